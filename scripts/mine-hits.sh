#!/usr/bin/env bash
# Makes what the built-in post filter model test checks against, from the
# fetched development data: the teacher labels (labels/faces.jsonl, by
# label_faces) and the hits our cascade finds on it (labels/hits.tsv/.f32, by
# dump_hits). The test suite runs this as a fixture before that test.
#
#   bash scripts/mine-hits.sh LABEL_FACES DUMP_HITS
#
# Quick when both exist. Without the data cache (scripts/fetch-data.sh not run
# or offline) it does nothing and the test skips with its reason. Writes to
# temporary names first, so that an interrupted run leaves nothing half made.
set -euo pipefail
LABEL_FACES="${1:?usage: mine-hits.sh LABEL_FACES DUMP_HITS}"
DUMP_HITS="${2:?usage: mine-hits.sh LABEL_FACES DUMP_HITS}"
DATA="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
LABELS="$DATA/labels"

if [ ! -f "$DATA/READY" ]; then
  echo "mine-hits: no development data in $DATA; the post filter model test will skip"
  exit 0
fi
mkdir -p "$LABELS"
if [ ! -f "$LABELS/faces.jsonl" ]; then
  [ -x "$LABEL_FACES" ] || { echo "mine-hits: $LABEL_FACES not built (needs libdlib-dev)" >&2; exit 1; }
  "$LABEL_FACES" --data "$DATA" --out "$LABELS/faces.jsonl.part"
  mv "$LABELS/faces.jsonl.part" "$LABELS/faces.jsonl"
fi
# The hits belong to the built-in cascade they were mined with: a new one mines again.
CASCADE="$(sha256sum "$(dirname "$0")/../models/mdcb.bin" | cut -d' ' -f1)"
if [ ! -f "$LABELS/hits.tsv" ] || [ ! -f "$LABELS/hits.f32" ] || [ "$(cat "$LABELS/hits.cascade" 2>/dev/null)" != "$CASCADE" ]; then
  "$DUMP_HITS" --data "$DATA" --out "$LABELS/hits.part"
  mv "$LABELS/hits.part.f32" "$LABELS/hits.f32"
  mv "$LABELS/hits.part.tsv" "$LABELS/hits.tsv"
  echo "$CASCADE" > "$LABELS/hits.cascade"
fi
echo "mine-hits: labels and mined hits ready in $LABELS"
