#!/usr/bin/env bash
# Runs the detection benchmarks in one go, from one build, so that every ratio
# is read off one run: the byte pass against the integral image and the
# exhaustive search (bench_detector), the whole detect entry per detection
# mode on a 640 x 480 frame (bench_api), and our engine against OpenCV's
# CascadeClassifier on the development photos and clips (quorin-compare-opencv,
# see bench/compare/run_compare.sh for what it measures; here timed by each
# thread's CPU clock, as the machines are shared). Google Benchmark
# cases run with repetitions and report medians. Uses an existing build
# directory as it is (it configures nothing), so that a profiling build
# (RelWithDebInfo) can be measured; prints everything and keeps a copy in
# out/bench-all.txt.
#
#   bash bench/run_all.sh [BUILD_DIR]     default build/
#   REPS=5 CLIPS="franck cap12_edit" FRAMES=300 bash bench/run_all.sh
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
BUILD="$(cd "${1:-$ROOT/build}" && pwd)"
CACHE="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
REPS="${REPS:-5}"
CLIPS="${CLIPS:-franck cap12_edit cap13_edit2}"
FRAMES="${FRAMES:-300}"

cmake --build "$BUILD" -j2 --target bench_detector bench_api quorin-compare-opencv >/dev/null
gbench=(--benchmark_repetitions="$REPS" --benchmark_report_aggregates_only=true)

mkdir -p "$ROOT/out"
{
  echo "== integral image against the byte pass; exhaustive search (medians of $REPS)"
  "$BUILD/bench/detector/bench_detector" "${gbench[@]}" 2>&1 | grep -E "median|^Benchmark|^-" || true
  echo
  echo "== quorin_detect per detection mode, 640 x 480 (medians of $REPS)"
  "$BUILD/bench/api/bench_api" --benchmark_filter=BM_DetectEntryMode "${gbench[@]}" 2>&1 |
    grep -E "median|^Benchmark|^-" || true
  echo
  echo "== against OpenCV (one thread each)"
  shopt -s nullglob
  photos=("$CACHE"/photos/*.jpg "$CACHE"/photos/*.png)
  labels=()
  [ -s "$CACHE/labels/faces.jsonl" ] && labels=(--labels "$CACHE/labels/faces.jsonl")
  prog="$BUILD/bench/compare/quorin-compare-opencv"
  first=1
  for clip in $CLIPS; do
    video="$CACHE/videos/$clip.mp4"
    [ -f "$video" ] || { echo "clip $clip missing in $CACHE/videos"; continue; }
    size="$(ffprobe -v error -select_streams v:0 -show_entries stream=width,height -of csv=s=x:p=0 "$video")"
    raw="$CACHE/compare/$clip-$FRAMES.gray"
    if [ ! -s "$raw" ]; then
      mkdir -p "$CACHE/compare"
      ffmpeg -nostdin -v error -i "$video" -frames:v "$FRAMES" -f rawvideo -pix_fmt gray "$raw.tmp"
      mv "$raw.tmp" "$raw"
    fi
    # The photos once, with the first clip; the other clips alone.
    if [ "$first" = 1 ]; then
      "$prog" --repeats 3 --cv-threads 1 --cpu-time "${labels[@]}" --video "$raw" --video-size "$size" \
        --video-frames "$FRAMES" "${photos[@]}"
      first=0
    else
      "$prog" --repeats 3 --cv-threads 1 --cpu-time --video "$raw" --video-size "$size" --video-frames "$FRAMES" |
        grep -E "clip|frames" || true
    fi
  done
} | tee "$ROOT/out/bench-all.txt"
