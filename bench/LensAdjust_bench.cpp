// DistortionFringingAdjust through the plug-in interface (Running on host memory frames) beside
// memcpy of the same frame, with the maps already built (settings unchanged between frames),
// and once with a strength that changes every frame, which rebuilds the maps each time.
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

namespace Key = NLEKey::Filter;

NLEComPtr<INLECGFilter> CreateLens(double distortion, double fringing) {
  NLEComPtr<INLEProperties> props;
  NLECommon::CreateProperties(&props);
  const std::pair<const wchar_t*, double> params[] = {{L"distortion", distortion},
                                                      {L"fringing", fringing}};
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
  CreateFilterFromGUID(nullptr, L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735", props, nullptr,
                       reinterpret_cast<void**>(&filter));
  return filter;
}

void BM_Lens(benchmark::State& state, BenchSize size, double distortion, double fringing,
             bool animate) {
  GetFilterCount();
  NLEComPtr<INLECGFilter> filter = CreateLens(distortion, fringing);
  std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  NLEComPtr<INLEMemoryFrame> fg, dst;
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &fg);
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &dst);
  fg->Wrap(input.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
  NLEComPtr<INLEProperties> strength;
  if (!filter || !fg || !dst ||
      filter->GetParamPropertyFromName(L"distortion", &strength) != NLE_S_OK) {
    state.SkipWithError("cannot create the filter or frames");
    return;
  }
  filter->SetForeground(fg);
  releaseLensVariables();
  filter->Running(dst);  // builds the maps
  double step = 0;
  for (auto _ : state) {
    if (animate) {
      step += 0.01;
      strength->SetValue(Key::Property::kValue_Current, CNLEValue(distortion + step));
      filter->ParamValueChanged();
    }
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
    const struct {
      const char* label;
      double distortion, fringing;
      bool animate;
    } cases[] = {
        {"distortion", 40, 0, false},
        {"fringing", 0, 60, false},
        {"both", -30, 50, false},
        {"distortion_rebuilt_each_frame", 40, 0, true},
    };
    for (const BenchSize& size : kBenchSizes) {
      benchmark::RegisterBenchmark((std::string("BM_Memcpy/") + size.label).c_str(), BM_Memcpy,
                                   size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      for (const auto& c : cases) {
        benchmark::RegisterBenchmark((std::string("BM_Lens/") + size.label + "/" + c.label).c_str(),
                                     BM_Lens, size, c.distortion, c.fringing, c.animate)
            ->Unit(benchmark::kMillisecond)
            ->UseRealTime();
      }
    }
  }
} registrar;

}  // namespace
