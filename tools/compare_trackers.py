#!/usr/bin/env python3
"""Compares the trackers on the development clips.

From the clips in videos/ of the data cache and the teacher boxes in
labels/faces.jsonl (made for the frames that scripts/fetch-data.sh decodes from
every STEP-th frame of each clip), it decodes each whole clip to raw gray with
ffmpeg, runs `quorin-detect --raw WxH --tracker NAME` over it for every tracker
(and the C API's own tracking mode as a reference), and prints a Markdown
table: per clip and tracker, the labelled frames, those with a face reported,
those whose best reported box has IoU >= 0.5 with the teacher box, the mean of
that best IoU over the frames with a report, the share of all frames of the
clip with any face reported, and the wall time per frame of the whole run (model loading included, decoding not). The engine's trackers are
seeded from the clock, so the particle rows vary a little from run to run.
"""
import argparse
import json
import os
import re
import subprocess
import sys
import tempfile
import time

TRACKERS = ['simple', 'kf', 'pf', 'cpf']


def iou(a, b):
    w = min(a[2], b[2]) - max(a[0], b[0])
    h = min(a[3], b[3]) - max(a[1], b[1])
    if w <= 0 or h <= 0:
        return 0.0
    inter = w * h
    union = (a[2] - a[0]) * (a[3] - a[1]) + (b[2] - b[0]) * (b[3] - b[1]) - inter
    return inter / union


def teacher_boxes(data):
    """{clip: {frame index: box}} for the labelled frames with one face."""
    out = {}
    pattern = re.compile(r'^frames/([^/]+)/\1_f(\d+)\.pgm$')
    with open(os.path.join(data, 'labels', 'faces.jsonl')) as f:
        for line in f:
            d = json.loads(line)
            m = pattern.match(d['image'])
            if m and len(d['faces']) == 1:
                out.setdefault(m.group(1), {})[int(m.group(2))] = d['faces'][0]['rect']
    return out


def clip_size(path):
    text = subprocess.check_output(['ffprobe', '-v', 'error', '-select_streams', 'v:0', '-show_entries',
                                    'stream=width,height', '-of', 'csv=p=0', path], text=True)
    w, h = text.strip().split(',')[:2]
    return int(w), int(h)


def run(binary, raw, width, height, tracker):
    args = [binary, '--raw', '%dx%d' % (width, height)]
    if tracker:
        args += ['--tracker', tracker]
    with open(raw, 'rb') as stdin:
        t0 = time.monotonic()
        out = subprocess.run(args, stdin=stdin, stdout=subprocess.PIPE, check=True, text=True).stdout
        seconds = time.monotonic() - t0
    frames = {}
    for line in out.splitlines():
        d = json.loads(line)
        frames[d['frame']] = [(f['rect']['left'], f['rect']['top'], f['rect']['right'], f['rect']['bottom'])
                              for f in d['faces']]
    return frames, seconds


def main():
    p = argparse.ArgumentParser(description=__doc__.split('\n\n')[0])
    p.add_argument('--data', default=os.path.expanduser('~/.cache/quorin'), help='data cache')
    p.add_argument('--binary', default='build/apps/quorin-detect/quorin-detect', help='quorin-detect')
    p.add_argument('--clips', nargs='*', help='clip names (default: all with labels)')
    args = p.parse_args()

    labels = teacher_boxes(args.data)
    clips = args.clips or sorted(labels)
    print('| clip | tracker | labelled frames | face reported | IoU >= 0.5 | mean IoU | all frames with a face |'
          ' ms/frame |')
    print('|---|---|---|---|---|---|---|---|')
    for clip in clips:
        video = os.path.join(args.data, 'videos', clip + '.mp4')
        if clip not in labels or not os.path.exists(video):
            sys.exit('no clip or labels for %s' % clip)
        width, height = clip_size(video)
        with tempfile.NamedTemporaryFile(suffix='.gray') as raw:
            subprocess.run(['ffmpeg', '-nostdin', '-loglevel', 'error', '-y', '-i', video, '-f', 'rawvideo',
                            '-pix_fmt', 'gray', raw.name], check=True)
            for tracker in TRACKERS + [None]:
                frames, seconds = run(args.binary, raw.name, width, height, tracker)
                truth = labels[clip]
                best = {k: max([iou(b, box) for b in frames.get(k, [])], default=None) for k, box in truth.items()}
                reported = [v for v in best.values() if v is not None]
                held = sum(1 for v in reported if v >= 0.5)
                mean = sum(reported) / len(reported) if reported else 0.0
                name = tracker or 'C API mode 1 (kf)'
                any_face = sum(1 for faces in frames.values() if faces)
                print('| %s | %s | %d | %d | %d | %.2f | %d%% | %.1f |' %
                      (clip, name, len(truth), len(reported), held, mean, round(100.0 * any_face / max(1, len(frames))),
                       1000.0 * seconds / max(1, len(frames))))
                sys.stdout.flush()


if __name__ == '__main__':
    main()
