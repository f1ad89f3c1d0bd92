#include <CLI/CLI.hpp>
#include <algorithm>
#include <climits>
#include <cstdio>
#include <limits>
#include <memory>

#include "commands/Commands.h"
#include "media/ImageFiles.h"
#include "media/Text.h"
#include "media/VideoJob.h"
#include "plugin/FilterChain.h"
#include "plugin/FilterHost.h"
#include "plugin/OpenCLDevices.h"

namespace tfxtool {
namespace {

// With --opencl, the chain must have a step for the device.
Status CheckOpenCLSteps(const std::vector<ChainStep>& steps) {
  for (const ChainStep& step : steps) {
    if (step.filter.opencl) return Status::Ok();
  }
  if (steps.size() == 1) {
    return Status::Error(steps[0].filter.name + " has no OpenCL class; see tessarofx list");
  }
  return Status::Error(
      "--opencl: none of the chain's filters has an OpenCL class; see tessarofx list");
}

struct ApplyOptions {
  StepList steps;
  Args positional;
  std::string background, device, kernels;
  bool opencl = false;
  VideoOptions video;
};

// A worker of a clip: a chain of its own and, with --opencl, a device of its own for the steps
// that have an OpenCL class.
class ChainWorker final : public FrameWorker {
 public:
  NLEComPtr<INLECGDevice> device;
  OpenCLTarget target;
  FilterChain chain;
  Status Process(cv::Mat& bgra, const cv::Mat* background, int64_t index, int64_t total) override {
    chain.SetFrameTime(static_cast<int32_t>(std::min<int64_t>(index, INT32_MAX)),
                       static_cast<int32_t>(std::min<int64_t>(total, INT32_MAX)));
    return chain.Run(bgra, &bgra, background);
  }
};

}  // namespace

Status ApplyChainToClip(const GlobalOptions& options, const PluginLibrary& plugin,
                        const std::vector<ChainStep>& steps, const ClipRequest& request) {
  const std::string& input = request.input;
  const std::string& output = request.output;
  if (IsStillImagePath(output)) {
    return Status::Error(output + " is a picture, but " + input +
                         " is a clip: write a clip, or a sequence such as out_%04d.png");
  }
  // Settings are checked once, before any frame is read; the chain that checked them becomes
  // the first worker's.
  auto first = std::make_unique<ChainWorker>();
  if (Status s = FilterChain::Create(plugin, steps, &first->chain); !s.ok()) return s;
  VideoJob job = ClipJob(options, request);
  const bool makesAlpha = first->chain.CarriesAlpha(false);
  const bool keepsAlpha = first->chain.CarriesAlpha(true);
  job.alpha = [makesAlpha, keepsAlpha](bool inputAlpha) {
    return inputAlpha ? keepsAlpha : makesAlpha;
  };
  job.makeWorker = [&](std::unique_ptr<FrameWorker>* out) {
    if (first && !request.opencl) {
      *out = std::move(first);
      return Status::Ok();
    }
    auto worker = std::make_unique<ChainWorker>();
    const OpenCLTarget* device = nullptr;
    if (request.opencl) {
      if (Status s = OpenOpenCLTarget(plugin, request.deviceIndex, request.kernels, worker->device,
                                      &worker->target);
          !s.ok()) {
        return s;
      }
      device = &worker->target;
    }
    if (Status s = FilterChain::Create(plugin, steps, &worker->chain, device); !s.ok()) return s;
    *out = std::move(worker);
    return Status::Ok();
  };
  return RunVideoJob(job, *options.reporter);
}

namespace {

// The chain the command line asks for: the steps of -f, or the one FILTER before INPUT.
Status ChainWords(const ApplyOptions& given, std::vector<StepWords>* steps, Args* files) {
  const Args& positional = given.positional;
  if (given.steps.steps.empty()) {
    if (positional.empty()) return Status::Error("apply needs a FILTER (see tessarofx list)");
    if (positional.size() < 3) {
      return Status::Error("apply needs INPUT and OUTPUT (see tessarofx apply --help)");
    }
    if (positional.size() > 3) {
      return Status::Error("apply: unexpected argument '" + positional[3] + "'");
    }
    *steps = {{positional[0], given.steps.leading}};
    files->assign(positional.begin() + 1, positional.end());
    return Status::Ok();
  }
  if (!given.steps.leading.empty()) {
    return Status::Error("apply: -p " + given.steps.leading.front() +
                         " needs a -f FILTER before it");
  }
  if (positional.size() < 2) {
    return Status::Error("apply needs INPUT and OUTPUT (see tessarofx apply --help)");
  }
  if (positional.size() > 2) {
    return Status::Error("apply: unexpected argument '" + positional[2] +
                         "' (with -f, every filter is given by -f)");
  }
  *steps = given.steps.steps;
  *files = positional;
  return Status::Ok();
}

Status ApplyFilters(const GlobalOptions& options, const ApplyOptions& given) {
  std::vector<StepWords> words;
  Args files;
  if (Status s = ChainWords(given, &words, &files); !s.ok()) return s;
  const std::string& backgroundPath = given.background;
  const std::string& deviceText = given.device;
  const std::string& kernelDir = given.kernels;
  const bool opencl = given.opencl;
  if (words.size() > 1 && !backgroundPath.empty()) {
    return Status::Error("--background goes with one filter: it is ChromeKeyCombine's key mask");
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
  const std::string& input = files[0];
  const std::string& output = files[1];
  const bool clip = !IsStillImagePath(input);
  if (opencl && !clip && !backgroundPath.empty()) {
    return Status::Error(
        "--background does not go with --opencl: the OpenCL filters adjust one "
        "frame");
  }
  if (!clip) {
    if (Status s = CheckWritableFormat(output); !s.ok()) return s;
  }

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::vector<PublishedFilter> published;
  if (Status s = ReadPublishedFilters(plugin, &published); !s.ok()) return s;
  std::vector<ChainStep> steps;
  for (const StepWords& step : words) {
    ChainStep resolved;
    if (Status s = ResolveFilter(published, step.filter, &resolved.filter); !s.ok()) return s;
    for (const std::string& text : step.params) {
      resolved.settings.emplace_back();
      if (Status s = ParseParamSetting(text, &resolved.settings.back()); !s.ok()) return s;
    }
    steps.push_back(std::move(resolved));
  }
  if (opencl) {
    if (Status s = CheckOpenCLSteps(steps); !s.ok()) return s;
  }
  if (clip) {
    ClipRequest request{input,       output, backgroundPath,
                        given.video, opencl, static_cast<int>(deviceIndex),
                        kernelDir};
    return ApplyChainToClip(options, plugin, steps, request);
  }

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

  NLEComPtr<INLECGDevice> device;
  OpenCLTarget target;
  if (opencl) {
    if (Status s =
            OpenOpenCLTarget(plugin, static_cast<int>(deviceIndex), kernelDir, device, &target);
        !s.ok()) {
      return s;
    }
  }
  cv::Mat result;
  FilterChain chain;
  if (Status s = FilterChain::Create(plugin, std::move(steps), &chain, opencl ? &target : nullptr);
      !s.ok()) {
    return s;
  }
  if (Status s = chain.Run(foreground, &result, &background); !s.ok()) return s;
  return WriteImage(output, result);
}

}  // namespace

void AddApplyCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands) {
  CLI::App* apply =
      app.add_subcommand("apply", "Runs one filter or a chain of them on an image or a clip.");
  apply->footer(R"(
  tessarofx apply FILTER [-p NAME=VALUE]... [-b FILE] INPUT OUTPUT
  tessarofx apply -f FILTER [-p NAME=VALUE]... [-f FILTER [-p NAME=VALUE]...]... INPUT OUTPUT

A filter is a GUID or a name in any letter case, including registered names the list does not
show (ColorLut3dAdjust, ChromeKeyLut3d); 'tessarofx list' shows each filter's parameters and
their ranges. Filters given by -f run in the order given, each on the result of the one before,
with the -p settings that follow it. INPUT is the foreground frame; the background is -b FILE
(same size) or INPUT itself.

INPUT may be a clip in any format FFmpeg reads, or a picture sequence such as shot_%04d.png; the
output is then a clip (H.264 for .mp4/.mkv/.mov unless --codec says otherwise; with alpha when
the chain keys: ProRes 4444 in .mov, VP9 in .webm, FFV1 in .mkv, PNG sequences) with the input's
sound, subtitles, timing, rotation and colour tags. It is written beside OUTPUT and moved there
once complete: a failure or Ctrl-C leaves nothing at OUTPUT. Exit status 3: the input was
damaged, and OUTPUT holds the frames that could be decoded.

Examples:
  tessarofx apply ColorAdjust -p u_exposure=20 -p u_sat=-30 in.png out.png
  tessarofx apply -f ColorAdjust -p u_exposure=20 -f VignetteAdjust -p amount=-60 in.png out.png
  tessarofx apply ChromeKeyCombine --background mask.png beauty.png keyed.png
  tessarofx apply --opencl --device 0 WhiteBalanceAdjust -p u_temperature=40 in.png out.png
  tessarofx apply -f ColorAdjust -p u_exposure=20 -f Lut -p lut3dPath=look.cube in.mp4 out.mp4
  tessarofx apply --threads 4 --codec ffv1 LightAdjust -p u_shadow=30 shot_%04d.png graded.mkv)");
  auto given = std::make_shared<ApplyOptions>();
  AddStepOptions(apply, &given->steps);
  apply
      ->add_option("-b,--background", given->background,
                   "the frame under a lone filter (ChromeKeyCombine's key mask)")
      ->type_name("FILE");
  apply->add_flag("--opencl", given->opencl,
                  "run the filters that have an OpenCL class on a device (list: OpenCL), the "
                  "others on the CPU");
  apply
      ->add_option("--device", given->device,
                   "with --opencl: a device from 'tessarofx devices' (default -1)")
      ->type_name("N");
  apply
      ->add_option("--kernels", given->kernels,
                   "with --opencl: the OpenCL programs (default: beside the plug-in)")
      ->type_name("DIR");
  AddVideoOptions(apply, &given->video);
  apply->add_option("FILES", given->positional, "[FILTER] INPUT OUTPUT")->type_name("");
  commands->push_back(
      {apply, &given->positional, [&options, given] { return ApplyFilters(options, *given); }});
}

}  // namespace tfxtool
