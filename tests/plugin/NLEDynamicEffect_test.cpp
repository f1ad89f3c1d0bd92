#include "plugin/NLEDynamicEffect.h"

#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "plugin/NLECGFrameWrapper.h"
#include "support/TestFrame.h"

namespace {

// Records what Transform receives and writes a marker into the output.
class RecordingEffect final : public NLEDynamicEffect {
 public:
  int Transform(uint8_t* dst, int dstW, int dstH, int dstPitch, const uint8_t* src, int srcW,
                int srcH, int srcPitch, const uint8_t* src2, int src2W, int src2H,
                int src2Pitch) override {
    calls++;
    d = {dst, dstW, dstH, dstPitch};
    s = {src, srcW, srcH, srcPitch};
    s2 = {src2, src2W, src2H, src2Pitch};
    if (dst)
      for (int y = 0; y < dstH; ++y)
        for (int x = 0; x < dstW * 4; ++x) dst[y * dstPitch + x] = static_cast<uint8_t>(y * 16 + x);
    return result;
  }
  struct View {
    const uint8_t* data;
    int w, h, pitch;
  };
  View d{}, s{}, s2{};
  int calls = 0;
  int result = 0;
};

TEST(NLEDynamicEffect, RefusesToRunWithoutFramesAndPassesForegroundOnlyWithEmptyBackground) {
  NLEComPtr<RecordingEffect> fx(new RecordingEffect);
  TestFrame* dst = new TestFrame(2, 2);
  NLEComPtr<INLEFrame> hold(dst);
  EXPECT_EQ(fx->Running(nullptr), NLE_E_INVALIDARG);
  EXPECT_EQ(fx->Running(dst), NLE_E_INVALIDARG);  // neither background nor foreground
  EXPECT_EQ(fx->calls, 0);

  NLEComPtr<NLEDynamicEffect> base(new NLEDynamicEffect);
  base->SetForeground(dst);
  EXPECT_EQ(base->Running(dst), NLE_E_NOTIMPL);

  // With an empty background the foreground alone goes to the effect.
  TestFrame* fg = new TestFrame(3, 2);
  dst = new TestFrame(3, 2);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fx->SetForeground(fg);
  fx->result = -7;
  EXPECT_EQ(fx->Running(dst), -7);  // the effect's code goes back unchanged
  EXPECT_EQ(fx->s.data, nullptr);
  EXPECT_EQ(fx->s.w + fx->s.h + fx->s.pitch, 0);
  EXPECT_EQ(fx->s2.data, fg->pixels.data());  // packed full frames are used in place
  EXPECT_EQ(fx->d.data, dst->pixels.data());
  EXPECT_EQ(fx->d.pitch, 12);
  EXPECT_EQ(dst->prepareCalls, 0);  // no background: nothing to prepare

  TestFrame* bg = new TestFrame(3, 2);
  NLEComPtr<INLEFrame> h3(bg);
  fx->SetBackground(bg);
  fx->Running(dst);
  EXPECT_EQ(dst->prepareCalls, 1);
  fx->SetBackground(dst);
  fx->Running(dst);
  EXPECT_EQ(dst->prepareCalls, 1);  // background is the destination itself
}

TEST(NLEDynamicEffect, PaddedDestinationIsPackedAndWrittenBackAndSurfacesHandedBack) {
  NLEComPtr<RecordingEffect> fx(new RecordingEffect);
  TestFrame* fg = new TestFrame(2, 3, 12, false, 5);
  TestFrame* dst = new TestFrame(2, 3, 12, false, 0xEE);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fx->SetForeground(fg);
  ASSERT_EQ(fx->Running(dst), 0);
  EXPECT_NE(fx->d.data, dst->pixels.data());
  EXPECT_EQ(fx->d.pitch, 8);
  EXPECT_EQ(fx->s2.pitch, 8);
  for (int y = 0; y < 3; ++y) {
    for (int x = 0; x < 8; ++x) EXPECT_EQ(dst->Row(y)[x], y * 16 + x) << y << "," << x;
    for (int x = 8; x < 12; ++x) EXPECT_EQ(dst->Row(y)[x], 0xEE);  // padding untouched
  }

  // Surface frames are mapped and handed back.
  fg = new TestFrame(2, 2, 0, true);
  dst = new TestFrame(2, 2, 16, true);
  NLEComPtr<INLEFrame> h3(fg), h4(dst);
  fx->SetForeground(fg);
  ASSERT_EQ(fx->Running(dst), 0);
  EXPECT_EQ(fx->s2.data, fg->pixels.data());
  EXPECT_EQ(dst->Row(1)[3], 16 + 3);
  EXPECT_EQ(dst->surfaceReleases, 1);
  EXPECT_EQ(fg->surfaceReleases, 1);
}

TEST(NLECGFrameWrapper, CropsFlipsAndReportsEmptinessInverted) {
  TestFrame* f = new TestFrame(4, 4);
  NLEComPtr<INLEFrame> hold(f);
  for (int y = 0; y < 4; ++y) std::memset(f->Row(y), y + 1, 16);

  {
    NLECGFrameWrapper crop(f, false, false, NLERectF{0.25, 0.5, 0.5, 0.5});
    EXPECT_FALSE(crop.IsValid());  // has pixels
    EXPECT_EQ(crop.GetWidth(), 2);
    EXPECT_EQ(crop.GetHeight(), 2);
    EXPECT_EQ(crop.GetPitch(), 8);
    EXPECT_EQ(crop.GetData()[0], 3);
    EXPECT_EQ(crop.GetData()[8], 4);
  }
  {
    NLECGFrameWrapper flipped(f, true, true, NLERectF{0, 0, 1, 1});
    ASSERT_EQ(flipped.GetHeight(), 4);
    EXPECT_EQ(flipped.GetData()[0], 4);  // bottom row first
    flipped.GetData()[0] = 99;           // written back to the last row
  }
  EXPECT_EQ(f->Row(3)[0], 99);
  {
    // A region running past the frame is cut at its edge.
    NLECGFrameWrapper over(f, false, false, NLERectF{0.5, 0.5, 1, 1});
    EXPECT_EQ(over.GetWidth(), 2);
    EXPECT_EQ(over.GetHeight(), 2);
  }
  NLECGFrameWrapper none(nullptr, false, false, NLERectF{0, 0, 1, 1});
  EXPECT_TRUE(none.IsValid());
  EXPECT_EQ(none.GetWidth(), 0);
  TestFrame* empty = new TestFrame(0, 0);
  NLEComPtr<INLEFrame> holdEmpty(empty);
  NLECGFrameWrapper zero(empty, false, false, NLERectF{0, 0, 1, 1});
  EXPECT_TRUE(zero.IsValid());
}

TEST(myCopy, StepsBothBuffersByTheSmallerPitch) {
  std::vector<uint8_t> src(32), dst(32, 0);
  for (size_t i = 0; i < src.size(); ++i) src[i] = static_cast<uint8_t>(i + 1);
  ASSERT_TRUE(myCopy(src.data(), dst.data(), 3, 2, 16, 12));
  for (size_t i = 0; i < 24; ++i) EXPECT_EQ(dst[i], i + 1) << i;
  for (size_t i = 24; i < 32; ++i) EXPECT_EQ(dst[i], 0) << i;

  EXPECT_TRUE(myCopy(src.data(), dst.data(), 0, 2, 16, 16));
  EXPECT_EQ(dst[31], 32);
  EXPECT_FALSE(myCopy(nullptr, dst.data(), 1, 1, 4, 4));
  EXPECT_FALSE(myCopy(src.data(), nullptr, 1, 1, 4, 4));
  EXPECT_FALSE(myCopy(src.data(), dst.data(), 1, 0, 4, 4));
  EXPECT_FALSE(myCopy(src.data(), dst.data(), 1, 1, 0, 4));
  EXPECT_FALSE(myCopy(src.data(), dst.data(), 1, 1, 4, 0));
}

}  // namespace
