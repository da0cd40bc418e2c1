#!/usr/bin/python3
"""numpy peer of the fine co-registration grid, for bench_coregistration.sh.

  peer ROOT LINES PIXELS ROWS COLS SIZE OVERSAMPLING BORDER COUNT

Reads the FLOAT_COMPLEX pair ROOT_1, ROOT_2 (raw little-endian complex64)
as memory maps and, for the first COUNT windows of a ROWS x COLS grid of
SIZE x SIZE windows (BORDER pixels from the edges), does what a numpy user
writes: amplitudes, np.fft.fft2 of both, the cross-spectrum without its
zero frequency zero-padded to SIZE x OVERSAMPLING and np.fft.ifft2 of it,
the peak by argmax. Prints the seconds per window and the median shift.
"""
import sys
import time

import numpy as np


def main(args):
    root = args[0]
    lines, pixels, rows, cols, size, osf, border, count = (int(a) for a in args[1:9])
    master = np.memmap(root + "_1", dtype="<c8", mode="r", shape=(lines, pixels))
    slave = np.memmap(root + "_2", dtype="<c8", mode="r", shape=(lines, pixels))
    starts_y = np.linspace(border, lines - border - size, rows).astype(int)
    starts_x = np.linspace(border, pixels - border - size, cols).astype(int)
    big = size * osf
    half = size // 2
    shifts = []
    start = time.perf_counter()
    done = 0
    for y in starts_y:
        for x in starts_x:
            if done == count:
                break
            m = np.abs(master[y:y + size, x:x + size])
            s = np.abs(slave[y:y + size, x:x + size])
            cross = np.fft.fft2(m) * np.conj(np.fft.fft2(s))
            cross[0, 0] = 0
            padded = np.zeros((big, big), dtype=complex)
            padded[:half, :half] = cross[:half, :half]
            padded[:half, -half:] = cross[:half, -half:]
            padded[-half:, :half] = cross[-half:, :half]
            padded[-half:, -half:] = cross[-half:, -half:]
            surface = np.abs(np.fft.ifft2(padded))
            py, px = np.unravel_index(np.argmax(surface), surface.shape)
            py = py - big if py > big // 2 else py
            px = px - big if px > big // 2 else px
            shifts.append((-px / osf, -py / osf))
            done += 1
    seconds = time.perf_counter() - start
    med = np.median(np.array(shifts), axis=0)
    print("peer_seconds_per_window %.5f windows %d range %.4f azimuth %.4f" % (seconds / done, done, med[0], med[1]))


if __name__ == "__main__":
    main(sys.argv[1:])
