#!/usr/bin/env bash
# quorin.Detect and quorin-detect print the same JSON lines for the lossless
# development photos (the two decode them with different codecs, so JPEG
# photos could differ in their last bits).
#   same_json.sh QUORIN_DETECT JAVA_COMMAND...
set -euo pipefail
native="$1"; shift
data="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}/photos"
photos=("$data/tracking_faces_test.png" "$data/average.png")
for p in "${photos[@]}"; do
  [ -f "$p" ] || { echo "SKIPPED: development data not found in $data (run scripts/fetch-data.sh)"; exit 77; }
done
expected="$("$native" "${photos[@]}")"
actual="$("$@" "${photos[@]}")"
if [ "$expected" != "$actual" ]; then
  diff <(echo "$expected") <(echo "$actual") || true
  exit 1
fi
grep -q '"rect"' <<<"$actual" || { echo "no faces found: the comparison proves nothing"; exit 1; }
echo "same JSON for ${#photos[@]} photos"
