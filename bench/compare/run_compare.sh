#!/usr/bin/env bash
# Times our engine against OpenCV's CascadeClassifier in one run on the same
# frames: the development photos (resized to 320, 640 and 1280 long side) and a
# face clip decoded to gray frames for the tracking-mode row. Builds the
# comparison program (Release) in build-compare/, prints the table with OpenCV
# on one thread (as our engine runs) and again with OpenCV's default thread
# count, adds recall against the teacher labels when they are there, and keeps
# a copy in out/compare.txt.
#
#   bash bench/compare/run_compare.sh               clip franck, 300 frames
#   CLIP=cap12_edit FRAMES=200 bash bench/compare/run_compare.sh
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/../.." && pwd)"
BUILD="${QUORIN_COMPARE_BUILD_DIR:-$ROOT/build-compare}"
CACHE="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
CLIP="${CLIP:-franck}"
FRAMES="${FRAMES:-300}"
REPEATS="${REPEATS:-3}"

bash "$ROOT/scripts/setup.sh"
bash "$ROOT/scripts/fetch-data.sh"
[ -f "$CACHE/READY" ] || { echo "run_compare: no development data in $CACHE" >&2; exit 1; }

cmake -S "$ROOT" -B "$BUILD" -DCMAKE_BUILD_TYPE=Release -DQUORIN_WERROR=ON -DQUORIN_BUILD_TESTS=OFF \
  -DQUORIN_BUILD_BENCH=ON >/dev/null
cmake --build "$BUILD" -j2 --target quorin-compare-opencv
PROG="$BUILD/bench/compare/quorin-compare-opencv"
[ -x "$PROG" ] || { echo "run_compare: the comparison was not built (OpenCV missing?)" >&2; exit 1; }

video="$CACHE/videos/$CLIP.mp4"
size="$(ffprobe -v error -select_streams v:0 -show_entries stream=width,height -of csv=s=x:p=0 "$video")"
raw="$CACHE/compare/$CLIP-$FRAMES.gray"
if [ ! -s "$raw" ]; then
  mkdir -p "$CACHE/compare"
  ffmpeg -nostdin -v error -i "$video" -frames:v "$FRAMES" -f rawvideo -pix_fmt gray "$raw.tmp"
  mv "$raw.tmp" "$raw"
fi

mkdir -p "$ROOT/out"
shopt -s nullglob
photos=("$CACHE"/photos/*.jpg "$CACHE"/photos/*.png)
labels=()
[ -s "$CACHE/labels/faces.jsonl" ] && labels=(--labels "$CACHE/labels/faces.jsonl")
{
  for threads in 1 0; do
    "$PROG" --repeats "$REPEATS" --cv-threads "$threads" "${labels[@]}" \
      --video "$raw" --video-size "$size" --video-frames "$FRAMES" "${photos[@]}"
    echo
  done
} | tee "$ROOT/out/compare.txt"
