#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdint>

#include "tessarofx/NLEHost.h"

namespace {

struct Layout {
  int32_t width, height, stride, size;
  NLEFrameOrientation orientation;
};

Layout LayoutOf(INLEFrame* frame) {
  NLEFrameDesc desc{};
  EXPECT_EQ(frame->GetDescription(&desc, false, false), NLE_S_OK);
  EXPECT_EQ(desc.storage, kNLEFrameStorageMemory);
  NLEComPtr<INLEFrameBuffer> buffer;
  EXPECT_EQ(frame->GetBuffer(&buffer), NLE_S_OK);
  return {desc.width, desc.height, buffer->GetStride(), buffer->GetSize(), desc.orientation};
}

TEST(MemoryFrame, AllocatesZeroedStorageLazilyWithPackedOrPaddedRows) {
  NLEComPtr<INLEMemoryFrame> frame;
  ASSERT_EQ(NLECommon::CreateMemoryFrame(3, 2, 0, &frame), NLE_S_OK);
  const Layout packed = LayoutOf(frame);
  EXPECT_EQ(packed.stride, 12);
  EXPECT_EQ(packed.size, 24);
  uint8_t* first = nullptr;
  uint8_t* again = nullptr;
  ASSERT_EQ(frame->GetPixels(&first), NLE_S_OK);
  ASSERT_NE(first, nullptr);
  EXPECT_EQ(std::count(first, first + 24, 0), 24);
  first[5] = 9;
  EXPECT_EQ(frame->Prepare(), NLE_S_OK);  // storage exists: nothing changes
  EXPECT_EQ(frame->GetPixels(&again), NLE_S_OK);
  EXPECT_EQ(again, first);
  EXPECT_EQ(again[5], 9);

  // Reallocating drops the old pixels; Prepare gives zeroed storage.
  ASSERT_EQ(frame->Allocate(3, 2, 16, kNLEFrameBottomUp), NLE_S_OK);
  const Layout padded = LayoutOf(frame);
  EXPECT_EQ(padded.stride, 16);
  EXPECT_EQ(padded.size, 32);
  EXPECT_EQ(padded.orientation, kNLEFrameBottomUp);
  EXPECT_EQ(frame->Prepare(), NLE_S_OK);
  ASSERT_EQ(frame->GetPixels(&again), NLE_S_OK);
  EXPECT_EQ(std::count(again, again + 32, 0), 32);
}

TEST(MemoryFrame, RejectsBadSizesAndKeepsItsLayout) {
  NLEComPtr<INLEMemoryFrame> frame;
  ASSERT_EQ(NLECommon::CreateMemoryFrame(2, 2, 0, &frame), NLE_S_OK);
  const struct {
    int32_t width, height, stride;
  } bad[] = {{-1, 2, 0}, {2, -1, 0},        {2, 2, -8},
             {2, 2, 7},  {INT32_MAX, 1, 0}, {1 << 20, 1 << 12, 0}};
  for (const auto& b : bad) {
    SCOPED_TRACE(testing::Message() << b.width << "x" << b.height << " stride " << b.stride);
    EXPECT_EQ(frame->Allocate(b.width, b.height, b.stride, kNLEFrameTopDown), NLE_E_INVALIDARG);
    uint8_t dummy = 0;
    EXPECT_EQ(frame->Wrap(&dummy, b.width, b.height, b.stride, kNLEFrameTopDown), NLE_E_INVALIDARG);
    EXPECT_EQ(LayoutOf(frame).stride, 8);
  }
  EXPECT_EQ(frame->Allocate(2, 2, 0, static_cast<NLEFrameOrientation>(7)), NLE_E_INVALIDARG);
  INLEMemoryFrame* none = reinterpret_cast<INLEMemoryFrame*>(1);
  EXPECT_EQ(NLECommon::CreateMemoryFrame(2, 2, 4, &none), NLE_E_INVALIDARG);
  EXPECT_EQ(none, nullptr);
}

TEST(MemoryFrame, StartsWithoutPixelsAndWrapsCallerMemoryUntilReallocated) {
  NLEComPtr<INLEMemoryFrame> frame;
  ASSERT_EQ(NLECommon::GetInterface(CLSID_NLEMemoryFrame, nullptr, 0, IID_INLEMemoryFrame,
                                    reinterpret_cast<void**>(&frame)),
            NLE_S_OK);
  EXPECT_EQ(LayoutOf(frame).size, 0);
  EXPECT_EQ(frame->Prepare(), NLE_S_OK);
  uint8_t* pixels = reinterpret_cast<uint8_t*>(1);
  EXPECT_EQ(frame->GetPixels(&pixels), NLE_S_OK);
  EXPECT_EQ(pixels, nullptr);
  INLEFrameSurface* surface = nullptr;
  EXPECT_EQ(frame->GetSurface(&surface), NLE_E_NOTIMPL);
  EXPECT_EQ(frame->ReleaseSurface(surface), NLE_E_NOTIMPL);

  uint8_t mine[2 * 20] = {};
  EXPECT_EQ(frame->Wrap(nullptr, 4, 2, 20, kNLEFrameTopDown), NLE_E_POINTER);
  ASSERT_EQ(frame->Wrap(mine, 4, 2, 20, kNLEFrameTopDown), NLE_S_OK);
  EXPECT_EQ(LayoutOf(frame).stride, 20);
  ASSERT_EQ(frame->GetPixels(&pixels), NLE_S_OK);
  EXPECT_EQ(pixels, mine);
  ASSERT_EQ(frame->Allocate(4, 2, 0, kNLEFrameTopDown), NLE_S_OK);
  ASSERT_EQ(frame->GetPixels(&pixels), NLE_S_OK);
  EXPECT_NE(pixels, mine);
}

}  // namespace
