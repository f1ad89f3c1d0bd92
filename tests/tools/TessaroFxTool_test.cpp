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
#include <functional>
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
using tfx_test::ReadFile;
constexpr auto npos = std::string::npos;

// Upper-case hexadecimal digits in groups of 8-4-4-4-12.
bool IsGuid(const std::string& s) {
  if (s.size() != 36) return false;
  for (size_t i = 0; i < s.size(); ++i) {
    const bool hyphen = i == 8 || i == 13 || i == 18 || i == 23;
    if (std::string_view(hyphen ? "-" : "0123456789ABCDEF").find(s[i]) == npos) return false;
  }
  return true;
}

struct Outcome {
  int exitCode = -1;
  std::string out, err;
};

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
              ReadFile(Path(".stdout")), ReadFile(Path(".stderr"))};
    fs::remove(Path(".stdout"));
    fs::remove(Path(".stderr"));
    return r;
  }
  ::testing::AssertionResult Ok(const std::string& args, const std::string& env = "") {
    const Outcome r = Run(args, env);
    if (r.exitCode == 0) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure() << args << ": exit " << r.exitCode << ": " << r.err;
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
  double Diff(const std::string& a, const std::string& b) const {
    return cv::norm(Read(a), Read(b), cv::NORM_INF);
  }

  // `args` fails with `exitCode` (2: a command line the tool cannot parse) and one error line
  // naming `cause`, and leaves the directory as it was `before`.
  void ExpectRefused(const std::string& args, const std::string& cause,
                     const std::vector<std::string>& before, const std::string& env = "",
                     int exitCode = 1) {
    SCOPED_TRACE(args);
    const Outcome r = Run(args, env);
    EXPECT_EQ(r.exitCode, exitCode);
    EXPECT_EQ(r.err.rfind("tessarofx: error: ", 0), 0u) << r.err;
    EXPECT_NE(r.err.find(cause), npos) << r.err;
    EXPECT_EQ(std::count(r.err.begin(), r.err.end(), '\n'), 1) << r.err;
    EXPECT_EQ(dir_.Names(), before) << "output or temporary file left behind";
  }

  tfx_test::TempDir dir_;
};

TEST_F(ToolTest, ListShowsTheTenPublishedFiltersInIndexOrder) {
  // An explicit plug-in wins over the one the environment names.
  const Outcome r = Run("--plugin " TFX_PLUGIN_PATH " list", "TESSAROFX_PLUGIN=/x/env.so");
  ASSERT_EQ(r.exitCode, 0) << r.err;
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
  EXPECT_EQ(names, (std::vector<std::string>{
                       "ColorAdjust", "WhiteBalanceAdjust", "ChromeKeyCombine", "Lut",
                       "VignetteAdjust", "lutAToWhiteEffect", "HSLAdjust",
                       "DistortionFringingAdjust", "LightAdjust", "ChromeKeyLut3dCL"}));
  // The white-balance parameters come from its descriptor, the others from the tool's table.
  for (const char* text : {"u_temperature", "u_exposure", "also registered as: ColorLut3dAdjust"}) {
    EXPECT_NE(r.out.find(text), npos) << text;
  }
  // The JSON form's syntax and completeness are the Python tests' business.
  const Outcome json = Run("list --json");
  ASSERT_EQ(json.exitCode, 0) << json.err;
  for (const char* text : {R"({"name": "u_temperature", "type": "double", "default": 0, )"
                           R"("min": -100, "max": 100, "registered": true)",
                           R"({"name": "red", "type": "int")"}) {
    EXPECT_NE(json.out.find(text), npos) << text;
  }
}

TEST_F(ToolTest, ApplyFindsFiltersByGuidAndNameInAnyCase) {
  WriteInput("in.png");
  ASSERT_TRUE(Ok("apply coloradjust -p u_sat=-100 in.png a.png"));
  ASSERT_TRUE(Ok("apply {18c6e879-4138-42d0-b0b9-6b4401aa97e6} --param=U_SAT=-100 in.png b.png"));
  EXPECT_EQ(ReadFile(Path("a.png")), ReadFile(Path("b.png")));
  // Registered names behind a published one are found too, whatever the effect answers.
  for (const std::string hidden : {"ColorLut3dAdjust", "chromekeylut3d"}) {
    EXPECT_EQ(Run("apply " + hidden + " in.png c.png").err.find("unknown filter"), npos) << hidden;
  }
  // Option-like file names after a double dash.
  WriteInput("-in.png");
  ASSERT_TRUE(Ok("fx brightness -20 -- -in.png -out.png"));
  EXPECT_TRUE(fs::exists(Path("-out.png")));
}

TEST_F(ToolTest, ReadsAnyInputAsBgraAndWritesAlphaOnlyWhereTheFormatHoldsIt) {
  // 0x12AB keeps its high byte.
  ASSERT_TRUE(cv::imwrite(Path("grey16.png"), cv::Mat(3, 5, CV_16UC1, cv::Scalar(0x12AB))));
  ASSERT_TRUE(Ok("apply ColorAdjust grey16.png out.png"));
  ASSERT_EQ(Read("out.png").type(), CV_8UC4);
  EXPECT_EQ(Read("out.png").at<cv::Vec4b>(2, 4), cv::Vec4b(0x12, 0x12, 0x12, 255));
  WriteInput("in.png");
  for (const std::string name : {"o.png", "o.tif", "o.webp", "o.jpg", "o.bmp"}) {
    SCOPED_TRACE(name);
    ASSERT_TRUE(Ok("apply ColorAdjust in.png " + name));
    const bool alpha = name != "o.jpg" && name != "o.bmp";
    ASSERT_EQ(Read(name).channels(), alpha ? 4 : 3);
    EXPECT_EQ(alpha ? Diff(name, "in.png") : 0, 0);
  }
}

TEST_F(ToolTest, FailuresNameTheirCauseAndLeaveNoOutput) {
  WriteInput("in.png");
  WriteInput("wide.png", 9, 4);
  dir_.Write("out.png", "previous");
  dir_.Write("out.cube", "previous");
  dir_.Write("big.cube", CubeText(65));
  dir_.Write("bad.cube", "# c\n\nLUT_3D_SIZE 70\nTITLE \"a\"\n\nTITLE \"b\"\n");
  dir_.Write("grade.lut", "LUT_3D_SIZE 2\n");
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
       "big.cube: 65 points per axis, more than the plug-in's 64: pass --size 64 (or smaller)"},
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
  const std::vector<std::string> before = dir_.Names();
  for (const auto& c : cases) ExpectRefused(c.args, c.cause, before, c.env, c.exitCode);
  EXPECT_EQ(ReadFile(Path("out.png")), "previous");
  EXPECT_EQ(ReadFile(Path("out.cube")), "previous");
  // The refusals are not the input's fault.
  EXPECT_TRUE(Ok("apply ColorAdjust in.png out.png"));
}

TEST_F(ToolTest, LogsOnlyWhenAskedAndGivesUsageOnStdoutOrOnMistakesStderr) {
  WriteInput("in.png");
  const std::string line = "CREATE <PureC> Filter: ColorAdjust";
  const std::string apply = " apply ColorAdjust in.png o.png";
  EXPECT_EQ(Run(apply).err, "");
  EXPECT_NE(Run("-v" + apply).err.find(line), npos);
  EXPECT_NE(Run("--log-level 32" + apply).err.find(line), npos);
  EXPECT_EQ(Run("-v --log-level=off" + apply).err, "");
  for (const auto& [args, text] : {std::pair{"--help", "usage: tessarofx"},
                                   {"apply --help", "usage: tessarofx apply"},
                                   {"apply --help", "-f,--filter FILTER"}}) {
    const Outcome help = Run(args);
    EXPECT_EQ(help.exitCode, 0) << args;
    EXPECT_NE(help.out.find(text), npos) << args;
  }
  const Outcome none = Run("");
  EXPECT_NE(none.exitCode, 0);
  EXPECT_NE(none.err.find("usage: tessarofx"), npos);
}

// Each -f runs on the result of the one before, with its own settings; the chain's result is
// the same as applying the filters one at a time. A function of the table with the same value
// as a filter's parameter gives its bytes.
TEST_F(ToolTest, ApplyChainRunsItsFiltersInOrderAndFxMatchesTheFilter) {
  WriteInput("in.png", 17, 9);
  const std::string first = "ColorAdjust -p u_exposure=30", second = "HSLAdjust -p u_red_sat=-50";
  ASSERT_TRUE(Ok("apply " + first + " in.png a.png"));
  ASSERT_TRUE(Ok("apply " + second + " a.png ab.png"));
  ASSERT_TRUE(Ok("apply " + second + " in.png b.png"));
  ASSERT_TRUE(Ok("apply " + first + " b.png ba.png"));
  ASSERT_TRUE(Ok("apply -f " + first + " -f " + second + " in.png chain.png"));
  EXPECT_EQ(Diff("chain.png", "ab.png"), 0);
  EXPECT_NE(Diff("ab.png", "ba.png"), 0) << "order proves nothing";

  ASSERT_TRUE(Ok("fx exposure -37.5 in.png fx.png"));
  ASSERT_TRUE(Ok("apply ColorAdjust -p u_exposure=-37.5 in.png apply.png"));
  EXPECT_EQ(Diff("fx.png", "apply.png"), 0);
  EXPECT_NE(Diff("fx.png", "in.png"), 0);
}

TEST_F(ToolTest, EveryFxCallingKindRunsWithTheOutputSizeItPromises) {
  // Every function, so every way of calling (scalars, a band record, new images, each call shape
  // of the enhancement table): a wrong pointer type would crash or leave the pixels alone.
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
    ASSERT_TRUE(Ok("fx " + args + " in.png out.png"));
    EXPECT_EQ(Read("out.png").size(), size);
    EXPECT_TRUE(size != cv::Size(33, 21) || Diff("out.png", "in.png") != 0) << "pixels unchanged";
  }
}

TEST_F(ToolTest, FxMergeAndTheMeasuresReadASecondImage) {
  WriteInput("in.png", 12, 8);
  ASSERT_TRUE(cv::imwrite(Path("patch.png"), cv::Mat(3, 4, CV_8UC4, cv::Scalar(10, 20, 30, 255))));
  ASSERT_TRUE(Ok("fx merge 5 2 100 100 in.png patch.png out.png"));
  const cv::Mat merged = Read("out.png"), in = Read("in.png");
  // Placed top-down as the images are read, whatever the function's own row order.
  EXPECT_EQ(merged.at<cv::Vec4b>(2, 5), cv::Vec4b(10, 20, 30, 255));
  EXPECT_EQ(merged.at<cv::Vec4b>(4, 8), cv::Vec4b(10, 20, 30, 255));
  EXPECT_EQ(merged.at<cv::Vec4b>(1, 5), in.at<cv::Vec4b>(1, 5));
  EXPECT_EQ(merged.at<cv::Vec4b>(5, 5), in.at<cv::Vec4b>(5, 5));
  // fx white-point's printout is the Python tests' business, against the module's numbers.
  const Outcome same = Run("fx wb-rates in.png in.png");
  ASSERT_EQ(same.exitCode, 0) << same.err;
  for (const char* text : {"temperature change (getAutoWhiteBalanceCCTChangeRate)   0.00",
                           "tint change (getAutoWhiteBalanceTintChangeRate)         0.00"}) {
    EXPECT_NE(same.out.find(text), npos) << same.out;
  }
  EXPECT_EQ(dir_.Names(), (std::vector<std::string>{"in.png", "out.png", "patch.png"}));
}

TEST_F(ToolTest, DemoWritesTheSceneEachFilterAndAContactSheet) {
  const Outcome r = Run("demo");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const auto demo = [&](const std::string& name) { return Read("demo-out/" + name + ".png"); };
  const cv::Mat scene = demo("sample");
  ASSERT_EQ(scene.size(), cv::Size(960, 540));
  EXPECT_NE(cv::norm(demo("ColorAdjust"), scene, cv::NORM_INF), 0);
  EXPECT_FALSE(demo("contact-sheet").empty());
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
  const cv::Mat filled = demo("lutAToWhiteEffect");
  ASSERT_EQ(filled.size(), scene.size());
  EXPECT_EQ(filled.at<cv::Vec4b>(60, 500), cv::Vec4b(0, 0, 0, 255));
  EXPECT_EQ(filled.at<cv::Vec4b>(90, 40), scene.at<cv::Vec4b>(90, 40));
  // Grain, then denoised back towards the scene; the cut-out with its outline on a canvas 8
  // pixels larger on each side.
  const cv::Mat grain = demo("grain"), denoised = demo("denoise");
  EXPECT_LT(cv::norm(denoised, scene, cv::NORM_L2), 0.7 * cv::norm(grain, scene, cv::NORM_L2));
  EXPECT_EQ(demo("cutout-frame").size(), cv::Size(976, 556));
  // The filters with an OpenCL class ran again on the default device, to the CPU class's bytes
  // where the kernels are exact, unless the machine has no OpenCL at all.
  if (r.out.find("skipped the OpenCL classes: no OpenCL device") == npos) {
    for (const std::string name : {"ColorLut3dAdjust", "ChromeKeyLut3d-alpha",
                                   "ChromeKeyLut3d-beauty", "lutAToWhiteEffect"}) {
      EXPECT_EQ(Diff("demo-out/opencl-" + name + ".png", "demo-out/" + name + ".png"), 0) << name;
    }
    EXPECT_TRUE(fs::exists(Path("demo-out/opencl-WhiteBalanceAdjust.png")));
  }
}

// The table rows of a ".cube" file, in file order.
std::vector<std::array<double, 3>> CubeRows(const std::string& text) {
  std::vector<std::array<double, 3>> rows;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    std::array<double, 3> v;
    if (std::sscanf(line.c_str(), "%lf %lf %lf", &v[0], &v[1], &v[2]) == 3) rows.push_back(v);
  }
  return rows;
}

// A refused file names the status, its meaning and the physical line where the plug-in's reader
// stopped, counting the comments and blank lines it skipped.
TEST_F(ToolTest, LutInfoShowsSizeTitleAndDomainOrWhereTheReaderStopped) {
  dir_.Write("grade.CUBE", CubeText(5, "# made by hand\nTITLE \"Warm\"\nDOMAIN_MIN 0.5 0.5 0.5\n"));
  const Outcome r = Run("lut info grade.CUBE");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  for (const char* line :
       {"size:    5 points per axis", "title:   Warm\n", "domain:  0.5 0.5 0.5 .. 1 1 1"}) {
    EXPECT_NE(r.out.find(line), npos) << r.out;
  }
  dir_.Write("big.cube", CubeText(65, "# 65 points\n\n"));
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
// and any mix-up of axes or corners shows.
TEST_F(ToolTest, LutConvertResamplesBigTablesAndTurns3dlIntoCubeKeepingTheDomainScaling) {
  dir_.Write("big.cube", CubeText(65, "# rotation\n", 1, 0, true));
  for (const int n : {33, 20}) {
    SCOPED_TRACE(n);
    const std::string out = "small" + std::to_string(n) + ".cube";
    ASSERT_TRUE(Ok("lut convert big.cube " + out + " --size " + std::to_string(n)));
    EXPECT_LT(
        WorstRotationError(ReadFile(Path(out)), n, [n](int i) { return double(i) / (n - 1); }),
        1e-6);
  }
  // 17 points with a 10-bit input range; every ".3DL" output is taken as 12-bit. Blue changes
  // fastest.
  std::ostringstream text;
  text << "3DMESH\nMesh 4 12\n";
  for (int i = 0; i < 17; ++i) text << (i == 16 ? 1023 : i * 64) << (i == 16 ? "\n" : " ");
  const auto level = [](int i) { return std::lround(double(i) * 4095 / 16.0); };
  for (int i = 0; i < 17 * 17 * 17; ++i) {
    text << level(i / 17 % 17) << " " << level(i % 17) << " " << level(i / 289) << "\n";
  }
  dir_.Write("look.3DL", text.str());
  ASSERT_TRUE(Ok("lut convert look.3DL look.cube"));
  EXPECT_LT(
      WorstRotationError(ReadFile(Path("look.cube")), 17, [&](int i) { return level(i) / 4095.0; }),
      1e-7);
  // The plug-in multiplies by the domain's width and does not subtract its minimum; the
  // converted table means the same, now over the plain domain.
  dir_.Write("half.cube", CubeText(3, "DOMAIN_MIN 0.5 0.5 0.5\n"));
  ASSERT_TRUE(Ok("lut convert half.cube plain.cube"));
  const std::vector<std::array<double, 3>> rows = CubeRows(ReadFile(Path("plain.cube")));
  ASSERT_EQ(rows.size(), 27u);
  EXPECT_EQ(rows[26], (std::array<double, 3>{0.5, 0.5, 0.5}));
  EXPECT_EQ(rows[1], (std::array<double, 3>{0.25, 0, 0}));
}

TEST_F(ToolTest, LutBakeAppliesLikeTheFiltersItBakes) {
  WriteInput("in.png", 33, 21);
  ASSERT_TRUE(Ok("lut bake -f ColorAdjust -p u_exposure=20 exposure.cube"));
  EXPECT_EQ(CubeRows(ReadFile(Path("exposure.cube"))).size(), 33u * 33 * 33);  // the default size
  const std::string lut = "apply ColorLut3dAdjust -p lut3dPath=";
  ASSERT_TRUE(Ok(lut + Path("exposure.cube") + " in.png baked.png"));
  ASSERT_TRUE(Ok("apply ColorAdjust -p u_exposure=20 in.png direct.png"));
  // One level: the filter truncates where doLUT rounds, and a gain's table is exact but in the
  // cell where the gain clips at 255, where it draws a line under the knee (less than a level).
  EXPECT_LE(Diff("baked.png", "direct.png"), 1);
  EXPECT_GT(Diff("baked.png", "in.png"), 5);

  std::string bake = "lut bake --size 17 chain.cube", last = "in.png";
  for (const std::string step :
       {"ColorAdjust -p u_contrast=30 -p u_vib=40",
        "LightAdjust -p u_highLight=-40 -p u_shadow=50 -p u_whiteLevel=20 -p u_blackLevel=-20",
        "WhiteBalanceAdjust -p u_temperature=40 -p u_tint=10"}) {
    bake += " -f " + step;
    ASSERT_TRUE(Ok("apply " + step + " " + last + " after-" + last));
    last = "after-" + last;
  }
  ASSERT_TRUE(Ok(bake));
  ASSERT_TRUE(Ok(lut + Path("chain.cube") + " in.png chain.png"));
  // The filters truncate after every operation and the baked table does not: over every colour
  // that is up to 13 levels, 2.4 on average, with interpolation adding at most 11 at size 17.
  const cv::Mat a = Read("chain.png"), b = Read(last);
  EXPECT_LE(cv::norm(a, b, cv::NORM_INF), 24);
  EXPECT_LE(cv::norm(a, b, cv::NORM_L1) / (3.0 * a.total()), 3.0);
}

// The rows of `devices` as (marked, the rest): a '*' or blank mark, then the index, type, platform
// and device.
std::vector<std::pair<bool, std::string>> DeviceRows(const std::string& out) {
  std::vector<std::pair<bool, std::string>> rows;
  std::istringstream lines(out);
  for (std::string line; std::getline(lines, line);) {
    if (line.size() > 2 && std::isdigit(static_cast<unsigned char>(line[2]))) {
      rows.emplace_back(line[0] == '*', line.substr(2));
    }
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

  const std::vector<NLEOpenCLDeviceInfo> devices = tfx_test::OpenCLDevices();
  const Outcome r = Run("devices", "-u TESSAROFX_OPENCL_DEVICE");
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const auto rows = DeviceRows(r.out);
  ASSERT_EQ(rows.size(), devices.size()) << r.out;
  if (devices.empty()) GTEST_SKIP() << "no OpenCL device on this machine (the runtime lists none)";
  std::string marked;
  for (size_t i = 0; i < rows.size(); ++i) {
    const auto& [mark, rest] = rows[i];
    SCOPED_TRACE(rest);
    EXPECT_EQ(rest.rfind(std::to_string(i) + " ", 0), 0u);
    EXPECT_NE(rest.find(devices[i].platform), npos);
    EXPECT_NE(rest.find(devices[i].device), npos);
    if (mark) marked += devices[i].device;
  }
  // The mark is on the device the kit opens for -1, and moves where the environment points.
  NLEComPtr<INLECGDevice> chosen;
  ASSERT_EQ(NLECommon::CreateOpenCLDevice(-1, &chosen), NLE_S_OK);
  wchar_t name[256] = {};
  ASSERT_EQ(chosen->GetName(name, 256), NLE_S_OK);
  EXPECT_EQ(marked, std::string(name, name + std::wcslen(name)));
  const auto marks = [&](size_t choice, const char* note) {
    const Outcome o = Run("devices", "TESSAROFX_OPENCL_DEVICE=" + std::to_string(choice));
    EXPECT_EQ(o.exitCode, 0);
    EXPECT_NE(o.out.find(note), npos) << o.out;
    std::vector<bool> m;
    for (const auto& row : DeviceRows(o.out)) m.push_back(row.first);
    return m;
  };
  std::vector<bool> unmarked(devices.size()), lastMarked = unmarked;
  lastMarked.back() = true;
  EXPECT_EQ(marks(devices.size() - 1, "the default choice"), lastMarked);
  EXPECT_EQ(marks(devices.size(), "names no device"), unmarked);
}

TEST_F(ToolTest, ApplyOpenCLAgreesWithTheCpuClassAndNamesTheDeviceOrProgramThatFailed) {
  const size_t devices = tfx_test::OpenCLDevices().size();
  if (devices == 0) GTEST_SKIP() << "no OpenCL device on this machine";
  // The option's plumbing (the classes' agreement is the OpenCL effect tests' and the demo's
  // business); 33 columns leave a ragged edge for any vector width a runtime picks.
  WriteInput("in.png", 33, 7);
  const std::string wb = "WhiteBalanceAdjust -p u_temperature=40 -p u_tint=-20";
  ASSERT_TRUE(Ok("apply --opencl " + wb + " in.png cl.png"));
  ASSERT_TRUE(Ok("apply " + wb + " in.png cpu.png"));
  // The kernel computes in float where the CPU class may not: a level per channel.
  EXPECT_LE(Diff("cl.png", "cpu.png"), 1);
  EXPECT_NE(Diff("cpu.png", "in.png"), 0) << "the case proves nothing";
  fs::create_directory(Path("broken"));
  dir_.Write("broken/WhiteBalanceAdjust.cl",
             "__kernel void auto_white_balance(__global uchar4* p) { p[0] = undeclared_name; }\n");
  const std::vector<std::string> before = dir_.Names();
  const std::string count = std::to_string(devices);
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
  EXPECT_EQ(dir_.Names(), before);
}

TEST_F(ToolTest, AFailingOpenCLRuntimeCostsNoCpuPicture) {
  // The loader reads the runtimes to start from *.icd files in OCL_ICD_VENDORS.
  fs::create_directory(Path("vendors"));
  dir_.Write("vendors/aborting.icd", TFX_ABORTING_OPENCL "\n");
  const std::string aborting = "OCL_ICD_VENDORS=" + Path("vendors");
  const Outcome crashed = Run("demo", aborting), off = Run("--no-opencl demo off", aborting);
  ASSERT_EQ(crashed.exitCode, 0) << crashed.err;
  ASSERT_EQ(off.exitCode, 0) << off.err;
  EXPECT_NE(crashed.out.find("skipped the OpenCL classes: the OpenCL runtime crashed while "
                             "starting (Aborted); --no-opencl or TESSAROFX_NO_OPENCL=1"),
            npos)
      << crashed.out;
  EXPECT_NE(off.out.find("skipped the OpenCL classes: OpenCL is turned off (--no-opencl)"), npos);
  for (const std::string dir : {"demo-out/", "off/"}) {
    for (const std::string name : {"sample", "ColorAdjust", "ChromeKeyCombine", "denoise",
                                   "cutout-frame", "contact-sheet"}) {
      EXPECT_TRUE(fs::exists(Path(dir + name + ".png"))) << dir << name;
    }
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
