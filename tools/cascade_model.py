#!/usr/bin/python3
"""Reads, writes and evaluates cascade model payloads (the plain bytes of mdcb.bin).

A payload is the 24/24/7 header, the common stages and, per branch, a count and its
stages; a stage is a feature (kind 0 empty, 1 rectangles, 2 inverse deviation), seven
descending bin thresholds and one to fifteen scores with eight bin scores and a reject
threshold each. This module mirrors the engine's arithmetic in numpy (float32 where the
engine uses float32, uint32 rectangle sums, truncated-variance deviation) so that a
payload can be checked before, and independently of, the C++ engine. Run as a program
it prints a summary of a payload, or with --image the raw hits of an exhaustive search
over one image (deterministic; no randomness involved).
"""
import argparse
import struct
import sys

import numpy as np

F32 = np.float32
WINDOW = 24
BINS = 7
DEAD = F32(-20.0)


class FormatError(ValueError):
    pass


class Stage:
    """One decision step: a feature and the score updates for each bin."""

    def __init__(self, kind=0, rects=(), thresholds=(0.0,) * BINS, scores=((0.0,) * 8 + (0.0,),),
                 remap=None):
        self.kind = int(kind)
        # rects: (weight, left, top, right, bottom)
        self.rects = [(F32(w), int(l), int(t), int(r), int(b)) for (w, l, t, r, b) in rects]
        self.thresholds = np.asarray(thresholds, F32)
        s = np.asarray(scores, F32).reshape(-1, 9)
        self.binScores = s[:, :8].copy()
        self.rejectThreshold = s[:, 8].copy()
        self.remap = None if remap is None else [int(v) for v in remap]

    @property
    def scoreCount(self):
        return len(self.rejectThreshold)

    def pack(self):
        out = [struct.pack('<i', self.kind)]
        if self.kind == 1:
            out.append(struct.pack('<i', len(self.rects)))
            for (w, l, t, r, b) in self.rects:
                out.append(struct.pack('<f4i', w, l, t, r, b))
        out.append(self.thresholds.astype('<f4').tobytes())
        out.append(struct.pack('<ii', self.scoreCount, 0 if self.remap is None else 1))
        if self.remap is not None:
            out.append(struct.pack('<%di' % self.scoreCount, *self.remap))
        for i in range(self.scoreCount):
            out.append(self.binScores[i].astype('<f4').tobytes())
            out.append(struct.pack('<f', self.rejectThreshold[i]))
        return b''.join(out)


class Cascade:
    def __init__(self, common, branches=None):
        self.common = list(common)
        n = self.common[-1].scoreCount if self.common else 1
        self.branches = branches if branches is not None else [[] for _ in range(n)]

    def pack(self):
        out = [struct.pack('<3i', WINDOW, WINDOW, BINS), struct.pack('<i', len(self.common))]
        out += [s.pack() for s in self.common]
        for br in self.branches:
            out.append(struct.pack('<i', len(br)))
            out += [s.pack() for s in br]
        return b''.join(out)

    @staticmethod
    def unpack(data):
        """Parses a payload, checking every count against the bytes and the bounds."""
        r = _Reader(data)
        if r.ints(3) != (WINDOW, WINDOW, BINS):
            raise FormatError('bad header')
        common = [_read_stage(r) for _ in range(r.count(1 << 20, 'common stage count'))]
        if not common:
            raise FormatError('no common stages')
        branches = []
        for _ in range(common[-1].scoreCount):
            branches.append([_read_stage(r) for _ in range(r.count(1 << 20, 'branch stage count'))])
        if r.pos != len(data):
            raise FormatError('%d trailing bytes' % (len(data) - r.pos))
        return Cascade(common, branches)


class _Reader:
    def __init__(self, data):
        self.data, self.pos = data, 0

    def take(self, n):
        if n < 0 or self.pos + n > len(self.data):
            raise FormatError('truncated at byte %d' % self.pos)
        b = self.data[self.pos:self.pos + n]
        self.pos += n
        return b

    def ints(self, n):
        return struct.unpack('<%di' % n, self.take(4 * n))

    def floats(self, n):
        return np.frombuffer(self.take(4 * n), '<f4').astype(F32)

    def count(self, limit, what):
        v = self.ints(1)[0]
        if not 0 <= v <= limit:
            raise FormatError('%s %d out of range' % (what, v))
        return v


def _read_stage(r):
    kind = r.ints(1)[0]
    rects = []
    if kind == 1:
        for _ in range(r.count(64, 'rectangle count')):
            w = r.floats(1)[0]
            l, t, rr, b = r.ints(4)
            if not (0 <= l <= rr <= WINDOW and 0 <= t <= b <= WINDOW):
                raise FormatError('rectangle outside the window')
            rects.append((w, l, t, rr, b))
    thr = r.floats(BINS)
    n = r.ints(1)[0]
    if not 1 <= n <= 15:
        raise FormatError('score count %d out of range' % n)
    flag = r.ints(1)[0]
    remap = list(r.ints(n)) if flag else None
    if remap is not None and any(not 0 <= v < 15 for v in remap):
        raise FormatError('remap entry out of range')
    scores = [tuple(r.floats(9)) for _ in range(n)]
    return Stage(kind, rects, thr, scores, remap)


# ---------------------------------------------------------------- evaluation

class Integral:
    """Integral image and integral of squares with a zero first row and column."""

    def __init__(self, gray):
        g = np.asarray(gray, np.uint64)
        self.height, self.width = g.shape
        self.stride = self.width + 1
        s = np.zeros((self.height + 1, self.width + 1), np.uint64)
        q = np.zeros_like(s)
        s[1:, 1:] = g.cumsum(0).cumsum(1)
        q[1:, 1:] = (g * g).cumsum(0).cumsum(1)
        # the engine keeps sums in 32 bits and wraps; differences are the same
        self.s = (s & np.uint64(0xFFFFFFFF)).astype(np.uint32).ravel()
        self.q = q.ravel()

    def rect(self, base, l, t, r, b):
        st = self.stride
        with np.errstate(over='ignore'):
            return (self.s[base + b * st + r] + self.s[base + t * st + l]
                    - self.s[base + t * st + r] - self.s[base + b * st + l])


_SQRT = np.sqrt(np.arange(65536, dtype=np.float64)).astype(F32)


def inverse_deviation(ii, xs, ys, w, h):
    """Window inverse deviation from the truncated integer variance."""
    base = ys * ii.stride + xs
    st = ii.stride
    s = ii.rect(base, 0, 0, w, h).astype(np.float64)
    q = (ii.q[base + h * st + w] + ii.q[base] - ii.q[base + h * st] - ii.q[base + w]).astype(np.float64)
    n = float(w) * float(h)
    var = np.trunc((q * n - s * s) / (n * n)).astype(np.int64)
    r = _SQRT[np.clip(var, 0, 65535)]
    return (F32(1.0) / np.maximum(r, F32(1.0))).astype(F32)


def scale_rects(rects, scale):
    """Scaled copy of a feature's rectangles, weights corrected by the area ratio."""
    sc = F32(scale)
    out = []
    for (w, l, t, r, b) in rects:
        nl, nt, nr, nb = (int(F32(0.5) + F32(c) * sc) for c in (l, t, r, b))
        old = F32((b - t) * (r - l))
        new = F32((nb - nt) * (nr - nl))
        out.append((F32(old * F32(w) / new), nl, nt, nr, nb))
    return out


def feature_values(stage, ii, xs, ys, invdev, rects=None):
    if stage.kind == 2:
        return invdev
    if stage.kind != 1:
        return np.zeros(len(xs), F32)
    base = ys * ii.stride + xs
    acc = np.zeros(len(xs), F32)
    for (w, l, t, r, b) in (stage.rects if rects is None else rects):
        acc = (acc + ii.rect(base, l, t, r, b).astype(F32) * F32(w)).astype(F32)
    return (acc * invdev).astype(F32)


def bins_of(values, t):
    hi = values >= t[3]
    b_hi = np.where(values >= t[1], np.where(values < t[0], 1, 0), np.where(values < t[2], 3, 2))
    b_lo = np.where(values >= t[5], np.where(values < t[4], 5, 4), np.where(values < t[6], 7, 6))
    return np.where(hi, b_hi, b_lo)


def update(stage, values, scores):
    """Applies a stage to scores (N x 15, float32) in place; returns the reject mask."""
    b = bins_of(values, stage.thresholds)
    n = stage.scoreCount
    if stage.remap is not None:
        saved = scores[:, :n].copy()
        for i, src in enumerate(stage.remap):
            scores[:, i] = saved[:, src]
    if n == 1:
        scores[:, 0] = (scores[:, 0] + stage.binScores[0][b]).astype(F32)
        return scores[:, 0] < stage.rejectThreshold[0]
    dead = np.zeros(len(values), np.int64)
    for i in range(n):
        alive = scores[:, i] > DEAD
        s = (scores[:, i] + stage.binScores[i][b]).astype(F32)
        died = alive & (s < stage.rejectThreshold[i])
        scores[:, i] = np.where(alive, np.where(died, DEAD, s), scores[:, i])
        dead += (~alive) | died
    return dead == n


def classify(cascade, ii, xs, ys, size=WINDOW, scaled=None):
    """Classifies the windows with top-left (xs, ys) and side `size`.

    Returns (accepted, score, stage) arrays as the engine reports them: stage is the
    rejecting stage index, or the category when accepted."""
    xs = np.asarray(xs, np.int64)
    ys = np.asarray(ys, np.int64)
    N = len(xs)
    invdev = inverse_deviation(ii, xs, ys, size, size)
    scores = np.zeros((N, 15), F32)
    stage_out = np.full(N, -1, np.int64)
    score_out = np.zeros(N, F32)
    alive = np.arange(N)
    for k, st in enumerate(cascade.common):
        if len(alive) == 0:
            break
        rects = None if scaled is None else scaled[k]
        v = feature_values(st, ii, xs[alive], ys[alive], invdev[alive], rects)
        sub = scores[alive]
        rej = update(st, v, sub)
        scores[alive] = sub
        stage_out[alive[rej]] = k
        score_out[alive[rej]] = sub[rej, 0]
        alive = alive[~rej]
    accepted = np.zeros(N, bool)
    accepted[alive] = True
    nb = len(cascade.branches)
    if nb < 2:
        stage_out[alive] = 0
        score_out[alive] = scores[alive, 0]
        return accepted, score_out, stage_out
    raise NotImplementedError('multi-branch evaluation is not needed by these tools')


def scale_table(factor=1.25, count=17):
    sizes = []
    for i in range(count):
        f = F32(np.power(np.float64(F32(factor)), np.float64(i)))
        sizes.append(int(float(F32(f * F32(24.0))) + 0.5))
    return sizes


def exhaustive_search(cascade, gray, min_scale=0, max_scale=16, step=0.1, factor=1.25):
    """Raw hits (score, left, top, right, bottom) of the sliding-window search over the
    whole image, with the early-reject neighbour skipping."""
    ii = Integral(gray)
    H, W = ii.height, ii.width
    lf = float(np.log(np.float64(F32(factor))))
    if W < 24 or H < 24:
        return []
    limit = min(int(np.log(W / 24.0) / lf), int(np.log(H / 24.0) / lf), max_scale)
    hits = []
    for s in range(min_scale, limit + 1):
        size = scale_table(factor)[s]
        st = int(float(F32(F32(size) * F32(step))) + 0.5)
        f = float(F32(np.power(np.float64(F32(factor)), np.float64(s))))
        scaled = [scale_rects(c.rects, f) if c.kind == 1 else None for c in cascade.common]
        ys = np.arange(0, H, st)
        ys = ys[ys + size < H]
        xs = np.arange(0, W, st)
        xs = xs[xs + size < W]
        if len(xs) == 0 or len(ys) == 0:
            continue
        gx, gy = np.meshgrid(xs, ys)
        acc, score, stage = classify(cascade, ii, gx.ravel(), gy.ravel(), size, scaled)
        acc = acc.reshape(gy.shape)
        score = score.reshape(gy.shape)
        stage = stage.reshape(gy.shape)
        skip = np.zeros(len(xs) + 1, np.int64)
        for j in range(len(ys)):
            for c in range(len(xs)):
                if skip[c] > 0:
                    skip[c] -= 1
                    continue
                if acc[j, c]:
                    x, y = int(xs[c]), int(ys[j])
                    hits.append((float(score[j, c]), x, y, x + size, y + size))
                elif stage[j, c] <= 9:
                    skip[c] = 1
                    skip[c + 1] = 1
    return hits


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument('payload', help='plain cascade payload, e.g. models/mdcb.bin')
    ap.add_argument('--image', help='gray-convertible image to search (needs cv2)')
    ap.add_argument('--min-scale', type=int, default=0)
    ap.add_argument('--max-scale', type=int, default=16)
    args = ap.parse_args(argv)
    with open(args.payload, 'rb') as f:
        casc = Cascade.unpack(f.read())
    kinds = [s.kind for s in casc.common]
    print('common stages %d (kind 0: %d, kind 1: %d, kind 2: %d), branches %d'
          % (len(casc.common), kinds.count(0), kinds.count(1), kinds.count(2), len(casc.branches)))
    if args.image:
        import cv2
        g = cv2.imread(args.image, cv2.IMREAD_GRAYSCALE)
        if g is None:
            print('cannot read %s' % args.image, file=sys.stderr)
            return 1
        for h in exhaustive_search(casc, g, args.min_scale, args.max_scale):
            print('%.6f %d %d %d %d' % h)
    return 0


if __name__ == '__main__':
    sys.exit(main())
