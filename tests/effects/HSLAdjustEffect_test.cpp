#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::FillRandom;
using tfx_test::Settings;
constexpr const wchar_t* kHSLAdjust = L"AF91FF05-6577-4A4B-C81E-652EE7D6596E";

// The frame through the exported function, rows packed.
std::vector<uint8_t> Expected(TestFrame* fg, const HSLBands& bands) {
  std::vector<uint8_t> pixels;
  for (int y = 0; y < fg->height; ++y) {
    pixels.insert(pixels.end(), fg->Row(y), fg->Row(y) + fg->width * 4);
  }
  uint8_t* bits = pixels.data();
  CxImage image(&bits, fg->width, fg->height, 32, fg->width * 4, IPF_BGRA);
  hslAdjustment(&image, bands);
  return pixels;
}

std::vector<uint8_t> Packed(TestFrame* f) {
  std::vector<uint8_t> pixels;
  for (int y = 0; y < f->height; ++y)
    pixels.insert(pixels.end(), f->Row(y), f->Row(y) + f->width * 4);
  return pixels;
}

TEST(HSLAdjustEffect, ReadsEveryBandValueByItsName) {
  // One band value at a time (width and soft beside a hue shift, which they shape): each name
  // must land in its own field.
  const wchar_t* bandNames[] = {L"red",  L"orange", L"yellow", L"green",
                                L"aqua", L"blue",   L"purple", L"magenta"};
  TestFrame* fg = new TestFrame(64, 8);
  NLEComPtr<INLEFrame> hold(fg);
  FillRandom(fg, 5);
  for (int b = 0; b < kHSLBandCount; ++b) {
    const std::wstring prefix = std::wstring(L"u_") + bandNames[b] + L"_";
    const struct {
      std::vector<std::pair<std::wstring, double>> params;
      HSLBandValues values;
    } cases[] = {
        {{{prefix + L"hue", 60}}, {60, 0, 0, 0, 0}},
        {{{prefix + L"sat", -45}}, {0, -45, 0, 0, 0}},
        {{{prefix + L"light", 35}}, {0, 0, 35, 0, 0}},
        {{{prefix + L"hue", 60}, {prefix + L"width", 80}}, {60, 0, 0, 80, 0}},
        {{{prefix + L"hue", 60}, {prefix + L"soft", -90}}, {60, 0, 0, 0, -90}},
    };
    for (const auto& c : cases) {
      const std::wstring& name = c.params.back().first;
      SCOPED_TRACE(std::string(name.begin(), name.end()));
      NLEComPtr<INLECGFilter> filter = CreateEffect(kHSLAdjust, Settings(c.params));
      TestFrame* dst = new TestFrame(64, 8, 300);
      NLEComPtr<INLEFrame> h(dst);
      filter->SetForeground(fg);
      ASSERT_EQ(filter->Running(dst), NLE_S_OK);
      HSLBands bands{};
      bands.band[b] = c.values;
      const std::vector<uint8_t> expected = Expected(fg, bands);
      ASSERT_NE(expected, Packed(fg));
      ASSERT_EQ(Packed(dst), expected);
    }
  }
}

TEST(HSLAdjustEffect, FollowsParameterChanges) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kHSLAdjust, Settings({{L"u_green_sat", 0}}));
  TestFrame* fg = new TestFrame(33, 7);
  TestFrame* dst = new TestFrame(33, 7);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  FillRandom(fg, 9);
  filter->SetForeground(fg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);  // the tables built for 0 must not stay

  tfx_test::SetParam(filter.get(), L"u_green_sat", -100);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  HSLBands bands{};
  bands.band[kHSLGreen].sat = -100;
  EXPECT_EQ(dst->pixels, Expected(fg, bands));
}

}  // namespace
