#!/usr/bin/env bash
# Each host transition (bench_transitions: 1920x1080 BGRA 8-bit, one thread, progress
# 0.5) beside ffmpeg's xfade doing the same kind of transition on 1920x1080 planar
# 8-bit RGB (gbrp, the planar format xfade takes), single-threaded, as a ratio.
#
# ffmpeg's cost per frame is the wall time of FRAMES frames of xfade over raw gbrp
# inputs, less the time of the same run passing one input through untouched (reading
# and discarding), over FRAMES. Its frames have three 8-bit planes, ours four
# interleaved channels (a third more bytes). Pairs: dissolve and fade, the dips and
# fadeblack / fadewhite, wipes and wipeleft / wipeup, push and slideleft (ffmpeg's
# slide moves both pictures), slide and slideleft (the nearest: ffmpeg has no cover
# transition in this version), iris and circleopen.
#
# Environment: BUILD_DIR (default build), FRAMES (default 50), RUNS (default 3, the
# fastest run counts), WORK_DIR (default a fresh temporary folder, removed at the
# end). Needs ffmpeg (scripts/install-bench-deps) and a build with the benchmarks
# (target bench_transitions).
set -euo pipefail

ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
FRAMES="${FRAMES:-50}"
RUNS="${RUNS:-3}"
BENCH="$BUILD_DIR/bin/bench_transitions"

SCRIPT=transitions-vs-ffmpeg
source "$ROOT/bench/compare/common.sh"
need_built "$BENCH" bench_transitions
need_tools ffmpeg

FF=(ffmpeg -hide_banner -nostdin -loglevel error -nostats)
RAW=(-f rawvideo -pix_fmt gbrp -s 1920x1080 -r 25)
if [ ! -s "$WORK_DIR/b.gbrp" ]; then
  "${FF[@]}" -f lavfi -i "testsrc2=s=1920x1080:r=25" -frames:v "$FRAMES" -pix_fmt gbrp -f rawvideo -y "$WORK_DIR/a.gbrp"
  "${FF[@]}" -f lavfi -i "mandelbrot=s=1920x1080:r=25" -frames:v "$FRAMES" -pix_fmt gbrp -f rawvideo -y "$WORK_DIR/b.gbrp"
fi

# Milliseconds per frame of our transitions, by benchmark name.
taskset -c 0 "$BENCH" --benchmark_format=csv --benchmark_min_time=0.3 2>/dev/null |
  awk -F, '/^"BM_Transition\// { gsub(/"/, "", $1); sub(/BM_Transition\//, "", $1); print $1, $3 }' \
  >"$WORK_DIR/ours.txt"

# Seconds of the fastest of RUNS ffmpeg runs of filter graph $1, pinned to one core.
ffmpeg_seconds() {
  local best=""
  for _ in $(seq "$RUNS"); do
    local start end
    start=$(date +%s%N)
    taskset -c 0 "${FF[@]}" -threads 1 -filter_threads 1 -filter_complex_threads 1 \
      "${RAW[@]}" -i "$WORK_DIR/a.gbrp" "${RAW[@]}" -i "$WORK_DIR/b.gbrp" \
      -filter_complex "$1" -map '[out]' -frames:v "$FRAMES" -f null -
    end=$(date +%s%N)
    best=$(awk -v s="$start" -v e="$end" -v b="$best" \
      'BEGIN { t = (e - s) / 1e9; if (b == "" || t < b) b = t; print b }')
  done
  echo "$best"
}

base=$(ffmpeg_seconds "[0:v]null[out]")
echo "transitions-vs-ffmpeg: 1920x1080, one thread, ms per frame"
echo "| transition | xfade | vrender | ffmpeg | vrender / ffmpeg |"
echo "|------------|-------|---------|--------|------------------|"
while read -r ours theirs; do
  v=$(awk -v n="$ours" '$1 == n { print $2 }' "$WORK_DIR/ours.txt")
  t=$(ffmpeg_seconds "[0:v][1:v]xfade=transition=$theirs:duration=$((FRAMES / 25 + 1)):offset=0[out]")
  awk -v o="$ours" -v x="$theirs" -v v="$v" -v t="$t" -v b="$base" -v n="$FRAMES" \
    'BEGIN { f = (t - b) * 1000 / n; printf "| %s | %s | %.2f | %.2f | %.2f |\n", o, x, v, f, v / f }'
done <<'PAIRS'
CrossDissolve fade
DipToBlack fadeblack
DipToWhite fadewhite
WipeLeft wipeleft
WipeTop wipeup
WipeBorderSoft wipeleft
PushLeft slideleft
SlideLeft slideleft
Iris circleopen
PAIRS
