#include <cstdio>

#include "Commands.h"
#include "FilterTable.h"
#include "ImageFiles.h"
#include "ImageFunctions.h"
#include "Text.h"

namespace tfxtool {
namespace {

void PrintFunctions() {
  std::printf("Image functions (fx NAME ARG... INPUT OUTPUT):\n");
  for (const ImageFunction& fn : ImageFunctions()) {
    std::printf("  %-18s %-22s %s\n      %s\n", fn.name, fn.function, fn.symbol, fn.meaning);
    for (const FxArg& arg : fn.args) {
      std::printf("      %-12s %s..%s\n", arg.name, FormatNumber(arg.min).c_str(),
                  FormatNumber(arg.max).c_str());
    }
  }
  std::printf("Support symbols:\n");
  for (const SupportSymbol& s : ImageSupportSymbols()) {
    std::printf("  %-30s %s\n", s.what, s.symbol);
  }
}

}  // namespace

Status FxCommand(const GlobalOptions& options, const Args& args) {
  Args positional;
  bool optionsEnded = false;
  for (const std::string& a : args) {
    if (a == "--list" && !optionsEnded) {
      PrintFunctions();
      return Status::Ok();
    }
    if (a == "--" && !optionsEnded) {
      optionsEnded = true;
    } else if (!optionsEnded && IsOptionWord(a)) {
      return Status::Error("fx: unknown option '" + a + "'");
    } else {
      positional.push_back(a);
    }
  }
  if (positional.empty()) return Status::Error("fx needs a FUNCTION (see tessarofx fx --list)");
  const ImageFunction* fn = FindImageFunction(positional[0]);
  if (!fn) {
    std::string names;
    for (const ImageFunction& f : ImageFunctions())
      names += (names.empty() ? "" : ", ") + std::string(f.name);
    return Status::Error("unknown function '" + positional[0] + "' (known: " + names + ")");
  }
  if (positional.size() < 3) {
    return Status::Error("fx needs INPUT and OUTPUT (see tessarofx --help)");
  }
  const Args fnArgs(positional.begin() + 1, positional.end() - 2);
  const std::string& input = positional[positional.size() - 2];
  const std::string& output = positional.back();
  ImageCall call;
  if (Status s = PrepareImageCall(*fn, fnArgs, &call); !s.ok()) return s;
  if (Status s = CheckWritableFormat(output); !s.ok()) return s;

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  cv::Mat image;
  if (Status s = ReadImage(input, &image); !s.ok()) return s;
  if (Status s = CallImageFunction(plugin, call, &image); !s.ok()) return s;
  return WriteImage(output, image);
}

}  // namespace tfxtool
