#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdio>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "support/TempDir.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;
using tfx_test::CreateEffect;
using tfx_test::CubeText;
using tfx_test::kLut;
using tfx_test::Wide;

NLEComPtr<INLEProperties> PathSettings(const std::wstring& path) {
  return tfx_test::TextSettings(L"lut3dPath", path);
}

void SetPath(INLECGFilter* filter, const std::wstring& path) {
  NLEComPtr<INLEProperties> param;
  ASSERT_EQ(filter->GetParamPropertyFromName(L"lut3dPath", &param), NLE_S_OK);
  param->SetString(Key::Property::kValue_Current, path.c_str());
  filter->ParamValueChanged();
}

class ColorLut3dAdjustEffect : public ::testing::Test {
 protected:
  void SetUp() override {
    dir_.Write("invert.cube", CubeText(2, "", -1, 1));
    dir_.Write("halve.cube", CubeText(2, "", 0.5));
  }

  std::string Path(const std::string& name) const { return dir_.Path(name); }

  // An 8x2 frame of noise (`height` rows of it) through the filter into a destination filled
  // with 0xEE; the source lands in *in.
  tfx_test::Bytes Run(INLECGFilter* filter, tfx_test::Bytes* in, HRESULT* status = nullptr,
                      int height = 2) {
    *in = tfx_test::NoiseBytes(8 * height * 4, ++salt_);
    return tfx_test::RunFrame(filter, new TestFrame(8, height, *in),
                              new TestFrame(8, 2, 0, false, 0xEE), nullptr, status);
  }

  // Which of the two test tables the filter applied: "invert", "halve", "copy" or "other".
  std::string Applied(INLECGFilter* filter) {
    tfx_test::Bytes in;
    const tfx_test::Bytes out = Run(filter, &in);
    bool invert = true, halve = true;
    for (size_t i = 0; i < in.size(); ++i) {
      if (i % 4 == 3) {
        EXPECT_EQ(out[i], in[i]) << "alpha changed";
        continue;
      }
      invert = invert && std::abs(out[i] - (255 - in[i])) <= 1;
      halve = halve && std::abs(out[i] - in[i] / 2.0) <= 1;
    }
    if (out == in) return "copy";
    return invert ? "invert" : halve ? "halve" : "other";
  }

  tfx_test::TempDir dir_;
  unsigned salt_ = 0;
};

TEST_F(ColorLut3dAdjustEffect, AppliesTheFileAndReloadsOnlyWhenThePathTextChanges) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kLut, PathSettings(Wide(Path("invert.cube"))));
  EXPECT_EQ(Applied(filter.get()), "invert");
  SetPath(filter.get(), Wide(Path("halve.cube")));
  EXPECT_EQ(Applied(filter.get()), "halve");

  // The same text again keeps the table read before, even though the file has changed since.
  dir_.Write("halve.cube", CubeText(2, "", -1, 1));
  SetPath(filter.get(), Wide(Path("halve.cube")));
  EXPECT_EQ(Applied(filter.get()), "halve");
  // Extensions count in any letter case.
  std::rename(Path("invert.cube").c_str(), Path("invert.CuBe").c_str());
  SetPath(filter.get(), Wide(Path("invert.CuBe")));
  EXPECT_EQ(Applied(filter.get()), "invert");
}

// The cache compares the parameter with the translated path, so a path that the host rewrites
// is read again on every frame.
TEST_F(ColorLut3dAdjustEffect, RereadsAPathThatTranslationRewritesOnEveryFrame) {
  ASSERT_EQ(setenv("TFX_TEST_LUT_DIR", dir_.path.c_str(), 1), 0);
  NLEComPtr<INLECGFilter> filter =
      CreateEffect(kLut, PathSettings(L"$TFX_TEST_LUT_DIR/halve.cube"));
  EXPECT_EQ(Applied(filter.get()), "halve");
  dir_.Write("halve.cube", CubeText(2, "", -1, 1));
  EXPECT_EQ(Applied(filter.get()), "invert");
  unsetenv("TFX_TEST_LUT_DIR");
}

TEST_F(ColorLut3dAdjustEffect, PassesFramesThroughWhenNoTableApplies) {
  std::rename(Path("halve.cube").c_str(), Path("halve.txt").c_str());
  dir_.Write("big.cube", CubeText(65));  // one point more than the lattice holds
  for (const std::string name : {"halve.txt", "missing.cube", "big.cube"}) {
    SCOPED_TRACE(name);
    NLEComPtr<INLECGFilter> filter = CreateEffect(kLut, PathSettings(Wide(Path(name))));
    EXPECT_EQ(Applied(filter.get()), "copy");
  }
  // A source smaller than the destination gives what it holds and no more.
  NLEComPtr<INLECGFilter> filter = CreateEffect(kLut, PathSettings(Wide(Path("none.cube"))));
  tfx_test::Bytes in;
  const tfx_test::Bytes out = Run(filter.get(), &in, nullptr, 1);
  EXPECT_EQ(std::vector<uint8_t>(out.begin(), out.begin() + 32), in);
  EXPECT_EQ(std::vector<uint8_t>(out.begin() + 32, out.end()), std::vector<uint8_t>(32, 0xEE));
}

TEST_F(ColorLut3dAdjustEffect, EmptyPathFailsWithoutWriting) {
  for (NLEComPtr<INLEProperties> settings : {PathSettings(L""), NLEComPtr<INLEProperties>()}) {
    NLEComPtr<INLECGFilter> filter = CreateEffect(kLut, settings.get());
    tfx_test::Bytes in;
    HRESULT status = 0;
    EXPECT_EQ(Run(filter.get(), &in, &status), std::vector<uint8_t>(64, 0xEE));
    EXPECT_EQ(status, NLE_E_RESOURCE);
  }
}

}  // namespace
