#include <CLI/CLI.hpp>
#include <cstdio>
#include <memory>
#include <string>

#include "commands/Commands.h"
#include "commands/ImageFunctions.h"
#include "media/ImageFiles.h"
#include "media/Text.h"
#include "plugin/FilterTable.h"

namespace tfxtool {
namespace {

// The image files a function takes after its arguments.
std::string FileWords(const ImageFunction& fn) {
  std::string words = "INPUT";
  if (fn.inputs > 1) words += std::string(" ") + (fn.secondName ? fn.secondName : "SECOND");
  if (fn.writes) words += " OUTPUT";
  return words;
}

void PrintFunctions() {
  std::printf("Image functions (fx NAME ARG... INPUT OUTPUT, unless shown otherwise):\n");
  for (const ImageFunction& fn : ImageFunctions()) {
    std::printf("  %-18s %s\n      %s\n", fn.name, fn.function, fn.meaning);
    if (fn.inputs != 1 || !fn.writes) std::printf("      files: %s\n", FileWords(fn).c_str());
    for (const char* other : fn.also) std::printf("      also calls %s\n", other);
    for (const FxArg& arg : fn.args) {
      std::printf("      %-12s %s..%s\n", arg.name, FormatNumber(arg.min).c_str(),
                  FormatNumber(arg.max).c_str());
    }
  }
}

struct FxOptions {
  bool list = false;
  Args positional;
};

Status CallFunction(const FxOptions& options) {
  if (options.list) {
    PrintFunctions();
    return Status::Ok();
  }
  const Args& positional = options.positional;
  if (positional.empty()) return Status::Error("fx needs a FUNCTION (see tessarofx fx --list)");
  const ImageFunction* fn = FindImageFunction(positional[0]);
  if (!fn) {
    std::string names;
    for (const ImageFunction& f : ImageFunctions())
      names += (names.empty() ? "" : ", ") + std::string(f.name);
    return Status::Error("unknown function '" + positional[0] + "' (known: " + names + ")");
  }
  const size_t files = static_cast<size_t>(fn->inputs) + (fn->writes ? 1 : 0);
  if (positional.size() < 1 + files) {
    return Status::Error(std::string("fx ") + fn->name + " needs " + FileWords(*fn) +
                         " (see tessarofx fx --list)");
  }
  const Args fnArgs(positional.begin() + 1, positional.end() - static_cast<long>(files));
  const Args paths(positional.end() - static_cast<long>(files), positional.end());
  ImageCall call;
  if (Status s = PrepareImageCall(*fn, fnArgs, &call); !s.ok()) return s;
  if (fn->writes) {
    if (Status s = CheckWritableFormat(paths.back()); !s.ok()) return s;
  }

  cv::Mat image, second;
  if (Status s = ReadImage(paths[0], &image); !s.ok()) return s;
  if (fn->inputs > 1) {
    if (Status s = ReadImage(paths[1], &second); !s.ok()) return s;
  }
  std::string report;
  if (Status s = CallImageFunction(call, &image, &second, &report); !s.ok()) return s;
  std::fputs(report.c_str(), stdout);
  return fn->writes ? WriteImage(paths.back(), image) : Status::Ok();
}

}  // namespace

void AddFxCommand(CLI::App& app, const GlobalOptions&, std::vector<Command>* commands) {
  CLI::App* fx =
      app.add_subcommand("fx", "Calls one of the library's image functions on an image.");
  fx->footer(R"(
  tessarofx fx FUNCTION [ARG]... INPUT [SECOND] [OUTPUT]

Most functions write OUTPUT; merge and wb-rates read a SECOND image; white-point and wb-rates
print measurements instead of writing. 'tessarofx fx --list' shows every function.)");
  auto options = std::make_shared<FxOptions>();
  fx->add_flag("--list", options->list, "the functions, their arguments and their ranges");
  fx->add_option("WORDS", options->positional, "FUNCTION [ARG]... INPUT [SECOND] [OUTPUT]")
      ->type_name("");
  commands->push_back({fx, &options->positional, [options] { return CallFunction(*options); }});
}

}  // namespace tfxtool
