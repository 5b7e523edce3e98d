#!/usr/bin/env python3
"""Faces found and false hits of quorin-detect with and without --min-face,
next to OpenCV's frontal Haar cascade, on labelled photos.

Two sets: the development photos with their teacher labels (labels/faces.jsonl
of the data cache), written as PNG; and group photos composed from the
Congress portraits of the face data (congress-train.tar): 500 x 375 photos
tiled with portraits shrunk so that the faces measure from about 20 to 74
pixels, labelled by construction (a portrait counts only where OpenCV's cascade
and our C API, at the portrait's full size, each find exactly one face and
agree with IoU >= 0.5; the label is the mean of the two boxes, shrunk with the
portrait). For each set quorin-detect runs over the whole list (with --json,
under `script` so that its progress line reports the engine's ms/image), and
OpenCV's detectMultiScale on one thread with its default parameters (scale
1.1, 3 neighbours, smallest face 24). A labelled face is found when a
detection overlaps it with IoU >= 0.4 (one detection per face, best overlap
first); every other detection is a false hit. Prints a Markdown table.
Deterministic apart from the times.

  /usr/bin/python3 bench/compare/min_face.py --detect build/apps/quorin-detect/quorin-detect \
      --faces ../shared/data/faces
"""
import argparse
import json
import os
import re
import tarfile
import statistics
import subprocess
import sys
import tempfile
import time

import cv2
import numpy

# The one-to-one matching of the detection report (IoU >= 0.4, best overlap first).
sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), "..", "..", "tools"))
from report_detection import iou, score  # noqa: E402


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


def development_photos(data, work):
    photos, truth = [], {}
    for line in open(os.path.join(data, "labels/faces.jsonl")):
        rec = json.loads(line)
        if rec["image"].startswith("photos/"):
            path = os.path.join(work, "dev-" + os.path.basename(rec["image"]) + ".png")
            cv2.imwrite(path, cv2.imread(os.path.join(data, rec["image"])))
            photos.append(path)
            truth[path] = [f["rect"] for f in rec["faces"]]
    return photos, truth


def group_photos(detect, faces_dir, cascade, work, count):
    with tarfile.open(os.path.join(faces_dir, "congress-train.tar")) as tar:
        members = sorted((m for m in tar.getmembers() if m.name.endswith(".jpg")), key=lambda m: m.name)[::3]
        tar.extractall(work, members=members)
    names = [os.path.join(work, m.name) for m in members]
    ours, _ = run_ours(detect, names, [], 1)
    portraits = []
    for n in names:
        gray = cv2.imread(n, cv2.IMREAD_GRAYSCALE)
        theirs = [(x, y, x + w, y + h) for (x, y, w, h) in cascade.detectMultiScale(gray, 1.1, 5, minSize=(60, 60))]
        mine = ours.get(n, [])
        if len(theirs) == 1 and len(mine) == 1 and iou(theirs[0], mine[0]) >= 0.5:
            portraits.append((gray, [(a + b) / 2 for a, b in zip(theirs[0], mine[0])]))
    photos, truth, k = [], {}, 0
    for i in range(count):
        s = 0.20 + 0.30 * i / max(1, count - 1)  # faces of about 20 to 74 pixels
        canvas = numpy.full((375, 500), 128, numpy.uint8)
        boxes = []
        cw, ch = round(200 * s), round(250 * s)
        for row in range(375 // ch):
            for col in range(500 // cw):
                gray, box = portraits[k % len(portraits)]
                k += 1
                x0, y0 = col * cw, row * ch
                canvas[y0:y0 + ch, x0:x0 + cw] = cv2.resize(gray, (cw, ch), interpolation=cv2.INTER_AREA)
                boxes.append([x0 + box[0] * cw / 200, y0 + box[1] * ch / 250, x0 + box[2] * cw / 200, y0 + box[3] * ch / 250])
        path = os.path.join(work, "group-%02d.png" % i)
        cv2.imwrite(path, canvas)
        photos.append(path)
        truth[path] = boxes
    return photos, truth, len(portraits), len(names)


def evaluate(what, photos, truth, detect, cascade, min_faces, repeats):
    runs = [("quorin-detect (C API, mode 2)", run_ours(detect, photos, [], repeats))]
    for m in min_faces:
        runs.append(("quorin-detect --min-face %d" % m, run_ours(detect, photos, ["--min-face", str(m)], repeats)))
    runs.append(("OpenCV cascade (1.1, 3, min 24)", run_opencv(cascade, photos, repeats)))
    labelled = sum(len(t) for t in truth.values())
    for name, (boxes, ms) in runs:
        found = false = 0
        for p in photos:
            f, x = score(truth[p], boxes.get(p, []))
            found += f
            false += x
        print("| %s | %s | %d | %d | %d | %.2f |" % (what, name, labelled, found, false, ms), flush=True)


def main():
    ap = argparse.ArgumentParser(description=__doc__.split("\n")[0])
    ap.add_argument("--detect", required=True, help="the quorin-detect program")
    ap.add_argument("--data", default=os.environ.get("QUORIN_DATA_DIR", os.path.expanduser("~/.cache/quorin")))
    ap.add_argument("--faces", help="the face data folder with congress-train.tar (the group photos)")
    ap.add_argument("--groups", type=int, default=12, help="group photos to compose")
    ap.add_argument("--min-face", type=int, nargs="+", default=[24, 32])
    ap.add_argument("--repeats", type=int, default=3)
    args = ap.parse_args()
    cascade = cv2.CascadeClassifier("/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml")
    print("| photos | detector | labelled | found | false hits | ms/photo |")
    print("|---|---|---|---|---|---|")
    with tempfile.TemporaryDirectory() as work:
        photos, truth = development_photos(args.data, work)
        evaluate("%d development photos" % len(photos), photos, truth, args.detect, cascade, args.min_face, args.repeats)
        if args.faces:
            photos, truth, used, tried = group_photos(args.detect, args.faces, cascade, work, args.groups)
            evaluate("%d group photos (%d of %d portraits)" % (len(photos), used, tried), photos, truth, args.detect,
                     cascade, args.min_face, args.repeats)


if __name__ == "__main__":
    main()
