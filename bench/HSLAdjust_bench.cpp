// HSLAdjust through the plug-in interface (Running on host memory frames) with every band active
// and with one band, and the hue rotation called directly on a CxImage, beside memcpy of the same
// frame.
#include <cstring>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HueAdjust.h"

namespace {

constexpr const wchar_t* kHSLAdjust = L"AF91FF05-6577-4A4B-C81E-652EE7D6596E";

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

// Each iteration restores the frame, untimed, then rotates it: repeated rotation in place would
// drift towards greys, which the rotation skips.
void BM_HueAdjust(benchmark::State& state, BenchSize size) {
  const std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  CxImage image(static_cast<unsigned>(size.width), static_cast<unsigned>(size.height), 32,
                IPF_BGRA);
  for (auto _ : state) {
    state.PauseTiming();
    std::memcpy(image.GetBits(), input.data(), input.size());
    state.ResumeTiming();
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
      RegisterMemcpy(size);
      for (const auto& [label, params] : cases) {
        RegisterTimed(std::string("BM_HSLAdjust/") + size.label + "/" + label, BM_EffectRunning,
                      size, kHSLAdjust, params);
      }
      RegisterTimed(std::string("BM_HueAdjust/") + size.label + "/30deg", BM_HueAdjust, size);
    }
  }
} registrar;

}  // namespace
