// Headers and arguments a host may build from its own numbers: none of them may lead the image
// class or the adjustment functions past the memory a header describes.
#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <memory>
#include <vector>

#include "tessarofx/CxImage.h"
#include "tessarofx/WhiteBalance.h"

namespace {

TEST(CxImageCreate, RefusesSizesWhoseBytesDoNotFit32Bits) {
  // Each of these wrapped to a small buffer in 32-bit arithmetic; 16384 x 65536 x 32 bits is
  // exactly 2^32 bytes, which wraps to 0.
  const struct {
    unsigned width, height, bpp;
  } cases[] = {{65536, 65536, 32}, {16384, 65536, 32}, {1u << 27, 16, 32}, {UINT_MAX, 16, 8}};
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << ", " << c.bpp << " bpp");
    CxImage image(2, 2, 32, IPF_BGRA);
    EXPECT_EQ(image.Create(c.width, c.height, c.bpp, IPF_BGRA), nullptr);
    EXPECT_EQ(image.GetBits(), nullptr);
    EXPECT_EQ(image.GetWidth(), 0u);
    EXPECT_EQ(image.GetSize(), 0u);
    EXPECT_EQ(image.getFormat(), IPF_None);
  }
  const std::unique_ptr<CxImage> gradient(createTemperateColor(65536, 65536));
  ASSERT_NE(gradient, nullptr);
  EXPECT_EQ(gradient->GetBits(), nullptr);
}

}  // namespace
