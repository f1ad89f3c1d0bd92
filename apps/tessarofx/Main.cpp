// tessarofx: runs the TessaroFx plug-in on image files the way a video editor drives it, so that
// its filters can be tried, scripted and checked without an editor.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <opencv2/core.hpp>

#include "commands/Commands.h"
#include "media/Text.h"
#include "plugin/FilterTable.h"
#include "tessarofx/NLEHost.h"

namespace tfxtool {
namespace {

constexpr const char* kUsage =
    R"(usage: tessarofx [OPTIONS] COMMAND [ARGS]

Runs the TessaroFx filter plug-in on image files, as a video editor would.

Commands:
  list [--json]
      Published filters in index order, with their support flags and parameters.
  apply FILTER [-p NAME=VALUE]... [--background FILE] INPUT OUTPUT
      Runs one filter on INPUT. FILTER is a GUID or a filter name in any letter case,
      including registered names the list does not show (ColorLut3dAdjust,
      ChromeKeyLut3d). INPUT is the foreground frame; the background is FILE (same size)
      or INPUT itself.
  apply --opencl [--device N] [--kernels DIR] FILTER [-p NAME=VALUE]... INPUT OUTPUT
      Runs the filter's OpenCL class instead (filters whose list entry says OpenCL):
      INPUT goes into a frame in the device's memory and the result comes back from it.
      --device N picks a device from 'devices' (default -1: the default choice);
      --kernels DIR holds the OpenCL programs (default: tessarofx/kernels beside the
      plug-in). A program that does not build shows the compiler's log on stderr.
  devices
      OpenCL platforms and devices, with the index --device takes; * marks the
      default choice. Says so when there is no OpenCL platform.
  fx FUNCTION [ARG]... INPUT [SECOND] [OUTPUT]
      Calls one of the plug-in's exported image functions on INPUT. Most write
      OUTPUT; merge and wb-rates read a SECOND image; white-point and wb-rates print
      measurements instead of writing.
  fx --list
      Those functions, their arguments and their ranges.
  lut info FILE
      Reads a .cube or .3dl file with the plug-in's reader and prints its size, title
      and domain, or the line where reading stopped and why.
  lut convert IN OUT.cube [--size N]
      Rewrites a .cube (up to 256 points per axis) or .3dl table as a .cube file the
      plug-in reads; --size N (2..64) resamples it by tetrahedral interpolation, which
      tables above 64 points need.
  lut bake [-f FILTER [-p NAME=VALUE]...]... [--size N] OUT.cube
      Bakes ColorAdjust, LightAdjust and WhiteBalanceAdjust settings (the parameters
      apply takes) into a .cube table of N points per axis (default 33), in the order
      given; ColorLut3dAdjust then applies the whole chain in one pass.
  demo [OUTDIR]
      Renders a built-in test scene through every filter, writing one PNG per filter
      and contact-sheet.png to OUTDIR (default: demo-out).

Options:
  --plugin PATH      the plug-in to load (default: $TESSAROFX_PLUGIN, then beside the
                     tool, then the loader's search path)
  --log-level N|off  plug-in log threshold: 0 trace, 16 debug, 32 info, 48 warning,
                     64 error (default: $TESSAROFX_LOG_LEVEL, else 48)
  -v, --verbose      log level 32: show each filter as it is created
  --no-opencl        never touch the OpenCL runtime (also $TESSAROFX_NO_OPENCL=1): the
                     demo skips its OpenCL pictures, apply --opencl and devices refuse
  -h, --help         this text

Images: PNG, TIFF and WebP keep alpha; JPEG and BMP are written without it. Every image
is processed as 8-bit BGRA.
)";

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

int Run(int argc, char** argv) {
  GlobalOptions options;
  Args rest;
  bool help = false;
  bool verbose = false;
  std::string logLevel;
  Args all(argv + 1, argv + argc);
  for (size_t i = 0; i < all.size(); ++i) {
    Status error;
    if (all[i] == "--") {
      // After the command word, the command still needs to see it to stop reading options.
      const size_t from = rest.empty() ? i + 1 : i;
      rest.insert(rest.end(), all.begin() + static_cast<std::ptrdiff_t>(from), all.end());
      break;
    }
    if (all[i] == "-h" || all[i] == "--help") {
      help = true;
    } else if (all[i] == "-v" || all[i] == "--verbose") {
      verbose = true;
    } else if (all[i] == "--no-opencl") {
      options.noOpenCL = true;
    } else if (!TakeOptionValue(all, &i, "--plugin", nullptr, &options.pluginPath, &error) &&
               !TakeOptionValue(all, &i, "--log-level", nullptr, &logLevel, &error) && error.ok()) {
      rest.push_back(all[i]);
    }
    if (!error.ok()) {
      PrintError(error.message());
      return 2;
    }
  }
  if (help || rest.empty()) {
    std::fputs(kUsage, help ? stdout : stderr);
    return help ? 0 : 2;
  }

  // Creation lines are informational: quiet unless asked for, here or in the environment.
  INLELogger* logger = NLEGetDefaultLogger();
  if (logger) {
    int32_t level = kNLELogWarning;
    if (!logLevel.empty()) {
      if (Status s = ParseLogLevel(logLevel, &level); !s.ok()) {
        PrintError(s.message());
        return 2;
      }
      logger->SetLevel(level);
    } else if (verbose) {
      logger->SetLevel(kNLELogInfo);
    } else if (!std::getenv("TESSAROFX_LOG_LEVEL")) {
      logger->SetLevel(level);
    }
  }

  const std::string command = rest.front();
  const Args args(rest.begin() + 1, rest.end());
  Status result;
  if (command == "list") {
    result = ListCommand(options, args);
  } else if (command == "apply") {
    result = ApplyCommand(options, args);
  } else if (command == "fx") {
    result = FxCommand(options, args);
  } else if (command == "demo") {
    result = DemoCommand(options, args);
  } else if (command == "lut") {
    result = LutCommand(options, args);
  } else if (command == "devices") {
    result = DevicesCommand(options, args);
  } else {
    PrintError("unknown command '" + command + "' (see tessarofx --help)");
    return 2;
  }
  if (!result.ok()) {
    PrintError(result.message());
    return 1;
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
