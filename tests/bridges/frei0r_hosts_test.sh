#!/usr/bin/env bash
# The frei0r modules inside the real hosts: FFmpeg, melt and GStreamer run each filter on a
# lossless path, and every result must be the bytes `tessarofx apply` gives with the equivalent
# parameters. Then the hosts' own threading, and hostile input.
#   frei0r_hosts_test.sh TOOL FREI0R_DIR
set -uo pipefail
tool=$1
export FREI0R_PATH=$2
work=$(mktemp -d)
[ -n "${KEEP:-}" ] || trap 'rm -rf "$work"' EXIT
cd "$work" || exit 1
# A registry of our own, built once before any pipeline: GStreamer rescans plug-ins whose files
# changed, and two processes rescanning the shared one at once can miss an element.
export GST_REGISTRY=$work/gst-registry.bin
gst-inspect-1.0 frei0r-filter-tessarofx-coloradjust >/dev/null 2>&1
failures=0
fail() { echo "FAIL: $*"; failures=$((failures + 1)); }

ff() { ffmpeg -nostdin -v error -y "$@"; }
raw() { ff -i "$1" -f rawvideo -pix_fmt bgra "$2"; }
same() {  # same NAME GOT WANT
  if cmp -s "$2" "$3"; then echo "ok: $1"; else fail "$1: $2 and $3 differ"; fi
}
# The tool's result for a filter, as raw BGRA: apply NAME OUT.raw [-p N=V]... [--background F]
apply() {
  local name=$1 out=$2
  shift 2
  "$tool" apply "$name" "$@" in.png "$out.png" >/dev/null || fail "tessarofx apply $name $*"
  raw "$out.png" "$out"
}

# An asymmetric picture: colour bars and gradients, a transparent strip and varying alpha, so a
# swapped channel or a lost alpha shows. 128 wide: FFmpeg shears rows that are not a multiple of
# 16 pixels.
ff -f lavfi -i "testsrc2=s=128x96,format=bgra,geq=r='r(X,Y)':g='g(X,Y)':b='b(X,Y)':a='if(lt(X,16),0,255-Y)'" \
  -frames:v 1 in.png
raw in.png in.raw
# A LUT that moves every channel differently.
awk 'BEGIN { print "LUT_3D_SIZE 2"
  for (b = 0; b < 2; b++) for (g = 0; g < 2; g++) for (r = 0; r < 2; r++)
    printf "%g %g %g\n", r * 0.8 + 0.1, g * 0.6 + 0.3, b * 0.9 }' >look.cube
printf 'LUT_3D_SIZE 2\n0 0 oops\n' > broken.cube

# --- FFmpeg: every one-input filter. Parameters are 0..1 over each range; 0.75 of -100..100 is 50.
ffmpeg_case() {  # ffmpeg_case SLUG "frei0r params" NAME [-p N=V]...
  local slug=$1 params=$2 name=$3
  shift 3
  ff -i in.png -vf "frei0r=tessarofx-$slug:$params" -f rawvideo -pix_fmt bgra "ff-$slug.raw" ||
    fail "ffmpeg $slug"
  apply "$name" "ref-$slug.raw" "$@"
  same "ffmpeg $slug" "ff-$slug.raw" "ref-$slug.raw"
}
ffmpeg_case coloradjust '0.75|0.4|0.6|0.3|0.7' ColorAdjust -p u_exposure=50 -p u_brightness=-20 \
  -p u_contrast=20 -p u_vib=-40 -p u_sat=40
ffmpeg_case whitebalance '0.7|0.35' WhiteBalanceAdjust -p u_temperature=40 -p u_tint=-30
ffmpeg_case lut "$work/look.cube" Lut -p "lut3dPath=$work/look.cube"
ffmpeg_case vignette '0.25|0.6|0.75|0.3|0.6|0.7' VignetteAdjust -p amount=-50 -p size=60 \
  -p roundness=50 -p feather=30 -p exposure=20 -p highlights=70
ffmpeg_case atowhite '' lutAToWhiteEffect
ffmpeg_case hsl '0.75|0.25|0.6|0.5|0.5|0.3' HSLAdjust -p u_red_hue=50 -p u_red_sat=-50 \
  -p u_red_light=20 -p u_orange_hue=-40
ffmpeg_case lens '0.7|0.8' DistortionFringingAdjust -p distortion=40 -p fringing=60
ffmpeg_case light '0.7|0.6|0.4|0.3' LightAdjust -p u_highLight=40 -p u_shadow=20 \
  -p u_whiteLevel=-20 -p u_blackLevel=-40
key=(-p red=48 -p green=192 -p blue=64 -p contrast=60)
ffmpeg_case chromakey '0x30C040|0.6|0.5|n' ChromeKeyLut3d "${key[@]}" -p mode=0
ffmpeg_case chromakey '0x30C040|0.6|0.5|y' ChromeKeyLut3d "${key[@]}" -p mode=1

# --- melt: a profile of the picture's own size, so that nothing is scaled.
printf '%s\n' description=test width=128 height=96 progressive=1 sample_aspect_num=1 \
  sample_aspect_den=1 display_aspect_num=4 display_aspect_den=3 frame_rate_num=25 \
  frame_rate_den=1 colorspace=709 >profile
# Six frames of the picture through melt, each against one reference: melt_case NAME REF [ARGS]...
melt_case() {
  local name=$1 ref=$2
  shift 2
  # With parallel rendering (real_time), melt's consumer can stop before its queue drains on a busy
  # machine and write fewer frames; a short file is run again, a wrong frame never is.
  for _ in 1 2 3; do
    rm -f melt.raw
    melt -quiet -profile profile pixbuf:in.png out=5 "$@" -consumer avformat:melt.raw \
      f=rawvideo pix_fmt=bgra </dev/null >/dev/null 2>melt.log ||
      { fail "melt $name"; cat melt.log; return; }
    [ "$(stat -c %s melt.raw)" = $((128 * 96 * 4 * 6)) ] && break
  done
  for _ in 1 2 3 4 5 6; do cat "$ref"; done >frames.raw
  same "melt $name" melt.raw frames.raw
}
# The key chain: mask and colours on two tracks, joined by the two-input module as a transition.
keyset=(keyColor=#30c040 contrast=0.6 offset=0.5)
"$tool" apply ChromeKeyLut3d "${key[@]}" -p mode=0 in.png mask.png >/dev/null
"$tool" apply ChromeKeyLut3d "${key[@]}" -p mode=1 in.png colours.png >/dev/null
"$tool" apply ChromeKeyCombine --background mask.png colours.png keyed.png >/dev/null
raw keyed.png ref-keyed.raw

# MLT's threading: a rendering thread per frame, and frames cut into slices processed at once
# (FFmpeg above hands each module whole frames).
melt_case "key chain, real_time=-4" ref-keyed.raw -attach frei0r.tessarofx-chromakey \
  "${keyset[@]}" mode=0 -track pixbuf:in.png out=5 -attach frei0r.tessarofx-chromakey \
  "${keyset[@]}" mode=1 -transition frei0r.tessarofx-chromakeycombine a_track=0 b_track=1 in=0 \
  out=5 real_time=-4
melt_case "coloradjust, sliced and real_time=-4" ref-coloradjust.raw \
  -attach frei0r.tessarofx-coloradjust u_exposure=0.75 u_brightness=0.4 u_contrast=0.6 \
  u_vib=0.3 u_sat=0.7 threads=4 real_time=-4
while read -r slug params; do
  # shellcheck disable=SC2086  # the parameters split at their spaces
  melt_case "$slug, sliced" "ref-$slug.raw" -attach "frei0r.tessarofx-$slug" $params threads=3
done <<EOF
whitebalance u_temperature=0.7 u_tint=0.35
lut lut3dPath=$work/look.cube
atowhite
hsl u_red_hue=0.75 u_red_sat=0.25 u_red_light=0.6 u_orange_hue=0.3
light u_highLight=0.7 u_shadow=0.6 u_whiteLevel=0.4 u_blackLevel=0.3
chromakey ${keyset[*]} mode=1
EOF

# --- GStreamer: two pipelines in one process (each branch streams on a thread of its own) and a
# third process beside it, each against the tool.
branch() {  # branch OUT.raw ELEMENT [properties]...
  local out=$1
  shift
  echo filesrc location=in.png ! pngdec ! videoconvert ! "$@" ! videoconvert ! \
    video/x-raw,format=BGRA ! filesink "location=$out"
}
color=(frei0r-filter-tessarofx-coloradjust u-exposure=0.75 u-brightness=0.4 u-contrast=0.6
  u-vib=0.3 u-sat=0.7)
# shellcheck disable=SC2046
gst-launch-1.0 -q $(branch g-color.raw "${color[@]}") \
  $(branch g-lut.raw frei0r-filter-tessarofx-lut "lut3dpath=$work/look.cube") >g1.log 2>&1 &
# shellcheck disable=SC2046
gst-launch-1.0 -q $(branch g-color2.raw "${color[@]}") >g2.log 2>&1 &
wait
same "gst-launch coloradjust" g-color.raw ref-coloradjust.raw
same "gst-launch lut, beside coloradjust in one process" g-lut.raw ref-lut.raw
same "gst-launch coloradjust, another process" g-color2.raw ref-coloradjust.raw

# --- Hostile input: a message, no crash, frames still come out.
expect_message() {  # expect_message NAME PATTERN LOG
  if grep -q "$2" "$3"; then echo "ok: $1"; else fail "$1: no message like '$2'"; cat "$3"; fi
}
ff -i in.png -vf "frei0r=tessarofx-coloradjust:7|nan|-3" -f rawvideo -pix_fmt bgra h1.raw \
  2>h1.log || fail "ffmpeg with values outside 0..1"
expect_message "values outside 0..1" "outside 0..1; it is clamped" h1.log
expect_message "a value that is not a number" "is not a number" h1.log
apply ColorAdjust ref-clamped.raw -p u_exposure=100 -p u_contrast=-100
same "values outside 0..1 are clamped" h1.raw ref-clamped.raw
# A missing and a malformed LUT: frames pass through, and the user hears of it once.
ff -f lavfi -i "testsrc2=s=64x48" -frames:v 20 -vf "frei0r=tessarofx-lut:$work/none.cube" \
  -f rawvideo -pix_fmt bgra h2.raw 2>h2.log || fail "ffmpeg with a missing LUT"
expect_message "a missing LUT" "cannot read the LUT file" h2.log
[ "$(grep -c tessarofx h2.log)" = 1 ] || fail "a missing LUT is reported once, not per frame"
ff -i in.png -vf "frei0r=tessarofx-lut:$work/broken.cube" -f rawvideo -pix_fmt bgra h3.raw \
  2>h3.log || fail "ffmpeg with a malformed LUT"
expect_message "a malformed LUT" "is not a .cube or .3dl LUT" h3.log
same "a malformed LUT passes frames through" h3.raw in.raw
# Sizes that are not multiples of 8, and a size that changes mid-stream (each host builds a new
# instance). GStreamer feeds packed rows of any width.
ff -f lavfi -i "testsrc2=s=40x24" -frames:v 1 -vf format=rgba,crop=37:23:0:0 size1.png
ff -f lavfi -i "testsrc2=s=64x40" -frames:v 1 size2.png
gst-launch-1.0 -q multifilesrc location=size%d.png index=1 stop-index=2 \
  caps=image/png,framerate=25/1 ! pngdec ! videoconvert ! \
  frei0r-filter-tessarofx-vignette amount=0.2 ! videoconvert ! video/x-raw,format=BGRA ! \
  filesink location=h4.raw 2>h4.log || fail "gst-launch with 37x23 and 64x40 frames"
[ "$(stat -c %s h4.raw)" = $(((37 * 23 + 64 * 40) * 4)) ] || fail "37x23 and 64x40 frames in GStreamer"
ff -i size%d.png -vf "frei0r=tessarofx-light:0.9" -f rawvideo -pix_fmt bgra h5.raw 2>h5.log ||
  fail "ffmpeg with a change of frame size"
# FFmpeg scales the later frames to the first size for its encoder.
[ "$(stat -c %s h5.raw)" = $((37 * 23 * 4 * 2)) ] || fail "37x23 and 64x40 frames in FFmpeg"

[ "$failures" = 0 ] || { echo "$failures failure(s)"; exit 1; }
echo "all frei0r host checks passed"
