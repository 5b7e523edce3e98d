#!/usr/bin/python3
"""Make the reference fixtures of the numeric building blocks with numpy and OpenCV.

From fixed-seed random signals, images, vectors and point sets it computes,
with numpy and OpenCV only (no code of the library), what the filters, the
normalizers, the affine fit and the PCA projection must give, and writes them
as one small text file: one `name count v1 v2 ...` line per array, `#`
comments. Filtering uses replicated borders (numpy edge padding, OpenCV
BORDER_REPLICATE) and OpenCV's own Gaussian kernels; the affine fit is numpy's
lstsq on [x, y, 1]. The output is deterministic. Command that made the
committed file:

    /usr/bin/python3 tools/make_numeric_fixtures.py --out tests/numeric/fixtures/numeric_reference.txt
"""
import argparse
import sys

import cv2
import numpy as np


def gaussian_kernel(sigma):
    radius = int(np.floor(np.float32(sigma) * np.float32(3.0)))
    k = cv2.getGaussianKernel(2 * radius + 1, float(sigma), ktype=cv2.CV_64F).ravel()
    return k


def filter_replicate(signal, kernel):
    r = (len(kernel) - 1) // 2
    padded = np.pad(signal, r, mode="edge")
    return np.convolve(padded, kernel, mode="valid")


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument("--out", required=True, help="fixture file to write")
    args = ap.parse_args(argv)
    rng = np.random.default_rng(20261123)
    rows = []

    def put(name, values):
        values = np.asarray(values, dtype=np.float64).ravel()
        rows.append("%s %d %s" % (name, values.size, " ".join("%.9g" % v for v in values)))

    # 1-D Gaussian kernels and a filtered signal, borders replicated.
    signal = rng.uniform(-1.0, 1.0, 40).astype(np.float32)
    put("signal", signal)
    for tag, sigma in (("0_5", 0.5), ("1_0", 1.0), ("1_5", 1.5), ("2_2", 2.2)):
        k = gaussian_kernel(sigma)
        put("gauss1d_kernel_" + tag, k)
        put("gauss1d_out_" + tag, filter_replicate(signal.astype(np.float64), k))
    # DoG of sigmas 1.0 (lower) and 2.2 (higher): higher minus lower.
    put("dog1d_out_1_0_2_2", filter_replicate(signal.astype(np.float64), gaussian_kernel(2.2))
        - filter_replicate(signal.astype(np.float64), gaussian_kernel(1.0)))

    # 2-D Gaussian (sigmas 1.0 across, 1.5 down) and DoG (1.0, 2.0) on a 17 x 11 image.
    image = rng.uniform(0.0, 255.0, (11, 17)).astype(np.float32)
    put("image_17x11", image)
    kx, ky = gaussian_kernel(1.0), gaussian_kernel(1.5)
    g2 = cv2.sepFilter2D(image.astype(np.float64), cv2.CV_64F, kx, ky, borderType=cv2.BORDER_REPLICATE)
    put("gauss2d_out_1_0_1_5", g2)
    lo = cv2.sepFilter2D(image.astype(np.float64), cv2.CV_64F, gaussian_kernel(1.0), gaussian_kernel(1.0),
                         borderType=cv2.BORDER_REPLICATE)
    hi = cv2.sepFilter2D(image.astype(np.float64), cv2.CV_64F, gaussian_kernel(2.0), gaussian_kernel(2.0),
                         borderType=cv2.BORDER_REPLICATE)
    put("dog2d_out_1_0_2_0", hi - lo)

    # Normalizers on a mixed-sign vector and a non-negative histogram.
    eps = np.float32(2.0 ** -23)
    mixed = rng.normal(0.0, 1.0, 36).astype(np.float32)
    hist = rng.uniform(0.0, 5.0, 36).astype(np.float32)
    put("norm_mixed", mixed)
    put("norm_hist", hist)
    m = mixed.astype(np.float64)
    h = hist.astype(np.float64)
    put("norm_l1_mixed", m / (np.abs(m).sum() + eps))
    put("norm_l2_mixed", m / (np.sqrt((m * m).sum()) + eps))
    put("norm_l1sqrt_hist", np.sqrt(h / (h.sum() + eps)))
    clip, alpha = 0.2, 0.01
    x = np.sqrt((m * m).sum()) + eps + alpha * m.size
    v = np.minimum(m / x, clip)
    put("norm_l2hys_mixed_0_2_0_01", v / (np.sqrt((v * v).sum()) + eps))

    # Affine fit by least squares on 12 noisy correspondences.
    source = rng.uniform(-50.0, 150.0, (12, 2)).astype(np.float32)
    truth = np.array([[1.1, -0.3], [0.25, 0.9]])
    target = (source.astype(np.float64) @ truth.T + np.array([7.0, -4.0])
              + rng.normal(0.0, 1.5, (12, 2))).astype(np.float32)
    put("affine_source", source)
    put("affine_target", target)
    design = np.hstack([source.astype(np.float64), np.ones((12, 1))])
    params, _, _, _ = np.linalg.lstsq(design, target.astype(np.float64), rcond=None)
    probes = np.array([[0.0, 0.0], [100.0, -20.0], [-35.5, 60.25]])
    put("affine_probes", probes)
    put("affine_probes_mapped", np.hstack([probes, np.ones((3, 1))]) @ params)

    # PCA projection 24 -> 5.
    mean = rng.normal(0.0, 1.0, 24).astype(np.float32)
    projection = rng.normal(0.0, 0.3, (5, 24)).astype(np.float32)
    pca_in = rng.normal(0.0, 2.0, 24).astype(np.float32)
    put("pca_mean", mean)
    put("pca_projection_rows", projection)
    put("pca_input", pca_in)
    put("pca_output", projection.astype(np.float64) @ (pca_in.astype(np.float64) - mean.astype(np.float64)))

    text = "# Made by tools/make_numeric_fixtures.py (numpy %s, OpenCV %s); do not edit.\n" % (
        np.__version__, cv2.__version__) + "\n".join(rows) + "\n"
    with open(args.out, "w") as f:
        f.write(text)
    return 0


if __name__ == "__main__":
    sys.exit(main())
