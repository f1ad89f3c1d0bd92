// Filters as a host drives them: created through the entry points with their settings in
// property bags, then fed frame after frame; and the OpenCL devices their OpenCL classes run on.
#include <pybind11/stl.h>

#include <chrono>
#include <memory>
#include <mutex>
#include <optional>
#include <vector>

#include "Frames.h"
#include "Module.h"
#include "media/Text.h"
#include "plugin/FilterHost.h"
#include "plugin/FilterTable.h"
#include "plugin/OpenCLDevices.h"

namespace tfxpy {
namespace {

using tfxtool::FilterParam;
using tfxtool::ParamSetting;
using tfxtool::PublishedFilter;
using tfxtool::ResolvedFilter;
using tfxtool::Status;

const std::vector<PublishedFilter>& Published() {
  static const std::vector<PublishedFilter>* published = [] {
    auto* filters = new std::vector<PublishedFilter>;
    Check(tfxtool::ReadPublishedFilters(Plugin(), filters), ErrorKind::kError);
    return filters;
  }();
  return *published;
}

py::list ListFilters() {
  py::list list;
  for (const PublishedFilter& f : Published()) {
    const tfxtool::FilterInfo* info = tfxtool::FindFilterByGuid(f.guid);
    py::list aliases, params;
    if (info) {
      for (const char* alias : info->aliases) aliases.append(alias);
    }
    for (const FilterParam& p : f.params) {
      py::dict param;
      param["name"] = p.name;
      param["type"] = tfxtool::ParamTypeName(p.type);
      if (p.type == tfxtool::ParamType::kString) {
        param["default"] = "";
        param["min"] = py::none();
        param["max"] = py::none();
      } else if (p.type == tfxtool::ParamType::kInt) {
        param["default"] = static_cast<long long>(p.defaultValue);
        param["min"] = static_cast<long long>(p.min);
        param["max"] = static_cast<long long>(p.max);
      } else {
        param["default"] = p.defaultValue;
        param["min"] = p.min;
        param["max"] = p.max;
      }
      param["meaning"] = p.meaning;
      params.append(param);
    }
    py::dict filter;
    filter["index"] = f.index;
    filter["name"] = f.name;
    filter["guid"] = f.guid;
    filter["cpu"] = f.cpu;
    filter["opencl"] = f.opencl;
    filter["summary"] = info ? info->summary : "";
    filter["aliases"] = aliases;
    filter["inputs"] = info ? info->inputs : 1;
    filter["params"] = params;
    list.append(filter);
  }
  return list;
}

void CheckOpenCL() { Check(tfxtool::CheckOpenCLUsable(false), ErrorKind::kError); }

py::list ListDevices() {
  CheckOpenCL();
  std::vector<NLEOpenCLDeviceInfo> devices;
  Check(tfxtool::ListDevices(&devices), ErrorKind::kError);
  const int chosen = tfxtool::DefaultDeviceIndex(devices, nullptr);
  py::list list;
  for (size_t i = 0; i < devices.size(); ++i) {
    py::dict d;
    d["index"] = i;
    d["type"] = tfxtool::DeviceTypeName(devices[i].type);
    d["platform"] = devices[i].platform;
    d["name"] = devices[i].device;
    d["default"] = static_cast<int>(i) == chosen;
    list.append(d);
  }
  return list;
}

bool Overlap(const cv::Mat& a, const cv::Mat& b) {
  return a.datastart < b.dataend && b.datastart < a.dataend;
}

// One filter object, its CPU class or its OpenCL class, kept from frame to frame.
class NativeFilter {
 public:
  NativeFilter(const std::string& name,
               const std::vector<std::pair<std::string, std::string>>& params,
               std::optional<int> device, const std::string& kernels) {
    Check(tfxtool::ResolveFilter(Published(), name, &filter_), ErrorKind::kParameter);
    for (const auto& [key, value] : params) settings_.push_back({key, value});
    if (!device) {
      const Status created = tfxtool::CreateFilter(Plugin(), filter_, settings_, nullptr, fx_);
      // A refused setting is the caller's; a filter the plug-in would not make is the library's.
      Check(created, created.code() == 0 ? ErrorKind::kParameter : ErrorKind::kError);
      return;
    }
    if (!filter_.opencl) {
      throw ModuleError{ErrorKind::kParameter, filter_.name + " has no OpenCL class", 0};
    }
    CheckOpenCL();
    tfxtool::OpenCLTarget target;
    Check(tfxtool::OpenOpenCLTarget(Plugin(), *device, kernels, device_, &target),
          ErrorKind::kError);
    deviceName_ = target.deviceName;
    opencl_ = std::make_unique<tfxtool::OpenCLFilterRun>();
    const Status created =
        tfxtool::OpenCLFilterRun::Create(Plugin(), filter_, settings_, target, opencl_.get());
    Check(created, created.code() == 0 ? ErrorKind::kParameter : ErrorKind::kError);
  }

  py::array Run(py::handle frame, py::handle background, const std::string& order, py::handle out) {
    const Order o = ParseOrder(order);
    FrameIn in = ReadFrame(frame, o, "frame");
    std::optional<FrameIn> under;
    if (!background.is_none()) {
      if (opencl_) {
        throw py::value_error("a filter on an OpenCL device adjusts one frame: no background");
      }
      under = ReadFrame(background, o, "background");
      if (under->pixels.size() != in.pixels.size()) {
        throw py::value_error("the background must have the frame's height and width");
      }
    }
    const int rows = in.pixels.rows, cols = in.pixels.cols;
    py::array result;
    cv::Mat dst;
    if (out.is_none()) {
      result = NewFrame(rows, cols, o, &dst);
    } else {
      // Written in place, so only a packed array of the right shape will do.
      FrameIn given = ReadFrame(out, o, "out");
      auto array = py::reinterpret_borrow<py::array>(out);
      if (given.pixels.size() != in.pixels.size() || !given.keep.is(out) || !array.writeable() ||
          !given.pixels.isContinuous()) {
        throw py::value_error("out must be a writable, C-contiguous array of the frame's shape");
      }
      result = array;
      dst = given.pixels;
    }
    // Filters read neighbouring pixels, so a destination that shares memory with an input
    // (out=frame) gets a copy of that input to read from.
    const bool overlaps = Overlap(dst, in.pixels) || (under && Overlap(dst, under->pixels));
    Status status;
    {
      py::gil_scoped_release released;
      if (overlaps) {
        in.pixels = in.pixels.clone();
        if (under) under->pixels = under->pixels.clone();
      }
      // One caller at a time per filter object; other objects run in parallel.
      std::lock_guard<std::mutex> lock(mutex_);
      status = opencl_ ? RunOpenCL(in.pixels, o, &dst)
                       : RunCpu(in.pixels, under ? &under->pixels : nullptr, o, &dst);
    }
    Check(status, ErrorKind::kError);
    return result;
  }

  void SetTime(int32_t current, int32_t total) {
    if (total < 1 || current < 0 || current >= total) {
      throw py::value_error("the time must satisfy 0 <= current < total");
    }
    std::lock_guard<std::mutex> lock(mutex_);
    current_ = current;
    total_ = total;
  }

  const std::string& name() const { return filter_.name; }
  const std::string& guid() const { return filter_.guid; }
  py::object device() const { return opencl_ ? py::cast(deviceName_) : py::none(); }
  long long runningNs() const { return runningNs_; }

 private:
  // The frame through the CPU class as the tool's chains run it: a destination cleared first,
  // Prepare once per run of frames of one size, the inputs lent only for the call.
  Status RunCpu(const cv::Mat& pixels, const cv::Mat* background, Order order, cv::Mat* dst) {
    const cv::Mat input = ToBgra(pixels, order);
    const cv::Mat under = background ? ToBgra(*background, order) : input;
    cv::Mat target = order == Order::kBgra ? *dst : cv::Mat(input.size(), CV_8UC4);
    const bool prepare = input.size() != prepared_;
    prepared_ = cv::Size();
    const auto start = std::chrono::steady_clock::now();
    const HRESULT hr =
        tfxtool::RunFilterFrame(fx_.get(), input, under, target, current_, total_, prepare);
    runningNs_ = std::chrono::duration_cast<std::chrono::nanoseconds>(
                     std::chrono::steady_clock::now() - start)
                     .count();
    if (NLE_FAILED(hr)) {
      return Status::Error(filter_.name + " failed: " + tfxtool::DescribeResult(hr), hr);
    }
    prepared_ = input.size();
    if (order != Order::kBgra) BgraInto(target, order, dst);
    return Status::Ok();
  }

  Status RunOpenCL(const cv::Mat& pixels, Order order, cv::Mat* dst) {
    // The device frames take packed rows.
    cv::Mat input = ToBgra(pixels, order);
    if (!input.isContinuous()) input = input.clone();
    cv::Mat result;
    const auto start = std::chrono::steady_clock::now();
    if (Status s = opencl_->Run(input, &result); !s.ok()) return s;
    runningNs_ = std::chrono::duration_cast<std::chrono::nanoseconds>(
                     std::chrono::steady_clock::now() - start)
                     .count();
    BgraInto(result, order, dst);
    return Status::Ok();
  }

  ResolvedFilter filter_;
  std::vector<ParamSetting> settings_;
  NLEComPtr<INLECGFilter> fx_;
  NLEComPtr<INLECGDevice> device_;
  std::unique_ptr<tfxtool::OpenCLFilterRun> opencl_;
  std::string deviceName_;
  std::mutex mutex_;
  cv::Size prepared_;
  int32_t current_ = 0;
  int32_t total_ = 1;
  long long runningNs_ = 0;
};

}  // namespace

void RegisterFilters(py::module_& m) {
  m.def("filters", &ListFilters,
        "The published filters, their classes and their parameters, as the tool lists them.");
  m.def("devices", &ListDevices, "The OpenCL devices, numbered as Filter(device=...) takes them.");
  py::class_<NativeFilter>(m, "NativeFilter")
      .def(py::init<const std::string&, const std::vector<std::pair<std::string, std::string>>&,
                    std::optional<int>, const std::string&>(),
           py::arg("name"), py::arg("params"), py::arg("device"), py::arg("kernels"))
      .def("run", &NativeFilter::Run, py::arg("frame"), py::arg("background"), py::arg("order"),
           py::arg("out"))
      .def("set_time", &NativeFilter::SetTime, py::arg("current"), py::arg("total"))
      .def_property_readonly("name", &NativeFilter::name)
      .def_property_readonly("guid", &NativeFilter::guid)
      .def_property_readonly("device", &NativeFilter::device)
      .def_property_readonly("running_ns", &NativeFilter::runningNs);
}

}  // namespace tfxpy
