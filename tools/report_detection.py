#!/usr/bin/python3
"""Recall and false positives of our engine and of OpenCV's Haar cascade on one split of the
development data, measured against the teacher labels.

From tools/data_split.json (which images belong to the split), the teacher labels
(labels/faces.jsonl of the data cache) and the images themselves, it makes a table, one
row per group (face photos, mask photos, clip frames, face-free images) and a total.
Our engine runs through the built quorin-detect program (quorin_detect, mode 2, each
image on its own); OpenCV's CascadeClassifier runs the same frontal cascade with
scaleFactor 1.25, minNeighbors 3 and, per image, the smallest face size our engine
searches there. A box finds a labelled face when their overlap (IoU) is at least 0.4,
one box per face; every other box is a false positive, and so is every box on a mask
or a face-free image. The teacher misses some small and turned faces, so a few false
positives may be real faces. No randomness: the output is the same on every run.
"""
import argparse
import json
import os
import subprocess
import sys

import cv2

HERE = os.path.dirname(os.path.abspath(__file__))
XML = '/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml'
# Long side of the work frame of mode 2; faces below an eighth of its short
# side (and below 32 pixels) are not searched.
WORK_LONG_SIDE = 640
IOU_MATCH = 0.4


def default_data_dir():
    return os.environ.get('QUORIN_DATA_DIR', os.path.join(os.path.expanduser('~'), '.cache', 'quorin'))


def default_binary():
    for build in sorted(os.listdir(os.path.join(HERE, '..'))):
        path = os.path.join(HERE, '..', build, 'apps', 'quorin-detect', 'quorin-detect')
        if build.startswith('build') and 'asan' not in build and os.access(path, os.X_OK):
            return os.path.normpath(path)
    return None


def engine_min_face(width, height):
    """The smallest face our engine searches in a frame, in the frame's pixels."""
    scale = WORK_LONG_SIDE / float(max(width, height))
    w, h = width, height
    if scale < 1.0:
        w, h = int(scale * width), int(scale * height)
    short = min(w, h)
    work_min = int(short / 8.0) if short / 8.0 > 32 else 32
    return int(round(work_min * min(width, height) / float(short)))


def split_images(split, data, which):
    """(relative path, group) of every image in the split, in a fixed order."""
    out = []
    for name, e in sorted(split['photos'].items()):
        if e['split'] == which:
            out.append(('photos/' + name, 'photos' if e['kind'] == 'face' else 'masks/art'))
    for clip, e in sorted(split['clips'].items()):
        if e['split'] == which and e['kind'] == 'face':
            folder = os.path.join(data, 'frames', clip)
            for f in sorted(os.listdir(folder)) if os.path.isdir(folder) else []:
                out.append(('frames/%s/%s' % (clip, f), 'clip frames'))
    for name, s in sorted(split['negatives'].items()):
        if s == which:
            out.append(('negatives/' + name, 'face-free'))
    return out


def run_engine(binary, data, images, batch=64):
    boxes = {}
    for a in range(0, len(images), batch):
        chunk = images[a:a + batch]
        res = subprocess.run([binary, '--mode', '2'] + [os.path.join(data, p) for p in chunk],
                             stdout=subprocess.PIPE, stderr=subprocess.PIPE, check=False)
        lines = [json.loads(l) for l in res.stdout.decode().splitlines() if l.strip()]
        if len(lines) != len(chunk):
            sys.exit('quorin-detect answered %d of %d images: %s'
                     % (len(lines), len(chunk), res.stderr.decode().strip()))
        for p, d in zip(chunk, lines):
            boxes[p] = [(f['rect']['left'], f['rect']['top'], f['rect']['right'], f['rect']['bottom'])
                        for f in d['faces']]
    return boxes


def run_opencv(data, images):
    classifier = cv2.CascadeClassifier(XML)
    if classifier.empty():
        sys.exit('cannot load ' + XML)
    cv2.setNumThreads(1)
    boxes = {}
    for p in images:
        gray = cv2.imread(os.path.join(data, p), cv2.IMREAD_GRAYSCALE)
        if gray is None:
            sys.exit('cannot read ' + p)
        m = engine_min_face(gray.shape[1], gray.shape[0])
        found = classifier.detectMultiScale(gray, scaleFactor=1.25, minNeighbors=3, minSize=(m, m))
        boxes[p] = [(int(x), int(y), int(x + w), int(y + h)) for (x, y, w, h) in (found if len(found) else [])]
    return boxes


def iou(a, b):
    w = min(a[2], b[2]) - max(a[0], b[0])
    h = min(a[3], b[3]) - max(a[1], b[1])
    if w <= 0 or h <= 0:
        return 0.0
    inter = w * h
    return inter / float((a[2] - a[0]) * (a[3] - a[1]) + (b[2] - b[0]) * (b[3] - b[1]) - inter)


def score(truth, found):
    """(matched faces, false positives), greedy one-to-one by best overlap."""
    pairs = sorted(((iou(t, f), i, j) for i, t in enumerate(truth) for j, f in enumerate(found)), reverse=True)
    used_t, used_f = set(), set()
    for v, i, j in pairs:
        if v < IOU_MATCH:
            break
        if i not in used_t and j not in used_f:
            used_t.add(i)
            used_f.add(j)
    return len(used_t), len(found) - len(used_f)


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument('--binary', default=default_binary(), help='the quorin-detect program (default: first build dir)')
    ap.add_argument('--data', default=default_data_dir(), help='development data cache')
    ap.add_argument('--split', default='report', choices=('report', 'train'), help='which split (default report)')
    ap.add_argument('--markdown', action='store_true', help='print the table as Markdown')
    args = ap.parse_args(argv)
    if not args.binary or not os.access(args.binary, os.X_OK):
        sys.exit('quorin-detect not found; build the quorin-detect target or pass --binary')
    labels_path = os.path.join(args.data, 'labels', 'faces.jsonl')
    if not os.path.exists(labels_path):
        sys.exit('no teacher labels in %s (run scripts/fetch-data.sh and label_faces)' % args.data)
    with open(os.path.join(HERE, 'data_split.json')) as f:
        split = json.load(f)
    labels = {}
    with open(labels_path) as f:
        for line in f:
            d = json.loads(line)
            labels[d['image']] = [tuple(face['rect']) for face in d['faces']]

    images = [(p, g) for p, g in split_images(split, args.data, args.split) if os.path.exists(os.path.join(args.data, p))]
    paths = [p for p, _ in images]
    ours = run_engine(args.binary, args.data, paths)
    theirs = run_opencv(args.data, paths)

    groups = ['photos', 'clip frames', 'masks/art', 'face-free']
    rows = {g: [0] * 6 for g in groups + ['total']}  # images, faces, ours found, ours FP, cv found, cv FP
    for p, g in images:
        truth = labels.get(p, []) if g in ('photos', 'clip frames') else []
        a, b = score(truth, ours[p])
        c, d = score(truth, theirs[p])
        for key in (g, 'total'):
            r = rows[key]
            r[0] += 1
            r[1] += len(truth)
            r[2] += a
            r[3] += b
            r[4] += c
            r[5] += d

    def pct(n, d):
        return '%.1f%%' % (100.0 * n / d) if d else '-'

    head = ['group', 'images', 'faces', 'ours recall', 'ours FP', 'OpenCV recall', 'OpenCV FP']
    table = []
    for g in groups + ['total']:
        r = rows[g]
        if r[0] == 0:
            continue
        table.append([g, str(r[0]), str(r[1]), '%s (%d)' % (pct(r[2], r[1]), r[2]), str(r[3]),
                      '%s (%d)' % (pct(r[4], r[1]), r[4]), str(r[5])])
    if args.markdown:
        print('| ' + ' | '.join(head) + ' |')
        print('|' + '|'.join(['---'] * len(head)) + '|')
        for t in table:
            print('| ' + ' | '.join(t) + ' |')
    else:
        widths = [max(len(x[i]) for x in [head] + table) for i in range(len(head))]
        for t in [head] + table:
            print('  '.join(v.ljust(w) for v, w in zip(t, widths)))
    return 0


if __name__ == '__main__':
    sys.exit(main())
