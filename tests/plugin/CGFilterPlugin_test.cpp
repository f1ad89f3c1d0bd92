#include <gtest/gtest.h>

#include <algorithm>
#include <cwchar>
#include <string>
#include <vector>

#include "plugin/NLEBasicCrossFilter.h"
#include "plugin/NLEDynamicEffect.h"
#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

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

// Collects what the default logger writes while the test runs.
struct LogCapture {
  LogCapture() {
    NLEGetDefaultLogger()->SetSink(&LogCapture::Sink, this);
    level = NLEGetDefaultLogger()->GetLevel();
    NLEGetDefaultLogger()->SetLevel(kNLELogInfo);
  }
  ~LogCapture() {
    NLEGetDefaultLogger()->SetSink(nullptr, nullptr);
    NLEGetDefaultLogger()->SetLevel(level);
  }
  static void Sink(void* self, int32_t, const wchar_t* message) {
    static_cast<LogCapture*>(self)->lines.push_back(message);
  }
  std::vector<std::wstring> lines;
  int32_t level;
};

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

TEST(FilterRegistry, PublishesTenFiltersInGuidOrder) {
  EXPECT_EQ(GetFilterCount(), 10u);
  EXPECT_EQ(GetFilterCount(), 10u);

  const wchar_t* expected[10][2] = {
      {L"18C6E879-4138-42D0-B0B9-6B4401AA97E6", L"ColorAdjust"},
      {L"39509FB9-39FB-4516-9464-3D891DD61D62", L"WhiteBalanceAdjust"},
      {L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A", L"ChromeKeyCombine"},
      {L"74EB022D-1D73-4D1E-9F70-487C356D46CD", L"Lut"},
      {L"8622FC58-4DF1-44BD-9B37-2F633D4D3368", L"VignetteAdjust"},
      {L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356", L"lutAToWhiteEffect"},
      {L"AF91FF05-6577-4A4B-C81E-652EE7D6596E", L"HSLAdjust"},
      {L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735", L"DistortionFringingAdjust"},
      {L"D8651B53-F47A-4B98-B8E9-35B491D5EADC", L"LightAdjust"},
      {L"DB4BBA18-48FC-4164-B572-E59757B02796", L"ChromeKeyLut3dCL"},
  };
  for (int i = 0; i < 10; ++i) {
    SCOPED_TRACE(i);
    NLEComPtr<INLEProperties> desc = Descriptor(i);
    ASSERT_TRUE(desc);
    EXPECT_EQ(StringOf(desc, Key::kFilterID), expected[i][0]);
    EXPECT_EQ(StringOf(desc, Key::kFilterFriendName), expected[i][1]);
    EXPECT_EQ(IntOf(desc, Key::kFilterCSupport), 1);  // every GUID has a CPU class
  }

  INLEProperties* untouched = reinterpret_cast<INLEProperties*>(0x1);
  EXPECT_EQ(GetFilterProperties(10, &untouched), NLE_E_INVALIDARG);
  EXPECT_EQ(GetFilterProperties(-1, &untouched), NLE_E_INVALIDARG);
  EXPECT_EQ(untouched, reinterpret_cast<INLEProperties*>(0x1));
}

TEST(FilterRegistry, OpenCLDescriptorWinsWhereBothClassesExist) {
  ASSERT_EQ(GetFilterCount(), 10u);
  NLEComPtr<INLEProperties> key = Descriptor(9);
  EXPECT_EQ(IntOf(key, Key::kFilterOpenclSupport), 1);
  EXPECT_EQ(IntOf(key, Key::kFilterCSupport), 1);
  EXPECT_EQ(IntOf(key, Key::Property::kCount, 0), 0);  // the CPU class's six stay unpublished

  NLEComPtr<INLEProperties> light = Descriptor(8);
  EXPECT_EQ(IntOf(light, Key::kFilterOpenclSupport), -1);

  // The published descriptor is the registered object itself, not a copy.
  auto& cl = NLEBasicCrossFilter::get_class_set();
  EXPECT_EQ(cl.at(L"DB4BBA18-48FC-4164-B572-E59757B02796").second.get(), key.get());
  auto& cpu = NLEDynamicEffect::get_class_set();
  EXPECT_EQ(cpu.size(), 10u);
  EXPECT_EQ(cl.size(), 4u);
  NLEComPtr<INLEProperties> cpuKey = cpu.at(L"DB4BBA18-48FC-4164-B572-E59757B02796").second;
  EXPECT_EQ(IntOf(cpuKey, Key::Property::kCount), 6);
  EXPECT_EQ(StringOf(cpuKey, Key::kFilterFriendName), L"ChromeKeyLut3d");
}

TEST(FilterRegistry, WhiteBalanceRegistersItsFiveParameters) {
  ASSERT_EQ(GetFilterCount(), 10u);
  NLEComPtr<INLEProperties> wb = Descriptor(1);
  ASSERT_EQ(IntOf(wb, Key::Property::kCount), 5);
  NLEComPtr<IUnknown> unk;
  ASSERT_EQ(wb->GetInterface(Key::Property::kParamsArray[2], &unk), NLE_S_OK);
  NLEComPtr<INLEProperties> gain;
  ASSERT_EQ(unk.QueryInterface(IID_INLEProperties, &gain), NLE_S_OK);
  EXPECT_EQ(StringOf(gain, Key::Property::kVariantName), L"u_rgain");
  EXPECT_EQ(StringOf(gain, Key::Property::kFriendName), L"u_rgain");
  EXPECT_EQ(IntOf(gain, Key::Property::kType), 3);
  EXPECT_EQ(IntOf(gain, Key::Property::kDisplayType), 0);
  CNLEValue def, current, min;
  gain->GetValue(Key::Property::kValue_Default, &def);
  gain->GetValue(Key::Property::kValue_Current, &current);
  gain->GetValue(Key::Property::kValue_Min, &min);
  EXPECT_EQ(def.TypeName(), L"double");
  EXPECT_EQ(def.Text(), L"1.000000");
  EXPECT_EQ(current, def);
  EXPECT_EQ(min.Text(), L"-100.000000");
}

TEST(CreateFilterFromGUID, ChoosesTheClassByTheDevice) {
  ASSERT_EQ(GetFilterCount(), 10u);
  void* filter = nullptr;
  // Unknown GUID and missing arguments.
  EXPECT_EQ(CreateFilterFromGUID(nullptr, L"00000000-0000-0000-0000-000000000000", nullptr, nullptr,
                                 &filter),
            NLE_E_INVALIDARG);
  EXPECT_EQ(filter, nullptr);

  // A CPU-only GUID with a device has no class to create.
  FakeDevice* device = new FakeDevice(true);
  NLEComPtr<INLECGDevice> hold(device);
  EXPECT_EQ(
      CreateFilterFromGUID(device, L"D8651B53-F47A-4B98-B8E9-35B491D5EADC", nullptr, "", &filter),
      NLE_E_INVALIDARG);
  // OpenCL classes cannot bind without a program manager, nor to a device without OpenCL.
  EXPECT_EQ(CreateFilterFromGUID(device, L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356", nullptr, nullptr,
                                 &filter),
            NLE_E_INVALIDARG);
  NLEComPtr<INLECGDevice> plain(new FakeDevice(false));
  EXPECT_EQ(
      CreateFilterFromGUID(plain, L"39509FB9-39FB-4516-9464-3D891DD61D62", nullptr, "x", &filter),
      NLE_E_INVALIDARG);
  EXPECT_EQ(filter, nullptr);
  EXPECT_EQ(device->GetRefCount(), 1u);  // failed filters released what they took

  // Without a device every GUID has a CPU class.
  for (int i = 0; i < 10; ++i) {
    NLEComPtr<INLEProperties> desc = Descriptor(i);
    std::wstring guid = StringOf(desc, Key::kFilterID);
    NLEComPtr<INLECGFilter> cpu;
    ASSERT_EQ(CreateFilterFromGUID(nullptr, guid.c_str(), nullptr, nullptr,
                                   reinterpret_cast<void**>(&cpu)),
              NLE_S_OK);
    ASSERT_TRUE(cpu);
  }
}

TEST(CreateFilterFromGUID, LogsCreationWithFileAndLine) {
  LogCapture log;
  NLEComPtr<INLECGFilter> filter;
  ASSERT_EQ(CreateFilterFromGUID(nullptr, L"18C6E879-4138-42D0-B0B9-6B4401AA97E6", nullptr, nullptr,
                                 reinterpret_cast<void**>(&filter)),
            NLE_S_OK);
  ASSERT_EQ(log.lines.size(), 1u);
  EXPECT_EQ(log.lines[0], L"CREATE <PureC> Filter: ColorAdjust  [CGFilterPlugin.cpp, 78]");
}

TEST(CreateFilterFromGUID, HostSettingsOverrideRegisteredDefaults) {
  ASSERT_EQ(GetFilterCount(), 10u);
  NLEComPtr<INLEProperties> props;
  ASSERT_EQ(NLECommon::CreateProperties(&props), NLE_S_OK);
  props->SetInt(Key::kFilterType, 7);
  props->SetString(L"Host.Note", L"kept");

  NLEComPtr<INLECGFilter> filter;
  ASSERT_EQ(CreateFilterFromGUID(nullptr, L"39509FB9-39FB-4516-9464-3D891DD61D62", props, nullptr,
                                 reinterpret_cast<void**>(&filter)),
            NLE_S_OK);
  NLEComPtr<INLEProperties> own;
  ASSERT_EQ(filter.QueryInterface(IID_INLEProperties, &own), NLE_S_OK);
  EXPECT_EQ(StringOf(own, L"Host.Note"), L"kept");
  EXPECT_EQ(StringOf(own, Key::kFilterFriendName), L"WhiteBalanceAdjust");
  EXPECT_EQ(filter->GetParamCount(), 5);

  // The filter's parameters are its own copies, not the descriptor's objects.
  NLEComPtr<INLEProperties> mine;
  ASSERT_EQ(filter->GetParamPropertyFromName(L"u_tint", &mine), NLE_S_OK);
  NLEComPtr<IUnknown> registered;
  Descriptor(1)->GetInterface(Key::Property::kParamsArray[1], &registered);
  NLEComPtr<INLEProperties> registeredTint;
  registered.QueryInterface(IID_INLEProperties, &registeredTint);
  EXPECT_NE(mine.get(), registeredTint.get());
  EXPECT_EQ(StringOf(mine, Key::Property::kVariantName), L"u_tint");
}

// Every CPU class reads the foreground, so without one it refuses and leaves the output alone.
TEST(CreateFilterFromGUID, EveryCpuClassRefusesAMissingForeground) {
  ASSERT_EQ(GetFilterCount(), 10u);
  for (int i = 0; i < 10; ++i) {
    const std::wstring guid = StringOf(Descriptor(i), Key::kFilterID);
    SCOPED_TRACE(std::string(guid.begin(), guid.end()));
    NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(guid.c_str(), nullptr);
    ASSERT_TRUE(filter);
    tfx_test::ExpectRefusesMissingForeground(filter.get());
  }
}

// Each effect at the settings that ask it to do nothing gives its foreground back byte for byte,
// into a packed destination and into a padded one. The combiner needs an opaque colour and a
// full mask for that; everything else sees random alpha, none of it 0, which the alpha filler
// would change.
TEST(CreateFilterFromGUID, EveryEffectLeavesTheFrameAloneAtNeutralSettings) {
  using tfx_test::Settings;
  const struct {
    const wchar_t* guid;
    NLEComPtr<INLEProperties> settings;
    bool mask = false;
  } cases[] = {
      {L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
       Settings({{L"u_exposure", 0}, {L"u_brightness", 0}, {L"u_contrast", 0}})},
      {L"39509FB9-39FB-4516-9464-3D891DD61D62", nullptr},
      {L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A", nullptr, true},
      // No file there: the frame passes as it is.
      {L"74EB022D-1D73-4D1E-9F70-487C356D46CD",
       tfx_test::TextSettings(L"lut3dPath", L"/nonexistent/none.cube")},
      // Without an amount the shape settings change nothing.
      {L"8622FC58-4DF1-44BD-9B37-2F633D4D3368", Settings({{L"feather", 10}, {L"size", 5}})},
      {L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356", nullptr},
      {L"AF91FF05-6577-4A4B-C81E-652EE7D6596E", Settings({{L"u_green_sat", 0}})},
      {L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735", Settings({{L"distortion", 0}, {L"fringing", 0}})},
      {L"D8651B53-F47A-4B98-B8E9-35B491D5EADC", nullptr},
      // Modes past mask (0) and beauty (1), on either side, are a plain copy.
      {L"DB4BBA18-48FC-4164-B572-E59757B02796", Settings({{L"green", 200}, {L"mode", 2}})},
      {L"DB4BBA18-48FC-4164-B572-E59757B02796", Settings({{L"green", 200}, {L"mode", -1}})},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.guid, c.guid + std::wcslen(c.guid)));
    NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(c.guid, c.settings.get());
    ASSERT_TRUE(filter);
    for (const int stride : {0, 17 * 4 + 12}) {
      TestFrame* fg = new TestFrame(17, 9);
      TestFrame* bg = new TestFrame(17, 9, 0, false, 255);
      TestFrame* dst = new TestFrame(17, 9, stride, false, 0xEE);
      NLEComPtr<INLEFrame> h1(fg), h2(bg), h3(dst);
      tfx_test::FillRandom(fg, 17);
      for (size_t i = 3; i < fg->pixels.size(); i += 4) {
        fg->pixels[i] = c.mask ? 255 : std::max<uint8_t>(fg->pixels[i], 1);
      }
      filter->SetForeground(fg);
      if (c.mask) filter->SetBackground(bg);
      ASSERT_EQ(filter->Running(dst), NLE_S_OK);
      for (int y = 0; y < 9; ++y) {
        ASSERT_TRUE(std::equal(fg->Row(y), fg->Row(y) + 17 * 4, dst->Row(y))) << "row " << y;
      }
    }
  }
}

}  // namespace
