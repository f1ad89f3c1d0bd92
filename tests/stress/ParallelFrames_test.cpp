// Frame-parallel work as a host and a batch tool do it: every filter and a spread of the
// enhancement functions, each job with its own filter object, settings and frame size, run on
// several threads at once in different orders. Every result must equal the same job run alone.
// The library's process-wide caches (lens maps, the hue matrix, the lattice instance, dispatch
// tables) are shared by all of them; ThreadSanitizer runs this test in CI.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "support/EffectHarness.h"
#include "support/ImageBuilders.h"
#include "support/TempDir.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Compositing.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/WhiteBalance.h"

namespace {

using tfx_test::EffectParams;
using Bytes = std::vector<uint8_t>;

struct Job {
  std::string name;
  std::function<Bytes()> run;
};

// Frames through one filter object; between frames one parameter changes, as a host's keyframes
// change it.
Bytes RunFilter(const wchar_t* guid, EffectParams params, int width, int height, int padding,
                const wchar_t* animated, std::vector<double> values, bool mask) {
  if (values.empty()) values.push_back(0);
  if (animated) params.push_back({animated, values[0]});
  NLEComPtr<INLECGFilter> filter = tfx_test::CreateEffect(guid, tfx_test::Settings(params).get());
  Bytes out;
  if (!filter) return out;
  for (size_t frame = 0; frame < values.size(); ++frame) {
    if (animated) tfx_test::SetParam(filter.get(), animated, values[frame]);
    TestFrame* fg = new TestFrame(width, height, width * 4 + padding);
    TestFrame* bg = mask ? new TestFrame(width, height) : nullptr;
    tfx_test::FillRandom(fg, static_cast<unsigned>(frame * 31 + width));
    if (bg) tfx_test::FillRandom(bg, static_cast<unsigned>(frame + height));
    const Bytes dst = tfx_test::RunFrame(
        filter.get(), fg, new TestFrame(width, height, width * 4 + padding, false, 7), bg);
    out.insert(out.end(), dst.begin(), dst.end());
  }
  return out;
}

// A function on a 32-bit BGRA image of its own.
Bytes RunOnImage(int width, int height, uint32_t salt, const std::function<void(CxImage*)>& fn) {
  const tfx_test::Image image =
      tfx_test::NoiseImage(static_cast<unsigned>(width), static_cast<unsigned>(height), 32,
                           IPF_BGRA, static_cast<unsigned>(width) * 4, salt);
  fn(image.get());
  return Bytes(image->GetBits(), image->GetBits() + image->GetSize());
}

Bytes RunOnBuffer(size_t bytes, uint32_t salt, const std::function<void(uint8_t*)>& fn) {
  Bytes buffer = tfx_test::NoiseBytes(bytes, salt);
  fn(buffer.data());
  return buffer;
}

std::vector<Job> Jobs(const std::wstring& cube) {
  std::vector<Job> jobs;
  const auto filter = [&](const char* name, const wchar_t* guid, EffectParams params, int w, int h,
                          int padding, const wchar_t* animated = nullptr,
                          std::vector<double> values = {}, bool mask = false) {
    jobs.push_back(
        {name, [=] { return RunFilter(guid, params, w, h, padding, animated, values, mask); }});
  };
  filter("ColorAdjust a", tfx_test::kColorAdjust,
         {{L"u_exposure", 20}, {L"u_brightness", -30}, {L"u_contrast", 40}, {L"u_vib", 50}}, 33, 17,
         0, L"u_sat", {-20, 35});
  filter("ColorAdjust b", tfx_test::kColorAdjust, {{L"u_contrast", -60}, {L"u_vib", -40}}, 48, 9,
         12);
  filter("LightAdjust", tfx_test::kLight,
         {{L"u_highLight", -40}, {L"u_shadow", 50}, {L"u_blackLevel", -20}}, 29, 13, 4,
         L"u_whiteLevel", {20, -30});
  filter("WhiteBalanceAdjust", tfx_test::kWhiteBalance, {{L"u_tint", 10}}, 40, 11, 0,
         L"u_temperature", {40, -60});
  filter("VignetteAdjust", tfx_test::kVignette,
         {{L"size", 80}, {L"roundness", 20}, {L"feather", 40}, {L"highlights", 30}}, 37, 21, 8,
         L"amount", {-50, 70});
  filter("HSLAdjust", tfx_test::kHsl,
         {{L"u_red_hue", 30}, {L"u_green_sat", -40}, {L"u_blue_light", 25}}, 31, 15, 0,
         L"u_orange_width", {10, 60});
  // Lens strengths change every frame and differ between jobs, so the shared map cache is built,
  // evicted and read from several threads at once.
  filter("DistortionFringingAdjust a", tfx_test::kLens, {{L"fringing", 40}}, 45, 19, 0,
         L"distortion", {30, -20, 30.5});
  filter("DistortionFringingAdjust b", tfx_test::kLens, {{L"distortion", -10}}, 38, 22, 4,
         L"fringing", {-50, 10.5, 75});
  filter("ChromeKeyLut3d mask", tfx_test::kChromeKey,
         {{L"red", 40}, {L"green", 200}, {L"blue", 60}, {L"contrast", 50}}, 26, 14, 0, L"offset",
         {0, 20});
  filter("ChromeKeyLut3d colours", tfx_test::kChromeKey,
         {{L"red", 200}, {L"green", 30}, {L"blue", 90}, {L"mode", 1}}, 30, 10, 4, L"contrast",
         {50, 80});
  filter("ChromeKeyCombine", tfx_test::kCombine, {}, 27, 12, 0, nullptr, {}, true);
  filter("lutAToWhiteEffect", tfx_test::kAToWhite, {}, 24, 16, 8);
  jobs.push_back({"Lut", [cube] {
                    NLEComPtr<INLECGFilter> f = tfx_test::CreateEffect(
                        tfx_test::kLut, tfx_test::TextSettings(L"lut3dPath", cube).get());
                    return tfx_test::RunFrame(
                        f.get(), new TestFrame(35, 18, tfx_test::NoiseBytes(35 * 18 * 4, 5)),
                        new TestFrame(35, 18));
                  }});

  const auto image = [&](const char* name, int w, int h, std::function<void(CxImage*)> fn) {
    jobs.push_back({name, [=] { return RunOnImage(w, h, static_cast<uint32_t>(w * h), fn); }});
  };
  // Two angles at once: each call keeps its own matrix, and the published one stays whole.
  image("hueAdjustment a", 41, 9, [](CxImage* i) { hueAdjustment(i, 40.0f); });
  image("hueAdjustment b", 23, 17, [](CxImage* i) { hueAdjustment(i, -70.0f); });
  image("temperatureAdjustment", 25, 19, [](CxImage* i) { temperatureAdjustment(i, 3500); });
  image("deNoiseRGB", 40, 24, [](CxImage* i) { deNoiseRGB(i, 30.0f); });
  image("deNoiseLumiance", 24, 40, [](CxImage* i) { deNoiseLumiance(i, 50.0f); });
  image("dehaze", 36, 20, [](CxImage* i) { dehaze(i, 40.0f); });
  image("sharpen", 30, 12, [](CxImage* i) { sharpen(i, 60.0f); });
  image("clarity", 28, 28, [](CxImage* i) { clarity(i, -30.0f); });
  image("diffuse", 33, 21, [](CxImage* i) { diffuse(i, 120.0f); });
  image("addNoiseFilter", 27, 13, [](CxImage* i) { addNoiseFilter(i, 30.0f, 0.5f); });
  // The lens and HSL image forms run in their filters' jobs. Releasing the lens maps while other
  // threads build and read them:
  image("distortFilter and releaseLensVariables", 31, 17, [](CxImage* i) {
    distortFilter(i, -15.0f);
    releaseLensVariables();
  });

  const auto buffer = [&](const char* name, size_t bytes, std::function<void(uint8_t*)> fn) {
    jobs.push_back({name, [=] { return RunOnBuffer(bytes, static_cast<uint32_t>(bytes), fn); }});
  };
  buffer("gaussianBlur", 36 * 20 * 4, [](uint8_t* p) { gaussianBlur(p, 36, 20, 4, 5); });
  buffer("fastAverageBlur", 30 * 25 * 3, [](uint8_t* p) { fastAverageBlur(p, 30, 25, 3, 4); });
  buffer("window filters", 2 * 40 * 30, [](uint8_t* p) {
    fastWindowVarianceFilter(p, p + 1200, 40, 30, 3);
    fastFilter(p + 1200, p, 40, 30, 2, 0.5f);
  });
  buffer("dct_Denosing", 2 * 32 * 24, [](uint8_t* p) { dct_Denosing(p, p + 768, 32, 24, 32, 20); });
  buffer("blurImage and makeImageFrame", 20 * 14 * 4, [](uint8_t* p) {
    unsigned char* out = nullptr;
    int w = 0, h = 0;
    blurImage(&out, &w, &h, p, 20, 14, 32, 3);
    makeImageFrame(&out, &w, &h, p, 20, 14, 80, 32, PIPNLERGB{200, 150, 40, 255}, 4);
    std::copy(out, out + 20 * 14 * 4, p);
    delete[] out;
  });
  return jobs;
}

TEST(ParallelFrames, EveryJobOnFourThreadsGivesItsSerialBytes) {
  const tfx_test::TempDir dir;
  const std::string cube = dir.Write("grade.cube", tfx_test::CubeText(3, "", 0.8, 0.1, true));
  const std::vector<Job> jobs = Jobs(std::wstring(cube.begin(), cube.end()));
  std::vector<Bytes> serial;
  for (const Job& job : jobs) {
    serial.push_back(job.run());
    ASSERT_FALSE(serial.back().empty()) << job.name;
  }

  constexpr int kThreads = 4, kRounds = 2;
  std::vector<std::vector<std::string>> wrong(kThreads);
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([&, t] {
      // Each thread starts at another job and walks the list in its own direction, so different
      // jobs meet in every round.
      const size_t n = jobs.size();
      for (int round = 0; round < kRounds; ++round) {
        for (size_t k = 0; k < n; ++k) {
          const size_t i = t % 2 ? (t * 7 + k) % n : (n - 1 - (t * 5 + k) % n);
          if (jobs[i].run() != serial[i]) wrong[t].push_back(jobs[i].name);
        }
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  for (int t = 0; t < kThreads; ++t) EXPECT_EQ(wrong[t], std::vector<std::string>{}) << t;
  // The hue matrix published to hosts is the whole matrix of one of the angles, never a mix.
  float published[9], whole[2][9];
  std::copy(matrix, matrix + 9, published);
  for (int i = 0; i < 2; ++i) {
    calculateHueMartrix(i ? -70.0f : 40.0f);
    std::copy(matrix, matrix + 9, whole[i]);
  }
  EXPECT_TRUE(std::equal(published, published + 9, whole[0]) ||
              std::equal(published, published + 9, whole[1]));
  releaseLensVariables();
}

}  // namespace
