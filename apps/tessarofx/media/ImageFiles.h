// Image files in and out. Everything inside the tool is 8-bit BGRA, the frames' own format.
#pragma once

#include <functional>
#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "Status.h"

namespace tfxtool {

// Reads any image OpenCV decodes into a packed 8-bit BGRA matrix: grey and BGR become opaque
// BGRA, 16-bit samples keep their high byte, floating-point samples are taken as 0..1.
Status ReadImage(const std::string& path, cv::Mat* bgra);

// True when the file name's extension is a format the tool writes.
Status CheckWritableFormat(const std::string& path);

// Encodes a BGRA image by the file name's extension (PNG, TIFF and WebP keep alpha, JPEG and BMP
// drop it) and replaces `path` in one step: the bytes go to a temporary file in the same
// directory that is renamed onto the target, so a failure never leaves a partial file behind.
Status WriteImage(const std::string& path, const cv::Mat& bgra);

// Replaces `path` with `bytes` the same way.
Status WriteFileReplacing(const std::string& path, const std::vector<unsigned char>& bytes);

// The same for content that something else writes: `write` gets the temporary file, already
// created with the mode a plain create would give, as an open descriptor and by name (whoever
// writes by name opens it again); the temporary replaces `path` only when `write` succeeds, and
// is removed otherwise.
Status ReplaceFileVia(const std::string& path,
                      const std::function<Status(int fd, const std::string& temporary)>& write);

}  // namespace tfxtool
