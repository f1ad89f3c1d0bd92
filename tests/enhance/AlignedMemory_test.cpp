#include "tessarofx/AlignedMemory.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>

namespace {

bool AlignedTo(const void* p, uintptr_t alignment) {
  return reinterpret_cast<uintptr_t>(p) % alignment == 0;
}

TEST(AllocMemory, Gives32ByteAlignedBlocksZeroedOnRequest) {
  for (const uint32_t size : {0u, 1u, 33u, 4096u + 7u}) {
    SCOPED_TRACE(size);
    for (int i = 0; i < 4; ++i) {
      // Dirty the heap first so that zeroing is not free.
      void* dirty = AllocMemory(size, false);
      ASSERT_NE(dirty, nullptr);
      EXPECT_TRUE(AlignedTo(dirty, 32));
      std::memset(dirty, 0xa5, size);
      FreeMemory(dirty);
      auto* zeroed = static_cast<uint8_t*>(AllocMemory(size, true));
      ASSERT_NE(zeroed, nullptr);
      EXPECT_TRUE(AlignedTo(zeroed, 32));
      for (uint32_t b = 0; b < size; ++b) ASSERT_EQ(zeroed[b], 0) << b;
      FreeMemory(zeroed);
    }
  }
  FreeMemory(nullptr);
}

TEST(AlignedMalloc, TakesPowersOfTwoOnly) {
  for (const size_t alignment : {size_t{1}, size_t{2}, size_t{8}, size_t{64}, size_t{4096}}) {
    void* p = aligned_malloc(100, alignment);
    ASSERT_NE(p, nullptr) << alignment;
    EXPECT_TRUE(AlignedTo(p, alignment)) << alignment;
    std::memset(p, 1, 100);
    aligned_free(p);
  }
  for (const size_t alignment : {size_t{0}, size_t{3}, size_t{24}, size_t{100}}) {
    EXPECT_EQ(aligned_malloc(100, alignment), nullptr) << alignment;
  }
  EXPECT_EQ(aligned_malloc(SIZE_MAX - 64, 32), nullptr);
  aligned_free(nullptr);
}

}  // namespace
