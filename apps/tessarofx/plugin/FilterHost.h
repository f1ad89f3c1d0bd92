// The host side of running a filter: reading the published descriptors, finding a filter by
// GUID or name, turning command-line settings into the property bags the plug-in expects, and
// driving one frame through a filter object.
#pragma once

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "Status.h"
#include "plugin/FilterTable.h"
#include "plugin/PluginLibrary.h"
#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEOpenCL.h"
#include "tessarofx/NLEProperties.h"

namespace tfxtool {

// One parameter as a host presents it: the descriptor's entry where the filter registers it,
// completed (meaning, and the whole entry for unregistered ones) from the tool's table.
struct FilterParam {
  std::string name;
  ParamType type = ParamType::kDouble;
  double defaultValue = 0;
  double min = 0;
  double max = 0;
  std::string meaning;
  // The descriptor's own bag, read only: bags given to the plug-in are copies of it.
  NLEComPtr<INLEProperties> registered;
};

struct PublishedFilter {
  int index = 0;
  std::string guid;
  std::string name;
  bool cpu = false;
  bool opencl = false;
  std::vector<FilterParam> params;
};

// Every published filter, in index order.
Status ReadPublishedFilters(const PluginLibrary& plugin, std::vector<PublishedFilter>* filters);

struct ResolvedFilter {
  std::string guid;
  std::string name;     // the name the user asked for, as registered
  bool opencl = false;  // the GUID has an OpenCL class
  std::vector<FilterParam> params;
};

// FILTER as given on the command line: a GUID (braces optional) or a friendly name, published or
// registered behind a published one, in any letter case.
Status ResolveFilter(const std::vector<PublishedFilter>& published, const std::string& request,
                     ResolvedFilter* filter);

struct ParamSetting {
  std::string name;
  std::string value;
};

// Splits "NAME=VALUE".
Status ParseParamSetting(const std::string& text, ParamSetting* setting);

// The filter with the settings applied: its CPU class when `target` is null, else its OpenCL
// class on the target's device. Both classes get the same property bag, so a setting means the
// same on either path. NLEComPtr's operator& serves out-parameters of interface calls, so the
// result comes back through a reference.
struct OpenCLTarget;
Status CreateFilter(const PluginLibrary& plugin, const ResolvedFilter& filter,
                    const std::vector<ParamSetting>& settings, const OpenCLTarget* target,
                    NLEComPtr<INLECGFilter>& fx);

// A host frame over a matrix's pixels; the matrix must outlive it.
Status WrapFrame(const cv::Mat& bgra, NLEComPtr<INLEMemoryFrame>& frame);

// One frame through a filter as an editor runs it: the inputs lent for the call only, the time
// in the clip set, Prepare first when `prepare` (a new run of frames of `input`'s size), then
// Running into `dst` (the input's size). The inputs are only read.
HRESULT RunFilterFrame(INLECGFilter* fx, const cv::Mat& input, const cv::Mat& background,
                       cv::Mat& dst, int32_t current, int32_t total, bool prepare);

// Creates the filter's CPU class with the settings applied and runs it once: `foreground` is the
// frame the effect adjusts, `background` the frame under it; `out` gets the foreground's size.
// The inputs are only read.
Status RunFilter(const PluginLibrary& plugin, const ResolvedFilter& filter,
                 const std::vector<ParamSetting>& settings, const cv::Mat& foreground,
                 const cv::Mat& background, cv::Mat* out);

// The device and kernel directory the OpenCL class of a filter is created with.
struct OpenCLTarget {
  INLECGDevice* device = nullptr;
  std::string deviceName;  // for messages
  std::string kernelDir;
};

// Opens device `index` (-1: the default choice) and names the kernel directory: `kernelDir`, or
// the one beside the loaded plug-in. A directory that does not exist is refused here, as the
// plug-in would only report a failed build. `device` holds the device for as long as `target`
// is used.
Status OpenOpenCLTarget(const PluginLibrary& plugin, int index, const std::string& kernelDir,
                        NLEComPtr<INLECGDevice>& device, OpenCLTarget* target);

// The filter's OpenCL class on a device, kept with its device frames from one picture to the
// next, as a clip needs it. The target's device must outlive it.
class OpenCLFilterRun {
 public:
  static Status Create(const PluginLibrary& plugin, const ResolvedFilter& filter,
                       const std::vector<ParamSetting>& settings, const OpenCLTarget& target,
                       OpenCLFilterRun* run);
  // `input` uploaded into a device frame, the filter run, the result downloaded into `out`.
  Status Run(const cv::Mat& input, cv::Mat* out);

 private:
  std::string name_;
  OpenCLTarget target_;
  NLEComPtr<INLECGFilter> fx_;
  NLEComPtr<INLEOpenCLFrame> src_, dst_;
  cv::Size size_;
};

// RunFilter for the filter's OpenCL class: the same settings, with `input` uploaded into a frame
// in the device's memory and the result downloaded into `out`. The OpenCL classes adjust one
// frame, so there is no background.
Status RunFilterOpenCL(const PluginLibrary& plugin, const ResolvedFilter& filter,
                       const std::vector<ParamSetting>& settings, const OpenCLTarget& target,
                       const cv::Mat& input, cv::Mat* out);

}  // namespace tfxtool
