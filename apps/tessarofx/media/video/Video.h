// Reading and writing video files frame by frame as packed 8-bit BGRA, on top of FFmpeg's
// libraries. Image sequences ("shot_%04d.png") and single still images read as videos too.
//
// Results come back as media::Status, the module's own twin of the tool's Status (same ok() and
// message()), so that the module builds on its own wherever the tool's sources move; the caller
// turns a failure into its own Status with the message.
#pragma once

#include <array>
#include <cstdint>
#include <memory>
#include <opencv2/core/mat.hpp>
#include <string>
#include <utility>

namespace tfxtool::media {

class [[nodiscard]] Status {
 public:
  static Status Ok() { return Status(); }
  static Status Error(std::string message) {
    Status s;
    s.failed_ = true;
    s.message_ = std::move(message);
    return s;
  }
  bool ok() const { return !failed_; }
  const std::string& message() const { return message_; }

 private:
  bool failed_ = false;
  std::string message_;
};

// How much FFmpeg's libraries print on stderr, for the whole process. Left alone they print
// information lines, encoder statistics among them.
enum class LibraryLog { kQuiet, kErrors, kWarnings, kInfo };
void SetLibraryLog(LibraryLog level);

struct Rational {
  int num = 0;
  int den = 1;
};

// FFmpeg's own enumerations (AVColorPrimaries, AVColorTransferCharacteristic, AVColorSpace,
// AVColorRange) as plain numbers, so that the header needs no FFmpeg include. 2 and 0 are
// "unspecified".
struct ColourTags {
  int primaries = 2;
  int transfer = 2;
  int matrix = 2;
  int range = 0;
};

struct VideoInfo {
  int width = 0;
  int height = 0;
  Rational frameRate;           // the stream's average rate, or the demuxer's guess
  Rational timeBase;            // unit of VideoFrame::pts
  Rational sampleAspect{0, 1};  // 0/1 when unknown
  // From the container's frame count, else its duration times the rate; -1 when neither is known.
  int64_t frameCountEstimate = -1;
  bool hasAlpha = false;
  // Clockwise degrees in [0, 360) a player turns the picture by (as ffmpeg's autorotate does);
  // the matrix itself, as stored in the container, travels to the writer so that flips survive.
  double rotation = 0;
  bool hasDisplayMatrix = false;
  std::array<int32_t, 9> displayMatrix{};
  ColourTags colour;
  std::string codec;        // the decoder's name
  std::string pixelFormat;  // the decoded pixel format, as FFmpeg names it
  int streamIndex = -1;     // the video stream within the container
};

struct VideoFrame {
  cv::Mat bgra;       // CV_8UC4; a new buffer for every frame, so it may be kept
  int64_t index = 0;  // counts decoded frames from 0
  int64_t pts = 0;    // in VideoInfo::timeBase
};

class VideoReader {
 public:
  VideoReader();
  ~VideoReader();
  VideoReader(const VideoReader&) = delete;
  VideoReader& operator=(const VideoReader&) = delete;

  Status Open(const std::string& path);
  // The next frame in presentation order. ok() with *got false is the end of the input; a
  // failure is a fault of this process (memory), never of the file: damage is skipped and
  // counted in framesLost().
  Status Read(VideoFrame& frame, bool* got);

  const std::string& path() const;
  const VideoInfo& info() const;
  // Frames that could not be decoded: packets and frames the decoder rejected, and at the end of
  // the input those the container announced but never delivered. Best effort.
  int64_t framesLost() const;
  // The first problem met, for the caller's report; empty while the input is sound.
  const std::string& damage() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

struct WriterOptions {
  // Any encoder FFmpeg knows (libx264, ffv1, prores_ks, png, ...), given the pixel format closest
  // to the frames that it takes (BGRA or RGBA for alpha where it can). Empty picks by container:
  // H.264 (libx264, yuv420p) for .mp4 .m4v .mkv .mov and VP9 (libvpx-vp9, yuv420p) for .webm;
  // with alpha ProRes 4444 (yuva444p10le) for .mov, VP9 (yuva420p) for .webm, FFV1 (bgra) for
  // .mkv; PNG (rgba, or rgb24) for pictures and "%04d" sequences; elsewhere the container's own.
  std::string codec;
  // Constant-quality setting: the encoder's crf where it has one, else its quantiser scale;
  // empty keeps the default (crf 17 for x264, visually lossless). Lossless codecs ignore it.
  std::string quality;
  bool alpha = false;
};

// Writes into a hidden file beside the target and moves it onto the target only in Finish(), so
// that a failure or an interrupt never leaves a partial file there. The source's audio and
// subtitle streams are copied packet for packet (pictures and sequences get none); one that the
// container cannot hold fails Open().
class VideoWriter {
 public:
  VideoWriter();
  ~VideoWriter();  // aborts when not finished
  VideoWriter(const VideoWriter&) = delete;
  VideoWriter& operator=(const VideoWriter&) = delete;

  // Takes size, timing, colour tags and rotation from the opened source, and opens the source's
  // file a second time for its audio and subtitle packets.
  Status Open(const std::string& target, const VideoReader& source, const WriterOptions& options);
  // Frames in order, with the source's pts; each keeps its time (AVI, which only counts frames,
  // keeps their order). A frame whose time does not advance moves to the next tick. A frame of
  // another size is scaled to the source's.
  Status Write(const VideoFrame& frame);
  Status Finish();
  void Abort();

  // Removes the temporary files of every writer not yet finished. Async-signal-safe (unlink and
  // rmdir only), for a SIGINT/SIGTERM handler that then calls _exit().
  static void RemoveTemporaryFiles() noexcept;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

}  // namespace tfxtool::media
