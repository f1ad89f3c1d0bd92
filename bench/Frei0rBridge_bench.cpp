// What the frei0r path costs over Running: the same filter with the same settings on the same
// frames, once through the plug-in interface as a host calls it and once through its frei0r
// module as FFmpeg, melt or GStreamer call it. The summary prints each frei0r figure as a ratio
// to its Running twin.
extern "C" {
#include <frei0r.h>
}
#include <dlfcn.h>

#include "BenchCommon.h"

namespace {

struct Case {
  const char* label;
  const char* slug;
  const wchar_t* guid;
  Params running;              // in the filter's own units
  std::vector<double> frei0r;  // the same, as the module's 0..1 values in parameter order
};

const Case kCases[] = {
    {"coloradjust",
     "coloradjust",
     L"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
     {{L"u_exposure", 20},
      {L"u_brightness", 15},
      {L"u_contrast", 30},
      {L"u_vib", 40},
      {L"u_sat", 20}},
     {0.6, 0.575, 0.65, 0.7, 0.6}},
    {"light",
     "light",
     L"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
     {{L"u_highLight", 20}, {L"u_shadow", 30}},
     {0.6, 0.65}},
};

void BM_Running(benchmark::State& state, BenchSize size, const Case* c) {
  BM_EffectRunning(state, size, c->guid, c->running);
}

void BM_Frei0r(benchmark::State& state, BenchSize size, const Case* c) {
  const std::string path = std::string(TFX_FREI0R_DIR) + "/tessarofx-" + c->slug + ".so";
  void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!module) {
    state.SkipWithError(dlerror());
    return;
  }
  auto init = reinterpret_cast<int (*)()>(dlsym(module, "f0r_init"));
  auto construct =
      reinterpret_cast<f0r_instance_t (*)(unsigned, unsigned)>(dlsym(module, "f0r_construct"));
  auto destruct = reinterpret_cast<void (*)(f0r_instance_t)>(dlsym(module, "f0r_destruct"));
  auto set = reinterpret_cast<void (*)(f0r_instance_t, f0r_param_t, int)>(
      dlsym(module, "f0r_set_param_value"));
  auto update = reinterpret_cast<void (*)(f0r_instance_t, double, const uint32_t*, uint32_t*)>(
      dlsym(module, "f0r_update"));
  init();
  f0r_instance_t inst =
      construct(static_cast<unsigned>(size.width), static_cast<unsigned>(size.height));
  std::vector<double> values = c->frei0r;
  const std::vector<uint8_t> in = RandomBgra(size.width, size.height);
  std::vector<uint8_t> out(in.size());
  int frame = 0;
  for (auto _ : state) {
    // Hosts set every parameter before every frame, as MLT does.
    for (size_t i = 0; i < values.size(); ++i) set(inst, &values[i], static_cast<int>(i));
    update(inst, frame++ / 25.0, reinterpret_cast<const uint32_t*>(in.data()),
           reinterpret_cast<uint32_t*>(out.data()));
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * size.width * size.height);
  destruct(inst);
  dlclose(module);
}

const struct Registrar {
  Registrar() {
    for (const BenchSize& size : kBenchSizes) {
      RegisterMemcpy(size);
      for (const Case& c : kCases) {
        const std::string tail = std::string("/") + size.label + "/" + c.label;
        RegisterTimed("BM_Running" + tail, BM_Running, size, &c);
        RegisterTimed("BM_Frei0r" + tail, BM_Frei0r, size, &c);
      }
    }
  }
} registrar;

}  // namespace
