#include <fcntl.h>
#include <limits.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <random>
#include <vector>

#include "Ffmpeg.h"
#include "TemporaryFiles.h"
#include "Video.h"

extern "C" {
#include <libavutil/opt.h>
}

namespace tfxtool::media {

namespace {

struct OutputCloser {
  void operator()(AVFormatContext* c) const {
    if (!(c->oformat->flags & AVFMT_NOFILE)) avio_closep(&c->pb);
    avformat_free_context(c);
  }
};
using OutputPtr = std::unique_ptr<AVFormatContext, OutputCloser>;

std::string Lower(std::string text) {
  for (char& c : text) c = char(std::tolower(static_cast<unsigned char>(c)));
  return text;
}

struct PathParts {
  std::string directory;  // "." for a bare name
  std::string stem;       // the name without its extension
  std::string extension;  // with its dot, or empty
};

PathParts Split(const std::string& path) {
  PathParts parts;
  const size_t slash = path.rfind('/');
  parts.directory = slash == std::string::npos ? "." : slash == 0 ? "/" : path.substr(0, slash);
  const std::string name = slash == std::string::npos ? path : path.substr(slash + 1);
  const size_t dot = name.rfind('.');
  parts.stem = dot == std::string::npos || dot == 0 ? name : name.substr(0, dot);
  parts.extension = dot == std::string::npos || dot == 0 ? "" : name.substr(dot);
  return parts;
}

std::string RandomTag() {
  static const char kLetters[] = "abcdefghijklmnopqrstuvwxyz0123456789";
  std::random_device device;
  std::string tag(6, 'x');
  for (char& c : tag) c = kLetters[device() % (sizeof kLetters - 1)];
  return tag;
}

struct EncoderChoice {
  const AVCodec* codec = nullptr;
  AVPixelFormat format = AV_PIX_FMT_NONE;
};

bool Supports(const AVCodec* codec, AVPixelFormat format) {
  if (codec->pix_fmts == nullptr) return true;
  for (const AVPixelFormat* f = codec->pix_fmts; *f != AV_PIX_FMT_NONE; ++f)
    if (*f == format) return true;
  return false;
}

// The encoder's format closest to the frames: BGRA or RGBA as they are when alpha is kept,
// otherwise the source's own format where the encoder takes it.
AVPixelFormat PickFormat(const AVCodec* codec, AVPixelFormat source, bool alpha) {
  if (alpha) {
    for (AVPixelFormat f : {AV_PIX_FMT_BGRA, AV_PIX_FMT_RGBA})
      if (codec->pix_fmts != nullptr && Supports(codec, f)) return f;
  } else if (source != AV_PIX_FMT_NONE && !HasAlpha(source) && Supports(codec, source)) {
    return source;
  }
  if (codec->pix_fmts == nullptr) return alpha ? AV_PIX_FMT_BGRA : AV_PIX_FMT_YUV420P;
  const AVPixelFormat from = alpha || source == AV_PIX_FMT_NONE ? AV_PIX_FMT_BGRA : source;
  return avcodec_find_best_pix_fmt_of_list(codec->pix_fmts, from, alpha ? 1 : 0, nullptr);
}

}  // namespace

struct VideoWriter::Impl {
  std::string target;
  std::string temporary;  // the hidden file, or the hidden directory of a sequence
  bool sequence = false;
  std::string pattern;  // a sequence's file names
  std::string targetDirectory;
  int64_t firstNumber = 1;
  int slot = -1;

  OutputPtr output;
  CodecPtr encoder;
  AVStream* videoOut = nullptr;
  AVRational sourceTimeBase{1, 25};
  SwsPtr sws;
  FramePtr frame{av_frame_alloc()};
  PacketPtr packet{av_packet_alloc()};
  int matrix = AVCOL_SPC_BT709;
  bool fullRange = false;
  bool rgbOut = false;
  int64_t framesSent = 0;
  int64_t lastPts = 0;
  int64_t videoPackets = 0;

  InputPtr copyInput;
  std::vector<int> copyMap;  // input stream -> output stream, -1 when not copied
  PacketPtr copyPacket{av_packet_alloc()};
  bool copyPending = false;

  bool open = false;
  std::string failure;

  Status Fail(const std::string& message) {
    if (failure.empty()) failure = message;
    return Status::Error(failure);
  }
  Status WriteFailure(int code) { return Fail("cannot write '" + target + "': " + AvError(code)); }
  Status CreateTemporary();
  Status ChooseEncoder(const WriterOptions& options, const VideoInfo& info, EncoderChoice* out);
  Status OpenEncoder(const EncoderChoice& choice, const WriterOptions& options,
                     const VideoInfo& info);
  Status AddCopiedStreams(const std::string& source, const VideoInfo& info);
  Status Drain();
  Status CopyUpTo(int64_t ts, AVRational timeBase);
  void Close();
  void RemoveTemporary();
};

VideoWriter::VideoWriter() : impl_(std::make_unique<Impl>()) {}
VideoWriter::~VideoWriter() { Abort(); }

void VideoWriter::RemoveTemporaryFiles() noexcept { TemporaryFiles::RemoveAll(); }

Status VideoWriter::Impl::CreateTemporary() {
  const PathParts parts = Split(target);
  for (int attempt = 0; attempt < 100; ++attempt) {
    if (sequence) {
      // The stem of a pattern may hold the %d itself; the hidden name keeps what precedes it.
      const std::string name = Split(target.substr(0, target.find('%'))).stem;
      std::string dir =
          parts.directory + "/." + (name.empty() ? "sequence" : name) + ".tmp-" + RandomTag();
      if (mkdir(dir.c_str(), 0777) == 0) {
        temporary = dir;
        return Status::Ok();
      }
    } else {
      // The extension stays last: the muxer is chosen by it.
      std::string file =
          parts.directory + "/." + parts.stem + ".tmp-" + RandomTag() + parts.extension;
      const int fd = ::open(file.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
      if (fd >= 0) {
        ::close(fd);
        temporary = file;
        return Status::Ok();
      }
    }
    if (errno != EEXIST) break;
  }
  return Status::Error("cannot write into directory '" + parts.directory +
                       "': " + std::strerror(errno));
}

Status VideoWriter::Impl::ChooseEncoder(const WriterOptions& options, const VideoInfo& info,
                                        EncoderChoice* out) {
  const std::string extension = Lower(Split(target).extension);
  const bool image = std::strcmp(output->oformat->name, "image2") == 0;
  const AVPixelFormat source = av_get_pix_fmt(info.pixelFormat.c_str());
  const char* name = nullptr;
  if (!options.codec.empty()) {
    name = options.codec.c_str();
  } else if (!image) {
    const bool common =
        extension == ".mp4" || extension == ".mkv" || extension == ".mov" || extension == ".m4v";
    if (options.alpha) {
      if (extension == ".mov") {
        out->format = AV_PIX_FMT_YUVA444P10LE;
        name = "prores_ks";
      } else if (extension == ".webm") {
        out->format = AV_PIX_FMT_YUVA420P;
        name = "libvpx-vp9";
      } else if (extension == ".mkv") {
        out->format = AV_PIX_FMT_BGRA;
        name = "ffv1";
      } else if (common) {
        return Status::Error("'" + target +
                             "': MP4 has no codec with alpha; write .mov, .webm or .mkv, or name "
                             "a codec");
      }
    } else if (common) {
      out->format = AV_PIX_FMT_YUV420P;
      name = "libx264";
    } else if (extension == ".webm") {
      out->format = AV_PIX_FMT_YUV420P;
      name = "libvpx-vp9";
    }
  }
  if (name != nullptr) {
    out->codec = avcodec_find_encoder_by_name(name);
    if (out->codec == nullptr) return Status::Error(std::string("unknown codec '") + name + "'");
  } else {
    const AVCodecID id =
        av_guess_codec(output->oformat, nullptr, target.c_str(), nullptr, AVMEDIA_TYPE_VIDEO);
    out->codec = id == AV_CODEC_ID_NONE ? nullptr : avcodec_find_encoder(id);
    if (out->codec == nullptr)
      return Status::Error("'" + target + "': no video encoder for " + extension + " files");
  }
  const std::string codecName = out->codec->name;
  if (out->codec->type != AVMEDIA_TYPE_VIDEO)
    return Status::Error("codec '" + codecName + "' does not encode video");
  if (avformat_query_codec(output->oformat, out->codec->id, FF_COMPLIANCE_NORMAL) == 0)
    return Status::Error("codec '" + codecName + "' cannot be written into " +
                         (extension.empty() ? "these" : extension) + " files");
  if (out->format == AV_PIX_FMT_NONE) out->format = PickFormat(out->codec, source, options.alpha);
  if (out->format == AV_PIX_FMT_NONE)
    return Status::Error("codec '" + codecName + "' takes no pixel format this tool can give");
  if (options.alpha && !HasAlpha(out->format))
    return Status::Error("codec '" + codecName + "' cannot keep alpha");
  // Most encoders refuse a size their chroma grid does not cover with an error that does not say
  // so (x264: "generic error"); the VP8/VP9/AV1 family pads by itself.
  const AVPixFmtDescriptor* d = av_pix_fmt_desc_get(out->format);
  const AVCodecID id = out->codec->id;
  const bool padsItself = id == AV_CODEC_ID_VP8 || id == AV_CODEC_ID_VP9 || id == AV_CODEC_ID_AV1;
  const bool offGrid = (info.width & ((1 << d->log2_chroma_w) - 1)) != 0 ||
                       (info.height & ((1 << d->log2_chroma_h) - 1)) != 0;
  if (!padsItself && offGrid)
    return Status::Error("'" + codecName + "' in " + d->name + " needs an even " +
                         (info.width % 2 ? "width" : "height") + ", not " +
                         std::to_string(info.width) + "x" + std::to_string(info.height) +
                         "; name a codec without chroma subsampling, such as ffv1");
  return Status::Ok();
}

Status VideoWriter::Impl::OpenEncoder(const EncoderChoice& choice, const WriterOptions& options,
                                      const VideoInfo& info) {
  const AVCodec* codec = choice.codec;
  const std::string codecName = codec->name;
  encoder.reset(avcodec_alloc_context3(codec));
  if (!encoder) return Status::Error("out of memory opening " + codecName);
  AVCodecContext* enc = encoder.get();
  enc->width = info.width;
  enc->height = info.height;
  enc->pix_fmt = choice.format;
  enc->sample_aspect_ratio = AVRational{info.sampleAspect.num, info.sampleAspect.den};
  if (info.timeBase.num > 0 && info.timeBase.den > 0)
    sourceTimeBase = AVRational{info.timeBase.num, info.timeBase.den};
  // The source's own time base keeps variable frame timing exact. AVI counts frames instead of
  // timing them: there a tick is one frame.
  enc->time_base = sourceTimeBase;
  if (info.frameRate.num > 0 && info.frameRate.den > 0) {
    enc->framerate = AVRational{info.frameRate.num, info.frameRate.den};
    if (std::strcmp(output->oformat->name, "avi") == 0) enc->time_base = av_inv_q(enc->framerate);
  }
  enc->thread_count = 0;

  // Back into YUV with the matrix and range the reader took out of it, so that an untouched
  // frame comes back as it was.
  bool sourceFull = info.colour.range == AVCOL_RANGE_JPEG;
  const AVPixelFormat sourceFormat =
      PlainYuv(av_get_pix_fmt(info.pixelFormat.c_str()), &sourceFull);
  const bool sourceRgb = sourceFormat == AV_PIX_FMT_NONE || IsRgb(sourceFormat);
  bool jpegRange = false;
  PlainYuv(choice.format, &jpegRange);
  rgbOut = IsRgb(choice.format);
  matrix = ResolvedMatrix(info.colour.matrix, info.width, info.height);
  fullRange = jpegRange || (!sourceRgb && sourceFull);
  enc->color_primaries = AVColorPrimaries(info.colour.primaries);
  enc->color_trc = AVColorTransferCharacteristic(info.colour.transfer);
  if (rgbOut) {
    enc->colorspace = AVCOL_SPC_RGB;
    enc->color_range = AVCOL_RANGE_JPEG;
  } else {
    enc->colorspace = AVColorSpace(sourceRgb ? matrix : info.colour.matrix);
    enc->color_range = sourceRgb && !jpegRange
                           ? AVCOL_RANGE_MPEG
                           : AVColorRange(fullRange ? AVCOL_RANGE_JPEG : info.colour.range);
  }
  if (output->oformat->flags & AVFMT_GLOBALHEADER) enc->flags |= AV_CODEC_FLAG_GLOBAL_HEADER;

  AVDictionary* settings = nullptr;
  std::string quality = options.quality;
  if (!quality.empty()) {
    char* end = nullptr;
    const double value = std::strtod(quality.c_str(), &end);
    if (end == quality.c_str() || *end != '\0' || value < 0)
      return Status::Error("quality '" + quality + "' is not a number");
  }
  const bool hasCrf = codec->priv_class != nullptr &&
                      av_opt_find2(const_cast<AVClass**>(&codec->priv_class), "crf", nullptr, 0,
                                   AV_OPT_SEARCH_FAKE_OBJ, nullptr) != nullptr;
  if (codecName == "libx264" || codecName == "libx264rgb") {
    // crf 17 is where x264's losses stop being visible; medium is its default preset.
    if (quality.empty()) quality = "17";
    av_dict_set(&settings, "preset", "medium", 0);
  } else if (codecName == "libvpx-vp9") {
    if (quality.empty()) quality = "20";
    enc->bit_rate = 0;  // constant quality, no bitrate cap
    av_dict_set(&settings, "row-mt", "1", 0);
  } else if (codecName == "prores_ks") {
    const AVPixFmtDescriptor* d = av_pix_fmt_desc_get(choice.format);
    av_dict_set(&settings, "profile", d->log2_chroma_w == 0 ? "4444" : "hq", 0);
  } else if (codecName == "ffv1") {
    // Version 3 checks every slice, so that a damaged copy is found out and limited to a slice.
    av_dict_set(&settings, "level", "3", 0);
    av_dict_set(&settings, "slicecrc", "1", 0);
  }
  if (!quality.empty()) {
    if (hasCrf) {
      av_dict_set(&settings, "crf", quality.c_str(), 0);
    } else {
      enc->flags |= AV_CODEC_FLAG_QSCALE;
      enc->global_quality = int(FF_QP2LAMBDA * std::strtod(quality.c_str(), nullptr));
    }
  }
  const int ret = avcodec_open2(enc, codec, &settings);
  av_dict_free(&settings);
  if (ret < 0)
    return Status::Error("cannot encode " + std::to_string(info.width) + "x" +
                         std::to_string(info.height) + " " + av_get_pix_fmt_name(choice.format) +
                         " with '" + codecName + "': " + AvError(ret));

  videoOut = avformat_new_stream(output.get(), nullptr);
  if (videoOut == nullptr) return Status::Error("out of memory opening '" + target + "'");
  if (avcodec_parameters_from_context(videoOut->codecpar, enc) < 0)
    return Status::Error("out of memory opening '" + target + "'");
  videoOut->time_base = enc->time_base;
  videoOut->avg_frame_rate = enc->framerate;
  videoOut->r_frame_rate = enc->framerate;
  videoOut->sample_aspect_ratio = enc->sample_aspect_ratio;
  if (info.hasDisplayMatrix) {
    uint8_t* data =
        av_stream_new_side_data(videoOut, AV_PKT_DATA_DISPLAYMATRIX, sizeof info.displayMatrix);
    if (data != nullptr) std::memcpy(data, info.displayMatrix.data(), sizeof info.displayMatrix);
  }

  frame->format = choice.format;
  frame->width = info.width;
  frame->height = info.height;
  if (av_frame_get_buffer(frame.get(), 0) < 0)
    return Status::Error("out of memory opening '" + target + "'");
  return Status::Ok();
}

Status VideoWriter::Impl::AddCopiedStreams(const std::string& source, const VideoInfo& info) {
  AVFormatContext* raw = nullptr;
  int ret = avformat_open_input(&raw, source.c_str(), nullptr, nullptr);
  if (ret < 0) return Status::Error("cannot open '" + source + "' again: " + AvError(ret));
  copyInput.reset(raw);
  ret = avformat_find_stream_info(raw, nullptr);
  if (ret < 0) return Status::Error("cannot read '" + source + "': " + AvError(ret));
  const std::string extension = Split(target).extension;
  copyMap.assign(raw->nb_streams, -1);
  bool any = false;
  for (unsigned i = 0; i < raw->nb_streams; ++i) {
    const AVStream* in = raw->streams[i];
    const AVMediaType type = in->codecpar->codec_type;
    if (int(i) == info.streamIndex || (type != AVMEDIA_TYPE_AUDIO && type != AVMEDIA_TYPE_SUBTITLE))
      continue;
    const std::string kind = type == AVMEDIA_TYPE_AUDIO ? "audio" : "subtitle";
    if (avformat_query_codec(output->oformat, in->codecpar->codec_id, FF_COMPLIANCE_NORMAL) == 0)
      return Status::Error("the " + kind + " stream #" + std::to_string(i) + " (" +
                           avcodec_get_name(in->codecpar->codec_id) + ") of '" + source +
                           "' cannot be copied into " + extension + " files");
    AVStream* out = avformat_new_stream(output.get(), nullptr);
    if (out == nullptr || avcodec_parameters_copy(out->codecpar, in->codecpar) < 0)
      return Status::Error("out of memory opening '" + target + "'");
    // The tag is the source container's name for the codec; the muxer picks its own.
    out->codecpar->codec_tag = 0;
    out->time_base = in->time_base;
    out->disposition = in->disposition;
    av_dict_copy(&out->metadata, in->metadata, 0);
    copyMap[i] = out->index;
    any = true;
  }
  if (!any) copyInput.reset();
  return Status::Ok();
}

Status VideoWriter::Open(const std::string& target, const VideoReader& source,
                         const WriterOptions& options) {
  Abort();
  impl_ = std::make_unique<Impl>();
  Impl& m = *impl_;
  const VideoInfo& info = source.info();
  if (info.width <= 0 || info.height <= 0) return Status::Error("the source is not open");
  if (!m.frame || !m.packet || !m.copyPacket) return Status::Error("out of memory");
  m.target = target;
  m.sequence = IsSequencePattern(target);
  const PathParts parts = Split(target);
  if (m.sequence) {
    m.targetDirectory = parts.directory;
    m.pattern = parts.stem + parts.extension;
    char probe[NAME_MAX + 1];
    if (m.pattern.find('/') != std::string::npos ||
        !TemporaryFiles::FormatNumber(m.pattern.c_str(), 1, probe, sizeof probe))
      return Status::Error("'" + target + "': a sequence is named with one %d or %0Nd");
  }
  Status status = m.CreateTemporary();
  if (!status.ok()) return status;
  m.slot = m.sequence ? TemporaryFiles::RegisterSequence(m.temporary, m.pattern, m.firstNumber)
                      : TemporaryFiles::RegisterFile(m.temporary);
  status = [&]() -> Status {
    const std::string url = m.sequence ? m.temporary + "/" + m.pattern : m.temporary;
    AVFormatContext* raw = nullptr;
    int ret =
        avformat_alloc_output_context2(&raw, nullptr, m.sequence ? "image2" : nullptr, url.c_str());
    if (ret < 0 || raw == nullptr)
      return Status::Error("'" + target + "': no container is known for '" + parts.extension +
                           "' files");
    m.output.reset(raw);
    EncoderChoice choice;
    Status s = m.ChooseEncoder(options, info, &choice);
    if (s.ok()) s = m.OpenEncoder(choice, options, info);
    const bool image = std::strcmp(raw->oformat->name, "image2") == 0;
    if (s.ok() && !image && !IsSequencePattern(source.path()))
      s = m.AddCopiedStreams(source.path(), info);
    if (!s.ok()) return s;
    if (!(raw->oformat->flags & AVFMT_NOFILE)) {
      ret = avio_open(&raw->pb, url.c_str(), AVIO_FLAG_WRITE);
      if (ret < 0) return Status::Error("cannot write '" + target + "': " + AvError(ret));
    }
    AVDictionary* muxing = nullptr;
    // One picture named without a number is rewritten in place rather than refused.
    if (image && !m.sequence) av_dict_set(&muxing, "update", "1", 0);
    if (image && m.sequence)
      av_dict_set(&muxing, "start_number", std::to_string(m.firstNumber).c_str(), 0);
    ret = avformat_write_header(raw, &muxing);
    av_dict_free(&muxing);
    if (ret < 0) {
      // The muxer refuses one of its streams without saying which; name them all.
      std::string streams;
      for (unsigned i = 0; i < raw->nb_streams; ++i)
        streams += std::string(i == 0 ? "" : ", ") +
                   avcodec_get_name(raw->streams[i]->codecpar->codec_id) + " " +
                   av_get_media_type_string(raw->streams[i]->codecpar->codec_type);
      return Status::Error("cannot write '" + target + "' with " + streams + ": " + AvError(ret));
    }
    return Status::Ok();
  }();
  if (!status.ok()) {
    Abort();
    return status;
  }
  m.open = true;
  return Status::Ok();
}

Status VideoWriter::Write(const VideoFrame& source) {
  Impl& m = *impl_;
  if (!m.failure.empty()) return Status::Error(m.failure);
  if (!m.open) return Status::Error("no video is open for writing");
  if (source.bgra.empty() || source.bgra.type() != CV_8UC4)
    return m.Fail("'" + m.target + "': a frame is not 8-bit BGRA");
  AVCodecContext* enc = m.encoder.get();
  m.sws.reset(sws_getCachedContext(m.sws.release(), source.bgra.cols, source.bgra.rows,
                                   AV_PIX_FMT_BGRA, enc->width, enc->height, enc->pix_fmt,
                                   SWS_LANCZOS | SWS_ACCURATE_RND | SWS_FULL_CHR_H_INP, nullptr,
                                   nullptr, nullptr));
  if (!m.sws)
    return m.Fail(std::string("cannot convert BGRA frames to ") +
                  av_get_pix_fmt_name(enc->pix_fmt));
  if (!m.rgbOut)
    sws_setColorspaceDetails(m.sws.get(), sws_getCoefficients(SWS_CS_DEFAULT), 1,
                             sws_getCoefficients(m.matrix), m.fullRange ? 1 : 0, 0, 1 << 16,
                             1 << 16);
  // The encoder may still hold the previous picture.
  if (av_frame_make_writable(m.frame.get()) < 0) return m.Fail("out of memory");
  const uint8_t* planes[1] = {source.bgra.data};
  const int strides[1] = {int(source.bgra.step[0])};
  sws_scale(m.sws.get(), planes, strides, 0, source.bgra.rows, m.frame->data, m.frame->linesize);
  // Where the output's ticks are coarser than the source's, two frames may fall on one tick; the
  // later one moves to the next, as encoders take no repeated times.
  int64_t pts = av_rescale_q(source.pts, m.sourceTimeBase, enc->time_base);
  if (m.framesSent > 0 && pts <= m.lastPts) pts = m.lastPts + 1;
  m.lastPts = pts;
  m.frame->pts = pts;
  m.frame->pict_type = AV_PICTURE_TYPE_NONE;
  // Some encoders (ProRes) store the frame's colour tags rather than the stream's.
  m.frame->color_primaries = enc->color_primaries;
  m.frame->color_trc = enc->color_trc;
  m.frame->colorspace = enc->colorspace;
  m.frame->color_range = enc->color_range;
  const int ret = avcodec_send_frame(enc, m.frame.get());
  if (ret < 0)
    return m.Fail("cannot encode frame " + std::to_string(source.index) + " of '" + m.target +
                  "': " + AvError(ret));
  ++m.framesSent;
  return m.Drain();
}

Status VideoWriter::Impl::Drain() {
  AVCodecContext* enc = encoder.get();
  for (;;) {
    int ret = avcodec_receive_packet(enc, packet.get());
    if (ret == AVERROR(EAGAIN) || ret == AVERROR_EOF) return Status::Ok();
    if (ret < 0) return Fail("cannot encode '" + target + "': " + AvError(ret));
    packet->stream_index = videoOut->index;
    av_packet_rescale_ts(packet.get(), enc->time_base, videoOut->time_base);
    // Sound and subtitles go in up to the picture's time, so that the muxer never has to hold
    // more than a packet or two of either.
    const int64_t when = packet->dts != AV_NOPTS_VALUE ? packet->dts : packet->pts;
    if (when != AV_NOPTS_VALUE) {
      Status copied = CopyUpTo(when, videoOut->time_base);
      if (!copied.ok()) return copied;
    }
    ret = av_interleaved_write_frame(output.get(), packet.get());
    if (ret < 0) return WriteFailure(ret);
    TemporaryFiles::Advance(slot, ++videoPackets);
  }
}

Status VideoWriter::Impl::CopyUpTo(int64_t ts, AVRational timeBase) {
  if (!copyInput) return Status::Ok();
  for (;;) {
    if (!copyPending) {
      // A damaged source ends its copies where reading stops; the reader reports the damage.
      if (av_read_frame(copyInput.get(), copyPacket.get()) < 0) {
        copyInput.reset();
        return Status::Ok();
      }
      const int index = copyPacket->stream_index;
      if (index >= int(copyMap.size()) || copyMap[index] < 0) {
        av_packet_unref(copyPacket.get());
        continue;
      }
      copyPending = true;
    }
    const AVStream* in = copyInput->streams[copyPacket->stream_index];
    const int64_t when = copyPacket->dts != AV_NOPTS_VALUE ? copyPacket->dts : copyPacket->pts;
    if (ts != AV_NOPTS_VALUE && when != AV_NOPTS_VALUE &&
        av_compare_ts(when, in->time_base, ts, timeBase) > 0)
      return Status::Ok();
    const AVStream* out = output->streams[copyMap[copyPacket->stream_index]];
    copyPacket->stream_index = out->index;
    av_packet_rescale_ts(copyPacket.get(), in->time_base, out->time_base);
    copyPacket->pos = -1;
    copyPending = false;
    const int ret = av_interleaved_write_frame(output.get(), copyPacket.get());
    if (ret < 0) return WriteFailure(ret);
  }
}

Status VideoWriter::Finish() {
  Impl& m = *impl_;
  Status status = [&]() -> Status {
    if (!m.failure.empty()) return Status::Error(m.failure);
    if (!m.open) return Status::Error("no video is open for writing");
    if (m.framesSent == 0) return m.Fail("no frame was written to '" + m.target + "'");
    int ret = avcodec_send_frame(m.encoder.get(), nullptr);
    if (ret < 0) return m.Fail("cannot encode '" + m.target + "': " + AvError(ret));
    Status s = m.Drain();
    if (s.ok()) s = m.CopyUpTo(AV_NOPTS_VALUE, AVRational{1, 1});
    if (!s.ok()) return s;
    ret = av_write_trailer(m.output.get());
    if (ret < 0) return m.WriteFailure(ret);
    AVFormatContext* out = m.output.get();
    if (!(out->oformat->flags & AVFMT_NOFILE)) {
      // Buffered bytes reach the disk only now; a full disk shows here first.
      avio_flush(out->pb);
      const int pending = out->pb->error;
      ret = avio_closep(&out->pb);
      if (pending < 0) return m.WriteFailure(pending);
      if (ret < 0) return m.WriteFailure(ret);
    }
    if (m.sequence) {
      char name[NAME_MAX + 1];
      for (int64_t n = 0; n < m.videoPackets; ++n) {
        if (!TemporaryFiles::FormatNumber(m.pattern.c_str(), m.firstNumber + n, name, sizeof name))
          return m.Fail("'" + m.target + "': too many files for the pattern");
        const std::string from = m.temporary + "/" + name;
        const std::string to = m.targetDirectory + "/" + name;
        if (std::rename(from.c_str(), to.c_str()) != 0)
          return m.Fail("cannot write '" + to + "': " + std::strerror(errno));
      }
      rmdir(m.temporary.c_str());
    } else if (std::rename(m.temporary.c_str(), m.target.c_str()) != 0) {
      return m.Fail("cannot write '" + m.target + "': " + std::strerror(errno));
    }
    TemporaryFiles::Release(m.slot);
    m.slot = -1;
    m.temporary.clear();
    m.Close();
    m.open = false;
    return Status::Ok();
  }();
  if (!status.ok()) Abort();
  return status;
}

void VideoWriter::Impl::Close() {
  copyInput.reset();
  output.reset();
  encoder.reset();
  sws.reset();
}

void VideoWriter::Impl::RemoveTemporary() {
  if (temporary.empty()) return;
  if (sequence)
    TemporaryFiles::RemoveSequence(temporary.c_str(), pattern.c_str(), firstNumber,
                                   videoPackets + 1);
  else
    unlink(temporary.c_str());
  temporary.clear();
  TemporaryFiles::Release(slot);
  slot = -1;
}

void VideoWriter::Abort() {
  if (!impl_) return;
  impl_->Close();
  impl_->RemoveTemporary();
  impl_->open = false;
}

}  // namespace tfxtool::media
