// The frei0r modules as a host loads them: one per catalogued filter, the frei0r face the hosts
// build their controls from, and the ways hosts really call them (in place, from several threads
// on one instance, a text parameter passed the wrong way).
extern "C" {
#include <frei0r.h>
}
#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cmath>
#include <string>
#include <thread>
#include <vector>

#include "catalog/FilterCatalog.h"

namespace {

struct Module {
  explicit Module(const std::string& slug) {
    handle = dlopen((std::string(TFX_FREI0R_DIR) + "/tessarofx-" + slug + ".so").c_str(),
                    RTLD_NOW | RTLD_LOCAL);
    if (!handle) return;
    init = reinterpret_cast<decltype(init)>(dlsym(handle, "f0r_init"));
    info = reinterpret_cast<decltype(info)>(dlsym(handle, "f0r_get_plugin_info"));
    paramInfo = reinterpret_cast<decltype(paramInfo)>(dlsym(handle, "f0r_get_param_info"));
    construct = reinterpret_cast<decltype(construct)>(dlsym(handle, "f0r_construct"));
    destruct = reinterpret_cast<decltype(destruct)>(dlsym(handle, "f0r_destruct"));
    set = reinterpret_cast<decltype(set)>(dlsym(handle, "f0r_set_param_value"));
    get = reinterpret_cast<decltype(get)>(dlsym(handle, "f0r_get_param_value"));
    update = reinterpret_cast<decltype(update)>(dlsym(handle, "f0r_update"));
  }
  ~Module() {
    if (handle) dlclose(handle);
  }
  void* handle = nullptr;
  int (*init)() = nullptr;
  void (*info)(f0r_plugin_info_t*) = nullptr;
  void (*paramInfo)(f0r_param_info_t*, int) = nullptr;
  f0r_instance_t (*construct)(unsigned, unsigned) = nullptr;
  void (*destruct)(f0r_instance_t) = nullptr;
  void (*set)(f0r_instance_t, f0r_param_t, int) = nullptr;
  void (*get)(f0r_instance_t, f0r_param_t, int) = nullptr;
  void (*update)(f0r_instance_t, double, const uint32_t*, uint32_t*) = nullptr;
};

// Every channel differs from the others and from pixel to pixel.
std::vector<uint32_t> Picture(unsigned width, unsigned height) {
  std::vector<uint32_t> pixels(static_cast<size_t>(width) * height);
  for (size_t i = 0; i < pixels.size(); ++i) {
    pixels[i] = static_cast<uint32_t>((i * 37 + 11) % 256) |
                static_cast<uint32_t>((i * 91 + 3) % 256) << 8 |
                static_cast<uint32_t>((i * 13 + 200) % 256) << 16 | 0xC0000000u;
  }
  return pixels;
}

TEST(Frei0rModules, OneModulePerCatalogedFilterWithItsOwnFace) {
  for (const tfx::catalog::Filter& filter : tfx::catalog::Filters()) {
    SCOPED_TRACE(filter.slug);
    Module m(filter.slug);
    ASSERT_NE(m.handle, nullptr) << dlerror();
    ASSERT_EQ(m.init(), 1);
    f0r_plugin_info_t info{};
    m.info(&info);
    EXPECT_EQ(std::string(info.name), std::string("tessarofx-") + filter.slug);
    EXPECT_EQ(info.color_model, F0R_COLOR_MODEL_BGRA8888);
    EXPECT_EQ(info.plugin_type,
              filter.inputs == 2 ? F0R_PLUGIN_TYPE_MIXER2 : F0R_PLUGIN_TYPE_FILTER);
    // The key colour's three channels become one frei0r colour.
    const int colours =
        filter.params.size() > 0 && filter.params[0].role == tfx::catalog::ParamRole::kKeyRed ? 2
                                                                                              : 0;
    ASSERT_EQ(info.num_params, static_cast<int>(filter.params.size()) - colours);
    for (int i = 0; i < info.num_params; ++i) {
      f0r_param_info_t p{};
      m.paramInfo(&p, i);
      EXPECT_TRUE(p.name && *p.name && p.explanation && *p.explanation);
    }
  }
}

TEST(Frei0rModules, ValuesMapOntoTheCatalogueRangeAndHostileOnesAreTamed) {
  Module m("vignette");
  ASSERT_EQ(m.init(), 1);
  f0r_instance_t inst = m.construct(16, 8);
  double v = -1;
  m.get(inst, &v, 1);  // size: default 100 of 0..100
  EXPECT_EQ(v, 1.0);
  m.get(inst, &v, 3);  // feather: default 50 of 0..100
  EXPECT_EQ(v, 0.5);
  double in = 7;  // clamped to 1
  m.set(inst, &in, 0);
  m.get(inst, &v, 0);
  EXPECT_EQ(v, 1.0);
  in = std::nan("");  // ignored
  m.set(inst, &in, 0);
  m.get(inst, &v, 0);
  EXPECT_EQ(v, 1.0);
  m.destruct(inst);
}

TEST(Frei0rModules, TextArrivesEitherAsPointerToPointerOrAsThePointerItself) {
  Module m("lut");
  ASSERT_EQ(m.init(), 1);
  f0r_instance_t inst = m.construct(4, 4);
  std::string first = "/nowhere/first.cube";
  char* text = first.data();
  m.set(inst, &text, 0);  // the frei0r convention
  char* got = nullptr;
  m.get(inst, &got, 0);
  EXPECT_STREQ(got, first.c_str());
  std::string second = "/nowhere/second.cube";
  m.set(inst, second.data(), 0);  // what GStreamer passes while it plays
  m.get(inst, &got, 0);
  EXPECT_STREQ(got, second.c_str());
  m.destruct(inst);
}

// MLT's sliced mode: one instance, built for a slice, updated from several threads at once;
// other hosts filter in place.
TEST(Frei0rModules, ConcurrentSlicesAndInPlaceGiveTheSerialBytes) {
  Module m("coloradjust");
  ASSERT_EQ(m.init(), 1);
  const unsigned width = 64, sliceHeight = 16, slices = 4;
  const std::vector<uint32_t> in = Picture(width, sliceHeight * slices);
  const size_t slice = static_cast<size_t>(width) * sliceHeight;
  f0r_instance_t inst = m.construct(width, sliceHeight);
  double exposure = 0.8, saturation = 0.3;
  m.set(inst, &exposure, 0);
  m.set(inst, &saturation, 4);

  std::vector<uint32_t> serial(in.size()), parallel(in.size()), inPlace(in);
  for (unsigned s = 0; s < slices; ++s) m.update(inst, 0, &in[s * slice], &serial[s * slice]);
  std::vector<std::thread> threads;
  for (int round = 0; round < 8; ++round) {
    for (unsigned s = 0; s < slices; ++s) {
      threads.emplace_back([&, s] { m.update(inst, 0, &in[s * slice], &parallel[s * slice]); });
    }
    for (auto& t : threads) t.join();
    threads.clear();
    ASSERT_EQ(parallel, serial);
  }
  for (unsigned s = 0; s < slices; ++s) m.update(inst, 0, &inPlace[s * slice], &inPlace[s * slice]);
  EXPECT_EQ(inPlace, serial);
  EXPECT_NE(serial, in);
  m.destruct(inst);
}

}  // namespace
