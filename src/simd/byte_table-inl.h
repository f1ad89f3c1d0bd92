// 256-entry byte tables looked up a whole vector of bytes at a time, for the Highway kernels.
// Included inside a kernel file's HWY_NAMESPACE after pixel_lanes-inl.h, once per target.

#if HWY_TARGET != HWY_SCALAR

using D8 = hn::Repartition<uint8_t, DU>;
using DI8 = hn::RebindToSigned<D8>;
using V8 = hn::Vec<D8>;

// Bytes 3 of the pixels (alpha).
HWY_INLINE hn::Mask<D8> AlphaBytes() {
  return hn::MaskFromVec(hn::BitCast(D8(), hn::Set(DU(), 0xff000000u)));
}

// A byte shuffle looks up 16 entries and gives 0 where the index has bit 7 set. Shuffle i sees
// the byte minus 16 * i (wrapping), whose low nibble is the byte's and whose bit 7 is clear
// exactly when (h - i) mod 16 < 8, h being the byte's high nibble. Below 128 (h < 8), shuffles
// 0..7 thus fire for i <= h, and with A_i = T_i ^ T_(i-1) (T_i the i-th run of 16 table entries,
// T_(-1) = 0) they XOR to T_h. From 128 on, shuffles 1..8 fire for i >= h - 7, and with
// B_i = T_(i+7) ^ T_(i+8) (T_16 = 0) they XOR to T_h as well. Both groups share their indices;
// bit 7 of the byte picks the group whose result counts. The chunks are A_0..A_7, B_1..B_8, and
// after them -16 * i (mod 256) for i = 1..8, sixteen times each: read from memory, these stay one
// addition each, where GCC rebuilt constants in every iteration at three vector operations each.
constexpr size_t kChunkBytes = 256 + 8 * 16;

void MakeChunks(const uint8_t table[256], uint8_t chunks[kChunkBytes]) {
  for (int j = 0; j < 16; ++j) {
    for (int i = 0; i < 8; ++i) {
      chunks[16 * i + j] = table[16 * i + j] ^ (i > 0 ? table[16 * (i - 1) + j] : 0);
      chunks[128 + 16 * i + j] = table[16 * (i + 8) + j] ^ (i < 7 ? table[16 * (i + 9) + j] : 0);
      chunks[256 + 16 * i + j] = static_cast<uint8_t>(256 - 16 * (i + 1));
    }
  }
}

// x86 shuffles read only bit 7 and the low nibble of an index. Elsewhere an index from 16 to 127
// may give 0 instead, so those bits alone are kept.
HWY_INLINE V8 LookUpChunk(const uint8_t* chunk, V8 index) {
  const D8 d8;
#if HWY_ARCH_X86 && HWY_TARGET <= HWY_SSSE3
  const V8 clean = index;
#else
  const V8 clean = hn::And(index, hn::Set(d8, uint8_t{0x8f}));
#endif
  return hn::TableLookupBytesOr0(hn::LoadDup128(d8, chunk), clean);
}

#if HWY_TARGET == HWY_AVX3_DL
// A 256-entry byte table held in four registers: two 128-entry permutes, the index's top bit
// picking between them.
struct ByteTable {
  __m512i part[4];

  explicit ByteTable(const uint8_t table[256]) {
    for (int i = 0; i < 4; ++i) part[i] = _mm512_loadu_si512(table + 64 * i);
  }

  HWY_INLINE __m512i operator()(__m512i x) const {
    const __m512i low = _mm512_permutex2var_epi8(part[0], x, part[1]);
    const __m512i high = _mm512_permutex2var_epi8(part[2], x, part[3]);
    return _mm512_mask_blend_epi8(_mm512_movepi8_mask(x), low, high);
  }
};

// Bytes 0..2 of each pixel from the table, byte 3 (alpha) kept.
struct TableVector {
  ByteTable table;

  // Every byte from the table, alpha too.
  HWY_INLINE V8 Lookup(V8 x) const { return V8{table(x.raw)}; }

  HWY_INLINE V8 operator()(V8 x) const {
    return V8{_mm512_mask_blend_epi8(0x8888888888888888ull, Lookup(x).raw, x.raw)};
  }
};

HWY_INLINE TableVector MakeTableVector(const uint8_t table[256], uint8_t*) {
  return TableVector{ByteTable(table)};
}
#else
// Bytes 0..2 of each pixel from the table, byte 3 (alpha) kept.
struct TableVector {
  const uint8_t* chunks;  // from MakeChunks

  const uint8_t* A(int i) const { return chunks + 16 * i; }
  const uint8_t* B(int i) const { return chunks + 128 + 16 * (i - 1); }
  // The byte minus 16 * i, for i = 1..8.
  HWY_INLINE V8 Index(V8 x, int i) const {
    return hn::Add(x, hn::LoadDup128(D8(), chunks + 256 + 16 * (i - 1)));
  }

  // Every byte from the table, alpha too.
  HWY_INLINE V8 Lookup(V8 x) const {
    const D8 d8;
    const DI8 di8;
    V8 low = LookUpChunk(A(0), x);
    V8 high = LookUpChunk(B(8), Index(x, 8));
    for (int i = 1; i < 7; i += 2) {
      const V8 index = Index(x, i);
      const V8 next = Index(x, i + 1);
      low = hn::Xor3(low, LookUpChunk(A(i), index), LookUpChunk(A(i + 1), next));
      high = hn::Xor3(high, LookUpChunk(B(i), index), LookUpChunk(B(i + 1), next));
    }
    const V8 index = Index(x, 7);
    low = hn::Xor(low, LookUpChunk(A(7), index));
    high = hn::Xor(high, LookUpChunk(B(7), index));
    const auto upper = hn::RebindMask(d8, hn::Lt(hn::BitCast(di8, x), hn::Zero(di8)));
    return hn::IfThenElse(upper, high, low);
  }

  HWY_INLINE V8 operator()(V8 x) const { return hn::IfThenElse(AlphaBytes(), x, Lookup(x)); }
};

// `chunks` holds kChunkBytes for MakeChunks.
HWY_INLINE TableVector MakeTableVector(const uint8_t table[256], uint8_t* chunks) {
  MakeChunks(table, chunks);
  return {chunks};
}
#endif  // HWY_TARGET == HWY_AVX3_DL

#endif  // HWY_TARGET != HWY_SCALAR
