// tessarofx lut: looks into 3D LUT files with the plug-in's own reader, and converts and
// resamples them to tables the plug-in takes.
#include <cstdio>
#include <cstring>
#include <fstream>
#include <memory>

#include "Commands.h"
#include "ImageFiles.h"
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
      if (Status s = ReadCubeTable(input, &table); !s.ok()) return s;
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
      return Status::Error(LutFileMessage(input, 0, "", "not a .cube or .3dl file"));
  }

  if (size == 0) {
    if (table.size > kPluginMaxSize) {
      return Status::Error(
          LutFileMessage(input, 0, "",
                         std::to_string(table.size) + " points per axis, more than the plug-in's " +
                             std::to_string(kPluginMaxSize) + ": pass --size " +
                             std::to_string(kPluginMaxSize) + " (or smaller) to resample it"));
    }
  } else if (size != table.size) {
    table = ResampleTable(table, size);
  }
  if (Status s = FillLattice(*lut, table); !s.ok()) return s;
  if (Status s = WriteThroughPlugin(*lut, output); !s.ok()) return s;
  std::printf("wrote %s (%d points per axis)\n", output.c_str(), table.size);
  return Status::Ok();
}

}  // namespace

Status LutCommand(const GlobalOptions& options, const Args& args) {
  if (args.empty()) {
    return Status::Error("lut needs a subcommand: info, convert (see tessarofx --help)");
  }
  const Args rest(args.begin() + 1, args.end());
  if (args[0] == "info") return InfoCommand(options, rest);
  if (args[0] == "convert") return ConvertCommand(options, rest);
  return Status::Error("unknown lut subcommand '" + args[0] + "' (known: info, convert)");
}

}  // namespace tfxtool
