// The loaded plug-in: its dlopen handle, its three entry points and lookup of the other
// functions it exports. The tool never links the plug-in, so what it calls is exactly what a
// host that loads libTessaroFx.so at run time can reach.
#pragma once

#include <string>

#include "Status.h"
#include "tessarofx/TessaroFx.h"

namespace tfxtool {

class PluginLibrary {
 public:
  PluginLibrary() = default;
  PluginLibrary(const PluginLibrary&) = delete;
  PluginLibrary& operator=(const PluginLibrary&) = delete;
  // The library stays loaded until the process ends: filters and descriptors handed out may
  // outlive this object, and unloading would run the plug-in's static destructors under them.
  ~PluginLibrary() = default;

  // Loads the plug-in. An explicit path (from --plugin) is used as given; without one the
  // TESSAROFX_PLUGIN environment variable, then the build and install layouts next to the
  // executable, then the dynamic loader's own search path are tried.
  Status Load(const std::string& explicitPath);

  const std::string& path() const { return path_; }
  // Where the plug-in's OpenCL programs sit: the kernels directory beside the library file that
  // was actually loaded (the loader's answer, so a bare name found on the search path works too).
  std::string KernelDir() const;
  // Address of an exported symbol, or null (with the loader's reason in *why when given).
  void* Symbol(const char* name, std::string* why = nullptr) const;
  // The exported function `name` as a pointer of type Fn; the error names the missing symbol.
  template <class Fn>
  Status Resolve(const char* name, Fn* fn) const {
    std::string why;
    void* p = Symbol(name, &why);
    if (!p) return Status::Error(std::string("the plug-in does not export ") + name + ": " + why);
    *fn = reinterpret_cast<Fn>(p);
    return Status::Ok();
  }

  // Entry points, valid after a successful Load. FilterCount runs the plug-in's one-time merge
  // of its registries and must come before Properties and Create.
  uint32_t FilterCount() const { return getCount_(); }
  HRESULT Properties(int index, INLEProperties** props) const {
    return getProperties_(index, props);
  }
  // The filter's CPU class without a device, else its OpenCL class on `device`, built from the
  // programs in `kernelDir`.
  HRESULT Create(const wchar_t* guid, INLEProperties* props, INLECGFilter** filter,
                 INLECGDevice* device = nullptr, const char* kernelDir = nullptr) const;

 private:
  Status Open(const std::string& path);

  void* handle_ = nullptr;
  std::string path_;
  PFN_GetFilterCount getCount_ = nullptr;
  PFN_GetFilterProperties getProperties_ = nullptr;
  PFN_CreateFilterFromGUID create_ = nullptr;
};

}  // namespace tfxtool
