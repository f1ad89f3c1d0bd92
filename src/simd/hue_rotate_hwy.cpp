// The hue rotation's vector kernel, compiled once per instruction set by foreach_target.h. Its
// lanes evaluate the per-pixel rows in the same order and precision (no MulAdd; the build passes
// -ffp-contract=off), so every set gives the same bytes.
#include <cstring>

#include "simd/hue_rotate.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/hue_rotate_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

#include "simd/pixel_lanes-inl.h"

// The stored byte as a float: limited to 0..255, then truncated (Trunc gives the integer's
// float exactly).
HWY_INLINE VF StoreLane(VF v) {
  const DF df;
  return hn::Trunc(hn::Min(hn::Set(df, 255.0f), hn::Max(hn::Zero(df), v)));
}

HWY_INLINE VU RotateLanes(VU px, const float m[9]) {
  const DU du;
  const DI di;
  const DF df;
  const VU byte = hn::Set(du, 255u);
  const VU u0 = hn::And(px, byte);
  const VU u1 = hn::And(hn::ShiftRight<8>(px), byte);
  const VU u2 = hn::And(hn::ShiftRight<16>(px), byte);
  const auto grey = hn::And(hn::Eq(u0, u1), hn::Eq(u1, u2));
  const VF b0 = hn::ConvertTo(df, hn::BitCast(di, u0));
  const VF b1 = hn::ConvertTo(df, hn::BitCast(di, u1));
  const VF b2 = hn::ConvertTo(df, hn::BitCast(di, u2));
  const auto row = [&](int i, VF x, VF y, VF z) {
    const VF sum =
        hn::Add(hn::Add(hn::Mul(hn::Set(df, m[i]), x), hn::Mul(hn::Set(df, m[i + 1]), y)),
                hn::Mul(hn::Set(df, m[i + 2]), z));
    return StoreLane(sum);
  };
  const VF n0 = row(0, b0, b1, b2);
  const VF n1 = row(3, n0, b1, b2);
  const VF n2 = row(6, n0, n1, b2);
  // A whole number 0..255 plus 2^23 is exact and holds the byte in its low mantissa bits, under
  // exponent bits that the shifts by 8 and 16 push out of the lane: cheaper than ConvertTo, whose
  // overflow fix-up these values never need.
  const auto bits = [&](VF v) { return hn::BitCast(du, hn::Add(v, hn::Set(df, 8388608.0f))); };
  const VU out = hn::Or(hn::Or(hn::And(px, hn::Set(du, 0xff000000u)), hn::And(bits(n0), byte)),
                        hn::Or(hn::ShiftLeft<8>(bits(n1)), hn::ShiftLeft<16>(bits(n2))));
  return hn::IfThenElse(grey, px, out);
}

// `count` consecutive 4-byte pixels.
void RotatePixelsOfTarget(uint8_t* pixels, size_t count, const float* m) {
  const DU du;
  const size_t lanes = hn::Lanes(du);
  size_t i = 0;
  for (; i + lanes <= count; i += lanes) {
    uint32_t* p = reinterpret_cast<uint32_t*>(pixels + 4 * i);
    // A frame far beyond the caches streams in faster when asked for well ahead of use.
    __builtin_prefetch(pixels + 4 * i + 4096, 1);
    hn::StoreU(RotateLanes(hn::LoadU(du, p), m), du, p);
  }
  if (i < count) {
    // The tail through a full vector, so that it sees the very same operations.
    alignas(64) uint32_t tail[HWY_MAX_BYTES / 4] = {};
    std::memcpy(tail, pixels + 4 * i, 4 * (count - i));
    hn::Store(RotateLanes(hn::Load(du, tail), m), du, tail);
    std::memcpy(pixels + 4 * i, tail, 4 * (count - i));
  }
}

const char* HueRotateTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(RotatePixelsOfTarget);
HWY_EXPORT(HueRotateTargetOfTarget);

void RotatePixels(uint8_t* pixels, size_t count, const float m[9]) {
  HWY_DYNAMIC_DISPATCH(RotatePixelsOfTarget)(pixels, count, m);
}

const char* HueRotateTarget() { return HWY_DYNAMIC_DISPATCH(HueRotateTargetOfTarget)(); }

}  // namespace tfx
#endif  // HWY_ONCE
