#!/usr/bin/env python3
"""numpy/scipy peer of the interferogram step, for bench_interferogram.sh.

    bench_interferogram_peer.py MASTER SLAVE OUT LINES PIXELS DR DA AL [BLOCK [OVERSAMPLE]]

Reads two FLOAT_COMPLEX rasters (little-endian complex64), resamples the slave
at (line + DA, pixel + DR) with cubic splines (scipy.ndimage.map_coordinates,
order 3, on the real and imaginary parts), forms master x conj(slave), sums AL
lines, normalises by the square root of the summed powers and writes OUT_int,
OUT_mpwr and OUT_spwr. Blocks of BLOCK lines (default 512) with a margin of 8.
No filters. With OVERSAMPLE 2 the lines of both images are oversampled by 2
in range (zero-padded FFT) before the product and 2 samples are summed per
range look, as the step does; with 1 (the default) the product is formed at
the input sampling, which aliases its doubled bandwidth.
"""
import sys

import numpy as np
from scipy import ndimage


def upsample(lines, factor):
    """Each line oversampled by factor through its zero-padded spectrum."""
    n = lines.shape[1]
    spectrum = np.fft.fft(lines, axis=1)
    padded = np.zeros((lines.shape[0], n * factor), dtype=spectrum.dtype)
    half = n // 2
    padded[:, :half] = spectrum[:, :half]
    padded[:, -(n - half):] = spectrum[:, half:]
    return np.fft.ifft(padded, axis=1) * factor


def main():
    master, slave, out = sys.argv[1:4]
    lines, pixels = int(sys.argv[4]), int(sys.argv[5])
    dr, da, al = float(sys.argv[6]), float(sys.argv[7]), int(sys.argv[8])
    block = int(sys.argv[9]) if len(sys.argv) > 9 else 512
    oversample = int(sys.argv[10]) if len(sys.argv) > 10 else 1
    block -= block % al
    m = np.memmap(master, dtype="<c8", mode="r", shape=(lines, pixels))
    s = np.memmap(slave, dtype="<c8", mode="r", shape=(lines, pixels))
    outs = [open(out + suffix, "wb") for suffix in ("_int", "_mpwr", "_spwr")]
    margin = 8
    for first in range(0, lines - lines % al, block):
        last = min(first + block, lines - lines % al)
        lo, hi = max(first - margin, 0), min(last + margin, lines)
        part = np.asarray(s[lo:hi])
        yy, xx = np.mgrid[first:last, 0:pixels].astype(np.float64)
        coords = [yy + da - lo, xx + dr]
        resampled = ndimage.map_coordinates(part.real, coords, order=3, mode="constant") + 1j * ndimage.map_coordinates(
            part.imag, coords, order=3, mode="constant")
        mb = np.asarray(m[first:last])
        if oversample > 1:
            mb, resampled = upsample(mb, oversample), upsample(resampled, oversample)
        rows = mb.shape[0] // al
        product = (mb * np.conj(resampled)).reshape(rows, al, pixels, -1).sum(axis=(1, 3))
        pm = (np.abs(mb) ** 2).reshape(rows, al, pixels, -1).sum(axis=(1, 3))
        ps = (np.abs(resampled) ** 2).reshape(rows, al, pixels, -1).sum(axis=(1, 3))
        d = np.sqrt(pm * ps)
        z = np.where(d > 1.1754943508222875e-38, product / np.where(d > 0, d, 1), 0)
        outs[0].write(z.astype("<c8").tobytes())
        outs[1].write((pm / (al * oversample)).astype("<f4").tobytes())
        outs[2].write((ps / (al * oversample)).astype("<f4").tobytes())
    for f in outs:
        f.close()


if __name__ == "__main__":
    main()
