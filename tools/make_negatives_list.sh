#!/usr/bin/env bash
# Makes the face-free image list of the cascade trainer (train_cascade --negatives):
# one picture per wallpaper of Debian's desktop-base, gnome-backgrounds,
# mate-backgrounds and plasma-workspace-wallpapers (GNOME's .webp converted to
# PNG with ffmpeg into the data cache), minus the ones that show a person, an
# animal or a face-like figure, plus the development negatives without the
# animal and toy faces. Every third image in list order is "report", the rest
# "train". Vector-only wallpapers (SVG) are left out.
#   usage: tools/make_negatives_list.sh OUT.tsv
#   needs: apt-get install --no-install-recommends desktop-base gnome-backgrounds \
#              mate-backgrounds plasma-workspace-wallpapers ffmpeg
set -euo pipefail
OUT="${1:?usage: make_negatives_list.sh OUT.tsv}"
DATA="${QUORIN_DATA_DIR:-$HOME/.cache/quorin}"
CONV="$DATA/wallpapers"
mkdir -p "$CONV"
# looked through by eye: a person, a cartoon creature, animals, a head-like silhouette
DROP_RE='/(Autumn|FlyingKonqui|Kite|Shell)/|Elephants|/(baboon|squirrel_cls|chicky_512|Blender_Suzanne1|Blender_Suzanne2|HappyFish)\.'
list=()
# KDE-style folders hold one picture at several sizes: take the largest file
for d in /usr/share/wallpapers/*/ /usr/share/desktop-base/*/wallpaper/; do
  f=$(find "$d" -type f \( -name '*.jpg' -o -name '*.png' \) -printf '%s %p\n' 2>/dev/null | sort -n | tail -1 | cut -d' ' -f2-)
  [ -n "$f" ] && list+=("$f")
done
while IFS= read -r f; do list+=("$f"); done < <(find /usr/share/backgrounds/mate -type f \( -name '*.jpg' -o -name '*.png' \) | sort)
for f in /usr/share/backgrounds/gnome/*.webp; do
  [ -f "$f" ] || continue
  p="$CONV/$(basename "${f%.webp}").png"
  [ -f "$p" ] || ffmpeg -loglevel error -y -i "$f" "$p"
  list+=("$p")
done
for f in "$DATA"/negatives/*; do list+=("$f"); done
n=0
: > "$OUT"
for f in "${list[@]}"; do
  [[ "$f" =~ $DROP_RE ]] && continue
  split=train; (( n % 3 == 2 )) && split=report
  printf '%s\t%s\n' "$f" "$split" >> "$OUT"
  n=$((n + 1))
done
echo "$n face-free images -> $OUT" >&2
