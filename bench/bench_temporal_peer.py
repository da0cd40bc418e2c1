#!/usr/bin/python3
"""numpy peer of the temporal feature extraction, for bench_temporal.sh.

  peer OUT LINES PIXELS NULL IN1 IN2 ...

Reads the inputs (raw little-endian float32, already in temporal order) as
one stack and writes, as a numpy user would, the mean, the population
standard deviation, the median, the minimum, the maximum and the largest
increment and decrement between consecutive images of the magnitudes, each
as OUT_<name> (float32). Mean and deviation leave no-data cells out through
a validity mask; median and differences use every image as it is, so the
peer does less than the program (no selection, no per-pixel series).
"""
import sys

import numpy as np


def main(args):
    out, lines, pixels, null = args[0], int(args[1]), int(args[2]), float(args[3])
    names = args[4:]
    stack = np.empty((len(names), lines, pixels), dtype=np.float64)
    for i, name in enumerate(names):
        stack[i] = np.fromfile(name, dtype="<f4").reshape(lines, pixels)
    valid = (stack != null) & np.isfinite(stack)
    values = np.abs(stack)
    count = valid.sum(axis=0)
    with np.errstate(divide="ignore", invalid="ignore"):
        total = np.where(valid, values, 0.0).sum(axis=0)
        mean = total / count
        squares = np.where(valid, values * values, 0.0).sum(axis=0) / count
        std = np.sqrt(np.maximum(squares - mean * mean, 0.0))
    steps = np.diff(values, axis=0)
    results = {
        "mea": mean,
        "std": std,
        "med": np.median(values, axis=0),
        "min": values.min(axis=0),
        "max": values.max(axis=0),
        "maxI": steps.max(axis=0),
        "maxD": steps.min(axis=0),
    }
    for name, image in results.items():
        np.where(count > 0, image, null).astype("<f4").tofile(out + "_" + name)


if __name__ == "__main__":
    main(sys.argv[1:])
