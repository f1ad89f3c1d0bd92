// The tool as a user runs it: a separate process, its exit code, its output and the files it
// leaves behind.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <iterator>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "support/OpenCLHarness.h"
#include "support/TempDir.h"

namespace {

namespace fs = std::filesystem;
using tfx_test::CubeText;
constexpr auto npos = std::string::npos;

struct Outcome {
  int exitCode = -1;
  std::string out, err;
};

// Upper-case hexadecimal digits in groups of 8-4-4-4-12.
bool IsGuid(const std::string& s) {
  for (size_t i = 0; i < 36; ++i) {
    const bool hyphen = i == 8 || i == 13 || i == 18 || i == 23;
    const std::string_view allowed = hyphen ? "-" : "0123456789ABCDEF";
    if (i >= s.size() || allowed.find(s[i]) == npos) return false;
  }
  return s.size() == 36;
}

class ToolTest : public ::testing::Test {
 protected:
  // Runs the tool in the temporary directory, so relative names land there. `args` goes through
  // the shell, and only `env` is added to an environment without the tool's own variables.
  Outcome Run(const std::string& args, const std::string& env = "") {
    const std::string command = "cd " + dir_.path +
                                " && env -u TESSAROFX_PLUGIN -u TESSAROFX_LOG_LEVEL " + env +
                                " " TFX_TOOL_PATH " " + args + " >.stdout 2>.stderr";
    const int status = std::system(command.c_str());
    // A crash is reported as 128 + signal, so it can never pass for a clean failure.
    Outcome r{WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status),
              tfx_test::ReadFile(Path(".stdout")), tfx_test::ReadFile(Path(".stderr"))};
    fs::remove(Path(".stdout"));
    fs::remove(Path(".stderr"));
    return r;
  }

  std::string Path(const std::string& name) const { return dir_.Path(name); }

  // Writes a small BGRA image with distinct channels and a varying alpha.
  void WriteInput(const std::string& name, int width = 6, int height = 4) {
    cv::Mat img(height, width, CV_8UC4);
    img.forEach<cv::Vec4b>([](cv::Vec4b& p, const int* at) {
      p = cv::Vec4b(20 * at[1] + 3, 40 * at[0] + 60, 130 + 10 * at[1], 255 - 30 * at[1]);
    });
    EXPECT_TRUE(cv::imwrite(Path(name), img));
  }
  cv::Mat Read(const std::string& name) const {
    return cv::imread(Path(name), cv::IMREAD_UNCHANGED);
  }

  // `args` fails with `exitCode` (2 for a command line the tool cannot parse) and one error line
  // naming `cause`, and the directory still holds what it held `before`: no output, no
  // temporary file, an existing output untouched.
  void ExpectRefused(const std::string& args, const std::string& cause,
                     const std::vector<std::string>& before, const std::string& env = "",
                     int exitCode = 1) {
    SCOPED_TRACE(args);
    const Outcome r = Run(args, env);
    EXPECT_EQ(r.exitCode, exitCode);
    EXPECT_EQ(r.err.rfind("tessarofx: error: ", 0), 0u) << r.err;
    EXPECT_NE(r.err.find(cause), npos) << r.err;
    EXPECT_EQ(std::count(r.err.begin(), r.err.end(), '\n'), 1) << r.err;
    EXPECT_EQ(Listing(), before) << "output or temporary file left behind";
  }

  void WriteText(const std::string& name, const std::string& text) { dir_.Write(name, text); }

  std::vector<std::string> Listing() const { return dir_.Names(); }

  tfx_test::TempDir dir_;
};

TEST_F(ToolTest, ListShowsTheTenPublishedFiltersInIndexOrder) {
  // An explicit plug-in wins over the one the environment names.
  const Outcome r = Run("--plugin " TFX_PLUGIN_PATH " list", "TESSAROFX_PLUGIN=/x/env.so");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const std::vector<std::string> expected = {
      "ColorAdjust",    "WhiteBalanceAdjust", "ChromeKeyCombine", "Lut",
      "VignetteAdjust", "lutAToWhiteEffect",  "HSLAdjust",        "DistortionFringingAdjust",
      "LightAdjust",    "ChromeKeyLut3dCL"};
  // Filter rows start at the margin: index, name, GUID, support flags.
  std::vector<std::string> names;
  std::istringstream lines(r.out);
  for (std::string line; std::getline(lines, line);) {
    if (line.empty() || !std::isdigit(static_cast<unsigned char>(line[0]))) continue;
    std::istringstream words(line);
    std::string index, name, guid, support;
    words >> index >> name >> guid >> support;
    EXPECT_EQ(index, std::to_string(names.size())) << line;
    EXPECT_TRUE(IsGuid(guid)) << line;
    EXPECT_EQ(support, "CPU") << line;
    names.push_back(name);
  }
  EXPECT_EQ(names, expected);
  // The white-balance parameters come from its descriptor, the others from the tool's table.
  EXPECT_NE(r.out.find("u_temperature"), npos);
  EXPECT_NE(r.out.find("u_exposure"), npos);
  EXPECT_NE(r.out.find("also registered as: ColorLut3dAdjust"), npos);

  // The JSON form (whose syntax the Python tests parse) carries every filter and its parameters.
  const Outcome json = Run("list --json");
  ASSERT_EQ(json.exitCode, 0) << json.err;
  int guids = 0;
  const std::string key = "\"guid\": \"";
  for (size_t at = json.out.find(key); at != npos; at = json.out.find(key, at + 1)) {
    guids += IsGuid(json.out.substr(at + key.size(), 36)) ? 1 : 0;
  }
  EXPECT_EQ(guids, 10);
  EXPECT_NE(
      json.out.find(R"({"name": "u_temperature", "type": "double", "default": 0, "min": -100, )"
                    R"("max": 100, "registered": true)"),
      npos);
  EXPECT_NE(json.out.find(R"({"name": "red", "type": "int")"), npos);
}

TEST_F(ToolTest, ApplyFindsFiltersByGuidAndNameInAnyCase) {
  WriteInput("in.png");
  ASSERT_EQ(Run("apply coloradjust -p u_sat=-100 in.png a.png").exitCode, 0);
  ASSERT_EQ(
      Run("apply {18c6e879-4138-42d0-b0b9-6b4401aa97e6} --param=U_SAT=-100 in.png b.png").exitCode,
      0);
  EXPECT_EQ(tfx_test::ReadFile(Path("a.png")), tfx_test::ReadFile(Path("b.png")));
  // Registered names behind a published one are found too, whatever the effect answers.
  for (const std::string hidden : {"ColorLut3dAdjust", "chromekeylut3d"}) {
    const Outcome r = Run("apply " + hidden + " in.png c.png");
    EXPECT_EQ(r.err.find("unknown filter"), npos) << hidden << ": " << r.err;
  }
  // Option-like file names after a double dash.
  WriteInput("-in.png");
  ASSERT_EQ(Run("fx brightness -20 -- -in.png -out.png").exitCode, 0);
  EXPECT_TRUE(fs::exists(Path("-out.png")));
}

TEST_F(ToolTest, ReadsAnyInputAsBgraAndWritesAlphaOnlyWhereTheFormatHoldsIt) {
  // 0x12AB keeps its high byte.
  ASSERT_TRUE(cv::imwrite(Path("grey16.png"), cv::Mat(3, 5, CV_16UC1, cv::Scalar(0x12AB))));
  ASSERT_EQ(Run("apply ColorAdjust grey16.png out.png").exitCode, 0);
  ASSERT_EQ(Read("out.png").type(), CV_8UC4);
  EXPECT_EQ(Read("out.png").at<cv::Vec4b>(2, 4), cv::Vec4b(0x12, 0x12, 0x12, 255));
  WriteInput("in.png");
  for (const std::string name : {"o.png", "o.tif", "o.webp", "o.jpg", "o.bmp"}) {
    SCOPED_TRACE(name);
    ASSERT_EQ(Run("apply ColorAdjust in.png " + name).exitCode, 0);
    const bool alpha = name != "o.jpg" && name != "o.bmp";
    ASSERT_EQ(Read(name).channels(), alpha ? 4 : 3);
    if (alpha) {
      EXPECT_EQ(cv::norm(Read(name), Read("in.png"), cv::NORM_INF), 0);
    }
  }
}

TEST_F(ToolTest, FailuresNameTheirCauseAndLeaveNoOutput) {
  WriteInput("in.png");
  WriteInput("wide.png", 9, 4);
  WriteText("out.png", "previous");
  WriteText("out.cube", "previous");
  WriteText("big.cube", CubeText(65));
  WriteText("bad.cube", "# c\n\nLUT_3D_SIZE 70\nTITLE \"a\"\n\nTITLE \"b\"\n");
  WriteText("grade.lut", "LUT_3D_SIZE 2\n");
  const struct {
    std::string args;
    std::string cause;
    std::string env = "";
    int exitCode = 1;
  } cases[] = {
      {"apply NoSuchFilter in.png out.png", "unknown filter 'NoSuchFilter'"},
      {"apply ColorAdjust -p u_glow=3 in.png out.png", "valid: u_exposure"},
      {"apply ChromeKeyCombine -p a=1 in.png out.png", "takes no parameters"},
      {"apply ColorAdjust -p u_sat=12x in.png out.png", "not a number"},
      {"apply ChromeKeyLut3d -p red=1.5 in.png out.png", "not an integer"},
      {"apply ColorAdjust -p u_contrast=255 in.png out.png", "-100..100"},
      {"apply ChromeKeyLut3d -p green=256 in.png out.png", "0..255"},
      {"apply ColorAdjust none.png out.png", "none.png"},
      {"apply ColorAdjust --background wide.png in.png out.png", "9x4"},
      // A filter's own failure: ColorLut3dAdjust without a LUT path.
      {"apply ColorLut3dAdjust in.png out.png", "0x80000008 (resource unavailable)"},
      {"apply ColorAdjust in.png out.xyz", "unknown image format"},
      {"apply ColorAdjust in.png no/such/dir/out.png", "No such file or directory"},
      {"apply ColorAdjust in.png in.png/out.png", "Not a directory"},
      {"apply ColorAdjust -in.png out.png", "not expected: -in.png"},
      {"apply -p u_sat=1 -f ColorAdjust in.png out.png", "-p u_sat=1 needs a -f FILTER before it"},
      {"apply -f ColorAdjust ColorAdjust in.png out.png", "unexpected argument 'out.png'"},
      {"apply -f ColorAdjust -f HSLAdjust -b in.png in.png out.png", "one filter"},
      {"apply -f ColorAdjust -f NoSuchFilter in.png out.png", "unknown filter 'NoSuchFilter'"},
      {"fx exposure bright in.png out.png", "not a number"},
      {"fx sharpness 3 in.png out.png", "unknown function"},
      {"fx merge in.png out.png", "needs INPUT OVERLAY OUTPUT"},
      {"fx clip 90 2 in.png out.png", "larger than the image"},
      {"--log-level loud apply ColorAdjust in.png out.png", "bad log level 'loud'", "", 2},
      {"--plugin ./nowhere.so list", "nowhere.so"},
      {"list", "env.so", "TESSAROFX_PLUGIN=" + Path("env.so")},
      {"frobnicate", "unknown command 'frobnicate'", "", 2},
      // The LUT commands; parse errors name the physical line.
      {"lut convert big.cube out.cube",
       "big.cube: 65 points per axis, more than the plug-in's 64: "
       "pass --size 64 (or smaller)"},
      {"lut convert big.cube out.cube --size 65", "bad --size '65': a whole number from 2 to 64"},
      {"lut convert big.cube out.png --size 8", "lut convert writes .cube files"},
      {"lut convert bad.cube out.cube --size 8",
       "bad.cube, line 6 (\"TITLE \\\"b\\\"\"): status 20, unknown or repeated keyword"},
      {"lut info grade.lut", "grade.lut: not a .cube or .3dl file"},
      {"lut convert none.cube out.cube", "none.cube: cannot be opened"},
      {"lut convert big.cube", "lut convert takes IN and OUT"},
      {"lut bake -f VignetteAdjust out.cube",
       "'VignetteAdjust' cannot be baked into a table (bakeable: ColorAdjust, LightAdjust, "
       "WhiteBalanceAdjust)"},
      {"lut bake -f LightAdjust -p u_glow=1 out.cube",
       "LightAdjust has no parameter 'u_glow' (valid: u_highLight, u_shadow, u_whiteLevel, "
       "u_blackLevel)"},
      {"lut bake -p u_exposure=1 out.cube", "-p u_exposure=1 needs a -f FILTER before it"},
      {"lut bake -f ColorAdjust -p u_contrast=300 out.cube", "-100..100"},
      {"lut bake -f ColorAdjust -p u_sat=lots out.cube", "not a number"},
      {"lut bake --size 1 out.cube", "bad --size '1'"},
      {"lut bake -f ColorAdjust out.png", "lut bake writes .cube files"},
      {"lut frobnicate", "unknown lut subcommand 'frobnicate'"},
      // Mistakes about OpenCL the tool can see whatever the machine has.
      {"apply --opencl ColorAdjust in.png out.png",
       "ColorAdjust has no OpenCL class; see tessarofx list"},
      {"apply --opencl -f ColorAdjust -f LightAdjust in.png out.png",
       "none of the chain's filters has an OpenCL class"},
      {"apply --device 0 WhiteBalanceAdjust in.png out.png", "--device only goes with --opencl"},
      {"apply --kernels . WhiteBalanceAdjust in.png out.png", "--kernels only goes with --opencl"},
      {"apply --opencl -b in.png WhiteBalanceAdjust in.png out.png",
       "--background does not go with --opencl"},
      {"apply --opencl --device gpu WhiteBalanceAdjust in.png out.png", "bad --device 'gpu'"},
      {"apply --opencl --device -2 WhiteBalanceAdjust in.png out.png", "bad --device '-2'"},
      {"apply --opencl WhiteBalanceAdjust in.png out.png", "no OpenCL device",
       "OCL_ICD_VENDORS=" + Path("no-such-dir")},
  };
  const std::vector<std::string> before = Listing();
  for (const auto& c : cases) ExpectRefused(c.args, c.cause, before, c.env, c.exitCode);
  EXPECT_EQ(tfx_test::ReadFile(Path("out.png")), "previous");
  EXPECT_EQ(tfx_test::ReadFile(Path("out.cube")), "previous");
  ASSERT_EQ(Run("apply ColorAdjust in.png out.png").exitCode, 0);
  EXPECT_EQ(Read("out.png").size(), cv::Size(6, 4));
}

TEST_F(ToolTest, LogsOnlyWhenAskedAndGivesUsageOnStdoutOrOnMistakesStderr) {
  WriteInput("in.png");
  const std::string line = "CREATE <PureC> Filter: ColorAdjust";
  const std::string apply = " apply ColorAdjust in.png o.png";
  EXPECT_EQ(Run(apply).err, "");
  EXPECT_NE(Run("-v" + apply).err.find(line), npos);
  EXPECT_NE(Run("--log-level 32" + apply).err.find(line), npos);
  EXPECT_NE(Run(apply, "TESSAROFX_LOG_LEVEL=0").err.find(line), npos);
  EXPECT_EQ(Run("-v --log-level=off" + apply).err, "");
  const Outcome help = Run("--help"), none = Run(""), applyHelp = Run("apply --help");
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find("usage: tessarofx"), npos);
  EXPECT_EQ(applyHelp.exitCode, 0);
  EXPECT_NE(applyHelp.out.find("usage: tessarofx apply"), npos);
  EXPECT_NE(applyHelp.out.find("-f,--filter FILTER"), npos);
  EXPECT_NE(none.exitCode, 0);
  EXPECT_NE(none.err.find("usage: tessarofx"), npos);
}

// Each -f runs on the result of the one before, with its own settings; the chain's result is
// the same as applying the filters one at a time. A function of the table with the same value
// as a filter's parameter gives its bytes.
TEST_F(ToolTest, ApplyChainRunsItsFiltersInOrderAndFxMatchesTheFilter) {
  WriteInput("in.png", 17, 9);
  const std::string first = "ColorAdjust -p u_exposure=30", second = "HSLAdjust -p u_red_sat=-50";
  ASSERT_EQ(Run("apply " + first + " in.png a.png").exitCode, 0);
  ASSERT_EQ(Run("apply " + second + " a.png ab.png").exitCode, 0);
  ASSERT_EQ(Run("apply " + second + " in.png b.png").exitCode, 0);
  ASSERT_EQ(Run("apply " + first + " b.png ba.png").exitCode, 0);
  const Outcome r = Run("apply -f " + first + " -f " + second + " in.png chain.png");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_EQ(r.err, "");
  EXPECT_EQ(cv::norm(Read("chain.png"), Read("ab.png"), cv::NORM_INF), 0);
  EXPECT_NE(cv::norm(Read("ab.png"), Read("ba.png"), cv::NORM_INF), 0) << "order proves nothing";

  ASSERT_EQ(Run("fx exposure -37.5 in.png fx.png").exitCode, 0);
  ASSERT_EQ(Run("apply ColorAdjust -p u_exposure=-37.5 in.png apply.png").exitCode, 0);
  ASSERT_FALSE(Read("fx.png").empty());
  EXPECT_EQ(cv::norm(Read("fx.png"), Read("apply.png"), cv::NORM_INF), 0);
  EXPECT_NE(cv::norm(Read("fx.png"), Read("in.png"), cv::NORM_INF), 0);
}

TEST_F(ToolTest, EveryFxCallingKindRunsWithTheOutputSizeItPromises) {
  // One function of each way of calling: a float, a long, six floats, a band record, a function
  // that makes a new image, and each call shape of the enhancement table (the image itself,
  // packed rows, colour planes, grey planes, buffers the plug-in allocates at a new size). A
  // wrong pointer type would crash or leave the pixels alone.
  WriteInput("in.png", 33, 21);
  std::vector<std::pair<std::string, cv::Size>> cases = {{"frame 255 0 0 255 4", {41, 29}},
                                                         {"scale-alpha 0 0 255 255 3", {39, 27}},
                                                         {"clip 11 7", {11, 7}},
                                                         {"pad-blur 5", {43, 31}}};
  std::istringstream sameSize(
      "hue 90;temperature 8000;vignette -80 50 50 30 0 20;hsl 0 50 60 0 0 0;temperature-colors;"
      "distort 40;blur 3;stack-pass 2 1;box-blur 2;window-mean 2;window-variance 2;"
      "percentile 2 0.5;denoise 200;denoise-hsl 200;dct-denoise 30;local-denoise 5 20;dehaze 50;"
      "dark-channel;haze-veil 0.5;sharpen 100;clarity 40;diffuse 300;grain 50 100;first-row");
  for (std::string args; std::getline(sameSize, args, ';');)
    cases.emplace_back(args, cv::Size(33, 21));
  for (const auto& [args, size] : cases) {
    SCOPED_TRACE(args);
    const Outcome r = Run("fx " + args + " in.png out.png");
    ASSERT_EQ(r.exitCode, 0) << r.err;
    const cv::Mat out = Read("out.png");
    EXPECT_EQ(out.size(), size);
    if (out.size() == cv::Size(33, 21)) {
      EXPECT_NE(cv::norm(out, Read("in.png"), cv::NORM_INF), 0);
    }
  }
}

TEST_F(ToolTest, FxMergeAndTheMeasuresReadASecondImage) {
  WriteInput("in.png", 12, 8);
  cv::Mat patch(3, 4, CV_8UC4, cv::Scalar(10, 20, 30, 255));
  ASSERT_TRUE(cv::imwrite(Path("patch.png"), patch));
  ASSERT_EQ(Run("fx merge 5 2 100 100 in.png patch.png out.png").exitCode, 0);
  const cv::Mat merged = Read("out.png"), in = Read("in.png");
  // Placed top-down as the images are read, whatever the function's own row order.
  EXPECT_EQ(merged.at<cv::Vec4b>(2, 5), cv::Vec4b(10, 20, 30, 255));
  EXPECT_EQ(merged.at<cv::Vec4b>(4, 8), cv::Vec4b(10, 20, 30, 255));
  EXPECT_EQ(merged.at<cv::Vec4b>(1, 5), in.at<cv::Vec4b>(1, 5));
  EXPECT_EQ(merged.at<cv::Vec4b>(5, 5), in.at<cv::Vec4b>(5, 5));

  const Outcome same = Run("fx wb-rates in.png in.png");
  ASSERT_EQ(same.exitCode, 0) << same.err;
  EXPECT_NE(same.out.find("temperature change (getAutoWhiteBalanceCCTChangeRate)   0.00"), npos)
      << same.out;
  EXPECT_NE(same.out.find("tint change (getAutoWhiteBalanceTintChangeRate)         0.00"), npos)
      << same.out;
  const Outcome point = Run("fx white-point in.png");
  ASSERT_EQ(point.exitCode, 0) << point.err;
  EXPECT_NE(point.out.find(" mired"), npos) << point.out;
  EXPECT_NE(point.out.find(" K"), npos) << point.out;
  EXPECT_EQ(Listing(), (std::vector<std::string>{"in.png", "out.png", "patch.png"}));
}

TEST_F(ToolTest, DemoWritesTheSceneEachFilterAndAContactSheet) {
  const Outcome r = Run("demo");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const cv::Mat scene = Read("demo-out/sample.png"), adjusted = Read("demo-out/ColorAdjust.png");
  EXPECT_EQ(scene.size(), cv::Size(960, 540));
  ASSERT_EQ(adjusted.size(), scene.size());
  EXPECT_NE(cv::norm(adjusted, scene, cv::NORM_INF), 0);
  EXPECT_FALSE(Read("demo-out/contact-sheet.png").empty());
  // Every filter either wrote its picture or was skipped with a note.
  for (const std::string name :
       {"LightAdjust", "WhiteBalanceAdjust", "VignetteAdjust", "DistortionFringingAdjust",
        "ColorLut3dAdjust", "HSLAdjust", "ChromeKeyLut3d-alpha", "ChromeKeyLut3d-beauty",
        "ChromeKeyCombine", "lutAToWhiteEffect"}) {
    const bool wrote = fs::exists(Path("demo-out/" + name + ".png"));
    EXPECT_NE(wrote, r.out.find("skipped " + name + ":") != npos) << name;
  }
  // The key chain: the green screen (from x 480, y 48) becomes a hole, then opaque black; a
  // colour patch stays as it was.
  const cv::Mat keyed = Read("demo-out/ChromeKeyCombine.png");
  const cv::Mat filled = Read("demo-out/lutAToWhiteEffect.png");
  ASSERT_EQ(keyed.size(), scene.size());
  ASSERT_EQ(filled.size(), scene.size());
  EXPECT_EQ(keyed.at<cv::Vec4b>(60, 500)[3], 0);
  EXPECT_EQ(filled.at<cv::Vec4b>(60, 500), cv::Vec4b(0, 0, 0, 255));
  EXPECT_EQ(keyed.at<cv::Vec4b>(90, 40), scene.at<cv::Vec4b>(90, 40));
  EXPECT_EQ(filled.at<cv::Vec4b>(90, 40), scene.at<cv::Vec4b>(90, 40));
  // The enhancement pictures: grain, then denoised back towards the scene; the cut-out with its
  // outline on a canvas 8 pixels larger on each side.
  const cv::Mat grain = Read("demo-out/grain.png"), denoised = Read("demo-out/denoise.png");
  ASSERT_EQ(grain.size(), scene.size());
  ASSERT_EQ(denoised.size(), scene.size());
  EXPECT_LT(cv::norm(denoised, scene, cv::NORM_L2), 0.7 * cv::norm(grain, scene, cv::NORM_L2));
  for (const std::string name : {"haze", "dehaze", "clarity", "diffuse"}) {
    EXPECT_EQ(Read("demo-out/" + name + ".png").size(), scene.size()) << name;
  }
  EXPECT_EQ(Read("demo-out/cutout-frame.png").size(), cv::Size(976, 556));
  // The filters with an OpenCL class ran again on the default device, to the CPU class's bytes
  // where the kernels are exact, unless the machine has no OpenCL at all.
  if (r.out.find("skipped the OpenCL classes: no OpenCL device") == npos) {
    for (const std::string name : {"ColorLut3dAdjust", "ChromeKeyLut3d-alpha",
                                   "ChromeKeyLut3d-beauty", "lutAToWhiteEffect"}) {
      const cv::Mat opencl = Read("demo-out/opencl-" + name + ".png");
      ASSERT_EQ(opencl.size(), scene.size()) << name;
      EXPECT_EQ(cv::norm(opencl, Read("demo-out/" + name + ".png"), cv::NORM_INF), 0) << name;
    }
    EXPECT_TRUE(fs::exists(Path("demo-out/opencl-WhiteBalanceAdjust.png")));
  }
  // The demo is deterministic: a second run into another directory gives the same scene bytes.
  ASSERT_EQ(Run("demo " + Path("again")).exitCode, 0);
  EXPECT_EQ(tfx_test::ReadFile(Path("again/sample.png")),
            tfx_test::ReadFile(Path("demo-out/sample.png")));
}

// The table rows of a ".cube" file, in file order.
std::vector<std::array<double, 3>> CubeRows(const std::string& text) {
  std::vector<std::array<double, 3>> rows;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    std::array<double, 3> v;
    if (!line.empty() && line[0] != '#' &&
        std::sscanf(line.c_str(), "%lf %lf %lf", &v[0], &v[1], &v[2]) == 3) {
      rows.push_back(v);
    }
  }
  return rows;
}

// A refused file names the status, its meaning and the physical line where the plug-in's reader
// stopped, counting the comments and blank lines it skipped; the variety of failures is the LUT
// file tests' business.
TEST_F(ToolTest, LutInfoShowsSizeTitleAndDomainOrWhereTheReaderStopped) {
  WriteText("grade.CUBE", CubeText(5, "# made by hand\nTITLE \"Warm\"\nDOMAIN_MIN 0.5 0.5 0.5\n"));
  const Outcome r = Run("lut info grade.CUBE");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  for (const char* line :
       {"size:    5 points per axis", "title:   Warm\n", "domain:  0.5 0.5 0.5 .. 1 1 1"}) {
    EXPECT_NE(r.out.find(line), npos) << r.out;
  }
  WriteText("big.cube", CubeText(65, "# 65 points\n\n"));
  const Outcome big = Run("lut info big.cube");
  EXPECT_EQ(big.exitCode, 1);
  EXPECT_EQ(std::count(big.err.begin(), big.err.end(), '\n'), 1) << big.err;
  for (const char* cause :
       {"big.cube, line 3 (\"LUT_3D_SIZE 65\"): status 23, the size is missing or outside 2..64",
        "tessarofx lut convert big.cube OUT.cube --size 64"}) {
    EXPECT_NE(big.err.find(cause), npos) << big.err;
  }
}

// The largest distance of a ".cube" file's rows (red fastest) from a channel rotation whose
// index i has the value level(i).
double WorstRotationError(const std::string& text, int n, const std::function<double(int)>& level) {
  const std::vector<std::array<double, 3>> rows = CubeRows(text);
  EXPECT_EQ(rows.size(), size_t(n) * n * n);
  double worst = rows.empty() ? 1 : 0;
  for (size_t at = 0; at < rows.size(); ++at) {
    const int red = int(at % n), green = int(at / n % n), blue = int(at / n / n);
    worst = std::max({worst, std::abs(rows[at][0] - level(green)),
                      std::abs(rows[at][1] - level(blue)), std::abs(rows[at][2] - level(red))});
  }
  return worst;
}

// Channel rotations: linear, so tetrahedral resampling must reproduce them exactly at any size,
// and any mix-up of axes or corners shows. The files go out through the plug-in's writer, whose
// tables read back as written (the LUT file tests).
TEST_F(ToolTest, LutConvertResamplesBigTablesAndTurns3dlIntoCubeKeepingTheDomainScaling) {
  WriteText("big.cube", CubeText(65, "# rotation\n", 1, 0, true));
  for (const int n : {33, 20}) {
    SCOPED_TRACE(n);
    const std::string out = "small" + std::to_string(n) + ".cube";
    const Outcome r = Run("lut convert big.cube " + out + " --size " + std::to_string(n));
    ASSERT_EQ(r.exitCode, 0) << r.err;
    EXPECT_LT(WorstRotationError(tfx_test::ReadFile(Path(out)), n,
                                 [n](int i) { return double(i) / (n - 1); }),
              1e-6);
  }

  // 17 points with a 10-bit input range; every ".3DL" output is taken as 12-bit. Blue changes
  // fastest.
  std::ostringstream text;
  text << "3DMESH\nMesh 4 12\n";
  for (int i = 0; i < 17; ++i) text << (i == 16 ? 1023 : i * 64) << (i == 16 ? "\n" : " ");
  const auto level = [](int i) { return std::lround(double(i) * 4095 / 16.0); };
  for (int r = 0; r < 17; ++r) {
    for (int g = 0; g < 17; ++g) {
      for (int b = 0; b < 17; ++b) text << level(g) << " " << level(b) << " " << level(r) << "\n";
    }
  }
  WriteText("look.3DL", text.str());
  const Outcome r = Run("lut convert look.3DL look.cube");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_LT(WorstRotationError(tfx_test::ReadFile(Path("look.cube")), 17,
                               [&](int i) { return level(i) / 4095.0; }),
            1e-7);

  // The plug-in multiplies by the domain's width and does not subtract its minimum; the
  // converted table means the same, now over the plain domain.
  WriteText("half.cube", CubeText(3, "DOMAIN_MIN 0.5 0.5 0.5\n"));
  ASSERT_EQ(Run("lut convert half.cube plain.cube").exitCode, 0);
  const std::vector<std::array<double, 3>> rows = CubeRows(tfx_test::ReadFile(Path("plain.cube")));
  ASSERT_EQ(rows.size(), 27u);
  EXPECT_EQ(rows[26], (std::array<double, 3>{0.5, 0.5, 0.5}));
  EXPECT_EQ(rows[1], (std::array<double, 3>{0.25, 0, 0}));
}

TEST_F(ToolTest, LutBakeAppliesLikeTheFiltersItBakes) {
  WriteInput("in.png", 33, 21);
  ASSERT_EQ(Run("lut bake -f ColorAdjust -p u_exposure=20 exposure.cube").exitCode, 0);
  EXPECT_EQ(CubeRows(tfx_test::ReadFile(Path("exposure.cube"))).size(),
            33u * 33 * 33);  // the default size
  const std::string lut = "apply ColorLut3dAdjust -p lut3dPath=";
  ASSERT_EQ(Run(lut + Path("exposure.cube") + " in.png baked.png").exitCode, 0);
  ASSERT_EQ(Run("apply ColorAdjust -p u_exposure=20 in.png direct.png").exitCode, 0);
  // One level: the filter truncates where doLUT rounds, and the table is exact between its
  // points for a per-channel gain except in the cell where the gain clips at 255, where it
  // draws a line under the knee (less than a level).
  ASSERT_EQ(Read("baked.png").size(), Read("in.png").size());
  EXPECT_LE(cv::norm(Read("baked.png"), Read("direct.png"), cv::NORM_INF), 1);
  EXPECT_GT(cv::norm(Read("baked.png"), Read("in.png"), cv::NORM_INF), 5);

  const std::string steps[] = {
      "ColorAdjust -p u_contrast=30 -p u_vib=40",
      "LightAdjust -p u_highLight=-40 -p u_shadow=50 -p u_whiteLevel=20 -p u_blackLevel=-20",
      "WhiteBalanceAdjust -p u_temperature=40 -p u_tint=10"};
  std::string bake = "lut bake", last = "in.png";
  for (const std::string& step : steps) {
    bake += " -f " + step;
    ASSERT_EQ(Run("apply " + step + " " + last + " after-" + last).exitCode, 0) << step;
    last = "after-" + last;
  }
  const Outcome r = Run(bake + " --size 17 chain.cube");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  ASSERT_EQ(Run(lut + Path("chain.cube") + " in.png chain.png").exitCode, 0);
  // The filters truncate after every operation and the baked table does not: over every colour
  // that is up to 13 levels, 2.4 on average, with interpolation adding at most 11 at size 17.
  const cv::Mat a = Read("chain.png"), b = Read(last);
  ASSERT_EQ(a.size(), b.size());
  EXPECT_LE(cv::norm(a, b, cv::NORM_INF), 24);
  EXPECT_LE(cv::norm(a, b, cv::NORM_L1) / (3.0 * a.total()), 3.0);
}

using tfx_test::OpenCLDevices;

// The rows of `devices`: a '*' or blank mark, the index, then the type, platform and device.
struct DeviceRow {
  bool marked;
  int index;
  std::string rest;
};
std::vector<DeviceRow> DeviceRows(const std::string& out) {
  std::vector<DeviceRow> rows;
  std::istringstream lines(out);
  for (std::string line; std::getline(lines, line);) {
    if (line.size() < 3 || !std::isdigit(static_cast<unsigned char>(line[2]))) continue;
    rows.push_back({line[0] == '*', std::atoi(line.c_str() + 2), line.substr(2)});
  }
  return rows;
}

TEST_F(ToolTest, DevicesListsEveryDeviceAndMarksTheDefaultChoice) {
  // No platform at all is a plain answer, not a failure.
  fs::create_directory(Path("no-vendors"));
  const Outcome none = Run("devices", "OCL_ICD_VENDORS=" + Path("no-vendors"));
  EXPECT_EQ(none.exitCode, 0) << none.err;
  EXPECT_NE(none.out.find("No OpenCL device"), npos) << none.out;
  EXPECT_TRUE(DeviceRows(none.out).empty());

  const std::vector<NLEOpenCLDeviceInfo> devices = OpenCLDevices();
  const Outcome r = Run("devices", "-u TESSAROFX_OPENCL_DEVICE");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const std::vector<DeviceRow> rows = DeviceRows(r.out);
  ASSERT_EQ(rows.size(), devices.size()) << r.out;
  if (devices.empty()) GTEST_SKIP() << "no OpenCL device on this machine (the runtime lists none)";
  std::string marked;
  for (size_t i = 0; i < rows.size(); ++i) {
    SCOPED_TRACE(rows[i].rest);
    EXPECT_EQ(rows[i].index, static_cast<int>(i));
    std::istringstream words(rows[i].rest.substr(rows[i].rest.find(' ')));
    std::string type;
    words >> type;
    EXPECT_TRUE(type == "GPU" || type == "CPU" || type == "accelerator" || type == "other");
    EXPECT_NE(rows[i].rest.find(devices[i].platform), npos);
    EXPECT_NE(rows[i].rest.find(devices[i].device), npos);
    if (rows[i].marked) marked += devices[i].device;
  }
  // The mark is on the device the kit opens for -1, and moves where the environment points.
  NLEComPtr<INLECGDevice> chosen;
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &chosen), NLE_S_OK);
  wchar_t name[256] = {};
  ASSERT_EQ(chosen->GetName(name, 256), NLE_S_OK);
  EXPECT_EQ(marked, std::string(name, name + std::wcslen(name)));
  const int last = static_cast<int>(devices.size()) - 1;
  const std::vector<DeviceRow> moved =
      DeviceRows(Run("devices", "TESSAROFX_OPENCL_DEVICE=" + std::to_string(last)).out);
  ASSERT_EQ(moved.size(), devices.size());
  EXPECT_TRUE(moved.back().marked);
  EXPECT_EQ(std::count_if(moved.begin(), moved.end(), [](const DeviceRow& d) { return d.marked; }),
            1);
  const Outcome wrong = Run("devices", "TESSAROFX_OPENCL_DEVICE=" + std::to_string(last + 1));
  EXPECT_EQ(wrong.exitCode, 0);
  EXPECT_NE(wrong.out.find("names no device"), npos) << wrong.out;
  for (const DeviceRow& d : DeviceRows(wrong.out)) EXPECT_FALSE(d.marked);
}

TEST_F(ToolTest, ApplyOpenCLAgreesWithTheCpuClassAndNamesTheDeviceOrProgramThatFailed) {
  if (OpenCLDevices().empty()) GTEST_SKIP() << "no OpenCL device on this machine";
  // The option's plumbing: the classes' agreement over many settings is the OpenCL effect tests'
  // business. Some pixels fully transparent, which lutAToWhiteEffect fills; 33 columns leave a
  // ragged edge for any vector width a runtime picks.
  WriteInput("in.png", 33, 7);
  cv::Mat in = Read("in.png");
  in.forEach<cv::Vec4b>([](cv::Vec4b& p, const int* at) {
    if ((at[0] + at[1]) % 3 == 0) p[3] = 0;
  });
  ASSERT_TRUE(cv::imwrite(Path("in.png"), in));
  const struct {
    std::string args;
    double tolerance;  // per channel: the kernel computes in float where the CPU class may not
  } cases[] = {
      {"lutAToWhiteEffect", 0},
      {"WhiteBalanceAdjust -p u_temperature=40 -p u_tint=-20", 1},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.args);
    const Outcome cl = Run("apply --opencl " + c.args + " in.png cl.png");
    ASSERT_EQ(cl.exitCode, 0) << cl.err;
    ASSERT_EQ(Run("apply " + c.args + " in.png cpu.png").exitCode, 0);
    const cv::Mat a = Read("cl.png"), b = Read("cpu.png");
    ASSERT_EQ(a.size(), in.size());
    ASSERT_EQ(a.type(), CV_8UC4);
    EXPECT_LE(cv::norm(a, b, cv::NORM_INF), c.tolerance);
    EXPECT_NE(cv::norm(b, in, cv::NORM_INF), 0) << "the case proves nothing";
  }
  fs::create_directory(Path("broken"));
  WriteText("broken/WhiteBalanceAdjust.cl",
            "__kernel void auto_white_balance(__global uchar4* p) { p[0] = undeclared_name; }\n");
  const std::vector<std::string> before = Listing();
  const std::string count = std::to_string(OpenCLDevices().size());
  ExpectRefused("apply --opencl --device " + count + " WhiteBalanceAdjust in.png o.png",
                "--device " + count + " is out of range", before);
  // The compiler's own complaint reaches the user, not just a result code.
  const Outcome broken = Run("apply --opencl --kernels broken WhiteBalanceAdjust in.png o.png");
  EXPECT_EQ(broken.exitCode, 1);
  for (const char* part :
       {"failed to build", "undeclared_name",
        "tessarofx: error: cannot create the OpenCL class of WhiteBalanceAdjust"}) {
    EXPECT_NE(broken.err.find(part), npos) << broken.err;
  }
  EXPECT_EQ(Listing(), before);
}

TEST_F(ToolTest, AFailingOpenCLRuntimeCostsNoCpuPicture) {
  // The loader reads the runtimes to start from *.icd files in OCL_ICD_VENDORS.
  fs::create_directory(Path("vendors"));
  std::ofstream(Path("vendors/aborting.icd")) << TFX_ABORTING_OPENCL << "\n";
  const std::string aborting = "OCL_ICD_VENDORS=" + Path("vendors");
  const Outcome crashed = Run("demo", aborting);
  ASSERT_EQ(crashed.exitCode, 0) << crashed.err;
  EXPECT_NE(crashed.out.find("skipped the OpenCL classes: the OpenCL runtime crashed while "
                             "starting (Aborted); --no-opencl or TESSAROFX_NO_OPENCL=1"),
            npos)
      << crashed.out;
  const Outcome off = Run("--no-opencl demo off", aborting);
  ASSERT_EQ(off.exitCode, 0) << off.err;
  EXPECT_NE(off.out.find("skipped the OpenCL classes: OpenCL is turned off (--no-opencl)"), npos);
  for (const char* name :
       {"sample", "ColorAdjust", "ChromeKeyCombine", "denoise", "cutout-frame", "contact-sheet"}) {
    EXPECT_TRUE(fs::exists(Path(std::string("demo-out/") + name + ".png"))) << name;
    EXPECT_TRUE(fs::exists(Path(std::string("off/") + name + ".png"))) << name;
  }
  for (const char* dir : {"demo-out", "off"}) {
    for (const auto& entry : fs::directory_iterator(Path(dir))) {
      EXPECT_NE(entry.path().filename().string().rfind("opencl-", 0), 0u) << entry.path();
    }
  }
  // Commands that need OpenCL refuse with the reason instead of dying with the runtime.
  WriteInput("in.png");
  const Outcome apply = Run("apply --opencl Lut -p lut3dPath=x.cube in.png o.png", aborting);
  EXPECT_EQ(apply.exitCode, 1);
  EXPECT_NE(apply.err.find("the OpenCL runtime crashed while starting"), npos) << apply.err;
  const Outcome devices = Run("devices", "TESSAROFX_NO_OPENCL=1 " + aborting);
  EXPECT_EQ(devices.exitCode, 1);
  EXPECT_NE(devices.err.find("OpenCL is turned off (TESSAROFX_NO_OPENCL=1)"), npos);
  EXPECT_FALSE(fs::exists(Path("o.png")));
}

}  // namespace
