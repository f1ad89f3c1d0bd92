#include "plugin/FilterHost.h"

#include <sys/stat.h>

#include <algorithm>
#include <cctype>

#include "media/Text.h"
#include "plugin/FilterChain.h"
#include "plugin/OpenCLDevices.h"
#include "tessarofx/NLECGFilter.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/NLEOpenCL.h"

namespace tfxtool {
namespace {

namespace Key = NLEKey::Filter;
namespace PKey = NLEKey::Filter::Property;

std::string ReadString(INLEProperties* bag, const wchar_t* key) {
  wchar_t buf[1024] = {};
  if (NLE_FAILED(bag->GetString(key, buf, 1024, nullptr))) return {};
  return Narrow(buf);
}

int32_t ReadInt(INLEProperties* bag, const wchar_t* key, int32_t fallback) {
  int32_t v = 0;
  return NLE_SUCCEEDED(bag->GetInt(key, &v)) ? v : fallback;
}

double ReadNumber(INLEProperties* bag, const wchar_t* key, double fallback) {
  CNLEValue value;
  double v = 0;
  if (NLE_SUCCEEDED(bag->GetValue(key, &value)) && value.GetDouble(&v)) return v;
  return NLE_SUCCEEDED(bag->GetDouble(key, &v)) ? v : fallback;
}

NLEComPtr<INLEProperties> ParamBag(INLEProperties* descriptor, int i) {
  NLEComPtr<IUnknown> unknown;
  NLEComPtr<INLEProperties> bag;
  if (NLE_SUCCEEDED(descriptor->GetInterface(PKey::kParamsArray[i], &unknown)) && unknown) {
    if (NLE_FAILED(unknown.QueryInterface(IID_INLEProperties, &bag))) bag.Reset();
  }
  return bag;
}

// The descriptor's parameters first, in their registered order (the filter's own copies are
// indexed by it), then those the tool's table adds.
std::vector<FilterParam> MergeParams(INLEProperties* descriptor, const FilterInfo* info) {
  std::vector<FilterParam> params;
  const int count = descriptor ? std::clamp(ReadInt(descriptor, PKey::kCount, 0), 0,
                                            static_cast<int>(PKey::kMaxParams))
                               : 0;
  for (int i = 0; i < count; ++i) {
    NLEComPtr<INLEProperties> bag = ParamBag(descriptor, i);
    if (!bag) continue;
    FilterParam p;
    p.name = ReadString(bag, PKey::kVariantName);
    if (p.name.empty()) p.name = ReadString(bag, PKey::kFriendName);
    p.type = ReadInt(bag, PKey::kType, 3) == 1 ? ParamType::kInt : ParamType::kDouble;
    p.defaultValue = ReadNumber(bag, PKey::kValue_Default, 0);
    p.min = ReadNumber(bag, PKey::kValue_Min, p.defaultValue);
    p.max = ReadNumber(bag, PKey::kValue_Max, p.defaultValue);
    p.registered = bag;
    params.push_back(p);
  }
  if (!info) return params;
  for (const ParamInfo& row : info->params) {
    auto known = std::find_if(params.begin(), params.end(),
                              [&](const FilterParam& p) { return p.name == row.name; });
    if (known != params.end()) {
      known->meaning = row.meaning;
      continue;
    }
    FilterParam p;
    p.name = row.name;
    p.type = row.type;
    p.defaultValue = row.defaultValue;
    p.min = row.min;
    p.max = row.max;
    p.meaning = row.meaning;
    params.push_back(p);
  }
  return params;
}

std::string NormaliseGuid(std::string text) {
  if (text.size() == 38 && text.front() == '{' && text.back() == '}') {
    text = text.substr(1, 36);
  }
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  return text;
}

std::string ValidNames(const std::vector<FilterParam>& params) {
  std::string names;
  for (const FilterParam& p : params) names += (names.empty() ? "" : ", ") + p.name;
  return names;
}

// The value a setting gives its parameter, checked against the parameter's type and range.
Status ParseSettingValue(const std::string& filterName, const FilterParam& param,
                         const std::string& text, CNLEValue* value, std::wstring* wide) {
  if (param.type == ParamType::kString) {
    *wide = Widen(text);
    return Status::Ok();
  }
  double v = 0;
  if (param.type == ParamType::kInt) {
    long long i = 0;
    if (!ParseInteger(text, &i)) {
      return Status::Error("bad value '" + text + "' for " + param.name + ": not an integer");
    }
    v = static_cast<double>(i);
  } else if (!ParseNumber(text, &v)) {
    return Status::Error("bad value '" + text + "' for " + param.name + ": not a number");
  }
  if (v < param.min || v > param.max) {
    return Status::Error(filterName + " " + param.name + " = " + text + " is outside its range " +
                         FormatNumber(param.min) + ".." + FormatNumber(param.max));
  }
  if (param.type == ParamType::kInt) {
    *value = CNLEValue(static_cast<int>(v));
  } else {
    *value = CNLEValue(v);
  }
  return Status::Ok();
}

// A parameter bag as a host fills it. A registered parameter starts as a copy of the
// descriptor's bag, so whatever the plug-in put there travels back unchanged; the descriptor's
// own bag is shared with every filter of its class and is never written.
Status BuildParamBag(const FilterParam& param, const CNLEValue* number, const std::wstring* text,
                     NLEComPtr<INLEProperties>& out) {
  NLEComPtr<INLEProperties> bag;
  if (NLE_FAILED(NLECommon::CreateProperties(&bag)) || !bag) {
    return Status::Error("cannot create a property bag");
  }
  const std::wstring name = Widen(param.name);
  if (param.registered) {
    param.registered->CopyTo(bag);
  } else {
    bag->SetString(PKey::kVariantName, name.c_str());
    bag->SetString(PKey::kFriendName, name.c_str());
    bag->SetInt(PKey::kDisplayType, 0);
    bag->SetInt(PKey::kType, static_cast<int32_t>(param.type));
    if (param.type == ParamType::kString) {
      bag->SetString(PKey::kValue_Default, L"");
    } else if (param.type == ParamType::kInt) {
      bag->SetValue(PKey::kValue_Min, CNLEValue(static_cast<int>(param.min)));
      bag->SetValue(PKey::kValue_Max, CNLEValue(static_cast<int>(param.max)));
      bag->SetValue(PKey::kValue_Default, CNLEValue(static_cast<int>(param.defaultValue)));
    } else {
      bag->SetValue(PKey::kValue_Min, CNLEValue(param.min));
      bag->SetValue(PKey::kValue_Max, CNLEValue(param.max));
      bag->SetValue(PKey::kValue_Default, CNLEValue(param.defaultValue));
    }
  }
  HRESULT hr = NLE_S_OK;
  if (param.type == ParamType::kString) {
    hr = bag->SetString(PKey::kValue_Current, text ? text->c_str() : L"");
  } else if (number) {
    hr = bag->SetValue(PKey::kValue_Current, *number);
  } else if (!param.registered) {
    CNLEValue def;
    bag->GetValue(PKey::kValue_Default, &def);
    hr = bag->SetValue(PKey::kValue_Current, def);
  }
  if (NLE_FAILED(hr)) {
    return Status::Error("cannot set " + param.name + ": " + DescribeResult(hr), hr);
  }
  out = bag;
  return Status::Ok();
}

// NLEComPtr's operator& serves out-parameters of interface calls, so helpers that fill a
// counted pointer take it by reference.
Status BuildProperties(const ResolvedFilter& filter, const std::vector<ParamSetting>& settings,
                       NLEComPtr<INLEProperties>& out) {
  // Each parameter's value, the last setting of a name winning as on most command lines.
  std::vector<CNLEValue> numbers(filter.params.size());
  std::vector<std::wstring> texts(filter.params.size());
  std::vector<bool> set(filter.params.size(), false);
  for (const ParamSetting& s : settings) {
    size_t i = 0;
    while (i < filter.params.size() && !EqualsNoCase(filter.params[i].name, s.name)) ++i;
    if (i == filter.params.size()) {
      if (filter.params.empty()) return Status::Error(filter.name + " takes no parameters");
      return Status::Error(filter.name + " has no parameter '" + s.name +
                           "' (valid: " + ValidNames(filter.params) + ")");
    }
    if (Status st =
            ParseSettingValue(filter.name, filter.params[i], s.value, &numbers[i], &texts[i]);
        !st.ok()) {
      return st;
    }
    set[i] = true;
  }
  if (filter.params.size() > static_cast<size_t>(PKey::kMaxParams)) {
    return Status::Error(filter.name + " has more parameters than a descriptor holds");
  }

  NLEComPtr<INLEProperties> props;
  if (NLE_FAILED(NLECommon::CreateProperties(&props)) || !props) {
    return Status::Error("cannot create a property bag");
  }
  for (size_t i = 0; i < filter.params.size(); ++i) {
    NLEComPtr<INLEProperties> bag;
    if (Status st = BuildParamBag(filter.params[i], set[i] ? &numbers[i] : nullptr,
                                  set[i] ? &texts[i] : nullptr, bag);
        !st.ok()) {
      return st;
    }
    props->SetInterface(PKey::kParamsArray[i], bag.get());
  }
  props->SetInt(PKey::kCount, static_cast<int32_t>(filter.params.size()));
  out = props;
  return Status::Ok();
}

}  // namespace

// A host frame over a matrix's pixels; the matrix must outlive it.
Status WrapFrame(const cv::Mat& bgra, NLEComPtr<INLEMemoryFrame>& frame) {
  NLEComPtr<INLEMemoryFrame> f;
  HRESULT hr = NLECommon::CreateMemoryFrame(bgra.cols, bgra.rows, 0, &f);
  // Filters only read their input frames; the destination is the one matrix written.
  if (NLE_SUCCEEDED(hr) && f) {
    hr = f->Wrap(const_cast<uint8_t*>(bgra.ptr<uint8_t>()), bgra.cols, bgra.rows,
                 static_cast<int32_t>(bgra.step[0]), kNLEFrameTopDown);
  }
  if (NLE_FAILED(hr) || !f) {
    return Status::Error("cannot create a frame: " + DescribeResult(hr), hr);
  }
  frame = f;
  return Status::Ok();
}

HRESULT RunFilterFrame(INLECGFilter* fx, const cv::Mat& input, const cv::Mat& background,
                       cv::Mat& dst, int32_t current, int32_t total, bool prepare) {
  NLEComPtr<INLEMemoryFrame> fgFrame, bgFrame, dstFrame;
  Status wrapped = WrapFrame(input, fgFrame);
  if (wrapped.ok()) wrapped = WrapFrame(background, bgFrame);
  if (wrapped.ok()) wrapped = WrapFrame(dst, dstFrame);
  if (!wrapped.ok()) return NLE_FAILED(wrapped.code()) ? wrapped.code() : NLE_E_OUTOFMEMORY;
  fx->SetForeground(fgFrame.get());
  fx->SetBackground(bgFrame.get());
  fx->SetTotalTime(total);
  fx->SetCurrentTime(current);
  HRESULT hr = NLE_S_OK;
  if (prepare) {
    CGFilterParam param = {};
    param.frameSize = {input.cols, input.rows};
    param.quality = 1;
    hr = fx->Prepare(param);
  }
  if (NLE_SUCCEEDED(hr)) hr = fx->Running(dstFrame.get());
  // The filter only borrows its inputs, and these frames end with this call.
  fx->SetForeground(nullptr);
  fx->SetBackground(nullptr);
  return hr;
}

Status ReadPublishedFilters(const PluginLibrary& plugin, std::vector<PublishedFilter>* filters) {
  filters->clear();
  const uint32_t count = plugin.FilterCount();
  for (uint32_t i = 0; i < count; ++i) {
    NLEComPtr<INLEProperties> descriptor;
    const HRESULT hr = plugin.Properties(static_cast<int>(i), &descriptor);
    if (NLE_FAILED(hr) || !descriptor) {
      return Status::Error(
          "cannot read the descriptor of filter " + std::to_string(i) + ": " + DescribeResult(hr),
          hr);
    }
    PublishedFilter f;
    f.index = static_cast<int>(i);
    f.guid = ReadString(descriptor, Key::kFilterID);
    f.name = ReadString(descriptor, Key::kFilterFriendName);
    f.cpu = ReadInt(descriptor, Key::kFilterCSupport, 0) != 0;
    f.opencl = ReadInt(descriptor, Key::kFilterOpenclSupport, 0) != 0;
    f.params = MergeParams(descriptor, FindFilterByGuid(f.guid));
    filters->push_back(std::move(f));
  }
  return Status::Ok();
}

Status ResolveFilter(const std::vector<PublishedFilter>& published, const std::string& request,
                     ResolvedFilter* filter) {
  const std::string guid = NormaliseGuid(request);
  const PublishedFilter* match = nullptr;
  std::string name;
  for (const PublishedFilter& f : published) {
    if (f.guid == guid || EqualsNoCase(f.name, request)) {
      match = &f;
      name = f.name;
    }
  }
  if (!match) {
    // A class hidden behind the published one: same GUID, its own registered name.
    if (const FilterInfo* info = FindFilterByName(request)) {
      for (const PublishedFilter& f : published) {
        if (f.guid != info->guid) continue;
        match = &f;
        name = info->name;
        for (const char* alias : info->aliases) {
          if (EqualsNoCase(alias, request)) name = alias;
        }
      }
    }
  }
  if (!match) {
    // The published names, as the parameter errors list theirs: the tool and the Python module
    // both report this.
    std::string known;
    for (const PublishedFilter& f : published) known += (known.empty() ? "" : ", ") + f.name;
    return Status::Error("unknown filter '" + request + "' (known: " + known + ")");
  }
  filter->guid = match->guid;
  filter->name = name;
  filter->opencl = match->opencl;
  filter->params = match->params;
  return Status::Ok();
}

Status ParseParamSetting(const std::string& text, ParamSetting* setting) {
  const size_t eq = text.find('=');
  if (eq == std::string::npos || eq == 0) {
    return Status::Error("expected NAME=VALUE after -p, got '" + text + "'");
  }
  setting->name = text.substr(0, eq);
  setting->value = text.substr(eq + 1);
  return Status::Ok();
}

Status CreateFilter(const PluginLibrary& plugin, const ResolvedFilter& filter,
                    const std::vector<ParamSetting>& settings, const OpenCLTarget* target,
                    NLEComPtr<INLECGFilter>& fx) {
  NLEComPtr<INLEProperties> props;
  if (Status s = BuildProperties(filter, settings, props); !s.ok()) return s;
  const std::wstring guid = Widen(filter.guid);
  INLECGFilter* raw = nullptr;
  const HRESULT hr = plugin.Create(guid.c_str(), props, &raw, target ? target->device : nullptr,
                                   target ? target->kernelDir.c_str() : nullptr);
  fx.Attach(raw);
  if (NLE_SUCCEEDED(hr) && fx) return Status::Ok();
  if (!target) {
    return Status::Error("cannot create " + filter.name + ": " + DescribeResult(hr), hr);
  }
  // The plug-in answers a program that would not load or build with a bare code; the host kit
  // has logged the file or the compiler's output just before.
  return Status::Error("cannot create the OpenCL class of " + filter.name + " on " +
                           target->deviceName + ": " + DescribeResult(hr) +
                           "; its program could not be read from " + target->kernelDir +
                           " or did not build (see the log above)",
                       hr);
}

namespace {

// One frame through the filter, driven as an editor drives it.
HRESULT RunOnce(INLECGFilter* fx, INLEFrame* foreground, INLEFrame* background, INLEFrame* dst,
                cv::Size size) {
  fx->SetForeground(foreground);
  fx->SetBackground(background);
  fx->SetTotalTime(1);
  fx->SetCurrentTime(0);
  CGFilterParam param = {};
  param.frameSize = {size.width, size.height};
  param.quality = 1;
  const HRESULT hr = fx->Prepare(param);
  return NLE_SUCCEEDED(hr) ? fx->Running(dst) : hr;
}

// What a failed Running means on the OpenCL path, where the codes are few and broad.
std::string OpenCLRunFailure(HRESULT hr) {
  switch (static_cast<uint32_t>(hr)) {
    case 0x80000001u:
      return ": the filter has no way to run on this input";
    case 0x80000003u:
      return ": the filter refused the device frames";
    case 0x80000008u:
      return ": the kernel did not run, or its parameters or tables could not be placed on the "
             "device";
    default:
      return "";
  }
}

}  // namespace

Status RunFilter(const PluginLibrary& plugin, const ResolvedFilter& filter,
                 const std::vector<ParamSetting>& settings, const cv::Mat& foreground,
                 const cv::Mat& background, cv::Mat* out) {
  FilterChain chain;
  if (Status s = FilterChain::Create(plugin, {{filter, settings}}, &chain); !s.ok()) return s;
  return chain.Run(foreground, out, &background);
}

Status OpenOpenCLTarget(const PluginLibrary& plugin, int index, const std::string& kernelDir,
                        NLEComPtr<INLECGDevice>& device, OpenCLTarget* target) {
  if (Status s = OpenDevice(index, device, &target->deviceName); !s.ok()) return s;
  target->device = device.get();
  target->kernelDir = kernelDir.empty() ? plugin.KernelDir() : kernelDir;
  struct stat info = {};
  if (stat(target->kernelDir.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) {
    return Status::Error(
        "no kernel directory at " + target->kernelDir +
        (kernelDir.empty() ? " (beside the plug-in; --kernels DIR names another)" : ""));
  }
  return Status::Ok();
}

Status OpenCLFilterRun::Create(const PluginLibrary& plugin, const ResolvedFilter& filter,
                               const std::vector<ParamSetting>& settings,
                               const OpenCLTarget& target, OpenCLFilterRun* run) {
  run->name_ = filter.name;
  run->target_ = target;
  return CreateFilter(plugin, filter, settings, &target, run->fx_);
}

Status OpenCLFilterRun::Run(const cv::Mat& input, cv::Mat* out) {
  const OpenCLTarget& target = target_;
  // The shipped kernels take packed BGRA buffers; image-kind frames are refused. The frames stay
  // on the device from one picture to the next of the same size.
  if (input.size() != size_ || !src_ || !dst_) {
    src_.Reset();
    dst_.Reset();
    HRESULT hr = NLECommon::CreateOpenCLFrame(target.device, input.cols, input.rows,
                                              OPENCL::kMemoryFrameBuffer, &src_);
    if (NLE_SUCCEEDED(hr)) {
      hr = NLECommon::CreateOpenCLFrame(target.device, input.cols, input.rows,
                                        OPENCL::kMemoryFrameBuffer, &dst_);
    }
    if (NLE_FAILED(hr) || !src_ || !dst_) {
      src_.Reset();
      dst_.Reset();
      return Status::Error("cannot create a " + std::to_string(input.cols) + "x" +
                               std::to_string(input.rows) + " frame on " + target.deviceName +
                               ": " + DescribeResult(hr),
                           hr);
    }
    size_ = input.size();
  }
  HRESULT hr = src_->Upload(input.ptr<uint8_t>(), static_cast<int32_t>(input.step[0]));
  if (NLE_FAILED(hr)) {
    return Status::Error(
        "cannot upload the input to " + target.deviceName + ": " + DescribeResult(hr), hr);
  }
  hr = RunOnce(fx_.get(), src_.get(), nullptr, dst_.get(), input.size());
  // The filter borrows the frames only for the run.
  fx_->SetForeground(nullptr);
  if (NLE_FAILED(hr)) {
    return Status::Error(name_ + " failed on " + target.deviceName + ": " + DescribeResult(hr) +
                             OpenCLRunFailure(hr),
                         hr);
  }
  cv::Mat result(input.size(), CV_8UC4);
  hr = dst_->Download(result.ptr<uint8_t>(), static_cast<int32_t>(result.step[0]));
  if (NLE_FAILED(hr)) {
    return Status::Error(
        "cannot download the result from " + target.deviceName + ": " + DescribeResult(hr), hr);
  }
  *out = result;
  return Status::Ok();
}

Status RunFilterOpenCL(const PluginLibrary& plugin, const ResolvedFilter& filter,
                       const std::vector<ParamSetting>& settings, const OpenCLTarget& target,
                       const cv::Mat& input, cv::Mat* out) {
  OpenCLFilterRun run;
  if (Status s = OpenCLFilterRun::Create(plugin, filter, settings, target, &run); !s.ok()) {
    return s;
  }
  return run.Run(input, out);
}

}  // namespace tfxtool
