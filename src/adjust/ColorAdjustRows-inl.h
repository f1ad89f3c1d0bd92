// Vibrance and saturation on whole vectors of packed pixels. Included once per instruction set
// by ColorAdjustRows.cpp, inside that set's target region, with TFX_ROWS_NS naming the namespace
// and TFX_ROWS_VEC_BYTES the vector width; there is deliberately no include guard.
//
// Every lane evaluates exactly the float and integer expressions of the per-pixel forms in
// ColorAdjust.cpp, in the same order and precision, so results match them bit for bit.

namespace tfx {
namespace TFX_ROWS_NS {
namespace {

typedef int32_t I32 __attribute__((vector_size(TFX_ROWS_VEC_BYTES)));
typedef uint32_t U32 __attribute__((vector_size(TFX_ROWS_VEC_BYTES)));
typedef float F32 __attribute__((vector_size(TFX_ROWS_VEC_BYTES)));
constexpr size_t kLanes = TFX_ROWS_VEC_BYTES / 4;

inline I32 Splat(int32_t v) { return I32{} + v; }
inline F32 SplatF(float v) { return F32{} + v; }
inline I32 Min(I32 a, I32 b) { return a < b ? a : b; }
inline I32 Max(I32 a, I32 b) { return a > b ? a : b; }
inline F32 ToFloat(I32 v) { return __builtin_convertvector(v, F32); }
inline I32 Trunc(F32 v) { return __builtin_convertvector(v, I32); }

struct Pixels {
  I32 c0, c1, c2;  // colour bytes 0, 1, 2
  I32 alpha;       // byte 3 in place
};

inline Pixels Unpack(I32 p) {
  return Pixels{p & 255, (p >> 8) & 255, (p >> 16) & 255,
                p & Splat(static_cast<int32_t>(0xff000000u))};
}

inline I32 Pack(const Pixels& px) { return px.alpha | px.c0 | (px.c1 << 8) | (px.c2 << 16); }

// (channel * (k + 256) - luma * k) >> 8 with 32-bit wrap-around, as in the per-pixel form,
// rearranged to (channel << 8) + (channel - luma) * k: equal modulo 2^32, one multiply fewer.
inline I32 MixChannel(I32 c, I32 luma, I32 k) {
  const U32 mixed = ((U32)c << 8) + (U32)(c - luma) * (U32)k;
  return Max(Min((I32)mixed >> 8, Splat(255)), Splat(0));
}

struct VibranceVector {
  float strength;

  I32 operator()(I32 p) const {
    Pixels px = Unpack(p);
    const I32 mx = Max(px.c0, Max(px.c1, px.c2));
    const I32 mn = Min(px.c0, Min(px.c1, px.c2));
    const I32 luma = (mx + mn) >> 1;
    // Of the three masks (channel - luma, floored at 0) the smallest is always 0 and the largest
    // is mx - luma, so the luma of the mask is (mx - luma) >> 1.
    const I32 weight = -((mx - luma) >> 1) & 255;
    const I32 k = Trunc(ToFloat(weight) * strength);
    px.c0 = MixChannel(px.c0, luma, k);
    px.c1 = MixChannel(px.c1, luma, k);
    px.c2 = MixChannel(px.c2, luma, k);
    return Pack(px);
  }
};

// 0 below 0, else trunc(min(255, v)).
inline I32 ToByte(F32 v) {
  const I32 capped = Trunc(v < 255.0f ? v : SplatF(255.0f));
  return v < 0.0f ? Splat(0) : capped;
}

template <bool kIncrease>
struct SaturationVector {
  float sigma;
  float fixedGain;  // 1 / (1 - sigma) - 1, or 1 + sigma when decreasing

  I32 operator()(I32 p) const {
    Pixels px = Unpack(p);
    const I32 mx = Max(px.c0, Max(px.c1, px.c2));
    const I32 mn = Min(px.c0, Min(px.c1, px.c2));
    const F32 sum = ToFloat(mx + mn) / 255.0f;
    const F32 l = sum / 2.0f;
    const F32 delta = ToFloat(mx - mn) / 255.0f;
    const F32 lv = l * 255.0f;
    const F32 f0 = ToFloat(px.c0), f1 = ToFloat(px.c1), f2 = ToFloat(px.c2);
    F32 o0, o1, o2;
    if (kIncrease) {
      // Picking the divisor first divides by the same value the per-pixel form divides by.
      // Grey lanes may divide by 0 here; they are restored below.
      const F32 s = delta / (l < 0.5f ? sum : 2.0f - sum);
      const F32 a = s + sigma >= 1.0f ? 1.0f / s - 1.0f : SplatF(fixedGain);
      o0 = f0 + (f0 - lv) * a;
      o1 = f1 + (f1 - lv) * a;
      o2 = f2 + (f2 - lv) * a;
    } else {
      o0 = lv + (f0 - lv) * fixedGain;
      o1 = lv + (f1 - lv) * fixedGain;
      o2 = lv + (f2 - lv) * fixedGain;
    }
    px.c0 = ToByte(o0);
    px.c1 = ToByte(o1);
    px.c2 = ToByte(o2);
    return mx == mn ? p : Pack(px);
  }
};

inline I32 Load(const uint8_t* p) {
  I32 v;
  std::memcpy(&v, p, sizeof v);
  return v;
}

inline void Store(uint8_t* p, I32 v) { std::memcpy(p, &v, sizeof v); }

// The last partial vector goes through a zero-padded copy, so the tail gets the same
// arithmetic as every other pixel.
template <class Kernel>
void ForEachVector(uint8_t* pixels, size_t count, const Kernel& kernel) {
  size_t i = 0;
  for (; i + kLanes <= count; i += kLanes) Store(pixels + 4 * i, kernel(Load(pixels + 4 * i)));
  if (i < count) {
    uint8_t tail[kLanes * 4] = {};
    const size_t bytes = (count - i) * 4;
    std::memcpy(tail, pixels + 4 * i, bytes);
    Store(tail, kernel(Load(tail)));
    std::memcpy(pixels + 4 * i, tail, bytes);
  }
}

void VibranceRow(uint8_t* pixels, size_t count, float strength) {
  ForEachVector(pixels, count, VibranceVector{strength});
}

void SaturationRow(uint8_t* pixels, size_t count, float sigma) {
  if (sigma >= 0.0f) {
    ForEachVector(pixels, count, SaturationVector<true>{sigma, 1.0f / (1.0f - sigma) - 1.0f});
  } else {
    ForEachVector(pixels, count, SaturationVector<false>{sigma, 1.0f + sigma});
  }
}

}  // namespace
}  // namespace TFX_ROWS_NS
}  // namespace tfx
