#include <CLI/CLI.hpp>
#include <thread>

#include "commands/Commands.h"

namespace tfxtool {

void AddStepOptions(CLI::App* command, StepList* list) {
  // Each occurrence is handled as it is read, so that a -p lands on the -f before it.
  command
      ->add_option_function<std::string>(
          "-f,--filter",
          [list](const std::string& name) {
            list->steps.push_back({name, {}});
          },
          "a filter of the chain; repeat for more, run in the order given")
      ->type_name("FILTER")
      ->trigger_on_parse()
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
  command
      ->add_option_function<std::string>(
          "-p,--param",
          [list](const std::string& setting) {
            (list->steps.empty() ? list->leading : list->steps.back().params).push_back(setting);
          },
          "a setting of the filter before it; the last of a name wins")
      ->type_name("NAME=VALUE")
      ->trigger_on_parse()
      ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
}

}  // namespace tfxtool

namespace tfxtool {

int VideoOptions::Threads() const {
  if (threads > 0) return threads;
  const unsigned cores = std::thread::hardware_concurrency();
  return cores > 0 ? static_cast<int>(cores) : 1;
}

VideoJob ClipJob(const GlobalOptions& options, const ClipRequest& request) {
  VideoJob job;
  job.input = request.input;
  job.output = request.output;
  job.background = request.background;
  job.codec = request.video.codec;
  job.quality = request.video.quality;
  job.threads = request.video.Threads();
  job.timings = options.verbose;
  return job;
}

void AddVideoOptions(CLI::App* command, VideoOptions* options) {
  command
      ->add_option("--codec", options->codec,
                   "for clips: an FFmpeg encoder (libx264, ffv1, prores_ks, libvpx-vp9, png, ...); "
                   "default by the output's container")
      ->type_name("NAME");
  command
      ->add_option("--quality", options->quality,
                   "for clips: the encoder's constant quality (x264's crf; lower is better; "
                   "default 17, visually lossless)")
      ->type_name("Q");
  command
      ->add_option("--threads", options->threads,
                   "for clips: frames filtered at once, each by filters of its own (default: "
                   "every core); the result is the same for any number")
      ->type_name("N")
      ->check(CLI::NonNegativeNumber);
}

}  // namespace tfxtool
