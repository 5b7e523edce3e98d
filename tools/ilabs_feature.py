#!/usr/bin/python3
"""Compute post filter features and ILABS decisions exactly as the library does.

From an 8-bit gray frame (raw bytes, row after row, --width x --height) and a
hit (window left,right,top,bottom with right/bottom one past the last pixel, and
its cascade score) this makes the 945-value feature the post filters judge: the
cascade score as float32, then the uniform-LBP histogram of the window cropped
and box-scaled to 24 x 24 through the integral image, 4 x 4 cells of 59 bins
(--transpose gives the SVM filter's layout, patch rows and columns swapped).
With --model (a plain ILABS payload, not packed) it also prints the category's
score and decision. It also offers read/write of ILABS payloads for the model
tools. Output is one line of space-separated values per hit, printed with 9
significant digits so that float32 values round-trip. Deterministic: no
randomness at all.
"""
import argparse
import struct
import sys

import numpy as np

PATCH = 24
CELLS = 4
BINS = 59
FEATURE_LENGTH = 1 + CELLS * CELLS * BINS
FAST_PASS_SCORE = np.float32(6.0)
CATEGORY_NUMBER = 15


def _uniform(p):
    return sum(((p >> b) & 1) != ((p >> ((b + 1) & 7)) & 1) for b in range(8)) <= 2


def _make_lut():
    lut, n = [], 0
    for p in range(256):
        if _uniform(p):
            lut.append(n)
            n += 1
        else:
            lut.append(BINS - 1)
    return lut


LBP_LUT = _make_lut()


def integral(frame, width, height):
    """(height+1) x (width+1) integral image as Python ints (uint32 wrap ignored)."""
    data = [[0] * (width + 1) for _ in range(height + 1)]
    for y in range(height):
        running = 0
        above, row = data[y], data[y + 1]
        base = y * width
        for x in range(width):
            running += frame[base + x]
            row[x + 1] = above[x + 1] + running
    return data


def interpolate(data, x, y):
    stride, rows = len(data[0]), len(data)
    fx0, fy0 = float(np.floor(x)), float(np.floor(y))
    ix = int(min(max(fx0, 0.0), float(stride - 1)))
    iy = int(min(max(fy0, 0.0), float(rows - 1)))
    fx, fy = x - fx0, y - fy0
    if fx < 0.001 or ix + 1 >= stride:
        fx = 0.0
    if fy < 0.001 or iy + 1 >= rows:
        fy = 0.0

    def e(c, r):
        return float(data[r][c])

    if fx == 0.0 and fy == 0.0:
        return e(ix, iy)
    if fx == 0.0:
        return e(ix, iy + 1) * fy + e(ix, iy) * (1.0 - fy)
    if fy == 0.0:
        return e(ix + 1, iy) * fx + e(ix, iy) * (1.0 - fx)
    return (e(ix, iy) * (1.0 - fx) + e(ix + 1, iy) * fx) * (1.0 - fy) + \
        (e(ix, iy + 1) * (1.0 - fx) + e(ix + 1, iy + 1) * fx) * fy


def crop_scale(data, window, size=PATCH):
    """Box-filtered size x size patch (list of rows of ints) of the clipped window."""
    left, right, top, bottom = window
    width, height = len(data[0]) - 1, len(data) - 1
    left, top = max(left, 0), max(top, 0)
    right, bottom = min(right, width), min(bottom, height)
    cw, ch = right - left, bottom - top
    if cw <= 0 or ch <= 0:
        return [[0] * size for _ in range(size)]
    step_x, step_y = cw / size, ch / size
    area = step_x * step_y
    prev = [interpolate(data, left + j * step_x, top) for j in range(size + 1)]
    patch = []
    for r in range(1, size + 1):
        y = top + r * step_y
        cur = [interpolate(data, left + j * step_x, y) for j in range(size + 1)]
        row = []
        for j in range(size):
            v = (cur[j + 1] + prev[j] - prev[j + 1] - cur[j]) / area + 0.5
            v = min(max(v, 0.0), 255.0)
            row.append(int(v))
        patch.append(row)
        prev = cur
    return patch


def lbp_histogram(image, cells_x=CELLS, cells_y=CELLS):
    """image: rows of values. Unnormalised uniform-LBP counts, cell-major."""
    height, width = len(image), len(image[0])
    hist = [0.0] * (cells_x * cells_y * BINS)
    if width < 3 or height < 3:
        return hist
    cell_w, cell_h = width // cells_x, height // cells_y
    for y in range(1, height - 1):
        for x in range(1, width - 1):
            cr, cc = y // cell_h, x // cell_w
            if cr >= cells_y or cc >= cells_x:
                continue
            c = image[y][x]
            up, mid, down = image[y - 1], image[y], image[y + 1]
            p = (1 if c < up[x - 1] else 0) | (2 if c < up[x] else 0) | (4 if c < up[x + 1] else 0) \
                | (8 if c < mid[x + 1] else 0) | (16 if c < down[x + 1] else 0) | (32 if c < down[x] else 0) \
                | (64 if c < down[x - 1] else 0) | (128 if c < mid[x - 1] else 0)
            hist[(cr * cells_x + cc) * BINS + LBP_LUT[p]] += 1.0
    return hist


def feature(data, window, score, transpose=False):
    patch = crop_scale(data, window)
    if transpose:
        patch = [list(col) for col in zip(*patch)]
    return [float(np.float32(score))] + lbp_histogram(patch)


# ---- ILABS payloads: per category int32 tag, quantised linear (D), weights (R),
# ---- left and right rows (R x D), float32 bias, int32 trailer.

def _read_block(buf, pos):
    _tag, count, scale = struct.unpack_from("<iif", buf, pos)
    pos += 12
    if count < 0 or pos + 2 * count > len(buf):
        raise ValueError("ILABS block count out of range")
    ints = np.frombuffer(buf, dtype="<i2", count=count, offset=pos)
    return (ints.astype(np.float32) * np.float32(scale)).astype(np.float32), pos + 2 * count


def read_ilabs(buf):
    cats, pos = [], 0
    for _ in range(CATEGORY_NUMBER):
        pos += 4
        linear, pos = _read_block(buf, pos)
        weights, pos = _read_block(buf, pos)
        left, pos = _read_block(buf, pos)
        right, pos = _read_block(buf, pos)
        d, r = len(linear), len(weights)
        if len(left) != r * d or len(right) != r * d:
            raise ValueError("ILABS matrix does not match its vectors")
        (bias,) = struct.unpack_from("<f", buf, pos)
        pos += 8
        cats.append((linear, weights, left.reshape(r, d), right.reshape(r, d), np.float32(bias)))
    return cats


def _write_block(values):
    values = np.asarray(values, dtype=np.float64).ravel()
    top = float(np.max(np.abs(values))) if values.size else 0.0
    scale = np.float32(top / 32767.0 if top > 0 else 1.0)
    q = np.clip(np.rint(values / float(scale)), -32768, 32767).astype("<i2")
    return struct.pack("<iif", 0, q.size, scale) + q.tobytes()


def write_ilabs(categories):
    """categories: 15 tuples (linear, weights, left R x D, right R x D, bias)."""
    out = b""
    for linear, weights, left, right, bias in categories:
        out += struct.pack("<i", 0) + _write_block(linear) + _write_block(weights)
        out += _write_block(left) + _write_block(right) + struct.pack("<fi", float(bias), 0)
    return out


def ilabs_score(category, feat):
    linear, weights, left, right, bias = category
    f = np.asarray(feat, dtype=np.float32)
    if len(f) != len(linear):
        raise ValueError("Incorrect PostFilter's feature length")
    score = np.float32(-bias)
    with np.errstate(over="ignore", invalid="ignore"):
        for r in range(len(weights)):
            a = np.float32(0)
            for i in range(len(f)):
                a = np.float32(a + np.float32(left[r][i] * f[i]))
            score = np.float32(score + np.float32(a * weights[r]))
            b = np.float32(0)
            for i in range(len(f)):
                b = np.float32(b + np.float32(right[r][i] * f[i]))
            score = np.float32(score + np.float32(a * b))
        for i in range(len(f)):
            score = np.float32(score + np.float32(linear[i] * f[i]))
    return score


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument("--frame", required=True, help="raw 8-bit gray frame, rows without padding")
    ap.add_argument("--width", type=int, required=True)
    ap.add_argument("--height", type=int, required=True)
    ap.add_argument("--hit", action="append", required=True, metavar="L,R,T,B,SCORE[,CATEGORY]",
                    help="a hit; may be given several times")
    ap.add_argument("--transpose", action="store_true", help="the SVM filter's patch layout")
    ap.add_argument("--model", help="plain ILABS payload: print 'score decision' instead of the feature")
    args = ap.parse_args(argv)
    with open(args.frame, "rb") as f:
        frame = f.read()
    if args.width <= 0 or args.height <= 0 or len(frame) < args.width * args.height:
        ap.error("frame file smaller than width x height")
    data = integral(frame, args.width, args.height)
    model = None
    if args.model:
        with open(args.model, "rb") as f:
            model = read_ilabs(f.read())
    for hit_text in args.hit:
        parts = hit_text.split(",")
        if len(parts) not in (5, 6):
            ap.error("a hit is L,R,T,B,SCORE[,CATEGORY]")
        window = tuple(int(v) for v in parts[:4])
        score = float(parts[4])
        category = int(parts[5]) if len(parts) == 6 else 0
        feat = feature(data, window, score, args.transpose)
        if model is None:
            print(" ".join("%.9g" % v for v in feat))
        elif np.float32(score) >= FAST_PASS_SCORE:
            print("fast 1")
        else:
            if not 0 <= category < len(model):
                ap.error("category out of range")
            s = ilabs_score(model[category], feat)
            print("%.9g %d" % (s, 1 if s > 0 else 0))
    return 0


if __name__ == "__main__":
    sys.exit(main())
