#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <memory>
#include <opencv2/imgcodecs.hpp>
#include <opencv2/imgproc.hpp>

#include "commands/Commands.h"
#include "commands/ImageFunctions.h"
#include "media/DemoScene.h"
#include "media/ImageFiles.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"
#include "plugin/OpenCLDevices.h"
#include "tessarofx/NLEComBase.h"

namespace tfxtool {
namespace {

struct DemoStep {
  std::string filter;  // as on the command line
  std::vector<ParamSetting> params;
  // Earlier steps (by label) whose results are this step's inputs; empty: the scene. A keyer's
  // chain needs the mask of one step as the background of the next.
  std::string foreground;
  std::string background;  // empty: the foreground
  // The step's name for its picture and for later steps; empty: the filter's name. A filter run
  // twice needs one per run.
  std::string label = "";

  const std::string& Label() const { return label.empty() ? filter : label; }
};

std::vector<ParamSetting> KeyerParams(const Rgb& key, int mode) {
  return {{"red", std::to_string(key.r)},
          {"green", std::to_string(key.g)},
          {"blue", std::to_string(key.b)},
          {"contrast", "50"},
          {"offset", "0"},
          {"mode", std::to_string(mode)}};
}

// One representative setting per filter. Steps whose filter is not implemented yet are skipped
// with a note, so entries can be added ahead of the effects.
std::vector<DemoStep> DemoSteps(const std::string& lutPath) {
  const Rgb key = DemoScreenColour();
  return {
      {"ColorAdjust",
       {{"u_exposure", "20"}, {"u_contrast", "30"}, {"u_vib", "40"}, {"u_sat", "20"}},
       "",
       ""},
      {"LightAdjust",
       {{"u_highLight", "-40"},
        {"u_shadow", "50"},
        {"u_whiteLevel", "20"},
        {"u_blackLevel", "-20"}},
       "",
       ""},
      {"WhiteBalanceAdjust", {{"u_temperature", "40"}, {"u_tint", "10"}}, "", ""},
      {"VignetteAdjust",
       {{"amount", "-60"}, {"size", "40"}, {"roundness", "50"}, {"feather", "60"}},
       "",
       ""},
      // The distortion resamples with a byte offset and so scrambles channels at any strength;
      // the demo shows the fringing, which resamples whole pixels.
      {"DistortionFringingAdjust", {{"distortion", "0"}, {"fringing", "100"}}, "", ""},
      {"ColorLut3dAdjust", {{"lut3dPath", lutPath}}, "", ""},
      {"HSLAdjust", {{"u_green_hue", "60"}, {"u_red_sat", "40"}, {"u_blue_light", "-30"}}, "", ""},
      // The green-screen key as a host runs it: the keyer once for the mask (mode 0) and once
      // for the colours with the spill taken out (mode 1), the two joined with the mask as alpha,
      // and the hole made opaque black for hosts that drop alpha.
      {"ChromeKeyLut3d", KeyerParams(key, 0), "", "", "ChromeKeyLut3d-alpha"},
      {"ChromeKeyLut3d", KeyerParams(key, 1), "", "", "ChromeKeyLut3d-beauty"},
      {"ChromeKeyCombine", {}, "ChromeKeyLut3d-beauty", "ChromeKeyLut3d-alpha"},
      {"lutAToWhiteEffect", {}, "ChromeKeyCombine", ""},
  };
}

// One call of an exported image function; `second` names an earlier result (or "input", the
// step's own input) for functions that take two images.
struct FxStage {
  std::string function;
  std::vector<std::string> args;
  std::string second = "";
};

// A picture made by image functions rather than a filter, from the scene or an earlier result.
struct DemoFxStep {
  std::string label;
  std::string input;  // empty: the scene
  std::vector<FxStage> stages;
  std::string caption;
};

std::vector<DemoFxStep> DemoFxSteps() {
  return {
      {"grain", "", {{"grain", {"30", "100"}}}, "addNoiseFilter 30% x 100%"},
      {"denoise", "grain", {{"denoise", {"250"}}}, "deNoiseRGB 250 on the grain"},
      {"haze", "", {{"dehaze", {"-40"}}}, "dehaze -40 (adds haze)"},
      {"dehaze", "haze", {{"dehaze", {"60"}}}, "dehaze 60 on the haze"},
      {"clarity", "", {{"clarity", {"60"}}}, "clarity 60"},
      {"diffuse", "", {{"diffuse", {"240"}}}, "diffuse 240"},
      // The keyed figure with a gold outline: the outline on a canvas 2 x 8 pixels larger, then
      // the cut-out merged back over it. The frame writes its red field into byte 0, which is
      // blue in BGRA, so gold is given as red 40, blue 255.
      {"cutout-frame",
       "ChromeKeyCombine",
       {{"frame", {"40", "190", "255", "255", "8"}}, {"merge", {"8", "8", "100", "100"}, "input"}},
       "makeImageFrame 8 px + mergeImage"},
  };
}

std::string Caption(const DemoStep& step) {
  std::string text;
  for (const ParamSetting& p : step.params) {
    // A path says little on a thumbnail; the file name is enough.
    const size_t slash = p.value.rfind('/');
    const std::string value = slash == std::string::npos ? p.value : p.value.substr(slash + 1);
    text += (text.empty() ? "" : " ") + p.name + "=" + value;
  }
  if (!step.background.empty()) text += (text.empty() ? "" : " ") + ("bg: " + step.background);
  if (!step.foreground.empty()) text += (text.empty() ? "" : " ") + ("fg: " + step.foreground);
  return text.empty() ? "no parameters" : text;
}

Status MakeDirectories(const std::string& dir) {
  for (size_t pos = 1; pos <= dir.size(); ++pos) {
    if (pos != dir.size() && dir[pos] != '/') continue;
    const std::string part = dir.substr(0, pos);
    if (mkdir(part.c_str(), 0777) != 0 && errno != EEXIST) {
      return Status::Error("cannot create " + part + ": " + std::strerror(errno));
    }
  }
  struct stat st;
  if (stat(dir.c_str(), &st) != 0 || !S_ISDIR(st.st_mode)) {
    return Status::Error("cannot use " + dir + ": not a directory");
  }
  return Status::Ok();
}

// A step whose filter also has an OpenCL class: what it read and what the CPU class made of it.
struct OpenCLTwin {
  std::string label;
  ResolvedFilter filter;
  std::vector<ParamSetting> params;
  cv::Mat input;
  cv::Mat cpu;
};

// The steps again through their OpenCL classes on the default device, each picture written as
// opencl-LABEL.png with how far it lies from the CPU class's. A machine without OpenCL, or whose
// runtime cannot start, skips them with the reason; a device that cannot run them is a failure.
// Returns the number of failures.
int RunOpenCLTwins(const GlobalOptions& options, const PluginLibrary& plugin,
                   const std::vector<OpenCLTwin>& twins, const std::string& dir) {
  if (twins.empty()) return 0;
  Reporter& report = *options.reporter;
  if (Status s = CheckOpenCLUsable(options.noOpenCL); !s.ok()) {
    report.Note("skipped the OpenCL classes: " + s.message());
    return 0;
  }
  std::vector<NLEOpenCLDeviceInfo> devices;
  if (!ListDevices(&devices).ok() || devices.empty()) {
    report.Note("skipped the OpenCL classes: no OpenCL device on this machine");
    return 0;
  }
  NLEComPtr<INLECGDevice> device;
  OpenCLTarget target;
  if (Status s = OpenOpenCLTarget(plugin, -1, "", device, &target); !s.ok()) {
    report.Error(s.message());
    return 1;
  }
  int failures = 0;
  report.Start("OpenCL pictures", twins.size());
  for (const OpenCLTwin& twin : twins) {
    cv::Mat result;
    const std::string file = dir + "/opencl-" + twin.label + ".png";
    Status s = RunFilterOpenCL(plugin, twin.filter, twin.params, target, twin.input, &result);
    if (s.ok()) s = WriteImage(file, result);
    report.Advance();
    if (!s.ok()) {
      report.Error(twin.label + " on " + target.deviceName + ": " + s.message());
      ++failures;
      continue;
    }
    const double apart = cv::norm(result, twin.cpu, cv::NORM_INF);
    if (apart == 0) {
      report.Note("wrote " + file + " (the CPU class's bytes)");
    } else {
      report.Note("wrote " + file + " (at most " + FormatNumber(std::round(apart)) +
                  " levels from the CPU class)");
    }
  }
  report.Finish();
  return failures;
}

// A few seconds of the scene with a ball crossing it and the green screen, graded and keyed over
// a sunset, through the same clip path as apply and key. Returns the number of failures.
int WriteDemoClips(const GlobalOptions& options, const PluginLibrary& plugin,
                   const std::vector<PublishedFilter>& published, const std::string& dir,
                   const std::string& lutPath) {
  Reporter& report = *options.reporter;
  constexpr int kFrames = 50;  // two seconds at the sequence's 25 frames a second
  const std::string frames = dir + "/.clip-frames";
  std::error_code ignored;
  std::filesystem::remove_all(frames, ignored);
  if (Status s = MakeDirectories(frames); !s.ok()) {
    report.Error(s.message());
    return 1;
  }
  const cv::Mat scene = MakeDemoScene(640, 360);
  for (int i = 0; i < kFrames; ++i) {
    cv::Mat frame = scene.clone();
    const cv::Point centre(60 + i * 11, 210 + static_cast<int>(50 * std::sin(i / 7.0)));
    cv::circle(frame, centre, 30, cv::Scalar(30, 140, 240, 255), cv::FILLED, cv::LINE_AA);
    char name[32];
    std::snprintf(name, sizeof name, "/frame_%03d.png", i + 1);
    // Opaque frames are stored without alpha, so that the clips need none.
    cv::Mat opaque;
    cv::cvtColor(frame, opaque, cv::COLOR_BGRA2BGR);
    if (!cv::imwrite(frames + name, opaque)) {
      report.Error("cannot write " + frames + name);
      return 1;
    }
  }
  cv::Mat sunset(360, 640, CV_8UC4);
  for (int y = 0; y < sunset.rows; ++y) {
    const double t = y / 359.0;
    sunset.row(y).setTo(cv::Scalar(90 + 60 * t, 80 + 90 * t, 250 - 40 * t, 255));
  }
  const std::string sunsetPath = dir + "/clip-background.png";
  int failures = 0;
  Status s = WriteImage(sunsetPath, sunset);

  ClipRequest graded;
  graded.input = frames + "/frame_%03d.png";
  graded.output = dir + "/clip-graded.mp4";
  std::vector<ChainStep> steps(2);
  if (s.ok()) s = ResolveFilter(published, "ColorAdjust", &steps[0].filter);
  if (s.ok()) s = ResolveFilter(published, "Lut", &steps[1].filter);
  steps[0].settings = {{"u_exposure", "20"}, {"u_contrast", "30"}, {"u_vib", "40"}};
  steps[1].settings = {{"lut3dPath", lutPath}};
  if (s.ok()) s = ApplyChainToClip(options, plugin, steps, graded);
  if (s.ok()) {
    report.Note("wrote " + graded.output);
  } else {
    report.Error(s.message());
    ++failures;
  }

  ClipRequest keyed = graded;
  keyed.output = dir + "/clip-keyed.mp4";
  keyed.background = sunsetPath;
  KeySettings key;
  const Rgb screen = DemoScreenColour();
  key.rgb[0] = screen.r;
  key.rgb[1] = screen.g;
  key.rgb[2] = screen.b;
  s = KeyClipOrPicture(options, plugin, published, key, keyed);
  if (s.ok()) {
    report.Note("wrote " + keyed.output);
  } else {
    report.Error(s.message());
    ++failures;
  }
  std::filesystem::remove_all(frames, ignored);
  return failures;
}

Status RunDemo(const GlobalOptions& options, const Args& args) {
  if (args.size() > 1) return Status::Error("demo: unexpected argument '" + args[1] + "'");
  std::string dir = args.empty() ? "demo-out" : args[0];
  while (dir.size() > 1 && dir.back() == '/') dir.pop_back();
  Reporter& report = *options.reporter;

  PluginLibrary plugin;
  if (Status s = plugin.Load(options.pluginPath); !s.ok()) return s;
  std::vector<PublishedFilter> published;
  if (Status s = ReadPublishedFilters(plugin, &published); !s.ok()) return s;
  if (Status s = MakeDirectories(dir); !s.ok()) return s;

  const cv::Mat scene = MakeDemoScene(960, 540);
  if (Status s = WriteImage(dir + "/sample.png", scene); !s.ok()) return s;
  const std::string lut = MakeDemoLut(17);
  const std::string lutPath = dir + "/demo-look.cube";
  if (Status s = WriteFileReplacing(lutPath, std::vector<unsigned char>(lut.begin(), lut.end()));
      !s.ok()) {
    return s;
  }

  const std::vector<DemoStep> steps = DemoSteps(lutPath);
  const std::vector<DemoFxStep> fxSteps = DemoFxSteps();
  report.Start("demo pictures", steps.size() + fxSteps.size() + 1);  // and the contact sheet
  std::map<std::string, cv::Mat> results;
  std::vector<SheetTile> tiles = {{"Original", "before", scene}};
  std::vector<OpenCLTwin> twins;
  int failures = 0;
  for (const DemoStep& step : steps) {
    auto input = [&](const std::string& name, const cv::Mat& fallback, cv::Mat* image) {
      if (name.empty()) {
        *image = fallback;
        return true;
      }
      auto it = results.find(name);
      if (it == results.end()) return false;
      *image = it->second;
      return true;
    };
    cv::Mat foreground, background;
    const bool haveForeground = input(step.foreground, scene, &foreground);
    if (!haveForeground || !input(step.background, foreground, &background)) {
      report.Note("skipped " + step.Label() + ": it needs the result of " +
                  (haveForeground ? step.background : step.foreground));
      report.Advance();
      continue;
    }
    ResolvedFilter filter;
    cv::Mat result;
    Status s = ResolveFilter(published, step.filter, &filter);
    if (s.ok()) s = RunFilter(plugin, filter, step.params, foreground, background, &result);
    if (!s.ok() && s.code() == NLE_E_NOTIMPL) {
      report.Note("skipped " + step.Label() + ": not implemented yet");
      report.Advance();
      continue;
    }
    const std::string file = dir + "/" + step.Label() + ".png";
    if (s.ok()) s = WriteImage(file, result);
    report.Advance();
    if (!s.ok()) {
      report.Error(s.message());
      ++failures;
      continue;
    }
    report.Note("wrote " + file);
    results[step.Label()] = result;
    tiles.push_back({step.Label(), Caption(step), result});
    if (filter.opencl && step.background.empty()) {
      twins.push_back({step.Label(), filter, step.params, foreground, result});
    }
  }

  for (const DemoFxStep& step : fxSteps) {
    cv::Mat input = scene;
    if (!step.input.empty()) {
      auto it = results.find(step.input);
      if (it == results.end()) {
        report.Note("skipped " + step.label + ": it needs the result of " + step.input);
        report.Advance();
        continue;
      }
      input = it->second;
    }
    cv::Mat image = input.clone();
    Status s = Status::Ok();
    for (const FxStage& stage : step.stages) {
      const ImageFunction* fn = FindImageFunction(stage.function);
      ImageCall call;
      s = fn ? PrepareImageCall(*fn, stage.args, &call)
             : Status::Error("no image function " + stage.function);
      if (!s.ok()) break;
      const cv::Mat* second = nullptr;
      if (stage.second == "input") second = &input;
      s = CallImageFunction(call, &image, second);
      if (!s.ok()) break;
    }
    const std::string file = dir + "/" + step.label + ".png";
    if (s.ok()) s = WriteImage(file, image);
    report.Advance();
    if (!s.ok()) {
      report.Error(step.label + ": " + s.message());
      ++failures;
      continue;
    }
    report.Note("wrote " + file);
    results[step.label] = image;
    tiles.push_back({step.label, step.caption, image});
  }

  const cv::Mat sheet = MakeContactSheet("TessaroFx demo: before and after", tiles);
  const std::string sheetFile = dir + "/contact-sheet.png";
  if (Status s = WriteImage(sheetFile, sheet); !s.ok()) return s;
  report.Advance();
  report.Finish();
  report.Note("wrote " + sheetFile);
  failures += WriteDemoClips(options, plugin, published, dir, lutPath);
  // Last, so that an OpenCL runtime that fails in any way cannot cost a CPU picture.
  failures += RunOpenCLTwins(options, plugin, twins, dir);
  if (failures) return Status::Error(std::to_string(failures) + " demo step(s) failed");
  return Status::Ok();
}

}  // namespace

void AddDemoCommand(CLI::App& app, const GlobalOptions& options, std::vector<Command>* commands) {
  CLI::App* demo = app.add_subcommand("demo", "Renders a test scene through every filter.");
  demo->footer(R"(
Writes the scene, one PNG per filter and contact-sheet.png to OUTDIR, two seconds of the scene
with a moving ball graded (clip-graded.mp4) and keyed over a sunset (clip-keyed.mp4), then the
filters with an OpenCL class again on the default device.)");
  auto dir = std::make_shared<Args>();
  demo->add_option("OUTDIR", *dir, "where the pictures go (default: demo-out)")
      ->type_name("")
      ->expected(0, 1);
  commands->push_back({demo, dir.get(), [&options, dir] { return RunDemo(options, *dir); }});
}

}  // namespace tfxtool
