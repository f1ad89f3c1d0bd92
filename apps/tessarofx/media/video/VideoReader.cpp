#include <cmath>
#include <cstring>

#include "Ffmpeg.h"
#include "Video.h"

extern "C" {
#include <libavutil/display.h>
#include <libavutil/parseutils.h>
}

namespace tfxtool::media {

struct VideoReader::Impl {
  std::string path;
  VideoInfo info;
  InputPtr input;
  CodecPtr decoder;
  AVStream* stream = nullptr;
  PacketPtr packet{av_packet_alloc()};
  FramePtr frame{av_frame_alloc()};
  SwsPtr sws;
  bool inputEnded = false;
  bool decoderDrained = false;
  int64_t decoded = 0;
  int64_t lost = 0;
  int64_t lastPts = AV_NOPTS_VALUE;
  int64_t lastDuration = 0;
  bool tailChecked = false;
  std::string damage;

  void NoteDamage(const std::string& what) {
    if (damage.empty()) damage = what;
  }
  Status Convert(VideoFrame& out);
  void AccountForMissingTail();
};

namespace {

// FFmpeg's AV_TIME_BASE_Q is a C compound literal, which C++ compilers reject under -Wpedantic.
constexpr AVRational kMicroseconds{1, AV_TIME_BASE};

// The native VP8/VP9 decoders drop the alpha plane that WebM keeps beside the picture; libvpx
// reads it.
const AVCodec* DecoderFor(const AVStream* stream, const AVCodec* found) {
  const AVDictionaryEntry* alpha = av_dict_get(stream->metadata, "alpha_mode", nullptr, 0);
  if (alpha != nullptr && std::strcmp(alpha->value, "1") == 0) {
    const char* name = stream->codecpar->codec_id == AV_CODEC_ID_VP9   ? "libvpx-vp9"
                       : stream->codecpar->codec_id == AV_CODEC_ID_VP8 ? "libvpx"
                                                                       : nullptr;
    if (const AVCodec* vpx = name ? avcodec_find_decoder_by_name(name) : nullptr) return vpx;
  }
  return found;
}

int64_t EstimateFrames(const AVFormatContext* input, const AVStream* stream, AVRational rate) {
  if (stream->nb_frames > 0) return stream->nb_frames;
  if (rate.num <= 0 || rate.den <= 0) return -1;
  double seconds = -1;
  if (stream->duration != AV_NOPTS_VALUE && stream->duration > 0)
    seconds = stream->duration * av_q2d(stream->time_base);
  else if (input->duration != AV_NOPTS_VALUE && input->duration > 0)
    seconds = input->duration / double(AV_TIME_BASE);
  if (seconds >= 0) return std::llround(seconds * av_q2d(rate));
  // A lone picture (png_pipe, jpeg_pipe, ...) is a video of one frame.
  const std::string demuxer = input->iformat->name;
  if (demuxer.size() > 5 && demuxer.compare(demuxer.size() - 5, 5, "_pipe") == 0) return 1;
  return -1;
}

}  // namespace

void SetLibraryLog(LibraryLog level) {
  switch (level) {
    case LibraryLog::kQuiet:
      av_log_set_level(AV_LOG_QUIET);
      break;
    case LibraryLog::kErrors:
      av_log_set_level(AV_LOG_ERROR);
      break;
    case LibraryLog::kWarnings:
      av_log_set_level(AV_LOG_WARNING);
      break;
    case LibraryLog::kInfo:
      av_log_set_level(AV_LOG_INFO);
      break;
  }
}

VideoReader::VideoReader() : impl_(std::make_unique<Impl>()) {}
VideoReader::~VideoReader() = default;

const std::string& VideoReader::path() const { return impl_->path; }
const VideoInfo& VideoReader::info() const { return impl_->info; }
int64_t VideoReader::framesLost() const { return impl_->lost; }
const std::string& VideoReader::damage() const { return impl_->damage; }

Status VideoReader::Open(const std::string& path) {
  impl_ = std::make_unique<Impl>();
  Impl& m = *impl_;
  m.path = path;
  const std::string quoted = "'" + path + "'";
  if (!m.packet || !m.frame) return Status::Error("out of memory opening " + quoted);

  // A pattern names files that may not exist under that name; only image2 expands it.
  const AVInputFormat* forced = IsSequencePattern(path) ? av_find_input_format("image2") : nullptr;
  AVFormatContext* raw = nullptr;
  int ret = avformat_open_input(&raw, path.c_str(), forced, nullptr);
  if (ret < 0) return Status::Error("cannot open " + quoted + ": " + AvError(ret));
  m.input.reset(raw);
  ret = avformat_find_stream_info(raw, nullptr);
  if (ret < 0) return Status::Error("cannot read " + quoted + ": " + AvError(ret));

  const AVCodec* codec = nullptr;
  ret = av_find_best_stream(raw, AVMEDIA_TYPE_VIDEO, -1, -1, &codec, 0);
  if (ret == AVERROR_STREAM_NOT_FOUND) return Status::Error(quoted + " has no video stream");
  if (ret == AVERROR_DECODER_NOT_FOUND || (ret >= 0 && codec == nullptr)) {
    int index = ret >= 0 ? ret : 0;
    for (unsigned i = 0; i < raw->nb_streams && ret < 0; ++i)
      if (raw->streams[i]->codecpar->codec_type == AVMEDIA_TYPE_VIDEO) index = int(i);
    return Status::Error(quoted + ": no decoder for its video codec '" +
                         avcodec_get_name(raw->streams[index]->codecpar->codec_id) + "'");
  }
  if (ret < 0) return Status::Error("cannot read " + quoted + ": " + AvError(ret));
  m.stream = raw->streams[ret];
  const AVCodec* usual = codec;
  codec = DecoderFor(m.stream, codec);

  m.decoder.reset(avcodec_alloc_context3(codec));
  if (!m.decoder) return Status::Error("out of memory opening " + quoted);
  ret = avcodec_parameters_to_context(m.decoder.get(), m.stream->codecpar);
  if (ret < 0) return Status::Error("cannot decode " + quoted + ": " + AvError(ret));
  m.decoder->pkt_timebase = m.stream->time_base;
  m.decoder->thread_count = 0;  // the codec's own choice, one per core
  m.decoder->thread_type = FF_THREAD_FRAME | FF_THREAD_SLICE;
  ret = avcodec_open2(m.decoder.get(), codec, nullptr);
  if (ret < 0)
    return Status::Error("cannot decode " + quoted + " with " + codec->name + ": " + AvError(ret));

  VideoInfo& info = m.info;
  const AVCodecParameters* par = m.stream->codecpar;
  info.width = par->width;
  info.height = par->height;
  const AVRational rate = av_guess_frame_rate(raw, m.stream, nullptr);
  info.frameRate = {rate.num, rate.den};
  info.timeBase = {m.stream->time_base.num, m.stream->time_base.den};
  const AVRational aspect = av_guess_sample_aspect_ratio(raw, m.stream, nullptr);
  info.sampleAspect = {aspect.num, aspect.den};
  info.frameCountEstimate = EstimateFrames(raw, m.stream, rate);
  const auto format = AVPixelFormat(par->format);
  // The stream's parameters come from the usual decoder, blind to an alpha plane kept apart.
  const bool alphaApart = codec != usual && format == AV_PIX_FMT_YUV420P;
  info.hasAlpha = alphaApart || HasAlpha(format);
  info.pixelFormat = alphaApart                  ? "yuva420p"
                     : format == AV_PIX_FMT_NONE ? ""
                                                 : av_get_pix_fmt_name(format);
  info.codec = codec->name;
  info.streamIndex = m.stream->index;
  info.colour = {par->color_primaries, par->color_trc, par->color_space, par->color_range};
  size_t size = 0;
  if (const uint8_t* matrix = av_stream_get_side_data(m.stream, AV_PKT_DATA_DISPLAYMATRIX, &size);
      matrix != nullptr && size >= sizeof info.displayMatrix) {
    info.hasDisplayMatrix = true;
    std::memcpy(info.displayMatrix.data(), matrix, sizeof info.displayMatrix);
    const double counterClockwise = av_display_rotation_get(info.displayMatrix.data());
    if (!std::isnan(counterClockwise)) {
      info.rotation = std::fmod(360.0 - counterClockwise, 360.0);
      if (info.rotation < 0) info.rotation += 360.0;
      if (std::fabs(info.rotation - 360.0) < 1e-9) info.rotation = 0;
    }
  }
  return Status::Ok();
}

Status VideoReader::Read(VideoFrame& frame, bool* got) {
  *got = false;
  if (!impl_->decoder) return Status::Error("no video is open");
  Impl& m = *impl_;
  AVCodecContext* dec = m.decoder.get();
  while (!m.decoderDrained) {
    int ret = avcodec_receive_frame(dec, m.frame.get());
    if (ret >= 0) {
      Status converted = m.Convert(frame);
      av_frame_unref(m.frame.get());
      if (!converted.ok()) return converted;
      *got = true;
      return Status::Ok();
    }
    if (ret == AVERROR_EOF) {
      m.decoderDrained = true;
      break;
    }
    if (ret != AVERROR(EAGAIN)) {
      ++m.lost;
      m.NoteDamage("a frame after frame " + std::to_string(m.decoded) +
                   " could not be decoded: " + AvError(ret));
      continue;
    }
    if (m.inputEnded) {
      // Not every decoder says EOF after the drain; the frames are out either way.
      m.decoderDrained = true;
      break;
    }
    ret = av_read_frame(m.input.get(), m.packet.get());
    if (ret < 0) {
      if (ret != AVERROR_EOF)
        m.NoteDamage("reading stopped after frame " + std::to_string(m.decoded) + ": " +
                     AvError(ret));
      m.inputEnded = true;
      avcodec_send_packet(dec, nullptr);
      continue;
    }
    if (m.packet->stream_index == m.stream->index) {
      ret = avcodec_send_packet(dec, m.packet.get());
      if (ret < 0 && ret != AVERROR(EAGAIN)) {
        ++m.lost;
        m.NoteDamage("a packet after frame " + std::to_string(m.decoded) +
                     " could not be decoded: " + AvError(ret));
      }
    }
    av_packet_unref(m.packet.get());
  }
  m.AccountForMissingTail();
  return Status::Ok();
}

Status VideoReader::Impl::Convert(VideoFrame& out) {
  AVFrame* f = frame.get();
  bool fullRange = f->color_range == AVCOL_RANGE_JPEG;
  const AVPixelFormat format = PlainYuv(AVPixelFormat(f->format), &fullRange);
  // Chroma is widened with the scaler's own filter: Lanczos loses the least of it on a round trip
  // through the writer (several dB of chroma PSNR over bicubic).
  sws.reset(sws_getCachedContext(
      sws.release(), f->width, f->height, format, f->width, f->height, AV_PIX_FMT_BGRA,
      SWS_LANCZOS | SWS_ACCURATE_RND | SWS_FULL_CHR_H_INT, nullptr, nullptr, nullptr));
  if (!sws)
    return Status::Error("cannot convert " + std::string(av_get_pix_fmt_name(format)) +
                         " frames of '" + path + "' to BGRA");
  if (!IsRgb(format)) {
    const int matrix = ResolvedMatrix(f->colorspace, f->width, f->height);
    sws_setColorspaceDetails(sws.get(), sws_getCoefficients(matrix), fullRange ? 1 : 0,
                             sws_getCoefficients(SWS_CS_DEFAULT), 1, 0, 1 << 16, 1 << 16);
  }
  out.bgra = cv::Mat(f->height, f->width, CV_8UC4);
  uint8_t* planes[1] = {out.bgra.data};
  const int strides[1] = {int(out.bgra.step[0])};
  sws_scale(sws.get(), f->data, f->linesize, 0, f->height, planes, strides);

  int64_t pts = f->best_effort_timestamp;
  if (pts == AV_NOPTS_VALUE) {
    // Streams without timestamps (raw elementary streams) tick at the frame rate.
    const AVRational rate = av_guess_frame_rate(input.get(), stream, nullptr);
    const int64_t step =
        rate.num > 0 ? std::max<int64_t>(1, av_rescale_q(1, av_inv_q(rate), stream->time_base)) : 1;
    pts = lastPts == AV_NOPTS_VALUE ? 0 : lastPts + step;
  }
  lastDuration =
      f->pkt_duration > 0 ? f->pkt_duration : (lastPts != AV_NOPTS_VALUE ? pts - lastPts : 0);
  lastPts = pts;
  out.pts = pts;
  out.index = decoded++;
  return Status::Ok();
}

// A cut file ends early without a decode error; what the container promised tells how much is
// missing.
void VideoReader::Impl::AccountForMissingTail() {
  if (tailChecked) return;
  tailChecked = true;
  if (stream->nb_frames > 0) {
    if (stream->nb_frames > decoded + lost) {
      NoteDamage("the input ends after " + std::to_string(decoded) + " of its " +
                 std::to_string(stream->nb_frames) + " frames");
      lost = stream->nb_frames - decoded;
    }
    return;
  }
  if (lastPts == AV_NOPTS_VALUE) return;
  int64_t end = AV_NOPTS_VALUE;
  int64_t tagged = 0;
  const AVDictionaryEntry* tag = av_dict_get(stream->metadata, "DURATION", nullptr, 0);
  if (stream->duration != AV_NOPTS_VALUE && stream->duration > 0)
    end = (stream->start_time != AV_NOPTS_VALUE ? stream->start_time : 0) + stream->duration;
  else if (tag != nullptr && av_parse_time(&tagged, tag->value, 1) >= 0 && tagged > 0)
    // Matroska keeps each track's length only as a tag; the segment's may be the audio's.
    end = av_rescale_q(tagged, kMicroseconds, stream->time_base);
  else if (input->duration != AV_NOPTS_VALUE && input->duration > 0)
    end = av_rescale_q(
        (input->start_time != AV_NOPTS_VALUE ? input->start_time : 0) + input->duration,
        kMicroseconds, stream->time_base);
  const AVRational rate = av_guess_frame_rate(input.get(), stream, nullptr);
  if (end == AV_NOPTS_VALUE || rate.num <= 0) return;
  const double missing = (end - (lastPts + lastDuration)) * av_q2d(stream->time_base);
  const int64_t frames = std::llround(missing * av_q2d(rate));
  // The container's duration may be rounded, or include audio that outlasts the picture.
  if (frames >= 2 && frames > lost) {
    NoteDamage("the input ends " + std::to_string(missing).substr(0, 5) +
               " s before its announced duration");
    lost = frames;
  }
}

}  // namespace tfxtool::media
