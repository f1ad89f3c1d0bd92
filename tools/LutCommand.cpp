// tessarofx lut: looks into 3D LUT files with the plug-in's own reader.
#include <cstdio>
#include <fstream>
#include <memory>

#include "Commands.h"
#include "LutFiles.h"
#include "PluginCubeLut.h"
#include "Text.h"
#include "tessarofx/CubeLut.h"

namespace tfxtool {
namespace {

constexpr int kPluginMaxSize = CubeLut::kMaxSize;  // points per axis the plug-in holds

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
    return Status::Error(LutFileMessage(path, 0, "", "not a .cube or .3dl file"));
  }
  std::ifstream in(path, std::ios::in | std::ios::binary);
  if (!in.is_open()) return Status::Error(LutFileMessage(path, 0, "", "cannot be opened"));
  const int status = format == LutFormat::kCube ? lut.LoadCube(in) : lut.Load3Dl(in);
  if (status == 0) return Status::Ok();

  in.clear();
  const long long offset = static_cast<long long>(in.tellg());
  const LutLine stop = LocateStop(path, format, offset, status);
  std::string reason = "status " + std::to_string(status) + ", " + LutStatusMeaning(status);
  const int size = SizeOnLine(stop.text);
  if (status == 23 && size > kPluginMaxSize && size <= kMaxCubeFileSize) {
    reason += "; 'tessarofx lut convert " + path + " OUT.cube --size " +
              std::to_string(kPluginMaxSize) +
              "' (or smaller) resamples it to a size the plug-in takes";
  }
  return Status::Error(LutFileMessage(path, stop.number, stop.text, reason));
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

}  // namespace

Status LutCommand(const GlobalOptions& options, const Args& args) {
  if (args.empty()) {
    return Status::Error("lut needs a subcommand: info (see tessarofx --help)");
  }
  const Args rest(args.begin() + 1, args.end());
  if (args[0] == "info") return InfoCommand(options, rest);
  return Status::Error("unknown lut subcommand '" + args[0] + "' (known: info)");
}

}  // namespace tfxtool
