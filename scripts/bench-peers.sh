#!/usr/bin/env bash
# Our filters against their nearest peers in FFmpeg, OpenColorIO and OpenCV, on the same frames in
# the same run, every program on one thread pinned to one core. Prints one table: Mpixel/s of
# each at 1080p and 4K, and ours divided by the peer's.
#
#   scripts/bench-peers.sh            (after scripts/setup.sh; builds what it needs)
#   BENCH_CORE=1 FFMPEG_FRAMES=8 MIN_TIME=0.3 scripts/bench-peers.sh
#   BEFORE_REV=<commit> scripts/bench-peers.sh
#   BEFORE_BIN=<dir of bench binaries> scripts/bench-peers.sh
#   NO_BUILD=1 BEFORE_BIN=<dir> scripts/bench-peers.sh   (build/release/bin as it is, no cmake)
#
# Where FFmpeg is not installed, its rows are left out and the rest runs: a machine that has
# only the built binaries (and python3) still gives OpenColorIO's, OpenCV's and our own cases.
#
# With BEFORE_REV, the library at that commit is built with today's benchmarks (in a temporary
# worktree, build/before-<commit>, which later runs reuse), and with BEFORE_BIN its binaries are
# taken as built; either way they run in the same run as ours and the peers, and the table gains
# their figures and the speed-up since.
#
# How each side is timed:
#  - Ours: the Google Benchmark binaries, pixels divided by CPU time per iteration.
#  - FFmpeg: raw BGRA frames in (-f rawvideo -pix_fmt bgra), -threads 1 -filter_threads 1
#    -filter_complex_threads 1, the user CPU time -benchmark reports (utime) for N frames through
#    the filter minus N frames through -vf null, so reading and demuxing the frames cancel out.
#    Where FFmpeg converts the frames for a filter (it inserts a scaler), that conversion is part
#    of its figure, and the table names the format it converted to.
#  - OpenColorIO: bench_peer_ocio_lut, a FileTransform with tetrahedral interpolation through the
#    optimized CPU processor, 8-bit packed BGRA in and out, CPU time per frame.
#  - OpenCV: measured by bench_blur in the same run as our blurs (cv::setNumThreads(1)).
# Every frame is random: the one bench_cube_lut uses (its generator is shared with the OCIO peer,
# which writes the file FFmpeg reads); the other benches draw theirs the same way.
set -euo pipefail
cd "$(dirname "$0")/.."

core=${BENCH_CORE:-1}
ffmpeg_frames=${FFMPEG_FRAMES:-6}
min_time=${MIN_TIME:-0.3}
reps=${CASE_REPS:-3}
pin=(taskset -c "$core")

no_build=${NO_BUILD:-}
tools=(python3 taskset)
[ -n "$no_build" ] || tools+=(cmake)
for tool in "${tools[@]}"; do
  command -v "$tool" >/dev/null || { echo "bench-peers: $tool is missing (scripts/setup.sh)" >&2; exit 1; }
done
have_ffmpeg=$(command -v ffmpeg >/dev/null && echo 1 || true)
[ -n "$have_ffmpeg" ] || echo "bench-peers: ffmpeg is missing: FFmpeg's rows are left out" >&2

benches=(bench_color_adjust bench_white_balance bench_hsl_adjust bench_vignette bench_lens_adjust
         bench_cube_lut bench_lut_effects bench_denoise bench_blur bench_light_adjust
         bench_grade_chain bench_peer_ocio_lut)
if [ -z "$no_build" ]; then
  [ -f build/release/CMakeCache.txt ] || cmake --preset release >/dev/null
  cmake --build build/release -j "$(nproc)" --target "${benches[@]}" >/dev/null
fi
bin=build/release/bin

before_bin=${BEFORE_BIN:-}
if [ -n "${BEFORE_REV:-}" ]; then
  rev=$(git rev-parse --short "$BEFORE_REV")
  tree=build/before-$rev
  if [ ! -d "$tree/src" ]; then
    git worktree add --detach "$tree" "$rev" >/dev/null
  fi
  # Today's benchmarks, so that both sides measure the same cases the same way.
  rm -rf "$tree/bench" && cp -r bench "$tree/bench"
  echo "bench-peers: building $rev with today's benchmarks in $tree" >&2
  (cd "$tree" && { [ -f build/release/CMakeCache.txt ] || cmake --preset release >/dev/null; } &&
    cmake --build build/release -j "$(nproc)" --target "${benches[@]::${#benches[@]}-1}" >/dev/null)
  before_bin=$tree/build/release/bin
fi

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

# The 33-point look the LUT pairs share: a gentle S-curve with a warm shift.
python3 - "$work/look33.cube" <<'PY'
import sys
n = 33
with open(sys.argv[1], "w") as f:
    f.write("LUT_3D_SIZE %d\n" % n)
    for b in range(n):
        for g in range(n):
            for r in range(n):
                c = [v / (n - 1) for v in (r, g, b)]
                c = [0.8 * v + 0.2 * v * v * (3 - 2 * v) for v in c]
                f.write("%.6f %.6f %.6f\n" % (c[0] * 0.97 + 0.03, c[1], c[2] * 0.95))
PY

sizes=("1080p 1920 1080" "4K 3840 2160")
for s in "${sizes[@]}"; do
  read -r label w h <<<"$s"
  "$bin/bench_peer_ocio_lut" --write-frame "$work/$label.raw" "$w" "$h"
done

# --- ours ---------------------------------------------------------------------------------------
# One benchmark binary of SIDE (now, or before where one was given), its results as JSON in OUT.
bench_json() {  # SIDE BINARY FILTER OUT
  local dir=$bin
  if [ "$1" = before ]; then
    [ -n "$before_bin" ] || return 0
    dir=$before_bin
  fi
  mkdir -p "$(dirname "$4")"
  TFX_BENCH_CUBE="$work/look33.cube" "${pin[@]}" "$dir/$2" --benchmark_filter="$3" \
    --benchmark_min_time="$min_time" --benchmark_out="$4" --benchmark_out_format=json \
    >/dev/null 2>&1 || echo "bench-peers: $2 failed ($1)" >&2
}
ours() {  # BINARY FILTER
  bench_json now "$1" "$2" "$work/$1.json"
  bench_json before "$1" "$2" "$work/before/$1.json"
}
echo "bench-peers: our benchmarks on core $core${before_bin:+, and before from $before_bin}" >&2
ours bench_color_adjust '^BM_ColorAdjust/[^/]+/vibrance/'
ours bench_white_balance '^BM_WhiteBalanceAdjust/'
ours bench_hsl_adjust '^BM_HSLAdjust/[^/]+/all8/'
ours bench_vignette '^BM_Vignette/[^/]+/darken/'
ours bench_lens_adjust '^BM_Lens/[^/]+/distortion/'
ours bench_cube_lut '^BM_CubeLutDoLUT/[^/]+/file/'
ours bench_lut_effects '^BM_ChromeKeyLut3d/[^/]+/mask/'
ours bench_denoise '^BM_DeNoiseRGB/'
ours bench_blur '^BM_(GaussianBlur|CvGaussianBlur)/[^/]+/bgra|^BM_(FastAverageBlur|CvBlur)/[^/]+/bgr/r7/|^BM_(FastFilter|CvMedianBlur)/[^/]+/r7/'

# Our own cases at 4K, each beside the memcpy of the frame in the same binary and invocation, in
# CASE_REPS rounds (default 3); within a round before and now run back to back, in turns first.
# Each figure is the median over the rounds of what one round gives (a fraction of that
# invocation's memcpy, a speed-up over the same round's before): on a shared machine the speed of
# memory and of the cores drifts by tens of percent within minutes, and a ratio of two fastest
# times taken at different moments carries that drift into the table.
# FIRST and SECOND in that order in odd rounds and the other way round in even ones.
in_turns() {  # ROUND FIRST SECOND
  if [ $(($1 % 2)) -eq 1 ]; then echo "$2 $3"; else echo "$3 $2"; fi
}
our_case() {  # BINARY FILTER
  local round side
  for round in $(seq "$reps"); do
    for side in $(in_turns "$round" now before); do
      bench_json "$side" "$1" "$2|^BM_Memcpy/4K/" "$work/cases/$side/$1.$round.json"
    done
  done
}
echo "bench-peers: our cases against memcpy" >&2
our_case bench_grade_chain '^BM_GradeChain/4K/'
our_case bench_color_adjust '^BM_ColorAdjust/4K/all5/'
our_case bench_light_adjust '^BM_LightAdjust/4K/all4/'
our_case bench_white_balance '^BM_(WhiteBalanceAdjust|temperatureAdjustment)/4K/'
our_case bench_vignette '^BM_Vignette/4K/darken/'
our_case bench_hsl_adjust '^BM_(HSLAdjust/4K/all8|HueAdjust/4K/30deg)/'
our_case bench_lens_adjust '^BM_Lens/4K/(both|distortion_rebuilt_each_frame)/'
our_case bench_cube_lut '^BM_CubeLutDoLUT/4K/(33|64)/(random|photo)/'
our_case bench_lut_effects '^BM_(ColorLut3dAdjust/4K/cube(33|64)|ChromeKeyLut3d/4K/(mask|beauty))/'
our_case bench_denoise '^BM_DeNoise(RGB|Lumiance)/4K/'
our_case bench_blur '^BM_(FastAverageBlur|CvBlur)/4K/bgr/r7/|^BM_(FastFilter|CvMedianBlur)/4K/r3/'

# --- OpenColorIO --------------------------------------------------------------------------------
echo "bench-peers: OpenColorIO" >&2
for s in "${sizes[@]}"; do
  read -r label w h <<<"$s"
  echo "$label $("${pin[@]}" "$bin/bench_peer_ocio_lut" "$work/look33.cube" "$w" "$h" 2)" \
    >>"$work/ocio.txt"
done

# --- FFmpeg -------------------------------------------------------------------------------------
# FILTER_ID SIZE FRAMES GRAPH: utime of the graph minus utime of null, and the format FFmpeg
# converted the frames to, if it did.
ffmpeg_run() {  # SIZE FRAMES GRAPH -> utime in seconds
  local label=$1 frames=$2 graph=$3 w h
  read -r _ w h <<<"$(printf '%s\n' "${sizes[@]}" | grep "^$label ")"
  "${pin[@]}" ffmpeg -hide_banner -nostdin -benchmark -threads 1 -filter_threads 1 \
    -filter_complex_threads 1 -f rawvideo -pix_fmt bgra -s "${w}x${h}" \
    -stream_loop $((frames - 1)) -i "$work/$label.raw" -vf "$graph" -f null - 2>&1 |
    sed -n 's/.*utime=\([0-9.]*\)s.*/\1/p'
}
ffmpeg_format() {  # GRAPH -> the format FFmpeg converts BGRA to for it, or nothing
  ffmpeg -hide_banner -nostdin -v verbose -f rawvideo -pix_fmt bgra -s 64x64 \
    -i "$work/1080p.raw" -vf "$1" -frames:v 1 -f null - 2>&1 |
    sed -n 's/.*auto_scale.*fmt:bgra.*-> .*fmt:\([a-z0-9]*\).*/\1/p' | head -1
}
peer() {  # ID GRAPH [FRAMES]
  local id=$1 graph=$2 frames
  local format
  format=$(ffmpeg_format "$graph")
  for s in "${sizes[@]}"; do
    read -r label w h <<<"$s"
    frames=${3:-$ffmpeg_frames}
    local with without
    with=$(ffmpeg_run "$label" "$frames" "$graph")
    without=$(ffmpeg_run "$label" "$frames" null)
    echo "$id $label $w $h $frames $with $without ${format:--}" >>"$work/ffmpeg.txt"
  done
}
# Without FFmpeg there is no ffmpeg.txt, and the table leaves its rows out.
if [ -n "$have_ffmpeg" ]; then
  : >"$work/ffmpeg.txt"
  echo "bench-peers: FFmpeg, $ffmpeg_frames frames a case" >&2
else
  peer() { :; }
fi
peer vibrance 'vibrance=intensity=0.4'
peer colortemperature 'colortemperature=temperature=5000'
peer huesaturation 'huesaturation=hue=20:saturation=-0.2:intensity=0.1'
peer vignette 'vignette=angle=PI/4'
peer lenscorrection 'lenscorrection=k1=-0.2:k2=0.05'
peer lut3d "lut3d=file=$work/look33.cube:interp=tetrahedral"
peer colorkey 'colorkey=color=0x28C83C:similarity=0.3:blend=0.1'
peer dctdnoiz 'dctdnoiz=sigma=4.5' 1
peer gblur 'gblur=sigma=5'
peer avgblur 'avgblur=sizeX=7'

# --- doLUT against lut3d and OpenColorIO, in rounds ---------------------------------------------
# The first table times each program once, minutes apart from its peer. For the pairs with a
# target, each round runs doLUT (now and before), OpenColorIO and lut3d back to back on the same
# frame and file, and the second table gives the median over the rounds of each round's ratio.
# Odd rounds run ours first (now, then before), even rounds the peers first and then ours the
# other way round (in_turns), so that no program always comes first after a pause or last after a
# long run.
echo "bench-peers: doLUT, OpenColorIO and lut3d in $reps rounds" >&2
mkdir -p "$work/lut/now" "$work/lut/before"
: >"$work/lut/peers.txt"
lut_ours() {  # ROUND
  local side
  for side in $(in_turns "$1" now before); do
    bench_json "$side" bench_cube_lut '^BM_CubeLutDoLUT/[^/]+/file/' \
      "$work/lut/$side/bench_cube_lut.$1.json"
  done
}
lut_peers() {  # ROUND
  local s label w h
  for s in "${sizes[@]}"; do
    read -r label w h <<<"$s"
    echo "$1 $label ocio $("${pin[@]}" "$bin/bench_peer_ocio_lut" "$work/look33.cube" "$w" "$h" 2)" \
      >>"$work/lut/peers.txt"
    if [ -n "$have_ffmpeg" ]; then
      # Frames, width, height, and the utime with lut3d and with null, as in ffmpeg.txt.
      echo "$1 $label lut3d $ffmpeg_frames $w $h" \
        "$(ffmpeg_run "$label" "$ffmpeg_frames" "lut3d=file=$work/look33.cube:interp=tetrahedral")" \
        "$(ffmpeg_run "$label" "$ffmpeg_frames" null)" >>"$work/lut/peers.txt"
    fi
  done
}
for round in $(seq "$reps"); do
  for part in $(in_turns "$round" lut_ours lut_peers); do
    "$part" "$round"
  done
done

# --- the table ----------------------------------------------------------------------------------
python3 - "$work" <<'PY'
import json, os, sys

work = sys.argv[1]

def file_rates(path):  # benchmark name without /real_time -> Mpixel/s by CPU time
    found = {}
    with open(path) as f:
        for b in json.load(f).get("benchmarks", []):
            if b.get("error_occurred") or "items_per_second" not in b:
                continue
            # Items per second are by real time; the two times share a unit.
            rate = b["items_per_second"] * b["real_time"] / b["cpu_time"] / 1e6
            found[b["run_name"].replace("/real_time", "")] = rate
    return found

def rates(folder):
    found = {}
    if os.path.isdir(folder):
        for name in os.listdir(folder):
            if name.endswith(".json"):
                found.update(file_rates(os.path.join(folder, name)))
    return found

def ffmpeg_rate(frames, w, h, with_t, without_t):
    seconds = float(with_t) - float(without_t)
    return int(frames) * int(w) * int(h) / seconds / 1e6 if seconds > 0 else float("nan")

ours = rates(work)
before = rates(os.path.join(work, "before"))

ffmpeg = None  # FFmpeg not installed
if os.path.exists(os.path.join(work, "ffmpeg.txt")):
    ffmpeg = {}
    for line in open(os.path.join(work, "ffmpeg.txt")):
        fid, size, w, h, frames, with_t, without_t, fmt = line.split()
        ffmpeg[(fid, size)] = (ffmpeg_rate(frames, w, h, with_t, without_t), fmt)
ocio = {}
with open(os.path.join(work, "ocio.txt")) as f:
    for line in f:
        size, rate = line.split()
        ocio[size] = float(rate)

pairs = [  # ours, its benchmark (size in {}), peer, how the peer is found
    ("ColorAdjust vibrance", "BM_ColorAdjust/{}/vibrance", "FFmpeg vibrance", ("ff", "vibrance")),
    ("WhiteBalanceAdjust", "BM_WhiteBalanceAdjust/{}", "FFmpeg colortemperature",
     ("ff", "colortemperature")),
    ("HSLAdjust, all bands", "BM_HSLAdjust/{}/all8", "FFmpeg huesaturation",
     ("ff", "huesaturation")),
    ("VignetteAdjust", "BM_Vignette/{}/darken", "FFmpeg vignette", ("ff", "vignette")),
    ("DistortionFringingAdjust", "BM_Lens/{}/distortion", "FFmpeg lenscorrection",
     ("ff", "lenscorrection")),
    ("doLUT 33 (tetrahedral)", "BM_CubeLutDoLUT/{}/file", "FFmpeg lut3d tetrahedral",
     ("ff", "lut3d")),
    ("doLUT 33 (tetrahedral)", "BM_CubeLutDoLUT/{}/file", "OpenColorIO CPU, tetrahedral",
     ("ocio", None)),
    ("ChromeKeyLut3d mask", "BM_ChromeKeyLut3d/{}/mask", "FFmpeg colorkey", ("ff", "colorkey")),
    ("deNoiseRGB", "BM_DeNoiseRGB/{}", "FFmpeg dctdnoiz", ("ff", "dctdnoiz")),
    ("GaussianBlur r10", "BM_GaussianBlur/{}/bgra/r10", "FFmpeg gblur sigma 5", ("ff", "gblur")),
    ("GaussianBlur r10", "BM_GaussianBlur/{}/bgra/r10", "OpenCV GaussianBlur sigma 5",
     ("cv", "BM_CvGaussianBlur/{}/bgra/sigma5")),
    ("fastAverageBlur r7 (BGR)", "BM_FastAverageBlur/{}/bgr/r7", "FFmpeg avgblur 7",
     ("ff", "avgblur")),
    ("fastAverageBlur r7 (BGR)", "BM_FastAverageBlur/{}/bgr/r7", "OpenCV blur 15x15",
     ("cv", "BM_CvBlur/{}/bgr/r7")),
    ("fastFilter r7 (median)", "BM_FastFilter/{}/r7", "OpenCV medianBlur 15",
     ("cv", "BM_CvMedianBlur/{}/r7")),
]

def fmt(v):
    return "n/a" if v is None or v != v else ("%.1f" % v if v < 1000 else "%.0f" % v)

rows = []
for size in ("1080p", "4K"):
    for name, bench, peer_name, (kind, key) in pairs:
        mine = ours.get(bench.format(size))
        note = ""
        if kind == "ff":
            if ffmpeg is None:
                continue
            theirs, conv = ffmpeg.get((key, size), (None, "-"))
            if conv != "-":
                note = "converts to " + conv
        elif kind == "ocio":
            theirs = ocio.get(size)
        else:
            theirs = ours.get(key.format(size))
        ratio = mine / theirs if mine and theirs and theirs == theirs else None
        row = [size, name, fmt(mine), peer_name, fmt(theirs),
               "n/a" if ratio is None else "%.2f" % ratio]
        if before:
            was = before.get(bench.format(size))
            row[2:2] = [fmt(was)]
            row += ["n/a" if not was or not theirs or theirs != theirs else "%.2f" % (was / theirs),
                    "n/a" if not was or not mine else "%.2fx" % (mine / was)]
        rows.append(tuple(row + [note]))

def cases(folder):  # name without /real_time -> {round: (real time in ms, that round's memcpy)}
    found = {}
    if not os.path.isdir(folder):
        return found
    scale = {"ns": 1e-6, "us": 1e-3, "ms": 1.0, "s": 1e3}
    for name in os.listdir(folder):
        round_ = int(name.split(".")[-2])
        with open(os.path.join(folder, name)) as f:
            runs = [b for b in json.load(f).get("benchmarks", [])
                    if not b.get("error_occurred") and b.get("run_type", "iteration") == "iteration"]
        times = {b["run_name"].replace("/real_time", ""):
                 b["real_time"] * scale[b["time_unit"]] for b in runs}
        memcpy = times.get("BM_Memcpy/4K")
        for key, t in times.items():
            if key != "BM_Memcpy/4K":
                found.setdefault(key, {})[round_] = (t, memcpy)
    return found

def median(values):
    values = sorted(v for v in values if v)
    if not values:
        return None
    mid = len(values) // 2
    return values[mid] if len(values) % 2 else (values[mid - 1] + values[mid]) / 2

now_cases = cases(os.path.join(work, "cases", "now"))
before_cases = cases(os.path.join(work, "cases", "before"))

head = ("size", "ours", "Mpx/s", "peer", "Mpx/s", "ours/peer", "note")
if before:
    head = ("size", "ours", "Mpx/s before", "Mpx/s now", "peer", "Mpx/s", "now/peer",
            "before/peer", "speed-up", "note")
print("| " + " | ".join(head) + " |")
print("|" + "|".join(["---"] * len(head)) + "|")
for r in rows:
    print("| " + " | ".join(r) + " |")

# Our cases: each as the fraction of the memcpy of the frame in its own run (or, where the target
# is against a peer or against before, that ratio), before and now.
ratio_cases = [  # label, benchmark, target
    ("Grade: ColorAdjust -> LightAdjust -> WhiteBalanceAdjust -> VignetteAdjust",
     "BM_GradeChain/4K", ">= 0.08 (12.5 memcpys)"),
    ("ColorAdjust, all five", "BM_ColorAdjust/4K/all5", ">= 0.3"),
    ("LightAdjust, all four", "BM_LightAdjust/4K/all4", ">= 0.35"),
    ("WhiteBalanceAdjust", "BM_WhiteBalanceAdjust/4K", ">= 0.35"),
    ("VignetteAdjust, amount -50", "BM_Vignette/4K/darken", ">= 0.3"),
    ("HSLAdjust, all bands", "BM_HSLAdjust/4K/all8", ">= 0.15"),
    ("DistortionFringingAdjust, both, warm", "BM_Lens/4K/both", ">= 0.2"),
    ("DistortionFringingAdjust, strength changing every frame",
     "BM_Lens/4K/distortion_rebuilt_each_frame", ">= 0.1"),
    ("hueAdjustment 30 degrees", "BM_HueAdjust/4K/30deg", ">= 0.3"),
    ("temperatureAdjustment", "BM_temperatureAdjustment/4K", ">= 0.1"),
    ("doLUT 33 points, random", "BM_CubeLutDoLUT/4K/33/random", ">= 0.1"),
    ("doLUT 33 points, photo-like", "BM_CubeLutDoLUT/4K/33/photo", ">= 0.1"),
    ("doLUT 64 points, random", "BM_CubeLutDoLUT/4K/64/random", ">= 0.1"),
    ("doLUT 64 points, photo-like", "BM_CubeLutDoLUT/4K/64/photo", ">= 0.1"),
    ("ColorLut3dAdjust, 33-point file", "BM_ColorLut3dAdjust/4K/cube33", ">= 0.09"),
    ("ColorLut3dAdjust, 64-point file", "BM_ColorLut3dAdjust/4K/cube64", ">= 0.09"),
    ("ChromeKeyLut3d mask", "BM_ChromeKeyLut3d/4K/mask", ">= 0.08"),
    ("ChromeKeyLut3d colours", "BM_ChromeKeyLut3d/4K/beauty", ">= 0.08"),
]
pair_cases = [  # label, ours, theirs, target
    ("fastAverageBlur r7 (BGR) over cv::blur 15x15", "BM_FastAverageBlur/4K/bgr/r7",
     "BM_CvBlur/4K/bgr/r7", ">= 1.3"),
    ("fastFilter r3 over cv::medianBlur 7", "BM_FastFilter/4K/r3", "BM_CvMedianBlur/4K/r3",
     ">= 1"),
]
speed_cases = [("deNoiseRGB", "BM_DeNoiseRGB/4K"), ("deNoiseLumiance", "BM_DeNoiseLumiance/4K")]

# doLUT over each LUT peer, by round: {(peer, size): {round: Mpixel/s}}, and doLUT's own.
lut_peers = {}
for line in open(os.path.join(work, "lut", "peers.txt")):
    fields = line.split()
    if len(fields) != (4 if fields[2] == "ocio" else 8):
        continue  # a peer that gave no figure
    round_, size, peer = fields[:3]
    rate = float(fields[3]) if peer == "ocio" else ffmpeg_rate(*fields[3:8])
    lut_peers.setdefault((peer, size), {})[round_] = rate
def lut_rounds(side):  # {size: {round: Mpixel/s}}
    found = {}
    folder = os.path.join(work, "lut", side)
    for name in os.listdir(folder):
        for key, rate in file_rates(os.path.join(folder, name)).items():
            found.setdefault(key.split("/")[1], {})[name.split(".")[-2]] = rate
    return found
lut_now, lut_before = lut_rounds("now"), lut_rounds("before")
lut_cases = [("FFmpeg lut3d tetrahedral", "lut3d"), ("OpenColorIO CPU, tetrahedral", "ocio")]
def lut_over(mine, peer, size):
    a, b = mine.get(size, {}), lut_peers.get((peer, size), {})
    f = median(a[r] / b[r] for r in a if r in b and b[r] == b[r] and b[r] > 0)
    return "n/a" if f is None else "%.2f" % f

def fraction(table, key):
    f = median(memcpy / t for t, memcpy in table.get(key, {}).values() if t and memcpy)
    return "n/a" if f is None else "%.3f" % f

def over(table, mine, theirs):
    a, b = table.get(mine, {}), table.get(theirs, {})
    f = median(b[r][0] / a[r][0] for r in a if r in b and a[r][0] and b[r][0])
    return "n/a" if f is None else "%.2f" % f

if now_cases:
    print()
    cols = ("case, 4K, one thread", "before", "now", "target") if before_cases else \
        ("case, 4K, one thread", "now", "target")
    print("| " + " | ".join(cols) + " |")
    print("|" + "|".join(["---"] * len(cols)) + "|")
    def row(label, was, now, target):
        cells = (label, was, now, target) if before_cases else (label, now, target)
        print("| " + " | ".join(cells) + " |")
    for label, key, target in ratio_cases:
        row(label + " (x memcpy)", fraction(before_cases, key), fraction(now_cases, key), target)
    for label, mine, theirs, target in pair_cases:
        row(label, over(before_cases, mine, theirs), over(now_cases, mine, theirs), target)
    for label, peer in lut_cases:
        for size in ("1080p", "4K"):
            row("doLUT 33 over %s, %s" % (label, size), lut_over(lut_before, peer, size),
                lut_over(lut_now, peer, size), ">= 8")
    for label, key in speed_cases:
        was, now = before_cases.get(key, {}), now_cases.get(key, {})
        was_ms, now_ms = median(t for t, _ in was.values()), median(t for t, _ in now.values())
        gain = median(was[r][0] / now[r][0] for r in now if r in was and now[r][0])
        row(label + " (ms a frame)", "n/a" if not was_ms else "%.0f" % was_ms,
            "n/a" if not now_ms else "%.0f" % now_ms + (" (%.2fx)" % gain if gain else ""),
            "2x faster")
PY
