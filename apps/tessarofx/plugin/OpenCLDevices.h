// The OpenCL devices the host kit can open, as the tool names and chooses them.
#pragma once

#include <string>
#include <vector>

#include "Status.h"
#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEOpenCL.h"

namespace tfxtool {

// Whether this run may touch the OpenCL runtime at all. Not when `turnedOff` (--no-opencl) or
// TESSAROFX_NO_OPENCL (any value but empty and "0") says so, nor when the runtime crashes while
// starting: a runtime that aborts inside its own start-up (PoCL without /sys, a broken driver)
// would take the tool with it, so a child process starts it first. Asked once per run; the
// error says why OpenCL is unavailable and how to turn it off.
Status CheckOpenCLUsable(bool turnedOff);

// Every device of every platform, in the kit's order (its indices are the kit's indices).
Status ListDevices(std::vector<NLEOpenCLDeviceInfo>* devices);

// "GPU", "CPU", "accelerator" or "other".
const char* DeviceTypeName(uint64_t type);

// The index the kit opens for -1, or -1 when TESSAROFX_OPENCL_DEVICE names no device, with
// *why saying so.
int DefaultDeviceIndex(const std::vector<NLEOpenCLDeviceInfo>& devices, std::string* why);

// Opens device `index` (-1: the default choice). Refusals say which devices there are.
Status OpenDevice(int index, NLEComPtr<INLECGDevice>& device, std::string* name);

}  // namespace tfxtool
