#!/usr/bin/env bash
# Frames per second of `tessarofx apply` grading a 1080p H.264 clip against FFmpeg's own command
# line running its closest filters on the same clip, both encoding H.264 with the same libx264
# preset and quality; measured in one run, reported as a ratio. The tool's own report shows how
# the wall time splits between decoding, the filters and encoding.
#   video_vs_ffmpeg.sh TOOL [SECONDS]
set -euo pipefail
tool=$(realpath "$1")
seconds=${2:-4}
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work"

# A camera-like clip: the demo's scene (colour chart, skin, sky and grey ramps), panned across at
# 1080p with temporal grain. Mid-tones matter: a test pattern of clipped primaries with heavy
# noise makes x264's time depend on which chain clips the noise away rather than on the chains.
TESSAROFX_LOG_LEVEL=off "$tool" --no-opencl demo scene >/dev/null 2>&1
ffmpeg -nostdin -v error -loop 1 -framerate 25 -i scene/sample.png -f lavfi -i "sine=f=440:d=$seconds" \
  -vf "scale=2560:1440,crop=1920:1080:x='t*150':y='t*60',noise=alls=6:allf=t,format=yuv420p" \
  -t "$seconds" -c:v libx264 -preset medium -crf 17 -c:a aac in.mp4
frames=$((seconds * 25))

now() { date +%s.%N; }
t0=$(now)
TESSAROFX_LOG_LEVEL=off "$tool" apply --quiet -v -f ColorAdjust -p u_exposure=10 -p u_contrast=15 -p u_vib=25 -p u_sat=10 \
  -f LightAdjust -p u_highLight=-20 -p u_shadow=20 -f WhiteBalanceAdjust -p u_temperature=20 \
  -f VignetteAdjust -p amount=-30 --codec libx264 --quality 17 in.mp4 ours.mp4 >ours.log 2>&1
t1=$(now)
# Highlights down and shadows up is what output levels do (input levels would crush both).
ffmpeg -nostdin -v error -i in.mp4 \
  -vf "eq=contrast=1.15:brightness=0.03:saturation=1.15,vibrance=intensity=0.25,colorlevels=romin=0.03:gomin=0.03:bomin=0.03:romax=0.97:gomax=0.97:bomax=0.97,colortemperature=temperature=5800,vignette=angle=PI/8" \
  -c:v libx264 -preset medium -crf 17 -c:a copy theirs.mp4
t2=$(now)

awk -v f="$frames" -v a="$t0" -v b="$t1" -v c="$t2" 'BEGIN {
  ours = f / (b - a); theirs = f / (c - b)
  printf "tessarofx apply: %6.1f frames/s (%.2f s)\n", ours, b - a
  printf "ffmpeg:          %6.1f frames/s (%.2f s)\n", theirs, c - b
  printf "ratio (tessarofx / ffmpeg): %.3f\n", ours / theirs }'
echo "where the tool's wall time went:"
grep -E "decode|filters|encode" ours.log || cat ours.log

# The two chains make different pictures, and x264's cost depends on the picture: the same
# encoder settings on each result alone, through FFmpeg both times.
for result in ours theirs; do
  ffmpeg -nostdin -v error -i "$result.mp4" -c:v ffv1 -pix_fmt yuv420p "$result-ll.mkv"
  t0=$(now)
  ffmpeg -nostdin -v error -i "$result-ll.mkv" -c:v libx264 -preset medium -crf 17 "$result-x264.mp4"
  t1=$(now)
  awk -v r="$result" -v a="$t0" -v b="$t1" 'BEGIN { printf "x264 alone on the %s result: %.2f s\n", r, b - a }'
done
