#!/usr/bin/env python3
"""numpy peers of the ratio and min-and-max commands, as an analyst would
write them: whole rasters in memory, the same no-data rules, float32 output.

  ratio   A B OUT LINES PIXELS NULL
  minmax  OUT LINES PIXELS NULL IN1 IN2 ...   (inputs in chronological order)
"""
import sys

import numpy as np


def read(name, lines, pixels):
    return np.fromfile(name, dtype="<f4").reshape(lines, pixels)


def is_null(values, null):
    return np.isnan(values) if np.isnan(null) else np.abs(values - null) <= 1.1754943508222875e-38


def ratio(a_name, b_name, out, lines, pixels, null):
    a, b = read(a_name, lines, pixels), read(b_name, lines, pixels)
    bad = is_null(a, null) | is_null(b, null) | (b <= 1.1754943508222875e-38)
    with np.errstate(divide="ignore", invalid="ignore"):
        r = (a.astype(np.float64) / b).astype(np.float32)
    r[bad] = null
    r.tofile(out)


def minmax(out, lines, pixels, null, names):
    stack = np.stack([read(n, lines, pixels) for n in names])
    bad = is_null(stack, null).any(axis=0)
    results = {
        "_min": stack.min(axis=0), "_max": stack.max(axis=0),
        "_min_date": (stack.argmin(axis=0) + 1).astype(np.float32),
        "_max_date": (stack.argmax(axis=0) + 1).astype(np.float32),
    }
    for suffix, values in results.items():
        values[bad] = null if "date" not in suffix else 0
        values.astype(np.float32).tofile(out + suffix)


if __name__ == "__main__":
    if sys.argv[1] == "ratio":
        ratio(sys.argv[2], sys.argv[3], sys.argv[4], int(sys.argv[5]), int(sys.argv[6]), float(sys.argv[7]))
    else:
        minmax(sys.argv[2], int(sys.argv[3]), int(sys.argv[4]), float(sys.argv[5]), sys.argv[6:])
