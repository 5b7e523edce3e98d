#!/usr/bin/python3
"""Compares a cascade payload (models/mdcb-converted.bin) with the OpenCV cascade it was made from,
window by window and after grouping, on photos of the development data cache.

Window test: every 24x24 window of each photo and of its copies downscaled by fixed
factors is classified by our payload (numpy evaluation of our format) and by
cv2.CascadeClassifier; OpenCV sees the windows as one tall stack of crops, one window
per row band, so that none is skipped and each is judged exactly as in a full image.
Grouped test: our raw hits (exhaustive search, step 0.1, factor 1.25) and OpenCV's raw
hits (scaleFactor 1.25) are both grouped by cv2.groupRectangles with minNeighbors 3;
OpenCV's faces count as matched when one of ours overlaps it with IoU >= 0.5.
Output is a deterministic table; no randomness is involved.
"""
import argparse
import glob
import os
import sys

import numpy as np
import cv2

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import cascade_model as cm  # noqa: E402

XML = '/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml'
DOWNSCALES = (1.0, 0.6, 0.4, 0.28, 0.2, 0.14)
WINDOW_PHOTOS = ('audrey.jpg', 'cage.jpg', 'franck_02045.jpg', 'obama4_crop.jpg', 'kim1_crop.jpg',
                 'tracking_faces.jpg', 'tracking_faces_test.png', 'SeanConnery.jpg', 'vendetta.jpg',
                 'bieber_small.jpg', 'clmtrackr01.jpg', 'walter2_crop.jpg')


def default_data_dir():
    return os.environ.get('QUORIN_DATA_DIR', os.path.join(os.path.expanduser('~'), '.cache', 'quorin'))


def opencv_window_accepts(classifier, gray, xs, ys, chunk=4000):
    """OpenCV's accept/reject for the 24x24 windows at (xs, ys) at scale 1."""
    out = np.zeros(len(xs), bool)
    view = np.lib.stride_tricks.sliding_window_view(gray, (24, 24))
    for a in range(0, len(xs), chunk):
        x, y = xs[a:a + chunk], ys[a:a + chunk]
        stack = np.ascontiguousarray(view[y, x].reshape(len(x) * 24, 24))
        found = classifier.detectMultiScale(stack, scaleFactor=1.1, minNeighbors=0,
                                            minSize=(24, 24), maxSize=(24, 24))
        for (_, ry, rw, _) in (found if len(found) else []):
            if ry % 24 == 0 and rw == 24:
                out[a + ry // 24] = True
    return out


def window_agreement(casc, classifier, gray):
    H, W = gray.shape
    ys, xs = np.mgrid[0:H - 23, 0:W - 23]
    xs, ys = xs.ravel(), ys.ravel()
    ours, _, _ = cm.classify(casc, cm.Integral(gray), xs, ys)
    theirs = opencv_window_accepts(classifier, gray, xs, ys)
    return len(xs), int((ours == theirs).sum()), int(ours.sum()), int(theirs.sum()), int((ours & theirs).sum())


def iou(a, b):
    ix = max(0, min(a[0] + a[2], b[0] + b[2]) - max(a[0], b[0]))
    iy = max(0, min(a[1] + a[3], b[1] + b[3]) - max(a[1], b[1]))
    inter = ix * iy
    return inter / float(a[2] * a[3] + b[2] * b[3] - inter)


def grouped(casc, classifier, gray, step=0.1):
    theirs = classifier.detectMultiScale(gray, scaleFactor=1.25, minNeighbors=3)
    theirs = [tuple(int(v) for v in r) for r in (theirs if len(theirs) else [])]
    raw = cm.exhaustive_search(casc, gray, step=step)
    rects = [[l, t, r - l, b - t] for (_, l, t, r, b) in raw]
    ours, _ = cv2.groupRectangles(rects, 3, 0.2) if rects else ((), None)
    ours = [tuple(int(v) for v in r) for r in ours]
    matched = sum(1 for t in theirs if any(iou(t, o) >= 0.5 for o in ours))
    extra = sum(1 for o in ours if not any(iou(t, o) >= 0.5 for t in theirs))
    return len(theirs), matched, len(ours), extra


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    ap.add_argument('--payload', default=os.path.join(os.path.dirname(os.path.abspath(__file__)),
                                                      '..', 'models', 'mdcb-converted.bin'))
    ap.add_argument('--data', default=default_data_dir(), help='development data cache')
    ap.add_argument('--windows', action='store_true', help='run the window test')
    ap.add_argument('--grouped', action='store_true', help='run the grouped test on all photos')
    ap.add_argument('--step', type=float, default=0.1, help='search step ratio of the grouped test')
    args = ap.parse_args(argv)
    if not (args.windows or args.grouped):
        args.windows = args.grouped = True
    with open(args.payload, 'rb') as f:
        casc = cm.Cascade.unpack(f.read())
    classifier = cv2.CascadeClassifier(XML)
    photos = os.path.join(args.data, 'photos')
    if not os.path.isdir(photos):
        print('no development data in %s (run scripts/fetch-data.sh)' % args.data, file=sys.stderr)
        return 2
    if args.windows:
        tot = [0] * 5
        for name in WINDOW_PHOTOS:
            g0 = cv2.imread(os.path.join(photos, name), cv2.IMREAD_GRAYSCALE)
            for f in DOWNSCALES:
                g = g0 if f == 1.0 else cv2.resize(g0, None, fx=f, fy=f, interpolation=cv2.INTER_AREA)
                if min(g.shape) < 24:
                    continue
                r = window_agreement(casc, classifier, g)
                tot = [a + b for a, b in zip(tot, r)]
                print('%-26s %4.2f windows %8d agree %8d accepted ours %4d opencv %4d both %4d' % ((name, f) + r))
        print('WINDOWS %d agreement %.4f%% accepted ours %d opencv %d both %d'
              % (tot[0], 100.0 * tot[1] / tot[0], tot[2], tot[3], tot[4]))
    if args.grouped:
        tot = [0] * 4
        for path in sorted(glob.glob(os.path.join(photos, '*'))):
            g = cv2.imread(path, cv2.IMREAD_GRAYSCALE)
            if g is None:
                continue
            r = grouped(casc, classifier, g, args.step)
            tot = [a + b for a, b in zip(tot, r)]
            print('%-40s opencv %2d matched %2d ours %2d extra %2d' % ((os.path.basename(path),) + r))
        print('GROUPED opencv %d matched %d (%.1f%%) ours %d extra %d'
              % (tot[0], tot[1], 100.0 * tot[1] / max(1, tot[0]), tot[2], tot[3]))
    return 0


if __name__ == '__main__':
    sys.exit(main())
