#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdio>
#include <fstream>
#include <string>
#include <vector>

#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;
using tfx_test::CreateEffect;
using tfx_test::FillRandom;
constexpr const wchar_t* kColorLut = L"74EB022D-1D73-4D1E-9F70-487C356D46CD";

std::wstring Wide(const std::string& s) { return std::wstring(s.begin(), s.end()); }

NLEComPtr<INLEProperties> PathSettings(const std::wstring& path) {
  return tfx_test::TextSettings(L"lut3dPath", path);
}

void SetPath(INLECGFilter* filter, const std::wstring& path) {
  NLEComPtr<INLEProperties> param;
  ASSERT_EQ(filter->GetParamPropertyFromName(L"lut3dPath", &param), NLE_S_OK);
  param->SetString(Key::Property::kValue_Current, path.c_str());
  filter->ParamValueChanged();
}

// A ".cube" file of `size` points per axis whose output is `scale` * input + `shift` (0..1).
void WriteCube(const std::string& file, int size, double scale, double shift) {
  std::ofstream out(file);
  out << "LUT_3D_SIZE " << size << "\n";
  char line[64];
  for (int b = 0; b < size; ++b) {
    for (int g = 0; g < size; ++g) {
      for (int r = 0; r < size; ++r) {
        const double v[3] = {double(r) / (size - 1), double(g) / (size - 1),
                             double(b) / (size - 1)};
        std::snprintf(line, sizeof line, "%.6f %.6f %.6f\n", v[0] * scale + shift,
                      v[1] * scale + shift, v[2] * scale + shift);
        out << line;
      }
    }
  }
}

class ColorLut3dAdjustEffect : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/tfx-colorlut-XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    dir_ = pattern;
    WriteCube(Path("invert.cube"), 2, -1.0, 1.0);
    WriteCube(Path("halve.cube"), 2, 0.5, 0.0);
  }
  void TearDown() override { std::system(("rm -rf '" + dir_ + "'").c_str()); }

  std::string Path(const std::string& name) const { return dir_ + "/" + name; }

  // One 8x2 frame of noise through the filter into a destination filled with 0xEE. Returns the
  // result code; the source goes to *in and the output to *out.
  int Run(INLECGFilter* filter, std::vector<uint8_t>* in, std::vector<uint8_t>* out,
          int srcHeight = 2) {
    TestFrame* fg = new TestFrame(8, srcHeight);
    TestFrame* dst = new TestFrame(8, 2, 0, false, 0xEE);
    NLEComPtr<INLEFrame> h1(fg), h2(dst);
    FillRandom(fg, ++salt_);
    filter->SetForeground(fg);
    const int result = filter->Running(dst);
    *in = fg->pixels;
    *out = dst->pixels;
    return result;
  }

  // Which of the two test tables the filter applied: "invert", "halve", "copy" or "other".
  std::string Applied(INLECGFilter* filter) {
    std::vector<uint8_t> in, out;
    EXPECT_EQ(Run(filter, &in, &out), NLE_S_OK);
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

  std::string dir_;
  unsigned salt_ = 0;
};

TEST_F(ColorLut3dAdjustEffect, AppliesTheFileAndReloadsOnlyWhenThePathTextChanges) {
  NLEComPtr<INLECGFilter> filter = CreateEffect(kColorLut, PathSettings(Wide(Path("invert.cube"))));
  EXPECT_EQ(Applied(filter.get()), "invert");
  SetPath(filter.get(), Wide(Path("halve.cube")));
  EXPECT_EQ(Applied(filter.get()), "halve");

  // The same text again keeps the table read before, even though the file has changed since.
  WriteCube(Path("halve.cube"), 2, -1.0, 1.0);
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
  ASSERT_EQ(setenv("TFX_TEST_LUT_DIR", dir_.c_str(), 1), 0);
  NLEComPtr<INLECGFilter> filter =
      CreateEffect(kColorLut, PathSettings(L"$TFX_TEST_LUT_DIR/halve.cube"));
  EXPECT_EQ(Applied(filter.get()), "halve");
  WriteCube(Path("halve.cube"), 2, -1.0, 1.0);
  EXPECT_EQ(Applied(filter.get()), "invert");
  unsetenv("TFX_TEST_LUT_DIR");
}

TEST_F(ColorLut3dAdjustEffect, PassesFramesThroughWhenNoTableApplies) {
  std::rename(Path("halve.cube").c_str(), Path("halve.txt").c_str());
  WriteCube(Path("big.cube"), 65, 1.0, 0.0);  // one point more than the lattice holds
  for (const std::string name : {"halve.txt", "missing.cube", "big.cube"}) {
    SCOPED_TRACE(name);
    NLEComPtr<INLECGFilter> filter = CreateEffect(kColorLut, PathSettings(Wide(Path(name))));
    EXPECT_EQ(Applied(filter.get()), "copy");
  }
  // A source smaller than the destination gives what it holds and no more.
  NLEComPtr<INLECGFilter> filter = CreateEffect(kColorLut, PathSettings(Wide(Path("none.cube"))));
  std::vector<uint8_t> in, out;
  EXPECT_EQ(Run(filter.get(), &in, &out, 1), NLE_S_OK);
  EXPECT_EQ(std::vector<uint8_t>(out.begin(), out.begin() + 32), in);
  EXPECT_EQ(std::vector<uint8_t>(out.begin() + 32, out.end()), std::vector<uint8_t>(32, 0xEE));
}

TEST_F(ColorLut3dAdjustEffect, EmptyPathFailsWithoutWriting) {
  for (NLEComPtr<INLEProperties> settings : {PathSettings(L""), NLEComPtr<INLEProperties>()}) {
    NLEComPtr<INLECGFilter> filter = CreateEffect(kColorLut, settings.get());
    std::vector<uint8_t> in, out;
    EXPECT_EQ(Run(filter.get(), &in, &out), NLE_E_RESOURCE);
    EXPECT_EQ(out, std::vector<uint8_t>(64, 0xEE));
  }
}

}  // namespace
