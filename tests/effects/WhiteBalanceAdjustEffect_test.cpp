#include <gtest/gtest.h>

#include <cstdint>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/ImageBuilders.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"
#include "tessarofx/WhiteBalance.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::SetParam;
using tfx_test::Settings;
constexpr const wchar_t* kWhiteBalance = L"39509FB9-39FB-4516-9464-3D891DD61D62";

// The balance per byte, from the formulas: factor in double, then float; product in float,
// truncated and limited.
uint8_t Scaled(int v, double factor) {
  const float p = static_cast<float>(factor) * static_cast<float>(v);
  return static_cast<uint8_t>(!(p > 0) ? 0 : p >= 255 ? 255 : int(p));
}

TEST(WhiteBalanceAdjustEffect, EveryColourMatchesTheFactors) {
  // Every 24-bit colour with an independent alpha, through Running, at both signs, the range
  // ends and far outside them (negative and above-2 factors).
  const CxImage& all = tfx_test::EveryColour();
  TestFrame* fg = new TestFrame(4096, static_cast<int>(all.GetHeight()));
  TestFrame* dst = new TestFrame(4096, static_cast<int>(all.GetHeight()));
  NLEComPtr<INLEFrame> h1(fg), h2(dst);
  fg->pixels.assign(all.GetBits(), all.GetBits() + all.GetSize());
  NLEComPtr<INLECGFilter> filter =
      CreateEffect(kWhiteBalance, Settings({{L"u_temperature", 0}, {L"u_tint", 0}}));
  filter->SetForeground(fg);
  const double settings[][2] = {{100, 0}, {-100, 37}, {0, -100}, {-33.3, 71.1}, {-900, 650}};
  for (const auto& s : settings) {
    SCOPED_TRACE(testing::Message() << "temperature " << s[0] << " tint " << s[1]);
    SetParam(filter.get(), L"u_temperature", s[0]);
    SetParam(filter.get(), L"u_tint", s[1]);
    ASSERT_EQ(filter->Running(dst), NLE_S_OK);
    const float a = static_cast<float>(s[0] / 200.0), b = static_cast<float>(s[1] / 200.0);
    uint8_t table[3][256];
    for (int v = 0; v < 256; ++v) {
      table[0][v] = Scaled(v, 1 + 0.5 * b - a);
      table[1][v] = Scaled(v, 1 - b);
      table[2][v] = Scaled(v, 1 + 0.5 * b + a);
    }
    for (size_t i = 0; i < fg->pixels.size(); i += 4) {
      const uint8_t* in = &fg->pixels[i];
      const uint8_t* out = &dst->pixels[i];
      if (out[0] != table[0][in[0]] || out[1] != table[1][in[1]] || out[2] != table[2][in[2]] ||
          out[3] != in[3]) {
        FAIL() << "pixel " << i / 4 << ": " << int(in[0]) << ' ' << int(in[1]) << ' ' << int(in[2])
               << " gave " << int(out[0]) << ' ' << int(out[1]) << ' ' << int(out[2]) << ' '
               << int(out[3]);
      }
    }
  }
}

TEST(WhiteBalanceAdjustEffect, CarriesTheGainsWithoutApplyingThem) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kWhiteBalance, nullptr);
  for (const auto& [name, value] : {std::pair{L"u_temperature", 25},
                                    {L"u_tint", -40},
                                    {L"u_rgain", -50},
                                    {L"u_ggain", 0},
                                    {L"u_bgain", 99}}) {
    SetParam(filter.get(), name, value);
  }
  tfx_test::ExpectMatchesImageForm(filter.get(), 33, 7, 0, [](CxImage* image) {
    cv::Mat m(7, 33, CV_8UC4, image->GetBits());
    AdjustWhiteBalance().Process(m, m, ColorGain{1, 1, 1}, 25 / 200.0f, -40 / 200.0f);
  });
}

}  // namespace
