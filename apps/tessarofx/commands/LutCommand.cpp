// tessarofx lut: looks into 3D LUT files with the plug-in's own reader, converts and resamples
// them to tables the plug-in takes, and bakes adjustments into new ones.
#include <CLI/CLI.hpp>
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

// What the lut subcommands are given.
struct LutOptions {
  Args positional;
  std::string size;  // --size, "" when absent
  StepList steps;    // bake's -f and -p
};

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

Status InfoCommand(const GlobalOptions& options, const LutOptions& given) {
  const Args& args = given.positional;
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

Status ConvertCommand(const GlobalOptions& options, const LutOptions& given) {
  const std::string& sizeText = given.size;
  const Args& positional = given.positional;
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

  // Reading and resampling a 256-point table take seconds.
  Reporter& report = *options.reporter;
  report.Start("lut convert", 3);
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

  report.Advance();
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
  report.Advance();
  if (Status s = FillLattice(*lut, table); !s.ok()) return s;
  if (Status s = WriteThroughPlugin(*lut, output); !s.ok()) return s;
  report.Advance();
  report.Finish();
  report.Note("wrote " + output + " (" + std::to_string(table.size) + " points per axis)");
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

Status BakeCommand(const GlobalOptions& options, const LutOptions& given) {
  if (!given.steps.leading.empty()) {
    return Status::Error("lut bake: -p " + given.steps.leading.front() +
                         " needs a -f FILTER before it");
  }
  std::vector<BakeStep> steps;
  for (const StepWords& words : given.steps.steps) {
    steps.emplace_back();
    if (Status s = StartStep(words.filter, &steps.back()); !s.ok()) return s;
    for (const std::string& param : words.params) {
      if (Status s = SetStepParam(param, &steps.back()); !s.ok()) return s;
    }
  }
  const std::string& sizeText = given.size;
  const Args& positional = given.positional;
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
  Reporter& report = *options.reporter;
  report.Start("lut bake", steps.size());
  for (const BakeStep& step : steps) {
    if (Status s = ApplyStep(*lut, step); !s.ok()) return s;
    report.Advance();
  }
  report.Finish();
  if (Status s = WriteThroughPlugin(*lut, output); !s.ok()) return s;
  report.Note("wrote " + output + " (" + std::to_string(size) + " points per axis)");
  return Status::Ok();
}

}  // namespace

void AddLutCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands) {
  CLI::App* lut = app.add_subcommand("lut", "Looks into, converts and bakes 3D LUT files.");
  lut->require_subcommand(0, 1);
  // A word that names no subcommand lands here, for a message that lists the known ones.
  auto unknown = std::make_shared<Args>();
  lut->add_option("SUBCOMMAND", *unknown, "info, convert or bake")->type_name("");
  commands->push_back({lut, unknown.get(), [unknown]() {
                         if (unknown->empty()) {
                           return Status::Error(
                               "lut needs a subcommand: info, convert, bake (see tessarofx lut "
                               "--help)");
                         }
                         return Status::Error("unknown lut subcommand '" + unknown->front() +
                                              "' (known: info, convert, bake)");
                       }});

  using Run = Status (*)(const GlobalOptions&, const LutOptions&);
  const auto add = [&](const char* name, const char* about, const char* words, Run run) {
    CLI::App* sub = lut->add_subcommand(name, about);
    auto given = std::make_shared<LutOptions>();
    sub->add_option("FILES", given->positional, words)->type_name("");
    commands->push_back(
        {sub, &given->positional, [&options, given, run] { return run(options, *given); }});
    return std::make_pair(sub, given);
  };
  add("info", "Prints a .cube or .3dl file's size, title and domain.", "FILE", InfoCommand)
      .first->footer(R"(
Reads the file with the plug-in's own reader; a file it refuses is shown with the line where
reading stopped and why.)");
  const auto [convert, convertOptions] =
      add("convert", "Rewrites a .cube or .3dl table as a .cube file the plug-in reads.",
          "IN OUT.cube", ConvertCommand);
  convert->footer(R"(
IN may be a .cube file of up to 256 points per axis or a .3dl file; tables above the plug-in's
64 points need --size, which resamples by tetrahedral interpolation.)");
  convert->add_option("--size", convertOptions->size, "resample to N points per axis (2..64)")
      ->type_name("N");
  const auto [bake, bakeOptions] =
      add("bake", "Bakes colour filter settings into a .cube table.", "OUT.cube", BakeCommand);
  bake->footer(R"(
  tessarofx lut bake [-f FILTER [-p NAME=VALUE]...]... [--size N] OUT.cube

Bakes ColorAdjust, LightAdjust and WhiteBalanceAdjust settings (the parameters apply takes), in
the order given; ColorLut3dAdjust then applies the whole chain in one pass.)");
  AddStepOptions(bake, &bakeOptions->steps);
  bake->add_option("--size", bakeOptions->size, "points per axis, 2..64 (default 33)")
      ->type_name("N");
}

}  // namespace tfxtool
