#!/usr/bin/env bash
# Frames per second of `tessarofx apply` grading a 1080p H.264 clip against FFmpeg's own command
# line running its closest filters on the same clip, both encoding H.264 with the same libx264
# preset and quality; measured in one run, reported as a ratio. The tool's own report shows how
# the wall time splits between decoding, the filters and encoding.
#   video_vs_ffmpeg.sh TOOL [SECONDS]
set -euo pipefail
tool=$1
seconds=${2:-4}
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
cd "$work"

ffmpeg -nostdin -v error -f lavfi -i "testsrc2=s=1920x1080:r=25:d=$seconds,noise=alls=12:allf=t" \
  -f lavfi -i "sine=f=440:d=$seconds" -c:v libx264 -preset medium -crf 17 -pix_fmt yuv420p \
  -c:a aac in.mp4
frames=$((seconds * 25))

now() { date +%s.%N; }
t0=$(now)
TESSAROFX_LOG_LEVEL=off "$tool" apply --quiet -v -f ColorAdjust -p u_exposure=10 -p u_contrast=15 -p u_vib=25 -p u_sat=10 \
  -f LightAdjust -p u_highLight=-20 -p u_shadow=20 -f WhiteBalanceAdjust -p u_temperature=20 \
  -f VignetteAdjust -p amount=-30 --codec libx264 --quality 17 in.mp4 ours.mp4 >ours.log 2>&1
t1=$(now)
ffmpeg -nostdin -v error -i in.mp4 \
  -vf "eq=contrast=1.15:brightness=0.03:saturation=1.15,vibrance=intensity=0.25,colorlevels=rimin=0.03:gimin=0.03:bimin=0.03:rimax=0.97:gimax=0.97:bimax=0.97,colortemperature=temperature=5800,vignette=angle=PI/8" \
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
