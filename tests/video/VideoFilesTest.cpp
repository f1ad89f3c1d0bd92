// Clips are made on the spot by the ffmpeg command-line tool, which also judges the results
// (packet checksums), so that the module is never checked against itself alone.
#include <gtest/gtest.h>
#include <stdio.h>

#include <filesystem>
#include <fstream>
#include <opencv2/core.hpp>
#include <string>
#include <tuple>
#include <vector>

#include "../support/TempDir.h"
#include "Video.h"

namespace fs = std::filesystem;
using tfxtool::media::Status;
using tfxtool::media::VideoFrame;
using tfxtool::media::VideoReader;
using tfxtool::media::VideoWriter;
using tfxtool::media::WriterOptions;

namespace {

class VideoFiles : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    tfxtool::media::SetLibraryLog(tfxtool::media::LibraryLog::kErrors);
  }
  std::string Path(const std::string& name) const { return dir_.Path(name); }

  // Runs the ffmpeg tool quietly; its stdout and stderr come back together.
  static std::string Ffmpeg(const std::string& args) {
    const std::string command =
        std::string(TFX_FFMPEG_CLI) + " -hide_banner -nostdin -y -loglevel error " + args + " 2>&1";
    std::string text;
    FILE* pipe = popen(command.c_str(), "r");
    char buffer[4096];
    for (size_t n; pipe != nullptr && (n = fread(buffer, 1, sizeof buffer, pipe)) > 0;)
      text.append(buffer, n);
    if (pipe != nullptr) pclose(pipe);
    return text;
  }
  std::string Make(const std::string& name, const std::string& args) {
    const std::string path = Path(name);
    const std::string log = Ffmpeg(args + " '" + path + "'");
    EXPECT_TRUE(fs::exists(path)) << log;
    return path;
  }

  struct Clip {
    tfxtool::media::VideoInfo info;
    std::vector<VideoFrame> frames;
    int64_t lost = 0;
    std::string damage;
  };
  static Clip ReadAll(const std::string& path) {
    Clip clip;
    VideoReader reader;
    Status s = reader.Open(path);
    EXPECT_TRUE(s.ok()) << s.message();
    clip.info = reader.info();
    for (bool got = s.ok(); got;) {
      VideoFrame frame;
      s = reader.Read(frame, &got);
      EXPECT_TRUE(s.ok()) << s.message();
      if (got) clip.frames.push_back(frame);
    }
    clip.lost = reader.framesLost();
    clip.damage = reader.damage();
    return clip;
  }
  static Status Transcode(const std::string& from, const std::string& to,
                          const WriterOptions& options) {
    VideoReader reader;
    Status s = reader.Open(from);
    VideoWriter writer;
    if (s.ok()) s = writer.Open(to, reader, options);
    for (bool got = s.ok(); got;) {
      VideoFrame frame;
      s = reader.Read(frame, &got);
      if (s.ok() && got) s = writer.Write(frame);
      got = got && s.ok();
    }
    return s.ok() ? writer.Finish() : s;
  }

  static double Seconds(const Clip& clip, size_t i) {
    return double(clip.frames[i].pts) * clip.info.timeBase.num / clip.info.timeBase.den;
  }
  static void ExpectSameTimes(const Clip& a, const Clip& b) {
    ASSERT_EQ(a.frames.size(), b.frames.size());
    for (size_t i = 0; i < a.frames.size(); ++i)
      EXPECT_NEAR(Seconds(a, i), Seconds(b, i), 1e-6) << "frame " << i;
  }

  tfx_test::TempDir dir_;
};

TEST_F(VideoFiles, LosslessRoundTripKeepsPixelsTimesAlphaAndSideStreams) {
  std::ofstream(Path("subs.srt")) << "1\n00:00:00,100 --> 00:00:00,500\nhello\n\n"
                                     "2\n00:00:00,600 --> 00:00:00,900\nagain\n";
  const std::string source = Make(
      "in.mkv",
      "-f lavfi -i \"testsrc2=s=64x48:r=25:d=1,format=rgba,geq=r='r(X,Y)':g='g(X,Y)':"
      "b='b(X,Y)':a='4*X'\" -f lavfi -i sine=d=1 -i '" +
          Path("subs.srt") + "' -map 0 -map 1 -map 2 -c:v ffv1 -pix_fmt bgra -c:a flac -c:s srt");
  WriterOptions options;
  options.codec = "ffv1";
  options.alpha = true;
  const std::string copy = Path("out.mkv");
  Status s = Transcode(source, copy, options);
  ASSERT_TRUE(s.ok()) << s.message();

  const Clip in = ReadAll(source), out = ReadAll(copy);
  ASSERT_EQ(in.frames.size(), 25u);
  EXPECT_EQ(in.info.frameCountEstimate, 25);
  EXPECT_TRUE(in.info.hasAlpha && out.info.hasAlpha);
  EXPECT_EQ(in.frames[3].bgra.at<cv::Vec4b>(0, 10)[3], 40);
  ExpectSameTimes(in, out);
  for (size_t i = 0; i < in.frames.size() && i < out.frames.size(); ++i)
    EXPECT_EQ(cv::norm(in.frames[i].bgra, out.frames[i].bgra, cv::NORM_INF), 0) << "frame " << i;
  EXPECT_EQ(out.lost, 0);
  for (const std::string streams : {"a", "s"}) {
    const std::string sums = Ffmpeg("-i '" + source + "' -map 0:" + streams + " -c copy -f md5 -");
    EXPECT_NE(sums.find("MD5="), std::string::npos) << sums;
    EXPECT_EQ(sums, Ffmpeg("-i '" + copy + "' -map 0:" + streams + " -c copy -f md5 -")) << streams;
  }
}

TEST_F(VideoFiles, VariableFrameRateKeepsEveryTimestamp) {
  // Steady, then a 0.31 s hold, then ever longer gaps, all off the 1/25 s grid.
  const std::string source =
      Make("vfr.mkv",
           "-f lavfi -i testsrc2=s=64x48:r=25:d=1 -vf \"settb=1/1000,setpts='N/25/TB+"
           "gte(N,10)*0.31/TB+gte(N,18)*(N-18)*0.013/TB'\" -fps_mode passthrough -enc_time_base "
           "1:1000 -c:v ffv1");
  const Clip in = ReadAll(source);
  ASSERT_EQ(in.frames.size(), 25u);
  EXPECT_NEAR(Seconds(in, 10) - Seconds(in, 9), 0.35, 1e-9);
  for (const char* target : {"vfr.mp4", "vfr-copy.mkv"}) {
    Status s = Transcode(source, Path(target), {});
    ASSERT_TRUE(s.ok()) << s.message();
    ExpectSameTimes(in, ReadAll(Path(target)));
  }
}

// What the writer makes of the tags, and how close H.264 stays, the tool's clip tests judge.
TEST_F(VideoFiles, H264InputIsReadByItsColourTags) {
  const std::string source =
      Make("bt709.mp4",
           "-f lavfi -i mandelbrot=s=320x240:r=25,trim=duration=0.2 -c:v libx264 -pix_fmt yuv420p "
           "-colorspace bt709 -color_primaries bt709 -color_trc bt709 -color_range tv");
  const Clip in = ReadAll(source);
  ASSERT_FALSE(in.frames.empty());
  const tfxtool::media::ColourTags& c = in.info.colour;
  // BT.709 throughout, limited range.
  EXPECT_EQ(std::tie(c.primaries, c.transfer, c.matrix, c.range), std::make_tuple(1, 1, 1, 1));
  EXPECT_EQ(in.info.pixelFormat, "yuv420p");
  // A small frame with BT.709 tags: the reader must follow the tags, not the size.
  const std::string rgb = Ffmpeg("-i '" + source +
                                 "' -frames:v 1 -sws_flags bicubic+accurate_rnd+full_chroma_int "
                                 "-f rawvideo -pix_fmt bgra -");
  ASSERT_EQ(rgb.size(), 320u * 240 * 4);
  const cv::Mat reference(240, 320, CV_8UC4, const_cast<char*>(rgb.data()));
  EXPECT_LT(cv::norm(reference, in.frames[0].bgra, cv::NORM_L1) / reference.total(), 2.0);
}

TEST_F(VideoFiles, ImageSequenceAndStillReadAsVideos) {
  const std::string source =
      Make("in.mkv", "-f lavfi -i testsrc2=s=64x48:r=25:d=0.2,format=rgba -c:v ffv1 -pix_fmt bgra");
  WriterOptions options;
  options.alpha = true;
  Status s = Transcode(source, Path("shot_%04d.png"), options);
  ASSERT_TRUE(s.ok()) << s.message();
  EXPECT_EQ(dir_.Names().size(), 6u);  // the source and five pictures

  const Clip in = ReadAll(source), shots = ReadAll(Path("shot_%04d.png"));
  ASSERT_EQ(shots.frames.size(), in.frames.size());
  for (size_t i = 0; i < in.frames.size(); ++i)
    EXPECT_EQ(cv::norm(in.frames[i].bgra, shots.frames[i].bgra, cv::NORM_INF), 0);

  const Clip still = ReadAll(Path("shot_0002.png"));
  EXPECT_EQ(still.info.frameCountEstimate, 1);
  ASSERT_EQ(still.frames.size(), 1u);
  EXPECT_EQ(cv::norm(in.frames[1].bgra, still.frames[0].bgra, cv::NORM_INF), 0);
}

TEST_F(VideoFiles, FailuresNameTheirCauseAndLeaveNoFile) {
  const std::string source = Make("in.mkv", "-f lavfi -i testsrc2=s=64x48:r=25:d=2 -c:v ffv1");
  const std::string sound = Make("sound.m4a", "-f lavfi -i sine=d=0.2 -c:a aac");
  for (const auto& [path, cause] :
       {std::pair{Path("missing.mkv"), "No such file"}, {sound, "has no video stream"}}) {
    VideoReader reader;
    EXPECT_NE(reader.Open(path).message().find(cause), std::string::npos) << path;
  }

  const std::vector<std::string> before = dir_.Names();
  struct Case {
    std::string target, codec, cause;
  };
  for (const Case& c : std::vector<Case>{
           {Path("out.mkv"), "nosuchcodec", "unknown codec 'nosuchcodec'"},
           {Path("out.mp4"), "ffv1", "cannot be written into .mp4"},
           {Path("out.mp4"), "pcm_s16le", "does not encode video"},
           {"/nonexistent-tfx/out.mkv", "", "cannot write into directory '/nonexistent-tfx'"},
           {sound + "/out.mkv", "", "Not a directory"}}) {
    VideoReader reader;
    ASSERT_TRUE(reader.Open(source).ok());
    VideoWriter writer;
    WriterOptions options;
    options.codec = c.codec;
    const std::string message = writer.Open(c.target, reader, options).message();
    EXPECT_NE(message.find(c.cause), std::string::npos) << message;
  }
  EXPECT_FALSE(fs::exists("/nonexistent-tfx"));
  EXPECT_EQ(dir_.Names(), before);

  // Abandoned half way, by Abort() and by the interrupt path.
  for (bool interrupt : {false, true}) {
    VideoReader reader;
    ASSERT_TRUE(reader.Open(source).ok());
    VideoWriter writer;
    ASSERT_TRUE(writer.Open(Path("out.mkv"), reader, {}).ok());
    VideoFrame frame;
    bool got = false;
    for (int i = 0; i < 10; ++i)
      ASSERT_TRUE(reader.Read(frame, &got).ok() && writer.Write(frame).ok());
    EXPECT_EQ(dir_.Names().size(), before.size() + 1);
    if (interrupt)
      VideoWriter::RemoveTemporaryFiles();
    else
      writer.Abort();
    EXPECT_EQ(dir_.Names(), before);
  }

  // Cut in half: what is there decodes, the rest is reported.
  const std::string cut = Path("cut.mkv");
  fs::copy_file(source, cut);
  fs::resize_file(cut, fs::file_size(source) / 2);
  const Clip clip = ReadAll(cut);
  EXPECT_GT(clip.frames.size(), 5u);
  EXPECT_LT(clip.frames.size(), 50u);
  EXPECT_GE(int64_t(clip.frames.size()) + clip.lost, 48);
  EXPECT_FALSE(clip.damage.empty());
}

}  // namespace
