#include <cstdio>

#include "Commands.h"
#include "FilterHost.h"
#include "ImageFiles.h"
#include "Text.h"

namespace tfxtool {

Status ApplyCommand(const GlobalOptions& options, const Args& args) {
  std::vector<ParamSetting> settings;
  std::string backgroundPath;
  Args positional;
  bool optionsEnded = false;
  for (size_t i = 0; i < args.size(); ++i) {
    Status error;
    std::string value;
    if (optionsEnded || !IsOptionWord(args[i])) {
      positional.push_back(args[i]);
    } else if (args[i] == "--") {
      optionsEnded = true;
    } else if (TakeOptionValue(args, &i, "--param", "-p", &value, &error)) {
      ParamSetting setting;
      if (Status s = ParseParamSetting(value, &setting); !s.ok()) return s;
      settings.push_back(setting);
    } else if (TakeOptionValue(args, &i, "--background", "-b", &backgroundPath, &error)) {
      // stored
    } else if (error.ok()) {
      return Status::Error("apply: unknown option '" + args[i] + "'");
    }
    if (!error.ok()) return error;
  }
  if (positional.empty()) return Status::Error("apply needs a FILTER (see tessarofx list)");
  if (positional.size() < 3) {
    return Status::Error("apply needs INPUT and OUTPUT (see tessarofx --help)");
  }
  if (positional.size() > 3) {
    return Status::Error("apply: unexpected argument '" + positional[3] + "'");
  }
  const std::string& input = positional[1];
  const std::string& output = positional[2];
  if (Status s = CheckWritableFormat(output); !s.ok()) return s;

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::vector<PublishedFilter> published;
  if (Status s = ReadPublishedFilters(plugin, &published); !s.ok()) return s;
  ResolvedFilter filter;
  if (Status s = ResolveFilter(published, positional[0], &filter); !s.ok()) return s;

  cv::Mat foreground, background;
  if (Status s = ReadImage(input, &foreground); !s.ok()) return s;
  if (backgroundPath.empty()) {
    background = foreground;
  } else {
    if (Status s = ReadImage(backgroundPath, &background); !s.ok()) return s;
    if (background.size() != foreground.size()) {
      return Status::Error("background " + backgroundPath + " is " +
                           std::to_string(background.cols) + "x" + std::to_string(background.rows) +
                           ", but " + input + " is " + std::to_string(foreground.cols) + "x" +
                           std::to_string(foreground.rows));
    }
  }

  cv::Mat result;
  if (Status s = RunFilter(plugin, filter, settings, foreground, background, &result); !s.ok()) {
    return s;
  }
  return WriteImage(output, result);
}

}  // namespace tfxtool
