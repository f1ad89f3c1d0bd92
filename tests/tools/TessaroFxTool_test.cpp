// The tool as a user runs it: a separate process, its exit code, its output and the files it
// leaves behind.
#include <dlfcn.h>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <opencv2/core.hpp>
#include <opencv2/imgcodecs.hpp>
#include <sstream>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

struct Outcome {
  int exitCode = -1;
  std::string out;
  std::string err;
};

std::string Slurp(const fs::path& path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream ss;
  ss << in.rdbuf();
  return ss.str();
}

class ToolTest : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/tessarofx-tool-XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    dir_ = pattern;
  }
  void TearDown() override { fs::remove_all(dir_); }

  // Runs the tool in the temporary directory; `env` entries are added to the environment.
  Outcome Run(const std::vector<std::string>& args, const std::vector<std::string>& env = {}) {
    const fs::path outFile = dir_ / ".stdout", errFile = dir_ / ".stderr";
    const pid_t pid = fork();
    if (pid == 0) {
      const int o = open(outFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
      const int e = open(errFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
      if (o < 0 || e < 0 || dup2(o, 1) < 0 || dup2(e, 2) < 0 || chdir(dir_.c_str()) != 0)
        _exit(127);
      // Hermetic: only what a case sets reaches the tool.
      unsetenv("TESSAROFX_PLUGIN");
      unsetenv("TESSAROFX_LOG_LEVEL");
      for (const std::string& kv : env) putenv(const_cast<char*>(kv.c_str()));
      std::vector<char*> argv = {const_cast<char*>(TFX_TOOL_PATH)};
      for (const std::string& a : args) argv.push_back(const_cast<char*>(a.c_str()));
      argv.push_back(nullptr);
      execv(TFX_TOOL_PATH, argv.data());
      _exit(127);
    }
    Outcome r;
    int status = 0;
    if (pid > 0 && waitpid(pid, &status, 0) == pid) {
      // A crash is reported as 128 + signal, so it can never pass for a clean failure.
      r.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    }
    r.out = Slurp(outFile);
    r.err = Slurp(errFile);
    fs::remove(outFile);
    fs::remove(errFile);
    return r;
  }

  std::string Path(const std::string& name) const { return (dir_ / name).string(); }

  // Writes a small BGRA image with distinct channels and a varying alpha.
  std::string WriteInput(const std::string& name, int width = 6, int height = 4) {
    cv::Mat img(height, width, CV_8UC4);
    for (int y = 0; y < height; ++y) {
      for (int x = 0; x < width; ++x) {
        img.at<cv::Vec4b>(y, x) =
            cv::Vec4b(static_cast<uchar>(20 * x + 3), static_cast<uchar>(40 * y + 60),
                      static_cast<uchar>(130 + 10 * x), static_cast<uchar>(255 - 30 * x));
      }
    }
    EXPECT_TRUE(cv::imwrite(Path(name), img));
    return Path(name);
  }

  std::vector<std::string> Listing() const {
    std::vector<std::string> names;
    for (const auto& e : fs::directory_iterator(dir_)) names.push_back(e.path().filename());
    std::sort(names.begin(), names.end());
    return names;
  }

  fs::path dir_;
};

bool IsGuid(const std::string& s) {
  if (s.size() != 36) return false;
  for (size_t i = 0; i < s.size(); ++i) {
    const bool hyphen = i == 8 || i == 13 || i == 18 || i == 23;
    if (hyphen ? s[i] != '-'
               : !std::isxdigit(static_cast<unsigned char>(s[i])) || std::islower(s[i]))
      return false;
  }
  return true;
}

// Only the command-line half of a clean failure: one line naming the cause, no crash.
void ExpectCleanFailure(const Outcome& r, const std::string& cause) {
  EXPECT_NE(r.exitCode, 0);
  EXPECT_LT(r.exitCode, 128) << "the tool crashed";
  EXPECT_EQ(r.err.rfind("tessarofx: error: ", 0), 0u) << r.err;
  EXPECT_NE(r.err.find(cause), std::string::npos) << r.err;
  EXPECT_EQ(std::count(r.err.begin(), r.err.end(), '\n'), 1) << r.err;
}

TEST_F(ToolTest, ListShowsTheTenPublishedFiltersInIndexOrder) {
  const Outcome r = Run({"list"});
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
  EXPECT_NE(r.out.find("u_temperature"), std::string::npos);
  EXPECT_NE(r.out.find("u_exposure"), std::string::npos);
  EXPECT_NE(r.out.find("also registered as: ColorLut3dAdjust"), std::string::npos);
}

// Enough of a JSON reader to tell well-formed output from broken output.
class JsonChecker {
 public:
  explicit JsonChecker(const std::string& s) : s_(s) {}
  bool Valid() {
    const bool ok = Value();
    Space();
    return ok && i_ == s_.size();
  }

 private:
  void Space() {
    while (i_ < s_.size() && std::isspace(static_cast<unsigned char>(s_[i_]))) ++i_;
  }
  bool Eat(char c) {
    Space();
    if (i_ < s_.size() && s_[i_] == c) return ++i_, true;
    return false;
  }
  bool String() {
    if (!Eat('"')) return false;
    while (i_ < s_.size() && s_[i_] != '"') i_ += s_[i_] == '\\' ? 2 : 1;
    return i_ < s_.size() && s_[i_++] == '"';
  }
  bool Value() {
    Space();
    if (i_ >= s_.size()) return false;
    const char c = s_[i_];
    if (c == '"') return String();
    if (c == '{' || c == '[') {
      const char close = c == '{' ? '}' : ']';
      ++i_;
      if (Eat(close)) return true;
      do {
        if (c == '{' && !(String() && Eat(':'))) return false;
        if (!Value()) return false;
      } while (Eat(','));
      return Eat(close);
    }
    for (const char* word : {"true", "false", "null"}) {
      if (s_.compare(i_, std::strlen(word), word) == 0) return i_ += std::strlen(word), true;
    }
    char* end = nullptr;
    std::strtod(s_.c_str() + i_, &end);
    if (end == s_.c_str() + i_) return false;
    i_ = static_cast<size_t>(end - s_.c_str());
    return true;
  }
  const std::string& s_;
  size_t i_ = 0;
};

TEST_F(ToolTest, ListJsonIsWellFormedAndCarriesEveryFilter) {
  const Outcome r = Run({"list", "--json"});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_TRUE(JsonChecker(r.out).Valid()) << r.out;
  int guids = 0;
  const std::string key = "\"guid\": \"";
  for (size_t at = r.out.find(key); at != std::string::npos; at = r.out.find(key, at + 1)) {
    guids += IsGuid(r.out.substr(at + key.size(), 36)) ? 1 : 0;
  }
  EXPECT_EQ(guids, 10);
  EXPECT_NE(r.out.find(R"({"name": "u_temperature", "type": "double", "default": 0, "min": -100, )"
                       R"("max": 100, "registered": true)"),
            std::string::npos);
  EXPECT_NE(r.out.find(R"({"name": "red", "type": "int")"), std::string::npos);
}

TEST_F(ToolTest, ApplyBrightnessDoublesChannelsAndKeepsAlpha) {
  const std::string in = WriteInput("in.png");
  const Outcome r = Run({"apply", "ColorAdjust", "-p", "u_brightness=100", in, Path("out.png")});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const cv::Mat before = cv::imread(in, cv::IMREAD_UNCHANGED);
  const cv::Mat after = cv::imread(Path("out.png"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(after.type(), CV_8UC4);
  ASSERT_EQ(after.size(), before.size());
  for (int y = 0; y < before.rows; ++y) {
    for (int x = 0; x < before.cols; ++x) {
      const cv::Vec4b b = before.at<cv::Vec4b>(y, x), a = after.at<cv::Vec4b>(y, x);
      for (int c = 0; c < 3; ++c) EXPECT_EQ(a[c], std::min(255, 2 * b[c])) << x << "," << y;
      EXPECT_EQ(a[3], b[3]);
    }
  }
}

TEST_F(ToolTest, ApplyFindsFiltersByGuidAndNameInAnyCase) {
  const std::string in = WriteInput("in.png");
  ASSERT_EQ(Run({"apply", "coloradjust", "-p", "u_sat=-100", in, Path("a.png")}).exitCode, 0);
  ASSERT_EQ(Run({"apply", "{18c6e879-4138-42d0-b0b9-6b4401aa97e6}", "--param=U_SAT=-100", in,
                 Path("b.png")})
                .exitCode,
            0);
  EXPECT_EQ(Slurp(Path("a.png")), Slurp(Path("b.png")));
  // Registered names behind a published one are found too, whatever the effect answers.
  for (const char* hidden : {"ColorLut3dAdjust", "chromekeylut3d"}) {
    const Outcome r = Run({"apply", hidden, in, Path("c.png")});
    EXPECT_EQ(r.err.find("unknown filter"), std::string::npos) << hidden << ": " << r.err;
  }
}

TEST_F(ToolTest, ReadsGreyAndSixteenBitInputAsBgra) {
  // 0x12AB keeps its high byte; a grey image becomes opaque BGRA.
  cv::Mat grey16(3, 5, CV_16UC1, cv::Scalar(0x12AB));
  ASSERT_TRUE(cv::imwrite(Path("grey16.png"), grey16));
  ASSERT_EQ(Run({"apply", "ColorAdjust", Path("grey16.png"), Path("out.png")}).exitCode, 0);
  const cv::Mat out = cv::imread(Path("out.png"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(out.type(), CV_8UC4);
  EXPECT_EQ(out.at<cv::Vec4b>(2, 4), cv::Vec4b(0x12, 0x12, 0x12, 255));
  // JPEG holds no alpha: written as BGR.
  ASSERT_EQ(Run({"apply", "ColorAdjust", Path("grey16.png"), Path("out.jpg")}).exitCode, 0);
  EXPECT_EQ(cv::imread(Path("out.jpg"), cv::IMREAD_UNCHANGED).channels(), 3);
}

TEST_F(ToolTest, FailuresNameTheirCauseAndLeaveNoOutput) {
  const std::string in = WriteInput("in.png");
  WriteInput("wide.png", 9, 4);
  const std::string out = Path("out.png");
  struct Case {
    const char* name;
    std::vector<std::string> args;
    const char* cause;
  };
  const std::vector<Case> cases = {
      {"unknown filter", {"apply", "NoSuchFilter", in, out}, "unknown filter 'NoSuchFilter'"},
      {"unknown parameter",
       {"apply", "ColorAdjust", "-p", "u_glow=3", in, out},
       "valid: u_exposure"},
      {"parameter of a filter without any",
       {"apply", "HSLAdjust", "-p", "a=1", in, out},
       "takes no parameters"},
      {"bad number", {"apply", "ColorAdjust", "-p", "u_sat=12x", in, out}, "not a number"},
      {"fraction for an integer",
       {"apply", "ChromeKeyLut3d", "-p", "red=1.5", in, out},
       "not an integer"},
      {"out of range", {"apply", "ColorAdjust", "-p", "u_contrast=255", in, out}, "-100..100"},
      {"integer out of range", {"apply", "ChromeKeyLut3d", "-p", "green=256", in, out}, "0..255"},
      {"missing input", {"apply", "ColorAdjust", Path("none.png"), out}, "none.png"},
      {"background size",
       {"apply", "ColorAdjust", "--background", Path("wide.png"), in, out},
       "9x4"},
      // HSLAdjust has no effect yet; when it gets one, pick another unimplemented filter.
      {"not implemented", {"apply", "HSLAdjust", in, out}, "0x80000001 (not implemented)"},
      {"unknown format", {"apply", "ColorAdjust", in, Path("out.xyz")}, "unknown image format"},
      {"missing directory",
       {"apply", "ColorAdjust", in, Path("no/such/dir/out.png")},
       "No such file or directory"},
      {"file as directory",
       {"apply", "ColorAdjust", in, Path("in.png/out.png")},
       "Not a directory"},
      {"fx bad number", {"fx", "exposure", "bright", in, out}, "not a number"},
      {"fx unknown function", {"fx", "sharpen", "3", in, out}, "unknown function"},
      {"plug-in not found", {"--plugin", Path("nowhere.so"), "list"}, "nowhere.so"},
  };
  const std::vector<std::string> before = Listing();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    ExpectCleanFailure(Run(c.args), c.cause);
    EXPECT_EQ(Listing(), before) << "output or temporary file left behind";
  }
}

TEST_F(ToolTest, WritesAlphaOnlyWhereTheFormatHoldsIt) {
  const std::string in = WriteInput("in.png");
  const cv::Mat source = cv::imread(in, cv::IMREAD_UNCHANGED);
  for (const char* name : {"o.png", "o.tif", "o.webp", "o.jpg", "o.bmp"}) {
    SCOPED_TRACE(name);
    ASSERT_EQ(Run({"apply", "ColorAdjust", in, Path(name)}).exitCode, 0);
    const cv::Mat out = cv::imread(Path(name), cv::IMREAD_UNCHANGED);
    const bool lossy = std::string(name) == "o.jpg";
    const bool alpha = !lossy && std::string(name) != "o.bmp";
    ASSERT_EQ(out.channels(), alpha ? 4 : 3);
    if (alpha) {
      EXPECT_EQ(cv::norm(out, source, cv::NORM_INF), 0);
    }
  }
}

TEST_F(ToolTest, ReplacesAnExistingOutputOnlyOnSuccess) {
  const std::string in = WriteInput("in.png");
  { std::ofstream(Path("out.png")) << "previous"; }
  ExpectCleanFailure(Run({"apply", "HSLAdjust", in, Path("out.png")}), "not implemented");
  EXPECT_EQ(Slurp(Path("out.png")), "previous");
  ASSERT_EQ(Run({"apply", "ColorAdjust", in, Path("out.png")}).exitCode, 0);
  EXPECT_EQ(cv::imread(Path("out.png"), cv::IMREAD_UNCHANGED).size(), cv::Size(6, 4));
}

TEST_F(ToolTest, ReadsOptionLikeFileNamesAfterDoubleDash) {
  const std::string in = WriteInput("-in.png");
  const Outcome r = Run({"fx", "brightness", "-20", "--", "-in.png", "-out.png"});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  EXPECT_TRUE(fs::exists(Path("-out.png")));
  ExpectCleanFailure(Run({"apply", "ColorAdjust", "-in.png", "o.png"}), "unknown option '-in.png'");
}

TEST_F(ToolTest, LogsFilterCreationOnlyWhenAsked) {
  const std::string in = WriteInput("in.png");
  const std::string line = "CREATE <PureC> Filter: ColorAdjust";
  const std::vector<std::string> apply = {"apply", "ColorAdjust", in, Path("o.png")};
  auto with = [&](std::vector<std::string> flags) {
    flags.insert(flags.end(), apply.begin(), apply.end());
    return flags;
  };
  EXPECT_EQ(Run(apply).err, "");
  EXPECT_NE(Run(with({"-v"})).err.find(line), std::string::npos);
  EXPECT_NE(Run(with({"--log-level", "32"})).err.find(line), std::string::npos);
  EXPECT_NE(Run(apply, {"TESSAROFX_LOG_LEVEL=0"}).err.find(line), std::string::npos);
  EXPECT_EQ(Run(with({"-v", "--log-level=off"})).err, "");
  ExpectCleanFailure(Run(with({"--log-level", "loud"})), "bad log level 'loud'");
}

TEST_F(ToolTest, PluginComesFromTheEnvironmentUnlessGivenExplicitly) {
  ExpectCleanFailure(Run({"list"}, {"TESSAROFX_PLUGIN=" + Path("env.so")}), "env.so");
  const Outcome r = Run({"--plugin", TFX_PLUGIN_PATH, "list"}, {"TESSAROFX_PLUGIN=/x/env.so"});
  EXPECT_EQ(r.exitCode, 0) << r.err;
}

TEST_F(ToolTest, FxExposureMatchesTheFilterWithTheSameValue) {
  const std::string in = WriteInput("in.png", 17, 9);
  ASSERT_EQ(Run({"fx", "exposure", "-37.5", in, Path("fx.png")}).exitCode, 0);
  ASSERT_EQ(Run({"apply", "ColorAdjust", "-p", "u_exposure=-37.5", in, Path("apply.png")}).exitCode,
            0);
  const cv::Mat fx = cv::imread(Path("fx.png"), cv::IMREAD_UNCHANGED);
  const cv::Mat filtered = cv::imread(Path("apply.png"), cv::IMREAD_UNCHANGED);
  ASSERT_FALSE(fx.empty());
  EXPECT_EQ(cv::norm(fx, filtered, cv::NORM_INF), 0);
  EXPECT_NE(cv::norm(fx, cv::imread(in, cv::IMREAD_UNCHANGED), cv::NORM_INF), 0);
}

TEST_F(ToolTest, EveryFxSymbolResolvesInThePlugin) {
  const Outcome r = Run({"fx", "--list"});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  std::vector<std::string> symbols;
  std::istringstream words(r.out);
  for (std::string w; words >> w;) {
    if (w.rfind("_Z", 0) == 0) symbols.push_back(w);
  }
  // Five functions, the image class's wrapping constructor and its destructor.
  ASSERT_GE(symbols.size(), 7u) << r.out;
  void* plugin = dlopen(TFX_PLUGIN_PATH, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(plugin, nullptr) << dlerror();
  for (const std::string& s : symbols) EXPECT_NE(dlsym(plugin, s.c_str()), nullptr) << s;
  dlclose(plugin);
}

TEST_F(ToolTest, DemoWritesTheSceneEachFilterAndAContactSheet) {
  const Outcome r = Run({"demo"});
  ASSERT_EQ(r.exitCode, 0) << r.err;
  const cv::Mat scene = cv::imread(Path("demo-out/sample.png"), cv::IMREAD_UNCHANGED);
  EXPECT_EQ(scene.size(), cv::Size(960, 540));
  const cv::Mat adjusted = cv::imread(Path("demo-out/ColorAdjust.png"), cv::IMREAD_UNCHANGED);
  ASSERT_EQ(adjusted.size(), scene.size());
  EXPECT_NE(cv::norm(adjusted, scene, cv::NORM_INF), 0);
  EXPECT_FALSE(cv::imread(Path("demo-out/contact-sheet.png")).empty());
  // Every filter either wrote its picture or was skipped with a note.
  for (const char* name : {"LightAdjust", "WhiteBalanceAdjust", "VignetteAdjust",
                           "DistortionFringingAdjust", "ColorLut3dAdjust", "HSLAdjust",
                           "ChromeKeyLut3d", "ChromeKeyCombine", "lutAToWhiteEffect"}) {
    const bool wrote = fs::exists(Path(std::string("demo-out/") + name + ".png"));
    const bool skipped = r.out.find(std::string("skipped ") + name + ":") != std::string::npos;
    EXPECT_NE(wrote, skipped) << name;
  }
  // The demo is deterministic: a second run into another directory gives the same scene bytes.
  ASSERT_EQ(Run({"demo", Path("again")}).exitCode, 0);
  EXPECT_EQ(Slurp(Path("again/sample.png")), Slurp(Path("demo-out/sample.png")));
}

TEST_F(ToolTest, UsageGoesToStdoutOnRequestAndStderrOnMistakes) {
  const Outcome help = Run({"--help"});
  EXPECT_EQ(help.exitCode, 0);
  EXPECT_NE(help.out.find("usage: tessarofx"), std::string::npos);
  const Outcome none = Run({});
  EXPECT_NE(none.exitCode, 0);
  EXPECT_NE(none.err.find("usage: tessarofx"), std::string::npos);
  ExpectCleanFailure(Run({"frobnicate"}), "unknown command 'frobnicate'");
}

}  // namespace
