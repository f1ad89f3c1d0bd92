#include <cstdio>
#include <limits>

#include "commands/Commands.h"
#include "media/ImageFiles.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"
#include "plugin/OpenCLDevices.h"

namespace tfxtool {
namespace {

Status RunOpenCL(const PluginLibrary& plugin, const ResolvedFilter& filter,
                 const std::vector<ParamSetting>& settings, int deviceIndex,
                 const std::string& kernelDir, const cv::Mat& input, cv::Mat* result) {
  // Asked before the device, so that the answer does not depend on the machine.
  if (!filter.opencl) {
    return Status::Error(filter.name + " has no OpenCL class; see tessarofx list");
  }
  NLEComPtr<INLECGDevice> device;
  OpenCLTarget target;
  if (Status s = OpenOpenCLTarget(plugin, deviceIndex, kernelDir, device, &target); !s.ok()) {
    return s;
  }
  return RunFilterOpenCL(plugin, filter, settings, target, input, result);
}

}  // namespace

Status ApplyCommand(const GlobalOptions& options, const Args& args) {
  std::vector<ParamSetting> settings;
  std::string backgroundPath, deviceText, kernelDir;
  bool opencl = false;
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
    } else if (args[i] == "--opencl") {
      opencl = true;
    } else if (TakeOptionValue(args, &i, "--background", "-b", &backgroundPath, &error) ||
               TakeOptionValue(args, &i, "--device", nullptr, &deviceText, &error) ||
               TakeOptionValue(args, &i, "--kernels", nullptr, &kernelDir, &error)) {
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
  if (!opencl && (!deviceText.empty() || !kernelDir.empty())) {
    return Status::Error(std::string(deviceText.empty() ? "--kernels" : "--device") +
                         " only goes with --opencl");
  }
  if (opencl && !backgroundPath.empty()) {
    return Status::Error(
        "--background does not go with --opencl: the OpenCL filters adjust one "
        "frame");
  }
  if (opencl) {
    if (Status s = CheckOpenCLUsable(options.noOpenCL); !s.ok()) return s;
  }
  long long deviceIndex = -1;
  if (!deviceText.empty() && (!ParseInteger(deviceText, &deviceIndex) || deviceIndex < -1 ||
                              deviceIndex > std::numeric_limits<int>::max())) {
    return Status::Error("bad --device '" + deviceText +
                         "': a device index (see tessarofx devices), or -1 for the default");
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
  if (opencl) {
    if (Status s = RunOpenCL(plugin, filter, settings, static_cast<int>(deviceIndex), kernelDir,
                             foreground, &result);
        !s.ok()) {
      return s;
    }
  } else if (Status s = RunFilter(plugin, filter, settings, foreground, background, &result);
             !s.ok()) {
    return s;
  }
  return WriteImage(output, result);
}

}  // namespace tfxtool
