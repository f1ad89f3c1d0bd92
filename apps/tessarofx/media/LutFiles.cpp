#include "media/LutFiles.h"

#include <cctype>
#include <fstream>

namespace tfxtool {

std::string LutFileMessage(const std::string& file, const std::string& reason) {
  return file + ": " + reason;
}

LutFormat LutFormatOf(const std::string& path) {
  const size_t dot = path.rfind('.');
  if (dot == std::string::npos) return LutFormat::kNone;
  std::string ext = path.substr(dot);
  for (char& c : ext) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  if (ext == ".CUBE") return LutFormat::kCube;
  if (ext == ".3DL") return LutFormat::k3dl;
  return LutFormat::kNone;
}

Status ReadCubeTable(const PluginCubeLut& lut, const std::string& path, LutTable* table) {
  std::ifstream in(path, std::ios::in | std::ios::binary);
  if (!in.is_open()) return Status::Error(LutFileMessage(path, "cannot be opened"));
  CubeLut::Stop stop;
  if (lut.LoadCubeLattice(in, &table->values, &table->size, &stop) != 0) {
    return Status::Error(lut.StopMessage(path, stop));
  }
  return Status::Ok();
}

LutTable ResampleTable(const PluginCubeLut& lut, const LutTable& in, int m) {
  LutTable out;
  out.size = m;
  out.values.resize(static_cast<size_t>(m) * m * m * 3);
  // Output index i of m lands at i * (n - 1) / (m - 1) points into the input, in float as the
  // plug-in's tables are; the last index lands exactly on the last point.
  const auto position = [m, n = in.size](int i) {
    return static_cast<float>(i) * static_cast<float>(n - 1) / static_cast<float>(m - 1);
  };
  float* p = out.values.data();
  for (int i = 0; i < m; ++i) {
    for (int j = 0; j < m; ++j) {
      for (int k = 0; k < m; ++k, p += 3) {
        lut.Interpolate(in.values.data(), in.size, position(i), position(j), position(k), p);
      }
    }
  }
  return out;
}

}  // namespace tfxtool
