#!/usr/bin/env bash
# The reference jobs J1, J2 and J3 (examples/bench/) rendered through
# `vrender render`, through ffmpeg and through melt doing the same work, 1920x1080,
# 25 frames per second, 100 frames, in one run. Prints the median of RUNS runs of
# whole-process wall time as milliseconds per frame, and vrender's ratio to each;
# then checks frame 50 of each job against ffmpeg's frame 50.
#
#   bench/compare/jobs.sh                 # single-threaded and default threads
#   MODES=1t bench/compare/jobs.sh        # single-threaded only
#
# Modes: 1t pins every program to one core (taskset) with vrender -j 1, ffmpeg
# -threads 1 -filter_threads 1 -filter_complex_threads 1, melt real_time=0 and one
# slice; def gives each program its defaults on both cores. Output: vrender writes a
# 4:4:4 Y4M stream, ffmpeg and melt raw RGBA, all to /dev/null. vrender composites at
# quality 4 (8-bit, bilinear), which is what the other two do.
#
# The frame 50 check converts both frames to RGBA and compares them: J1 within 2
# code values everywhere (8-bit rounding); J2 at a PSNR of at least 25 dB over the
# frame and 40 dB over the background above the inset. ffmpeg places the inset at
# whole pixels (x 484 at frame 50) and vrender at fractions of a pixel (484.85), so
# every sharp edge of the inset differs by up to a whole code range at one pixel, and
# ffmpeg's chroma up-sampling rings at the edges of the colour bars; ffmpeg is told to
# read the clips as BT.709, as vrender does for pictures of 720 rows and more.
#
# J3 (a 25-frame cross dissolve) is checked the same way at frame 50, the middle of
# the dissolve (B's weight 0.48): ffmpeg's xfade blends in planar 8-bit RGB, vrender
# in packed 8-bit BGRA, and the two up-sample the clips' chroma differently, so the
# frame must match at a PSNR of at least 35 dB with at most 2 % of its colour values
# more than 16 code values apart (those sit on the sharp edges of clipA's pattern;
# measured: 38.4 dB, 0.8 %, and both frames blend B at a weight of 0.48).
#
# Environment: BUILD_DIR (default build), RUNS (default 3), MODES (default "1t def"),
# JOBS (default "J1 J2 J3"),
# WORK_DIR (default a fresh temporary folder, removed at the end). Needs ffmpeg, melt
# and python3 (scripts/install-bench-deps) and a built vrender.
set -euo pipefail

ROOT="$(cd "$(dirname "${BASH_SOURCE[0]}")/../.." && pwd)"
BUILD_DIR="${BUILD_DIR:-$ROOT/build}"
RUNS="${RUNS:-3}"
MODES="${MODES:-1t def}"
JOBS="${JOBS:-J1 J2 J3}"
VRENDER="$BUILD_DIR/bin/vrender"

SCRIPT=jobs
source "$ROOT/bench/compare/common.sh"
need_built "$VRENDER" vrender
need_tools ffmpeg melt python3 time
MEDIA="$WORK_DIR/media"
mkdir -p "$MEDIA" "$WORK_DIR/f50"
FF=(ffmpeg -hide_banner -nostdin -loglevel error -nostats)
if [ ! -s "$MEDIA/clipB.y4m" ]; then
  echo "jobs: generating the media in $MEDIA" >&2
  "${FF[@]}" -f lavfi -i "testsrc2=s=1920x1080:r=25" -frames:v 1 -pix_fmt rgba -y "$MEDIA/still.png"
  "${FF[@]}" -f lavfi -i "testsrc2=s=1920x1080:r=25:d=4" -pix_fmt yuv420p -f yuv4mpegpipe -y "$MEDIA/clipA.y4m"
  "${FF[@]}" -f lavfi -i "mandelbrot=s=1920x1080:r=25" -frames:v 100 -pix_fmt yuv420p -f yuv4mpegpipe -y "$MEDIA/clipB.y4m"
fi
cp "$ROOT/examples/bench/J1.json" "$ROOT/examples/bench/J2.json" "$ROOT/examples/bench/J3.json" "$WORK_DIR/"

# The filter graphs of ffmpeg's side. $2 is an extra step at the end (frame
# selection); $3 "bt709" reads the clips as BT.709.
ff_graph() {
  local job=$1 tail=${2:-} bg="" fg=""
  if [ "${3:-}" = bt709 ]; then bg="scale=in_color_matrix=bt709,"; fg=":in_color_matrix=bt709"; fi
  case $job in
  J1) echo "color=c=0x2050A0:s=1920x1080:r=25,format=rgba[bg];[0:v]format=rgba,colorchannelmixer=aa=0.5,loop=loop=-1:size=1:start=0[fg];[bg][fg]overlay=x=0:y=0:format=rgb,format=rgba${tail}[out]" ;;
  J2) echo "[0:v]${bg}format=rgba[bg];[1:v]scale=960:540:flags=bilinear${fg},format=rgba[fg];[bg][fg]overlay=x='960*t/3.96':y='540*t/3.96':eval=frame:format=rgb,format=rgba${tail}[out]" ;;
  J3) echo "[0:v]${bg}format=gbrap[a];[1:v]${bg}format=gbrap[b];[a][b]xfade=transition=fade:duration=1:offset=1.52,format=rgba${tail}[out]" ;;
  esac
}
ff_inputs() {
  case $1 in
  J1) echo "$MEDIA/still.png" ;;
  J2) echo "$MEDIA/clipB.y4m $MEDIA/clipA.y4m" ;;
  J3) echo "$MEDIA/clipA.y4m $MEDIA/clipB.y4m" ;;
  esac
}

# One command line per program and job into the arrays ours, ffmpeg_cmd, melt_cmd.
commands() {
  local job=$1 mode=$2 ti=() tg=() vj=() inputs=()
  if [ "$mode" = 1t ]; then ti=(-threads 1); tg=(-filter_threads 1 -filter_complex_threads 1); vj=(-j 1); fi
  ours=("$VRENDER" render "$WORK_DIR/$job.json" -q --quality 4 "${vj[@]}" --y4m --chroma 444)
  for input in $(ff_inputs "$job"); do inputs+=("${ti[@]}" -i "$input"); done
  ffmpeg_cmd=("${FF[@]}" "${tg[@]}" "${inputs[@]}" -filter_complex "$(ff_graph "$job")"
    -map '[out]' -frames:v 100 "${ti[@]}" -f rawvideo -pix_fmt rgba -y /dev/null)
  local rt=-1 env=()
  [ "$mode" = 1t ] && { rt=0; env=(MLT_SLICES_COUNT=1); }
  melt_cmd=(env "${env[@]}" melt -silent -quiet -profile atsc_1080p_25)
  case $job in
  J1) melt_cmd+=("colour:0x2050A0ff" in=0 out=99 -track "$MEDIA/still.png" in=0 out=99
        -transition affine a_track=0 b_track=1 in=0 out=99 "rect=0 0 1920 1080 0.5") ;;
  J2) melt_cmd+=("$MEDIA/clipB.y4m" in=0 out=99 -track "$MEDIA/clipA.y4m" in=0 out=99
        -transition affine a_track=0 b_track=1 in=0 out=99 "rect=0=0 0 960 540 1;99=960 540 960 540 1") ;;
  J3) melt_cmd+=("$MEDIA/clipA.y4m" in=0 out=62 "$MEDIA/clipB.y4m" in=0 out=61 -mix 25 -mixer luma) ;;
  esac
  melt_cmd+=(-consumer "avformat:/dev/null" f=rawvideo vcodec=rawvideo pix_fmt=rgba an=1 rescale=bilinear real_time=$rt)
}

# Wall seconds of one run (output discarded), pinned to one core in mode 1t.
measure() {
  local mode=$1; shift
  local pin=()
  [ "$mode" = 1t ] && pin=(taskset -c 0)
  /usr/bin/time -o "$WORK_DIR/time.txt" -f '%e' "${pin[@]}" "$@" >/dev/null 2>"$WORK_DIR/stderr.txt" || {
    echo "jobs: failed: $*" >&2; cat "$WORK_DIR/stderr.txt" >&2; exit 1; }
  cat "$WORK_DIR/time.txt"
}
median() {
  local mode=$1; shift
  for _ in $(seq "$RUNS"); do measure "$mode" "$@"; done | sort -g | awk -v n="$RUNS" 'NR == int((n + 1) / 2)'
}

echo "jobs: 100 frames of 1920x1080, median of $RUNS runs, ms per frame (start-up included)"
echo "| job | mode | vrender | ffmpeg | melt | vrender / ffmpeg | vrender / melt |"
echo "|-----|------|---------|--------|------|------------------|----------------|"
for job in $JOBS; do
  for mode in $MODES; do
    commands "$job" "$mode"
    v=$(median "$mode" "${ours[@]}")
    f=$(median "$mode" "${ffmpeg_cmd[@]}")
    m=$(median "$mode" "${melt_cmd[@]}")
    awk -v j="$job" -v md="$mode" -v v="$v" -v f="$f" -v m="$m" \
      'BEGIN { printf "| %s | %s | %.1f | %.1f | %.1f | %.2f | %.2f |\n", j, md, v * 10, f * 10, m * 10, v / f, v / m }'
  done
done

# Frame 50 against ffmpeg's.
to_rgba() { "${FF[@]}" -i "$1" -f rawvideo -pix_fmt rgba -y "$2"; }
status=0
for job in $JOBS; do
  rm -f "$WORK_DIR"/f50/*
  "$VRENDER" render "$WORK_DIR/$job.json" -q --quality 4 --frames 50:50 -y -o "$WORK_DIR/f50/vr_%05d.png" 2>/dev/null
  inputs=()
  for input in $(ff_inputs "$job"); do inputs+=(-i "$input"); done
  "${FF[@]}" "${inputs[@]}" -filter_complex "$(ff_graph "$job" ",select='eq(n\,50)'" bt709)" \
    -map '[out]' -frames:v 1 -y "$WORK_DIR/f50/ff.png"
  to_rgba "$WORK_DIR/f50/vr_00050.png" "$WORK_DIR/f50/vr.rgba"
  to_rgba "$WORK_DIR/f50/ff.png" "$WORK_DIR/f50/ff.rgba"
  python3 - "$job" "$WORK_DIR/f50/vr.rgba" "$WORK_DIR/f50/ff.rgba" <<'PY' || status=1
import math, sys
job, ours, theirs = sys.argv[1], open(sys.argv[2], "rb").read(), open(sys.argv[3], "rb").read()
if len(ours) != len(theirs):
    sys.exit(f"{job} frame 50: sizes differ ({len(ours)} and {len(theirs)} bytes)")
far = 0
def compare(rows):  # colour only: R, G, B of rows [0, rows)
    global far
    worst, squares, count, far = 0, 0, 0, 0
    for i in range(0, min(len(ours), rows * 1920 * 4), 4):
        for c in range(3):
            d = abs(ours[i + c] - theirs[i + c])
            worst = max(worst, d); squares += d * d; count += 1; far += d > 16
    far /= max(count, 1)
    return worst, float("inf") if squares == 0 else 10 * math.log10(255 * 255 * count / squares)
worst, psnr = compare(1080)
if job == "J1":
    ok, text = worst <= 2, ""
elif job == "J3":
    ok, text = psnr >= 35 and far <= 0.02, f", {100 * far:.2f} % of values more than 16 apart"
else:
    # Above row 260 only the background shows (the inset starts at row 272).
    _, background = compare(260)
    ok, text = psnr >= 25 and background >= 40, f", background above the inset {background:.1f} dB"
print(f"{job} frame 50 against ffmpeg: largest difference {worst}, PSNR {psnr:.1f} dB{text}: {'ok' if ok else 'FAILED'}")
sys.exit(0 if ok else 1)
PY
done
exit $status
