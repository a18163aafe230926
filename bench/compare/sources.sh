#!/usr/bin/env bash
# Whole-process comparison of source renders through vrender and through ffmpeg on
# the same 1080p 4:2:0 Y4M clip, in one run: pass-through, scaling to 960x540
# (bilinear), deinterlacing, half speed with frame blending (all written as Y4M to
# /dev/null) and 30 frames written as PNG files. For each job it prints the median of
# RUNS runs of wall time, CPU time (user + system), peak memory (maximum resident set)
# and minor page faults, and the ratios vrender / ffmpeg.
#
#   bench/compare/sources.sh                  # one core: -j 1 against -threads 1
#   CORES=2 bench/compare/sources.sh          # both cores: -j 4 against ffmpeg's default
#   FRAMES=1000 bench/compare/sources.sh      # memory and faults against the frame count
#
# With CORES=1 both programs are also pinned to one core (taskset), so that neither
# gains from worker threads. Environment: BUILD_DIR (default build), FRAMES (default
# 100), RUNS (default 3), CORES (1 or 2), JOBS (only this comma-separated subset of
# passthrough,scale,deinterlace,halfspeed,png), WORK_DIR (default a fresh temporary
# folder, removed at the end). Needs ffmpeg (scripts/install-bench-deps) and vrender.
set -euo pipefail

ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
FRAMES="${FRAMES:-100}"
RUNS="${RUNS:-3}"
CORES="${CORES:-1}"
JOBS="${JOBS:-passthrough,scale,deinterlace,halfspeed,png}"
VRENDER="$BUILD_DIR/bin/vrender"

SCRIPT=sources
source "$ROOT/bench/compare/common.sh"
need_built "$VRENDER" vrender
need_tools ffmpeg time
CLIP="$WORK_DIR/clip-1080p-420.y4m"
if [ ! -s "$CLIP" ]; then
  echo "sources: generating $FRAMES frames of 1920x1080 4:2:0 in $CLIP" >&2
  ffmpeg -hide_banner -loglevel error -f lavfi -i "testsrc2=size=1920x1080:rate=25" \
    -frames:v "$FRAMES" -pix_fmt yuv420p -y "$CLIP"
fi
# The same frames marked as interlaced, upper field first, for the deinterlace job.
INTERLACED="$WORK_DIR/clip-1080i-420.y4m"
if [ ! -s "$INTERLACED" ]; then
  ffmpeg -hide_banner -loglevel error -i "$CLIP" -vf setfield=tff -pix_fmt yuv420p -y "$INTERLACED"
fi

if [ "$CORES" = 1 ]; then
  PIN=(taskset -c 0)
  VR_THREADS=(-j 1)
  FF_THREADS=(-threads 1 -filter_threads 1)
else
  PIN=()
  VR_THREADS=(-j "$((2 * CORES))")
  FF_THREADS=()
fi

# One measurement: "wall cpu peak_kib minor_faults" of a command, its output discarded.
measure() {
  local stats="$WORK_DIR/time.txt"
  /usr/bin/time -o "$stats" -f '%e %U %S %M %R' "${PIN[@]}" "$@" >/dev/null 2>"$WORK_DIR/stderr.txt" || {
    echo "sources: failed: $*" >&2
    cat "$WORK_DIR/stderr.txt" >&2
    exit 1
  }
  awk '{ printf "%.3f %.3f %d %d\n", $1, $2 + $3, $4, $5 }' "$stats"
}

# The median, field by field, of RUNS measurements.
median_of_runs() {
  local runs=()
  for _ in $(seq "$RUNS"); do runs+=("$(measure "$@")"); done
  printf '%s\n' "${runs[@]}" | awk -v n="$RUNS" '
    { for (f = 1; f <= 4; f++) v[f, NR] = $f }
    END {
      for (f = 1; f <= 4; f++) {
        for (i = 1; i <= n; i++) a[i] = v[f, i]
        for (i = 2; i <= n; i++) for (j = i; j > 1 && a[j - 1] > a[j]; j--) { t = a[j]; a[j] = a[j - 1]; a[j - 1] = t }
        printf "%s%s", a[int((n + 1) / 2)], (f < 4 ? " " : "\n")
      }
    }'
}

run_job() {
  local name=$1
  local png_dir="$WORK_DIR/png"
  case $name in
  passthrough)
    ours=("$VRENDER" source "$CLIP" -q "${VR_THREADS[@]}" --y4m)
    theirs=(ffmpeg -hide_banner -loglevel error "${FF_THREADS[@]}" -i "$CLIP" -f yuv4mpegpipe -y /dev/null) ;;
  scale)
    ours=("$VRENDER" source "$CLIP" -q "${VR_THREADS[@]}" --scale 960x540 --y4m)
    theirs=(ffmpeg -hide_banner -loglevel error "${FF_THREADS[@]}" -i "$CLIP"
      -vf scale=960:540:flags=bilinear -f yuv4mpegpipe -y /dev/null) ;;
  deinterlace)
    ours=("$VRENDER" source "$INTERLACED" -q "${VR_THREADS[@]}" --deinterlace --y4m)
    theirs=(ffmpeg -hide_banner -loglevel error "${FF_THREADS[@]}" -i "$INTERLACED" -vf yadif -f yuv4mpegpipe -y /dev/null) ;;
  halfspeed)
    ours=("$VRENDER" source "$CLIP" -q "${VR_THREADS[@]}" --speed 0.5 --frame-blend --y4m)
    theirs=(ffmpeg -hide_banner -loglevel error "${FF_THREADS[@]}" -i "$CLIP"
      -vf "setpts=2*PTS,framerate=fps=25" -f yuv4mpegpipe -y /dev/null) ;;
  png)
    rm -rf "$png_dir" && mkdir -p "$png_dir"
    ours=("$VRENDER" source "$CLIP" -q "${VR_THREADS[@]}" --count 30 -y -o "$png_dir/ours_%05d.png")
    theirs=(ffmpeg -hide_banner -loglevel error "${FF_THREADS[@]}" -i "$CLIP" -frames:v 30 -y "$png_dir/theirs_%05d.png") ;;
  *)
    echo "sources: unknown job $name" >&2
    exit 2 ;;
  esac
  # The Y4M jobs write to standard output, which measure() discards.
  read -r ow oc om of < <(median_of_runs "${ours[@]}")
  read -r tw tc tm tf < <(median_of_runs "${theirs[@]}")
  awk -v n="$name" -v ow="$ow" -v oc="$oc" -v om="$om" -v of="$of" \
    -v tw="$tw" -v tc="$tc" -v tm="$tm" -v tf="$tf" 'function r(a, b) { return b > 0 ? a / b : 0 }
    BEGIN {
      printf "| %-11s | %6.3f | %6.3f | %5.1f | %6.3f | %6.3f | %5.1f | %5.0f | %5.0f | %4.1f | %7d | %7d | %5.1f |\n",
        n, ow, tw, r(ow, tw), oc, tc, r(oc, tc), om / 1024, tm / 1024, r(om, tm), of, tf, r(of, tf)
    }'
}

echo "sources: $FRAMES frames, $CORES core(s), median of $RUNS runs"
echo "| job         | wall s | ffmpeg | ratio |  cpu s | ffmpeg | ratio | MiB   | ffmpeg| ratio|  faults |  ffmpeg | ratio |"
echo "|-------------|--------|--------|-------|--------|--------|-------|-------|-------|------|---------|---------|-------|"
IFS=, read -r -a job_list <<<"$JOBS"
for job in "${job_list[@]}"; do run_job "$job"; done
