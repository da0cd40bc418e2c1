#!/usr/bin/env python3
"""numpy/scipy peer of the coherence step, for bench_coherence.sh.

    bench_coherence_peer.py INT MPWR SPWR OUT LINES PIXELS WINDOW

Reads the normalised interferogram (little-endian complex64) and the two power
images (float32), restores the product z sqrt(m s), sums it and the powers
over WINDOW x WINDOW with scipy.ndimage.uniform_filter, voids the windows that
hold an invalid pixel (z exactly 0) and writes the coherence, capped at 0.999.
"""
import sys

import numpy as np
from scipy import ndimage


def main():
    interferogram, master, slave, out = sys.argv[1:5]
    lines, pixels, window = int(sys.argv[5]), int(sys.argv[6]), int(sys.argv[7])
    z = np.fromfile(interferogram, dtype="<c8").reshape(lines, pixels)
    m = np.fromfile(master, dtype="<f4").reshape(lines, pixels).astype(np.float64)
    s = np.fromfile(slave, dtype="<f4").reshape(lines, pixels).astype(np.float64)
    restored = z.astype(np.complex128) * np.sqrt(np.abs(m * s))
    box = dict(size=window, mode="constant")
    zr = ndimage.uniform_filter(restored.real, **box)
    zi = ndimage.uniform_filter(restored.imag, **box)
    pm = ndimage.uniform_filter(m, **box)
    ps = ndimage.uniform_filter(s, **box)
    bad = ndimage.uniform_filter((restored == 0).astype(np.float64), **box) > 0
    d = np.sqrt(pm * ps)
    g = np.where((d > 0) & ~bad, np.hypot(zr, zi) / np.where(d > 0, d, 1), -9999.0)
    np.minimum(g, 0.999, out=g, where=g >= 0)
    g.astype("<f4").tofile(out)


if __name__ == "__main__":
    main()
