// The tool's commands. Each declares its subcommand, options and arguments on the parser and
// records what runs once the command line is parsed; failures come back as a Status that main
// prints.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "Status.h"
#include "media/Reporter.h"
#include "media/VideoJob.h"
#include "plugin/FilterChain.h"
#include "plugin/PluginLibrary.h"

namespace CLI {
class App;
}

namespace tfxtool {

struct GlobalOptions {
  std::string pluginPath;  // --plugin; empty: the usual search
  bool noOpenCL = false;   // --no-opencl: nothing in this run touches the OpenCL runtime
  bool quiet = false;      // --quiet: no progress display
  bool verbose = false;    // -v: creation lines, and for clips where the time went
  Reporter* reporter = nullptr;
};

using Args = std::vector<std::string>;

// A subcommand as main runs it. `positional` collects the command's plain arguments; main adds
// the words after "--" to it, so that file names that look like options get through.
struct Command {
  CLI::App* app = nullptr;
  Args* positional = nullptr;
  std::function<Status()> run;
};

void AddListCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddApplyCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddFxCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddDemoCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddLutCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddDevicesCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);
void AddKeyCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands);

// "-f FILTER [-p NAME=VALUE]..." as apply and lut bake take them: each -p belongs to the -f
// before it. -p options before any -f are kept apart, for the commands that take a lone FILTER.
struct StepWords {
  std::string filter;
  std::vector<std::string> params;  // NAME=VALUE, in order
};
struct StepList {
  std::vector<StepWords> steps;
  std::vector<std::string> leading;  // -p before the first -f
};
void AddStepOptions(CLI::App* command, StepList* list);

// How a command writes clips: --codec, --quality, --threads.
struct VideoOptions {
  std::string codec;
  std::string quality;
  int threads = 0;  // 0: every core
  int Threads() const;
};
void AddVideoOptions(CLI::App* command, VideoOptions* options);

// A clip to run through filters: its input, its output, the background clip or picture beside
// it (empty: none), how to write it and, for one filter, whether to run its OpenCL class.
struct ClipRequest {
  std::string input, output, background;
  VideoOptions video;
  bool opencl = false;
  int deviceIndex = -1;
  std::string kernels;
};
// The job a clip request describes, without its workers and alpha rule.
VideoJob ClipJob(const GlobalOptions& options, const ClipRequest& request);

// A chain of filters over a clip, frame-parallel (apply's clip path).
Status ApplyChainToClip(const GlobalOptions& options, const PluginLibrary& plugin,
                        const std::vector<ChainStep>& steps, const ClipRequest& request);

// The chroma key: the screen's colour and the keyer's edge settings (as text, checked against
// the keyer's ranges); `request.background` is what the keyed picture is laid over, if anything.
struct KeySettings {
  int rgb[3] = {0, 0, 0};
  std::string contrast = "50";
  std::string offset = "0";
};
Status KeyClipOrPicture(const GlobalOptions& options, const PluginLibrary& plugin,
                        const std::vector<PublishedFilter>& published, const KeySettings& key,
                        const ClipRequest& request);

}  // namespace tfxtool
