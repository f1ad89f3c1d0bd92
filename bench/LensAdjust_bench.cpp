// DistortionFringingAdjust through the plug-in interface (Running on host memory frames) beside
// memcpy of the same frame, with the maps already built (settings unchanged between frames),
// and once with a strength that changes every frame, which rebuilds the maps each time.
#include <string>

#include "BenchCommon.h"
#include "tessarofx/LensAdjust.h"

namespace {

void BM_Lens(benchmark::State& state, BenchSize size, double distortion, double fringing,
             bool animate) {
  EffectRun run;
  if (!run.Prepare(state, size, L"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735",
                   {{L"distortion", distortion}, {L"fringing", fringing}})) {
    return;
  }
  NLEComPtr<INLEProperties> strength;
  if (run.filter->GetParamPropertyFromName(L"distortion", &strength) != NLE_S_OK) {
    state.SkipWithError("cannot create the filter or frames");
    return;
  }
  releaseLensVariables();
  run.filter->Running(run.dst);  // builds the maps
  double step = 0;
  for (auto _ : state) {
    if (animate) {
      step += 0.01;
      strength->SetValue(NLEKey::Filter::Property::kValue_Current, CNLEValue(distortion + step));
      run.filter->ParamValueChanged();
    }
    if (!run.Run(state)) return;
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
      RegisterMemcpy(size);
      for (const auto& c : cases) {
        RegisterTimed(std::string("BM_Lens/") + size.label + "/" + c.label, BM_Lens, size,
                      c.distortion, c.fringing, c.animate);
      }
    }
  }
} registrar;

}  // namespace
