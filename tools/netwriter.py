#!/usr/bin/python3
"""Write the library's integer net blob and net container from plain weights.

Makes, from a description of a locally connected integer net (layer sizes,
transfer types, layer divisors, i32 biases, input scaling, and for every source
neuron its runs of i16 target weights, given as Python lists or numpy arrays),
the serialised net blob and the checksummed container that the library's
classifier reads, and runs the same description through a reference integer
forward pass with the library's 32-bit wrapping arithmetic, so that a training
script can check its quantised net exactly before it ships. As a program it
writes the mean-shape landmark container (`mean-shape`) or a seeded random
demo net with inputs and expected outputs for the C++ cross-check (`demo`).
Output is deterministic for the given arguments.
"""
import argparse
import math
import os
import random
import struct
import sys

import numpy as np

TXF_LINEAR, TXF_SIGMOID, TXF_SOFTMAX, TXF_ABS, TXF_SOFTMAX_PAIR = 0, 1, 4, 10, 11

# Relative landmark positions in a detector rectangle (x, y), part order:
# leftEye, rightEye, nose, leftMouthCorner, rightMouthCorner; "left" is the
# image-left point.
MEAN_SHAPE = [(0.30, 0.38), (0.70, 0.38), (0.50, 0.58), (0.35, 0.76), (0.65, 0.76)]


class Net:
    """A net description. spans[l][a] lists (first_target, weights) for source
    neuron a of layer l-1 (l >= 1); targets are absolute work-buffer indices."""

    def __init__(self, layer_sizes, transfer_types, divisors, version=12):
        self.version = version
        self.layer_sizes = [int(n) for n in layer_sizes]
        self.transfer_types = [int(t) for t in transfer_types]
        self.divisors = [int(d) for d in divisors]
        n = self.layer_sizes[0]
        self.biases = [None] * len(self.layer_sizes)
        self.input_divisors = [1] * n
        self.input_offsets = [0] * n
        self.input_means = [0] * n
        self.spans = [None] + [[[] for _ in range(self.layer_sizes[l - 1])]
                               for l in range(1, len(self.layer_sizes))]

    def layer_start(self, layer):
        return sum(self.layer_sizes[:layer])

    def set_dense(self, layer, weights, biases=None):
        """weights[target][source] (rows = layer's neurons), one span per source."""
        start = self.layer_start(layer)
        rows = [list(map(int, r)) for r in weights]
        if len(rows) != self.layer_sizes[layer]:
            raise ValueError("weight rows must match the layer size")
        for a in range(self.layer_sizes[layer - 1]):
            self.spans[layer][a] = [(start, [rows[t][a] for t in range(len(rows))])]
        self.biases[layer] = None if biases is None else [int(b) for b in biases]


def _check_i16(values):
    for v in values:
        if not -32768 <= v <= 32767:
            raise ValueError("weight %d outside i16" % v)


def write_blob(net):
    out = bytearray()

    def align(k):
        while len(out) % k:
            out.append(0)

    def u16(v, a=2):
        align(a)
        out.extend(struct.pack("<H", v & 0xFFFF))

    def u32(v, a=4):
        align(a)
        out.extend(struct.pack("<I", v & 0xFFFFFFFF))

    def i64(v, a=8):
        align(a)
        out.extend(struct.pack("<q", v))

    sizes = net.layer_sizes
    L, N = len(sizes), sizes[0]
    u16(net.version)
    if net.version > 9:
        u16(2)
    u16(0)
    u16(L)
    if net.version > 9:
        u32(0)
        for t in net.transfer_types:
            u32(t)
        for _ in range(L):
            u32(0)
    if net.version > 11:
        u32(0)
    else:
        u16(0, 4)
    u16(sum(sizes))
    for n in sizes:
        u16(n)
    for b in net.biases:
        u16(1 if b else 0)
    for d in net.divisors:
        u16(d)
    if net.version > 10:
        u16(8)
        u16(4)
        u16(2)
        for d in net.input_divisors:
            if d < 1:
                raise ValueError("input divisors must be at least 1")
            u32(d)
        for o in net.input_offsets:
            i64(o)
    for m in net.input_means:
        u32(m)
    stream = bytearray()
    records = []
    for l in range(1, L):
        if net.biases[l]:
            if len(net.biases[l]) != sizes[l]:
                raise ValueError("bias count must match the layer size")
            stream.extend(b"\0" * (len(stream) % 4))
            stream.extend(struct.pack("<%di" % sizes[l], *net.biases[l]))
        start = net.layer_start(l - 1)
        for a in range(sizes[l - 1]):
            if not net.spans[l][a]:
                raise ValueError("every source neuron needs a span (layer %d neuron %d)" % (l, a))
            for first, weights in net.spans[l][a]:
                weights = [int(w) for w in weights]
                _check_i16(weights)
                stream.extend(struct.pack("<%dh" % len(weights), *weights))
                records.append(((start + a) & 0xFFFF, first, first + len(weights) - 1))
    u32(len(stream))
    align(2)
    out.extend(stream)
    u32(len(records))
    align(2)
    for r in records:
        out.extend(struct.pack("<3H", *r))
    if net.version > 9:
        align(4)
        u32(len(out) + 4)
    return bytes(out)


def checksum(image):
    n = (len(image) - 16) // 8
    x = s = 0
    for i in range(n):
        (w,) = struct.unpack_from("<Q", image, 16 + 8 * i)
        x ^= w
        s = (s + w) & 0xFFFFFFFFFFFFFFFF
    return struct.pack("<QQ", x, s)


def write_container(items, kind=0):
    head = bytearray(72 + 16 * len(items))
    total = len(head) + sum(len(i) for i in items)
    struct.pack_into("<II", head, 16, 100, total)
    struct.pack_into("<II", head, 32, kind, len(items))
    offset = len(head)
    for k, item in enumerate(items):
        struct.pack_into("<I", head, 72 + 16 * k, offset)
        struct.pack_into("<I", head, 72 + 16 * k + 12, len(item))
        offset += len(item)
    image = bytearray(head + b"".join(items))
    image[0:16] = checksum(image)
    return bytes(image)


# ---- reference integer forward pass ------------------------------------------

def _wrap(v):
    v &= 0xFFFFFFFF
    return v - (1 << 32) if v & 0x80000000 else v


def _div(a, b):
    """C division: truncates toward zero."""
    q = abs(a) // abs(b)
    return q if (a >= 0) == (b > 0) else -q


_TABLE = [int(math.floor(65536.0 / (1.0 + math.exp(-9.0 * i / 256.0)) + 0.5)) for i in range(256)] + [0xFFFF]


def sigmoid16(x):
    a = abs(x)
    if a >= 0x90000:
        return 0 if x < 0 else 0x10000
    t = a * 256 // 9
    i, f = t >> 16, (t >> 8) & 255
    r = (_TABLE[i + 1] * f + _TABLE[i] * (256 - f)) >> 8
    return r if x >= 0 else 0x10000 - r


def exp16(x):
    if x >= 0:
        return 65536
    s = sigmoid16(x)
    return ((s * 65536) // (65536 - s)) & 0xFFFFFFFF


def _softmax(v, lo, n, divisor, best):
    m = divisor or 1
    if n == 1:
        best[0] = 1 if v[lo] > 0 else 0
        r = _div(10000 * sigmoid16(_div(v[lo], m)), 65535)
        v[lo + 1], v[lo] = r, 10000 - r
        return
    v[lo] = _div(v[lo], m)
    best[0] = 0
    if n < 2:
        return
    mx = v[lo]
    for i in range(1, n):
        v[lo + i] = _div(v[lo + i], m)
        if v[lo + i] > mx:
            mx, best[0] = v[lo + i], i
    total = 0
    for i in range(n):
        v[lo + i] = exp16(_wrap(v[lo + i] - mx))
        total += v[lo + i]
    total = _wrap(total)
    if total < 1:
        return
    for i in range(n):
        v[lo + i] = _div(10000 * v[lo + i], total)


def _transfer(kind, v, lo, n, divisor, best):
    m = divisor or 1
    if kind == TXF_LINEAR:
        for i in range(lo, lo + n):
            v[i] = _div(v[i], m)
    elif kind == TXF_ABS:
        for i in range(lo, lo + n):
            v[i] = _wrap(abs(_div(v[i], m)))
    elif kind == TXF_SOFTMAX:
        _softmax(v, lo, n, divisor, best)
    elif kind == TXF_SOFTMAX_PAIR:
        _softmax(v, lo, n // 2, divisor, best)
        _softmax(v, lo + n // 2, n // 2, divisor, best)
    else:
        for i in range(lo, lo + n):
            v[i] = sigmoid16(_div(v[i], m))


def reference_run(net, inputs):
    """Outputs (list of int) and best class of the library's integer run."""
    sizes = net.layer_sizes
    L = len(sizes)
    work = [0] * (sum(sizes) + 2)
    for i, x in enumerate(inputs[:sizes[0]]):
        x, mean = int(x), net.input_means[i]
        if net.version <= 10:
            work[i] = _wrap(x - mean)
        elif x == -2147483648:
            work[i] = _wrap(-mean)
        elif x == 2147483647:
            work[i] = _wrap(65535 - mean)
        else:
            num = ((x * 65535 - net.input_offsets[i] + (1 << 63)) % (1 << 64)) - (1 << 63)
            q = _div(num, net.input_divisors[i])
            work[i] = 65535 if (q < -65534 or q > 65535) else q
    best = [0]
    divisor = 1
    for l in range(1, L):
        t0, s0 = net.layer_start(l), net.layer_start(l - 1)
        careful = net.divisors[l] == 0
        divisor = 1 if careful else net.divisors[l]
        if net.biases[l]:
            for i, b in enumerate(net.biases[l]):
                work[t0 + i] = _wrap(work[t0 + i] + b)
        for a in range(sizes[l - 1]):
            act = work[s0 + a]
            if act == 0:
                continue
            for first, weights in net.spans[l][a]:
                for k, w in enumerate(weights):
                    if careful:
                        p = int(w) * work[s0 + a + k]
                        work[first + k] = max(-2147483648, min(2147483647, p))
                    else:
                        work[first + k] = _wrap(work[first + k] + act * int(w))
        if l + 1 < L:
            _transfer(net.transfer_types[l], work, t0, sizes[l], divisor, [0])
    last = net.layer_start(L - 1)
    _transfer(net.transfer_types[L - 1], work, last, sizes[L - 1], divisor, best)
    n = sizes[L - 1]
    if n == 1 and net.transfer_types[L - 1] == TXF_SOFTMAX:
        n = 2
    return work[last:last + n], best[0]


def _trunc_div(a, b):
    """C division of int64 arrays: truncates toward zero."""
    q = np.abs(a) // np.abs(b)
    return np.where((a >= 0) == (b > 0), q, -q)


def sigmoid16_batch(x):
    a = np.abs(x)
    t = a * 256 // 9
    i = np.minimum(t >> 16, 255)
    f = (t >> 8) & 255
    table = np.array(_TABLE, np.int64)
    r = (table[i + 1] * f + table[i] * (256 - f)) >> 8
    r = np.where(x >= 0, r, 0x10000 - r)
    return np.where(a >= 0x90000, np.where(x < 0, 0, 0x10000), r)


def dense_run_batch(net, inputs):
    """reference_run for many input rows at once, for nets made by quantise_mlp
    (version > 10, dense layers, sigmoid or linear, no accumulator that can wrap,
    which the quantiser guarantees). Callers check a few rows against
    reference_run, which stays the definition."""
    x = np.asarray(inputs, np.int64)
    num = x * 65535 - np.array(net.input_offsets, np.int64)
    q = _trunc_div(num, np.array(net.input_divisors, np.int64))
    act = np.where((q < -65534) | (q > 65535), 65535, q)
    for l in range(1, len(net.layer_sizes)):
        n, src = net.layer_sizes[l], net.layer_sizes[l - 1]
        w = np.zeros((src, n), np.int64)
        for a in range(src):
            (first, weights), = net.spans[l][a]
            w[a, first - net.layer_start(l):first - net.layer_start(l) + len(weights)] = weights
        acc = act @ w + (np.array(net.biases[l], np.int64) if net.biases[l] else 0)
        v = _trunc_div(acc, np.int64(net.divisors[l] or 1))
        act = sigmoid16_batch(v) if net.transfer_types[l] == TXF_SIGMOID else v
    return act


# ---- quantisation of a float MLP ---------------------------------------------

ACC_LIMIT = 2 ** 31 - 1


def quantise_mlp(layers, input_mean, input_std, spread=4.0, version=12):
    """Integer net from a float MLP trained on u = (x - mean) / (spread * std),
    clipped to [-1, 1], where x is the locator's input (pixel times the gain
    that makes the patch sum 211676).

    layers: list of (W, b, kind) with W[out][in] floats, b[out] floats, kind
    "sigmoid" (hidden) or "linear" (output in units of the rectangle, the
    locator divides the output by 65535). Every layer gets the largest weight
    scale S (also its divisor) for which the worst-case accumulator
    |bias| + sum |w| * max|activation| fits in 32 bits, so nothing can wrap.
    Inputs below -spread deviations saturate to +1 in the library: pick spread
    so that this is rare on the training set. Returns the net and the scales.
    """
    n = len(input_mean)
    net = Net([n] + [len(b) for _, b, _ in layers],
              [TXF_LINEAR] + [TXF_SIGMOID if k == "sigmoid" else TXF_LINEAR for _, _, k in layers],
              [1] * (len(layers) + 1), version)
    net.input_offsets = [int(round(m * 65535)) for m in input_mean]
    net.input_divisors = [max(1, int(round(spread * s))) for s in input_std]
    net.input_means = [0] * n
    scales = []
    act_max = 65535  # inputs and sigmoid outputs alike reach 1.0 in 16.16
    for l, (W, b, kind) in enumerate(layers, start=1):
        W = [[float(v) for v in row] for row in W]
        b = [float(v) for v in b]
        out_unit = 65536 if kind == "sigmoid" else 65535
        worst_w = max(sum(abs(v) for v in row) for row in W) or 1e-9
        worst_b = max(abs(v) for v in b) if b else 0.0
        # S * (worst_w * act_max + worst_b * out_unit) <= ACC_LIMIT, S <= 65535, |w| <= 32767
        s = min(65535.0, ACC_LIMIT / (worst_w * act_max + worst_b * out_unit + 1),
                32767.0 / max(max(abs(v) for row in W for v in row), 1e-9))
        s = int(s)
        if s < 16:
            raise ValueError("layer %d: weights too large for 16-bit weights and 32-bit sums" % l)
        # The activation unit is 65535 or 65536; out = acc / S in out_unit.
        rows = [[int(round(v * s * out_unit / (act_max + 1))) for v in row] for row in W]
        biases = [int(round(v * s * out_unit)) for v in b]
        for r, bias in zip(rows, biases):
            if sum(abs(w) for w in r) * act_max + abs(bias) > ACC_LIMIT:
                raise ValueError("layer %d: accumulator could overflow" % l)
        net.set_dense(l, rows, biases)
        net.divisors[l] = s
        scales.append(s)
    return net, scales


# ---- programs ----------------------------------------------------------------

def mean_shape_net(side=8):
    """A landmark net that places the mean shape in every box: zero weights,
    the shape in the biases of a linear output layer (value * 65535)."""
    net = Net([side * side, 10], [TXF_LINEAR, TXF_LINEAR], [1, 1])
    biases = [int(round(c * 65535)) for p in MEAN_SHAPE for c in p]
    net.set_dense(1, [[0] * (side * side) for _ in range(10)], biases)
    return net


def demo_net(seed):
    """A random float MLP 9-6-4 quantised, plus odd parts the quantiser never
    makes (an absolute, saturating layer and a soft-max), for the cross-check."""
    rnd = random.Random(seed)
    float_layers = [([[rnd.uniform(-1, 1) for _ in range(9)] for _ in range(6)], [rnd.uniform(-.5, .5) for _ in range(6)], "sigmoid"),
                    ([[rnd.uniform(-1, 1) for _ in range(6)] for _ in range(4)], [rnd.uniform(0, .5) for _ in range(4)], "linear")]
    q, _ = quantise_mlp(float_layers, [rnd.uniform(100, 900) for _ in range(9)], [rnd.uniform(20, 300) for _ in range(9)])
    net = Net([9, 6, 5, 4], [0, TXF_SIGMOID, TXF_ABS, TXF_SOFTMAX], [1, q.divisors[1], 0, 65535])
    net.input_divisors, net.input_offsets = q.input_divisors, q.input_offsets
    net.input_means = [rnd.randint(-500, 500) for _ in range(9)]
    net.spans[1], net.biases[1] = q.spans[1], q.biases[1]
    for l, r in ((2, 20), (3, 200)):
        rows = [[rnd.randint(-r, r) for _ in range(net.layer_sizes[l - 1])] for _ in range(net.layer_sizes[l])]
        net.set_dense(l, rows, [rnd.randint(-30000, 30000) for _ in range(net.layer_sizes[l])] if l != 2 else None)
    # Split one neuron's run in two to cover several spans per source.
    first, weights = net.spans[2][1][0]
    net.spans[2][1] = [(first, weights[:2]), (first + 2, weights[2:])]
    return net


def float_mlp_run(layers, input_mean, input_std, spread, x):
    u = [max(-1.0, min(1.0, (xi - m) / (spread * s))) for xi, m, s in zip(x, input_mean, input_std)]
    for W, b, kind in layers:
        u = [sum(w * v for w, v in zip(row, u)) + bb for row, bb in zip(W, b)]
        if kind == "sigmoid":
            u = [1.0 / (1.0 + math.exp(-v)) for v in u]
    return u


def check_quantiser(seed=5, trials=200):
    """Largest error, in rectangle units, of a quantised random landmark MLP."""
    rnd = random.Random(seed)
    n, h = 64, 16
    mean = [rnd.uniform(100, 900) for _ in range(n)]
    std = [rnd.uniform(20, 300) for _ in range(n)]
    layers = [([[rnd.gauss(0, .3) for _ in range(n)] for _ in range(h)], [rnd.gauss(0, .3) for _ in range(h)], "sigmoid"),
              ([[rnd.gauss(0, .3) for _ in range(h)] for _ in range(10)], [rnd.uniform(.2, .8) for _ in range(10)], "linear")]
    net, _ = quantise_mlp(layers, mean, std)
    worst = 0.0
    for _ in range(trials):
        x = [int(rnd.gauss(m, s)) for m, s in zip(mean, std)]
        want = float_mlp_run(layers, mean, std, 4.0, x)
        got, _ = reference_run(net, x)
        worst = max(worst, max(abs(g / 65535.0 - w) for g, w in zip(got, want)))
    return worst


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    sub = ap.add_subparsers(dest="command", required=True)
    m = sub.add_parser("mean-shape", help="write the mean-shape landmark container")
    m.add_argument("--out", required=True, help="container file to write")
    m.add_argument("--side", type=int, default=8, help="side of the input patch (default 8)")
    d = sub.add_parser("demo", help="write a random net container, inputs and expected outputs")
    d.add_argument("--out-dir", required=True)
    d.add_argument("--seed", type=int, default=1)
    d.add_argument("--cases", type=int, default=25)
    sub.add_parser("check-quant", help="print the worst error of a quantised random landmark MLP")
    args = ap.parse_args(argv)
    if args.command == "check-quant":
        print("worst output error %.6f of the rectangle" % check_quantiser())
        return 0
    if args.command == "mean-shape":
        with open(args.out, "wb") as f:
            f.write(write_container([write_blob(mean_shape_net(args.side))]))
        return 0
    os.makedirs(args.out_dir, exist_ok=True)
    net = demo_net(args.seed)
    with open(os.path.join(args.out_dir, "demo_net.bin"), "wb") as f:
        f.write(write_container([write_blob(net)]))
    rnd = random.Random(args.seed + 1)
    with open(os.path.join(args.out_dir, "demo_cases.txt"), "w") as f:
        for c in range(args.cases):
            inputs = [rnd.randint(-3000, 3000) if c % 5 else rnd.randint(-2 ** 31, 2 ** 31 - 1) for _ in range(9)]
            outputs, best = reference_run(net, inputs)
            f.write(" ".join(map(str, inputs)) + " | " + " ".join(map(str, outputs)) + " | %d\n" % best)
    return 0


if __name__ == "__main__":
    sys.exit(main())
