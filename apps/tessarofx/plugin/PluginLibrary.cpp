#include "plugin/PluginLibrary.h"

#include <dlfcn.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <vector>

namespace tfxtool {
namespace {

#ifndef TFX_PLUGIN_FILE
#define TFX_PLUGIN_FILE "libTessaroFx.so"
#endif

// Directory of the running executable, "" when the kernel will not say.
std::string ExecutableDir() {
  std::vector<char> buf(4096);
  const ssize_t n = readlink("/proc/self/exe", buf.data(), buf.size() - 1);
  if (n <= 0) return {};
  std::string path(buf.data(), static_cast<size_t>(n));
  const size_t slash = path.rfind('/');
  return slash == std::string::npos ? std::string() : path.substr(0, slash);
}

std::string LoaderError() {
  const char* e = dlerror();
  return e ? e : "unknown loader error";
}

}  // namespace

Status PluginLibrary::Open(const std::string& path) {
  dlerror();
  // RTLD_LOCAL: the plug-in's symbols are reached through dlsym only, as in any host.
  void* h = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!h) return Status::Error("cannot load the plug-in: " + LoaderError());
  const char* missing = nullptr;
  auto count = reinterpret_cast<PFN_GetFilterCount>(dlsym(h, "GetFilterCount"));
  auto props = reinterpret_cast<PFN_GetFilterProperties>(dlsym(h, "GetFilterProperties"));
  auto create = reinterpret_cast<PFN_CreateFilterFromGUID>(dlsym(h, "CreateFilterFromGUID"));
  if (!count) missing = "GetFilterCount";
  if (!props) missing = "GetFilterProperties";
  if (!create) missing = "CreateFilterFromGUID";
  if (missing) {
    dlclose(h);
    return Status::Error(path + " is not a TessaroFx plug-in: it does not export " + missing);
  }
  handle_ = h;
  path_ = path;
  getCount_ = count;
  getProperties_ = props;
  create_ = create;
  return Status::Ok();
}

Status PluginLibrary::Load(const std::string& explicitPath) {
  if (!explicitPath.empty()) return Open(explicitPath);
  if (const char* env = std::getenv("TESSAROFX_PLUGIN"); env && *env) return Open(env);
  const std::string dir = ExecutableDir();
  if (!dir.empty()) {
    // Build tree: build/<preset>/bin/tessarofx beside build/<preset>/lib/; a flat install or a
    // copied tool keeps the plug-in in its own directory.
    for (const std::string& candidate :
         {dir + "/../lib/" TFX_PLUGIN_FILE, dir + "/" TFX_PLUGIN_FILE}) {
      if (access(candidate.c_str(), F_OK) == 0) return Open(candidate);
    }
  }
  // Installed: the loader's search path (rpath, LD_LIBRARY_PATH, system directories).
  return Open(TFX_PLUGIN_FILE);
}

void* PluginLibrary::Symbol(const char* name, std::string* why) const {
  if (!handle_) {
    if (why) *why = "the plug-in is not loaded";
    return nullptr;
  }
  dlerror();
  void* p = dlsym(handle_, name);
  if (!p && why) *why = LoaderError();
  return p;
}

std::string PluginLibrary::KernelDir() const {
  std::string file = path_;
  Dl_info info = {};
  if (getCount_ && dladdr(reinterpret_cast<void*>(getCount_), &info) != 0 && info.dli_fname) {
    file = info.dli_fname;
  }
  const size_t slash = file.rfind('/');
  const std::string dir = slash == std::string::npos ? "." : file.substr(0, slash);
  return dir + "/tessarofx/kernels";
}

HRESULT PluginLibrary::Create(const wchar_t* guid, INLEProperties* props, INLECGFilter** filter,
                              INLECGDevice* device, const char* kernelDir) const {
  void* out = nullptr;
  const HRESULT hr = create_(device, guid, props, kernelDir, &out);
  *filter = NLE_SUCCEEDED(hr) ? static_cast<INLECGFilter*>(out) : nullptr;
  return hr;
}

}  // namespace tfxtool
