#!/usr/bin/python3
"""Trains the built-in landmark net (models/mdnb.bin) on our own detector's faces.

Input: the merged hits of our detector (labels/hits.tsv of the data cache, written by
tools/dump_hits), the teacher faces with their 68 points (labels/faces.jsonl, written by
tools/label_faces) and the fixed split tools/data_split.json. A hit on a face photo or
clip frame that overlaps a teacher face with IoU >= 0.4 is a sample: the five points are
the means of the two eye contours (points 36-41 and 42-47), the nose tip (30) and the
outer mouth corners (48, 54); "left" is always the point on the image's left.

Each sample is rebuilt as the library sees it: the frame shrunk by nearest neighbour to
the work size the hit was found at, the hit's rectangle cut out and sampled to an s x s
patch with the locator's index rule, and the patch scaled to sum to 211676. Training
samples are augmented (rotation up to 30 degrees about the face, box shift and size
jitter, mirroring with swapped labels, brightness, contrast, blur, noise). The net is one
sigmoid hidden layer and ten linear outputs (x, y of the five points in units of the
rectangle), trained in float with torch, then quantised with tools/netwriter.py so that
no 32-bit accumulator can overflow; the held-out ("report") figures are computed with the
reference integer forward pass, i.e. bit for bit what the library computes.
Deterministic: fixed seeds, one thread.
"""
import argparse
import json
import math
import os
import sys
import time

import cv2
import numpy as np
import torch

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.insert(0, HERE)
import netwriter as nw  # noqa: E402
import train_postfilter as tp  # noqa: E402

PATCH_SUM = 211676.0
FLIP = [1, 0, 2, 4, 3]  # leftEye <-> rightEye, mouth corners swapped


def five_points(p68):
    p = np.asarray(p68, dtype=np.float64)
    pts = np.array([p[36:42].mean(0), p[42:48].mean(0), p[30], p[48], p[54]])
    # Image-left first, whatever the teacher's order.
    if pts[0, 0] > pts[1, 0]:
        pts[[0, 1]] = pts[[1, 0]]
    if pts[3, 0] > pts[4, 0]:
        pts[[3, 4]] = pts[[4, 3]]
    return pts


def shrink(gray, long_side):
    """The detect entries' work frame: nearest neighbour, sizes truncated."""
    h, w = gray.shape
    if max(w, h) <= long_side:
        return gray, 1.0
    s = np.float32(long_side) / np.float32(max(w, h))
    nw_, nh = int(s * np.float32(w)), int(s * np.float32(h))
    ys = (np.arange(nh) * h) // nh
    xs = (np.arange(nw_) * w) // nw_
    return gray[ys][:, xs], nw_ / w


def patch_input(frame, box, side):
    """The locator's net input for an integer box (left, top, right, bottom)."""
    l, t, r, b = box
    w, h = r - l, b - t
    ys = t + (np.arange(side) * h) // side
    xs = l + (np.arange(side) * w) // side
    patch = frame[ys][:, xs].astype(np.float32)
    total = np.float32(patch.sum())
    gain = np.float32(PATCH_SUM) / max(total, np.float32(1.0))
    return np.trunc(patch * gain).ravel()


def load_samples(data, split):
    faces = {}
    for line in open(os.path.join(data, 'labels', 'faces.jsonl')):
        e = json.loads(line)
        faces[e['image']] = e['faces']
    samples = []
    for line in open(os.path.join(data, 'labels', 'hits.tsv')):
        img, variant, long_side, best, _score, l, t, r, b = line.rstrip('\n').split('\t')
        if variant != '-' or float(best) < 0.4:
            continue
        which, kind = tp.split_of(img, split)
        if which is None or kind != 'face':
            continue
        box = np.array([float(l), float(t), float(r), float(b)])
        refs = faces.get(img, [])
        if not refs:
            continue
        ious = [tp_iou(box, f['rect']) for f in refs]
        ref = refs[int(np.argmax(ious))]
        samples.append({'image': img, 'long': int(long_side), 'box': box, 'pts': five_points(ref['points']),
                        'split': which})
    return samples


def identity_of(image, split):
    folder, _, rest = image.partition('/')
    if folder == 'photos':
        return split['photos'][rest]['identity']
    return split['clips'][rest.split('/')[0]]['identity']


def tp_iou(a, b):
    w = min(a[2], b[2]) - max(a[0], b[0])
    h = min(a[3], b[3]) - max(a[1], b[1])
    if w <= 0 or h <= 0:
        return 0.0
    i = w * h
    return i / ((a[2] - a[0]) * (a[3] - a[1]) + (b[2] - b[0]) * (b[3] - b[1]) - i)


class Frames:
    """Work frames by (image, long side), decoded once."""

    def __init__(self, data):
        self.data, self.cache = data, {}

    def get(self, image, long_side):
        key = (image, long_side)
        if key not in self.cache:
            gray = cv2.imread(os.path.join(self.data, image), cv2.IMREAD_GRAYSCALE)
            self.cache[key] = shrink(gray, long_side)
        return self.cache[key]


def plain_example(frames, s, side):
    frame, scale = frames.get(s['image'], s['long'])
    box = np.round(s['box'] * scale).astype(int)
    box[[0, 1]] = np.maximum(box[[0, 1]], 0)
    box[2] = min(box[2], frame.shape[1])
    box[3] = min(box[3], frame.shape[0])
    pts = s['pts'] * scale
    return patch_input(frame, box, side), box, pts


def augmented_example(frames, s, side, rng):
    frame, scale = frames.get(s['image'], s['long'])
    box = s['box'] * scale
    pts = s['pts'] * scale
    cx, cy = (box[0] + box[2]) / 2, (box[1] + box[3]) / 2
    size = box[2] - box[0]
    angle = rng.uniform(-30, 30)
    m = cv2.getRotationMatrix2D((cx, cy), angle, 1.0)
    img = cv2.warpAffine(frame, m, (frame.shape[1], frame.shape[0]), flags=cv2.INTER_LINEAR,
                         borderMode=cv2.BORDER_REFLECT)
    pts = np.hstack([pts, np.ones((5, 1))]) @ m.T
    # The detector's box wanders by about a tenth of its size and a step in scale.
    size2 = size * rng.uniform(0.88, 1.14)
    cx2 = cx + rng.uniform(-0.09, 0.09) * size
    cy2 = cy + rng.uniform(-0.09, 0.09) * size
    box2 = np.round([cx2 - size2 / 2, cy2 - size2 / 2, cx2 + size2 / 2, cy2 + size2 / 2]).astype(int)
    if box2[0] < 0 or box2[1] < 0 or box2[2] > img.shape[1] or box2[3] > img.shape[0] or box2[2] - box2[0] < 8:
        return None
    crop = img[box2[1]:box2[3], box2[0]:box2[2]].astype(np.float32)
    pts = pts - box2[:2]
    w = box2[2] - box2[0]
    if rng.random() < 0.5:
        crop = crop[:, ::-1]
        pts = pts[FLIP].copy()
        pts[:, 0] = w - pts[:, 0]
    if rng.random() < 0.3:
        k = rng.choice([3, 5])
        crop = cv2.GaussianBlur(crop, (k, k), 0)
    crop = crop * rng.uniform(0.6, 1.4) + rng.uniform(-40, 40)
    crop = crop + rng.normal(0, rng.uniform(0, 8), crop.shape)
    crop = np.clip(crop, 0, 255).astype(np.uint8)
    x = patch_input(crop, (0, 0, crop.shape[1], crop.shape[0]), side)
    return x, np.array([0, 0, w, box2[3] - box2[1]]), pts


def relative(pts, box):
    w, h = box[2] - box[0], box[3] - box[1]
    return np.stack([(pts[:, 0] - box[0]) / w, (pts[:, 1] - box[1]) / h], 1).ravel()


def nme(pred_rel, box, pts):
    w, h = box[2] - box[0], box[3] - box[1]
    p = pred_rel.reshape(5, 2) * [w, h] + box[:2]
    iod = np.linalg.norm(pts[0] - pts[1])
    return np.linalg.norm(p - pts, axis=1).mean() / iod


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0],
                                 epilog='Defaults reproduce models/mdnb.bin from the mined hits and labels.')
    ap.add_argument('--data', default=tp.data_dir())
    ap.add_argument('--split', default=os.path.join(HERE, 'data_split.json'))
    ap.add_argument('--out', default=os.path.join(HERE, '..', 'models', 'mdnb.bin'))
    ap.add_argument('--side', type=int, default=16, help='patch side (the net has side^2 inputs)')
    ap.add_argument('--hidden', type=int, default=48)
    ap.add_argument('--samples', type=int, default=24000, help='augmented training samples')
    ap.add_argument('--epochs', type=int, default=60)
    ap.add_argument('--seed', type=int, default=7)
    ap.add_argument('--keep-net', action='store_true', help='write the trained net even when it loses to the mean shape')
    ap.add_argument('--decay', type=float, default=1e-5, help='weight decay')
    args = ap.parse_args(argv)
    torch.manual_seed(args.seed)
    torch.set_num_threads(1)
    rng = np.random.default_rng(args.seed)

    split = json.load(open(args.split))
    samples = load_samples(args.data, split)
    train = [s for s in samples if s['split'] == 'train']
    report = [s for s in samples if s['split'] == 'report']
    frames = Frames(args.data)

    xs, ys = [], []
    for s in train:  # every plain sample once, then augmented draws
        x, box, pts = plain_example(frames, s, args.side)
        xs.append(x)
        ys.append(relative(pts, box))
    # Draws go to identities evenly: two clips of one person would otherwise
    # teach the net that person's face instead of faces.
    groups = {}
    for s in train:
        groups.setdefault(identity_of(s['image'], split), []).append(s)
    keys = sorted(groups)
    while len(xs) < args.samples:
        group = groups[keys[rng.integers(len(keys))]]
        e = augmented_example(frames, group[rng.integers(len(group))], args.side, rng)
        if e is not None:
            xs.append(e[0])
            ys.append(relative(e[2], e[1]))
    X, Y = np.array(xs, np.float64), np.array(ys, np.float64)
    mean, std = X.mean(0), X.std(0) + 1.0
    spread = 6.0
    U = net_inputs(X, mean, std, spread)

    model = torch.nn.Sequential(torch.nn.Linear(U.shape[1], args.hidden), torch.nn.Sigmoid(),
                                torch.nn.Linear(args.hidden, 10))
    with torch.no_grad():
        model[2].bias.copy_(torch.tensor(Y.mean(0)))
    opt = torch.optim.Adam(model.parameters(), lr=3e-3, weight_decay=args.decay)
    sched = torch.optim.lr_scheduler.CosineAnnealingLR(opt, args.epochs)
    ut, yt = torch.tensor(U, dtype=torch.float32), torch.tensor(Y, dtype=torch.float32)
    t0 = time.time()
    for epoch in range(args.epochs):
        perm = torch.randperm(len(ut))
        for k in range(0, len(ut), 128):
            i = perm[k:k + 128]
            loss = torch.nn.functional.smooth_l1_loss(model(ut[i]), yt[i], beta=0.02)
            opt.zero_grad()
            loss.backward()
            opt.step()
        sched.step()
    print('trained %d samples (%d plain) for %d epochs in %.0f s' % (len(U), len(train), args.epochs, time.time() - t0))

    layers = [(model[0].weight.detach().double().numpy(), model[0].bias.detach().double().numpy(), 'sigmoid'),
              (model[2].weight.detach().double().numpy(), model[2].bias.detach().double().numpy(), 'linear')]
    net, scales = nw.quantise_mlp(layers, list(mean), list(std), spread=spread)
    blob = nw.write_blob(net)
    with open(args.out, 'wb') as f:
        f.write(nw.write_container([blob]))

    # Overflow check over the whole training set: the quantiser bounds the worst
    # case; also count inputs that fall below -1 (they saturate to +1).
    low = float((((X - mean) / (spread * std)) < -1).mean())
    mean_shape = Y[:len(train)].mean(0)

    def evaluate(subset):
        got, base, gaps = [], [], []
        for s in subset:
            x, box, pts = plain_example(frames, s, args.side)
            out, _ = nw.reference_run(net, [int(v) for v in x])
            pred = np.array(out, np.float64) / 65535.0
            fl = float_predict(model, x, mean, std, spread)
            gaps.append(np.abs(pred - fl).max())
            got.append(nme(pred, box, pts))
            base.append(nme(mean_shape, box, pts))
        return np.mean(got), np.mean(base), np.max(gaps)

    print('%s: %d bytes, patch %dx%d, hidden %d, layer scales %s, inputs below -1: %.3f%%'
          % (os.path.normpath(args.out), os.path.getsize(args.out), args.side, args.side, args.hidden, scales,
             100 * low))
    print('%-8s %6s %10s %12s %12s %14s' % ('split', 'faces', 'NME net', 'NME mean', 'better by', 'int vs float'))
    figures = {}
    for name, subset in (('train', train), ('report', report)):
        a, b, g = evaluate(subset)
        figures[name] = (a, b)
        print('%-8s %6d %10.4f %12.4f %11.1f%% %14.5f' % (name, len(subset), a, b, 100 * (1 - a / b), g))
    if report and figures['report'][0] >= figures['report'][1] and not args.keep_net:
        # A net that places the points worse than the average shape on people
        # it hasn't seen must not ship: the learnt mean shape goes instead.
        with open(args.out, 'wb') as f:
            f.write(nw.write_container([nw.write_blob(mean_shape_net(mean_shape))]))
        print('the net is no better than the mean shape on the report split: wrote the learnt mean shape '
              '(%s) to %s' % (' '.join('%.4f' % v for v in mean_shape), os.path.normpath(args.out)))
    return 0


def mean_shape_net(shape, side=8):
    """Zero weights and the shape (x, y of the five points in units of the
    rectangle) in the biases of a linear output layer."""
    net = nw.Net([side * side, 10], [nw.TXF_LINEAR, nw.TXF_LINEAR], [1, 1])
    net.set_dense(1, [[0] * (side * side) for _ in range(10)], [int(round(v * 65535)) for v in shape])
    return net


def net_inputs(x, mean, std, spread):
    """The integer net's input scaling in float: values far below the mean
    wrap to full scale there, so the float net sees them the same way."""
    u = (x - mean) / (spread * std)
    return np.where(u < -65534.0 / 65535.0, 1.0, np.minimum(u, 1.0))


def float_predict(model, x, mean, std, spread):
    u = net_inputs(x, mean, std, spread)
    with torch.no_grad():
        return model(torch.tensor(u[None], dtype=torch.float32)).numpy()[0].astype(np.float64)


if __name__ == '__main__':
    sys.exit(main())
