#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <cstring>

#include "commands/Commands.h"
#include "plugin/OpenCLDevices.h"

namespace tfxtool {

namespace {

Status ListOpenCLDevices(const GlobalOptions& options) {
  if (Status s = CheckOpenCLUsable(options.noOpenCL); !s.ok()) return s;
  std::vector<NLEOpenCLDeviceInfo> devices;
  if (Status s = ListDevices(&devices); !s.ok()) return s;
  // Having no OpenCL is a state of the machine, not a mistake on the command line.
  if (devices.empty()) {
    std::puts(
        "No OpenCL device: no OpenCL platform was found, or none has a device. Install an "
        "OpenCL runtime (a GPU driver's, or PoCL for the CPU) to use apply --opencl.");
    return Status::Ok();
  }
  std::string why;
  const int chosen = DefaultDeviceIndex(devices, &why);
  int platformWidth = static_cast<int>(std::strlen("platform"));
  for (const NLEOpenCLDeviceInfo& d : devices) {
    platformWidth = std::max(platformWidth, static_cast<int>(std::strlen(d.platform)));
  }
  std::printf("  %-5s  %-11s  %-*s  %s\n", "index", "type", platformWidth, "platform", "device");
  for (size_t i = 0; i < devices.size(); ++i) {
    const NLEOpenCLDeviceInfo& d = devices[i];
    std::printf("%c %-5zu  %-11s  %-*s  %s\n", static_cast<int>(i) == chosen ? '*' : ' ', i,
                DeviceTypeName(d.type), platformWidth, d.platform, d.device);
  }
  if (chosen < 0) {
    std::printf("\nNo default device: %s; apply --opencl needs --device N.\n", why.c_str());
  } else {
    std::puts(
        "\n* the default choice (--device -1): TESSAROFX_OPENCL_DEVICE when set, else the first "
        "GPU, else the first CPU, else the first device.");
  }
  return Status::Ok();
}

}  // namespace

void AddDevicesCommand(CLI::App& app, const GlobalOptions& options,
                       std::vector<Command>* commands) {
  CLI::App* devices =
      app.add_subcommand("devices", "OpenCL devices, as apply --device numbers them.");
  devices->footer(R"(
Lists the OpenCL platforms and devices with the index --device takes; * marks the default
choice. Says so when there is no OpenCL platform.)");
  commands->push_back({devices, nullptr, [&options] { return ListOpenCLDevices(options); }});
}

}  // namespace tfxtool
