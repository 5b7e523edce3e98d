#!/usr/bin/env bash
# Makes the many-identity training folder for the landmark net and the post filter:
# the LFW and Congress photos of a faces folder (default ../shared/data/faces, made
# from the public sources as models/README.md tells) unpacked under
# DATA/faces-data/photos/, their teacher labels (labels/faces.jsonl, two label_faces
# processes sharing the photos) and our detector's merged hits (labels/hits.*).
# Also labels and mines the development data if that hasn't been done.
#   usage: tools/make_faces_data.sh [FACES_DIR]    (build/tools must be built)
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
FACES="${1:-$ROOT/../shared/data/faces}"
DATA="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
TOOLS="$ROOT/build/tools"
OUT="$DATA/faces-data"
[ -x "$TOOLS/label_faces" ] && [ -x "$TOOLS/dump_hits" ] || { echo "build label_faces and dump_hits first" >&2; exit 1; }
[ -f "$FACES/lfw-train.tar" ] || { echo "no faces folder at $FACES" >&2; exit 1; }

mkdir -p "$OUT/photos" "$OUT/labels"
[ -d "$OUT/photos/lfw" ] || tar -C "$OUT/photos" -xf "$FACES/lfw-train.tar"
[ -d "$OUT/photos/congress" ] || tar -C "$OUT/photos" -xf "$FACES/congress-train.tar"
if [ ! -f "$OUT/labels/faces.jsonl" ]; then
  # Faces fill most of these 200-pixel photos: no upsampling needed.
  for k in 0 1; do
    "$TOOLS/label_faces" --data "$OUT" --upsample 0 --shard "$k/2" --out "$OUT/labels/faces.$k.jsonl" &
  done
  wait
  LC_ALL=C sort -t'"' -k4,4 "$OUT/labels/faces.0.jsonl" "$OUT/labels/faces.1.jsonl" > "$OUT/labels/faces.jsonl"
  rm "$OUT/labels/faces.0.jsonl" "$OUT/labels/faces.1.jsonl"
fi
[ -f "$OUT/labels/hits.tsv" ] || "$TOOLS/dump_hits" --data "$OUT"
[ -f "$DATA/labels/faces.jsonl" ] || "$TOOLS/label_faces" --data "$DATA"
[ -f "$DATA/labels/hits.tsv" ] || "$TOOLS/dump_hits" --data "$DATA"
echo "ready: $OUT"
