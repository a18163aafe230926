#!/usr/bin/env bash
# Renders Y4M clips that ffmpeg writes from testsrc2 (640x480, BT.601, and
# 1280x720, BT.709) to PNG frames with vrender, and compares them with
# ffmpeg's own RGB conversion of the same frames. Prints the PSNR of each
# and fails when one is below the threshold (40 dB: within a code value or
# two, the difference being chroma upsampling).
#
#   BUILD_DIR=build bench/compare/y4m-vs-ffmpeg.sh
# Needs ffmpeg (scripts/install-bench-deps).
set -euo pipefail
BUILD_DIR=${BUILD_DIR:-build}
VRENDER="$BUILD_DIR/bin/vrender"
THRESHOLD=${THRESHOLD:-40}
[ -x "$VRENDER" ] || { echo "no $VRENDER: build it first (cmake --build $BUILD_DIR --target vrender)" >&2; exit 2; }
command -v ffmpeg >/dev/null || { echo "ffmpeg is missing: run scripts/install-bench-deps" >&2; exit 2; }

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
status=0
for case in "640x480 bt601" "1280x720 bt709"; do
  set -- $case
  size=$1 matrix=$2
  dir="$work/$size"
  mkdir -p "$dir"
  ffmpeg -v error -f lavfi -i "testsrc2=size=$size:rate=25" -frames:v 10 -pix_fmt yuv420p "$dir/clip.y4m"
  "$VRENDER" source "$dir/clip.y4m" -q -o "$dir/ours/f_%05d.png" 2>/dev/null
  ffmpeg -v error -i "$dir/clip.y4m" -start_number 0 \
    -vf "scale=in_color_matrix=$matrix:in_range=tv" -pix_fmt rgb24 "$dir/theirs_%05d.png"
  psnr=$(ffmpeg -i "$dir/ours/f_%05d.png" -i "$dir/theirs_%05d.png" \
    -lavfi "[0:v]format=rgb24[a];[1:v]format=rgb24[b];[a][b]psnr" -f null - 2>&1 |
    sed -n 's/.*average:\([0-9.inf]*\).*/\1/p' | tail -1)
  verdict=ok
  if [ "$psnr" != "inf" ] && awk -v p="$psnr" -v t="$THRESHOLD" 'BEGIN { exit !(p < t) }'; then
    verdict="BELOW $THRESHOLD dB"
    status=1
  fi
  printf '%-9s %-6s PSNR %s dB  %s\n' "$size" "$matrix" "$psnr" "$verdict"
done
exit $status
