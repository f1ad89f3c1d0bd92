// LightAdjust through the plug-in interface (Running on host memory frames), all four operations
// and each alone, beside memcpy of the same frame.
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

using Params = std::vector<std::pair<const wchar_t*, double>>;

NLEComPtr<INLECGFilter> CreateLightAdjust(const Params& params) {
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
  CreateFilterFromGUID(nullptr, L"D8651B53-F47A-4B98-B8E9-35B491D5EADC", props, nullptr,
                       reinterpret_cast<void**>(&filter));
  return filter;
}

void BM_LightAdjust(benchmark::State& state, BenchSize size, Params params) {
  GetFilterCount();
  NLEComPtr<INLECGFilter> filter = CreateLightAdjust(params);
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
        {"all4",
         {{L"u_highLight", -40}, {L"u_shadow", 50}, {L"u_whiteLevel", 20}, {L"u_blackLevel", -15}}},
        {"highlight", {{L"u_highLight", -40}}},
        {"shadow", {{L"u_shadow", 50}}},
        {"whiteLevel", {{L"u_whiteLevel", 20}}},
        {"blackLevel", {{L"u_blackLevel", -15}}},
    };
    for (const BenchSize& size : kBenchSizes) {
      benchmark::RegisterBenchmark((std::string("BM_Memcpy/") + size.label).c_str(), BM_Memcpy,
                                   size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      for (const auto& [label, params] : cases) {
        benchmark::RegisterBenchmark(
            (std::string("BM_LightAdjust/") + size.label + "/" + label).c_str(), BM_LightAdjust,
            size, params)
            ->Unit(benchmark::kMillisecond)
            ->UseRealTime();
      }
    }
  }
} registrar;

}  // namespace
