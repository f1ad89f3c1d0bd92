// The smallest TessaroFx host: loads the plug-in, lists its filters, and brightens one row of
// pixels with ColorAdjust's exposure through the same interfaces a video editor uses.
#include <dlfcn.h>
#include <tessarofx/HostKit.h>
#include <tessarofx/TessaroFx.h>

#include <cstdio>

// Where the package put the plug-in; the build passes it in (CMake or pkg-config).
#ifndef TESSAROFX_PLUGIN
#define TESSAROFX_PLUGIN "libTessaroFx.so.0"
#endif

static int Fail(const char* what, HRESULT hr) {
  std::fprintf(stderr, "%s: %s\n", what, NLEResultText(hr));
  return 1;
}

int main(int argc, char** argv) {
  const char* path = argc > 1 ? argv[1] : TESSAROFX_PLUGIN;
  void* plugin = dlopen(path, RTLD_NOW | RTLD_LOCAL);
  if (!plugin) {
    std::fprintf(stderr, "%s\n", dlerror());
    return 1;
  }
  auto getCount = reinterpret_cast<PFN_GetFilterCount>(dlsym(plugin, "GetFilterCount"));
  auto getProperties =
      reinterpret_cast<PFN_GetFilterProperties>(dlsym(plugin, "GetFilterProperties"));
  auto create = reinterpret_cast<PFN_CreateFilterFromGUID>(dlsym(plugin, "CreateFilterFromGUID"));
  if (!getCount || !getProperties || !create) {
    std::fprintf(stderr, "%s is not a TessaroFx plug-in\n", path);
    return 1;
  }

  // GetFilterCount comes first: it builds the list the descriptors are read from.
  const uint32_t count = getCount();
  for (uint32_t i = 0; i < count; ++i) {
    NLEComPtr<INLEProperties> descriptor;
    if (NLE_FAILED(getProperties(static_cast<int>(i), &descriptor))) continue;
    wchar_t guid[64] = {}, name[64] = {};
    descriptor->GetString(NLEKey::Filter::kFilterID, guid, 64, nullptr);
    descriptor->GetString(NLEKey::Filter::kFilterFriendName, name, 64, nullptr);
    std::printf("%ls  %ls\n", guid, name);
  }

  // Parameters travel as property bags: one per parameter, named and holding its value, listed
  // in the bag handed over at creation. Parameters left out keep their defaults.
  namespace Key = NLEKey::Filter::Property;
  NLEComPtr<INLEProperties> settings, exposure;
  HRESULT hr = NLECommon::CreateProperties(&settings);
  if (NLE_SUCCEEDED(hr)) hr = NLECommon::CreateProperties(&exposure);
  if (NLE_FAILED(hr)) return Fail("property bags", hr);
  exposure->SetString(Key::kVariantName, L"u_exposure");
  exposure->SetString(Key::kFriendName, L"u_exposure");
  exposure->SetInt(Key::kType, NLEFilterPropertyType_Double);
  exposure->SetValue(Key::kValue_Current, CNLEValue(50.0));
  settings->SetInterface(Key::kParamsArray[0], exposure);
  settings->SetInt(Key::kCount, 1);

  // No device: the CPU class. The filter copies the settings; ours stay ours.
  void* created = nullptr;
  hr = create(nullptr, L"18C6E879-4138-42D0-B0B9-6B4401AA97E6", settings, nullptr, &created);
  if (NLE_FAILED(hr)) return Fail("ColorAdjust", hr);
  NLEComPtr<INLECGFilter> filter;
  filter.Attach(static_cast<INLECGFilter*>(created));

  // Four BGRA pixels of the host's own memory, wrapped as frames; the filter borrows them.
  uint8_t in[16] = {40, 40, 40, 255, 100, 100, 100, 255, 0, 128, 255, 255, 200, 200, 200, 255};
  uint8_t out[16] = {};
  NLEComPtr<INLEMemoryFrame> source, target;
  hr = NLECommon::CreateMemoryFrame(0, 0, 0, &source);
  if (NLE_SUCCEEDED(hr)) hr = source->Wrap(in, 4, 1, 16, kNLEFrameTopDown);
  if (NLE_SUCCEEDED(hr)) hr = NLECommon::CreateMemoryFrame(0, 0, 0, &target);
  if (NLE_SUCCEEDED(hr)) hr = target->Wrap(out, 4, 1, 16, kNLEFrameTopDown);
  if (NLE_FAILED(hr)) return Fail("frames", hr);

  filter->SetForeground(source);
  filter->SetTotalTime(1);
  filter->SetCurrentTime(0);
  CGFilterParam param = {};
  param.frameSize = {4, 1};
  param.quality = 1;
  hr = filter->Prepare(param);
  if (NLE_SUCCEEDED(hr)) hr = filter->Running(target);
  filter.Reset();  // before the frames it borrowed go
  if (NLE_FAILED(hr)) return Fail("Running", hr);

  for (int i = 0; i < 16; i += 4) {
    std::printf("BGRA %3d %3d %3d %3d -> %3d %3d %3d %3d\n", in[i], in[i + 1], in[i + 2], in[i + 3],
                out[i], out[i + 1], out[i + 2], out[i + 3]);
  }
  return 0;
}
