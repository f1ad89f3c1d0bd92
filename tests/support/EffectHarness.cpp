#include "support/EffectHarness.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace tfx_test {

namespace Key = NLEKey::Filter;

NLEComPtr<INLEProperties> Settings(const EffectParams& values) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  int i = 0;
  for (const auto& [name, value] : values) {
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, name.c_str());
    p->SetString(Key::Property::kFriendName, name.c_str());
    p->SetInt(Key::Property::kType, NLEFilterPropertyType_Double);
    p->SetValue(Key::Property::kValue_Default, CNLEValue(0.0));
    p->SetValue(Key::Property::kValue_Current, CNLEValue(value));
    props->SetInterface(Key::Property::kParamsArray[i++], p.get());
  }
  props->SetInt(Key::Property::kCount, i);
  return props;
}

NLEComPtr<INLEProperties> TextSettings(const wchar_t* name, const std::wstring& value) {
  NLEComPtr<INLEProperties> props, p;
  NLECommon::CreateProperties(&props);
  NLECommon::CreateProperties(&p);
  p->SetString(Key::Property::kVariantName, name);
  p->SetString(Key::Property::kFriendName, name);
  p->SetInt(Key::Property::kType, NLEFilterPropertyType_String);
  p->SetString(Key::Property::kValue_Default, L"");
  p->SetString(Key::Property::kValue_Current, value.c_str());
  props->SetInterface(Key::Property::kParamsArray[0], p.get());
  props->SetInt(Key::Property::kCount, 1);
  return props;
}

NLEComPtr<INLECGFilter> CreateEffect(const wchar_t* guid, INLEProperties* settings) {
  NLEComPtr<INLECGFilter> filter;
  EXPECT_EQ(
      CreateFilterFromGUID(nullptr, guid, settings, nullptr, reinterpret_cast<void**>(&filter)),
      NLE_S_OK);
  return filter;
}

void FillRandom(TestFrame* frame, unsigned salt) {
  frame->pixels = NoiseBytes(frame->pixels.size(), salt);
}

Bytes RunFrame(INLECGFilter* filter, TestFrame* fg, TestFrame* dst, TestFrame* bg,
               HRESULT* status) {
  NLEComPtr<INLEFrame> h1(fg), h2(dst), h3(bg);
  filter->SetForeground(fg);
  filter->SetBackground(bg);
  const HRESULT hr = filter->Running(dst);
  if (status) {
    *status = hr;
  } else {
    EXPECT_EQ(hr, NLE_S_OK);
  }
  return dst->pixels;
}

LogCapture::LogCapture(int32_t level) : saved(NLEGetDefaultLogger()->GetLevel()) {
  NLEGetDefaultLogger()->SetSink(
      [](void* self, int32_t at, const wchar_t* message) {
        static_cast<LogCapture*>(self)->lines.emplace_back(at, message);
      },
      this);
  NLEGetDefaultLogger()->SetLevel(level);
}

LogCapture::~LogCapture() {
  NLEGetDefaultLogger()->SetSink(nullptr, nullptr);
  NLEGetDefaultLogger()->SetLevel(saved);
}

void SetParam(INLECGFilter* filter, const wchar_t* name, double value) {
  NLEComPtr<INLEProperties> param;
  ASSERT_EQ(filter->GetParamPropertyFromName(name, &param), NLE_S_OK);
  param->SetValue(Key::Property::kValue_Current, CNLEValue(value));
  filter->ParamValueChanged();
}

void ExpectMatchesImageForm(INLECGFilter* filter, int width, int height, int dstStride,
                            const std::function<void(CxImage*)>& imageForm, int fgHeight) {
  TestFrame* fg = new TestFrame(width, fgHeight ? fgHeight : height);
  TestFrame* bg = new TestFrame(width, height, 0, false, 0x55);
  TestFrame* dst = new TestFrame(width, height, dstStride, false, 0xEE);
  NLEComPtr<INLEFrame> h1(fg), h2(bg), h3(dst);
  FillRandom(fg, static_cast<unsigned>(width * 131 + height));
  filter->SetForeground(fg);
  filter->SetBackground(bg);
  ASSERT_EQ(filter->Running(dst), NLE_S_OK);
  const size_t row = static_cast<size_t>(width) * 4;
  std::vector<uint8_t> expected(fg->pixels.begin(), fg->pixels.begin() + row * height);
  uint8_t* bits = expected.data();
  CxImage image(&bits, width, height, 32, static_cast<unsigned>(row), IPF_BGRA);
  imageForm(&image);
  EXPECT_FALSE(std::equal(expected.begin(), expected.end(), fg->pixels.begin()))
      << "the case proves nothing";
  for (int y = 0; y < height; ++y) {
    ASSERT_TRUE(std::equal(dst->Row(y), dst->Row(y) + row, bits + y * row)) << "row " << y;
  }
}

void ExpectRefusesMissingForeground(INLECGFilter* filter) {
  TestFrame* bg = new TestFrame(2, 2);
  TestFrame* dst = new TestFrame(2, 2, 0, false, 9);
  NLEComPtr<INLEFrame> h1(bg), h2(dst);
  filter->SetBackground(bg);
  EXPECT_EQ(filter->Running(dst), NLE_E_INVALIDARG);
  EXPECT_EQ(dst->pixels[0], 9);
}

}  // namespace tfx_test
