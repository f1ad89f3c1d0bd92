// tessarofx lut: looks into 3D LUT files with the plug-in's own reader, converts and resamples
// them to tables the plug-in takes, and bakes adjustments into new ones.
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>
#include <vector>

#include "commands/Commands.h"
#include "media/ImageFiles.h"
#include "media/LutFiles.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"
#include "plugin/FilterTable.h"
#include "plugin/PluginCubeLut.h"
#include "tessarofx/CubeLut.h"
#include "tessarofx/Lut3dAdjust.h"

namespace tfxtool {
namespace {

constexpr int kPluginMaxSize = CubeLut::kMaxSize;  // points per axis the plug-in holds
// A cell of 255 / 32 levels, the common size of the format: finer than most grades bend, and
// 36k points.
constexpr int kDefaultBakeSize = 33;

// A subcommand's words: its positional arguments and, where it takes one, the --size value
// ("" when absent). "--" ends the options.
Status SplitArgs(const std::string& command, const Args& args, std::string* size,
                 Args* positional) {
  bool optionsEnded = false;
  for (size_t i = 0; i < args.size(); ++i) {
    Status error;
    if (optionsEnded || !IsOptionWord(args[i])) {
      positional->push_back(args[i]);
    } else if (args[i] == "--") {
      optionsEnded = true;
    } else if (!size || !TakeOptionValue(args, &i, "--size", nullptr, size, &error)) {
      if (!error.ok()) return error;
      return Status::Error(command + ": unknown option '" + args[i] + "'");
    }
  }
  return Status::Ok();
}

// The value of a "LUT_3D_SIZE N" line, 0 when the line is not one.
int SizeOnLine(const std::string& text) {
  int n = 0;
  char rest = 0;
  return std::sscanf(text.c_str(), "LUT_3D_SIZE %d %c", &n, &rest) == 1 ? n : 0;
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

Status InfoCommand(const GlobalOptions& options, const Args& words) {
  Args args;
  if (Status s = SplitArgs("lut info", words, nullptr, &args); !s.ok()) return s;
  if (args.size() != 1) return Status::Error("lut info takes one FILE");
  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::unique_ptr<PluginCubeLut> lut;
  if (Status s = PluginCubeLut::Create(plugin, &lut); !s.ok()) return s;
  if (Status s = LoadThroughPlugin(args[0], *lut); !s.ok()) return s;

  int size = 0;
  lut->Lattice(&size);
  float lo[3], hi[3];
  lut->Domain(lo, hi);
  const std::string title = lut->Title();
  std::printf("file:    %s\n", args[0].c_str());
  std::printf("size:    %d points per axis\n", size);
  std::printf("title:   %s\n", title.empty() ? "(none)" : title.c_str());
  // The plug-in multiplies a ".CUBE" value by the domain's width without subtracting its
  // minimum, so a domain other than 0..1 changes what the table does; worth seeing.
  std::printf("domain:  %s %s %s .. %s %s %s\n", FormatNumber(lo[0]).c_str(),
              FormatNumber(lo[1]).c_str(), FormatNumber(lo[2]).c_str(), FormatNumber(hi[0]).c_str(),
              FormatNumber(hi[1]).c_str(), FormatNumber(hi[2]).c_str());
  return Status::Ok();
}

Status ParseSize(const std::string& text, int* size) {
  long long n = 0;
  if (!ParseInteger(text, &n) || n < 2 || n > kPluginMaxSize) {
    return Status::Error("bad --size '" + text + "': a whole number from 2 to " +
                         std::to_string(kPluginMaxSize));
  }
  *size = static_cast<int>(n);
  return Status::Ok();
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

Status ConvertCommand(const GlobalOptions& options, const Args& args) {
  std::string sizeText;
  Args positional;
  if (Status s = SplitArgs("lut convert", args, &sizeText, &positional); !s.ok()) return s;
  if (positional.size() != 2) {
    return Status::Error("lut convert takes IN and OUT (see tessarofx --help)");
  }
  const std::string& input = positional[0];
  const std::string& output = positional[1];
  int size = 0;
  if (!sizeText.empty()) {
    if (Status s = ParseSize(sizeText, &size); !s.ok()) return s;
  }
  if (LutFormatOf(output) != LutFormat::kCube) {
    return Status::Error("cannot write " + output + ": lut convert writes .cube files");
  }

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::unique_ptr<PluginCubeLut> lut;
  if (Status s = PluginCubeLut::Create(plugin, &lut); !s.ok()) return s;

  LutTable table;
  switch (LutFormatOf(input)) {
    case LutFormat::kCube:
      if (Status s = ReadCubeTable(*lut, input, &table); !s.ok()) return s;
      break;
    case LutFormat::k3dl: {
      // ".3DL" tables go through the plug-in's reader, so up to 64 points per axis.
      if (Status s = LoadThroughPlugin(input, *lut); !s.ok()) return s;
      const float* lattice = lut->Lattice(&table.size);
      const int cap = kPluginMaxSize;
      for (int i = 0; i < table.size; ++i) {
        for (int j = 0; j < table.size; ++j) {
          for (int k = 0; k < table.size; ++k) {
            const float* p = lattice + ((i * cap + j) * cap + k) * 3;
            table.values.insert(table.values.end(), p, p + 3);
          }
        }
      }
      break;
    }
    case LutFormat::kNone:
      return Status::Error(LutFileMessage(input, "not a .cube or .3dl file"));
  }

  if (size == 0) {
    if (table.size > kPluginMaxSize) {
      return Status::Error(LutFileMessage(
          input, std::to_string(table.size) + " points per axis, more than the plug-in's " +
                     std::to_string(kPluginMaxSize) + ": pass --size " +
                     std::to_string(kPluginMaxSize) + " (or smaller) to resample it"));
    }
  } else if (size != table.size) {
    table = ResampleTable(*lut, table, size);
  }
  if (Status s = FillLattice(*lut, table); !s.ok()) return s;
  if (Status s = WriteThroughPlugin(*lut, output); !s.ok()) return s;
  std::printf("wrote %s (%d points per axis)\n", output.c_str(), table.size);
  return Status::Ok();
}

// ---- bake ---------------------------------------------------------------------------------

using TwinFn = CubeLut* (*)(CubeLut*, float);

// A filter whose effect depends on colour alone, and so can be baked: its parameters in the
// order its effect applies them, each with the twin it feeds (null for WhiteBalanceAdjust's,
// which all feed the one balance twin).
struct BakeableFilter {
  const char* name;
  std::vector<std::pair<const char*, TwinFn>> steps;  // parameter, twin
};

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

// One -f with its -p settings, checked against the filter's parameters and ranges.
struct BakeStep {
  const BakeableFilter* filter = nullptr;
  const FilterInfo* info = nullptr;
  std::vector<double> values;  // per entry of filter->steps; 0 (no change) unless set
};

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

Status BakeCommand(const GlobalOptions& options, const Args& args) {
  std::vector<BakeStep> steps;
  std::string sizeText;
  Args positional;
  bool optionsEnded = false;
  for (size_t i = 0; i < args.size(); ++i) {
    Status error;
    std::string value;
    if (optionsEnded || !IsOptionWord(args[i])) {
      positional.push_back(args[i]);
    } else if (args[i] == "--") {
      optionsEnded = true;
    } else if (TakeOptionValue(args, &i, "--filter", "-f", &value, &error)) {
      steps.emplace_back();
      if (Status s = StartStep(value, &steps.back()); !s.ok()) return s;
    } else if (error.ok() && TakeOptionValue(args, &i, "--param", "-p", &value, &error)) {
      if (steps.empty()) {
        return Status::Error("lut bake: -p " + value + " needs a -f FILTER before it");
      }
      if (Status s = SetStepParam(value, &steps.back()); !s.ok()) return s;
    } else if (error.ok() && !TakeOptionValue(args, &i, "--size", nullptr, &sizeText, &error) &&
               error.ok()) {
      return Status::Error("lut bake: unknown option '" + args[i] + "'");
    }
    if (!error.ok()) return error;
  }
  if (positional.size() != 1) {
    return Status::Error("lut bake takes one OUT.cube (see tessarofx --help)");
  }
  const std::string& output = positional[0];
  int size = kDefaultBakeSize;
  if (!sizeText.empty()) {
    if (Status s = ParseSize(sizeText, &size); !s.ok()) return s;
  }
  if (LutFormatOf(output) != LutFormat::kCube) {
    return Status::Error("cannot write " + output + ": lut bake writes .cube files");
  }

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::unique_ptr<PluginCubeLut> lut;
  if (Status s = PluginCubeLut::Create(plugin, &lut); !s.ok()) return s;
  if (Status s = FillLattice(*lut, IdentityTable(size)); !s.ok()) return s;
  for (const BakeStep& step : steps) {
    if (Status s = ApplyStep(*lut, step); !s.ok()) return s;
  }
  if (Status s = WriteThroughPlugin(*lut, output); !s.ok()) return s;
  std::printf("wrote %s (%d points per axis)\n", output.c_str(), size);
  return Status::Ok();
}

}  // namespace

Status LutCommand(const GlobalOptions& options, const Args& args) {
  if (args.empty()) {
    return Status::Error("lut needs a subcommand: info, convert, bake (see tessarofx --help)");
  }
  const Args rest(args.begin() + 1, args.end());
  if (args[0] == "info") return InfoCommand(options, rest);
  if (args[0] == "convert") return ConvertCommand(options, rest);
  if (args[0] == "bake") return BakeCommand(options, rest);
  return Status::Error("unknown lut subcommand '" + args[0] + "' (known: info, convert, bake)");
}

}  // namespace tfxtool
