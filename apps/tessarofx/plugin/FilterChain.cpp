#include "plugin/FilterChain.h"

#include "media/Text.h"

namespace tfxtool {
namespace {

bool Is(const ChainStep& step, const FilterInfo& filter) {
  return EqualsNoCase(step.filter.guid, filter.guid);
}

}  // namespace

Status FilterChain::Create(const PluginLibrary& plugin, std::vector<ChainStep> steps,
                           FilterChain* chain, const OpenCLTarget* device) {
  FilterChain made;
  for (const ChainStep& step : steps) {
    NLEComPtr<INLECGFilter> fx;
    std::unique_ptr<OpenCLFilterRun> run;
    if (device && step.filter.opencl) {
      run = std::make_unique<OpenCLFilterRun>();
      if (Status s =
              OpenCLFilterRun::Create(plugin, step.filter, step.settings, *device, run.get());
          !s.ok()) {
        return s;
      }
    } else if (Status s = CreateFilter(plugin, step.filter, step.settings, nullptr, fx); !s.ok()) {
      return s;
    }
    made.filters_.push_back(fx);
    made.onDevice_.push_back(std::move(run));
  }
  made.steps_ = std::move(steps);
  *chain = std::move(made);
  return Status::Ok();
}

size_t FilterChain::DeviceSteps() const {
  size_t count = 0;
  for (const auto& run : onDevice_) count += run ? 1 : 0;
  return count;
}

void FilterChain::SetFrameTime(int32_t current, int32_t total) {
  current_ = current;
  total_ = total;
}

Status FilterChain::Run(const cv::Mat& bgraIn, cv::Mat* bgraOut, const cv::Mat* background) {
  if (bgraIn.empty() || bgraIn.type() != CV_8UC4) {
    return Status::Error("filters run on 8-bit BGRA frames");
  }
  const cv::Size size = bgraIn.size();
  if (background && background->size() != size) {
    return Status::Error("the background must have the frame's size");
  }
  // Filters are prepared for a run of frames of one size, as an editor prepares them when
  // playback starts; a new size starts a new run.
  const bool prepare = size != prepared_;
  prepared_ = cv::Size();
  cv::Mat input = bgraIn;
  cv::Mat under = background ? *background : bgraIn;
  // Every filter writes every pixel of its destination, so none is cleared. The steps between
  // keep their frames from call to call; the last one's is new, since the caller keeps it.
  scratch_.resize(filters_.empty() ? 0 : filters_.size() - 1);
  for (size_t i = 0; i < filters_.size(); ++i) {
    cv::Mat dst;
    if (onDevice_[i]) {
      // A new matrix for the download.
      if (Status s = onDevice_[i]->Run(input, &dst); !s.ok()) return s;
      input = under = dst;
      continue;
    }
    if (i + 1 < filters_.size()) {
      scratch_[i].create(size, CV_8UC4);
      dst = scratch_[i];
    } else {
      dst.create(size, CV_8UC4);
    }
    const HRESULT hr =
        RunFilterFrame(filters_[i].get(), input, under, dst, current_, total_, prepare);
    if (NLE_FAILED(hr)) {
      return Status::Error(steps_[i].filter.name + " failed: " + DescribeResult(hr), hr);
    }
    input = under = dst;
  }
  prepared_ = size;
  *bgraOut = filters_.empty() ? bgraIn.clone() : input;
  return Status::Ok();
}

bool FilterChain::CarriesAlpha(bool inputAlpha) const {
  namespace catalog = tfx::catalog;
  bool alpha = inputAlpha;
  for (const ChainStep& step : steps_) {
    if (Is(step, catalog::kChromeKey) || Is(step, catalog::kChromeKeyCombine)) alpha = true;
    if (Is(step, catalog::kAToWhite)) alpha = false;
  }
  return alpha;
}

}  // namespace tfxtool
