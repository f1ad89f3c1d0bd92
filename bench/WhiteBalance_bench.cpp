// WhiteBalanceAdjust through the plug-in interface (Running on host memory frames), and the
// exported temperature, tint and automatic balance functions on a frame-sized CxImage, beside
// memcpy of the same frame.
#include <cstring>
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"
#include "tessarofx/WhiteBalance.h"

namespace {

namespace Key = NLEKey::Filter;

using Params = std::vector<std::pair<const wchar_t*, double>>;

NLEComPtr<INLECGFilter> CreateWhiteBalance(const Params& params) {
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
  CreateFilterFromGUID(nullptr, L"39509FB9-39FB-4516-9464-3D891DD61D62", props, nullptr,
                       reinterpret_cast<void**>(&filter));
  return filter;
}

void BM_WhiteBalanceAdjust(benchmark::State& state, BenchSize size) {
  GetFilterCount();
  NLEComPtr<INLECGFilter> filter = CreateWhiteBalance({{L"u_temperature", 30}, {L"u_tint", -20}});
  std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  NLEComPtr<INLEMemoryFrame> fg, dst;
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &fg);
  NLECommon::CreateMemoryFrame(size.width, size.height, 0, &dst);
  if (!filter || !fg || !dst) {
    state.SkipWithError("cannot create the filter or frames");
    return;
  }
  fg->Wrap(input.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
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

// The functions work in place; the frame is restored outside the timed part.
template <class Fn>
void BM_ImageFunction(benchmark::State& state, BenchSize size, Fn fn) {
  const std::vector<uint8_t> input = RandomBgra(size.width, size.height);
  std::vector<uint8_t> frame = input;
  uint8_t* bits = frame.data();
  CxImage image(&bits, static_cast<unsigned>(size.width), static_cast<unsigned>(size.height), 32,
                static_cast<unsigned>(size.width * 4), IPF_BGRA);
  for (auto _ : state) {
    state.PauseTiming();
    std::memcpy(frame.data(), input.data(), frame.size());
    state.ResumeTiming();
    fn(&image);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const struct Registrar {
  Registrar() {
    for (const BenchSize& size : kBenchSizes) {
      const std::string suffix = std::string("/") + size.label;
      benchmark::RegisterBenchmark(("BM_Memcpy" + suffix).c_str(), BM_Memcpy, size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      benchmark::RegisterBenchmark(("BM_WhiteBalanceAdjust" + suffix).c_str(),
                                   BM_WhiteBalanceAdjust, size)
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      benchmark::RegisterBenchmark(("BM_whiteBalanceAdjustment" + suffix).c_str(),
                                   BM_ImageFunction<CxImage* (*)(CxImage*)>, size,
                                   [](CxImage* i) { return whiteBalanceAdjustment(i, 50.0f); })
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      benchmark::RegisterBenchmark(("BM_temperatureAdjustment" + suffix).c_str(),
                                   BM_ImageFunction<CxImage* (*)(CxImage*)>, size,
                                   [](CxImage* i) { return temperatureAdjustment(i, 4000); })
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
      benchmark::RegisterBenchmark(("BM_tintAdjustment" + suffix).c_str(),
                                   BM_ImageFunction<CxImage* (*)(CxImage*)>, size,
                                   [](CxImage* i) { return tintAdjustment(i, 40.0f); })
          ->Unit(benchmark::kMillisecond)
          ->UseRealTime();
    }
  }
} registrar;

}  // namespace
