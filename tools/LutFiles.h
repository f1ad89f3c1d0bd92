// The tool's side of 3D LUT files: the one shape of every complaint about a file, the words for
// the plug-in's status codes, and where in a file a reader stopped.
#pragma once

#include <string>

namespace tfxtool {

// Every complaint about a LUT file has this shape, from this one helper:
//   FILE, line N ("TEXT"): REASON
// Line numbers are physical (comments and blank lines count) and start at 1; line 0 leaves the
// line and its text out. The text is cut to a readable length and control bytes are escaped.
std::string LutFileMessage(const std::string& file, long line, const std::string& text,
                           const std::string& reason);

// What a CubeLut status code means, in words ("" for 0).
std::string LutStatusMeaning(int status);

// The two formats, told apart by the extension in any letter case as the plug-in does.
enum class LutFormat { kNone, kCube, k3dl };
LutFormat LutFormatOf(const std::string& path);

struct LutLine {
  long number = 0;   // physical, from 1
  std::string text;  // without its terminator or a trailing '\r'
};

// The physical line where a plug-in reader stopped, from the stream position it left (`offset`,
// read with the flags cleared) and its status:
//   - the line holding the last byte it consumed (line 1 when it consumed nothing);
//   - except that a ".CUBE" header is only checked as a whole once the first table row has been
//     read and put back, with the comments and blank lines before it: then (status 22, or 23
//     without a LUT_3D_SIZE line just read) the line is that first table row.
LutLine LocateStop(const std::string& path, LutFormat format, long long offset, int status);

// The most points per axis the ".CUBE" format allows; the plug-in holds 64.
constexpr int kMaxCubeFileSize = 256;

}  // namespace tfxtool
