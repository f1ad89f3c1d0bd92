// Filters run one after another on a frame, as an editor stacks effects on a clip: each step's
// result is the next step's input. The steps are settled once; every chain made from them owns
// its filter objects and keeps them from frame to frame, so a frame costs the filters' work and
// little else, and a worker thread needs nothing but a chain of its own.
#pragma once

#include <memory>
#include <opencv2/core.hpp>
#include <vector>

#include "Status.h"
#include "plugin/FilterHost.h"

namespace tfxtool {

// One filter of a chain with the settings given to it.
struct ChainStep {
  ResolvedFilter filter;
  std::vector<ParamSetting> settings;
};

class FilterChain {
 public:
  FilterChain() = default;
  FilterChain(FilterChain&&) = default;
  FilterChain& operator=(FilterChain&&) = default;

  // Creates each step's filter (its CPU class) with its settings applied; a setting that does not
  // fit its filter is refused here, before any frame. Creating is cheap next to a frame, so N
  // threads make N chains from the same steps.
  // With `device`, steps whose filter has an OpenCL class run it on that device (each uploads its
  // input and downloads its result), the others on the CPU; the device must outlive the chain.
  static Status Create(const PluginLibrary& plugin, std::vector<ChainStep> steps,
                       FilterChain* chain, const OpenCLTarget* device = nullptr);

  // Runs one 8-bit BGRA frame through every step into `bgraOut` (same size; it may be `bgraIn`).
  // `background` is the frame under the first step (ChromeKeyCombine's key mask), by default the
  // input itself; later steps lie over their own input. Not for two threads at once.
  Status Run(const cv::Mat& bgraIn, cv::Mat* bgraOut, const cv::Mat* background = nullptr);

  // The position in the clip the filters are told about, for filters that change over time;
  // until set, every frame is frame 0 of 1.
  void SetFrameTime(int32_t current, int32_t total);

  // Whether the result can hold transparent pixels that matter: true once a keyer has run
  // (ChromeKeyLut3d in either mode, or ChromeKeyCombine), false again after lutAToWhiteEffect
  // fills the holes; the other filters keep what came in, `inputAlpha`.
  bool CarriesAlpha(bool inputAlpha = false) const;

  const std::vector<ChainStep>& steps() const { return steps_; }
  // How many steps run on a device.
  size_t DeviceSteps() const;

 private:
  std::vector<ChainStep> steps_;
  std::vector<NLEComPtr<INLECGFilter>> filters_;            // null for a step on the device
  std::vector<std::unique_ptr<OpenCLFilterRun>> onDevice_;  // null for a step on the CPU
  std::vector<cv::Mat> scratch_;                            // the results of all steps but the last
  cv::Size prepared_;  // the frame size the filters were prepared for, empty before the first
  int32_t current_ = 0;
  int32_t total_ = 1;
};

}  // namespace tfxtool
