#include "media/VideoJob.h"

#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <mutex>
#include <opencv2/imgproc.hpp>
#include <thread>
#include <vector>

#include "Video.h"
#include "media/FramePipeline.h"

namespace tfxtool {
namespace {

// Ctrl-C: the first asks the run to stop (it removes its temporary file on the way out); a
// second, for a run that does not stop at once, removes the files itself and leaves.
std::atomic<bool> gCancel{false};

extern "C" void OnInterrupt(int) {
  if (gCancel.exchange(true)) {
    media::VideoWriter::RemoveTemporaryFiles();
    _exit(130);
  }
}

class InterruptGuard {
 public:
  InterruptGuard() {
    gCancel = false;
    struct sigaction action {};
    action.sa_handler = OnInterrupt;
    sigemptyset(&action.sa_mask);
    sigaction(SIGINT, &action, &oldInt_);
    sigaction(SIGTERM, &action, &oldTerm_);
  }
  ~InterruptGuard() {
    sigaction(SIGINT, &oldInt_, nullptr);
    sigaction(SIGTERM, &oldTerm_, nullptr);
  }
  InterruptGuard(const InterruptGuard&) = delete;
  InterruptGuard& operator=(const InterruptGuard&) = delete;

 private:
  struct sigaction oldInt_ {};
  struct sigaction oldTerm_ {};
};

Status FromMedia(const media::Status& s) {
  return s.ok() ? Status::Ok() : Status::Error(s.message());
}

struct Frame {
  media::VideoFrame video;
  cv::Mat background;
};

// Seconds spent in one part of the run, added up from whichever threads do that part.
class Stopwatch {
 public:
  using Clock = std::chrono::steady_clock;
  void Add(Clock::time_point since) {
    const auto ns =
        std::chrono::duration_cast<std::chrono::nanoseconds>(Clock::now() - since).count();
    total_ += ns;
  }
  double Seconds() const { return static_cast<double>(total_.load()) / 1e9; }

 private:
  std::atomic<int64_t> total_{0};
};

// The background frame for each input frame: a still image once, a clip frame by frame (its
// last frame standing in once it ends).
class BackgroundSource {
 public:
  Status Open(const std::string& path, cv::Size size) {
    size_ = size;
    if (path.empty()) return Status::Ok();
    open_ = true;
    if (Status s = FromMedia(reader_.Open(path)); !s.ok()) return s;
    return Next();
  }
  bool active() const { return open_; }
  // The frame for the next input frame.
  Status Take(cv::Mat* out) {
    *out = current_;
    if (!ended_) return Next();
    return Status::Ok();
  }

 private:
  Status Next() {
    media::VideoFrame frame;
    bool got = false;
    if (Status s = FromMedia(reader_.Read(frame, &got)); !s.ok()) return s;
    if (!got) {
      ended_ = true;
      if (current_.empty()) return Status::Error(reader_.path() + " holds no picture");
      return Status::Ok();
    }
    if (frame.bgra.size() != size_) {
      cv::resize(frame.bgra, current_, size_, 0, 0, cv::INTER_AREA);
    } else {
      current_ = frame.bgra;
    }
    return Status::Ok();
  }

  media::VideoReader reader_;
  cv::Size size_;
  cv::Mat current_;
  bool open_ = false;
  bool ended_ = false;
};

}  // namespace

namespace {

bool IsOpaque(const cv::Mat& bgra) {
  for (int y = 0; y < bgra.rows; ++y) {
    const uint8_t* row = bgra.ptr<uint8_t>(y);
    for (int x = 0; x < bgra.cols; ++x) {
      if (row[4 * x + 3] != 255) return false;
    }
  }
  return true;
}

}  // namespace

bool IsStillImagePath(const std::string& path) {
  if (path.find('%') != std::string::npos) return false;
  const size_t dot = path.rfind('.');
  if (dot == std::string::npos || path.find('/', dot) != std::string::npos) return false;
  std::string ext = path.substr(dot + 1);
  for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  static const char* const kStill[] = {"png",  "jpg", "jpeg", "bmp", "tif", "tiff",
                                       "webp", "ppm", "pgm",  "pnm", "exr", "hdr"};
  return std::find(std::begin(kStill), std::end(kStill), ext) != std::end(kStill);
}

Status RunVideoJob(const VideoJob& job, Reporter& reporter) {
  media::SetLibraryLog(media::LibraryLog::kErrors);
  media::VideoReader reader;
  if (Status s = FromMedia(reader.Open(job.input)); !s.ok()) return s;
  const media::VideoInfo& info = reader.info();
  BackgroundSource background;
  if (Status s = background.Open(job.background, cv::Size(info.width, info.height)); !s.ok()) {
    return s;
  }

  const int workers = std::max(1, job.threads);
  std::vector<std::unique_ptr<FrameWorker>> states(static_cast<size_t>(workers));
  for (auto& state : states) {
    if (Status s = job.makeWorker(&state); !s.ok()) return s;
  }

  media::VideoWriter writer;
  media::WriterOptions options;
  options.codec = job.codec;
  options.quality = job.quality;
  // Alpha the chain makes must reach the output; alpha that only passes through from the input
  // is kept where the output can hold it and dropped, with a word, where it cannot.
  const bool makesAlpha = job.alpha && job.alpha(false);
  options.alpha = job.alpha && job.alpha(info.hasAlpha);
  Status opened = FromMedia(writer.Open(job.output, reader, options));
  bool alphaDropped = false;  // the input's alpha, kept by the chain, not written
  if (!opened.ok() && options.alpha && !makesAlpha) {
    options.alpha = false;
    opened = FromMedia(writer.Open(job.output, reader, options));
    alphaDropped = opened.ok();
  }
  if (!opened.ok()) return opened;
  // Many BGRA clips are opaque throughout; only transparency that is lost deserves a word.
  bool transparencyLost = false;

  InterruptGuard interrupt;
  const int64_t estimate = info.frameCountEstimate;
  reporter.Start(job.output, estimate > 0 ? static_cast<uint64_t>(estimate) : 0);
  Stopwatch decode, filters, encode;
  const auto started = Stopwatch::Clock::now();
  int64_t written = 0;

  Status run = FramePipeline<Frame>::Run(
      workers,
      [&](Frame* frame, bool* end) {
        const auto t = Stopwatch::Clock::now();
        bool got = false;
        Status s = FromMedia(reader.Read(frame->video, &got));
        if (s.ok() && got && background.active()) s = background.Take(&frame->background);
        decode.Add(t);
        *end = !got;
        return s;
      },
      [&](int worker, Frame& frame) {
        const auto t = Stopwatch::Clock::now();
        const int64_t index = frame.video.index;
        const int64_t total = std::max(estimate, index + 1);
        Status s = states[static_cast<size_t>(worker)]->Process(
            frame.video.bgra, frame.background.empty() ? nullptr : &frame.background, index, total);
        filters.Add(t);
        return s;
      },
      [&](Frame& frame) {
        const auto t = Stopwatch::Clock::now();
        if (alphaDropped && !transparencyLost) transparencyLost = !IsOpaque(frame.video.bgra);
        Status s = FromMedia(writer.Write(frame.video));
        encode.Add(t);
        ++written;
        reporter.Advance();
        return s;
      },
      &gCancel);

  if (run.ok() && gCancel) run = Status::Error("interrupted; " + job.output + " was not written");
  if (!run.ok()) {
    writer.Abort();
    reporter.Finish();
    return run;
  }
  // The encoder holds frames back to look ahead; draining them can take seconds.
  reporter.Start("finishing " + job.output, 0);
  const auto t = Stopwatch::Clock::now();
  if (Status s = FromMedia(writer.Finish()); !s.ok()) {
    reporter.Finish();
    return s;
  }
  encode.Add(t);
  reporter.Finish();
  if (transparencyLost) {
    reporter.Warn(job.input + " has transparent pixels, which " + job.output +
                  " cannot hold with its codec: written without them");
  }
  if (job.timings) {
    const double wall = std::chrono::duration<double>(Stopwatch::Clock::now() - started).count();
    char line[256];
    std::snprintf(line, sizeof line,
                  "%lld frames in %.2f s (%.1f frames/s): decode %.2f s, filters %.2f s on %d "
                  "thread%s, encode %.2f s",
                  static_cast<long long>(written), wall, wall > 0 ? written / wall : 0.0,
                  decode.Seconds(), filters.Seconds(), workers, workers == 1 ? "" : "s",
                  encode.Seconds());
    reporter.Note(line);
  }
  if (reader.framesLost() > 0) {
    return Status::Incomplete(job.input + " is damaged (" + reader.damage() +
                              "): " + std::to_string(reader.framesLost()) + " frame" +
                              (reader.framesLost() == 1 ? "" : "s") + " could not be decoded; " +
                              job.output + " holds the " + std::to_string(written) + " that could");
  }
  return Status::Ok();
}

}  // namespace tfxtool
