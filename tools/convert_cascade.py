#!/usr/bin/python3
"""Converts OpenCV's stump-based frontal face Haar cascade (an XML file such as Debian
opencv-data's haarcascade_frontalface_default.xml) into the plain payload of our cascade
model (models/mdcb-converted.bin): one single-score stage per stump, a score reset between the
boosted stages, a contrast gate in front and a constant stage at the end.

Construction (each choice keeps the per-window decisions of the source):
- Contrast gate: a stage on the inverse deviation rejects windows with a standard
  deviation of 10 or less, which the source rejects before its first stage.
- A stump (feature, threshold t, left, right; value < t gives left) becomes a stage with
  the stump's rectangles and weights, all seven bin thresholds float32(t * 484) and bin
  scores right (bins 0-3, high values) and left (bins 4-7). The source divides the
  weighted sum by 484 times the deviation of the inner 22x22 area; we divide by the
  deviation of the whole window, so 484 carries the area and the two deviations are
  taken as equal.
- Each boosted stage after the first starts with a reset stage: an empty feature, two
  scores and a remap [1, 1] that copies the never-written slot 1 (exactly 0) into slot 0.
- Intermediate stumps never reject; the last stump of a boosted stage rejects below the
  stage threshold as the source applies it (float32 value minus 1e-5).
- Score of an accepted window: a final constant stage subtracts the last stage's
  threshold, so the reported score is the margin by which the window passed the last
  boosted stage, times --score-gain (a power of two, exact). It is 0 at the border of
  acceptance and grows with confidence.
The output is deterministic.
"""
import argparse
import hashlib
import os
import sys
import xml.etree.ElementTree as ET

import numpy as np

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
from cascade_model import Cascade, Stage, F32  # noqa: E402

DEFAULT_XML = '/usr/share/opencv4/haarcascades/haarcascade_frontalface_default.xml'
AREA = 484.0          # inner normalisation area of the source, 22 * 22
EPS = F32(1e-5)       # the source lowers every stage threshold by this on load
NEVER = -1e30         # reject threshold that never fires
MIN_SIGMA = 10.0      # windows at or below this deviation are rejected up front


def load_xml(path):
    root = ET.parse(path).getroot()
    c = root.find('cascade')
    if c is None or c.find('featureType') is None or c.find('featureType').text.strip() != 'HAAR':
        raise ValueError('%s: not a HAAR cascade in the new format' % path)
    if (int(c.find('width').text), int(c.find('height').text)) != (24, 24):
        raise ValueError('%s: window must be 24x24' % path)
    feats = []
    for f in c.find('features'):
        t = f.find('tilted')
        if t is not None and int(t.text) != 0:
            raise ValueError('tilted features are not supported')
        rects = []
        for r in f.find('rects'):
            v = r.text.split()
            x, y, w, h = (int(s) for s in v[:4])
            wt = F32(float(v[4]))
            if wt != 0:
                rects.append((wt, x, y, x + w, y + h))
        feats.append(rects)
    stages = []
    for s in c.find('stages'):
        thr = F32(F32(float(s.find('stageThreshold').text)) - EPS)
        stumps = []
        for w in s.find('weakClassifiers'):
            n = w.find('internalNodes').text.split()
            lv = w.find('leafValues').text.split()
            if len(n) != 4 or int(n[0]) != 0 or int(n[1]) != -1 or len(lv) != 2:
                raise ValueError('only decision stumps are supported')
            stumps.append((int(n[2]), F32(float(n[3])), F32(float(lv[0])), F32(float(lv[1]))))
        stages.append((thr, stumps))
    return feats, stages


def convert(feats, stages, score_gain=0.5):
    if score_gain <= 0 or np.log2(score_gain) != int(np.log2(score_gain)):
        raise ValueError('score gain must be a power of two')
    g = F32(score_gain)
    out = []
    # contrast gate: invDev >= 0.1 (deviation <= 10) scores -1 and rejects
    gate = F32(1.0 / MIN_SIGMA)
    out.append(Stage(2, (), [gate] * 7, [(-1, -1, -1, -1, 0, 0, 0, 0, -0.5)]))
    last = len(stages) - 1
    for k, (thr, stumps) in enumerate(stages):
        if k > 0:
            out.append(Stage(0, (), [0.0] * 7, [(0,) * 8 + (NEVER,)] * 2, remap=[1, 1]))
        gain = g if k == last else F32(1.0)
        for j, (fi, t, left, right) in enumerate(stumps):
            reject = F32(thr * gain) if j == len(stumps) - 1 else NEVER
            bt = F32(t * F32(AREA))
            r, lft = F32(right * gain), F32(left * gain)
            out.append(Stage(1, feats[fi], [bt] * 7, [(r, r, r, r, lft, lft, lft, lft, reject)]))
    lt = F32(stages[last][0] * g)
    out.append(Stage(0, (), [0.0] * 7, [(-lt,) * 8 + (NEVER,)]))
    return Cascade(out)


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0],
                                 epilog='Defaults reproduce models/mdcb-converted.bin.')
    ap.add_argument('--xml', default=DEFAULT_XML, help='source cascade (default: %(default)s)')
    ap.add_argument('--out', default=os.path.join(os.path.dirname(os.path.abspath(__file__)),
                                                  '..', 'models', 'mdcb-converted.bin'),
                    help='payload to write (default: models/mdcb-converted.bin)')
    ap.add_argument('--score-gain', type=float, default=0.5,
                    help='power of two multiplying the last stage, hence the reported score')
    args = ap.parse_args(argv)
    feats, stages = load_xml(args.xml)
    casc = convert(feats, stages, args.score_gain)
    data = casc.pack()
    Cascade.unpack(data)  # the written bytes must parse back under the bounds checks
    with open(args.out, 'wb') as f:
        f.write(data)
    n1 = sum(1 for s in casc.common if s.kind == 1)
    print('%s: %d stages (%d stumps, %d resets, 1 gate, 1 final), %d bytes, sha256 %s'
          % (os.path.normpath(args.out), len(casc.common), n1, len(stages) - 1, len(data),
             hashlib.sha256(data).hexdigest()))
    return 0


if __name__ == '__main__':
    sys.exit(main())
