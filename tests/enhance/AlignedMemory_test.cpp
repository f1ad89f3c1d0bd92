#include "tessarofx/AlignedMemory.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

namespace {

bool AlignedTo(const void* p, uintptr_t alignment) {
  return reinterpret_cast<uintptr_t>(p) % alignment == 0;
}

TEST(AlignedMemory, AlignsAndZeroesAsAsked) {
  for (const uint32_t size : {0u, 1u, 33u, 4103u}) {
    // Dirty a block first, which the zeroed one is likely to reuse.
    void* dirty = AllocMemory(size, false);
    ASSERT_TRUE(dirty != nullptr && AlignedTo(dirty, 32)) << size;
    std::memset(dirty, 0xa5, size);
    FreeMemory(dirty);
    auto* zeroed = static_cast<uint8_t*>(AllocMemory(size, true));
    ASSERT_TRUE(zeroed != nullptr && AlignedTo(zeroed, 32)) << size;
    for (uint32_t b = 0; b < size; ++b) ASSERT_EQ(zeroed[b], 0) << b;
    FreeMemory(zeroed);
  }
  for (const size_t alignment : {1, 2, 8, 64, 4096}) {
    void* p = aligned_malloc(100, alignment);
    ASSERT_TRUE(p != nullptr && AlignedTo(p, alignment)) << alignment;
    aligned_free(p);
  }
  for (const size_t alignment : {0, 3, 24, 100}) EXPECT_EQ(aligned_malloc(100, alignment), nullptr);
  EXPECT_EQ(aligned_malloc(SIZE_MAX - 64, 32), nullptr);
  FreeMemory(nullptr);
  aligned_free(nullptr);
}

}  // namespace
