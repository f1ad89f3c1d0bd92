#include <gtest/gtest.h>

#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
constexpr const wchar_t* kAToWhite = L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356";

// Despite the name, fully transparent pixels become opaque black; any other alpha passes.
TEST(AToWhiteEffect, TurnsOnlyFullyTransparentPixelsOpaqueBlack) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kAToWhite, nullptr);
  TestFrame* fg = new TestFrame(4, 1);
  TestFrame* dst = new TestFrame(5, 1, 0, false, 0xEE);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fg->pixels = {10, 20, 30, 0, 10, 20, 30, 1, 10, 20, 30, 255, 0, 0, 0, 0};
  filter->SetForeground(fg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  // The destination's fifth pixel has no source pixel and keeps its bytes.
  const std::vector<uint8_t> expected = {0,  0,   0, 255, 10, 20,  30,   1,    10,   20,
                                         30, 255, 0, 0,   0,  255, 0xEE, 0xEE, 0xEE, 0xEE};
  EXPECT_EQ(dst->pixels, expected);
}

}  // namespace
