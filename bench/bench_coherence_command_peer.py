#!/usr/bin/python3
"""numpy/scipy peer of the coherence command, for bench_coherence_command.sh.

    bench_coherence_command_peer.py MASTER SLAVE OUT [LINES PIXELS]
    bench_coherence_command_peer.py --means CC LINES PIXELS
    bench_coherence_command_peer.py --coherence Z MPWR SPWR LINES PIXELS

Runs the chain of the command on a single-look complex pair (raw little-endian
complex64, sizes from MASTER.sml unless given), one look in each direction:

1. Co-registration: 12 x 12 windows of 64 x 64 (32 pixels from the edges),
   oversampled by 2 (FFT) before detection, their amplitudes all
   cross-correlated at once by FFT, the peak refined to 1/32 pixel by a
   matrix DFT of the cross-spectrum around it; windows whose peak
   correlation is below 0.2 are dropped, and an affine shift (1, pixel, line)
   is fitted by least squares, once more without the windows beyond 3 sigma.
2. Interferogram, blocks of 512 lines (margin 8, as bench_interferogram_peer):
   the slave resampled at the fitted positions by cubic splines
   (map_coordinates, order 3, real and imaginary parts); the range fringe
   frequency f of the block from the peak of the product's range spectrum;
   both images cut to their common range band (master [f - b/2, b/2], slave
   [-b/2, b/2 - f] for f > 0, b the range bandwidth over the sampling rate
   from the header) and oversampled by 2 in the same spectrum; the product
   summed over the two range samples, normalised by the powers. The
   azimuth common band is not applied when both Doppler centroids agree (it
   would cut nothing here); otherwise the run says so. Simplification: one
   fringe frequency per block rather than per group of lines.
3. Synthetic phase: 64 x 64 blocks of the interferogram, all transformed at
   once; the 2 x 2 bins of greatest power give each block's fringe
   frequencies (their power centroid) and its significance
   n P_peak / (P_total - P_peak) > 4 ln n; a polynomial P of degree 3
   without constant is fitted to the kept blocks' frequencies through its
   gradient, phi = 2 pi P + c with c the phase of the flattened sum. The
   elevation model is not used.
4. Flattening: z e^(-i phi).
5. Adaptive filter: 32 x 32 patches every 16 cells (from -16), transformed
   at once by rows of patches; where (P_4x4 - 16 P_total / 1024) / P_total
   >= 0.25 the pass band sinc(2 d / 32) kaiser(d, 2.1) is centred on the
   peak bin, else on zero; patches added back with sin^2 weights (a
   peak-centred linear band-pass rather than a power-law filter, so the
   coherence of the filtered interferogram stays comparable).
6. Coherence: |sum z sqrt(m s)| / sqrt(sum m sum s) over 5 x 5
   (uniform_filter), null -9999 at the 2-cell border and where a window
   holds a zero cell, capped at 0.999.
7. Quick-look: 8 bits, linear between the 0.333 % and 99.667 % points of the
   valid coherence, 0 for null; a GeoTIFF through GDAL's bindings when
   osgeo imports, else PIL, else a raw 8-bit file.

Writes OUT_int, OUT_mpwr, OUT_spwr, OUT_sint, OUT_dint, OUT_fint, OUT_cc
(raw little-endian), the quick-look and OUT_report.txt (step seconds, the
fit, the coherence means over the four column quarters), also printed.
With --means: the four column-quarter means of a FLOAT coherence raster;
with --coherence: those of the 5 x 5 coherence (step 6) of an interferogram
Z (FLOAT_COMPLEX) with its FLOAT power images.
"""
import math
import re
import sys
import time

import numpy as np
from scipy import fft, ndimage

from bench_interferogram_peer import upsample

NULL = -9999.0
WINDOWS, WINDOW, BORDER, UPSAMPLING, MIN_CORRELATION = 12, 64, 32, 16, 0.2
BLOCK, MARGIN, OVERSAMPLE, MIN_FRINGE_SNR = 512, 8, 2, 5.0
SYNT_BLOCK, SYNT_DEGREE, SYNT_SNR_FACTOR = 64, 3, 4.0
PATCH, STEP, LOW_SNR, WIDTH, KAISER_BETA, PATCH_ROWS = 32, 16, 0.25, 2.0, 2.1, 16
CC_WINDOW, CC_MAX, SATURATION = 5, 0.999, 0.333


def header_value(header, key, default=None):
    found = re.search(r"<%s>\s*(?:<VectorDouble[^>]*>\s*<ValueDouble[^>]*>)?([^<]+)<" % key, header)
    if found is None:
        if default is None:
            raise SystemExit("%s missing from the header" % key)
        return default
    return found.group(1).strip()


def upsample2d(windows):
    """Windows (..., n, n) oversampled by 2 in both axes through their zero-padded spectra."""
    n = windows.shape[-1]
    spectrum = fft.fft2(windows)
    padded = np.zeros(windows.shape[:-2] + (2 * n, 2 * n), spectrum.dtype)
    h = n // 2
    for a, b in ((slice(0, h), slice(0, h)), (slice(0, h), slice(-h, None)), (slice(-h, None), slice(0, h)),
                 (slice(-h, None), slice(-h, None))):
        padded[..., a, b] = spectrum[..., a, b]
    return fft.ifft2(padded) * 4


def coregister(master, slave, lines, pixels):
    """Affine shift (slave - master position) in range and azimuth: coefficients of 1, pixel, line."""
    starts_y = np.linspace(BORDER, lines - BORDER - WINDOW, WINDOWS).astype(int)
    starts_x = np.linspace(BORDER, pixels - BORDER - WINDOW, WINDOWS).astype(int)
    gy, gx = (a.ravel() for a in np.meshgrid(starts_y, starts_x, indexing="ij"))
    rows = gy[:, None, None] + np.arange(WINDOW)[None, :, None]
    cols = gx[:, None, None] + np.arange(WINDOW)[None, None, :]
    # Detection doubles the bandwidth: the complex windows are oversampled by
    # 2 first, else the amplitudes alias and the peak locks to whole pixels.
    m = np.abs(upsample2d(master[rows, cols])).astype(np.float64)
    s = np.abs(upsample2d(slave[rows, cols])).astype(np.float64)
    m -= m.mean(axis=(1, 2), keepdims=True)
    s -= s.mean(axis=(1, 2), keepdims=True)
    # c(t) = sum m(x) s(x + t) peaks at the shift t.
    cross = np.conj(fft.fft2(m)) * fft.fft2(s)
    surface = fft.ifft2(cross).real
    peak = surface.reshape(len(gy), -1).argmax(axis=1)
    side = 2 * WINDOW
    py, px = np.unravel_index(peak, (side, side))
    py = np.where(py > WINDOW, py - side, py)
    px = np.where(px > WINDOW, px - side, px)
    # The cross-spectrum evaluated on a 1/16 grid of +-1.5 steps of the
    # oversampled grid (half pixels) around the peak.
    offsets = np.arange(-24, 25) / UPSAMPLING
    ty, tx = py[:, None] + offsets, px[:, None] + offsets
    freq = fft.fftfreq(side)
    ey = np.exp(2j * np.pi * ty[:, :, None] * freq[None, None, :])
    ex = np.exp(2j * np.pi * freq[None, :, None] * tx[:, None, :])
    fine = (ey @ cross @ ex).real / side**2
    best = fine.reshape(len(gy), -1).argmax(axis=1)
    iy, ix = np.unravel_index(best, fine.shape[1:])
    shift_a, shift_r = ty[np.arange(len(gy)), iy] / 2.0, tx[np.arange(len(gy)), ix] / 2.0
    rho = fine.reshape(len(gy), -1).max(axis=1) / np.sqrt((m**2).sum(axis=(1, 2)) * (s**2).sum(axis=(1, 2)))
    keep = rho >= MIN_CORRELATION
    if keep.sum() < 3:
        raise SystemExit("co-registration: %d windows correlate, an affine fit needs 3" % keep.sum())
    design = np.column_stack([np.ones(len(gy)), gx + (WINDOW - 1) / 2.0, gy + (WINDOW - 1) / 2.0])
    for _ in range(2):
        cr = np.linalg.lstsq(design[keep], shift_r[keep], rcond=None)[0]
        ca = np.linalg.lstsq(design[keep], shift_a[keep], rcond=None)[0]
        residual = np.hypot(design @ cr - shift_r, design @ ca - shift_a)
        inside = keep & (residual <= 3.0 * max(residual[keep].std(), 1e-6))
        keep = inside if inside.sum() >= 3 else keep
    return cr, ca, int(keep.sum())


def common_bands(fringe, bandwidth):
    """The master's and the slave's common range bands (cycles per pixel) for fringe frequency f."""
    half = bandwidth / 2.0
    if fringe >= 0:
        return (fringe - half, half), (-half, half - fringe)
    return (-half, half + fringe), (-half - fringe, half)


def band_upsample(lines, band):
    """Lines cut to band (None: the whole band) and oversampled by 2 in the same spectrum."""
    if band is None:
        return upsample(lines, OVERSAMPLE)
    n = lines.shape[1]
    spectrum = fft.fft(lines, axis=1)
    freq = fft.fftfreq(n)
    spectrum[:, (freq < band[0]) | (freq > band[1])] = 0
    padded = np.zeros((lines.shape[0], n * OVERSAMPLE), dtype=spectrum.dtype)
    half = n // 2
    padded[:, :half] = spectrum[:, :half]
    padded[:, -(n - half):] = spectrum[:, half:]
    return fft.ifft(padded, axis=1) * OVERSAMPLE


def range_fringe(product):
    """Fringe frequency of a block (cycles per pixel) from its range power spectrum, None when not significant."""
    power = (np.abs(fft.fft(product, axis=1)) ** 2).sum(axis=0)
    n = power.size
    k = int(power.argmax())
    if n * power[k] <= MIN_FRINGE_SNR * max(power.sum() - power[k], 1e-300):
        return None
    left, right = power[(k - 1) % n], power[(k + 1) % n]
    curvature = left - 2 * power[k] + right
    delta = 0.5 * (left - right) / curvature if curvature < 0 else 0.0
    f = (k + delta) / n
    return f - 1.0 if f > 0.5 else f


def interferogram(master, slave, lines, pixels, cr, ca, bandwidth, out):
    z = np.zeros((lines, pixels), np.complex64)
    pm = np.zeros((lines, pixels), np.float32)
    ps = np.zeros((lines, pixels), np.float32)
    fringes = []
    for first in range(0, lines, BLOCK):
        last = min(first + BLOCK, lines)
        yy, xx = np.mgrid[first:last, 0:pixels].astype(np.float64)
        sy = yy + ca[0] + ca[1] * xx + ca[2] * yy
        sx = xx + cr[0] + cr[1] * xx + cr[2] * yy
        lo = max(int(math.floor(sy.min())) - MARGIN, 0)
        hi = min(int(math.ceil(sy.max())) + MARGIN + 1, lines)
        part = np.asarray(slave[lo:hi])
        coords = [sy - lo, sx]
        resampled = (ndimage.map_coordinates(part.real, coords, order=3, mode="constant")
                     + 1j * ndimage.map_coordinates(part.imag, coords, order=3, mode="constant"))
        mb = np.asarray(master[first:last])
        fringe = range_fringe(mb * np.conj(resampled))
        bands = common_bands(fringe, bandwidth) if fringe is not None else (None, None)
        fringes.append(fringe if fringe is not None else float("nan"))
        mo, so = band_upsample(mb, bands[0]), band_upsample(resampled, bands[1])
        product = (mo * np.conj(so)).reshape(last - first, pixels, OVERSAMPLE).sum(axis=2)
        m2 = (np.abs(mo) ** 2).reshape(last - first, pixels, OVERSAMPLE).sum(axis=2)
        s2 = (np.abs(so) ** 2).reshape(last - first, pixels, OVERSAMPLE).sum(axis=2)
        d = np.sqrt(m2 * s2)
        z[first:last] = np.where(d > 1.1754943508222875e-38, product / np.where(d > 0, d, 1), 0)
        pm[first:last] = m2 / OVERSAMPLE
        ps[first:last] = s2 / OVERSAMPLE
    z.tofile(out + "_int")
    pm.tofile(out + "_mpwr")
    ps.tofile(out + "_spwr")
    return z, pm, ps, float(np.nanmedian(fringes)) if fringes else float("nan")


def polynomial_terms(u, v):
    """The terms of P (degree 3 at most, no constant) and their u and v derivatives."""
    one, zero = np.ones_like(u), np.zeros_like(u)
    terms = [u, v, u * u, u * v, v * v, u**3, u * u * v, u * v * v, v**3]
    du = [one, zero, 2 * u, v, zero, 3 * u * u, 2 * u * v, v * v, zero]
    dv = [zero, one, zero, u, 2 * v, zero, u * u, 2 * u * v, 3 * v * v]
    return terms, du, dv


def synthetic_phase(z):
    lines, pixels = z.shape
    ny, nx = lines // SYNT_BLOCK, pixels // SYNT_BLOCK
    blocks = z[:ny * SYNT_BLOCK, :nx * SYNT_BLOCK].reshape(ny, SYNT_BLOCK, nx, SYNT_BLOCK).swapaxes(1, 2)
    valid = (blocks != 0).mean(axis=(2, 3)) >= 0.5
    power = np.abs(fft.fft2(blocks)) ** 2
    quad = power + np.roll(power, -1, axis=3)
    quad = quad + np.roll(quad, -1, axis=2)
    n = SYNT_BLOCK * SYNT_BLOCK
    best = quad.reshape(ny, nx, -1).argmax(axis=2)
    ky, kx = np.unravel_index(best, (SYNT_BLOCK, SYNT_BLOCK))
    peak = quad.reshape(ny, nx, -1).max(axis=2)
    total = power.sum(axis=(2, 3))
    snr = n * peak / np.maximum(total - peak, 1e-300)
    keep = valid & (snr > SYNT_SNR_FACTOR * math.log(n))
    # Power centroid of the 2 x 2 group: the fringe between its bins.
    iy, ix = np.indices((ny, nx))

    def bin_power(dy, dx):
        return power[iy, ix, (ky + dy) % SYNT_BLOCK, (kx + dx) % SYNT_BLOCK]

    p01, p10, p11 = bin_power(0, 1), bin_power(1, 0), bin_power(1, 1)
    fa = (ky + (p10 + p11) / np.maximum(peak, 1e-300)) / SYNT_BLOCK
    fr = (kx + (p01 + p11) / np.maximum(peak, 1e-300)) / SYNT_BLOCK
    fa, fr = (np.where(f > 0.5, f - 1.0, f) for f in (fa, fr))
    cx, sx, cy, sy = (pixels - 1) / 2.0, max((pixels - 1) / 2.0, 1.0), (lines - 1) / 2.0, max((lines - 1) / 2.0, 1.0)
    u = ((ix * SYNT_BLOCK + (SYNT_BLOCK - 1) / 2.0 - cx) / sx)[keep]
    v = ((iy * SYNT_BLOCK + (SYNT_BLOCK - 1) / 2.0 - cy) / sy)[keep]
    kept = int(keep.sum())
    coefficients = np.zeros(9)
    if kept:
        unknowns = 9 if kept >= 9 else 5 if kept >= 5 else 2
        _, du, dv = polynomial_terms(u, v)
        design = np.vstack([np.column_stack(du[:unknowns]) / sx, np.column_stack(dv[:unknowns]) / sy])
        coefficients[:unknowns] = np.linalg.lstsq(design, np.concatenate([fr[keep], fa[keep]]), rcond=None)[0]
    # phi over the image, row and column terms broadcast.
    uu = ((np.arange(pixels) - cx) / sx)[None, :]
    vv = ((np.arange(lines) - cy) / sy)[:, None]
    terms, _, _ = polynomial_terms(uu, vv)
    phi = 2.0 * np.pi * sum(c * t for c, t in zip(coefficients, terms))
    return phi, kept, ny * nx, coefficients


def kaiser_pass_band():
    """H(d) at bin offsets d = -16..15 from the centre, stored at d mod 32."""
    d = np.arange(-PATCH // 2, PATCH // 2)
    taper = np.i0(KAISER_BETA * np.sqrt(np.maximum(0.0, 1.0 - (2.0 * d / PATCH) ** 2))) / np.i0(KAISER_BETA)
    gain = np.sinc(WIDTH * d / PATCH) * taper
    band = np.zeros(PATCH)
    band[d % PATCH] = gain
    return band


def adaptive_filter(z):
    lines, pixels = z.shape
    ky, kx = (lines + STEP - 1) // STEP + 1, (pixels + STEP - 1) // STEP + 1
    padded = np.zeros((STEP * (ky + 1), STEP * (kx + 1)), np.complex64)
    padded[STEP:STEP + lines, STEP:STEP + pixels] = z
    tiles = np.zeros((ky + 1, kx + 1, STEP, STEP), np.complex64)
    weight = np.sin(np.pi * (np.arange(PATCH) + 0.5) / PATCH) ** 2
    weight2 = (weight[:, None] * weight[None, :]).astype(np.float32)
    band = kaiser_pass_band()
    bins = np.arange(PATCH)
    view = np.lib.stride_tricks.sliding_window_view(padded, (PATCH, PATCH))
    above = 0
    for first in range(0, ky, PATCH_ROWS):
        last = min(first + PATCH_ROWS, ky)
        patches = view[first * STEP:(last - 1) * STEP + 1:STEP, ::STEP][:, :kx]
        spectrum = fft.fft2(patches)
        power = np.abs(spectrum) ** 2
        box = power
        for axis in (2, 3):
            box = box + np.roll(box, -1, axis) + np.roll(box, -2, axis) + np.roll(box, -3, axis)
        total = power.sum(axis=(2, 3))
        p4 = box.reshape(box.shape[0], kx, -1).max(axis=2)
        snr = np.where(total > 0, (p4 - total * 16.0 / PATCH**2) / np.where(total > 0, total, 1), 0)
        py, px = np.unravel_index(power.reshape(box.shape[0], kx, -1).argmax(axis=2), (PATCH, PATCH))
        centred = snr >= LOW_SNR
        above += int(centred.sum())
        py, px = np.where(centred, py, 0), np.where(centred, px, 0)
        hy = band[(bins[None, None, :] - py[..., None]) % PATCH]
        hx = band[(bins[None, None, :] - px[..., None]) % PATCH]
        filtered = fft.ifft2(spectrum * (hy[..., :, None] * hx[..., None, :]).astype(np.float32)) * weight2
        quarters = filtered.reshape(last - first, kx, 2, STEP, 2, STEP).transpose(0, 1, 2, 4, 3, 5)
        for a in (0, 1):
            for b in (0, 1):
                tiles[first + a:last + a, b:kx + b] += quarters[:, :, a, b]
    out = tiles.transpose(0, 2, 1, 3).reshape(padded.shape)[STEP:STEP + lines, STEP:STEP + pixels]
    out[z == 0] = 0
    return out, above, ky * kx


def coherence(zf, pm, ps):
    restored = zf.astype(np.complex128) * np.sqrt(np.abs(pm.astype(np.float64) * ps))
    box = dict(size=CC_WINDOW, mode="constant")
    zr = ndimage.uniform_filter(restored.real, **box)
    zi = ndimage.uniform_filter(restored.imag, **box)
    sm = ndimage.uniform_filter(pm.astype(np.float64), **box)
    ss = ndimage.uniform_filter(ps.astype(np.float64), **box)
    bad = ndimage.uniform_filter((zf == 0).astype(np.float32), **box) > 0
    d = np.sqrt(sm * ss)
    g = np.where((d > 0) & ~bad, np.hypot(zr, zi) / np.where(d > 0, d, 1), NULL)
    np.minimum(g, CC_MAX, out=g, where=g >= 0)
    h = CC_WINDOW // 2
    g[:h], g[-h:], g[:, :h], g[:, -h:] = NULL, NULL, NULL, NULL
    return g.astype(np.float32)


def quick_look(g, name):
    valid = g != NULL
    low, high = np.percentile(g[valid], [SATURATION, 100 - SATURATION]) if valid.any() else (0.0, 1.0)
    scaled = np.clip((g - low) / max(high - low, 1e-12), 0, 1) * 254 + 1
    image = np.where(valid, scaled, 0).astype(np.uint8)
    try:
        from osgeo import gdal
        target = gdal.GetDriverByName("GTiff").Create(name, image.shape[1], image.shape[0], 1, gdal.GDT_Byte)
        target.GetRasterBand(1).WriteArray(image)
        target.GetRasterBand(1).SetNoDataValue(0)
        target = None
        return "GeoTIFF (GDAL)"
    except ImportError:
        pass
    try:
        from PIL import Image
        Image.fromarray(image).save(name)
        return "TIFF (PIL)"
    except ImportError:
        image.tofile(name + ".raw")
        return "raw 8-bit " + name + ".raw"


def quarter_means(g):
    valid = np.where(g != NULL, g, np.nan)
    quarter = g.shape[1] // 4
    return [float(np.nanmean(valid[:, q * quarter:(q + 1) * quarter])) for q in range(4)]


def main(args):
    if args and args[0] == "--means":
        g = np.fromfile(args[1], dtype="<f4").reshape(int(args[2]), int(args[3]))
        print(" ".join("%.3f" % m for m in quarter_means(g)))
        return
    if args and args[0] == "--coherence":
        shape = (int(args[4]), int(args[5]))
        z = np.fromfile(args[1], dtype="<c8").reshape(shape)
        pm, ps = (np.fromfile(name, dtype="<f4").reshape(shape) for name in args[2:4])
        print(" ".join("%.3f" % m for m in quarter_means(coherence(z, pm, ps))))
        return
    master_name, slave_name, out = args[:3]
    with open(master_name + ".sml") as f:
        header = f.read()
    with open(slave_name + ".sml") as f:
        slave_header = f.read()
    if len(args) >= 5:
        lines, pixels = int(args[3]), int(args[4])
    else:
        lines, pixels = int(header_value(header, "NrOfLinesPerImage")), int(header_value(header, "NrOfPixelsPerLine"))
    bandwidth = float(header_value(header, "RangeBandwidth")) / float(header_value(header, "RangeSamplingRate"))
    doppler = [float(header_value(h, "DopplerCentroidCoeff", "0")) for h in (header, slave_header)]
    master = np.memmap(master_name, dtype="<c8", mode="r", shape=(lines, pixels))
    slave = np.memmap(slave_name, dtype="<c8", mode="r", shape=(lines, pixels))
    seconds, report = {}, []
    clock = time.perf_counter()

    def lap(step):
        nonlocal clock
        now = time.perf_counter()
        seconds[step] = now - clock
        clock = now

    cr, ca, windows = coregister(master, slave, lines, pixels)
    lap("co-registration")
    z, pm, ps, fringe = interferogram(master, slave, lines, pixels, cr, ca, bandwidth, out)
    lap("interferogram")
    phi, kept, examined, _ = synthetic_phase(z)
    lap("synthetic phase")
    dint = (z * np.exp(-1j * phi)).astype(np.complex64)
    c = float(np.angle(dint.astype(np.complex128).sum()))
    dint *= np.complex64(np.exp(-1j * c))
    (phi + c).astype("<f4").tofile(out + "_sint")
    dint.tofile(out + "_dint")
    lap("flattening")
    fint, above, patches = adaptive_filter(dint)
    fint.tofile(out + "_fint")
    lap("adaptive filter")
    g = coherence(fint, pm, ps)
    g.tofile(out + "_cc")
    lap("coherence")
    kind = quick_look(g, out + "_cc.tif")
    lap("quick-look")

    report.append("peer steps (s): " + ", ".join("%s %.2f" % item for item in seconds.items()))
    report.append("peer co-registration: range %.4f %+.3e x %+.3e y, azimuth %.4f %+.3e x %+.3e y, %d windows"
                  % (*cr, *ca, windows))
    report.append("peer range fringe %.4f cycles/pixel (median of blocks); azimuth common band %s"
                  % (fringe, "not needed (centroids agree)" if abs(doppler[0] - doppler[1]) < 1e-9
                     else "NOT applied (centroids differ)"))
    report.append("peer synthetic phase: %d of %d blocks kept; filter: %d of %d patches peak-centred"
                  % (kept, examined, above, patches))
    report.append("peer quick-look: %s" % kind)
    report.append("peer coherence quarter means: " + " ".join("%.3f" % m for m in quarter_means(g)))
    with open(out + "_report.txt", "w") as f:
        f.write("\n".join(report) + "\n")
    print("\n".join(report))


if __name__ == "__main__":
    main(sys.argv[1:])
