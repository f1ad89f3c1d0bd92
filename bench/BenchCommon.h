// Frame sizes and helpers shared by the benchmarks. Every benchmark reports pixels processed
// (items) so the summary can print Mpixel/s and the ratio to memcpy of the same frame.
#pragma once

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "tessarofx/CxImage.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

struct BenchSize {
  int width;
  int height;
  const char* label;
};

inline constexpr BenchSize kBenchSizes[] = {{1920, 1080, "1080p"}, {3840, 2160, "4K"}};

inline std::vector<uint8_t> RandomBgra(int width, int height, unsigned salt = 7) {
  std::vector<uint8_t> px(static_cast<size_t>(width) * height * 4);
  std::mt19937 rng(salt);
  for (auto& b : px) b = static_cast<uint8_t>(rng());
  return px;
}

// The in-run reference: copying the frame once.
inline void BM_Memcpy(benchmark::State& state, BenchSize size) {
  const size_t bytes = static_cast<size_t>(size.width) * size.height * 4;
  std::vector<uint8_t> a = RandomBgra(size.width, size.height), b(bytes);
  for (auto _ : state) {
    std::memcpy(b.data(), a.data(), bytes);
    benchmark::DoNotOptimize(b.data());
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// Registers a benchmark timed in milliseconds of real time, as every benchmark here is.
template <class... Args>
benchmark::internal::Benchmark* RegisterTimed(const std::string& name, Args&&... args) {
  return benchmark::RegisterBenchmark(name.c_str(), std::forward<Args>(args)...)
      ->Unit(benchmark::kMillisecond)
      ->UseRealTime();
}

inline void RegisterMemcpy(BenchSize size) {
  RegisterTimed(std::string("BM_Memcpy/") + size.label, BM_Memcpy, size);
}

using Params = std::vector<std::pair<std::wstring, double>>;

// The effect `guid` with double parameters, created the way a host creates it.
inline NLEComPtr<INLECGFilter> CreateEffect(const wchar_t* guid, const Params& params) {
  namespace Key = NLEKey::Filter;
  GetFilterCount();
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
  CreateFilterFromGUID(nullptr, guid, props, nullptr, reinterpret_cast<void**>(&filter));
  return filter;
}

// An effect with a random foreground wrapped as a host memory frame, and its destination.
struct EffectRun {
  NLEComPtr<INLECGFilter> filter;
  std::vector<uint8_t> input;
  NLEComPtr<INLEMemoryFrame> fg, dst;

  // False (and the benchmark skipped) when the filter or the frames cannot be made.
  bool Prepare(benchmark::State& state, BenchSize size, const wchar_t* guid, const Params& params) {
    filter = CreateEffect(guid, params);
    input = RandomBgra(size.width, size.height);
    NLECommon::CreateMemoryFrame(size.width, size.height, 0, &fg);
    NLECommon::CreateMemoryFrame(size.width, size.height, 0, &dst);
    if (!filter || !fg || !dst) {
      state.SkipWithError("cannot create the filter or frames");
      return false;
    }
    fg->Wrap(input.data(), size.width, size.height, size.width * 4, kNLEFrameTopDown);
    filter->SetForeground(fg);
    return true;
  }

  // One frame through Running; false (and the benchmark skipped) when it fails.
  bool Run(benchmark::State& state) {
    if (filter->Running(dst) != NLE_S_OK) {
      state.SkipWithError("Running failed");
      return false;
    }
    benchmark::ClobberMemory();
    return true;
  }
};

// The effect through Running, frame after frame with the same settings.
inline void BM_EffectRunning(benchmark::State& state, BenchSize size, const wchar_t* guid,
                             Params params) {
  EffectRun run;
  if (!run.Prepare(state, size, guid, params)) return;
  // Effects may prepare tables on their first frame; a host runs thousands after it.
  if (!run.Run(state)) return;
  for (auto _ : state) {
    if (!run.Run(state)) return;
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// Registers BM_<name>/<size>/<label> for every size and case, each beside memcpy of the frame.
inline void RegisterEffectCases(const char* name, const wchar_t* guid,
                                const std::vector<std::pair<const char*, Params>>& cases) {
  for (const BenchSize& size : kBenchSizes) {
    RegisterMemcpy(size);
    for (const auto& [label, params] : cases) {
      RegisterTimed(std::string("BM_") + name + "/" + size.label + "/" + label, BM_EffectRunning,
                    size, guid, params);
    }
  }
}

// An exported function on a frame-sized BGRA CxImage, in place; the frame is restored outside
// the timed part.
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
