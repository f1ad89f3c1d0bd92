// The detail and haze filters on a frame-sized BGRA CxImage, beside memcpy of the same frame.
// Single-threaded, as the library owns no threads.
#include <cstring>
#include <string>
#include <vector>

#include "BenchCommon.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/DetailFilters.h"

namespace {

const struct Registrar {
  Registrar() {
    using ImageFn = CxImage* (*)(CxImage*);
    // BM_<filter>/<size>/<strength>: the summary finds the size in the first segment.
    const struct {
      const char* name;
      const char* strength;
      ImageFn fn;
    } cases[] = {
        {"dehaze", "50", [](CxImage* i) { return dehaze(i, 50.0f); }},
        {"dehaze", "-50", [](CxImage* i) { return dehaze(i, -50.0f); }},
        {"clarity", "40", [](CxImage* i) { return clarity(i, 40.0f); }},
        {"clarity", "-40", [](CxImage* i) { return clarity(i, -40.0f); }},
        {"sharpen", "100", [](CxImage* i) { return sharpen(i, 100.0f); }},
        {"diffuse", "200", [](CxImage* i) { return diffuse(i, 200.0f); }},
        {"addNoiseFilter", "50", [](CxImage* i) { return addNoiseFilter(i, 50.0f, 50.0f); }},
    };
    for (const BenchSize& size : kBenchSizes) {
      RegisterMemcpy(size);
      for (const auto& c : cases) {
        RegisterTimed(std::string("BM_") + c.name + "/" + size.label + "/" + c.strength,
                      BM_ImageFunction<ImageFn>, size, c.fn);
      }
    }
  }
} registrar;

}  // namespace
