// VignetteAdjust through the plug-in interface (Running on host memory frames) beside memcpy of
// the same frame: the default shape with and without the tone curve outside, and a small,
// fully feathered ellipse where nearly every pixel is blended one by one.
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

using Params = std::vector<std::pair<const wchar_t*, double>>;

NLEComPtr<INLECGFilter> CreateVignette(const Params& params) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  int i = 0;
  for (const auto& [name, value] : params) {
    NLEComPtr<INLEProperties> p;
    NLECommon::CreateProperties(&p);
    p->SetString(Key::Property::kVariantName, name);
    p->SetString(Key::Property::kFriendName, name);
    p->SetValue(Key::Property::kValue_Current, CNLEValue(value));
    props->SetInterface(Key::Property::kParamsArray[i++], p.get());
  }
  props->SetInt(Key::Property::kCount, i);
  NLEComPtr<INLECGFilter> filter;
  CreateFilterFromGUID(nullptr, L"8622FC58-4DF1-44BD-9B37-2F633D4D3368", props, nullptr,
                       reinterpret_cast<void**>(&filter));
  return filter;
}

void BM_Vignette(benchmark::State& state, BenchSize size, Params params) {
  GetFilterCount();
  NLEComPtr<INLECGFilter> filter = CreateVignette(params);
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

const struct Registrar {
  Registrar() {
    const std::pair<const char*, Params> cases[] = {
        {"darken", {{L"amount", -50}}},
        {"darken_highlights", {{L"amount", -50}, {L"highlights", 80}, {L"exposure", 20}}},
        {"small_feathered",
         {{L"amount", 60}, {L"size", 0}, {L"feather", 100}, {L"highlights", 20}}},
    };
    for (const BenchSize& size : kBenchSizes) {
      benchmark::RegisterBenchmark((std::string("BM_Memcpy/") + size.label).c_str(), BM_Memcpy,
                                   size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      for (const auto& [label, params] : cases) {
        benchmark::RegisterBenchmark(
            (std::string("BM_Vignette/") + size.label + "/" + label).c_str(), BM_Vignette, size,
            params)
            ->Unit(benchmark::kMillisecond)
            ->UseRealTime();
      }
    }
  }
} registrar;

}  // namespace
