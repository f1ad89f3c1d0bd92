#include "tessarofx/HueAdjust.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <vector>

#include "support/EveryTarget.h"
#include "support/ImageBuilders.h"

namespace {

using tfx_test::Clone;
using tfx_test::EveryColour;
using tfx_test::ForEveryTarget;
using tfx_test::Image;
using tfx_test::NoiseImage;

// The matrix from its definition: cos and sin in double, entries in double stored as float.
void ReferenceMatrix(float angle, float m[9]) {
  const double a = angle * 3.14159265358979323846 / 180.0;
  const double third = (1.0 - std::cos(a)) / 3.0;
  const double k = 0.57735026f;
  const float m0 = static_cast<float>(third + std::cos(a));
  const float m1 = static_cast<float>(third - k * std::sin(a));
  const float m2 = static_cast<float>(third + k * std::sin(a));
  const float rows[9] = {m0, m1, m2, m2, m0, m1, m1, m2, m0};
  std::memcpy(m, rows, sizeof(rows));
}

uint8_t Store(float v) { return v < 0 ? 0 : v > 255 ? 255 : static_cast<uint8_t>(v); }

// width * height windows of three bytes, bpp / 8 apart, each row using the bytes stored before.
void ReferenceHue(CxImage* image, float angle) {
  float m[9];
  ReferenceMatrix(angle, m);
  uint8_t* bits = image->GetBits();
  const size_t step = image->GetBpp() / 8;
  for (size_t i = 0; i < size_t{image->GetWidth()} * image->GetHeight(); ++i) {
    uint8_t* b = bits + i * step;
    if (i * step + 3 > image->GetSize()) break;
    if (b[0] == b[1] && b[1] == b[2]) continue;  // greys stay
    b[0] = Store(m[0] * b[0] + m[1] * b[1] + m[2] * b[2]);
    b[1] = Store(m[3] * b[0] + m[4] * b[1] + m[5] * b[2]);
    b[2] = Store(m[6] * b[0] + m[7] * b[1] + m[8] * b[2]);
  }
}

TEST(HueAdjust, MatchesTheSequentialFormulaOnEveryColourAndTarget) {
  for (const float angle : {37.5f, -100.0f, 120.0f}) {
    SCOPED_TRACE(angle);
    const Image expected = Clone(EveryColour());
    ReferenceHue(expected.get(), angle);
    ForEveryTarget([&] {
      const Image actual = Clone(EveryColour());
      EXPECT_EQ(hueAdjustment(actual.get(), angle), actual.get());
      EXPECT_TRUE(tfx_test::SameBuffer(*expected, *actual));
    });
    // The published matrix is the last rotation made: angles that turn nothing leave it.
    const Image idle = NoiseImage(7, 3, 32, IPF_BGRA, 28, 1);
    for (const float none : {0.0f, NAN, INFINITY}) hueAdjustment(idle.get(), none);
    hueAdjustment(nullptr, 30.0f);
    float m[9];
    ReferenceMatrix(angle, m);
    EXPECT_EQ(std::memcmp(m, matrix, sizeof(m)), 0);
    // The per-pixel form is the same step: on every grey, which stays whatever the angle (rows
    // that sum to 1 in float would truncate most greys a level down), and a sample of the rest.
    const uint8_t* in = EveryColour().GetBits();
    for (size_t i = 0; i < EveryColour().GetSize(); i += 4) {
      if (i % (4 * 4099) != 0 && (in[i] != in[i + 1] || in[i + 1] != in[i + 2])) continue;
      tagRGBQUAD c;
      std::memcpy(&c, in + i, 4);
      const tagRGBQUAD out = transformHue1(c, angle);
      ASSERT_EQ(std::memcmp(&out, expected->GetBits() + i, 4), 0) << i;
    }
  }
}

TEST(HueAdjust, WalksPixelsFromTheFirstByteInEveryLayout) {
  // Padded rows are walked as if packed; narrow pixels give overlapping windows that stop
  // before leaving the buffer.
  ForEveryTarget([&] {
    for (const tfx_test::Layout& l : tfx_test::kLayouts) {
      SCOPED_TRACE(testing::Message() << l.bpp << " bpp " << l.format);
      EXPECT_TRUE(tfx_test::SameResult(
          *NoiseImage(l, 13, 5, 8, l.bpp), [](CxImage* i) { hueAdjustment(i, 65.0f); },
          [](CxImage* i) { ReferenceHue(i, 65.0f); }));
    }
  });
}

TEST(HueAdjust, ExactRotationTurnsTheSameWayAsTheMatrix) {
  // At 3 degrees the sequential rows stay well within a level of the product; the wrong
  // direction would be off by up to 16 levels.
  const auto level = [](float v) { return std::fmin(255.0f, std::fmax(0.0f, v * 255.0f)); };
  for (const float angle : {-3.0f, 3.0f}) {
    for (size_t i = 0; i < 200; ++i) {
      const std::vector<uint8_t> c = tfx_test::NoiseBytes(3, static_cast<uint32_t>(i + 1));
      const tagRGBQUAD out = transformHue1(tagRGBQUAD{c[0], c[1], c[2], 0}, angle);
      const _rgb exact = transformHue2(_rgb{c[2] / 255.0f, c[1] / 255.0f, c[0] / 255.0f}, angle);
      ASSERT_NEAR(out.rgbRed, level(exact.r), 1.5f) << i;
      ASSERT_NEAR(out.rgbGreen, level(exact.g), 1.5f) << i;
      ASSERT_NEAR(out.rgbBlue, level(exact.b), 1.5f) << i;
    }
  }
}

}  // namespace
