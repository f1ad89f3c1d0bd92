// The tool's side of 3D LUT files: their formats, and tables of any size the format allows,
// read and resampled by the plug-in's own code.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "Status.h"
#include "plugin/FilterTable.h"
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
constexpr int kPluginMaxSize = CubeLut::kMaxSize;  // points per axis the plug-in holds
// A cell of 255 / 32 levels, the common size of the format: finer than most grades bend, and
// 36k points.
constexpr int kDefaultBakeSize = 33;

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

// Loads `path` into `lut` with the reader loadFile would pick, and on failure says where and why
// the reader stopped.
Status LoadThroughPlugin(const std::string& path, const PluginCubeLut& lut);

// A ".CUBE" file of up to kMaxCubeFileSize points per axis, or a ".3DL" file through the
// plug-in's reader (up to kPluginMaxSize); `lut` is the reader's scratch object.
Status ReadLutTable(const PluginCubeLut& lut, const std::string& path, LutTable* table);

// Makes `lut` a table of table.size points (at most kPluginMaxSize) holding `table`.
Status FillLattice(const PluginCubeLut& lut, const LutTable& table);

// Writes the lut through the plug-in's ".CUBE" writer into a temporary file that replaces
// `path` only once it is complete.
Status WriteThroughPlugin(const PluginCubeLut& lut, const std::string& path);

// The identity of n points, i * 255 / (n - 1) per axis; the plug-in's generated lattice is one
// only for n = 32.
LutTable IdentityTable(int n);

// ---- baking filter settings into a table --------------------------------------------------

using TwinFn = CubeLut* (*)(CubeLut*, float);

// A filter whose effect depends on colour alone, and so can be baked: its parameters in the
// order its effect applies them, each with the twin it feeds (null for WhiteBalanceAdjust's,
// which all feed the one balance twin).
struct BakeableFilter {
  const char* name;
  std::vector<std::pair<const char*, TwinFn>> steps;  // parameter, twin
};

// ColorAdjust, LightAdjust and WhiteBalanceAdjust.
const std::vector<BakeableFilter>& BakeableFilters();

// One -f with its -p settings, checked against the filter's parameters and ranges.
struct BakeStep {
  const BakeableFilter* filter = nullptr;
  const FilterInfo* info = nullptr;
  std::vector<double> values;  // per entry of filter->steps; 0 (no change) unless set
};

// Starts a step for the bakeable filter `name`, every value at its default.
Status StartStep(const std::string& name, BakeStep* step);
// One "NAME=VALUE" setting, checked against the filter's parameters and ranges.
Status SetStepParam(const std::string& text, BakeStep* step);
// Applies one step's twins to the lattice, in its effect's order and with its effect's
// conversions of the values.
Status ApplyStep(const PluginCubeLut& lut, const BakeStep& step);

}  // namespace tfxtool
