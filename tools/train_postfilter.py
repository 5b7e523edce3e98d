#!/usr/bin/python3
"""Trains the built-in ILABS post filter (models/mdpb.bin) on hits mined by our own detector.

Input: the hits written by tools/dump_hits (labels/hits.tsv and labels/hits.f32 in the data
cache: per merged hit of the cascade, its 945-value feature and its best overlap with a
teacher face) and the fixed split tools/data_split.json. Labels: a hit on a photo or clip
frame of kind "face" is a true face when it overlaps a teacher face with IoU >= 0.4 and a
false hit when below 0.1 (ambiguous ones are left out); every hit on a face-free image
(negatives/) or on a photo of kind "nonface" (masks, helmets) is a false hit; artwork is
left out. Only the "train" split is trained on; the figures are reported on "report".

Model: a linear term on the standardised feature, fitted by L2-regularised logistic
regression (Newton steps, class-balanced weights), then folded back onto the raw feature
and quantised to the format's int16 blocks. The bias is set so that at least --keep of the
training faces pass. With --categories N each of the first N cascade categories gets a model
fitted on its own hits (the roll branches see turned faces), the others take category 0's;
by default all 15 carry the same model. Deterministic: no randomness is involved.
"""
import argparse
import json
import os
import sys

import numpy as np

sys.path.insert(0, os.path.dirname(os.path.abspath(__file__)))
import ilabs_feature as ilabs  # noqa: E402

DIM = 945
FAST_PASS = np.float32(6.0)
HERE = os.path.dirname(os.path.abspath(__file__))


def data_dir():
    return os.environ.get('QUORIN_DATA_DIR', os.path.join(os.path.expanduser('~'), '.cache', 'quorin'))


def split_of(image, split):
    """(split, kind) of a cache-relative image path, or (None, None) when unknown."""
    folder, _, rest = image.partition('/')
    if folder == 'photos':
        e = split['photos'].get(rest)
        return (e['split'], e['kind']) if e else (None, None)
    if folder == 'frames':
        e = split['clips'].get(rest.split('/')[0])
        return (e['split'], e['kind']) if e else (None, None)
    if folder == 'negatives':
        return split['negatives'].get(rest), 'free'
    return None, None


def load_hits(prefix, split):
    rows = [line.rstrip('\n').split('\t') for line in open(prefix + '.tsv')]
    feats = np.fromfile(prefix + '.f32', dtype='<f4')
    if feats.size != len(rows) * DIM:
        raise SystemExit('hits.tsv and hits.f32 disagree: run dump_hits again')
    feats = feats.reshape(len(rows), DIM)
    labels, sets, keep = [], [], []
    for i, r in enumerate(rows):
        which, kind = split_of(r[0], split)
        best = float(r[3])
        if which is None or kind == 'artwork':
            continue
        if kind in ('free', 'nonface'):
            label = 0
        elif best >= 0.4:
            label = 1
        elif best < 0.1:
            label = 0
        else:
            continue
        labels.append(label)
        sets.append(which)
        keep.append(i)
    return feats[keep], np.array(labels), np.array(sets), [rows[i] for i in keep]


def load_face_hits(prefix):
    """True face hits of the many-identity folder (IoU >= 0.4 with a teacher face),
    split by identity as the landmark trainer splits it. Its other hits are left out:
    its teacher labels come from a search without upsampling, which misses small
    faces in the background, so a hit far from every label may still be a face."""
    import train_landmarks as tl
    rows = [line.rstrip('\n').split('\t') for line in open(prefix + '.tsv')]
    feats = np.fromfile(prefix + '.f32', dtype='<f4')
    if feats.size != len(rows) * DIM:
        raise SystemExit('%s.tsv and .f32 disagree: run dump_hits again' % prefix)
    # hits on quarter-turned photos (variant q90 ...) are false: a face on its side is none
    keep = [i for i, r in enumerate(rows) if float(r[3]) >= 0.4 or r[1].startswith('q')]
    sets = np.array(['report' if tl.report_person(tl.person_of(rows[i][0])) else 'train' for i in keep])
    labels = np.array([0 if rows[i][1].startswith('q') else 1 for i in keep], int)
    return feats.reshape(len(rows), DIM)[keep], labels, sets, [rows[i] for i in keep]


def load_pose_hits(prefix, report_people=(3, 6, 9, 12)):
    """Hits on the head-pose photos (dump_hits over a folder whose photos/pointing04
    holds them, labels from `train_cascade pose-boxes --jsonl`): one labelled face per
    photo before a plain background, so a hit is a face at IoU >= 0.4 and a false hit
    below 0.1. Split by person as `pose-boxes` splits them."""
    rows = [line.rstrip('\n').split('\t') for line in open(prefix + '.tsv')]
    feats = np.fromfile(prefix + '.f32', dtype='<f4')
    if feats.size != len(rows) * DIM:
        raise SystemExit('%s.tsv and .f32 disagree: run dump_hits again' % prefix)
    keep = [i for i, r in enumerate(rows) if float(r[3]) >= 0.4 or float(r[3]) < 0.1]
    person = [int(os.path.basename(rows[i][0])[6:8]) for i in keep]
    sets = np.array(['report' if p in report_people else 'train' for p in person])
    labels = np.array([1 if float(rows[i][3]) >= 0.4 else 0 for i in keep], int)
    return feats.reshape(len(rows), DIM)[keep], labels, sets, [rows[i] for i in keep]


def fit_logistic(x, y, l2, steps=30):
    """Class-balanced L2 logistic regression by Newton steps; returns (w, b)."""
    n, d = x.shape
    xa = np.hstack([x, np.ones((n, 1))])
    sw = np.where(y == 1, 0.5 / max(1, y.sum()), 0.5 / max(1, (1 - y).sum()))
    reg = np.full(d + 1, l2)
    reg[-1] = 0.0
    theta = np.zeros(d + 1)
    for _ in range(steps):
        p = 1.0 / (1.0 + np.exp(-(xa @ theta)))
        grad = xa.T @ (sw * (p - y)) + reg * theta
        hess = (xa * (sw * p * (1 - p))[:, None]).T @ xa + np.diag(reg + 1e-12)
        delta = np.linalg.solve(hess, grad)
        theta -= delta
        if np.max(np.abs(delta)) < 1e-10:
            break
    return theta[:-1], theta[-1]


def decisions(category, feats):
    """The library's decisions: fast pass on the score, else the category's sign."""
    linear = category[0].astype(np.float64)
    scores = feats.astype(np.float64) @ linear - float(category[4])
    return (feats[:, 0] >= FAST_PASS) | (scores > 0), scores


def fit_category(feats, labels, args, keep):
    """One category's model: the linear term on the standardised feature, folded
    back onto the raw one, with the bias that keeps --keep of its training faces
    that the fast pass doesn't already let through."""
    x = feats.astype(np.float64)
    mu, sigma = x.mean(0), x.std(0)
    sigma[sigma < 1e-6] = 1.0  # bins that never fire get no weight anyway
    w, b = fit_logistic((x - mu) / sigma, labels.astype(np.float64), args.l2)
    raw_w = w / sigma
    margin = x @ raw_w + (b - mu @ raw_w)
    judged = (labels == 1) & (feats[:, 0] < FAST_PASS)
    pos_margin = np.sort(margin[judged])
    cut = pos_margin[int(np.floor((1.0 - keep) * len(pos_margin)))] if len(pos_margin) else 0.0
    shift = (b - mu @ raw_w) - cut + 1e-3  # faces at the cut stay strictly above 0
    return (raw_w, np.zeros(0), np.zeros((0, DIM)), np.zeros((0, DIM)), -shift)


def decide(models, cats, feats):
    """Per hit, the decision of its category's model."""
    passed = np.zeros(len(feats), bool)
    for k in np.unique(cats):
        m = cats == k
        passed[m] = decisions(models[min(int(k), len(models) - 1)], feats[m])[0]
    return passed


def main(argv=None):
    ap = argparse.ArgumentParser(description=__doc__.splitlines()[0],
                                 epilog='Defaults reproduce models/mdpb.bin from the mined hits.')
    ap.add_argument('--hits', default=None, help='prefix of the dump_hits output (default: DATA/labels/hits)')
    ap.add_argument('--split', default=os.path.join(HERE, 'data_split.json'))
    ap.add_argument('--out', default=os.path.join(HERE, '..', 'models', 'mdpb.bin'))
    ap.add_argument('--faces', default=None,
                    help='prefix of dump_hits output on the many-identity folder (default: '
                         'DATA/faces-data/labels/hits when present; "none" to leave it out)')
    ap.add_argument('--compare', default=os.path.join(HERE, '..', 'models', 'mdpb.bin'),
                    help='payload whose figures are printed beside the new one (read before writing --out)')
    ap.add_argument('--l2', type=float, default=100.0, help='ridge weight on the standardised feature')
    ap.add_argument('--pose', default=None, help='prefix of dump_hits output on the head-pose photos')
    ap.add_argument('--keep', type=float, default=0.999, help='share of training faces the bias keeps')
    ap.add_argument('--keep-turned', type=float, default=None,
                    help='share of training faces kept in categories 1 and up (default: --keep)')
    ap.add_argument('--categories', type=int, default=1,
                    help='cascade categories with a model of their own (the hits\' last column); '
                         'the others take category 0\'s')
    args = ap.parse_args(argv)

    split = json.load(open(args.split))
    feats, labels, sets, rows = load_hits(args.hits or os.path.join(data_dir(), 'labels', 'hits'), split)
    source = np.array(['dev'] * len(rows), dtype=object)
    faces = args.faces or os.path.join(data_dir(), 'faces-data', 'labels', 'hits')
    if faces != 'none' and os.path.exists(faces + '.tsv'):
        f2, l2_, s2, r2 = load_face_hits(faces)
        feats, labels, sets, rows = (np.vstack([feats, f2]), np.concatenate([labels, l2_]),
                                     np.concatenate([sets, s2]), rows + r2)
        source = np.concatenate([source, np.array(['faces'] * len(r2), dtype=object)])
    if args.pose:
        f3, l3, s3, r3 = load_pose_hits(args.pose)
        feats, labels, sets, rows = (np.vstack([feats, f3]), np.concatenate([labels, l3]),
                                     np.concatenate([sets, s3]), rows + r3)
        source = np.concatenate([source, np.array(['pose'] * len(r3), dtype=object)])
    before = None
    if args.compare and os.path.exists(args.compare):
        before = ilabs.read_ilabs(open(args.compare, 'rb').read())[0]
    train = sets == 'train'
    if train.sum() == 0 or labels[train].min() == labels[train].max():
        raise SystemExit('no usable training hits')

    cats = np.array([int(r[9]) if len(r) > 9 else 0 for r in rows])
    cats[cats >= args.categories] = 0
    models = []
    for k in range(args.categories):
        m = train & (cats == k)
        if k < 3:
            # the head-pose room (a dozen people before one wall) trains only the
            # sideways categories; the others keep to the many-identity and development hits
            m &= source != 'pose'
        if k > 0 and (labels[m].min(initial=1) == labels[m].max(initial=0)):
            print('category %d: too few hits of both kinds, it takes category 0\'s model' % k)
            models.append(models[0])
            continue
        models.append(fit_category(feats[m], labels[m], args, args.keep if k == 0 else args.keep_turned or args.keep))
    payload = ilabs.write_ilabs(models + [models[0]] * (ilabs.CATEGORY_NUMBER - len(models)))
    quantised_all = ilabs.read_ilabs(payload)
    quantised = quantised_all[0]
    with open(args.out, 'wb') as f:
        f.write(payload)

    print('%s: %d bytes, linear term only, %d categories, l2 %g, training faces kept >= %.1f%%'
          % (os.path.normpath(args.out), len(payload), args.categories, args.l2, 100 * args.keep))
    for k in range(args.categories):
        mk = cats == k
        print('  category %d: %d face hits, %d false hits (train %d / %d)' % (
            k, (labels[mk] == 1).sum(), (labels[mk] == 0).sum(), (labels[mk & train] == 1).sum(),
            (labels[mk & train] == 0).sum()))
    print('| split | faces | false hits | faces kept | false hits removed | before: kept | before: removed |')
    print('|---|---|---|---|---|---|---|')
    plain = np.array([r[1] == '-' for r in rows])
    dev = source == 'dev'
    for name, m in (('train', sets == 'train'), ('report', sets == 'report'),
                    ('report, development data', (sets == 'report') & dev),
                    ('report, development data, plain', (sets == 'report') & dev & plain),
                    ('report, many-identity photos', (sets == 'report') & (source == 'faces')),
                    ('report, head-pose photos', (sets == 'report') & (source == 'pose'))):
        pos, neg = labels[m] == 1, labels[m] == 0
        cells = []
        for model in (quantised_all, before):
            if model is None:
                cells += ['-', '-']
                continue
            passed = decide(model if isinstance(model, list) else [model], cats[m], feats[m])
            kept = passed[pos].mean() if pos.any() else float('nan')
            removed = 1.0 - passed[neg].mean() if neg.any() else float('nan')
            cells += ['%.1f%% (%d)' % (100 * kept, passed[pos].sum()), '%.1f%% (%d)' % (100 * removed, (~passed[neg]).sum())]
        print('| %s | %d | %d | %s |' % (name, pos.sum(), neg.sum(), ' | '.join(cells)))
    print('(plain: without mirrored and turned copies)')
    # Where the report split's false hits come from, and those that pass.
    m = sets == 'report'
    passed = decide(quantised_all, cats[m], feats[m])
    origin = {}
    for r, lab, ok in zip([rows[i] for i in np.flatnonzero(m)], labels[m], passed):
        if lab == 0:
            k = r[0].split('/')[0]
            a = origin.setdefault(k, [0, 0])
            a[0] += 1
            a[1] += int(not ok)
    for k, (n, gone) in sorted(origin.items()):
        print('  report false hits on %-10s %4d, removed %4d' % (k, n, gone))
    return 0


if __name__ == '__main__':
    sys.exit(main())
