#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/EveryTarget.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::Settings;
constexpr const wchar_t* kHSLAdjust = L"AF91FF05-6577-4A4B-C81E-652EE7D6596E";

TEST(HSLAdjustEffect, ReadsEveryBandValueByItsName) {
  // One band value at a time (width and soft beside a hue shift, which they shape): each name
  // must land in its own field.
  const wchar_t* bandNames[] = {L"red",  L"orange", L"yellow", L"green",
                                L"aqua", L"blue",   L"purple", L"magenta"};
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
      HSLBands bands{};
      bands.band[b] = c.values;
      tfx_test::ExpectMatchesImageForm(filter.get(), 64, 8, 300,
                                       [&](CxImage* image) { hslAdjustment(image, bands); });
    }
  }
}

// Packed frames skip the copy: every target, with a tail shorter than a vector.
TEST(HSLAdjustEffect, PackedFramesMatchTheImageFormOnEveryTarget) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(
      kHSLAdjust, Settings({{L"u_red_hue", 40}, {L"u_aqua_sat", -70}, {L"u_blue_light", 55}}));
  HSLBands bands{};
  bands.band[kHSLRed].hue = 40;
  bands.band[kHSLAqua].sat = -70;
  bands.band[kHSLBlue].light = 55;
  tfx_test::ForEveryTarget([&] {
    tfx_test::ExpectMatchesImageForm(filter.get(), 67, 5, 0,
                                     [&](CxImage* image) { hslAdjustment(image, bands); });
  });
}

TEST(HSLAdjustEffect, FollowsParameterChanges) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kHSLAdjust, Settings({{L"u_green_sat", 0}}));
  TestFrame* fg = new TestFrame(33, 7);
  TestFrame* dst = new TestFrame(33, 7);
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  filter->SetForeground(fg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);  // the tables built for 0 must not stay

  tfx_test::SetParam(filter.get(), L"u_green_sat", -100);
  HSLBands bands{};
  bands.band[kHSLGreen].sat = -100;
  tfx_test::ExpectMatchesImageForm(filter.get(), 33, 7, 0,
                                   [&](CxImage* image) { hslAdjustment(image, bands); });
}

}  // namespace
