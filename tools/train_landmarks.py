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
jitter, mirroring with swapped labels, brightness, contrast, blur, noise). The net has
sigmoid hidden layers (--hidden) and ten linear outputs (x, y of the five points in units of the
rectangle), trained in float with torch, then quantised with tools/netwriter.py so that
no 32-bit accumulator can overflow; the held-out ("report") figures are computed with the
reference integer forward pass, i.e. bit for bit what the library computes.
Deterministic: fixed seeds, one thread.
"""
import argparse
import hashlib
import json
import math
import os
import re
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
    """Work frames by (folder, image, long side), decoded once."""

    def __init__(self):
        self.cache = {}

    def get(self, root, image, long_side):
        key = (root, image, long_side)
        if key not in self.cache:
            gray = cv2.imread(os.path.join(root, image), cv2.IMREAD_GRAYSCALE)
            self.cache[key] = shrink(gray, long_side)
        return self.cache[key]


def plain_example(frames, s, side):
    frame, scale = frames.get(s['root'], s['image'], s['long'])
    box = np.round(s['box'] * scale).astype(int)
    box[[0, 1]] = np.maximum(box[[0, 1]], 0)
    box[2] = min(box[2], frame.shape[1])
    box[3] = min(box[3], frame.shape[0])
    pts = s['pts'] * scale
    return patch_input(frame, box, side), box, pts


def turned_example(frames, s, side, angle):
    """The plain example with the frame turned by `angle` degrees about the box
    centre: the box stays (the detector reports the axis-aligned square of a
    turned face, centred as the upright one), the points turn."""
    frame, scale = frames.get(s['root'], s['image'], s['long'])
    box = s['box'] * scale
    cx, cy = (box[0] + box[2]) / 2, (box[1] + box[3]) / 2
    m = cv2.getRotationMatrix2D((cx, cy), angle, 1.0)
    img = cv2.warpAffine(frame, m, (frame.shape[1], frame.shape[0]), flags=cv2.INTER_LINEAR,
                         borderMode=cv2.BORDER_REFLECT)
    pts = np.hstack([s['pts'] * scale, np.ones((5, 1))]) @ m.T
    box = np.round(box).astype(int)
    box[[0, 1]] = np.maximum(box[[0, 1]], 0)
    box[2] = min(box[2], img.shape[1])
    box[3] = min(box[3], img.shape[0])
    return patch_input(img, box, side), box, pts


def person_of(image):
    """The identity of a many-identity photo: the LFW folder or the Congress id."""
    parts = image.split('/')
    return parts[2] if parts[1] == 'lfw' else os.path.splitext(parts[2])[0]


def report_person(person, share=15):
    """Fixed by-identity split: about share% of the people, by a hash of the name."""
    return int(hashlib.sha256(person.encode()).hexdigest()[:8], 16) % 100 < share


def read_five_points(path):
    """Human-placed five points by cache-relative image path (photos/lfw/...)."""
    out = {}
    if not path or not os.path.exists(path):
        return out
    for line in open(path).readlines()[1:]:
        f = line.rstrip('\n').split('\t')
        out['photos/' + f[0]] = np.array([float(v) for v in f[1:11]]).reshape(5, 2)
    return out


def read_faces(data):
    faces = {}
    for line in open(os.path.join(data, 'labels', 'faces.jsonl')):
        e = json.loads(line)
        faces[e['image']] = e['faces']
    return faces


def plain_hits(data):
    """Merged hits on unturned, unmirrored frames, one per image and box."""
    seen, out = set(), []
    for line in open(os.path.join(data, 'labels', 'hits.tsv')):
        img, variant, long_side, best, _score, l, t, r, b = line.rstrip('\n').split('\t')[:9]
        if variant != '-' or float(best) < 0.4:
            continue
        key = (img, l, t, r, b)
        if key not in seen:
            seen.add(key)
            out.append((img, int(long_side), float(best), np.array([float(l), float(t), float(r), float(b)])))
    return out


def load_dev_samples(data, split):
    faces = read_faces(data)
    samples = []
    for img, long_side, _best, box in plain_hits(data):
        which, kind = tp.split_of(img, split)
        if which is None or kind != 'face' or not faces.get(img):
            continue
        refs = faces[img]
        ref = refs[int(np.argmax([tp_iou(box, f['rect']) for f in refs]))]
        samples.append({'root': data, 'image': img, 'long': long_side, 'box': box, 'pts': five_points(ref['points']),
                        'split': which, 'who': 'dev:' + identity_of(img, split), 'human': False,
                        'source': 'dev'})
    return samples


def load_face_samples(faces_dir, human, sources):
    """Samples of the many-identity folder. The person of a photo is the face nearest
    its centre; that face takes the human points where they exist."""
    faces = read_faces(faces_dir)
    by_image = {}
    for img, long_side, _best, box in plain_hits(faces_dir):
        if img.split('/')[1] in sources and faces.get(img):
            by_image.setdefault(img, []).append((long_side, box))
    samples, offsets = [], []
    for img in sorted(by_image):
        hits = by_image[img]
        refs = faces[img]
        gray_shape = (250, 200) if img.split('/')[1] == 'congress' else (200, 200)
        centre = np.array([gray_shape[1] / 2, gray_shape[0] / 2])
        dist = [np.linalg.norm((box[:2] + box[2:]) / 2 - centre) for _, box in hits]
        central = int(np.argmin(dist))
        who = person_of(img)
        for k, (long_side, box) in enumerate(hits):
            pts, is_human = None, False
            ref = refs[int(np.argmax([tp_iou(box, f['rect']) for f in refs]))]
            if k == central and img in human:
                h = human[img]
                mid = (h[0] + h[1]) / 2
                if box[0] <= mid[0] < box[2] and box[1] <= mid[1] < box[3]:
                    pts, is_human = h.copy(), True
                    offsets.append(relative(pts, box) - relative(five_points(ref['points']), box))
            if pts is None:
                pts = five_points(ref['points'])
            samples.append({'root': faces_dir, 'image': img, 'long': long_side, 'box': box, 'pts': pts,
                            'split': 'report' if report_person(who) else 'train', 'who': who,
                            'human': is_human, 'central': k == central, 'source': img.split('/')[1]})
    return samples, (np.mean(offsets, 0) if offsets else np.zeros(10))


# The five points of a frontal upright face in our box (units of its side, from
# its centre; the mean of the human-labelled near-frontal training faces, made
# symmetric), and their depth in front of the head's vertical axis.
FRONTAL = np.array([[-0.186, -0.103], [0.186, -0.103], [0.0, 0.112], [-0.163, 0.29], [0.163, 0.29]])
DEPTH = np.array([0.30, 0.30, 0.45, 0.28, 0.28])
# The visible face's outline (cheeks, brow, chin, nose) as (x, y, depth), which
# the head-pose boxes frame.
OUTLINE = np.array([[-0.38, 0.1, 0.0], [0.38, 0.1, 0.0], [0.0, -0.25, 0.25], [0.0, 0.45, 0.2], [0.0, 0.112, 0.45]])


def pose_points(yaw, pitch):
    """Best-guess five points of a head turned by yaw (< 0: the nose to the
    image's right) and pitch (< 0: looking down), in units of the box side from
    the centre of the box that frames its visible face: the frontal points
    turned about the head's axes, hidden ones included, recentred as the box
    follows the visible outline. The eyes stay level, so the roll is 0."""
    a, b = math.radians(-yaw), math.radians(-pitch)

    def turn(x, y, z):
        # the nod about the head's own ear-to-ear axis first, then the turn
        # about the vertical: the eyes stay level whatever the pitch
        y1 = y * math.cos(b) + z * math.sin(b)
        z1 = -y * math.sin(b) + z * math.cos(b)
        return x * math.cos(a) + z1 * math.sin(a), y1

    pts = np.array([turn(x, y, z) for (x, y), z in zip(FRONTAL, DEPTH)])
    # the hidden eye and mouth corner kept a little toward the nose, so the
    # eye line (the reported roll) stays defined on a full profile
    far = 1 if yaw < 0 else 0
    for pair, least in (((0, 1), 0.22), ((3, 4), 0.12)):
        near = pair[1 - far]
        gap = pts[pair[1], 0] - pts[pair[0], 0]
        if gap < least:
            pts[pair[far], 0] = pts[near, 0] + (least if far == 1 else -least)
    out = np.array([turn(*o) for o in OUTLINE])
    centre = (out.min(0) + out.max(0)) / 2 - (OUTLINE[:, :2].min(0) + OUTLINE[:, :2].max(0)) / 2
    return pts - centre


def load_pose_samples(pose_dir, report_people=(3, 6, 9, 12)):
    """The head-pose photos (a folder made by `train_cascade pose-boxes --jsonl`)
    with best-guess points (pose_points) in their labelled boxes, split by person."""
    samples = []
    for line in open(os.path.join(pose_dir, 'labels', 'faces.jsonl')):
        e = json.loads(line)
        name = os.path.basename(e['image'])
        # personPPSNN, then the pitch and the yaw with their signs: person03144+0-30.jpg
        person, pitch, yaw = (int(v) for v in re.match(r'person(\d\d)\d{3}([+-]\d+)([+-]\d+)', name).groups())
        box = np.array(e['faces'][0]['rect'])
        side = box[2] - box[0]
        pts = (box[:2] + box[2:]) / 2 + pose_points(yaw, pitch) * side
        samples.append({'root': pose_dir, 'image': e['image'], 'long': 640, 'box': box, 'pts': pts,
                        'split': 'report' if person in report_people else 'train', 'who': 'pose:%d' % person,
                        'human': False, 'source': 'pose', 'yaw': yaw})
    return samples


def move_teacher_points(samples, offset):
    """Teacher points moved by the mean human-minus-teacher offset (in units of the
    box): the two place the eyes and mouth corners a little differently, and a net
    trained on a mix would learn neither."""
    for s in samples:
        if not s['human']:
            w, h = s['box'][2] - s['box'][0], s['box'][3] - s['box'][1]
            s['pts'] = s['pts'] + offset.reshape(5, 2) * [w, h]


def augmented_example(frames, s, side, rng, roll_range=0.0):
    """A training draw: the face turned in the plane, the box moved and resized as
    the detector's box varies, mirrored, with other light, blur and noise."""
    frame, scale = frames.get(s['root'], s['image'], s['long'])
    box = s['box'] * scale
    pts = s['pts'] * scale
    cx, cy = (box[0] + box[2]) / 2, (box[1] + box[3]) / 2
    size = box[2] - box[0]
    angle = float(np.clip(rng.normal(0, 10), -30, 30))
    if roll_range > 0 and rng.random() < 0.5:
        # half the draws over the whole roll range the cascade's branches find
        angle = float(rng.uniform(-roll_range, roll_range))
    m = cv2.getRotationMatrix2D((cx, cy), angle, 1.0)
    img = cv2.warpAffine(frame, m, (frame.shape[1], frame.shape[0]), flags=cv2.INTER_LINEAR,
                         borderMode=cv2.BORDER_REFLECT)
    pts = np.hstack([pts, np.ones((5, 1))]) @ m.T
    size2 = size * math.exp(rng.uniform(-0.1, 0.1))
    cx2 = cx + rng.uniform(-0.07, 0.07) * size
    cy2 = cy + rng.uniform(-0.07, 0.07) * size
    box2 = np.round([cx2 - size2 / 2, cy2 - size2 / 2, cx2 + size2 / 2, cy2 + size2 / 2]).astype(int)
    if box2[0] < 0 or box2[1] < 0 or box2[2] > img.shape[1] or box2[3] > img.shape[0] or box2[2] - box2[0] < 8:
        return None
    crop = img[box2[1]:box2[3], box2[0]:box2[2]].astype(np.float32)
    pts = pts - box2[:2]
    w = box2[2] - box2[0]
    if rng.random() < 0.5:
        crop = crop[:, ::-1]
        pts = pts[FLIP].copy()
        pts[:, 0] = w - 1 - pts[:, 0]
    if rng.random() < 0.25:
        crop = cv2.GaussianBlur(crop, (3, 3), 0)
    crop = crop * rng.uniform(0.6, 1.4) + rng.uniform(-40, 40)
    crop = crop + rng.normal(0, rng.uniform(0, 6), crop.shape)
    crop = np.clip(crop, 0, 255).astype(np.uint8)
    x = patch_input(crop, (0, 0, crop.shape[1], crop.shape[0]), side)
    return x, np.array([0, 0, w, box2[3] - box2[1]]), pts


def relative(pts, box):
    w, h = box[2] - box[0], box[3] - box[1]
    return np.stack([(pts[:, 0] - box[0]) / w, (pts[:, 1] - box[1]) / h], 1).ravel()


def absolute(rel, box):
    return rel.reshape(5, 2) * [box[2] - box[0], box[3] - box[1]] + box[:2]


def point_errors(pred_rel, box, pts):
    """(NME over the eye distance, roll error in degrees) of one face."""
    p = absolute(pred_rel, box)
    iod = np.linalg.norm(pts[0] - pts[1])
    roll = lambda q: math.degrees(math.atan2(q[1, 1] - q[0, 1], q[1, 0] - q[0, 0]))
    d = abs(roll(p) - roll(pts))
    return np.linalg.norm(p - pts, axis=1).mean() / iod, min(d, 360 - d)


def build_training_set(train, frames, side, draws, rng, roll_range=0.0):
    xs, ys = [], []
    for s in train:  # every plain sample once, then augmented draws
        x, box, pts = plain_example(frames, s, side)
        xs.append(x)
        ys.append(relative(pts, box))
        for _ in range(draws):
            e = augmented_example(frames, s, side, rng, roll_range)
            if e is not None:
                xs.append(e[0])
                ys.append(relative(e[2], e[1]))
    return np.array(xs, np.float32), np.array(ys, np.float32)


def make_model(inputs, hidden):
    layers = []
    for n in hidden:
        layers += [torch.nn.Linear(inputs, n), torch.nn.Sigmoid()]
        inputs = n
    return torch.nn.Sequential(*layers, torch.nn.Linear(inputs, 10))


def train_net(model, U, Y, args, work):
    """Adam with a cosine schedule; a checkpoint after every epoch lets a run that was
    cut off go on where it stopped."""
    opt = torch.optim.Adam(model.parameters(), lr=args.lr, weight_decay=args.decay)
    sched = torch.optim.lr_scheduler.CosineAnnealingLR(opt, args.epochs)
    ckpt = os.path.join(work, 'checkpoint.pt')
    first = 0
    if os.path.exists(ckpt):
        state = torch.load(ckpt)
        if state['tag'] == run_tag(args):
            model.load_state_dict(state['model'])
            opt.load_state_dict(state['opt'])
            sched.load_state_dict(state['sched'])
            first = state['epoch']
            print('resuming after epoch %d' % first)
    ut, yt = torch.tensor(U), torch.tensor(Y)
    for epoch in range(first, args.epochs):
        t0 = time.time()
        g = torch.Generator().manual_seed(args.seed * 1000 + epoch)
        perm = torch.randperm(len(ut), generator=g)
        total = 0.0
        for k in range(0, len(ut), args.batch):
            i = perm[k:k + args.batch]
            loss = torch.nn.functional.smooth_l1_loss(model(ut[i]), yt[i], beta=0.02)
            opt.zero_grad()
            loss.backward()
            opt.step()
            total += float(loss) * len(i)
        sched.step()
        torch.save({'tag': run_tag(args), 'epoch': epoch + 1, 'model': model.state_dict(), 'opt': opt.state_dict(),
                    'sched': sched.state_dict()}, ckpt + '.tmp')
        os.replace(ckpt + '.tmp', ckpt)
        print('epoch %d/%d loss %.5f (%.0f s)' % (epoch + 1, args.epochs, total / len(ut), time.time() - t0), flush=True)


def run_tag(args):
    keys = ('side', 'hidden', 'draws', 'epochs', 'seed', 'decay', 'lr', 'batch', 'sources', 'spread',
            'teacher_offset', 'limit', 'roll_range', 'pose', 'pose_copies')
    return json.dumps({k: getattr(args, k) for k in keys})


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0],
                                 epilog='models/README.md (mdnb.bin) gives the options that remake the shipped payload.')
    ap.add_argument('--data', default=tp.data_dir(), help='development data cache')
    ap.add_argument('--faces', default=None, help='many-identity folder (default DATA/faces-data)')
    ap.add_argument('--five-points', default=os.path.join(HERE, '..', '..', 'shared', 'data', 'faces',
                                                          'lfw-train-5pt.tsv'), help='human five points of LFW')
    ap.add_argument('--sources', default='lfw,congress,dev',
                    help='comma-separated sources to train on (lfw, congress, dev)')
    ap.add_argument('--split', default=os.path.join(HERE, 'data_split.json'))
    ap.add_argument('--out', default=os.path.join(HERE, '..', 'models', 'mdnb.bin'))
    ap.add_argument('--work', default=None, help='folder for the built samples and checkpoints (default DATA/lm-work)')
    ap.add_argument('--side', type=int, default=24, help='patch side (the net has side^2 inputs)')
    ap.add_argument('--hidden', default='128,64', help='hidden layer sizes, comma-separated')
    ap.add_argument('--draws', type=int, default=4, help='augmented draws per training face')
    ap.add_argument('--epochs', type=int, default=24)
    ap.add_argument('--batch', type=int, default=128)
    ap.add_argument('--lr', type=float, default=2e-3)
    ap.add_argument('--spread', type=float, default=4.0, help='input deviations mapped to the unit range')
    ap.add_argument('--seed', type=int, default=7)
    ap.add_argument('--decay', type=float, default=1e-5, help='weight decay')
    ap.add_argument('--teacher-offset', type=int, default=1,
                    help='move teacher points by the mean human-minus-teacher offset (1) or not (0)')
    ap.add_argument('--limit', type=int, default=0, help='train on at most this many faces (for the data curve)')
    ap.add_argument('--report', default=None, help='write the figures as JSON to this file')
    ap.add_argument('--pose', default=None,
                    help='head-pose folder (train_cascade pose-boxes --jsonl): its training people join')
    ap.add_argument('--pose-copies', type=int, default=1, help='times each head-pose training photo is drawn')
    ap.add_argument('--roll-range', type=float, default=0.0,
                    help='half the augmented draws turn the face uniformly within +-this many degrees '
                         '(0: all turns drawn around upright)')
    args = ap.parse_args(argv)
    args.faces = args.faces or os.path.join(args.data, 'faces-data')
    args.work = args.work or os.path.join(args.data, 'lm-work')
    args.hidden = [int(v) for v in str(args.hidden).split(',') if v]
    args.sources = sorted(set(args.sources.split(',')))
    tag = '%s-s%d-d%d-l%d-t%d' % ('+'.join(args.sources), args.side, args.draws, args.limit, args.teacher_offset)
    if args.roll_range:
        tag += '-r%g' % args.roll_range
    if args.pose:
        tag += '-pose%d' % args.pose_copies
    args.work = os.path.join(args.work, tag + '-' + '-'.join(map(str, args.hidden)))
    os.makedirs(args.work, exist_ok=True)
    torch.manual_seed(args.seed)
    torch.set_num_threads(1)
    rng = np.random.default_rng(args.seed)

    split = json.load(open(args.split))
    dev = load_dev_samples(args.data, split)
    # Every source is loaded so that all variants are judged on the same report faces;
    # only --sources are trained on.
    many, offset = (load_face_samples(args.faces, read_five_points(args.five_points), ['lfw', 'congress'])
                    if os.path.isdir(args.faces) else ([], np.zeros(10)))
    if args.teacher_offset and 'lfw' not in args.sources:
        # The offset comes from LFW's human labels and would carry their terms.
        raise SystemExit('--teacher-offset 1 needs lfw among --sources')
    if args.teacher_offset:
        move_teacher_points(many, offset)
        move_teacher_points(dev, offset)
        print('teacher points moved by %s (box units)' % ' '.join('%.4f' % v for v in offset))
    train = [s for s in many if s['split'] == 'train' and s['source'] in args.sources] + ([s for s in dev if s['split'] == 'train']
                                                          if 'dev' in args.sources else [])
    pose = load_pose_samples(args.pose) if args.pose else []
    # a dozen people among thousands: their photos are drawn --pose-copies times
    train += [s for s in pose if s['split'] == 'train'] * args.pose_copies
    if args.limit:
        # A fixed subset of people, for the curve of data size against error.
        people = sorted({s['who'] for s in train}, key=lambda p: hashlib.sha256(p.encode()).hexdigest())
        keep = set(people[:args.limit])
        train = [s for s in train if s['who'] in keep]
    frames = Frames()

    cache = os.path.join(args.work, 'samples.npz')
    if os.path.exists(cache):
        z = np.load(cache)
        X, Y = z['X'], z['Y']
    else:
        t0 = time.time()
        X, Y = build_training_set(train, frames, args.side, args.draws, rng, args.roll_range)
        np.savez(cache + '.tmp.npz', X=X, Y=Y)
        os.replace(cache + '.tmp.npz', cache)
        print('built %d samples from %d faces of %d people in %.0f s' % (len(X), len(train),
              len({s['who'] for s in train}), time.time() - t0), flush=True)
    mean, std = X.mean(0).astype(np.float64), X.std(0).astype(np.float64) + 1.0
    U = net_inputs(X, mean, std, args.spread).astype(np.float32)

    model = make_model(U.shape[1], args.hidden)
    with torch.no_grad():
        model[-1].bias.copy_(torch.tensor(Y.mean(0)))
    train_net(model, U, Y, args, args.work)

    lin = [m for m in model if isinstance(m, torch.nn.Linear)]
    layers = [(m.weight.detach().double().numpy(), m.bias.detach().double().numpy(),
               'linear' if m is lin[-1] else 'sigmoid') for m in lin]
    net, scales = nw.quantise_mlp(layers, list(mean), list(std), spread=args.spread)
    blob = nw.write_blob(net)
    low = float((((X - mean) / (args.spread * std)) < -1).mean())
    mean_shape = np.array([relative(s['pts'], s['box']) for s in train]).mean(0)

    def evaluate(subset, check=0, turn=0):
        """NME and roll error of the integer net and of the mean shape; the first
        `check` faces also run through the reference integer pass, which must agree
        with the vectorised one exactly."""
        xs, boxes = [], []
        for k, s in enumerate(subset):
            # turned faces alternate the direction
            x, box, pts = (turned_example(frames, s, args.side, turn if k % 2 == 0 else -turn) if turn
                           else plain_example(frames, s, args.side))
            xs.append(x)
            boxes.append((box, pts))
        out = nw.dense_run_batch(net, np.array(xs, np.int64))
        for k in range(min(check, len(xs))):
            ref, _ = nw.reference_run(net, [int(v) for v in xs[k]])
            if list(ref) != [int(v) for v in out[k]]:
                raise SystemExit('vectorised integer pass differs from the reference on face %d' % k)
        got = np.array([point_errors(o / 65535.0, b, p) for o, (b, p) in zip(out, boxes)])
        base = np.array([point_errors(mean_shape, b, p) for b, p in boxes])
        return {'faces': len(subset), 'nme': float(got[:, 0].mean()), 'roll': float(got[:, 1].mean()),
                'nme_mean_shape': float(base[:, 0].mean()), 'roll_mean_shape': float(base[:, 1].mean())}

    report_human = [s for s in many if s['split'] == 'report' and s['human']]
    report_teacher = [s for s in many if s['split'] == 'report' and not s['human'] and s['central']]
    groups = [('train (human points)', [s for s in train if s.get('human')][:2000], 20),
              ('report, human points', report_human, 50),
              ('report, human points, turned 15', report_human, 0, 15),
              ('report, human points, turned 30', report_human, 0, 30),
              ('report, human points, turned 45', report_human, 0, 45),
              ('report, teacher points (central faces)', report_teacher, 0),
              ('development report split', [s for s in dev if s['split'] == 'report'], 0),
              ('report, head-pose photos, yaw 0 to 30 (best-guess points)',
               [s for s in pose if s['split'] == 'report' and abs(s['yaw']) <= 30], 0),
              ('report, head-pose photos, yaw 45 to 90 (best-guess points)',
               [s for s in pose if s['split'] == 'report' and abs(s['yaw']) >= 45], 0)]
    figures = {'args': vars(args), 'scales': scales, 'inputs_below_minus_one': low}
    print('%s: patch %dx%d, hidden %s, layer scales %s, inputs below -1: %.3f%%'
          % (tag, args.side, args.side, args.hidden, scales, 100 * low))
    print('| split | faces | NME net | NME mean shape | roll error net | roll error mean shape |')
    print('|---|---|---|---|---|---|')
    for name, subset, check, *turn in groups:
        if not subset:
            continue
        f = evaluate(subset, check, turn[0] if turn else 0)
        figures[name] = f
        print('| %s | %d | %.4f | %.4f | %.2f | %.2f |' % (name, f['faces'], f['nme'], f['nme_mean_shape'],
                                                          f['roll'], f['roll_mean_shape']), flush=True)
    if args.report:
        json.dump(figures, open(args.report, 'w'), indent=1, default=str)
    with open(args.out, 'wb') as f:
        f.write(nw.write_container([blob]))
    print('wrote %s (%d bytes)' % (os.path.normpath(args.out), os.path.getsize(args.out)))
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
