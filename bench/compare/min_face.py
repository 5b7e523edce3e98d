#!/usr/bin/env python3
"""Faces found and false hits of quorin-detect with and without --min-face,
next to OpenCV's frontal Haar cascade, on the labelled development photos.

Reads the teacher labels (labels/faces.jsonl of the data cache), takes the
photos they label, writes them as PNG at their own size and shrunk to a long
side of 320 (where faces get small), and for each set runs quorin-detect over
the whole list (with --json, under `script` so that its progress line reports
the engine's ms/image) and OpenCV's detectMultiScale on one thread with its
default parameters (scale 1.1, 3 neighbours, smallest face 24). A labelled
face is found when a detection overlaps it with IoU >= 0.4 (one detection per
face, best overlap first); every other detection is a false hit. Prints a
Markdown table. Deterministic apart from the times.

  python3 bench/compare/min_face.py --detect build/apps/quorin-detect/quorin-detect
"""
import argparse
import json
import os
import re
import statistics
import subprocess
import tempfile
import time

import cv2


def iou(a, b):
    w = min(a[2], b[2]) - max(a[0], b[0])
    h = min(a[3], b[3]) - max(a[1], b[1])
    if w <= 0 or h <= 0:
        return 0.0
    inter = w * h
    return inter / ((a[2] - a[0]) * (a[3] - a[1]) + (b[2] - b[0]) * (b[3] - b[1]) - inter)


def score(truth, found):
    """(labelled faces found, false hits) for one photo."""
    pairs = sorted(((iou(t, f), i, j) for i, t in enumerate(truth) for j, f in enumerate(found)), reverse=True)
    used_t, used_f = set(), set()
    for v, i, j in pairs:
        if v >= 0.4 and i not in used_t and j not in used_f:
            used_t.add(i)
            used_f.add(j)
    return len(used_t), len(found) - len(used_f)


def run_ours(detect, photos, extra, repeats):
    """Boxes per photo and the engine's ms/image (median of the runs)."""
    times = []
    for _ in range(repeats):
        with tempfile.NamedTemporaryFile(suffix=".jsonl") as out:
            cmd = " ".join([detect, "--json", out.name] + extra + photos)
            tty = subprocess.run(["script", "-qec", cmd, "/dev/null"], capture_output=True, text=True)
            if tty.returncode != 0:
                raise SystemExit("quorin-detect failed: " + tty.stdout[-500:])
            times.append(float(re.findall(r"([0-9.]+) ms/image", tty.stdout)[-1]))
            lines = [json.loads(l) for l in open(out.name)]
    boxes = {}
    for l in lines:
        boxes[l["file"]] = [(f["rect"]["left"], f["rect"]["top"], f["rect"]["right"], f["rect"]["bottom"])
                            for f in l["faces"]]
    return boxes, statistics.median(times)


def run_opencv(cascade, photos, repeats):
    cv2.setNumThreads(1)
    boxes, times = {}, []
    for p in photos:
        gray = cv2.cvtColor(cv2.imread(p), cv2.COLOR_BGR2GRAY)
        best = None
        for _ in range(repeats):
            t0 = time.perf_counter()
            found = cascade.detectMultiScale(gray, 1.1, 3)
            best = min(best or 1e9, (time.perf_counter() - t0) * 1000)
        times.append(best)
        boxes[p] = [(x, y, x + w, y + h) for (x, y, w, h) in found]
    return boxes, sum(times) / len(times)


def main():
    ap = argparse.ArgumentParser(description=__doc__.split("\n")[0])
    ap.add_argument("--detect", required=True, help="the quorin-detect program")
    ap.add_argument("--data", default=os.environ.get("QUORIN_DATA_DIR", os.path.expanduser("~/.cache/quorin")))
    ap.add_argument("--min-face", type=int, nargs="+", default=[24, 32])
    ap.add_argument("--repeats", type=int, default=3)
    args = ap.parse_args()
    cascade = cv2.CascadeClassifier("/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml")

    labels = {}
    for line in open(os.path.join(args.data, "labels/faces.jsonl")):
        rec = json.loads(line)
        if rec["image"].startswith("photos/"):
            labels[rec["image"]] = [f["rect"] for f in rec["faces"]]

    print("| photos | detector | labelled | found | false hits | ms/photo |")
    print("|---|---|---|---|---|---|")
    with tempfile.TemporaryDirectory() as work:
        for long_side in (None, 320):
            photos, truth = [], {}
            for name, rects in sorted(labels.items()):
                img = cv2.imread(os.path.join(args.data, name))
                s = 1.0 if long_side is None else long_side / max(img.shape[:2])
                if s != 1.0:
                    img = cv2.resize(img, (round(img.shape[1] * s), round(img.shape[0] * s)), interpolation=cv2.INTER_AREA)
                path = os.path.join(work, "%s-%s.png" % (long_side or "full", os.path.basename(name)))
                cv2.imwrite(path, img)
                photos.append(path)
                truth[path] = [[v * s for v in r] for r in rects]
            runs = [("quorin-detect (C API, mode 2)", run_ours(args.detect, photos, [], args.repeats))]
            for m in args.min_face:
                runs.append(("quorin-detect --min-face %d" % m,
                             run_ours(args.detect, photos, ["--min-face", str(m)], args.repeats)))
            runs.append(("OpenCV cascade (1.1, 3, min 24)", run_opencv(cascade, photos, args.repeats)))
            labelled = sum(len(t) for t in truth.values())
            what = "%d as fetched" % len(photos) if long_side is None else "%d, long side %d" % (len(photos), long_side)
            for name, (boxes, ms) in runs:
                found = false = 0
                for p in photos:
                    f, x = score(truth[p], boxes.get(p, []))
                    found += f
                    false += x
                print("| %s | %s | %d | %d | %d | %.2f |" % (what, name, labelled, found, false, ms))


if __name__ == "__main__":
    main()
