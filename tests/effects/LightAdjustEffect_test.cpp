#include <gtest/gtest.h>

#include <random>
#include <vector>

#include "support/TestFrame.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;
constexpr const wchar_t* kLightAdjust = L"D8651B53-F47A-4B98-B8E9-35B491D5EADC";

// Host settings carrying double parameters the way a host's UI writes them.
NLEComPtr<INLEProperties> Settings(
    std::initializer_list<std::pair<const wchar_t*, double>> values) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  int i = 0;
  for (const auto& [name, value] : values) {
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, name);
    p->SetString(Key::Property::kFriendName, name);
    p->SetInt(Key::Property::kType, NLEFilterPropertyType_Double);
    p->SetValue(Key::Property::kValue_Default, CNLEValue(0.0));
    p->SetValue(Key::Property::kValue_Current, CNLEValue(value));
    props->SetInterface(Key::Property::kParamsArray[i++], p.get());
  }
  props->SetInt(Key::Property::kCount, i);
  return props;
}

NLEComPtr<INLECGFilter> Create(INLEProperties* settings) {
  NLEComPtr<INLECGFilter> filter;
  EXPECT_EQ(CreateFilterFromGUID(nullptr, kLightAdjust, settings, nullptr,
                                 reinterpret_cast<void**>(&filter)),
            NLE_S_OK);
  return filter;
}

void FillRandom(TestFrame* f, unsigned salt) {
  std::mt19937 rng(salt);
  for (auto& b : f->pixels) b = static_cast<uint8_t>(rng());
}

TEST(LightAdjustEffect, ZeroParametersGiveTheForegroundBack) {
  const NLEComPtr<INLEProperties> zeros =
      Settings({{L"u_highLight", 0}, {L"u_shadow", 0}, {L"u_whiteLevel", 0}});
  // Zeros, and no parameters at all.
  for (INLEProperties* settings : {zeros.get(), static_cast<INLEProperties*>(nullptr)}) {
    NLEComPtr<INLECGFilter> filter = Create(settings);
    TestFrame* fg = new TestFrame(17, 9);
    TestFrame* dst = new TestFrame(17, 9);
    NLEComPtr<INLEFrame> h1(fg), h2(dst);
    FillRandom(fg, 1);
    filter->SetForeground(fg);
    ASSERT_EQ(filter->Running(dst), NLE_S_OK);
    EXPECT_EQ(dst->pixels, fg->pixels);
  }
}

TEST(LightAdjustEffect, AppliesTheFourOperationsInOrder) {
  // Highlight, shadow, white level, black level, each seeing the previous one's output; the
  // padded output goes through a private copy, the background is never read.
  NLEComPtr<INLECGFilter> filter = Create(Settings(
      {{L"u_blackLevel", -35}, {L"u_highLight", 60}, {L"u_shadow", 80}, {L"u_whiteLevel", 0}}));
  NLEComPtr<INLEProperties> white;
  ASSERT_EQ(filter->GetParamPropertyFromName(L"u_whiteLevel", &white), NLE_S_OK);
  white->SetValue(Key::Property::kValue_Current, CNLEValue(-45.0));
  filter->ParamValueChanged();

  TestFrame* fg = new TestFrame(64, 4);
  TestFrame* bg = new TestFrame(64, 4, 0, false, 0x55);
  TestFrame* dst = new TestFrame(64, 4, 300);
  NLEComPtr<INLEFrame> h1(fg), h2(bg), h3(dst);
  FillRandom(fg, 2);
  filter->SetForeground(fg);
  filter->SetBackground(bg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);

  std::vector<uint8_t> expected = fg->pixels;
  uint8_t* bits = expected.data();
  CxImage image(&bits, 64, 4, 32, 256, IPF_BGRA);
  hdrBlackLevel(hdrWhiteLevel(hdrShadow(hdrHighlight(&image, 60), 80), -45), -35);
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 64; ++x) {
      for (int c = 0; c < 4; ++c) ASSERT_EQ(dst->Pixel(x, y)[c], expected[y * 256 + x * 4 + c]);
    }
  }
}

TEST(LightAdjustEffect, MissingForegroundIsABadArgument) {
  NLEComPtr<INLECGFilter> filter = Create(Settings({{L"u_highLight", 50}}));
  TestFrame* bg = new TestFrame(2, 2);
  TestFrame* dst = new TestFrame(2, 2, 0, false, 9);
  NLEComPtr<INLEFrame> h1(bg), h2(dst);
  filter->SetBackground(bg);
  EXPECT_EQ(filter->Running(dst), NLE_E_INVALIDARG);
  EXPECT_EQ(dst->pixels[0], 9);
}

}  // namespace
