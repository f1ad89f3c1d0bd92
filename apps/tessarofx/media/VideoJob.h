// A video run: frames decoded on a thread of their own, transformed by N workers each with its
// own filter objects, written in order by the calling thread into a file that only appears at
// the target once complete. The same for every command that works on clips (apply, key, demo).
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <opencv2/core.hpp>
#include <string>

#include "Status.h"
#include "media/Reporter.h"

namespace tfxtool {

// One worker's state: its own chain of filter objects, used by its thread alone.
class FrameWorker {
 public:
  virtual ~FrameWorker() = default;
  // Rewrites `bgra` (the input frame, 8-bit BGRA) into the result. `background` is the matching
  // frame of the job's background, or null. `index` counts frames from 0; `total` is the
  // input's frame count as far as it is known (at least index + 1).
  virtual Status Process(cv::Mat& bgra, const cv::Mat* background, int64_t index,
                         int64_t total) = 0;
};

struct VideoJob {
  std::string input;
  std::string output;
  // Read beside the input, frame for frame: a clip (its last frame holds once it ends) or a
  // still image, scaled to the input's size. Empty: none.
  std::string background;
  std::string codec;    // empty: chosen by the output's container
  std::string quality;  // empty: the codec's visually lossless default
  // Whether the results carry alpha worth keeping (a keyed clip), given whether the input has
  // any: the output must then hold it. Unset: no alpha.
  std::function<bool(bool inputHasAlpha)> alpha;
  int threads = 1;
  bool timings = false;  // report where the wall time went
  // Called once per worker, on the calling thread, before any frame.
  std::function<Status(std::unique_ptr<FrameWorker>*)> makeWorker;
};

// Runs the job to the end of the input. A damaged input is processed as far as it decodes; the
// output is then complete for what was read and the result is Status::Incomplete, naming the
// frames lost. Ctrl-C stops the run and removes everything it wrote.
Status RunVideoJob(const VideoJob& job, Reporter& reporter);

// Whether a path names a still picture the image path handles (by its extension, and without a
// "%d" sequence pattern); everything else is read and written as video.
bool IsStillImagePath(const std::string& path);

}  // namespace tfxtool
