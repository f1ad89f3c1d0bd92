#include "media/ImageFiles.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cctype>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>
#include <vector>

namespace tfxtool {
namespace {

std::string LowerExtension(const std::string& path) {
  const size_t slash = path.rfind('/');
  const size_t dot = path.rfind('.');
  if (dot == std::string::npos || (slash != std::string::npos && dot < slash)) return {};
  std::string ext = path.substr(dot);
  for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return ext;
}

enum class Alpha { kKeep, kDrop };

bool FormatOf(const std::string& path, Alpha* alpha) {
  const std::string ext = LowerExtension(path);
  if (ext == ".png" || ext == ".tif" || ext == ".tiff" || ext == ".webp") {
    *alpha = Alpha::kKeep;
    return true;
  }
  if (ext == ".jpg" || ext == ".jpeg" || ext == ".bmp") {
    *alpha = Alpha::kDrop;
    return true;
  }
  return false;
}

// Any supported sample type to 8 bits; truncating shifts, not rounding, so that a 16-bit file
// written from 8-bit data (v * 257) comes back as exactly v.
Status To8Bit(const cv::Mat& in, cv::Mat* out) {
  switch (in.depth()) {
    case CV_8U:
      *out = in;
      return Status::Ok();
    case CV_16U: {
      cv::Mat m(in.size(), CV_8UC(in.channels()));
      for (int y = 0; y < in.rows; ++y) {
        const uint16_t* s = in.ptr<uint16_t>(y);
        uint8_t* d = m.ptr<uint8_t>(y);
        for (int i = 0; i < in.cols * in.channels(); ++i) d[i] = static_cast<uint8_t>(s[i] >> 8);
      }
      *out = m;
      return Status::Ok();
    }
    case CV_32F:
      in.convertTo(*out, CV_8U, 255.0);
      return Status::Ok();
    default:
      return Status::Error("unsupported sample type");
  }
}

Status CloseAndRename(int fd, const std::string& tmp, const std::string& path) {
  if (close(fd) != 0) return Status::Error(std::strerror(errno));
  if (rename(tmp.c_str(), path.c_str()) != 0) return Status::Error(std::strerror(errno));
  return Status::Ok();
}

Status WriteAll(int fd, const std::vector<uchar>& bytes) {
  size_t done = 0;
  while (done < bytes.size()) {
    const ssize_t n = write(fd, bytes.data() + done, bytes.size() - done);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return Status::Error(std::strerror(n < 0 ? errno : EIO));
    done += static_cast<size_t>(n);
  }
  return Status::Ok();
}

}  // namespace

Status ReadImage(const std::string& path, cv::Mat* bgra) {
  // Read the bytes ourselves so that a missing file and an undecodable one get distinct messages.
  std::ifstream in(path, std::ios::binary);
  if (!in) return Status::Error("cannot read " + path + ": " + std::strerror(errno));
  std::vector<uchar> bytes((std::istreambuf_iterator<char>(in)), std::istreambuf_iterator<char>());
  if (in.bad()) return Status::Error("cannot read " + path + ": " + std::strerror(errno));
  cv::Mat decoded;
  if (!bytes.empty()) decoded = cv::imdecode(bytes, cv::IMREAD_UNCHANGED);
  if (decoded.empty()) return Status::Error(path + " is not an image the tool can decode");

  cv::Mat eight;
  if (Status s = To8Bit(decoded, &eight); !s.ok()) {
    return Status::Error(path + ": " + s.message());
  }
  switch (eight.channels()) {
    case 1:
      cv::cvtColor(eight, *bgra, cv::COLOR_GRAY2BGRA);
      break;
    case 3:
      cv::cvtColor(eight, *bgra, cv::COLOR_BGR2BGRA);
      break;
    case 4:
      *bgra = eight.clone();
      break;
    default:
      return Status::Error(path + ": " + std::to_string(eight.channels()) +
                           "-channel images are not supported");
  }
  return Status::Ok();
}

Status CheckWritableFormat(const std::string& path) {
  Alpha alpha;
  if (!FormatOf(path, &alpha)) {
    return Status::Error("cannot write " + path +
                         ": unknown image format (use .png, .tif, .webp, .jpg or .bmp)");
  }
  return Status::Ok();
}

Status WriteImage(const std::string& path, const cv::Mat& bgra) {
  Alpha alpha;
  if (Status s = CheckWritableFormat(path); !s.ok()) return s;
  FormatOf(path, &alpha);

  cv::Mat image = bgra;
  if (alpha == Alpha::kDrop) cv::cvtColor(bgra, image, cv::COLOR_BGRA2BGR);
  std::vector<uchar> bytes;
  bool encoded = false;
  try {
    encoded = cv::imencode(LowerExtension(path), image, bytes);
  } catch (const cv::Exception& e) {
    return Status::Error("cannot encode " + path + ": " + e.err);
  }
  if (!encoded) return Status::Error("cannot encode " + path);

  return WriteFileReplacing(path, bytes);
}

Status WriteFileReplacing(const std::string& path, const std::vector<unsigned char>& bytes) {
  return ReplaceFileVia(path, [&](int fd, const std::string&) { return WriteAll(fd, bytes); });
}

Status ReplaceFileVia(const std::string& path,
                      const std::function<Status(int fd, const std::string& temporary)>& write) {
  // The temporary lives beside the target: rename is only atomic within one file system.
  const size_t slash = path.rfind('/');
  const size_t cut = slash == std::string::npos ? 0 : slash + 1;
  std::string tmp = path.substr(0, cut) + "." + path.substr(cut) + ".XXXXXX";
  std::vector<char> name(tmp.begin(), tmp.end());
  name.push_back('\0');
  const int fd = mkstemp(name.data());
  if (fd < 0) return Status::Error("cannot write " + path + ": " + std::strerror(errno));
  tmp = name.data();
  // mkstemp creates the file private to the user; give it the mode a plain create would.
  const mode_t mask = umask(0);
  umask(mask);
  fchmod(fd, 0666 & ~mask);

  Status s = write(fd, tmp);
  if (s.ok()) {
    s = CloseAndRename(fd, tmp, path);
  } else {
    close(fd);
  }
  if (!s.ok()) {
    unlink(tmp.c_str());
    return Status::Error("cannot write " + path + ": " + s.message());
  }
  return Status::Ok();
}

}  // namespace tfxtool
