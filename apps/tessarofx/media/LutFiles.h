// The tool's side of 3D LUT files: their formats, and tables of any size the format allows,
// read and resampled by the plug-in's own code.
#pragma once

#include <string>
#include <vector>

#include "Status.h"
#include "plugin/PluginCubeLut.h"

namespace tfxtool {

// A complaint about a LUT file as a whole ("FILE: REASON"), in the shape of the plug-in's
// complaints about a line of one.
std::string LutFileMessage(const std::string& file, const std::string& reason);

// The two formats, told apart by the extension in any letter case as the plug-in does.
enum class LutFormat { kNone, kCube, k3dl };
LutFormat LutFormatOf(const std::string& path);

// The points per axis a table the tool converts may have: the most the format allows. The
// plug-in's lattice holds 64.
constexpr int kMaxCubeFileSize = CubeLut::kMaxFileSize;

// A 3D table of any size up to kMaxCubeFileSize, in the plug-in's units: values in 0..255 for
// 0..1, point (i, j, k) = (red, green, blue index) at values[((i * size + j) * size + k) * 3].
struct LutTable {
  int size = 0;
  std::vector<float> values;

  const float* Point(int i, int j, int k) const {
    return values.data() + ((static_cast<size_t>(i) * size + j) * size + k) * 3;
  }
};

// Reads a ".CUBE" file of up to kMaxCubeFileSize points per axis with the plug-in's reader for
// such tables: what the plug-in would make of the file if its lattice were big enough. Errors are
// the plug-in's message, with the physical line where reading stopped.
Status ReadCubeTable(const PluginCubeLut& lut, const std::string& path, LutTable* table);

// The table resampled to m points per axis with the plug-in's tetrahedral interpolation, on
// positions that fall anywhere in a cell and without rounding.
LutTable ResampleTable(const PluginCubeLut& lut, const LutTable& in, int m);

}  // namespace tfxtool
