// CubeLut::doLUT beside memcpy of the same frame, with a 33- and a 64-point lattice, on random
// pixels, which scatter the lattice reads as widely as any picture can, and on a photo-like
// frame, whose neighbouring pixels fall in the same or nearby cells; and the per-pixel reference
// rows on random pixels for comparison. With TFX_BENCH_CUBE naming a ".cube" file, doLUT with that
// file too. Every iteration starts again from the same frame.
#include <algorithm>
#include <cmath>
#include <cstdlib>
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

// Soft gradients in every channel, a few large blobs of colour and a little grain: what a camera
// frame looks like to a lattice, which sees only how far apart neighbouring colours are.
std::vector<uint8_t> PhotoBgra(int width, int height) {
  std::vector<uint8_t> px(static_cast<size_t>(width) * height * 4);
  std::mt19937 rng(11);
  uint8_t* p = px.data();
  for (int y = 0; y < height; ++y) {
    const double v = static_cast<double>(y) / height;
    for (int x = 0; x < width; ++x, p += 4) {
      const double u = static_cast<double>(x) / width;
      const double blob = std::exp(-40.0 * ((u - 0.3) * (u - 0.3) + (v - 0.6) * (v - 0.6)));
      const double sky = 1.0 - v;
      const double c[3] = {90 + 120 * sky * (1 - u) + 60 * blob + 20 * std::sin(9 * u + 4 * v),
                           70 + 80 * sky + 110 * blob * u + 25 * std::sin(13 * v),
                           50 + 170 * sky * sky + 30 * std::cos(7 * u - 5 * v)};
      for (int k = 0; k < 3; ++k) {
        const double grain = static_cast<double>(rng() % 7) - 3.0;
        p[2 - k] = static_cast<uint8_t>(std::clamp(c[k] + grain, 0.0, 255.0));
      }
      p[3] = 255;
    }
  }
  return px;
}

// Runs `apply` on a fresh copy of the frame each iteration; the copy is not timed.
template <class Apply>
void RunFrames(benchmark::State& state, BenchSize size, Apply apply, bool photo = false) {
  const std::vector<uint8_t> source =
      photo ? PhotoBgra(size.width, size.height) : RandomBgra(size.width, size.height);
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

void BM_DoLut(benchmark::State& state, BenchSize size, int n, bool photo) {
  const std::unique_ptr<CubeLut> lut = MakeLut(n);
  RunFrames(
      state, size,
      [&](uint8_t* frame) {
        if (lut->doLUT(frame, size.width, size.height, size.width * 4, 4) != 0) {
          state.SkipWithError("doLUT failed");
        }
      },
      photo);
}

// A ".cube" file read through loadFile, on random pixels: the peers script hands the same file
// to FFmpeg and OpenColorIO.
void BM_DoLutFile(benchmark::State& state, BenchSize size, std::string path) {
  auto lut = std::make_unique<CubeLut>();
  if (!lut->loadFile(std::wstring(path.begin(), path.end()).c_str())) {
    state.SkipWithError("cannot read the .cube file");
    return;
  }
  RunFrames(state, size,
            [&](uint8_t* frame) { lut->doLUT(frame, size.width, size.height, size.width * 4, 4); });
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
        RegisterTimed("BM_CubeLutDoLUT" + suffix + "/random", BM_DoLut, size, n, false);
        RegisterTimed("BM_CubeLutDoLUT" + suffix + "/photo", BM_DoLut, size, n, true);
        RegisterTimed("BM_CubeLutReference" + suffix, BM_ReferenceRows, size, n);
      }
      if (const char* path = std::getenv("TFX_BENCH_CUBE")) {
        RegisterTimed(std::string("BM_CubeLutDoLUT/") + size.label + "/file", BM_DoLutFile, size,
                      std::string(path));
      }
    }
  }
} registrar;

}  // namespace
