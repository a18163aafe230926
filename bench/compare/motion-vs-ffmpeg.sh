#!/usr/bin/env bash
# Times the half-size bilinear motion (a 1920x1080 clip drawn at half size over another)
# through the image renderer (ir_motion_job) and through ffmpeg's
# scale=960:540:flags=bilinear,overlay on the same raw BGRA frames, both single-threaded,
# and prints the ratio. Needs ffmpeg (scripts/install-bench-deps) and a build with the
# benchmarks (ir_motion_job).
#
# Environment: BUILD_DIR (default build), FRAMES (default 100), RUNS (default 3, the
# fastest run counts), WORK_DIR (default a fresh temporary folder, removed at the end).
set -euo pipefail

ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
FRAMES="${FRAMES:-100}"
RUNS="${RUNS:-3}"
WIDTH=1920
HEIGHT=1080
HALF_W=$((WIDTH / 2))
HALF_H=$((HEIGHT / 2))
# Where the half-size foreground's top-left corner lands.
OFFSET_X=480
OFFSET_Y=270

JOB="$BUILD_DIR/bin/ir_motion_job"
SCRIPT=motion-vs-ffmpeg
source "$ROOT/bench/compare/common.sh"
need_built "$JOB" ir_motion_job
need_tools ffmpeg
BG="$WORK_DIR/background.bgra"
FG="$WORK_DIR/foreground.bgra"

echo "motion-vs-ffmpeg: generating $FRAMES frames of two ${WIDTH}x${HEIGHT} clips in $WORK_DIR"
if [ ! -s "$BG" ]; then
  ffmpeg -hide_banner -loglevel error -f lavfi -i "testsrc2=size=${WIDTH}x${HEIGHT}:rate=25" \
    -frames:v "$FRAMES" -pix_fmt bgra -f rawvideo -y "$BG"
fi
if [ ! -s "$FG" ]; then
  ffmpeg -hide_banner -loglevel error -f lavfi -i "mandelbrot=size=${WIDTH}x${HEIGHT}:rate=25" \
    -frames:v "$FRAMES" -pix_fmt bgra -f rawvideo -y "$FG"
fi

# Wall-clock seconds of the fastest of RUNS runs of a command.
fastest() {
  local best=""
  for _ in $(seq "$RUNS"); do
    local start end
    start=$(date +%s%N)
    "$@" >/dev/null 2>&1
    end=$(date +%s%N)
    local seconds
    seconds=$(awk -v s="$start" -v e="$end" 'BEGIN { printf "%.3f", (e - s) / 1e9 }')
    if [ -z "$best" ] || awk -v a="$seconds" -v b="$best" 'BEGIN { exit !(a < b) }'; then
      best="$seconds"
    fi
  done
  echo "$best"
}

ours() {
  "$JOB" "$WIDTH" "$HEIGHT" "$FRAMES" "$BG" "$FG" /dev/null "$OFFSET_X" "$OFFSET_Y"
}

theirs() {
  ffmpeg -hide_banner -loglevel error -threads 1 -filter_threads 1 -filter_complex_threads 1 \
    -f rawvideo -pix_fmt bgra -s "${WIDTH}x${HEIGHT}" -i "$BG" \
    -f rawvideo -pix_fmt bgra -s "${WIDTH}x${HEIGHT}" -i "$FG" \
    -filter_complex "[1:v]scale=${HALF_W}:${HALF_H}:flags=bilinear[s];[0:v][s]overlay=x=${OFFSET_X}:y=${OFFSET_Y}:format=rgb" \
    -frames:v "$FRAMES" -pix_fmt bgra -f rawvideo -y /dev/null
}

# One run each to check that both work (and to warm the page cache).
ours 2>&1 | tail -1
theirs

OURS=$(fastest ours)
THEIRS=$(fastest theirs)
awk -v o="$OURS" -v t="$THEIRS" -v n="$FRAMES" 'BEGIN {
  printf "image renderer: %.3f s for %d frames (%.2f ms per frame, reading and writing included)\n", o, n, 1000 * o / n
  printf "ffmpeg:         %.3f s for %d frames (%.2f ms per frame, reading and writing included)\n", t, n, 1000 * t / n
  printf "ratio (ffmpeg / image renderer): %.2f\n", t / o
}'
