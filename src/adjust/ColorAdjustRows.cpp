// The row kernels, compiled once per instruction set in this one file: the vector code of
// ColorAdjustRows-inl.h is included under each target region, and the set is picked once at run
// time from what the CPU reports. None of the targets enables fused multiply-add, so every set
// rounds exactly like the per-pixel forms.
#include "adjust/ColorAdjustRows.h"

#include <cstring>

#if defined(__x86_64__) || defined(__i386__)
#include <immintrin.h>
#define TFX_ROWS_X86 1
#else
#define TFX_ROWS_X86 0
#endif

#if defined(__clang__)
#define TFX_BEGIN_TARGET(isa) \
  _Pragma(TFX_STRINGIFY(clang attribute push(__attribute__((target(isa))), apply_to = function)))
#define TFX_END_TARGET _Pragma("clang attribute pop")
#else
#define TFX_BEGIN_TARGET(isa) _Pragma("GCC push_options") _Pragma(TFX_STRINGIFY(GCC target(isa)))
#define TFX_END_TARGET _Pragma("GCC pop_options")
#endif
#define TFX_STRINGIFY(x) #x

namespace tfx {
namespace {

// Without a usable byte shuffle, bytes are looked up one by one.
void ApplyTableBytes(uint8_t* pixels, size_t count, const uint8_t table[256]) {
  for (size_t i = 0; i < count; ++i, pixels += 4) {
    pixels[0] = table[pixels[0]];
    pixels[1] = table[pixels[1]];
    pixels[2] = table[pixels[2]];
  }
}

}  // namespace
}  // namespace tfx

// Baseline: 16-byte vectors (SSE2 on x86-64, NEON on AArch64, scalar code elsewhere).
#define TFX_ROWS_NS generic
#define TFX_ROWS_VEC_BYTES 16
#include "adjust/ColorAdjustRows-inl.h"
#undef TFX_ROWS_NS
#undef TFX_ROWS_VEC_BYTES

#if TFX_ROWS_X86
TFX_BEGIN_TARGET("avx2")
#define TFX_ROWS_NS avx2
#define TFX_ROWS_VEC_BYTES 32
#include "adjust/ColorAdjustRows-inl.h"
#undef TFX_ROWS_NS
#undef TFX_ROWS_VEC_BYTES

namespace tfx {
namespace avx2 {
namespace {

// A byte shuffle looks up 16 entries and gives 0 where the index has bit 7 set. Indices below
// 128 are lowered by 16 with signed saturation before each of eight shuffles, so shuffle i sees a
// non-negative index exactly for i <= h (h = index >> 4) and always the index's low nibble;
// indices from 128 stay negative throughout. With chunk_i = T_i ^ T_(i-1) (T_i being the i-th
// run of 16 table entries, T_(-1) = 0) the contributions XOR to T_h. The upper half does the same
// on the index with bit 7 flipped, using runs 8 to 15.
struct ShuffleTable {
  __m256i chunks[16];

  explicit ShuffleTable(const uint8_t table[256]) {
    for (int i = 0; i < 16; ++i) {
      uint8_t chunk[16];
      for (int j = 0; j < 16; ++j) {
        chunk[j] = table[16 * i + j] ^ (i % 8 != 0 ? table[16 * (i - 1) + j] : 0);
      }
      chunks[i] = _mm256_broadcastsi128_si256(_mm_loadu_si128(reinterpret_cast<__m128i*>(chunk)));
    }
  }

  __m256i LookUp(__m256i x) const {
    const __m256i sixteen = _mm256_set1_epi8(16);
    __m256i low = x;
    __m256i high = _mm256_xor_si256(x, _mm256_set1_epi8(static_cast<char>(0x80)));
    __m256i looked =
        _mm256_xor_si256(_mm256_shuffle_epi8(chunks[0], low), _mm256_shuffle_epi8(chunks[8], high));
    for (int i = 1; i < 8; ++i) {
      low = _mm256_subs_epi8(low, sixteen);
      high = _mm256_subs_epi8(high, sixteen);
      looked = _mm256_xor_si256(looked, _mm256_xor_si256(_mm256_shuffle_epi8(chunks[i], low),
                                                         _mm256_shuffle_epi8(chunks[8 + i], high)));
    }
    // Bytes 0..2 of every pixel from the table, byte 3 (alpha) as it was.
    return _mm256_blendv_epi8(looked, x, _mm256_set1_epi32(static_cast<int>(0xff000000u)));
  }
};

void ApplyTable(uint8_t* pixels, size_t count, const uint8_t table[256]) {
  const ShuffleTable shuffle(table);
  const size_t bytes = count * 4;
  size_t i = 0;
  for (; i + 32 <= bytes; i += 32) {
    const __m256i x = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(pixels + i));
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(pixels + i), shuffle.LookUp(x));
  }
  if (i < bytes) {
    uint8_t tail[32] = {};
    std::memcpy(tail, pixels + i, bytes - i);
    const __m256i x = _mm256_loadu_si256(reinterpret_cast<const __m256i*>(tail));
    _mm256_storeu_si256(reinterpret_cast<__m256i*>(tail), shuffle.LookUp(x));
    std::memcpy(pixels + i, tail, bytes - i);
  }
}

}  // namespace
}  // namespace avx2
}  // namespace tfx
TFX_END_TARGET

TFX_BEGIN_TARGET("avx512f,avx512bw,avx512vbmi")
#define TFX_ROWS_NS avx512
#define TFX_ROWS_VEC_BYTES 64
#include "adjust/ColorAdjustRows-inl.h"
#undef TFX_ROWS_NS
#undef TFX_ROWS_VEC_BYTES

namespace tfx {
namespace avx512 {
namespace {

// Two 128-entry byte permutes cover the table; bit 7 of each index picks the half.
inline __m512i LookUp(__m512i x, __m512i t0, __m512i t1, __m512i t2, __m512i t3) {
  const __m512i low = _mm512_permutex2var_epi8(t0, x, t1);
  const __m512i high = _mm512_permutex2var_epi8(t2, x, t3);
  const __m512i looked = _mm512_mask_blend_epi8(_mm512_movepi8_mask(x), low, high);
  // Bytes 0..2 of every pixel from the table, byte 3 (alpha) as it was.
  return _mm512_mask_blend_epi8(0x7777777777777777ull, x, looked);
}

void ApplyTable(uint8_t* pixels, size_t count, const uint8_t table[256]) {
  const __m512i t0 = _mm512_loadu_si512(table);
  const __m512i t1 = _mm512_loadu_si512(table + 64);
  const __m512i t2 = _mm512_loadu_si512(table + 128);
  const __m512i t3 = _mm512_loadu_si512(table + 192);
  const size_t bytes = count * 4;
  size_t i = 0;
  for (; i + 64 <= bytes; i += 64) {
    const __m512i x = _mm512_loadu_si512(pixels + i);
    _mm512_storeu_si512(pixels + i, LookUp(x, t0, t1, t2, t3));
  }
  if (i < bytes) {
    const __mmask64 tail = (1ull << (bytes - i)) - 1;
    const __m512i x = _mm512_maskz_loadu_epi8(tail, pixels + i);
    _mm512_mask_storeu_epi8(pixels + i, tail, LookUp(x, t0, t1, t2, t3));
  }
}

}  // namespace
}  // namespace avx512
}  // namespace tfx
TFX_END_TARGET
#endif  // TFX_ROWS_X86

namespace tfx {
namespace {

const ColorAdjustRows kGenericRows = {"generic", ApplyTableBytes, generic::VibranceRow,
                                      generic::SaturationRow};
#if TFX_ROWS_X86
const ColorAdjustRows kAvx2Rows = {"avx2", avx2::ApplyTable, avx2::VibranceRow,
                                   avx2::SaturationRow};
const ColorAdjustRows kAvx512Rows = {"avx512", avx512::ApplyTable, avx512::VibranceRow,
                                     avx512::SaturationRow};
#endif

}  // namespace

std::vector<const ColorAdjustRows*> SupportedColorAdjustRows() {
  std::vector<const ColorAdjustRows*> rows;
#if TFX_ROWS_X86
  __builtin_cpu_init();
  if (__builtin_cpu_supports("avx512f") && __builtin_cpu_supports("avx512bw") &&
      __builtin_cpu_supports("avx512vbmi")) {
    rows.push_back(&kAvx512Rows);
  }
  if (__builtin_cpu_supports("avx2")) rows.push_back(&kAvx2Rows);
#endif
  rows.push_back(&kGenericRows);
  return rows;
}

const ColorAdjustRows& BestColorAdjustRows() {
  static const ColorAdjustRows* const best = SupportedColorAdjustRows().front();
  return *best;
}

}  // namespace tfx
