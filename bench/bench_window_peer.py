#!/usr/bin/python3
"""numpy/scipy peer of the window commands, for bench_window.sh.

Whole-image box filters (scipy.ndimage.uniform_filter, zero outside the
image) over validity masks, in double precision, as a numpy user would write
them:

  texture IN OUT LINES PIXELS ROWS COLS NULL POWER
      coefficient of variation of the valid amplitudes in the window
  correlation IN1 IN2 NORM OUT LINES PIXELS ROWS COLS NULL
      normalisation image (mean of the two local mean intensities), then
      g = sqrt(2 r - 1), r = sum x1 x2 / sqrt(sum x1^2 sum x2^2), x = I / norm

Inputs and outputs are raw little-endian float32 rasters; the inputs' no-data
value is NULL. A ratio of box means equals the ratio of window sums, so the
zero padding gives the same clipped windows as the program.
"""
import sys

import numpy as np
from scipy.ndimage import uniform_filter


def read(name, lines, pixels, null):
    values = np.fromfile(name, dtype="<f4").reshape(lines, pixels).astype(np.float64)
    valid = (values != null) & np.isfinite(values)
    return np.where(valid, values, 0.0), valid.astype(np.float64)


def box(values, rows, cols):
    return uniform_filter(values, size=(rows, cols), mode="constant", cval=0.0)


def texture(args):
    name, out, lines, pixels, rows, cols, null, power = args
    lines, pixels, rows, cols, null = int(lines), int(pixels), int(rows), int(cols), float(null)
    values, valid = read(name, lines, pixels, null)
    if power == "1":
        values = np.sqrt(np.abs(values))
    count = box(valid, rows, cols)
    mean = box(values, rows, cols)
    squares = box(values * values, rows, cols)
    with np.errstate(divide="ignore", invalid="ignore"):
        m = mean / count
        cv = np.sqrt(np.maximum(squares / count - m * m, 0.0)) / m
    ok = (valid > 0) & (mean > 0) & (count > 0)
    np.where(ok, cv, -9999.0).astype("<f4").tofile(out)


def correlation(args):
    name1, name2, norm_name, out, lines, pixels, rows, cols, null = args
    lines, pixels, rows, cols, null = int(lines), int(pixels), int(rows), int(cols), float(null)
    i1, v1 = read(name1, lines, pixels, null)
    i2, v2 = read(name2, lines, pixels, null)
    with np.errstate(divide="ignore", invalid="ignore"):
        n1 = box(v1, rows, cols)
        n2 = box(v2, rows, cols)
        norm = (box(i1, rows, cols) / n1 + box(i2, rows, cols) / n2) / 2
        norm_ok = (v1 > 0) & (v2 > 0) & (n1 > 0) & (n2 > 0)
        np.where(norm_ok, norm, -9999.0).astype("<f4").tofile(norm_name)
        both = norm_ok & (norm != 0)
        x1 = np.where(both, i1 / norm, 0.0)
        x2 = np.where(both, i2 / norm, 0.0)
        cross = box(x1 * x2, rows, cols)
        a = box(x1 * x1, rows, cols)
        b = box(x2 * x2, rows, cols)
        r = cross / np.sqrt(a * b)
        g = np.where(r > 0.5, np.sqrt(np.maximum(2 * r - 1, 0.0)), 0.0)
    np.where(both & (a * b > 0), g, -9999.0).astype("<f4").tofile(out)


if __name__ == "__main__":
    {"texture": texture, "correlation": correlation}[sys.argv[1]](sys.argv[2:])
