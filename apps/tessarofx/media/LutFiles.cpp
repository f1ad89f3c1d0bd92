#include "media/LutFiles.h"

#include <cctype>
#include <cstdio>
#include <cstring>
#include <fstream>

#include "media/ImageFiles.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"
#include "tessarofx/Lut3dAdjust.h"

namespace tfxtool {
namespace {

// The value of a "LUT_3D_SIZE N" line, 0 when the line is not one.
int SizeOnLine(const std::string& text) {
  int n = 0;
  char rest = 0;
  return std::sscanf(text.c_str(), "LUT_3D_SIZE %d %c", &n, &rest) == 1 ? n : 0;
}

}  // namespace

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

// Loads `path` into `lut` with the reader loadFile would pick, and on failure says where and why
// the reader stopped.
Status LoadThroughPlugin(const std::string& path, const PluginCubeLut& lut) {
  const LutFormat format = LutFormatOf(path);
  if (format == LutFormat::kNone) {
    return Status::Error(LutFileMessage(path, "not a .cube or .3dl file"));
  }
  std::ifstream in(path, std::ios::in | std::ios::binary);
  if (!in.is_open()) return Status::Error(LutFileMessage(path, "cannot be opened"));
  CubeLut::Stop stop;
  const int status = format == LutFormat::kCube ? lut.LoadCube(in, &stop) : lut.Load3Dl(in, &stop);
  if (status == 0) return Status::Ok();

  std::string reason = lut.StopMessage(path, stop);
  const int size = SizeOnLine(stop.text);
  if (status == 23 && size > kPluginMaxSize && size <= kMaxCubeFileSize) {
    reason += "; 'tessarofx lut convert " + path + " OUT.cube --size " +
              std::to_string(kPluginMaxSize) +
              "' (or smaller) resamples it to a size the plug-in takes";
  }
  return Status::Error(reason);
}

Status ReadLutTable(const PluginCubeLut& lut, const std::string& path, LutTable* table) {
  switch (LutFormatOf(path)) {
    case LutFormat::kCube:
      return ReadCubeTable(lut, path, table);
    case LutFormat::k3dl: {
      // ".3DL" tables go through the plug-in's reader, so up to 64 points per axis.
      if (Status s = LoadThroughPlugin(path, lut); !s.ok()) return s;
      table->values.clear();
      const float* lattice = lut.Lattice(&table->size);
      const int cap = kPluginMaxSize;
      for (int i = 0; i < table->size; ++i) {
        for (int j = 0; j < table->size; ++j) {
          for (int k = 0; k < table->size; ++k) {
            const float* p = lattice + ((i * cap + j) * cap + k) * 3;
            table->values.insert(table->values.end(), p, p + 3);
          }
        }
      }
      return Status::Ok();
    }
    case LutFormat::kNone:
      break;
  }
  return Status::Error(LutFileMessage(path, "not a .cube or .3dl file"));
}

// Makes `lut` a table of table.size points (at most 64) holding `table`.
Status FillLattice(const PluginCubeLut& lut, const LutTable& table) {
  lut.Generate(table.size);
  int size = 0;
  float* lattice = lut.Lattice(&size);
  if (size != table.size) {
    return Status::Error("the plug-in refused a size of " + std::to_string(table.size));
  }
  const int cap = kPluginMaxSize;
  for (int i = 0; i < size; ++i) {
    for (int j = 0; j < size; ++j) {
      for (int k = 0; k < size; ++k) {
        std::memcpy(lattice + ((i * cap + j) * cap + k) * 3, table.Point(i, j, k),
                    3 * sizeof(float));
      }
    }
  }
  return Status::Ok();
}

// Writes the lut through the plug-in's ".CUBE" writer into a temporary file that replaces
// `path` only once it is complete.
Status WriteThroughPlugin(const PluginCubeLut& lut, const std::string& path) {
  return ReplaceFileVia(path, [&](int, const std::string& temporary) {
    return lut.Write(temporary) ? Status::Ok() : Status::Error("the plug-in's writer failed");
  });
}

const std::vector<BakeableFilter>& BakeableFilters() {
  static const std::vector<BakeableFilter> kFilters = {
      {"ColorAdjust",
       {{"u_exposure", &lut3d_exposureAdjustment},
        {"u_brightness", &lut3d_brightnessAdjustment},
        {"u_contrast", &lut3d_contrastAdjustment},
        {"u_vib", &lut3d_vibranceAdjustment},
        {"u_sat", &lut3d_saturationAdjustment}}},
      {"LightAdjust",
       {{"u_highLight", &lut3d_hdrHighlight},
        {"u_shadow", &lut3d_hdrShadow},
        {"u_whiteLevel", &lut3d_hdrWhiteLevel},
        {"u_blackLevel", &lut3d_hdrBlackLevel}}},
      // The effect reads the gains and does not apply them; so does the bake.
      {"WhiteBalanceAdjust",
       {{"u_temperature", nullptr},
        {"u_tint", nullptr},
        {"u_rgain", nullptr},
        {"u_ggain", nullptr},
        {"u_bgain", nullptr}}},
  };
  return kFilters;
}

Status StartStep(const std::string& name, BakeStep* step) {
  std::string names;
  for (const BakeableFilter& f : BakeableFilters()) {
    names += (names.empty() ? "" : ", ") + std::string(f.name);
    if (EqualsNoCase(f.name, name)) step->filter = &f;
  }
  if (!step->filter) {
    return Status::Error("lut bake: '" + name +
                         "' cannot be baked into a table (bakeable: " + names + ")");
  }
  step->info = FindFilterByName(step->filter->name);
  if (!step->info) return Status::Error(std::string("no parameters known for ") + name);
  step->values.assign(step->filter->steps.size(), 0.0);
  for (size_t i = 0; i < step->values.size(); ++i) {
    for (const ParamInfo& p : step->info->params) {
      if (EqualsNoCase(p.name, step->filter->steps[i].first)) step->values[i] = p.defaultValue;
    }
  }
  return Status::Ok();
}

Status SetStepParam(const std::string& text, BakeStep* step) {
  ParamSetting setting;
  if (Status s = ParseParamSetting(text, &setting); !s.ok()) return s;
  const std::string& filter = step->filter->name;
  const auto& steps = step->filter->steps;
  size_t i = 0;
  while (i < steps.size() && !EqualsNoCase(steps[i].first, setting.name)) ++i;
  if (i == steps.size()) {
    std::string valid;
    for (const auto& s : steps) valid += (valid.empty() ? "" : ", ") + std::string(s.first);
    return Status::Error(filter + " has no parameter '" + setting.name + "' (valid: " + valid +
                         ")");
  }
  double v = 0;
  if (!ParseNumber(setting.value, &v)) {
    return Status::Error("bad value '" + setting.value + "' for " + steps[i].first +
                         ": not a number");
  }
  for (const ParamInfo& p : step->info->params) {
    if (EqualsNoCase(p.name, steps[i].first) && (v < p.min || v > p.max)) {
      return Status::Error(filter + " " + p.name + " = " + setting.value +
                           " is outside its range " + FormatNumber(p.min) + ".." +
                           FormatNumber(p.max));
    }
  }
  step->values[i] = v;  // the last setting of a name wins, as in apply
  return Status::Ok();
}

// Applies one step's twins to the lattice, in its effect's order and with its effect's
// conversions of the values.
Status ApplyStep(const PluginCubeLut& lut, const BakeStep& step) {
  if (!step.filter->steps.front().second) {
    // a = temperature / 200 and b = tint / 200 in double, passed as float.
    lut3d_adjustWhiteBalance(lut.get(), static_cast<float>(step.values[0] / 200.0),
                             static_cast<float>(step.values[1] / 200.0));
    return Status::Ok();
  }
  for (size_t i = 0; i < step.values.size(); ++i) {
    step.filter->steps[i].second(lut.get(), static_cast<float>(step.values[i]));
  }
  return Status::Ok();
}

// The identity of n points, i * 255 / (n - 1) per axis; the plug-in's generated lattice is one
// only for n = 32.
LutTable IdentityTable(int n) {
  LutTable table;
  table.size = n;
  table.values.reserve(static_cast<size_t>(n) * n * n * 3);
  const auto level = [n](int i) {
    return static_cast<float>(i) * 255.0f / static_cast<float>(n - 1);
  };
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k) {
        table.values.insert(table.values.end(), {level(i), level(j), level(k)});
      }
    }
  }
  return table;
}

}  // namespace tfxtool
