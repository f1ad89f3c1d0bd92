// Arguments a host may pass by mistake: sizes and radii near INT_MAX that describe nothing a
// caller could hold. Each case would reach past a buffer or overflow an offset if the function
// did not see it first; the sanitizer build reports those.
#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <functional>
#include <vector>

#include "support/ImageBuilders.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Denoise.h"

namespace {

using tfx_test::NoiseBytes;

// A radius past every edge gives the window of the whole plane, however far past it is. The
// plane is wide enough that rows a radius of INT_MAX away lie outside the address space.
TEST(WindowFilters, TreatRadiiFarBeyondThePlaneAsTheWholePlane) {
  const int w = 1 << 17, h = 2;
  const std::vector<uint8_t> src = NoiseBytes(size_t{w} * h, 3);
  using Filter = std::function<void(std::vector<uint8_t>&, int radius)>;
  const struct {
    const char* name;
    Filter run;
  } filters[] = {
      {"mean", [&](auto& out, int r) { fastWindowAverageFilter(src.data(), out.data(), w, h, r); }},
      {"variance",
       [&](auto& out, int r) { fastWindowVarianceFilter(src.data(), out.data(), w, h, r); }},
      {"channelDenoise",
       [&](auto& out, int r) {
         out = src;
         channelDenoise(out.data(), w, h, r < INT_MAX / 2 ? 2 * r + 1 : INT_MAX, 20.0f);
       }},
  };
  for (const auto& filter : filters) {
    SCOPED_TRACE(filter.name);
    std::vector<uint8_t> whole(src.size()), far(src.size());
    filter.run(whole, w);
    for (const int radius : {1 << 30, INT_MAX}) {
      SCOPED_TRACE(radius);
      filter.run(far, radius);
      EXPECT_EQ(far, whole);
    }
  }
}

}  // namespace
