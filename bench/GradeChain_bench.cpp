// The grade a host previews most: ColorAdjust (all five) -> LightAdjust (all four) ->
// WhiteBalanceAdjust -> VignetteAdjust, each through Running on the previous one's output, as a
// host chains them. Its budget is 12.5 memcpys of the frame (x memcpy >= 0.08).
#include "BenchCommon.h"

namespace {

struct Stage {
  const wchar_t* guid;
  Params params;
};

const Stage kGrade[] = {
    {L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
     {{L"u_exposure", 20},
      {L"u_brightness", 15},
      {L"u_contrast", 30},
      {L"u_vib", 40},
      {L"u_sat", 25}}},
    {L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
     {{L"u_highLight", -40}, {L"u_shadow", 50}, {L"u_whiteLevel", 20}, {L"u_blackLevel", -15}}},
    {L"39509FB9-39FB-4516-9464-3D891DD61D62", {{L"u_temperature", 30}, {L"u_tint", -20}}},
    {L"8622FC58-4DF1-44BD-9B37-2F633D4D3368", {{L"amount", -50}}},
};

void BM_GradeChain(benchmark::State& state, BenchSize size) {
  std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  NLEComPtr<INLEMemoryFrame> frames[5];
  for (auto& frame : frames) NLECommon::CreateMemoryFrame(size.width, size.height, 0, &frame);
  NLEComPtr<INLECGFilter> filters[4];
  for (int i = 0; i < 4; ++i) {
    filters[i] = CreateEffect(kGrade[i].guid, kGrade[i].params);
    if (!filters[i] || !frames[i] || !frames[i + 1]) {
      state.SkipWithError("cannot create the filters or frames");
      return;
    }
    filters[i]->SetForeground(frames[i]);
  }
  frames[0]->Wrap(input.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
  // The filters prepare their tables and the vignette its mask on the first frame; a preview
  // runs thousands after it with the same settings.
  for (int i = 0; i < 4; ++i) filters[i]->Running(frames[i + 1]);
  for (auto _ : state) {
    for (int i = 0; i < 4; ++i) {
      if (filters[i]->Running(frames[i + 1]) != NLE_S_OK) {
        state.SkipWithError("Running failed");
        return;
      }
    }
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const int kRegistered = [] {
  for (const BenchSize& size : kBenchSizes) {
    RegisterMemcpy(size);
    RegisterTimed(std::string("BM_GradeChain/") + size.label, BM_GradeChain, size);
  }
  return 0;
}();

}  // namespace
