#!/usr/bin/env bash
# The tool on clips, as a user runs it: a lossless result is the picture path's, frame by frame;
# sound, timing and tags survive; threads change nothing; H.264 stays close; and every failure
# leaves nothing at the target and names its cause, a full disk included.
#   tool_video_test.sh TOOL
set -uo pipefail
tool=$1
work=$(mktemp -d)
[ -n "${KEEP:-}" ] || trap 'rm -rf "$work"' EXIT
cd "$work" || exit 1
failures=0
fail() { echo "FAIL: $*"; failures=$((failures + 1)); }
ok() { echo "ok: $*"; }
same() { [ "$2" = "$3" ] && ok "$1" || fail "$1 (got '${2:0:60}', expected '${3:0:60}')"; }
ff() { ffmpeg -nostdin -v error -y "$@"; }
video_md5() { ffmpeg -nostdin -v error -i "$1" -map 0:v -f framemd5 - | grep -v '^#'; }
audio_md5() { ffmpeg -nostdin -v error -i "$1" -map 0:a -c copy -f md5 -; }
times() { ffprobe -v error -select_streams v -show_entries frame=pts -of csv=p=0 "$1"; }

# A lossless BGRA clip with sound. Odd timings are the video library tests' business.
ff -f lavfi -i "testsrc2=s=96x64:r=25:d=0.6,format=bgra" -f lavfi -i "sine=f=440:d=0.6" \
  -c:v ffv1 -c:a aac clip.mkv
chain=(-f ColorAdjust -p u_exposure=30 -p u_sat=20 -f VignetteAdjust -p amount=-40)

# Lossless: each frame equals the picture path on that frame.
"$tool" apply -q "${chain[@]}" --codec ffv1 clip.mkv out.mkv || fail "apply on a clip"
ff -i clip.mkv -fps_mode passthrough frame_%02d.png
frames=$(ls frame_*.png | wc -l)
[ "$frames" = 15 ] || fail "the test clip has $frames frames, not 15"
for f in frame_*.png; do "$tool" apply -q "${chain[@]}" "$f" "ref_$f" >/dev/null; done
ff -i ref_frame_%02d.png -f rawvideo -pix_fmt bgra ref.raw
ff -i out.mkv -fps_mode passthrough -f rawvideo -pix_fmt bgra got.raw
cmp -s ref.raw got.raw && ok "frames equal to the picture path's result" ||
  fail "frames differ from the picture path's result"
same "audio packets copied bit for bit" "$(audio_md5 out.mkv)" "$(audio_md5 clip.mkv)"
same "frame count and timestamps kept" "$(times out.mkv)" "$(times clip.mkv)"

# Rotation and colour tags survive (stream copy adds the rotation: the encoder option ignores it).
ff -f lavfi -i "testsrc2=s=96x64:r=25:d=0.4" -c:v libx264 -preset ultrafast -pix_fmt yuv420p \
  -color_primaries bt709 -color_trc bt709 -colorspace bt709 plain.mp4
ff -i plain.mp4 -c copy -metadata:s:v:0 rotate=90 turned.mp4
"$tool" apply -q ColorAdjust -p u_exposure=10 turned.mp4 turned-out.mp4
tags() { ffprobe -v error -show_streams -select_streams v "$1" | grep -E '^(rotation|color_)'; }
[ "$(tags turned-out.mp4)" = "$(tags turned.mp4)" ] && tags turned.mp4 | grep -q rotation=90 &&
  ok "rotation and colour tags kept" || fail "rotation or colour tags changed"

# Threads change nothing; H.264 stays within 40 dB of the lossless result.
"$tool" apply -q "${chain[@]}" --codec ffv1 --threads 4 clip.mkv t4.mkv
"$tool" apply -q "${chain[@]}" --codec ffv1 --threads 1 clip.mkv t1.mkv
same "--threads 4 equals --threads 1" "$(video_md5 t4.mkv)" "$(video_md5 t1.mkv)"
# --opencl puts the steps with an OpenCL class on a device (PoCL here), the rest stay on the CPU.
if "$tool" devices >/dev/null 2>&1; then
  device_chain=(-f ColorAdjust -p u_exposure=30 -f WhiteBalanceAdjust -p u_temperature=40)
  "$tool" apply -q "${device_chain[@]}" --codec ffv1 clip.mkv cpu.mkv
  "$tool" apply -q --opencl "${device_chain[@]}" --codec ffv1 --threads 2 clip.mkv device.mkv
  same "--opencl chain equals the CPU" "$(video_md5 device.mkv)" "$(video_md5 cpu.mkv)"
fi
# Against the lossless result in the same 4:2:0 layout, so that only the encoder's loss counts;
# a frame larger than the others, as tiny frames of test patterns are all edges.
ff -f lavfi -i "testsrc2=s=192x128:r=25:d=0.6,format=bgra" -c:v ffv1 big.mkv
"$tool" apply -q "${chain[@]}" --codec ffv1 big.mkv big-out.mkv
"$tool" apply -q "${chain[@]}" big.mkv out.mp4 || fail "apply to H.264"
psnr=$(ffmpeg -nostdin -i out.mp4 -i big-out.mkv -lavfi "[1]format=yuv420p[b];[0][b]psnr" \
  -f null - 2>&1 | sed -n 's/.*PSNR.*average:\([0-9.inf]*\).*/\1/p')
awk -v p="$psnr" 'BEGIN { exit !(p == "inf" || p + 0 >= 40) }' && ok "H.264 at $psnr dB" ||
  fail "H.264 PSNR $psnr below 40 dB"

# The key: alpha kept in a .mov, or laid over a picture.
ff -f lavfi -i "color=c=0x30C040:s=96x64:r=25:d=0.4" -f lavfi -i "color=c=0xC03020:s=30x30:d=0.4" \
  -filter_complex "[0][1]overlay=x='10+t*50':y=20" -c:v ffv1 green.mkv
"$tool" key -q --screen 48,192,64 green.mkv keyed.mov || fail "key to .mov"
ffprobe -v error -show_entries stream=pix_fmt -of csv=p=0 keyed.mov | grep -q yuva &&
  ok "the keyed clip has alpha" || fail "the keyed clip lost its alpha"
"$tool" key -q --screen 48,192,64 --over frame_01.png green.mkv comp.mp4 || fail "key --over"

# Failures: a clear message, a non-zero exit, nothing at the target. The library's own messages
# for each cause are its tests' business.
expect_failure() {  # expect_failure NAME PATTERN TARGET COMMAND...
  local name=$1 pattern=$2 target=$3
  shift 3
  "$@" >fail.log 2>&1
  local rc=$?
  if [ $rc = 0 ]; then fail "$name: exit status 0"; return; fi
  grep -qi -- "$pattern" fail.log || { fail "$name: no message like '$pattern'"; cat fail.log; }
  [ ! -e "$target" ] || fail "$name: $target exists"
  find "$(dirname "$target")" -maxdepth 1 -name "*.tmp-*" 2>/dev/null | grep -q . &&
    fail "$name: a temporary file is left"
  echo "ok: $name"
}
ff -f lavfi -i "sine=d=0.3" sound.wav
mkdir -p sealed && chmod 555 sealed
expect_failure "no video stream" "video" x2.mp4 "$tool" apply ColorAdjust sound.wav x2.mp4
expect_failure "unknown codec" "nosuchcodec" x3.mkv \
  "$tool" apply --codec nosuchcodec ColorAdjust clip.mkv x3.mkv
if [ "$(id -u)" != 0 ]; then
  expect_failure "unwritable directory" "sealed" sealed/x4.mkv \
    "$tool" apply ColorAdjust clip.mkv sealed/x4.mkv
fi
expect_failure "a picture as the output of a clip" "clip" x5.png \
  "$tool" apply ColorAdjust clip.mkv x5.png
# A full disk: a 64 KiB file system of its own, where mount namespaces are allowed.
ff -f lavfi -i "testsrc2=s=320x240:r=25:d=2" -c:v libx264 -preset ultrafast mid.mp4
mkdir -p tiny
if unshare -m sh -c 'mount -t tmpfs -o size=64k tmpfs tiny' 2>/dev/null; then
  unshare -m sh -c 'mount -t tmpfs -o size=64k tmpfs tiny && "$0" apply -q --codec ffv1 \
    ColorAdjust mid.mp4 tiny/x7.mkv; echo "rc $?"; ls -A tiny' "$tool" >full.log 2>&1
  grep -q "No space left" full.log && grep -q "rc 1" full.log && [ "$(tail -n 1 full.log)" = "rc 1" ] &&
    ok "a full disk" || { fail "full disk"; cat full.log; }
fi
# Ctrl-C halfway: nothing at the target, no temporary file.
ff -f lavfi -i "testsrc2=s=640x360:r=25:d=20" -c:v libx264 -preset ultrafast long.mp4
"$tool" apply -q --threads 1 ColorAdjust -p u_exposure=10 long.mp4 cut.mp4 &
sleep 1; kill -INT $!; wait $!
rc=$?
left=$(find . -maxdepth 1 -name "*.tmp-*")
[ $rc != 0 ] && [ ! -e cut.mp4 ] && [ -z "$left" ] && ok "Ctrl-C leaves nothing" ||
  fail "Ctrl-C: exit $rc, target or temporary file left"
# A damaged input: processed as far as it decodes, reported, exit status 3.
head -c $(($(stat -c %s clip.mkv) / 2)) clip.mkv >half.mkv
"$tool" apply -q ColorAdjust half.mkv half-out.mkv >damaged.log 2>&1
rc=$?
[ $rc = 3 ] && [ -s half-out.mkv ] && grep -q "could not be decoded" damaged.log &&
  ok "a damaged input gives what decodes, and exit status 3" ||
  { fail "damaged input: exit $rc"; cat damaged.log; }

[ "$failures" = 0 ] || { echo "$failures failure(s)"; exit 1; }
echo "all video checks passed"
