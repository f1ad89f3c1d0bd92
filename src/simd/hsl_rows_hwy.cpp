// CxImage's integer HSL conversions over rows, compiled once per instruction set by
// foreach_target.h.
//
// RGBtoHSL's integers never reach 2^24, so they are exact in float lanes, and its quotients are
// float quotients truncated: a quotient n / d of RGBtoHSL lies at least 1 / d below the next
// integer, far more than the rounding of a float quotient below 256. HSLtoRGB is float already
// and is evaluated with the same operations in the same order, nothing fused. Four-byte pixels are
// taken apart and put together in 32-bit lanes; three-byte pixels and the last partial vector of a
// row byte by byte.
#include <cstring>

#include "simd/hsl_rows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/hsl_rows_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/pixel_lanes-inl.h"

namespace {

// The most lanes of any target, for the byte staging arrays.
constexpr size_t kMaxLanes = 64;

// floor(n / d) for the non-negative integers of RGBtoHSL.
VF Quotient(VF n, VF d) { return hn::Floor(hn::Div(n, d)); }

using D8 = hn::Rebind<uint8_t, DF>;  // one byte a lane

// Bytes of `count` (at most one vector) pixels into float lanes: the colour at offset `at`.
VF Channel(const uint8_t* pixels, size_t step, size_t at, size_t count) {
  HWY_ALIGN float lanes[kMaxLanes] = {};
  for (size_t i = 0; i < count; ++i) lanes[i] = pixels[i * step + at];
  return hn::Load(DF(), lanes);
}

// Four-byte pixels as 32-bit lanes, from and to memory of any alignment.
VU LoadPixels(const uint8_t* p) {
#if HWY_TARGET == HWY_SCALAR
  uint32_t v;
  std::memcpy(&v, p, sizeof v);
  return hn::Set(DU(), v);
#else
  return hn::BitCast(DU(), hn::LoadU(hn::Repartition<uint8_t, DU>(), p));
#endif
}

void StorePixels(VU v, uint8_t* p) {
#if HWY_TARGET == HWY_SCALAR
  const uint32_t lane = hn::GetLane(v);
  std::memcpy(p, &lane, sizeof lane);
#else
  const hn::Repartition<uint8_t, DU> d8;
  hn::StoreU(hn::BitCast(d8, v), d8, p);
#endif
}

// Byte `at` (0..2) of each 32-bit lane as a float.
VF ByteOf(VU pixels, int at) { return hn::ConvertTo(DF(), ChannelAt(pixels, 8 * at)); }

// The low byte of each lane of `v`.
hn::Vec<D8> LowBytes(VI v) { return hn::DemoteTo(D8(), hn::And(v, hn::Set(DI(), 255))); }

// A whole vector of `count` bytes from each plane, or the bytes of a shorter tail.
VF PlaneBytes(const uint8_t* plane, size_t count) {
  if (count == hn::Lanes(DF())) {
    return hn::ConvertTo(DF(), hn::PromoteTo(DI(), hn::LoadU(D8(), plane)));
  }
  return Channel(plane, 1, 0, count);
}

// HueToRGB's channel, for hues within one turn of 0..360.
VF HueToChannel(VF p, VF q, VF hue) {
  const DF d;
  const VF turn = hn::Set(d, 360.0f), zero = hn::Zero(d), sixty = hn::Set(d, 60.0f);
  hue = hn::IfThenElse(hn::Gt(hue, turn), hn::Sub(hue, turn),
                       hn::IfThenElse(hn::Lt(hue, zero), hn::Add(hue, turn), hue));
  const VF rising = hn::Add(p, hn::Div(hn::Mul(hn::Sub(q, p), hue), sixty));
  const VF falling =
      hn::Add(p, hn::Div(hn::Mul(hn::Sub(q, p), hn::Sub(hn::Set(d, 240.0f), hue)), sixty));
  return hn::IfThenElse(
      hn::Lt(hue, sixty), rising,
      hn::IfThenElse(hn::Lt(hue, hn::Set(d, 180.0f)), q,
                     hn::IfThenElse(hn::Lt(hue, hn::Set(d, 240.0f)), falling, p)));
}

// (int)(v * 255), of which the caller keeps the low byte.
VI TruncatedByte(VF v) { return hn::ConvertTo(DI(), hn::Mul(v, hn::Set(DF(), 255.0f))); }

// The low byte of each lane of `v` to `out`, `step` bytes apart.
void StoreByte(VI v, uint8_t* out, size_t step, size_t count) {
  HWY_ALIGN int32_t lanes[kMaxLanes];
  hn::Store(v, DI(), lanes);
  for (size_t i = 0; i < count; ++i) out[i * step] = static_cast<uint8_t>(lanes[i]);
}

// The low bytes of `v` into a plane.
void StorePlane(VI v, uint8_t* plane, size_t count) {
  if (count == hn::Lanes(DF())) {
    hn::StoreU(LowBytes(v), D8(), plane);
  } else {
    StoreByte(v, plane, 1, count);
  }
}

}  // namespace

void RgbToHslRowOfTarget(const uint8_t* pixels, size_t bytesPerPixel, bool redFirst, uint8_t* hue,
                         uint8_t* saturation, uint8_t* lightness, size_t count) {
  const DF d;
  const DI di;
  const size_t n = hn::Lanes(d);
  const VF k255 = hn::Set(d, 255.0f), k510 = hn::Set(d, 510.0f), k42 = hn::Set(d, 42.0f);
  const VF half = hn::Set(d, 0.5f), one = hn::Set(d, 1.0f);
  const int redAt = redFirst ? 0 : 2, blueAt = redFirst ? 2 : 0;
  for (size_t x = 0; x < count; x += n) {
    const size_t lanes = count - x < n ? count - x : n;
    const uint8_t* p = pixels + x * bytesPerPixel;
    VF r, g, b;
    if (bytesPerPixel == 4 && lanes == n) {
      const VU px = LoadPixels(p);
      r = ByteOf(px, redAt), g = ByteOf(px, 1), b = ByteOf(px, blueAt);
    } else {
      r = Channel(p, bytesPerPixel, redAt, lanes);
      g = Channel(p, bytesPerPixel, 1, lanes);
      b = Channel(p, bytesPerPixel, blueAt, lanes);
    }
    const VF cMax = hn::Max(hn::Max(r, g), b), cMin = hn::Min(hn::Min(r, g), b);
    const VF sum = hn::Add(cMax, cMin), delta = hn::Sub(cMax, cMin);
    const VF l = Quotient(hn::Add(hn::Mul(sum, k255), k255), k510);
    // Greys divide by 1 instead of 0 and are replaced below.
    const auto grey = hn::Eq(cMax, cMin);
    const VF dividend = hn::IfThenElse(grey, one, delta);
    const VF below = hn::IfThenElse(hn::Le(l, hn::Set(d, 127.0f)), sum, hn::Sub(k510, sum));
    const VF divisor = hn::IfThenElse(grey, one, below);
    const VF s =
        Quotient(hn::Add(hn::Mul(delta, k255), hn::Floor(hn::Mul(divisor, half))), divisor);
    const VF rounding = hn::Floor(hn::Mul(dividend, half));
    const VF rDelta = Quotient(hn::Add(hn::Mul(hn::Sub(cMax, r), k42), rounding), dividend);
    const VF gDelta = Quotient(hn::Add(hn::Mul(hn::Sub(cMax, g), k42), rounding), dividend);
    const VF bDelta = Quotient(hn::Add(hn::Mul(hn::Sub(cMax, b), k42), rounding), dividend);
    const VF h = hn::IfThenElse(
        hn::Eq(r, cMax), hn::Sub(bDelta, gDelta),
        hn::IfThenElse(hn::Eq(g, cMax), hn::Sub(hn::Add(hn::Set(d, 85.0f), rDelta), bDelta),
                       hn::Sub(hn::Add(hn::Set(d, 170.0f), gDelta), rDelta)));
    // Each keeps its low byte: a negative hue wraps modulo 256.
    StorePlane(hn::ConvertTo(di, hn::IfThenElse(grey, hn::Set(d, 170.0f), h)), hue + x, lanes);
    StorePlane(hn::ConvertTo(di, hn::IfThenZeroElse(grey, s)), saturation + x, lanes);
    StorePlane(hn::ConvertTo(di, l), lightness + x, lanes);
  }
}

void HslToRgbRowOfTarget(const uint8_t* hue, const uint8_t* saturation, const uint8_t* lightness,
                         uint8_t* pixels, size_t bytesPerPixel, bool redFirst, size_t count) {
  const DF d;
  const size_t n = hn::Lanes(d);
  const VF k255 = hn::Set(d, 255.0f), one = hn::Set(d, 1.0f), k120 = hn::Set(d, 120.0f);
  for (size_t x = 0; x < count; x += n) {
    const size_t lanes = count - x < n ? count - x : n;
    const VF s = hn::Div(PlaneBytes(saturation + x, lanes), k255);
    const VF l = hn::Div(PlaneBytes(lightness + x, lanes), k255);
    const VF q = hn::IfThenElse(hn::Le(l, hn::Set(d, 0.5f)), hn::Mul(hn::Add(one, s), l),
                                hn::Sub(hn::Add(l, s), hn::Mul(l, s)));
    // H * 360 is an exact integer product, then a float quotient.
    const VF h = hn::Div(hn::Mul(PlaneBytes(hue + x, lanes), hn::Set(d, 360.0f)), k255);
    const VF p = hn::Sub(hn::Mul(hn::Set(d, 2.0f), l), q);
    const auto grey = hn::Eq(s, hn::Zero(d));
    const auto blue = TruncatedByte(hn::IfThenElse(grey, l, HueToChannel(p, q, hn::Sub(h, k120))));
    const auto green = TruncatedByte(hn::IfThenElse(grey, l, HueToChannel(p, q, h)));
    const auto red = TruncatedByte(hn::IfThenElse(grey, l, HueToChannel(p, q, hn::Add(h, k120))));
    uint8_t* out = pixels + x * bytesPerPixel;
    if (bytesPerPixel == 4 && lanes == n) {
      const DU du;
      const VU byte = hn::Set(du, 0xFFu);
      const auto low = [&](VI v) { return hn::And(hn::BitCast(du, v), byte); };
      const VU first = low(redFirst ? red : blue), last = low(redFirst ? blue : red);
      const VU kept = hn::And(LoadPixels(out), hn::Set(du, 0xFF000000u));
      const VU colour = hn::Or3(first, hn::ShiftLeft<8>(low(green)), hn::ShiftLeft<16>(last));
      StorePixels(hn::Or(kept, colour), out);
    } else {
      StoreByte(blue, out + (redFirst ? 2 : 0), bytesPerPixel, lanes);
      StoreByte(green, out + 1, bytesPerPixel, lanes);
      StoreByte(red, out + (redFirst ? 0 : 2), bytesPerPixel, lanes);
    }
  }
}

const char* HslRowsTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(RgbToHslRowOfTarget);
HWY_EXPORT(HslToRgbRowOfTarget);
HWY_EXPORT(HslRowsTargetOfTarget);

void RgbToHslRow(const uint8_t* pixels, size_t bytesPerPixel, bool redFirst, uint8_t* hue,
                 uint8_t* saturation, uint8_t* lightness, size_t count) {
  HWY_DYNAMIC_DISPATCH(RgbToHslRowOfTarget)
  (pixels, bytesPerPixel, redFirst, hue, saturation, lightness, count);
}

void HslToRgbRow(const uint8_t* hue, const uint8_t* saturation, const uint8_t* lightness,
                 uint8_t* pixels, size_t bytesPerPixel, bool redFirst, size_t count) {
  HWY_DYNAMIC_DISPATCH(HslToRgbRowOfTarget)
  (hue, saturation, lightness, pixels, bytesPerPixel, redFirst, count);
}

const char* HslRowsTarget() { return HWY_DYNAMIC_DISPATCH(HslRowsTargetOfTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
