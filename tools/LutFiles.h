// The tool's side of 3D LUT files: the one shape of every complaint about a file, the words for
// the plug-in's status codes, and where in a file a reader stopped.
#pragma once

#include <string>
#include <vector>

#include "Status.h"

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

// The points per axis the tool's own ".CUBE" reader takes: the most the format allows. The
// plug-in holds 64.
constexpr int kMaxCubeFileSize = 256;

// A 3D table of any size up to kMaxCubeFileSize, in the plug-in's units: values in 0..255 for
// 0..1, point (i, j, k) = (red, green, blue index) at values[((i * size + j) * size + k) * 3].
struct LutTable {
  int size = 0;
  std::vector<float> values;

  const float* Point(int i, int j, int k) const {
    return values.data() + ((static_cast<size_t>(i) * size + j) * size + k) * 3;
  }
};

// Reads a ".CUBE" file by the plug-in's rules but up to kMaxCubeFileSize points per axis, for
// tables the plug-in refuses. The same header keywords, each once; the same line skipping
// (empty lines, '#' in the first column, bare "\r"); rows with missing numbers keep the previous
// row's values. Like the plug-in, it multiplies each value by the domain's width (DOMAIN_MAX -
// DOMAIN_MIN) without subtracting DOMAIN_MIN, so the table means what the plug-in would make of
// the same file if it were small enough. Errors carry the plug-in's status code and the physical
// line where reading stopped.
Status ReadCubeTable(const std::string& path, LutTable* table);

// The table resampled to m points per axis by tetrahedral interpolation, with doLUT's corner
// choice and weights but on positions that fall anywhere in a cell, and without rounding.
LutTable ResampleTable(const LutTable& in, int m);

}  // namespace tfxtool
