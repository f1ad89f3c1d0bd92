#include "Frei0rBridge.h"

extern "C" {
#include <frei0r.h>
}

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <memory>
#include <mutex>
#include <new>
#include <set>
#include <utility>

#include "Utf8.h"
#include "tessarofx/CubeLut.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

#define TFX_F0R_EXPORT extern "C" __attribute__((visibility("default")))

namespace tfx::frei0r {

extern const char kModuleSlug[];

namespace {

using catalog::Param;
using catalog::ParamRole;
using catalog::ParamType;
namespace PKey = NLEKey::Filter::Property;

// ---------------------------------------------------------------------------------------------
// The frei0r face of each filter.

std::string Percent(double v) {
  char text[32];
  std::snprintf(text, sizeof text, "%g", v);
  return text;
}

BridgeInfo Describe(const catalog::Filter& f) {
  BridgeInfo info;
  info.filter = &f;
  // The one name every host shows: FFmpeg and MLT take the file name, GStreamer this one.
  info.pluginName = std::string("tessarofx-") + f.slug;
  info.explanation = std::string("TessaroFx ") + f.name + ": " + f.summary;
  for (size_t i = 0; i < f.params.size(); ++i) {
    const Param& p = f.params[i];
    switch (p.role) {
      case ParamRole::kKeyRed:
        // The key colour's three channels follow one another in the catalogue.
        info.params.push_back({"keyColor", Kind::kColor, "key colour (the screen to remove)", &p,
                               &f.params[i + 1], &f.params[i + 2]});
        break;
      case ParamRole::kKeyGreen:
      case ParamRole::kKeyBlue:
        break;
      case ParamRole::kFilePath:
        info.params.push_back({p.name, Kind::kString, p.meaning, &p});
        break;
      case ParamRole::kChoice:
        if (p.max - p.min == 1) {
          info.params.push_back({p.name, Kind::kBool, std::string(p.meaning) + " (a switch)", &p});
          break;
        }
        [[fallthrough]];
      case ParamRole::kAmount:
        info.params.push_back({p.name, Kind::kDouble,
                               std::string(p.meaning) + " (0..1 spans " + Percent(p.min) + ".." +
                                   Percent(p.max) + "; default " +
                                   Percent(ToUnit(p, p.defaultValue)) + ")",
                               &p});
        break;
    }
  }
  return info;
}

const std::vector<BridgeInfo>& AllInfos() {
  static const std::vector<BridgeInfo> infos = [] {
    std::vector<BridgeInfo> all;
    for (const catalog::Filter& f : catalog::Filters()) all.push_back(Describe(f));
    return all;
  }();
  return infos;
}

const BridgeInfo& Module() {
  static const BridgeInfo* info = InfoForSlug(kModuleSlug);
  return *info;
}

// ---------------------------------------------------------------------------------------------
// Messages: each said once per process, however many instances and frames meet the same fault.

void SayOnce(const std::string& message) {
  static std::mutex mutex;
  static std::set<std::string> said;
  {
    std::lock_guard<std::mutex> lock(mutex);
    if (!said.insert(message).second) return;
  }
  std::fprintf(stderr, "tessarofx-%s: %s\n", kModuleSlug, message.c_str());
}

// ---------------------------------------------------------------------------------------------
// The LUT file check, with the plug-in's own reader on a table of the bridge's own.

class ProbeLut final : public CubeLut {
 public:
  ProbeLut() : CubeLut(Unlisted{}) {}
};

std::wstring TranslatePath(const std::wstring& path) {
  NLEComPtr<INLEEnviroment> env;
  if (NLE_FAILED(NLECommon::GetInterface(CLSID_NLEEnviroment, nullptr, 0, IID_INLEEnviroment,
                                         reinterpret_cast<void**>(&env))) ||
      !env) {
    return path;
  }
  uint32_t needed = 0;
  std::vector<wchar_t> out(path.size() + 256);
  if (env->TranslatePath(path.c_str(), out.data(), static_cast<uint32_t>(out.size()), &needed) ==
      NLE_E_OUTOFMEMORY) {
    out.resize(needed + 1);
    if (NLE_FAILED(env->TranslatePath(path.c_str(), out.data(), static_cast<uint32_t>(out.size()),
                                      nullptr))) {
      return path;
    }
  }
  return out.data();
}

// Tells the user, once, why the frames will pass through unchanged.
void CheckLutFile(const std::string& path) {
  if (path.empty()) {
    SayOnce("lut3dPath is not set; frames pass through unchanged");
    return;
  }
  const std::wstring wide = host::DecodeUtf8(path.data(), path.size());
  std::string real;
  const std::wstring translated = TranslatePath(wide);
  host::AppendUtf8(real, translated.data(), translated.size());
  std::ifstream in(real, std::ios::binary);
  if (!in) {
    SayOnce("cannot read the LUT file '" + path + "' (" + std::strerror(errno) +
            "); frames pass through unchanged");
    return;
  }
  in.close();
  auto probe = std::make_unique<ProbeLut>();
  if (!probe->loadFile(translated.c_str())) {
    SayOnce("'" + path + "' is not a .cube or .3dl LUT this filter reads (reader status " +
            std::to_string(probe->getStatus()) + "); frames pass through unchanged");
  }
}

// ---------------------------------------------------------------------------------------------
// An instance: the parameter values the host set, and the filter objects that run its frames.

class Instance {
 public:
  Instance(unsigned width, unsigned height) : width_(width), height_(height) {
    const auto& params = Module().filter->params;
    for (const Param& p : params) values_.push_back(p.defaultValue);
  }

  void Set(int index, const void* value);
  void Get(int index, void* value);
  void Update(const uint32_t* in1, const uint32_t* in2, uint32_t* out);

 private:
  // One filter object with its frames. A filter object runs one frame at a time, so an instance
  // that a host drives from several threads at once (MLT's sliced mode) holds one per thread.
  struct Worker {
    NLEComPtr<INLECGFilter> filter;
    NLEComPtr<INLEMemoryFrame> first, second, out;
    std::vector<uint32_t> scratch;  // the input, when the host filters in place
    uint64_t version = 0;           // of the values last given to the filter
  };

  std::unique_ptr<Worker> Acquire();
  void Release(std::unique_ptr<Worker> worker);
  std::unique_ptr<Worker> NewWorker();
  void Apply(Worker& worker);
  size_t IndexOf(const Param& p) const {
    return static_cast<size_t>(&p - Module().filter->params.data);
  }
  void SetNumber(const Param& p, double value);

  const unsigned width_;
  const unsigned height_;
  std::mutex mutex_;  // guards everything below
  std::vector<double> values_;
  std::string path_;
  uint64_t version_ = 1;
  std::vector<std::unique_ptr<Worker>> idle_;
};

void Instance::SetNumber(const Param& p, double value) {
  std::lock_guard<std::mutex> lock(mutex_);
  double& slot = values_[IndexOf(p)];
  if (slot == value) return;
  slot = value;
  ++version_;
}

// Hosts check nothing: FFmpeg and MLT pass any number the user typed, NaN included.
void Instance::Set(int index, const void* value) {
  const auto& params = Module().params;
  if (!value || index < 0 || static_cast<size_t>(index) >= params.size()) return;
  const BridgeParam& bp = params[static_cast<size_t>(index)];
  switch (bp.kind) {
    case Kind::kDouble:
    case Kind::kBool: {
      double unit = *static_cast<const double*>(value);
      if (std::isnan(unit)) {
        SayOnce(bp.name + " = nan is not a number; the value is ignored");
        return;
      }
      if (bp.kind == Kind::kBool) {
        unit = unit >= 0.5 ? 1.0 : 0.0;  // frei0r's reading of a bool
      } else if (unit < 0 || unit > 1) {
        SayOnce(bp.name + " = " + Percent(unit) + " is outside 0..1; it is clamped");
        unit = std::clamp(unit, 0.0, 1.0);
      }
      SetNumber(*bp.param, FromUnit(*bp.param, unit));
      return;
    }
    case Kind::kColor: {
      const auto* c = static_cast<const f0r_param_color_t*>(value);
      const float channels[3] = {c->r, c->g, c->b};
      const Param* targets[3] = {bp.param, bp.green, bp.blue};
      for (int i = 0; i < 3; ++i) {
        if (std::isnan(channels[i])) {
          SayOnce(bp.name + ": a channel is not a number; it is ignored");
          continue;
        }
        SetNumber(*targets[i], FromUnit(*targets[i], std::clamp(channels[i], 0.0f, 1.0f)));
      }
      return;
    }
    case Kind::kString: {
      // The frei0r convention is a pointer to the text pointer. GStreamer, when a string
      // property changes while it plays, passes the text pointer itself; a user-space pointer
      // has its two top bytes zero, and text of seven or more characters never does.
      const char* text = *static_cast<char* const*>(value);
      uint64_t bits = 0;
      std::memcpy(&bits, value, sizeof bits);
      if ((bits >> 48) != 0) text = static_cast<const char*>(value);
      std::string path = text ? text : "";
      if (path.size() > 4096) {
        SayOnce(bp.name + " is longer than 4096 bytes; it is ignored");
        return;
      }
      {
        std::lock_guard<std::mutex> lock(mutex_);
        if (path == path_) return;
        path_ = path;
        ++version_;
      }
      CheckLutFile(path);
      return;
    }
  }
}

void Instance::Get(int index, void* value) {
  const auto& params = Module().params;
  if (!value || index < 0 || static_cast<size_t>(index) >= params.size()) return;
  const BridgeParam& bp = params[static_cast<size_t>(index)];
  std::lock_guard<std::mutex> lock(mutex_);
  switch (bp.kind) {
    case Kind::kDouble:
    case Kind::kBool:
      *static_cast<double*>(value) = ToUnit(*bp.param, values_[IndexOf(*bp.param)]);
      return;
    case Kind::kColor: {
      auto* c = static_cast<f0r_param_color_t*>(value);
      c->r = static_cast<float>(ToUnit(*bp.param, values_[IndexOf(*bp.param)]));
      c->g = static_cast<float>(ToUnit(*bp.green, values_[IndexOf(*bp.green)]));
      c->b = static_cast<float>(ToUnit(*bp.blue, values_[IndexOf(*bp.blue)]));
      return;
    }
    case Kind::kString:
      // The text stays the instance's; it lives until the next change or the instance's end.
      *static_cast<const char**>(value) = path_.c_str();
      return;
  }
}

// A settings bag holding every catalogued parameter at its default, as a host's user interface
// would fill one; the values are set after creation like any later change.
NLEComPtr<INLEProperties> DefaultSettings() {
  NLEComPtr<INLEProperties> props;
  if (NLE_FAILED(NLECommon::CreateProperties(&props)) || !props) return {};
  const auto& params = Module().filter->params;
  for (size_t i = 0; i < params.size() && i < static_cast<size_t>(PKey::kMaxParams); ++i) {
    const Param& p = params[i];
    NLEComPtr<INLEProperties> bag;
    if (NLE_FAILED(NLECommon::CreateProperties(&bag)) || !bag) return {};
    bag->SetString(PKey::kVariantName, p.wideName);
    bag->SetString(PKey::kFriendName, p.wideName);
    bag->SetInt(PKey::kDisplayType, 0);
    bag->SetInt(PKey::kType, static_cast<int32_t>(p.type));
    if (p.type == ParamType::kString) {
      bag->SetString(PKey::kValue_Default, L"");
      bag->SetString(PKey::kValue_Current, L"");
    } else if (p.type == ParamType::kInt) {
      bag->SetValue(PKey::kValue_Min, CNLEValue(static_cast<int>(p.min)));
      bag->SetValue(PKey::kValue_Max, CNLEValue(static_cast<int>(p.max)));
      bag->SetValue(PKey::kValue_Default, CNLEValue(static_cast<int>(p.defaultValue)));
      bag->SetValue(PKey::kValue_Current, CNLEValue(static_cast<int>(p.defaultValue)));
    } else {
      bag->SetValue(PKey::kValue_Min, CNLEValue(p.min));
      bag->SetValue(PKey::kValue_Max, CNLEValue(p.max));
      bag->SetValue(PKey::kValue_Default, CNLEValue(p.defaultValue));
      bag->SetValue(PKey::kValue_Current, CNLEValue(p.defaultValue));
    }
    props->SetInterface(PKey::kParamsArray[i], bag.get());
  }
  props->SetInt(PKey::kCount, static_cast<int32_t>(params.size()));
  return props;
}

std::unique_ptr<Instance::Worker> Instance::NewWorker() {
  auto worker = std::make_unique<Worker>();
  NLEComPtr<INLEProperties> settings = DefaultSettings();
  void* filter = nullptr;
  const HRESULT hr =
      CreateFilterFromGUID(nullptr, Module().filter->wideGuid, settings.get(), nullptr, &filter);
  if (NLE_FAILED(hr) || !filter) {
    SayOnce("cannot create the filter (result " + std::to_string(hr) +
            "); frames pass through unchanged");
    return nullptr;
  }
  worker->filter.Attach(static_cast<INLECGFilter*>(filter));
  if (NLE_FAILED(NLECommon::CreateMemoryFrame(0, 0, 0, &worker->first)) ||
      NLE_FAILED(NLECommon::CreateMemoryFrame(0, 0, 0, &worker->second)) ||
      NLE_FAILED(NLECommon::CreateMemoryFrame(0, 0, 0, &worker->out))) {
    SayOnce("cannot create frames; frames pass through unchanged");
    return nullptr;
  }
  return worker;
}

std::unique_ptr<Instance::Worker> Instance::Acquire() {
  {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!idle_.empty()) {
      std::unique_ptr<Worker> worker = std::move(idle_.back());
      idle_.pop_back();
      return worker;
    }
  }
  return NewWorker();
}

void Instance::Release(std::unique_ptr<Worker> worker) {
  std::lock_guard<std::mutex> lock(mutex_);
  idle_.push_back(std::move(worker));
}

void Instance::Apply(Worker& worker) {
  std::vector<double> values;
  std::string path;
  uint64_t version;
  {
    std::lock_guard<std::mutex> lock(mutex_);
    if (worker.version == version_) return;
    values = values_;
    path = path_;
    version = version_;
  }
  const auto& params = Module().filter->params;
  for (size_t i = 0; i < params.size(); ++i) {
    const Param& p = params[i];
    NLEComPtr<INLEProperties> bag;
    if (NLE_FAILED(worker.filter->GetParamPropertyFromName(p.wideName, &bag)) || !bag) continue;
    if (p.type == ParamType::kString) {
      bag->SetString(PKey::kValue_Current, host::DecodeUtf8(path.data(), path.size()).c_str());
    } else if (p.type == ParamType::kInt) {
      bag->SetValue(PKey::kValue_Current, CNLEValue(static_cast<int>(values[i])));
    } else {
      bag->SetValue(PKey::kValue_Current, CNLEValue(values[i]));
    }
  }
  worker.filter->ParamValueChanged();
  worker.version = version;
}

void Instance::Update(const uint32_t* in1, const uint32_t* in2, uint32_t* out) {
  if (!out || !in1 || width_ == 0 || height_ == 0) return;
  const size_t pixels = static_cast<size_t>(width_) * height_;
  const bool twoInputs = Module().filter->inputs == 2;
  // What a frame that cannot be filtered becomes: the picture the filter would have changed.
  const uint32_t* passthrough = twoInputs && in2 ? in2 : in1;

  std::unique_ptr<Worker> worker = Acquire();
  if (!worker) {
    if (passthrough != out) std::memcpy(out, passthrough, pixels * 4);
    return;
  }
  Apply(*worker);

  const int32_t w = static_cast<int32_t>(width_);
  const int32_t h = static_cast<int32_t>(height_);
  auto wrap = [&](INLEMemoryFrame* frame, const uint32_t* pixelsIn) {
    // Filters only read their input frames.
    return frame->Wrap(reinterpret_cast<uint8_t*>(const_cast<uint32_t*>(pixelsIn)), w, h, w * 4,
                       kNLEFrameTopDown);
  };
  // A filter reads its inputs after it has started writing its output, so an input that is also
  // the output is read from a copy.
  auto input = [&](const uint32_t* frame) -> const uint32_t* {
    if (frame != out) return frame;
    worker->scratch.assign(frame, frame + pixels);
    return worker->scratch.data();
  };
  HRESULT hr = wrap(worker->out.get(), out);
  if (twoInputs) {
    if (!in2) {
      SayOnce("needs two inputs (the key mask, then the colours); frames pass through unchanged");
      hr = NLE_E_INVALIDARG;
    } else {
      if (NLE_SUCCEEDED(hr)) hr = wrap(worker->first.get(), input(in1));
      if (NLE_SUCCEEDED(hr)) hr = wrap(worker->second.get(), input(in2));
      worker->filter->SetBackground(worker->first.get());
      worker->filter->SetForeground(worker->second.get());
    }
  } else {
    if (NLE_SUCCEEDED(hr)) hr = wrap(worker->first.get(), input(in1));
    worker->filter->SetForeground(worker->first.get());
  }
  if (NLE_SUCCEEDED(hr)) hr = worker->filter->Running(worker->out.get());
  if (NLE_FAILED(hr)) {
    if (hr != NLE_E_INVALIDARG || !twoInputs || in2) {
      // The LUT filter without a readable file is the common case; CheckLutFile said why.
      if (Module().filter != &catalog::kLut) {
        SayOnce("the filter failed (result " + std::to_string(hr) +
                "); frames pass through unchanged");
      }
    }
    if (passthrough != out) std::memcpy(out, passthrough, pixels * 4);
  }
  worker->filter->SetForeground(nullptr);
  worker->filter->SetBackground(nullptr);
  Release(std::move(worker));
}

}  // namespace

// ---------------------------------------------------------------------------------------------

const BridgeInfo* InfoForSlug(const char* slug) {
  for (const BridgeInfo& info : AllInfos()) {
    if (std::strcmp(info.filter->slug, slug) == 0) return &info;
  }
  return nullptr;
}

double FromUnit(const catalog::Param& p, double unit) {
  const double v = p.min + unit * (p.max - p.min);
  return p.type == ParamType::kInt ? std::round(v) : v;
}

double ToUnit(const catalog::Param& p, double value) {
  return p.max > p.min ? (value - p.min) / (p.max - p.min) : 0.0;
}

}  // namespace tfx::frei0r

// ---------------------------------------------------------------------------------------------
// The frei0r entry points.

using tfx::frei0r::Instance;

TFX_F0R_EXPORT int f0r_init() {
  if (!tfx::frei0r::InfoForSlug(tfx::frei0r::kModuleSlug)) return 0;
  // Filter creation is logged at the info level; inside an editor that is noise on its console
  // unless the user asked for it.
  if (!std::getenv("TESSAROFX_LOG_LEVEL")) {
    if (INLELogger* logger = NLEGetDefaultLogger()) logger->SetLevel(kNLELogWarning);
  }
  return GetFilterCount() > 0 ? 1 : 0;
}

TFX_F0R_EXPORT void f0r_deinit() {}

TFX_F0R_EXPORT void f0r_get_plugin_info(f0r_plugin_info_t* info) {
  const tfx::frei0r::BridgeInfo& m = tfx::frei0r::Module();
  info->name = m.pluginName.c_str();
  info->author = "TessaroFx";
  info->plugin_type = m.filter->inputs == 2 ? F0R_PLUGIN_TYPE_MIXER2 : F0R_PLUGIN_TYPE_FILTER;
  info->color_model = F0R_COLOR_MODEL_BGRA8888;
  info->frei0r_version = FREI0R_MAJOR_VERSION;
  info->major_version = TFX_VERSION_MAJOR;
  info->minor_version = TFX_VERSION_MINOR;
  info->num_params = static_cast<int>(m.params.size());
  info->explanation = m.explanation.c_str();
}

TFX_F0R_EXPORT void f0r_get_param_info(f0r_param_info_t* info, int index) {
  const auto& params = tfx::frei0r::Module().params;
  if (!info || index < 0 || static_cast<size_t>(index) >= params.size()) return;
  const tfx::frei0r::BridgeParam& p = params[static_cast<size_t>(index)];
  info->name = p.name.c_str();
  info->type = static_cast<int>(p.kind);
  info->explanation = p.explanation.c_str();
}

// Cheap: GStreamer constructs every plug-in it finds when it starts. Filter objects are created
// with the first frame.
TFX_F0R_EXPORT f0r_instance_t f0r_construct(unsigned int width, unsigned int height) {
  if (height != 0 && width > static_cast<unsigned>(INT32_MAX / 4) / height) {
    std::fprintf(stderr, "tessarofx-%s: a %ux%u frame is too large\n", tfx::frei0r::kModuleSlug,
                 width, height);
    return nullptr;
  }
  return new (std::nothrow) Instance(width, height);
}

TFX_F0R_EXPORT void f0r_destruct(f0r_instance_t instance) {
  delete static_cast<Instance*>(instance);
}

TFX_F0R_EXPORT void f0r_set_param_value(f0r_instance_t instance, f0r_param_t param, int index) {
  if (instance) static_cast<Instance*>(instance)->Set(index, param);
}

TFX_F0R_EXPORT void f0r_get_param_value(f0r_instance_t instance, f0r_param_t param, int index) {
  if (instance) static_cast<Instance*>(instance)->Get(index, param);
}

TFX_F0R_EXPORT void f0r_update(f0r_instance_t instance, double, const uint32_t* inframe,
                               uint32_t* outframe) {
  if (instance) static_cast<Instance*>(instance)->Update(inframe, nullptr, outframe);
}

TFX_F0R_EXPORT void f0r_update2(f0r_instance_t instance, double, const uint32_t* inframe1,
                                const uint32_t* inframe2, const uint32_t*, uint32_t* outframe) {
  if (instance) static_cast<Instance*>(instance)->Update(inframe1, inframe2, outframe);
}
