// key: the whole chroma key in one command. The keyer makes the key mask and, separately, the
// colours with the screen's spill removed; ChromeKeyCombine joins them into a picture with alpha,
// which is written as it is or laid over a background.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "commands/Commands.h"
#include "media/ImageFiles.h"
#include "media/Text.h"
#include "media/VideoJob.h"
#include "plugin/FilterChain.h"
#include "plugin/FilterHost.h"
#include "tessarofx/Compositing.h"

namespace tfxtool {
namespace {

struct KeyOptions {
  std::string screen;
  KeySettings key;
  std::string over;
  VideoOptions video;
  Args positional;
};

struct KeySteps {
  std::vector<ChainStep> mask, colours, combine;
};

// The keyer in one mode; its settings are checked against the catalogue's ranges when the chains
// are created.
Status KeyerStep(const std::vector<PublishedFilter>& published, const KeySettings& key, int mode,
                 std::vector<ChainStep>* chain) {
  const int* rgb = key.rgb;
  ChainStep step;
  if (Status s = ResolveFilter(published, "ChromeKeyLut3d", &step.filter); !s.ok()) return s;
  step.settings = {{"red", std::to_string(rgb[0])},  {"green", std::to_string(rgb[1])},
                   {"blue", std::to_string(rgb[2])}, {"contrast", key.contrast},
                   {"offset", key.offset},           {"mode", std::to_string(mode)}};
  chain->push_back(std::move(step));
  return Status::Ok();
}

Status ParseScreen(const std::string& text, int rgb[3]) {
  const std::string bad = "bad --screen '" + text + "': three numbers 0..255, as R,G,B";
  size_t start = 0;
  for (int c = 0; c < 3; ++c) {
    const size_t comma = text.find(',', start);
    if ((c < 2) != (comma != std::string::npos)) return Status::Error(bad);
    long long v = 0;
    if (!ParseInteger(text.substr(start, comma - start), &v) || v < 0 || v > 255) {
      return Status::Error(bad);
    }
    rgb[c] = static_cast<int>(v);
    start = comma + 1;
  }
  return Status::Ok();
}

// One worker's three chains, and the key of one frame.
class KeyWorker final : public FrameWorker {
 public:
  FilterChain mask, colours, combine;

  Status Process(cv::Mat& bgra, const cv::Mat* background, int64_t, int64_t) override {
    if (Status s = mask.Run(bgra, &mask_); !s.ok()) return s;
    if (Status s = colours.Run(bgra, &colours_); !s.ok()) return s;
    if (Status s = combine.Run(colours_, &bgra, &mask_); !s.ok()) return s;
    if (!background) return Status::Ok();
    // Source-over with the library's own blend, then opaque: the background has no holes.
    cv::Mat under = background->clone();
    mergeImage(under.data, bgra.data, under.cols, under.rows, bgra.cols, bgra.rows,
               static_cast<int>(bgra.step[0]), 0, 0, -1, -1, 0, 0, 100, 100);
    bgra = under;
    for (int y = 0; y < bgra.rows; ++y) {
      uint8_t* row = bgra.ptr<uint8_t>(y);
      for (int x = 0; x < bgra.cols; ++x) row[x * 4 + 3] = 255;
    }
    return Status::Ok();
  }

 private:
  cv::Mat mask_, colours_;
};

Status MakeKeyWorker(const PluginLibrary& plugin, const KeySteps& steps,
                     std::unique_ptr<KeyWorker>* out) {
  auto worker = std::make_unique<KeyWorker>();
  if (Status s = FilterChain::Create(plugin, steps.mask, &worker->mask); !s.ok()) return s;
  if (Status s = FilterChain::Create(plugin, steps.colours, &worker->colours); !s.ok()) return s;
  if (Status s = FilterChain::Create(plugin, steps.combine, &worker->combine); !s.ok()) return s;
  *out = std::move(worker);
  return Status::Ok();
}

Status Key(const GlobalOptions& options, KeyOptions given) {
  if (given.positional.size() != 2) {
    return Status::Error("key needs IN and OUT (see tessarofx key --help)");
  }
  if (Status s = ParseScreen(given.screen, given.key.rgb); !s.ok()) return s;
  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::vector<PublishedFilter> published;
  if (Status s = ReadPublishedFilters(plugin, &published); !s.ok()) return s;
  ClipRequest request;
  request.input = given.positional[0];
  request.output = given.positional[1];
  request.background = given.over;
  request.video = given.video;
  return KeyClipOrPicture(options, plugin, published, given.key, request);
}

}  // namespace

Status KeyClipOrPicture(const GlobalOptions& options, const PluginLibrary& plugin,
                        const std::vector<PublishedFilter>& published, const KeySettings& key,
                        const ClipRequest& request) {
  const std::string& input = request.input;
  const std::string& output = request.output;
  KeySteps steps;
  if (Status s = KeyerStep(published, key, 0, &steps.mask); !s.ok()) return s;
  if (Status s = KeyerStep(published, key, 1, &steps.colours); !s.ok()) return s;
  steps.combine.emplace_back();
  if (Status s = ResolveFilter(published, "ChromeKeyCombine", &steps.combine[0].filter); !s.ok()) {
    return s;
  }
  std::unique_ptr<KeyWorker> first;
  if (Status s = MakeKeyWorker(plugin, steps, &first); !s.ok()) return s;

  if (IsStillImagePath(input)) {
    if (!IsStillImagePath(output)) {
      return Status::Error(output + " is not a picture, but " + input + " is one");
    }
    if (Status s = CheckWritableFormat(output); !s.ok()) return s;
    cv::Mat frame, under;
    if (Status s = ReadImage(input, &frame); !s.ok()) return s;
    if (!request.background.empty()) {
      cv::Mat picture;
      if (Status s = ReadImage(request.background, &picture); !s.ok()) return s;
      cv::resize(picture, under, frame.size(), 0, 0, cv::INTER_AREA);
    }
    if (Status s = first->Process(frame, under.empty() ? nullptr : &under, 0, 1); !s.ok()) {
      return s;
    }
    return WriteImage(output, frame);
  }

  VideoJob job = ClipJob(options, request);
  const bool keepAlpha = request.background.empty();
  job.alpha = [keepAlpha](bool) { return keepAlpha; };
  job.makeWorker = [&](std::unique_ptr<FrameWorker>* out) {
    if (first) {
      *out = std::move(first);
      return Status::Ok();
    }
    std::unique_ptr<KeyWorker> worker;
    if (Status s = MakeKeyWorker(plugin, steps, &worker); !s.ok()) return s;
    *out = std::move(worker);
    return Status::Ok();
  };
  return RunVideoJob(job, *options.reporter);
}

void AddKeyCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands) {
  CLI::App* key = app.add_subcommand(
      "key",
      "Keys a green or blue screen out of a picture or a clip, with alpha or over a "
      "background.");
  key->footer(R"(
  tessarofx key --screen R,G,B [--contrast C] [--offset O] [--over BACKGROUND] IN OUT

The keyer's mask and its spill-free colours are joined into a picture with alpha. Without --over
OUT keeps the alpha: a PNG, or a clip that holds alpha (ProRes 4444 .mov, VP9 .webm, FFV1 .mkv,
PNG sequences). With --over the keyed picture is laid over BACKGROUND (a picture, or a clip
played beside IN; scaled to IN's size) and OUT is opaque, in any format.

Examples:
  tessarofx key --screen 48,192,64 greenscreen.mov keyed.mov
  tessarofx key --screen 48,192,64 --contrast 60 --over beach.jpg greenscreen.mp4 composite.mp4)");
  auto given = std::make_shared<KeyOptions>();
  key->add_option("--screen", given->screen, "the screen's colour, R,G,B in 0..255")
      ->type_name("R,G,B")
      ->required();
  key->add_option("--contrast", given->key.contrast,
                  "hardness of the key's edge, 0..100 (default 50)")
      ->type_name("C");
  key->add_option("--offset", given->key.offset, "moves the key threshold, -100..100 (default 0)")
      ->type_name("O");
  key->add_option("--over", given->over, "a picture or clip to lay the keyed picture over")
      ->type_name("BACKGROUND");
  AddVideoOptions(key, &given->video);
  key->add_option("FILES", given->positional, "IN OUT")->type_name("");
  commands->push_back(
      {key, &given->positional, [&options, given] { return Key(options, *given); }});
}

}  // namespace tfxtool
