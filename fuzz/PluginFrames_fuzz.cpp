// libFuzzer target for the plug-in interface as a host drives it: a filter picked by index
// through the three entry points, settings and live parameter changes of any type and value
// (NaN, infinities, huge numbers, text where a number belongs), then frames of hostile geometry
// (empty, one pixel, padded, bottom-up, sizes that differ between inputs and destination, the
// destination also an input, no input at all) through Running. Whatever the input, the plug-in
// must answer with a result code; the sanitizers judge every byte it touches. Frames are the
// host kit's memory frames, so their buffers are exactly as large as they say.
#include <fuzzer/FuzzedDataProvider.h>
#include <unistd.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string>
#include <vector>

#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

// Every parameter name an effect reads, so that the fuzzer reaches each one by a byte.
const wchar_t* const kNames[] = {
    L"u_exposure",   L"u_brightness",    L"u_contrast",    L"u_vib",        L"u_sat",
    L"u_highLight",  L"u_shadow",        L"u_whiteLevel",  L"u_blackLevel", L"u_temperature",
    L"u_tint",       L"u_rgain",         L"u_ggain",       L"u_bgain",      L"amount",
    L"size",         L"roundness",       L"feather",       L"exposure",     L"highlights",
    L"distortion",   L"fringing",        L"lut3dPath",     L"red",          L"green",
    L"blue",         L"contrast",        L"offset",        L"mode",         L"u_red_hue",
    L"u_orange_sat", L"u_yellow_light",  L"u_green_width", L"u_aqua_soft",  L"u_blue_hue",
    L"u_purple_sat", L"u_magenta_light", L"u_red_soft",    L"u_blue_width"};

std::wstring g_cube, g_dl;  // two small readable tables, written once

double Number(FuzzedDataProvider& in) {
  switch (in.ConsumeIntegralInRange<int>(0, 9)) {
    case 0:
      return std::numeric_limits<double>::quiet_NaN();
    case 1:
      return in.ConsumeBool() ? HUGE_VAL : -HUGE_VAL;
    case 2:
      return in.ConsumeBool() ? 1e300 : -1e300;
    case 3:
      return static_cast<double>(in.ConsumeIntegral<int32_t>());
    case 4:
      return in.ConsumeFloatingPoint<double>();
    default:  // where the filters' ranges lie
      return in.ConsumeFloatingPointInRange<double>(-300.0, 300.0);
  }
}

std::wstring Text(FuzzedDataProvider& in) {
  switch (in.ConsumeIntegralInRange<int>(0, 4)) {
    case 0:
      return g_cube;
    case 1:
      return g_dl;
    case 2:
      return L"/nonexistent/look.cube";
    case 3:
      return L"";
    default: {
      const std::string bytes = in.ConsumeRandomLengthString(24);
      return std::wstring(bytes.begin(), bytes.end());
    }
  }
}

// One value into `key` of a parameter bag: usually a number, sometimes text, an integer or a
// value of no known type.
void SetValue(FuzzedDataProvider& in, INLEProperties* bag, const wchar_t* key) {
  switch (in.ConsumeIntegralInRange<int>(0, 5)) {
    case 0:
      bag->SetString(key, Text(in).c_str());
      break;
    case 1:
      bag->SetInt(key, in.ConsumeIntegral<int32_t>());
      break;
    case 2:
      bag->Remove(key);
      break;
    default:
      bag->SetValue(key, CNLEValue(Number(in)));
      break;
  }
}

NLEComPtr<INLEProperties> Settings(FuzzedDataProvider& in) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  const int count = in.ConsumeIntegralInRange<int>(0, 8);
  for (int i = 0; i < count; ++i) {
    const wchar_t* name = in.PickValueInArray(kNames);
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, name);
    p->SetString(Key::Property::kFriendName, name);
    p->SetInt(Key::Property::kType, in.ConsumeIntegralInRange<int32_t>(0, 5));
    SetValue(in, p.get(), Key::Property::kValue_Default);
    SetValue(in, p.get(), Key::Property::kValue_Current);
    props->SetInterface(Key::Property::kParamsArray[i], p.get());
  }
  // A count that disagrees with the entries is the host's mistake to survive, too.
  props->SetInt(Key::Property::kCount, in.ConsumeBool() ? count : in.ConsumeIntegral<int32_t>());
  return props;
}

// A frame of small but hostile geometry; null for "no frame".
NLEComPtr<INLEMemoryFrame> Frame(FuzzedDataProvider& in) {
  NLEComPtr<INLEMemoryFrame> frame;
  if (in.ConsumeIntegralInRange<int>(0, 7) == 0) return frame;
  const int32_t width = in.ConsumeIntegralInRange<int32_t>(0, 80);
  const int32_t height = in.ConsumeIntegralInRange<int32_t>(0, 48);
  const int32_t stride = in.ConsumeBool() ? 0 : width * 4 + in.ConsumeIntegralInRange<int>(0, 19);
  if (NLE_FAILED(NLECommon::CreateMemoryFrame(0, 0, 0, &frame)) || !frame) std::abort();
  const NLEFrameOrientation orientation = in.ConsumeBool() ? kNLEFrameTopDown : kNLEFrameBottomUp;
  if (NLE_FAILED(frame->Allocate(width, height, stride, orientation))) std::abort();
  uint8_t* pixels = nullptr;
  frame->GetPixels(&pixels);
  NLEComPtr<INLEFrameBuffer> buffer;
  if (pixels && NLE_SUCCEEDED(frame->GetBuffer(&buffer)) && buffer) {
    const int32_t bytes = buffer->GetSize();
    const uint8_t salt = in.ConsumeIntegral<uint8_t>();
    for (int32_t i = 0; i < bytes; ++i) pixels[i] = static_cast<uint8_t>(salt + i * 29 + i / 7);
  }
  return frame;
}

bool WriteText(const std::string& path, const std::string& text) {
  std::FILE* file = std::fopen(path.c_str(), "wb");
  if (!file) return false;
  const bool ok = std::fwrite(text.data(), 1, text.size(), file) == text.size();
  return std::fclose(file) == 0 && ok;
}

std::string g_base;

void RemoveFiles() {
  std::remove((g_base + ".cube").c_str());
  std::remove((g_base + ".3dl").c_str());
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  const char* dir = std::getenv("TMPDIR");
  g_base = std::string(dir && *dir ? dir : "/tmp") + "/tfx-plugin-fuzz-" + std::to_string(getpid());
  // A two-point table that swaps red and blue, and a small mesh with a range line.
  std::string cube = "LUT_3D_SIZE 2\n";
  for (int i = 0; i < 8; ++i) {
    cube += std::to_string(i >> 2 & 1) + " " + std::to_string(i >> 1 & 1) + " " +
            std::to_string(i & 1) + "\n";
  }
  std::string dl = "0 512 1023\n";
  for (int i = 0; i < 27; ++i) dl += "1023 512 0\n";
  if (!WriteText(g_base + ".cube", cube) || !WriteText(g_base + ".3dl", dl)) std::abort();
  std::atexit(RemoveFiles);
  g_cube.assign(g_base.begin(), g_base.end());
  g_dl = g_cube + L".3dl";
  g_cube += L".cube";
  // Creation lines would flood the fuzzer's output.
  if (INLELogger* logger = NLEGetDefaultLogger()) logger->SetLevel(kNLELogOff);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  FuzzedDataProvider in(data, size);
  const uint32_t count = GetFilterCount();
  if (count == 0) std::abort();
  const int index = in.ConsumeIntegralInRange<int>(-1, static_cast<int>(count));
  NLEComPtr<INLEProperties> descriptor;
  const HRESULT described = GetFilterProperties(index, &descriptor);
  if ((index < 0 || index >= static_cast<int>(count)) != NLE_FAILED(described)) std::abort();
  if (NLE_FAILED(described)) return 0;
  wchar_t guid[64] = {};
  if (NLE_FAILED(descriptor->GetString(Key::kFilterID, guid, 64, nullptr))) std::abort();

  NLEComPtr<INLEProperties> settings = Settings(in);
  NLEComPtr<INLECGFilter> filter;
  if (NLE_FAILED(CreateFilterFromGUID(nullptr, guid, in.ConsumeBool() ? settings.get() : nullptr,
                                      nullptr, reinterpret_cast<void**>(&filter))) ||
      !filter) {
    std::abort();  // every published GUID has a CPU class
  }

  // Frames, parameter changes and runs in any order; the same frame may play several roles.
  std::vector<NLEComPtr<INLEMemoryFrame>> frames;
  for (int i = 0; i < 3; ++i) frames.push_back(Frame(in));
  const int steps = in.ConsumeIntegralInRange<int>(1, 6);
  for (int step = 0; step < steps && in.remaining_bytes() > 0; ++step) {
    switch (in.ConsumeIntegralInRange<int>(0, 5)) {
      case 0: {
        const int32_t params = filter->GetParamCount();
        NLEComPtr<INLEProperties> param;
        const HRESULT found =
            in.ConsumeBool()
                ? filter->GetParamPropertyFromName(in.PickValueInArray(kNames), &param)
                : filter->GetParamProperty(in.ConsumeIntegralInRange<int32_t>(-1, params), &param);
        if (NLE_SUCCEEDED(found) && param) SetValue(in, param.get(), Key::Property::kValue_Current);
        filter->ParamValueChanged();
        break;
      }
      case 1:
        filter->SetCurrentTime(in.ConsumeIntegral<int32_t>());
        filter->SetTotalTime(in.ConsumeIntegral<int32_t>());
        break;
      case 2: {
        const NLERectF roi{Number(in), Number(in), Number(in), Number(in)};
        filter->SetRegionOfIntrest(roi, roi);
        filter->SetAngle(Number(in));
        break;
      }
      case 3:
        frames[in.ConsumeIntegralInRange<size_t>(0, 2)] = Frame(in);
        break;
      default: {
        INLEFrame* fg = frames[in.ConsumeIntegralInRange<size_t>(0, 2)].get();
        INLEFrame* bg = frames[in.ConsumeIntegralInRange<size_t>(0, 2)].get();
        INLEFrame* dst = frames[in.ConsumeIntegralInRange<size_t>(0, 2)].get();
        filter->SetForeground(fg);
        filter->SetBackground(bg);
        filter->IsPassthrough();
        filter->Running(dst);
        // Frames are borrowed: the filter must not keep them past the host's say-so.
        filter->SetForeground(nullptr);
        filter->SetBackground(nullptr);
        break;
      }
    }
  }
  return 0;
}
