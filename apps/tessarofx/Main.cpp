// tessarofx: runs the TessaroFx plug-in on pictures and clips the way a video editor drives it, so
// that its filters can be tried, scripted and checked without an editor.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <opencv2/core.hpp>

#include "commands/Commands.h"
#include "media/Reporter.h"
#include "media/Text.h"
#include "plugin/FilterTable.h"
#include "tessarofx/NLEHost.h"

namespace tfxtool {
namespace {

constexpr const char* kDescription =
    "Runs the TessaroFx filter plug-in on pictures and clips, as a video editor would.";

constexpr const char* kFooter = R"(
The plug-in is --plugin, else $TESSAROFX_PLUGIN, else the one beside the tool, else the one the
loader finds. The log threshold is --log-level, else -v (32), else $TESSAROFX_LOG_LEVEL, else 48;
$TESSAROFX_NO_OPENCL=1 works as --no-opencl.

Images: PNG, TIFF and WebP keep alpha; JPEG and BMP are written without it. Every image is
processed as 8-bit BGRA. 'tessarofx COMMAND --help' describes a command.)";

// Exit codes: 1 when a command fails, its arguments included; 2 when the line names no command
// the tool can run or a global option is wrong, as the shell's own utilities do.
constexpr int kFailed = 1;
constexpr int kUsage = 2;
constexpr int kIncomplete = 3;  // the output stands, but the input could not all be read

void PrintError(const std::string& message) {
  std::fprintf(stderr, "tessarofx: error: %s\n", message.c_str());
}

Status ParseLogLevel(const std::string& text, int32_t* level) {
  if (EqualsNoCase(text, "off")) {
    *level = kNLELogOff;
    return Status::Ok();
  }
  long long v = 0;
  if (!ParseInteger(text, &v) || v < 0 || v > kNLELogOff) {
    return Status::Error("bad log level '" + text + "': a number from 0 or 'off'");
  }
  *level = static_cast<int32_t>(v);
  return Status::Ok();
}

// CLI11 reads "-20" as a value but "-.5" as the option "-."; the old command line took both
// as numbers, so the second is written the way the parser expects.
std::string NumberWord(const std::string& word) {
  if (word.size() > 2 && word[0] == '-' && word[1] == '.' &&
      word.find_first_not_of("0123456789", 2) == std::string::npos) {
    return "-0" + word.substr(1);
  }
  return word;
}

int Run(int argc, char** argv) {
  GlobalOptions options;
  bool verbose = false;
  std::string logLevel;

  CLI::App app(kDescription, "tessarofx");
  app.get_formatter()->label("Usage", "usage");
  app.get_formatter()->column_width(28);
  // Global options may also follow the command, as they could before subcommands existed.
  app.fallthrough();
  app.require_subcommand(0, 1);
  app.add_option("--plugin", options.pluginPath,
                 "the plug-in that runs the filters (default: see below)")
      ->type_name("PATH");
  app.add_option("--log-level", logLevel,
                 "plug-in log threshold: 0 trace, 16 debug, 32 info, 48 warning, 64 error")
      ->type_name("N|off");
  app.add_flag("-v,--verbose", verbose,
               "log level 32: show each filter as it is created; for clips, where the time went");
  app.add_flag("--no-opencl", options.noOpenCL,
               "never touch the OpenCL runtime (apply --opencl and devices refuse)");
  app.add_flag("-q,--quiet", options.quiet, "no progress display; messages still appear");

  std::vector<Command> commands;
  AddListCommand(app, options, &commands);
  AddApplyCommand(app, options, &commands);
  AddKeyCommand(app, options, &commands);
  AddFxCommand(app, options, &commands);
  AddLutCommand(app, options, &commands);
  AddDemoCommand(app, options, &commands);
  AddDevicesCommand(app, options, &commands);
  // After the commands, which would otherwise inherit it.
  app.footer(kFooter);

  // Words after "--" are the command's arguments whatever they look like; the parser sees the
  // words before it only.
  std::vector<std::string> words, trailing;
  bool ended = false;
  for (int i = 1; i < argc; ++i) {
    const std::string word = argv[i];
    if (ended) {
      trailing.push_back(word);
    } else if (word == "--") {
      ended = true;
    } else {
      words.push_back(NumberWord(word));
    }
  }
  std::reverse(words.begin(), words.end());  // the parser takes them last first

  // The innermost command given: "lut bake" rather than "lut".
  const auto selected = [&]() -> const Command* {
    const Command* found = nullptr;
    for (const Command& c : commands) {
      if (c.app->parsed()) found = &c;
    }
    return found;
  };
  try {
    app.parse(words);
  } catch (const CLI::CallForHelp&) {
    std::fputs(app.help().c_str(), stdout);
    return 0;
  } catch (const CLI::ParseError& e) {
    if (!selected() && !app.remaining().empty()) {
      PrintError("unknown command '" + app.remaining().front() + "' (see tessarofx --help)");
    } else {
      PrintError(e.what());
    }
    return selected() ? kFailed : kUsage;
  }
  const Command* command = selected();
  if (!command) {
    std::fputs(app.help().c_str(), stderr);
    return kUsage;
  }
  if (!trailing.empty()) {
    if (!command->positional) {
      PrintError("unexpected argument '" + trailing.front() + "'");
      return kFailed;
    }
    command->positional->insert(command->positional->end(), trailing.begin(), trailing.end());
  }

  // Creation lines are informational: quiet unless asked for, here or in the environment.
  if (INLELogger* logger = NLEGetDefaultLogger()) {
    int32_t level = kNLELogWarning;
    if (!logLevel.empty()) {
      if (Status s = ParseLogLevel(logLevel, &level); !s.ok()) {
        PrintError(s.message());
        return kUsage;
      }
      logger->SetLevel(level);
    } else if (verbose) {
      logger->SetLevel(kNLELogInfo);
    } else if (!std::getenv("TESSAROFX_LOG_LEVEL")) {
      logger->SetLevel(level);
    }
  }

  options.verbose = verbose;
  Reporter reporter(options.quiet, Reporter::StderrIsTerminal());
  options.reporter = &reporter;
  if (Status s = command->run(); !s.ok()) {
    if (s.incomplete()) {
      reporter.Warn(s.message());
      return kIncomplete;
    }
    reporter.Error(s.message());
    return kFailed;
  }
  return 0;
}

}  // namespace
}  // namespace tfxtool

int main(int argc, char** argv) {
  // Nothing below is expected to throw; this keeps a surprise (an allocation failure, a codec
  // error) a message and an exit code rather than an abort.
  try {
    return tfxtool::Run(argc, argv);
  } catch (const cv::Exception& e) {
    tfxtool::PrintError(e.err);
  } catch (const std::exception& e) {
    tfxtool::PrintError(e.what());
  }
  return 1;
}
