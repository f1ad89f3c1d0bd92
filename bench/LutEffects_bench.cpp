// The LUT effects through the plug-in interface (Running on host memory frames), beside memcpy of
// the same frame: ColorLut3dAdjust with a 33- and a 64-point ".cube" file, ChromeKeyLut3d in
// mask and beauty mode with its tables already built, and ChromeKeyCombine. Separately, on a
// 16x16 frame so that the table work dominates, what a frame costs when the key colour changes
// (both tables rebuilt) or only the contrast does (the alpha table rebuilt).
#include <stdlib.h>

#include <cstdio>
#include <fstream>
#include <string>

#include "BenchCommon.h"

namespace {

namespace Key = NLEKey::Filter;
constexpr const wchar_t* kColorLut = L"74EB022D-1D73-4D1E-9F70-487C356D46CD";
constexpr const wchar_t* kChromeKey = L"DB4BBA18-48FC-4164-B572-E59757B02796";
constexpr const wchar_t* kCombine = L"41AA934B-757A-4EAD-8F7B-85E2E2952B6A";

// Two ".cube" files with a gentle S-curve and a warm shift, in a directory removed at exit.
struct LutFiles {
  LutFiles() {
    char pattern[] = "/tmp/tfx-bench-lut-XXXXXX";
    if (!mkdtemp(pattern)) return;
    dir = pattern;
    for (int size : {33, 64}) Write(size);
  }
  ~LutFiles() {
    for (int size : {33, 64}) std::remove(Path(size).c_str());
    if (!dir.empty()) std::remove(dir.c_str());
  }
  std::string Path(int size) const { return dir + "/look" + std::to_string(size) + ".cube"; }
  void Write(int size) const {
    std::ofstream out(Path(size));
    out << "LUT_3D_SIZE " << size << "\n";
    char line[64];
    for (int b = 0; b < size; ++b) {
      for (int g = 0; g < size; ++g) {
        for (int r = 0; r < size; ++r) {
          double c[3] = {double(r) / (size - 1), double(g) / (size - 1), double(b) / (size - 1)};
          for (double& v : c) v = 0.8 * v + 0.2 * v * v * (3 - 2 * v);
          std::snprintf(line, sizeof line, "%.6f %.6f %.6f\n", c[0] * 0.97 + 0.03, c[1],
                        c[2] * 0.95);
          out << line;
        }
      }
    }
  }
  std::string dir;
};

const LutFiles& Files() {
  static const LutFiles files;
  return files;
}

NLEComPtr<INLECGFilter> ColorLutWithPath(const std::string& path) {
  NLEComPtr<INLEProperties> props, p;
  NLECommon::CreateProperties(&props);
  NLECommon::CreateProperties(&p);
  const std::wstring wide(path.begin(), path.end());
  p->SetString(Key::Property::kVariantName, L"lut3dPath");
  p->SetString(Key::Property::kFriendName, L"lut3dPath");
  p->SetInt(Key::Property::kType, NLEFilterPropertyType_String);
  p->SetString(Key::Property::kValue_Current, wide.c_str());
  props->SetInterface(Key::Property::kParamsArray[0], p.get());
  props->SetInt(Key::Property::kCount, 1);
  NLEComPtr<INLECGFilter> filter;
  CreateFilterFromGUID(nullptr, kColorLut, props, nullptr, reinterpret_cast<void**>(&filter));
  return filter;
}

Params GreenKey(double mode) {
  return {{L"red", 40},      {L"green", 200}, {L"blue", 60},
          {L"contrast", 50}, {L"offset", 0},  {L"mode", mode}};
}

// Frames after a first one, which loads the file or builds the tables.
void BM_Warm(benchmark::State& state, BenchSize size, const wchar_t* guid, Params params,
             int lutSize) {
  EffectRun run;
  if (!run.Prepare(state, size, guid, params)) return;
  if (lutSize) {
    run.filter = ColorLutWithPath(Files().Path(lutSize));
    if (!run.filter) {
      state.SkipWithError("cannot create the filter");
      return;
    }
    run.filter->SetForeground(run.fg);
  }
  if (!run.Run(state)) return;
  for (auto _ : state) {
    if (!run.Run(state)) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

void BM_Combine(benchmark::State& state, BenchSize size) {
  EffectRun run;
  if (!run.Prepare(state, size, kCombine, {})) return;
  std::vector<uint8_t> mask = RandomBgra(size.width, size.height, 11);
  NLEComPtr<INLEMemoryFrame> bg;
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &bg);
  if (!bg) {
    state.SkipWithError("cannot create the frames");
    return;
  }
  bg->Wrap(mask.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
  run.filter->SetBackground(bg);
  for (auto _ : state) {
    if (!run.Run(state)) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// Every frame alternates one parameter between two values, so every frame rebuilds tables.
void BM_Regenerate(benchmark::State& state, const wchar_t* name, double a, double b) {
  EffectRun run;
  if (!run.Prepare(state, {16, 16, "16x16"}, kChromeKey, GreenKey(0))) return;
  NLEComPtr<INLEProperties> param;
  if (run.filter->GetParamPropertyFromName(name, &param) != NLE_S_OK) {
    state.SkipWithError("no such parameter");
    return;
  }
  if (!run.Run(state)) return;
  bool flip = false;
  for (auto _ : state) {
    flip = !flip;
    param->SetValue(Key::Property::kValue_Current, CNLEValue(flip ? b : a));
    run.filter->ParamValueChanged();
    if (!run.Run(state)) return;
  }
}

const struct Registrar {
  Registrar() {
    for (const BenchSize& size : kBenchSizes) {
      RegisterMemcpy(size);
      const std::string tail = std::string("/") + size.label + "/";
      RegisterTimed("BM_ColorLut3dAdjust" + tail + "cube33", BM_Warm, size, kColorLut, Params{},
                    33);
      RegisterTimed("BM_ColorLut3dAdjust" + tail + "cube64", BM_Warm, size, kColorLut, Params{},
                    64);
      RegisterTimed("BM_ChromeKeyLut3d" + tail + "mask", BM_Warm, size, kChromeKey, GreenKey(0), 0);
      RegisterTimed("BM_ChromeKeyLut3d" + tail + "beauty", BM_Warm, size, kChromeKey, GreenKey(1),
                    0);
      RegisterTimed("BM_ChromeKeyCombine" + tail + "combine", BM_Combine, size);
    }
    RegisterTimed("BM_ChromeKeyLut3dTables/key_change_both", BM_Regenerate, L"green", 200.0, 190.0);
    RegisterTimed("BM_ChromeKeyLut3dTables/contrast_change_alpha", BM_Regenerate, L"contrast", 50.0,
                  60.0);
  }
} registrar;

}  // namespace
