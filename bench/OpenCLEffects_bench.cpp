// The four OpenCL effects through the plug-in interface, with frames already in device memory, so
// that only the kernel and its argument set-up are timed; moving a frame to and from the device is
// timed on its own (Upload, Download). Beside them, in the same run: the CPU class of each GUID on
// a host frame of the same size, and memcpy of the frame. The device is the one a host gets by
// default (TESSAROFX_OPENCL_DEVICE picks another); without any, the OpenCL benchmarks are skipped
// with the reason and the CPU ones still run.
#include <stdlib.h>

#include <cmath>
#include <cstdio>
#include <cwchar>
#include <fstream>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/NLEOpenCL.h"

#ifndef TFX_KERNEL_DIR
#error "TFX_KERNEL_DIR must name the directory of the built OpenCL programs"
#endif

namespace {

namespace Key = NLEKey::Filter;
constexpr const wchar_t* kLut = L"74EB022D-1D73-4D1E-9F70-487C356D46CD";
constexpr const wchar_t* kChromeKey = L"DB4BBA18-48FC-4164-B572-E59757B02796";
constexpr const wchar_t* kAToWhite = L"969C6D5D-43AC-42F9-8F6C-9AB868BA9356";
constexpr const wchar_t* kWhiteBalance = L"39509FB9-39FB-4516-9464-3D891DD61D62";

// One parameter as a host sets it: a number, or a string when `text` is not empty.
struct Setting {
  std::wstring name;
  double value;
  std::wstring text;
};
using Settings = std::vector<Setting>;

std::string Hex(HRESULT hr) {
  char text[16];
  std::snprintf(text, sizeof text, "0x%08X", static_cast<unsigned>(hr));
  return text;
}

// A 33-point ".cube" grade (lifted blacks, a soft S-curve, a cooler blue), in a directory removed
// at exit.
struct CubeFile {
  CubeFile() {
    char pattern[] = "/tmp/tfx-bench-cl-XXXXXX";
    if (!mkdtemp(pattern)) return;
    dir = pattern;
    path = dir + "/grade33.cube";
    std::ofstream out(path);
    constexpr int kSize = 33;
    out << "LUT_3D_SIZE " << kSize << "\n";
    char line[64];
    for (int b = 0; b < kSize; ++b) {
      for (int g = 0; g < kSize; ++g) {
        for (int r = 0; r < kSize; ++r) {
          double c[3] = {double(r) / (kSize - 1), double(g) / (kSize - 1), double(b) / (kSize - 1)};
          for (double& v : c) v = 0.04 + 0.92 * (0.7 * v + 0.3 * v * v * (3 - 2 * v));
          std::snprintf(line, sizeof line, "%.6f %.6f %.6f\n", c[0] * 0.98, c[1],
                        std::fmin(1.0, c[2] * 1.03));
          out << line;
        }
      }
    }
  }
  ~CubeFile() {
    if (!path.empty()) std::remove(path.c_str());
    if (!dir.empty()) std::remove(dir.c_str());
  }
  std::string dir, path;
};

const CubeFile& Cube() {
  static const CubeFile file;
  return file;
}

Settings LutSettings() {
  const std::string& path = Cube().path;
  return {{L"lut3dPath", 0, std::wstring(path.begin(), path.end())}};
}

// Green key (0,255,0); mode 0 gives the key mask, mode 1 the colours with the spill removed.
Settings GreenKey(double mode) {
  return {{L"red", 0, {}},       {L"green", 255, {}}, {L"blue", 0, {}},
          {L"contrast", 50, {}}, {L"offset", 0, {}},  {L"mode", mode, {}}};
}

Settings WarmerGreener() {
  return {{L"u_temperature", 30, {}},
          {L"u_tint", -20, {}},
          {L"u_rgain", 1, {}},
          {L"u_ggain", 1, {}},
          {L"u_bgain", 1, {}}};
}

// The filter of `guid` as a host creates it: the OpenCL class on `device`, the CPU class without.
HRESULT CreateFilter(INLECGDevice* device, const wchar_t* guid, const Settings& settings,
                     INLECGFilter** filter) {
  GetFilterCount();
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  int i = 0;
  for (const Setting& s : settings) {
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, s.name.c_str());
    p->SetString(Key::Property::kFriendName, s.name.c_str());
    if (s.text.empty()) {
      p->SetValue(Key::Property::kValue_Current, CNLEValue(s.value));
    } else {
      p->SetInt(Key::Property::kType, NLEFilterPropertyType_String);
      p->SetString(Key::Property::kValue_Current, s.text.c_str());
    }
    props->SetInterface(Key::Property::kParamsArray[i++], p.get());
  }
  props->SetInt(Key::Property::kCount, i);
  return CreateFilterFromGUID(device, guid, props, device ? TFX_KERNEL_DIR : nullptr,
                              reinterpret_cast<void**>(filter));
}

// The default device, opened once for the whole run; `reason` says why there is none.
struct Device {
  Device() {
    uint32_t count = 0;
    if (NLECommon::ListOpenCLDevices(nullptr, 0, &count) < 0 || count == 0) {
      reason = "no OpenCL platform or device on this machine";
      return;
    }
    const HRESULT hr = NLECommon::CreateOpenCLDevice(-1, &device);
    if (hr < 0 || !device) {
      reason = "cannot open the OpenCL device (" + Hex(hr) + ")";
      device = nullptr;
    }
  }
  NLEComPtr<INLECGDevice> device;
  std::string reason;
};

const Device& TheDevice() {
  static const Device opened;
  return opened;
}

INLECGDevice* OpenDevice(benchmark::State& state) {
  const Device& opened = TheDevice();
  if (!opened.device) state.SkipWithError(opened.reason.c_str());
  return opened.device.get();
}

// Which device the figures are for, in the run's context lines.
std::string DeviceLine() {
  const Device& opened = TheDevice();
  if (!opened.device) return opened.reason;
  wchar_t name[128] = {};
  opened.device->GetName(name, 128);
  return std::string(name, name + std::wcslen(name));  // device names are ASCII in practice
}

// A device frame holding a random picture, and an empty one of the same size.
struct DeviceFrames {
  NLEComPtr<INLEOpenCLFrame> src, dst;

  bool Make(benchmark::State& state, INLECGDevice* device, BenchSize size) {
    const HRESULT a = NLECommon::CreateOpenCLFrame(device, size.width, size.height,
                                                   OPENCL::kMemoryFrameBuffer, &src);
    const HRESULT b = NLECommon::CreateOpenCLFrame(device, size.width, size.height,
                                                   OPENCL::kMemoryFrameBuffer, &dst);
    if (a < 0 || b < 0 || !src || !dst) {
      state.SkipWithError(("cannot create the device frames (" + Hex(a < 0 ? a : b) + ")").c_str());
      return false;
    }
    const std::vector<uint8_t> picture = RandomBgra(size.width, size.height);
    if (src->Upload(picture.data(), 0) < 0) {
      state.SkipWithError("cannot upload the frame");
      return false;
    }
    return true;
  }
};

bool RunOnce(benchmark::State& state, INLECGFilter* filter, INLEFrame* dst) {
  const HRESULT hr = filter->Running(dst);
  if (hr != NLE_S_OK) {
    state.SkipWithError(("Running failed (" + Hex(hr) + ")").c_str());
    return false;
  }
  benchmark::ClobberMemory();
  return true;
}

// The OpenCL class on frames already on the device. Running waits for its kernel, so each
// iteration is a whole frame; the first frame (program lookup, file load, tables) is not timed.
void BM_OpenCL(benchmark::State& state, BenchSize size, const wchar_t* guid, Settings settings) {
  INLECGDevice* device = OpenDevice(state);
  if (!device) return;
  NLEComPtr<INLECGFilter> filter;
  const HRESULT hr = CreateFilter(device, guid, settings, &filter);
  if (hr < 0 || !filter) {
    state.SkipWithError(("cannot create the OpenCL filter (" + Hex(hr) + ")").c_str());
    return;
  }
  DeviceFrames frames;
  if (!frames.Make(state, device, size)) return;
  filter->SetForeground(frames.src.get());
  if (!RunOnce(state, filter.get(), frames.dst.get())) return;
  for (auto _ : state) {
    if (!RunOnce(state, filter.get(), frames.dst.get())) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// The CPU class of the same GUID on host frames, also after a first frame.
void BM_Cpu(benchmark::State& state, BenchSize size, const wchar_t* guid, Settings settings) {
  NLEComPtr<INLECGFilter> filter;
  const HRESULT hr = CreateFilter(nullptr, guid, settings, &filter);
  if (hr < 0 || !filter) {
    state.SkipWithError(("cannot create the CPU filter (" + Hex(hr) + ")").c_str());
    return;
  }
  std::vector<uint8_t> picture = RandomBgra(size.width, size.height);
  NLEComPtr<INLEMemoryFrame> fg, dst;
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &fg);
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &dst);
  if (!fg || !dst) {
    state.SkipWithError("cannot create the frames");
    return;
  }
  fg->Wrap(picture.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
  filter->SetForeground(fg);
  if (!RunOnce(state, filter.get(), dst.get())) return;
  for (auto _ : state) {
    if (!RunOnce(state, filter.get(), dst.get())) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// A packed host frame to a device frame, or back; both calls return once the copy is done.
void BM_Transfer(benchmark::State& state, BenchSize size, bool upload) {
  INLECGDevice* device = OpenDevice(state);
  if (!device) return;
  DeviceFrames frames;
  if (!frames.Make(state, device, size)) return;
  std::vector<uint8_t> host = RandomBgra(size.width, size.height, 3);
  for (auto _ : state) {
    const HRESULT hr =
        upload ? frames.dst->Upload(host.data(), 0) : frames.src->Download(host.data(), 0);
    if (hr < 0) {
      state.SkipWithError(
          ((upload ? "Upload failed (" : "Download failed (") + Hex(hr) + ")").c_str());
      return;
    }
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const struct Registrar {
  Registrar() {
    struct Case {
      const char* name;
      const char* label;
      const wchar_t* guid;
      Settings settings;
    };
    const std::vector<Case> cases = {
        {"Lut", "cube33", kLut, LutSettings()},
        {"ChromeKeyLut3d", "mask", kChromeKey, GreenKey(0)},
        {"ChromeKeyLut3d", "beauty", kChromeKey, GreenKey(1)},
        {"AToWhite", "plain", kAToWhite, {}},
        {"WhiteBalanceAdjust", "warm_green", kWhiteBalance, WarmerGreener()},
    };
    // A line per filter created would split the table; errors (a failed program build) still
    // show, and TESSAROFX_LOG_LEVEL still decides when it is set.
    if (!getenv("TESSAROFX_LOG_LEVEL")) NLEGetDefaultLogger()->SetLevel(kNLELogWarning);
    benchmark::AddCustomContext("opencl_device", DeviceLine());
    for (const BenchSize& size : kBenchSizes) {
      RegisterMemcpy(size);
      const std::string tail = std::string("/") + size.label;
      RegisterTimed("BM_Upload" + tail, BM_Transfer, size, true);
      RegisterTimed("BM_Download" + tail, BM_Transfer, size, false);
      for (const Case& c : cases) {
        const std::string suffix = tail + "/" + c.label;
        RegisterTimed(std::string("BM_") + c.name + "CL" + suffix, BM_OpenCL, size, c.guid,
                      c.settings);
        RegisterTimed(std::string("BM_") + c.name + "CPU" + suffix, BM_Cpu, size, c.guid,
                      c.settings);
      }
    }
  }
} registrar;

}  // namespace
