// The plug-in's entry points and every effect as a host creates and runs it.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <opencv2/core.hpp>
#include <string>
#include <tuple>
#include <vector>

#include "support/EffectHarness.h"
#include "support/EveryTarget.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"
#include "tessarofx/Vignette.h"
#include "tessarofx/WhiteBalance.h"

namespace {

namespace Key = NLEKey::Filter;
using tfx_test::Bytes;
using tfx_test::CreateEffect;
using tfx_test::EffectParams;
using tfx_test::RunFrame;
using tfx_test::Settings;

std::wstring StringOf(INLEProperties* bag, const wchar_t* key) {
  wchar_t buf[128] = {};
  if (bag->GetString(key, buf, 128, nullptr) < 0) return L"<absent>";
  return buf;
}

int IntOf(INLEProperties* bag, const wchar_t* key, int fallback = -1) {
  int32_t v = 0;
  return bag->GetInt(key, &v) < 0 ? fallback : v;
}

NLEComPtr<INLEProperties> Descriptor(int index) {
  NLEComPtr<INLEProperties> desc;
  EXPECT_EQ(GetFilterProperties(index, &desc), NLE_S_OK) << index;
  return desc;
}

// A device that offers the OpenCL operations but has no program manager or memory behind them.
class FakeDevice final : public scombase::CUnknown,
                         public INLECGDevice,
                         public INLECGOpenCLOperate {
 public:
  explicit FakeDevice(bool withOperate)
      : CUnknown(L"FakeDevice", nullptr), withOperate_(withOperate) {}
  NLE_DECLARE_IUNKNOWN
  HRESULT NonDelegatingQueryInterface(REFIID iid, void** out) override {
    if (iid == IID_INLECGDevice) return GetInterface(static_cast<INLECGDevice*>(this), out);
    if (iid == IID_INLECGOpenCLOperate && withOperate_)
      return GetInterface(static_cast<INLECGOpenCLOperate*>(this), out);
    return CUnknown::NonDelegatingQueryInterface(iid, out);
  }
  HRESULT GetName(wchar_t* buf, uint32_t capacity) override {
    if (capacity) buf[0] = 0;
    return NLE_S_OK;
  }
  HRESULT GetOpenCLHandles(void** manager, void** memory) override {
    *manager = nullptr;
    *memory = nullptr;
    return NLE_S_OK;
  }

 private:
  bool withOperate_;
};

TEST(FilterRegistry, DescriptorsAreUnreachableBeforeTheFirstCount) {
  // A fresh process is needed: another test may already have merged the registries.
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(
      {
        INLEProperties* props = nullptr;
        const bool ok = GetFilterProperties(0, &props) == NLE_E_INVALIDARG && props == nullptr;
        std::exit(ok ? 0 : 1);
      },
      ::testing::ExitedWithCode(0), "");
}

// The names in index order are the tool's list test's business.
TEST(FilterRegistry, PublishesTenFiltersInGuidOrder) {
  EXPECT_EQ(GetFilterCount(), 10u);
  EXPECT_EQ(GetFilterCount(), 10u);
  for (int i = 0; i < 10; ++i) {
    SCOPED_TRACE(i);
    NLEComPtr<INLEProperties> desc = Descriptor(i);
    ASSERT_TRUE(desc);
    EXPECT_EQ(StringOf(desc, Key::kFilterID), tfx_test::kGuids[i]);
    EXPECT_EQ(IntOf(desc, Key::kFilterCSupport), 1);  // every GUID has a CPU class
  }
  INLEProperties* untouched = reinterpret_cast<INLEProperties*>(0x1);
  EXPECT_EQ(GetFilterProperties(10, &untouched), NLE_E_INVALIDARG);
  EXPECT_EQ(GetFilterProperties(-1, &untouched), NLE_E_INVALIDARG);
  EXPECT_EQ(untouched, reinterpret_cast<INLEProperties*>(0x1));

  // Where both classes exist the OpenCL descriptor is published: the CPU class's six parameters
  // stay unpublished.
  NLEComPtr<INLEProperties> key = Descriptor(9);
  EXPECT_EQ(IntOf(key, Key::kFilterOpenclSupport), 1);
  EXPECT_EQ(IntOf(key, Key::Property::kCount, 0), 0);
  EXPECT_EQ(IntOf(Descriptor(8), Key::kFilterOpenclSupport), -1);
}

TEST(CreateFilterFromGUID, ChoosesTheClassByTheDeviceAndLogsIt) {
  ASSERT_EQ(GetFilterCount(), 10u);
  void* filter = nullptr;
  EXPECT_EQ(CreateFilterFromGUID(nullptr, L"00000000-0000-0000-0000-000000000000", nullptr, nullptr,
                                 &filter),
            NLE_E_INVALIDARG);

  // A CPU-only GUID with a device has no class to create; OpenCL classes cannot bind without a
  // program manager, nor to a device without OpenCL.
  FakeDevice* device = new FakeDevice(true);
  NLEComPtr<INLECGDevice> hold(device);
  EXPECT_EQ(CreateFilterFromGUID(device, tfx_test::kLight, nullptr, "", &filter), NLE_E_INVALIDARG);
  EXPECT_EQ(CreateFilterFromGUID(device, tfx_test::kAToWhite, nullptr, nullptr, &filter),
            NLE_E_INVALIDARG);
  NLEComPtr<INLECGDevice> plain(new FakeDevice(false));
  EXPECT_EQ(CreateFilterFromGUID(plain, tfx_test::kWhiteBalance, nullptr, "x", &filter),
            NLE_E_INVALIDARG);
  EXPECT_EQ(filter, nullptr);
  EXPECT_EQ(device->GetRefCount(), 1u);  // failed filters released what they took

  // Every GUID's CPU class is created in the neutral-settings test below.
  tfx_test::LogCapture log;
  NLEComPtr<INLECGFilter> cpu = CreateEffect(tfx_test::kColorAdjust, nullptr);
  const decltype(log.lines) expected = {
      {kNLELogInfo, L"CREATE <PureC> Filter: ColorAdjust  [CGFilterPlugin.cpp, 78]"}};
  EXPECT_EQ(log.lines, expected);
}

// That the parameters are the filter's own copies is the NLEBasicFilter tests' business, and the
// registered descriptors' values the tool's list test's (it prints white balance's from them).
TEST(CreateFilterFromGUID, HostSettingsOverrideRegisteredDefaults) {
  ASSERT_EQ(GetFilterCount(), 10u);
  NLEComPtr<INLEProperties> props;
  ASSERT_EQ(NLECommon::CreateProperties(&props), NLE_S_OK);
  props->SetString(Key::kFilterFriendName, L"Warmth");
  props->SetString(L"Host.Note", L"kept");
  NLEComPtr<INLECGFilter> filter = CreateEffect(tfx_test::kWhiteBalance, props);
  NLEComPtr<INLEProperties> own;
  ASSERT_EQ(filter.QueryInterface(IID_INLEProperties, &own), NLE_S_OK);
  EXPECT_EQ(StringOf(own, L"Host.Note"), L"kept");
  EXPECT_EQ(StringOf(own, Key::kFilterFriendName), L"Warmth");
  EXPECT_EQ(filter->GetParamCount(), 5);  // the registered parameters stay
}

// At the settings that ask it to do nothing, each effect gives its foreground back byte for byte,
// packed and padded (the LUT's missing file is the LUT tests' business). The combiner needs an
// opaque colour and a full mask for that; the alpha filler would change a 0 alpha.
TEST(CreateFilterFromGUID, EveryEffectRefusesNoForegroundAndLeavesTheFrameAtNeutralSettings) {
  ASSERT_EQ(GetFilterCount(), 10u);
  for (const wchar_t* guid : tfx_test::kGuids) {
    SCOPED_TRACE(std::string(guid, guid + 36));
    tfx_test::ExpectRefusesMissingForeground(CreateEffect(guid, nullptr).get());
  }
  const struct {
    const wchar_t* guid;
    NLEComPtr<INLEProperties> settings;
    bool mask = false;
  } cases[] = {
      {tfx_test::kColorAdjust,
       Settings({{L"u_exposure", 0}, {L"u_brightness", 0}, {L"u_contrast", 0}})},
      {tfx_test::kWhiteBalance, nullptr},
      {tfx_test::kCombine, nullptr, true},
      // Without an amount the shape settings change nothing.
      {tfx_test::kVignette, Settings({{L"feather", 10}, {L"size", 5}})},
      {tfx_test::kAToWhite, nullptr},
      {tfx_test::kHsl, Settings({{L"u_green_sat", 0}})},
      {tfx_test::kLens, Settings({{L"distortion", 0}, {L"fringing", 0}})},
      {tfx_test::kLight, nullptr},
      // Modes past mask (0) and beauty (1), on either side, are a plain copy.
      {tfx_test::kChromeKey, Settings({{L"green", 200}, {L"mode", 2}})},
      {tfx_test::kChromeKey, Settings({{L"green", 200}, {L"mode", -1}})},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.guid, c.guid + 36));
    NLEComPtr<INLECGFilter> filter = CreateEffect(c.guid, c.settings.get());
    ASSERT_TRUE(filter);
    for (const int stride : {0, 17 * 4 + 12}) {
      Bytes fg = tfx_test::NoiseBytes(17 * 9 * 4, 17);
      for (size_t i = 3; i < fg.size(); i += 4) fg[i] = c.mask ? 255 : std::max<uint8_t>(fg[i], 1);
      TestFrame* dst = new TestFrame(17, 9, stride, false, 0xEE);
      const Bytes out = RunFrame(filter.get(), new TestFrame(17, 9, fg), dst,
                                 c.mask ? new TestFrame(17, 9, 0, false, 255) : nullptr);
      for (int y = 0; y < 9; ++y) {
        const int at = y * (stride ? stride : 17 * 4);
        ASSERT_TRUE(std::equal(&fg[y * 17 * 4], &fg[(y + 1) * 17 * 4], &out[at])) << "row " << y;
      }
    }
  }
}

// Each effect applies its image form with the values its parameters carry: set at creation, or
// changed after a frame (which must not leave tables built for the old values), into padded and
// packed destinations, on every target. Distinct values show the argument order; the short lists
// the defaults of missing parameters.
TEST(CreateFilterFromGUID, EveryEffectAppliesItsImageFormWithItsParameters) {
  using Form = std::function<void(CxImage*)>;
  struct Case {
    std::string name;
    const wchar_t* guid;
    EffectParams settings, changes;
    int width, height, fgHeight;
    std::vector<int> strides;
    Form form;
  };
  std::vector<Case> cases;
  const auto add = [&](std::string name, const wchar_t* guid, EffectParams settings,
                       EffectParams changes, int w, int h, std::vector<int> strides, Form form,
                       int fgHeight = 0) {
    cases.push_back({name, guid, settings, changes, w, h, fgHeight, strides, form});
  };
  using tfx_test::kVignette;
  add("colour at creation", tfx_test::kColorAdjust, {{L"u_brightness", 100}, {L"u_exposure", 0}},
      {}, 64, 4, {300}, [](CxImage* i) { brightnessAdjustment(i, 100); });
  add("colour changed", tfx_test::kColorAdjust, {{L"u_brightness", 100}, {L"u_exposure", 0}},
      {{L"u_brightness", 0}, {L"u_exposure", 50}}, 5, 3, {0},
      [](CxImage* i) { exposureAdjustment(i, 50); });
  // Highlight, shadow, white level, black level, each seeing the previous one's output.
  add("light", tfx_test::kLight,
      EffectParams{
          {L"u_blackLevel", -35}, {L"u_highLight", 60}, {L"u_shadow", 80}, {L"u_whiteLevel", 0}},
      {{L"u_whiteLevel", -45}}, 64, 4, {300}, [](CxImage* i) {
        hdrBlackLevel(hdrWhiteLevel(hdrShadow(hdrHighlight(i, 60), 80), -45), -35);
      });
  add("vignette, every parameter", kVignette,
      EffectParams{{L"amount", -40},
                   {L"size", 30},
                   {L"roundness", 60},
                   {L"feather", 80},
                   {L"exposure", 25},
                   {L"highlights", 70}},
      {}, 61, 35, {260}, [](CxImage* i) { vignetteAdjustFilter(i, -40, 80, 70, 30, 60, 25); });
  // Size 100, feather 50, highlights 50, roundness and exposure 0 unless given.
  add("vignette, amount", kVignette, {{L"amount", -70}}, {}, 61, 35, {260},
      [](CxImage* i) { vignetteAdjustFilter(i, -70, 50, 50, 100, 0, 0); });
  add("vignette, exposure", kVignette, {{L"exposure", -60}, {L"roundness", 20}}, {}, 61, 35, {260},
      [](CxImage* i) { vignetteAdjustFilter(i, 0, 50, 50, 100, 20, -60); });
  // The gains are carried and not applied.
  add("white balance", tfx_test::kWhiteBalance, {},
      EffectParams{{L"u_temperature", 25},
                   {L"u_tint", -40},
                   {L"u_rgain", -50},
                   {L"u_ggain", 0},
                   {L"u_bgain", 99}},
      33, 7, {0}, [](CxImage* i) {
        cv::Mat m(int(i->GetHeight()), int(i->GetWidth()), CV_8UC4, i->GetBits());
        AdjustWhiteBalance().Process(m, m, ColorGain{1, 1, 1}, 25 / 200.0f, -40 / 200.0f);
      });
  // One band value at a time (width and soft beside a hue shift, which they shape): each name
  // must land in its own field. Then a packed frame whose 67 pixels leave a tail shorter than a
  // vector, and a change of value.
  const wchar_t* bandNames[] = {L"red",  L"orange", L"yellow", L"green",
                                L"aqua", L"blue",   L"purple", L"magenta"};
  for (int b = 0; b < kHSLBandCount; ++b) {
    const std::wstring prefix = std::wstring(L"u_") + bandNames[b] + L"_";
    const std::pair<EffectParams, HSLBandValues> values[] = {
        {{{prefix + L"hue", 60}}, {60, 0, 0, 0, 0}},
        {{{prefix + L"sat", -45}}, {0, -45, 0, 0, 0}},
        {{{prefix + L"light", 35}}, {0, 0, 35, 0, 0}},
        {{{prefix + L"hue", 60}, {prefix + L"width", 80}}, {60, 0, 0, 80, 0}},
        {{{prefix + L"hue", 60}, {prefix + L"soft", -90}}, {60, 0, 0, 0, -90}},
    };
    for (const auto& [params, v] : values) {
      HSLBands bands{};
      bands.band[b] = v;
      const std::wstring& name = params.back().first;
      add(std::string(name.begin(), name.end()), tfx_test::kHsl, params, {}, 64, 8, {300},
          [bands](CxImage* i) { hslAdjustment(i, bands); });
    }
  }
  HSLBands packed{}, changed{};
  packed.band[kHSLRed].hue = 40;
  packed.band[kHSLAqua].sat = -70;
  packed.band[kHSLBlue].light = 55;
  changed.band[kHSLGreen].sat = -100;
  add("hsl, packed", tfx_test::kHsl,
      EffectParams{{L"u_red_hue", 40}, {L"u_aqua_sat", -70}, {L"u_blue_light", 55}}, {}, 67, 5, {0},
      [packed](CxImage* i) { hslAdjustment(i, packed); });
  add("hsl changed", tfx_test::kHsl, {{L"u_green_sat", 0}}, {{L"u_green_sat", -100}}, 33, 7, {0},
      [changed](CxImage* i) { hslAdjustment(i, changed); });
  // Frames of one size are resampled straight from the foreground, a taller foreground is cut
  // to the output first. A distortion of -2000 sends samples out of the frame, where the
  // foreground's own pixel stays. Padded output rows, then packed ones twice: a setting held for
  // a second frame takes the single pass.
  for (const auto& [d, f, fgHeight] : {std::tuple{-35.0, 60.0, 30},
                                       {0.0, 45.0, 30},
                                       {70.0, 0.0, 30},
                                       {25.0, -40.0, 34},
                                       {-2000.0, 30.0, 30}}) {
    add(
        "lens " + std::to_string(d) + " " + std::to_string(f), tfx_test::kLens,
        {{L"distortion", d}, {L"fringing", f}}, {}, 50, 30, {216, 0, 0},
        [d = float(d), f = float(f)](CxImage* i) { fringingFilter(distortFilter(i, d), f); },
        fgHeight);
  }
  tfx_test::ForEveryTarget([&] {
    for (const Case& c : cases) {
      SCOPED_TRACE(c.name);
      NLEComPtr<INLECGFilter> filter =
          CreateEffect(c.guid, c.settings.empty() ? nullptr : Settings(c.settings).get());
      ASSERT_TRUE(filter);
      if (!c.changes.empty()) {
        RunFrame(filter.get(), new TestFrame(c.width, c.height), new TestFrame(c.width, c.height));
        for (const auto& [name, value] : c.changes) {
          tfx_test::SetParam(filter.get(), name.c_str(), value);
        }
      }
      for (const int stride : c.strides) {
        tfx_test::ExpectMatchesImageForm(filter.get(), c.width, c.height, stride, c.form,
                                         c.fgHeight);
      }
    }
  });
}

// The alpha effects, byte by byte; destination bytes no source pixel reaches keep their 0xEE.
TEST(CreateFilterFromGUID, AlphaEffectsWriteTheirStatedBytes) {
  const struct {
    const char* name;
    const wchar_t* guid;
    int width, height;  // the foreground's; the background's and the destination's follow
    Bytes fg;
    int bgWidth;  // 0: no background
    Bytes bg;
    int dstWidth, dstHeight;
    HRESULT status;
    Bytes expected;
  } cases[] = {
      // Despite the name, fully transparent pixels become opaque black; any other alpha passes.
      {"to white", tfx_test::kAToWhite, 4, 1,
       Bytes{10, 20, 30, 0, 10, 20, 30, 1, 10, 20, 30, 255, 0, 0, 0, 0}, 0, Bytes{}, 5, 1, NLE_S_OK,
       Bytes{0, 0, 0, 255, 10, 20, 30, 1, 10, 20, 30, 255, 0, 0, 0, 255, 0xEE, 0xEE, 0xEE, 0xEE}},
      // Colour premultiplied, alpha from byte 0 of the mask alone.
      {"combine", tfx_test::kCombine, 4, 1,
       Bytes{200, 100, 50, 128, 200, 100, 50, 9, 200, 100, 50, 10, 255, 255, 255, 255}, 4,
       Bytes{77, 1, 2, 3, 200, 9, 9, 9, 200, 9, 9, 9, 0, 255, 255, 255}, 4, 1, NLE_S_OK,
       Bytes{100, 50, 25, 77, 7, 3, 1, 0, 7, 3, 1, 200, 255, 255, 255, 0}},
      // Pixels are matched by their index in each packed image; a smaller input limits the
      // output to the pixels it holds.
      {"combine, smaller colour", tfx_test::kCombine, 1, 2, Bytes(8, 255), 3, Bytes(12, 99), 3, 1,
       NLE_S_OK, Bytes{255, 255, 255, 99, 255, 255, 255, 99, 0xEE, 0xEE, 0xEE, 0xEE}},
      {"combine without a mask", tfx_test::kCombine, 2, 2, Bytes(16, 5), 0, Bytes{}, 2, 2,
       NLE_E_INVALIDARG, Bytes(16, 0xEE)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    HRESULT status = 0;
    const Bytes out = RunFrame(
        CreateEffect(c.guid, nullptr).get(), new TestFrame(c.width, c.height, c.fg),
        new TestFrame(c.dstWidth, c.dstHeight, 0, false, 0xEE),
        c.bgWidth ? new TestFrame(c.bgWidth, int(c.bg.size()) / 4 / c.bgWidth, c.bg) : nullptr,
        &status);
    EXPECT_EQ(status, c.status);
    EXPECT_EQ(out, c.expected);
  }
}

}  // namespace
