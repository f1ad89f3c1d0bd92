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

// The module's entry points, typed by the declarations in frei0r.h.
struct Module {
  explicit Module(const std::string& slug)
      : handle(dlopen((TFX_FREI0R_DIR "/tessarofx-" + slug + ".so").c_str(), RTLD_NOW)) {}
  ~Module() {
    if (handle) dlclose(handle);
  }
  template <typename F>
  F Sym(const char* name) const {
    return handle ? reinterpret_cast<F>(dlsym(handle, name)) : nullptr;
  }
  void* const handle;
  decltype(&f0r_init) init = Sym<decltype(init)>("f0r_init");
  decltype(&f0r_get_plugin_info) info = Sym<decltype(info)>("f0r_get_plugin_info");
  decltype(&f0r_get_param_info) paramInfo = Sym<decltype(paramInfo)>("f0r_get_param_info");
  decltype(&f0r_construct) construct = Sym<decltype(construct)>("f0r_construct");
  decltype(&f0r_destruct) destruct = Sym<decltype(destruct)>("f0r_destruct");
  decltype(&f0r_set_param_value) set = Sym<decltype(set)>("f0r_set_param_value");
  decltype(&f0r_get_param_value) get = Sym<decltype(get)>("f0r_get_param_value");
  decltype(&f0r_update) update = Sym<decltype(update)>("f0r_update");
};

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
    const bool keyed =
        filter.params.size() > 0 && filter.params[0].role == tfx::catalog::ParamRole::kKeyRed;
    ASSERT_EQ(info.num_params, static_cast<int>(filter.params.size()) - (keyed ? 2 : 0));
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
  const auto get = [&](int index) {
    double v = -1;
    m.get(inst, &v, index);
    return v;
  };
  EXPECT_EQ(get(1), 1.0);                       // size: default 100 of 0..100
  EXPECT_EQ(get(3), 0.5);                       // feather: default 50 of 0..100
  for (double hostile : {7.0, std::nan("")}) {  // clamped to 1, then ignored
    m.set(inst, &hostile, 0);
    EXPECT_EQ(get(0), 1.0) << hostile;
  }
  m.destruct(inst);
}

TEST(Frei0rModules, TextArrivesEitherAsPointerToPointerOrAsThePointerItself) {
  Module m("lut");
  ASSERT_EQ(m.init(), 1);
  f0r_instance_t inst = m.construct(4, 4);
  std::string first = "/nowhere/first.cube", second = "/nowhere/second.cube";
  char* text = first.data();
  char* got = nullptr;
  m.set(inst, &text, 0);  // the frei0r convention
  m.get(inst, &got, 0);
  EXPECT_STREQ(got, first.c_str());
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
  const size_t slice = size_t(width) * sliceHeight;
  // Every channel differs from the others and from pixel to pixel.
  std::vector<uint32_t> in(slice * slices);
  for (size_t i = 0; i < in.size(); ++i) in[i] = uint32_t(i * 0x9E3779B1u) | 0xC0000000u;
  f0r_instance_t inst = m.construct(width, sliceHeight);
  double exposure = 0.8, saturation = 0.3;
  m.set(inst, &exposure, 0);
  m.set(inst, &saturation, 4);

  std::vector<uint32_t> serial(in.size()), parallel(in.size()), inPlace(in);
  for (unsigned s = 0; s < slices; ++s) m.update(inst, 0, &in[s * slice], &serial[s * slice]);
  for (int round = 0; round < 8; ++round) {
    std::vector<std::thread> threads;
    for (unsigned s = 0; s < slices; ++s) {
      threads.emplace_back([&, s] { m.update(inst, 0, &in[s * slice], &parallel[s * slice]); });
    }
    for (auto& t : threads) t.join();
    ASSERT_EQ(parallel, serial);
  }
  for (unsigned s = 0; s < slices; ++s) m.update(inst, 0, &inPlace[s * slice], &inPlace[s * slice]);
  EXPECT_EQ(inPlace, serial);
  EXPECT_NE(serial, in);
  m.destruct(inst);
}

}  // namespace
