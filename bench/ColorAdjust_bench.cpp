// ColorAdjust through the plug-in interface (Running on host memory frames), all five operations
// and each alone, beside memcpy of the same frame; and all five with saturation changing every
// frame, as a keyframed grade plays, which builds the effect's tables for every frame.
#include <string>

#include "BenchCommon.h"

namespace {

const Params kAllFive = {{L"u_exposure", 20},
                         {L"u_brightness", 15},
                         {L"u_contrast", 30},
                         {L"u_vib", 40},
                         {L"u_sat", 25}};

void BM_SaturationChanging(benchmark::State& state, BenchSize size) {
  EffectRun run;
  if (!run.Prepare(state, size, L"18C6E879-4138-42D0-B0B9-6B4401AA97E6", kAllFive)) return;
  NLEComPtr<INLEProperties> saturation;
  if (run.filter->GetParamPropertyFromName(L"u_sat", &saturation) != NLE_S_OK) {
    state.SkipWithError("no such parameter");
    return;
  }
  double value = 25;
  for (auto _ : state) {
    value = value < 60 ? value + 0.1 : 25;
    saturation->SetValue(NLEKey::Filter::Property::kValue_Current, CNLEValue(value));
    run.filter->ParamValueChanged();
    if (!run.Run(state)) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const struct Registrar {
  Registrar() {
    RegisterEffectCases("ColorAdjust", L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
                        {
                            {"all5", kAllFive},
                            {"exposure", {{L"u_exposure", 20}}},
                            {"brightness", {{L"u_brightness", 15}}},
                            {"contrast", {{L"u_contrast", 30}}},
                            {"vibrance", {{L"u_vib", 40}}},
                            {"saturation", {{L"u_sat", 25}}},
                        });
    for (const BenchSize& size : kBenchSizes) {
      RegisterTimed(std::string("BM_ColorAdjust/") + size.label + "/all5_saturation_changing",
                    BM_SaturationChanging, size);
    }
  }
} registrar;

}  // namespace
