// CubeLut::doLUT on random BGRA frames beside memcpy of the same frame, with a 33- and a 64-point
// lattice, and the per-pixel reference rows for comparison. Random pixels scatter the lattice
// reads as widely as any picture can, and every iteration starts again from the same frame.
#include <cmath>
#include <memory>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "lut/CubeLutApply.h"
#include "tessarofx/CubeLut.h"

namespace {

// A look with some contrast and a little channel crosstalk, so that no corner is the identity.
std::unique_ptr<CubeLut> MakeLut(int n) {
  auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(n);
  float* lattice = lut->getLut3DData(nullptr, nullptr, nullptr, nullptr);
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k) {
        const float r = i / (n - 1.0f), g = j / (n - 1.0f), b = k / (n - 1.0f);
        float* p = lattice + ((i * 64 + j) * 64 + k) * 3;
        p[0] = 255.0f * std::pow(0.85f * r + 0.1f * g + 0.05f * b, 1.2f);
        p[1] = 255.0f * std::pow(0.1f * r + 0.8f * g + 0.1f * b, 0.9f);
        p[2] = 255.0f * std::pow(0.05f * r + 0.15f * g + 0.8f * b, 1.1f);
      }
    }
  }
  return lut;
}

// Runs `apply` on a fresh copy of the frame each iteration; the copy is not timed.
template <class Apply>
void RunFrames(benchmark::State& state, BenchSize size, Apply apply) {
  const std::vector<uint8_t> source = RandomBgra(size.width, size.height);
  std::vector<uint8_t> frame = source;
  for (auto _ : state) {
    state.PauseTiming();
    std::memcpy(frame.data(), source.data(), source.size());
    state.ResumeTiming();
    apply(frame.data());
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

void BM_DoLut(benchmark::State& state, BenchSize size, int n) {
  const std::unique_ptr<CubeLut> lut = MakeLut(n);
  RunFrames(state, size, [&](uint8_t* frame) {
    if (lut->doLUT(frame, size.width, size.height, size.width * 4, 4) != 0) {
      state.SkipWithError("doLUT failed");
    }
  });
}

void BM_ReferenceRows(benchmark::State& state, BenchSize size, int n) {
  const std::unique_ptr<CubeLut> lut = MakeLut(n);
  const tfx::TetraTable table{lut->getLut3DData(nullptr, nullptr, nullptr, nullptr),
                              lut->getFTData(nullptr), lut->getGTData(nullptr), n};
  RunFrames(state, size, [&](uint8_t* frame) {
    for (int y = 0; y < size.height; ++y) {
      tfx::TetraRowReference(table, frame + static_cast<size_t>(y) * size.width * 4, size.width, 4);
    }
  });
}

const struct Registrar {
  Registrar() {
    for (const BenchSize& size : kBenchSizes) {
      RegisterMemcpy(size);
      for (const int n : {33, 64}) {
        const std::string suffix = std::string("/") + size.label + "/" + std::to_string(n);
        RegisterTimed("BM_CubeLutDoLUT" + suffix, BM_DoLut, size, n);
        RegisterTimed("BM_CubeLutReference" + suffix, BM_ReferenceRows, size, n);
      }
    }
  }
} registrar;

}  // namespace
