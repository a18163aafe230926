#!/usr/bin/env bash
# Times each catalogue effect that has an ffmpeg counterpart (effect_job) beside
# that ffmpeg filter on the same raw 1920x1080 BGRA frames, both single-threaded,
# both reading the frames from one file and discarding the results, and prints a
# table of milliseconds per frame and the ratio ffmpeg / ours (above 1: ours is
# faster). Needs ffmpeg (scripts/install-bench-deps) and a build with the
# benchmarks (effect_job).
#
# Pairs: ProcAmp levels / eq, ProcAmp hue and saturation / colorbalance, Luma key /
# lumakey, Chroma key / chromakey, Gaussian Blur / gblur, Crop / crop. ffmpeg's
# filters that work on Y'CbCr or planar pictures pay for their conversions from
# BGRA: that is the cost of doing the same job on the same frames.
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

JOB="$BUILD_DIR/bin/effect_job"
SCRIPT=effects
source "$ROOT/bench/compare/common.sh"
need_built "$JOB" effect_job
need_tools ffmpeg
INPUT="$WORK_DIR/input.bgra"
if [ ! -s "$INPUT" ]; then
  echo "effects: generating $FRAMES frames of ${WIDTH}x${HEIGHT} in $WORK_DIR" >&2
  ffmpeg -hide_banner -loglevel error -f lavfi -i "testsrc2=size=${WIDTH}x${HEIGHT}:rate=25" \
    -frames:v "$FRAMES" -pix_fmt bgra -f rawvideo -y "$INPUT"
fi

# Wall-clock seconds of the fastest of RUNS runs of a command.
fastest() {
  local best=""
  for _ in $(seq "$RUNS"); do
    local start end seconds
    start=$(date +%s%N)
    "$@" >/dev/null 2>&1
    end=$(date +%s%N)
    seconds=$(awk -v s="$start" -v e="$end" 'BEGIN { printf "%.3f", (e - s) / 1e9 }')
    if [ -z "$best" ] || awk -v a="$seconds" -v b="$best" 'BEGIN { exit !(a < b) }'; then
      best="$seconds"
    fi
  done
  echo "$best"
}

ours() {
  "$JOB" "$WIDTH" "$HEIGHT" "$FRAMES" "$INPUT" "$@"
}

theirs() {
  ffmpeg -hide_banner -loglevel error -threads 1 -filter_threads 1 \
    -f rawvideo -pix_fmt bgra -s "${WIDTH}x${HEIGHT}" -i "$INPUT" \
    -vf "$1" -frames:v "$FRAMES" -f null -
}

# name | our match name and parameters | ffmpeg filter
JOBS=(
  "procamp levels|KX.VNTR ProcAmp brightness=10 contrast=120|eq=brightness=0.1:contrast=1.2"
  "procamp colour|KX.VNTR ProcAmp hue=30 saturation=130|colorbalance=rs=0.2:gm=-0.1:bh=0.1"
  "luma key|KX.VNTR Legacy Key Luma threshold=20 softness=10|lumakey=threshold=0.2:tolerance=0.1:softness=0.1"
  "chroma key|KX.VNTR Legacy Key Chroma color=#00FF00 similarity=20 blend=10|chromakey=color=0x00FF00:similarity=0.2:blend=0.1"
  "gaussian blur|VR.GaussianBlur blurriness=10|gblur=sigma=10"
  "crop|VR.Crop left=10 right=10 top=5 bottom=0|crop=1536:1026:192:54"
)

printf "%-15s %10s %10s %8s\n" "effect" "ours ms" "ffmpeg ms" "ratio"
for entry in "${JOBS[@]}"; do
  IFS='|' read -r name ourjob filter <<<"$entry"
  # The match name is every word before the first KEY=VALUE.
  match=""
  params=()
  for word in $ourjob; do
    if [[ "$word" == *=* ]]; then params+=("$word"); else match="${match:+$match }$word"; fi
  done
  ours "$match" "${params[@]}" || { echo "effects: effect_job failed for $name" >&2; exit 1; }
  theirs "$filter" || { echo "effects: ffmpeg failed for $name" >&2; exit 1; }
  OURS=$(fastest ours "$match" "${params[@]}")
  THEIRS=$(fastest theirs "$filter")
  awk -v n="$name" -v o="$OURS" -v t="$THEIRS" -v f="$FRAMES" \
    'BEGIN { printf "%-15s %10.2f %10.2f %8.2f\n", n, 1000 * o / f, 1000 * t / f, t / o }'
done
