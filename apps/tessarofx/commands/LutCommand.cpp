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

// What the lut subcommands are given.
struct LutOptions {
  Args positional;
  std::string size;  // --size, "" when absent
  StepList steps;    // bake's -f and -p
};

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
  if (Status s = ReadLutTable(*lut, input, &table); !s.ok()) return s;

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
