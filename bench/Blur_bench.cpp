// The blur family on random frames beside memcpy of the same frame, with OpenCV's nearest
// functions as peers. Everything runs on one thread: the library owns none, and OpenCV is held to
// one with cv::setNumThreads(1) so the comparison is fair. The blurs work in place and their cost
// does not depend on the pixel values, so each iteration blurs the previous one's output; the
// window filters read a fixed plane. Radius 3 and 50 of the window and box filters show that
// their cost does not grow with the radius.
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>
#include <string>
#include <utility>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/Blur.h"

namespace {

void Finish(benchmark::State& state, BenchSize size) {
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
}

std::vector<uint8_t> RandomPlane(BenchSize size, int channels) {
  std::vector<uint8_t> px = RandomBgra(size.width, size.height);
  px.resize(static_cast<size_t>(size.width) * size.height * channels);
  return px;
}

void BM_GaussianBlur(benchmark::State& state, BenchSize size, int radius) {
  std::vector<uint8_t> frame = RandomBgra(size.width, size.height);
  for (auto _ : state) {
    gaussianBlur(frame.data(), size.width, size.height, 4, radius);
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

// sigma 5 with the kernel size OpenCV derives from it (31 taps for 8-bit data).
void BM_CvGaussianBlur(benchmark::State& state, BenchSize size, double sigma) {
  cv::setNumThreads(1);
  std::vector<uint8_t> frame = RandomBgra(size.width, size.height);
  cv::Mat mat(size.height, size.width, CV_8UC4, frame.data());
  for (auto _ : state) {
    cv::GaussianBlur(mat, mat, cv::Size(), sigma);
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

void BM_FastAverageBlur(benchmark::State& state, BenchSize size, int channels, int radius) {
  std::vector<uint8_t> frame = RandomPlane(size, channels);
  for (auto _ : state) {
    fastAverageBlur(frame.data(), size.width, size.height, channels, radius);
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

void BM_CvBlur(benchmark::State& state, BenchSize size, int channels, int radius) {
  cv::setNumThreads(1);
  std::vector<uint8_t> frame = RandomPlane(size, channels);
  cv::Mat mat(size.height, size.width, CV_8UC(channels), frame.data());
  for (auto _ : state) {
    // Edge pixels repeated, as fastAverageBlur repeats them.
    cv::blur(mat, mat, cv::Size(2 * radius + 1, 2 * radius + 1), cv::Point(-1, -1),
             cv::BORDER_REPLICATE);
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

enum class Window { kMean, kVariance, kMedian };

void BM_Window(benchmark::State& state, BenchSize size, Window window, int radius) {
  const std::vector<uint8_t> src = RandomPlane(size, 1);
  std::vector<uint8_t> dst(src.size());
  for (auto _ : state) {
    switch (window) {
      case Window::kMean:
        fastWindowAverageFilter(src.data(), dst.data(), size.width, size.height, radius);
        break;
      case Window::kVariance:
        fastWindowVarianceFilter(src.data(), dst.data(), size.width, size.height, radius);
        break;
      case Window::kMedian:
        fastFilter(src.data(), dst.data(), size.width, size.height, radius, 0.5f);
        break;
    }
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

void BM_CvMedianBlur(benchmark::State& state, BenchSize size, int radius) {
  cv::setNumThreads(1);
  const std::vector<uint8_t> src = RandomPlane(size, 1);
  std::vector<uint8_t> dst(src.size());
  const cv::Mat in(size.height, size.width, CV_8UC1, const_cast<uint8_t*>(src.data()));
  cv::Mat out(size.height, size.width, CV_8UC1, dst.data());
  for (auto _ : state) {
    cv::medianBlur(in, out, 2 * radius + 1);
    benchmark::ClobberMemory();
  }
  Finish(state, size);
}

const int kRegistered = [] {
  const std::pair<const char*, Window> windows[] = {
      {"BM_FastWindowAverageFilter", Window::kMean},
      {"BM_FastWindowVarianceFilter", Window::kVariance},
      {"BM_FastFilter", Window::kMedian}};
  for (const BenchSize& size : kBenchSizes) {
    const std::string s = std::string("/") + size.label;
    RegisterMemcpy(size);
    RegisterTimed("BM_GaussianBlur" + s + "/bgra/r10", BM_GaussianBlur, size, 10);
    RegisterTimed("BM_CvGaussianBlur" + s + "/bgra/sigma5", BM_CvGaussianBlur, size, 5.0);
    for (const int radius : {3, 7, 50}) {
      const std::string r = "/r" + std::to_string(radius);
      RegisterTimed("BM_FastAverageBlur" + s + "/bgr" + r, BM_FastAverageBlur, size, 3, radius);
      if (radius == 7) RegisterTimed("BM_CvBlur" + s + "/bgr" + r, BM_CvBlur, size, 3, radius);
    }
    for (const auto& [name, window] : windows) {
      for (const int radius : {3, 7, 50}) {
        RegisterTimed(name + s + "/r" + std::to_string(radius), BM_Window, size, window, radius);
      }
    }
    for (const int radius : {3, 7}) {
      RegisterTimed("BM_CvMedianBlur" + s + "/r" + std::to_string(radius), BM_CvMedianBlur, size,
                    radius);
    }
  }
  return 0;
}();

}  // namespace
