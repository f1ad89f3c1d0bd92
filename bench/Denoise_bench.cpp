// The denoisers beside memcpy of the same frame (4 bytes a pixel): dct_Denosing on one 8-bit
// plane; the straightforward form that runs a full 2-D transform per block position (what a
// sliding 8 x 8 DCT denoiser with full overlap does when it shares nothing between blocks);
// deNoiseRGB and deNoiseLumiance on BGRA frames; channelDenoise on a plane. Everything runs on
// one thread. Random pixels cost the same as any picture: no step depends on the values.
#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"

namespace {

constexpr float kSigma = 15.0f;

std::vector<uint8_t> RandomPlane(BenchSize size) {
  std::vector<uint8_t> bgra = RandomBgra(size.width, size.height);
  bgra.resize(static_cast<size_t>(size.width) * size.height);
  return bgra;
}

// ---- The straightforward form: a full separable 2-D transform per block ----------------------

constexpr float kC1 = 0.4903926f, kC2 = 0.4619398f, kC3 = 0.4157348f, kC4 = 0.3535534f;
constexpr float kC5 = 0.2777851f, kC6 = 0.1913417f, kC7 = 0.0975452f;

// The 8-point DCT-II (or DCT-III) down each column of a row-major block, by the usual even/odd
// butterfly; the loops over the 8 columns are left for the compiler to vectorise.
void Columns(float* b, bool inverse) {
  float* r[8];
  for (int i = 0; i < 8; ++i) r[i] = b + 8 * i;
  float out[8][8];
  for (int c = 0; c < 8; ++c) {
    if (!inverse) {
      const float s07 = r[0][c] + r[7][c], s16 = r[1][c] + r[6][c];
      const float s25 = r[2][c] + r[5][c], s34 = r[3][c] + r[4][c];
      const float d07 = r[0][c] - r[7][c], d16 = r[1][c] - r[6][c];
      const float d25 = r[2][c] - r[5][c], d34 = r[3][c] - r[4][c];
      const float e0 = s07 + s34, e1 = s16 + s25, e2 = s07 - s34, e3 = s16 - s25;
      out[0][c] = kC4 * (e0 + e1);
      out[4][c] = kC4 * (e0 - e1);
      out[2][c] = kC2 * e2 + kC6 * e3;
      out[6][c] = kC6 * e2 - kC2 * e3;
      out[1][c] = kC1 * d07 + kC3 * d16 + kC5 * d25 + kC7 * d34;
      out[3][c] = kC3 * d07 - kC7 * d16 - kC1 * d25 - kC5 * d34;
      out[5][c] = kC5 * d07 - kC1 * d16 + kC7 * d25 + kC3 * d34;
      out[7][c] = kC7 * d07 - kC5 * d16 + kC3 * d25 - kC1 * d34;
    } else {
      const float p0 = kC4 * (r[0][c] + r[4][c]), p1 = kC4 * (r[0][c] - r[4][c]);
      const float q0 = kC2 * r[2][c] + kC6 * r[6][c], q1 = kC6 * r[2][c] - kC2 * r[6][c];
      const float e[4] = {p0 + q0, p1 + q1, p1 - q1, p0 - q0};
      const float o[4] = {kC1 * r[1][c] + kC3 * r[3][c] + kC5 * r[5][c] + kC7 * r[7][c],
                          kC3 * r[1][c] - kC7 * r[3][c] - kC1 * r[5][c] - kC5 * r[7][c],
                          kC5 * r[1][c] - kC1 * r[3][c] + kC7 * r[5][c] + kC3 * r[7][c],
                          kC7 * r[1][c] - kC5 * r[3][c] + kC3 * r[5][c] - kC1 * r[7][c]};
      for (int n = 0; n < 4; ++n) {
        out[n][c] = e[n] + o[n];
        out[7 - n][c] = e[n] - o[n];
      }
    }
  }
  std::memcpy(b, out, sizeof(out));
}

void Transpose(float* b) {
  for (int i = 0; i < 8; ++i) {
    for (int j = i + 1; j < 8; ++j) std::swap(b[8 * i + j], b[8 * j + i]);
  }
}

void FullBlocks(const uint8_t* src, uint8_t* dst, int width, int height, float sigma,
                std::vector<float>& sum, std::vector<float>& weight) {
  const float threshold = 3.0f * sigma;
  std::fill(sum.begin(), sum.end(), 0.0f);
  std::fill(weight.begin(), weight.end(), 0.0f);
  for (int y = 0; y + 8 < height; ++y) {
    for (int x = 0; x + 8 < width; ++x) {
      // Rows, then columns; back in the reverse order.
      float block[64];
      for (int i = 0; i < 8; ++i) {
        for (int j = 0; j < 8; ++j) block[8 * j + i] = src[(y + i) * width + x + j];
      }
      Columns(block, false);
      Transpose(block);
      Columns(block, false);
      for (float& v : block) v = std::abs(v) < threshold ? 0.0f : v;
      Columns(block, true);
      Transpose(block);
      Columns(block, true);
      for (int i = 0; i < 8; ++i) {
        for (int j = 0; j < 8; ++j) {
          const size_t at = static_cast<size_t>(y + i) * width + x + j;
          sum[at] += block[8 * j + i];
          weight[at] += 1.0f;
        }
      }
    }
  }
  for (int y = 0; y < height; ++y) {
    for (int x = 0; x < width; ++x) {
      const size_t at = static_cast<size_t>(y) * width + x;
      dst[at] = y < height - 8 && x < width - 8
                    ? static_cast<uint8_t>(std::clamp(sum[at] / weight[at], 0.0f, 255.0f))
                    : src[at];
    }
  }
}

void BM_FullBlocks(benchmark::State& state, BenchSize size) {
  const std::vector<uint8_t> src = RandomPlane(size);
  std::vector<uint8_t> dst(src.size());
  std::vector<float> sum(src.size()), weight(src.size());
  for (auto _ : state) {
    FullBlocks(src.data(), dst.data(), size.width, size.height, kSigma, sum, weight);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

void BM_DctDenoise(benchmark::State& state, BenchSize size) {
  const std::vector<uint8_t> src = RandomPlane(size);
  std::vector<uint8_t> dst(src.size());
  for (auto _ : state) {
    dct_Denosing(src.data(), dst.data(), size.width, size.height, size.width, kSigma);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// The plane is restored before every call (untimed): the filter works in place.
void BM_ChannelDenoise(benchmark::State& state, BenchSize size) {
  const std::vector<uint8_t> source = RandomPlane(size);
  std::vector<uint8_t> plane = source;
  for (auto _ : state) {
    state.PauseTiming();
    std::copy(source.begin(), source.end(), plane.begin());
    state.ResumeTiming();
    channelDenoise(plane.data(), size.width, size.height, 5, 20.0f);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

// A frame wrapped as an effect wraps it, restored before every call (untimed).
void BM_DenoiseImage(benchmark::State& state, BenchSize size,
                     CxImage* (*denoise)(CxImage*, float)) {
  const std::vector<uint8_t> source = RandomBgra(size.width, size.height);
  std::vector<uint8_t> frame = source;
  uint8_t* bits = frame.data();
  CxImage image(&bits, size.width, size.height, 32, size.width * 4, IPF_BGRA);
  for (auto _ : state) {
    state.PauseTiming();
    std::copy(source.begin(), source.end(), frame.begin());
    state.ResumeTiming();
    denoise(&image, 100.0f);
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

const struct Registrar {
  Registrar() {
    for (const BenchSize& size : kBenchSizes) {
      const std::string suffix = std::string("/") + size.label;
      RegisterMemcpy(size);
      RegisterTimed("BM_DctDenosing" + suffix, BM_DctDenoise, size);
      if (size.height == 1080) RegisterTimed("BM_DctFullBlocks" + suffix, BM_FullBlocks, size);
      RegisterTimed("BM_ChannelDenoise" + suffix, BM_ChannelDenoise, size);
      RegisterTimed("BM_DeNoiseRGB" + suffix, BM_DenoiseImage, size, &deNoiseRGB);
      RegisterTimed("BM_DeNoiseLumiance" + suffix, BM_DenoiseImage, size, &deNoiseLumiance);
    }
  }
} registrar;

}  // namespace
