// Frame sizes and helpers shared by the benchmarks. Every benchmark reports pixels processed
// (items) so the summary can print Mpixel/s and the ratio to memcpy of the same frame.
#pragma once

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

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
