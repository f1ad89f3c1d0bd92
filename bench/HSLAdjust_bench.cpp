// HSLAdjust through the plug-in interface (Running on host memory frames) with every band active
// and with one band, and the hue rotation called directly on a CxImage, beside memcpy of the same
// frame.
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

using Params = std::vector<std::pair<std::wstring, double>>;

NLEComPtr<INLECGFilter> CreateHSLAdjust(const Params& params) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  int i = 0;
  for (const auto& [name, value] : params) {
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, name.c_str());
    p->SetString(Key::Property::kFriendName, name.c_str());
    p->SetValue(Key::Property::kValue_Current, CNLEValue(value));
    props->SetInterface(Key::Property::kParamsArray[i++], p.get());
  }
  props->SetInt(Key::Property::kCount, i);
  NLEComPtr<INLECGFilter> filter;
  CreateFilterFromGUID(nullptr, L"AF91FF05-6577-4A4B-C81E-652EE7D6596E", props, nullptr,
                       reinterpret_cast<void**>(&filter));
  return filter;
}

// Every band with all five values set, each band differently.
Params EveryBand() {
  const wchar_t* bands[] = {L"red",  L"orange", L"yellow", L"green",
                            L"aqua", L"blue",   L"purple", L"magenta"};
  Params params;
  for (int b = 0; b < 8; ++b) {
    const std::wstring prefix = std::wstring(L"u_") + bands[b] + L"_";
    const double sign = b % 2 ? -1.0 : 1.0;
    params.push_back({prefix + L"hue", sign * (20 + 5 * b)});
    params.push_back({prefix + L"sat", -sign * (15 + 4 * b)});
    params.push_back({prefix + L"light", sign * (10 + 3 * b)});
    params.push_back({prefix + L"width", 10.0 * b - 30});
    params.push_back({prefix + L"soft", 40.0 - 10 * b});
  }
  return params;
}

void BM_HSLAdjust(benchmark::State& state, BenchSize size, Params params) {
  GetFilterCount();
  NLEComPtr<INLECGFilter> filter = CreateHSLAdjust(params);
  std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  NLEComPtr<INLEMemoryFrame> fg, dst;
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &fg);
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &dst);
  fg->Wrap(input.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
  if (!filter || !fg || !dst) {
    state.SkipWithError("cannot create the filter or frames");
    return;
  }
  filter->SetForeground(fg);
  for (auto _ : state) {
    if (filter->Running(dst) != NLE_S_OK) {
      state.SkipWithError("Running failed");
      return;
    }
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// Each iteration restores the frame, then rotates it: repeated rotation in place would drift
// towards greys, which the rotation skips.
void BM_HueAdjust(benchmark::State& state, BenchSize size) {
  const std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  CxImage image(static_cast<unsigned>(size.width), static_cast<unsigned>(size.height), 32,
                IPF_BGRA);
  for (auto _ : state) {
    std::memcpy(image.GetBits(), input.data(), input.size());
    hueAdjustment(&image, 30.0f);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const struct Registrar {
  Registrar() {
    const std::pair<const char*, Params> cases[] = {
        {"all8", EveryBand()},
        {"red", {{L"u_red_hue", 30}, {L"u_red_sat", 20}, {L"u_red_light", -10}}},
    };
    for (const BenchSize& size : kBenchSizes) {
      benchmark::RegisterBenchmark((std::string("BM_Memcpy/") + size.label).c_str(), BM_Memcpy,
                                   size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      for (const auto& [label, params] : cases) {
        benchmark::RegisterBenchmark(
            (std::string("BM_HSLAdjust/") + size.label + "/" + label).c_str(), BM_HSLAdjust, size,
            params)
            ->Unit(benchmark::kMillisecond)
            ->UseRealTime();
      }
      benchmark::RegisterBenchmark((std::string("BM_HueAdjust/") + size.label + "/30deg").c_str(),
                                   BM_HueAdjust, size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
    }
  }
} registrar;

}  // namespace
