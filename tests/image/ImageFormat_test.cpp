#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <climits>
#include <cstdint>
#include <cstring>
#include <tuple>
#include <vector>

#include "tessarofx/CxImage.h"

// Found by argument-dependent lookup, so they live beside tagRGBQUAD.
static bool operator==(tagRGBQUAD x, tagRGBQUAD y) { return std::memcmp(&x, &y, sizeof x) == 0; }

static std::ostream& operator<<(std::ostream& os, tagRGBQUAD c) {
  return os << "{r " << int(c.rgbRed) << ", g " << int(c.rgbGreen) << ", b " << int(c.rgbBlue)
            << ", a " << int(c.rgbReserved) << "}";
}

namespace {

// Exposes the fields the accessors do not.
struct ImageProbe : CxImage {
  using CxImage::CxImage;
  uint32_t OwnsBits() const { return ownsBits; }
};

tagRGBQUAD Rgba(uint8_t r, uint8_t g, uint8_t b, uint8_t a) { return tagRGBQUAD{b, g, r, a}; }

TEST(CxImage, CreatePadsRowsToFourBytesAndMakesEightBitsGrey) {
  // An effWidth of 0 marks a refusal, which leaves the image empty: a zero argument, or a size
  // that wrapped to a small buffer in 32-bit arithmetic (16384 x 65536 x 32 bits is exactly 2^32
  // bytes, which wraps to 0).
  const struct {
    unsigned width, height, bpp, effWidth;
  } cases[] = {{100, 3, 24, 300},     {101, 3, 24, 304},     {5, 3, 8, 8},
               {3, 3, 16, 8},         {7, 3, 32, 28},        {0, 4, 32, 0},
               {4, 0, 32, 0},         {4, 4, 0, 0},          {65536, 65536, 32, 0},
               {16384, 65536, 32, 0}, {1u << 27, 16, 32, 0}, {UINT_MAX, 16, 8, 0}};
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.width << "x" << c.height << ", " << c.bpp << " bpp");
    CxImage image(8, 8, 32, IPF_BGRA);
    EXPECT_EQ(image.Create(c.width, c.height, c.bpp, IPF_BGRA), c.effWidth ? &image : nullptr);
    EXPECT_EQ(image.GetWidth(), c.effWidth ? c.width : 0u);
    EXPECT_EQ(image.GetEffWidth(), c.effWidth);
    EXPECT_EQ(image.GetSize(), c.effWidth * c.height);
    EXPECT_EQ(image.getFormat(), !c.effWidth ? IPF_None : c.bpp == 8 ? IPF_Gray8 : IPF_BGRA);
    EXPECT_EQ(image.GetBits() == nullptr, !c.effWidth);
  }
  uint8_t* none = nullptr;
  EXPECT_EQ(CxImage(&none, 4, 4, 8, 4, IPF_RGB).getFormat(), IPF_Gray8);
}

TEST(CxImage, ReadsAndWritesEachByteOrder) {
  const tagRGBQUAD c = Rgba(10, 20, 30, 40);
  const struct {
    unsigned bpp;
    _ImagePixelFormat format;
    std::vector<uint8_t> bytes;
    tagRGBQUAD read;
  } cases[] = {
      {24, IPF_RGB, {10, 20, 30}, Rgba(10, 20, 30, 0)},
      {24, IPF_BGR, {30, 20, 10}, Rgba(10, 20, 30, 0)},
      {32, IPF_RGBA, {10, 20, 30, 40}, c},
      {32, IPF_BGRA, {30, 20, 10, 40}, c},
      {8, IPF_Gray8, {10}, Rgba(10, 10, 10, 10)},
  };
  for (const auto& k : cases) {
    SCOPED_TRACE(testing::Message() << k.bpp << " bpp, format " << k.format);
    CxImage image(2, 2, k.bpp, k.format);
    std::memset(image.GetBits(), 0, image.GetSize());
    image.SetPixelColor(1, 1, c);
    const uint8_t* p = image.GetBits() + image.GetEffWidth() + k.bytes.size();
    EXPECT_EQ(std::vector<uint8_t>(p, p + k.bytes.size()), k.bytes);
    EXPECT_EQ(image.GetPixelColor(1, 1, true), k.read);
    tagRGBQUAD noAlpha = k.read;
    if (k.format != IPF_Gray8) noAlpha.rgbReserved = 0;  // grey repeats its value regardless
    EXPECT_EQ(image.GetPixelColor(1, 1, false), noAlpha);
  }
}

TEST(CxImage, SixteenBitWordsLeakBetweenFields) {
  CxImage image(1, 1, 16, IPF_RGB);
  // Green is added after the other fields are or-ed in, so its top bits carry into red.
  image.SetPixelColor(0, 0, Rgba(0x1f, 0xff, 0x1f, 0));
  uint16_t word;
  std::memcpy(&word, image.GetBits(), 2);
  EXPECT_EQ(word, 0x17ff);
  // Each field is masked with 8 bits, so green overlaps red's low bits.
  EXPECT_EQ(image.GetPixelColor(0, 0, true), Rgba(2, 0xbf, 0x1f, 0));
  // The word is read sign-extended.
  word = 0x8000;
  std::memcpy(image.GetBits(), &word, 2);
  EXPECT_EQ(image.GetPixelColor(0, 0, true), Rgba(240, 0, 0, 0));

  CxImage bgr(1, 1, 16, IPF_BGR);
  bgr.SetPixelColor(0, 0, Rgba(3, 0, 1, 0));
  std::memcpy(&word, bgr.GetBits(), 2);
  EXPECT_EQ(word, 3 | (1 << 11));
  // Blue, stored from bit 11, shows up in green's 8-bit mask.
  EXPECT_EQ(bgr.GetPixelColor(0, 0, true), Rgba(3, 64, 1, 0));
}

TEST(CxImage, OutOfRangeAndMismatchedPixelsReadZeroAndIgnoreWrites) {
  // 16 x (2^26 + 2) pixels of 64-byte rows claim 2^32 + 128 bytes, which the 32-bit size wraps
  // to 128; 8 x 2 pixels of 16-byte rows hold 32-byte rows in 32 bytes. Rows up to GetSize() read
  // as ever; past it nothing is read or written.
  std::vector<uint8_t> buffer(128, 0x77);
  buffer[68] = 5;  // pixel (1, 1) of 64-byte rows
  buffer[20] = 6;  // and of 16-byte rows
  const std::vector<uint8_t> original = buffer;
  uint8_t* bits = buffer.data();
  CxImage image(&bits, 3, 2, 32, 16, IPF_BGRA);
  CxImage threeByteFormat(&bits, 4, 2, 32, 16, IPF_RGB);
  CxImage beyondTheTable(&bits, 4, 2, 32, 16, static_cast<_ImagePixelFormat>(9));
  CxImage wrapped(&bits, 16, (1u << 26) + 2, 32, 64, IPF_BGRA);
  CxImage shortRows(&bits, 8, 2, 32, 16, IPF_BGRA);
  EXPECT_EQ(wrapped.GetPixelColor(1, 1, true).rgbBlue, 5);
  EXPECT_EQ(shortRows.GetPixelColor(1, 1, true).rgbBlue, 6);
  for (auto [at, x, y] : {std::tuple(&image, 3, 0), std::tuple(&image, 0, 2),
                          std::tuple(&threeByteFormat, 0, 0), std::tuple(&beyondTheTable, 0, 0),
                          std::tuple(&wrapped, 0, 2), std::tuple(&shortRows, 7, 1)}) {
    EXPECT_EQ(at->GetPixelColor(x, y, true), Rgba(0, 0, 0, 0))
        << at->getFormat() << " at " << x << "," << y;
    at->SetPixelColor(x, y, Rgba(1, 2, 3, 4));
  }
  EXPECT_EQ(buffer, original);
  EXPECT_EQ(CxImage().GetPixelColor(0, 0, true), Rgba(0, 0, 0, 0));
}

// A copy into an empty image is what every test's Clone does.
TEST(CxImage, CopyReusesASameSizedBufferAndReplacesAnyOther) {
  CxImage src(5, 3, 24, IPF_BGR);
  for (uint32_t i = 0; i < src.GetSize(); ++i) src.GetBits()[i] = static_cast<uint8_t>(i * 7);

  // A wrapper of the same size receives the pixels in the caller's buffer, which stays the
  // caller's: a double free would show under the sanitizers.
  std::vector<uint8_t> frame(48);
  uint8_t* bits = frame.data();
  ImageProbe wrapper(&bits, 5, 3, 24, 16, IPF_BGR);
  EXPECT_EQ(wrapper.OwnsBits(), 0u);
  EXPECT_EQ(wrapper.GetSize(), 48u);
  wrapper.Copy(src);
  EXPECT_EQ(wrapper.GetBits(), frame.data());
  EXPECT_EQ(wrapper.OwnsBits(), 0u);
  EXPECT_EQ(frame[47], src.GetBits()[47]);
  // Copying from an image without pixels changes nothing.
  wrapper.Copy(CxImage());
  EXPECT_EQ(wrapper.GetWidth(), 5u);

  // A wrapper of another size frees even the caller's buffer and clears the caller's pointer;
  // the same dimensions with unpadded rows are 45 bytes, too few for the source's 48.
  for (int byReference = 0; byReference < 2; ++byReference) {
    uint8_t* small = new uint8_t[45];  // from array new, as the wrapper will delete it
    ImageProbe other(&small, 5, 3, 24, 15, IPF_BGR);
    byReference ? other.Copy(src) : other.Copy(&src);
    EXPECT_EQ(small, nullptr);
    ASSERT_NE(other.GetBits(), nullptr);
    EXPECT_EQ(other.OwnsBits(), 1u);
    EXPECT_EQ(other.GetSize(), 48u);
    EXPECT_EQ(std::memcmp(other.GetBits(), src.GetBits(), 48), 0);
  }
}

TEST(CxImage, HslConversionsUseIntegerScaleAndRoundTripClosely) {
  EXPECT_EQ(CxImage::RGBtoHSL(Rgba(255, 0, 0, 9)), Rgba(0, 255, 128, 0));  // H, S, L
  for (int v : {0, 77, 255}) {
    EXPECT_EQ(CxImage::RGBtoHSL(Rgba(v, v, v, 0)), Rgba(170, 0, (v * 510 + 255) / 510, 0));
  }
  // Red is largest and Bdelta (40) < Gdelta (42): the hue wraps to 256 - 2, not 255 - 2.
  EXPECT_EQ(CxImage::RGBtoHSL(Rgba(255, 0, 10, 0)).rgbRed, 254);
  EXPECT_EQ(CxImage::RGBtoHSL(Rgba(0, 255, 0, 0)).rgbRed, 85);
  // Light colours take the other saturation denominator.
  EXPECT_EQ(CxImage::RGBtoHSL(Rgba(255, 200, 200, 0)).rgbGreen, 255);
  for (int l = 0; l < 256; ++l) {
    EXPECT_EQ(CxImage::HSLtoRGB(tagRGBQUAD{uint8_t(l), 0, 99, 7}), Rgba(l, l, l, 0));
  }
  // Hue has 42 steps per sixth of the circle and every step truncates, so a round trip may lose
  // a few levels, but never swaps or drops a channel.
  for (uint32_t i = 0; i < (1u << 24); i += 101) {
    const tagRGBQUAD c = Rgba(i >> 16, (i >> 8) & 255, i & 255, 0);
    const tagRGBQUAD back = CxImage::HSLtoRGB(CxImage::RGBtoHSL(c));
    ASSERT_NEAR(back.rgbRed, c.rgbRed, 12) << c;
    ASSERT_NEAR(back.rgbGreen, c.rgbGreen, 12) << c;
    ASSERT_NEAR(back.rgbBlue, c.rgbBlue, 12) << c;
  }
}

// The planes' round trip through Split and Combine is the channel denoisers' test.
TEST(CxImage, SplitAndCombineRefuseWhatTheyCannotDo) {
  CxImage image(7, 3, 32, IPF_BGRA), rgb(1, 1, 32, IPF_BGRA);
  CxImage r, g, b, a;
  ASSERT_TRUE(image.SplitRGBA(&r, &g, &b, &a));
  EXPECT_EQ(r.getFormat(), IPF_Gray8);
  CxImage grey(4, 4, 8, IPF_Gray8), empty;
  EXPECT_FALSE(grey.SplitRGBA(&r, &g, &b, nullptr));
  EXPECT_FALSE(empty.SplitHSLA(&r, &g, &b, nullptr));
  EXPECT_FALSE(image.SplitRGBA(nullptr, nullptr, nullptr, &a));
  EXPECT_FALSE(rgb.Combine(&r, nullptr, &b, nullptr, 0));
}

TEST(CxImageDeathTest, CombineAbortsOnMismatchedPlanes) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  CxImage r(4, 4, 8, IPF_Gray8), g(4, 4, 8, IPF_Gray8), b(4, 4, 8, IPF_Gray8);
  CxImage wide(5, 4, 8, IPF_Gray8), colour(4, 4, 24, IPF_BGR);
  CxImage target(4, 4, 32, IPF_BGRA);
  EXPECT_DEATH(
      target.Combine(&r, &g, &wide, nullptr, 0),
      testing::HasSubstr("Combine: Assertion `(rw == gw && gw == bw) && (rh == gh && gh == bh) && "
                         "(r->GetBpp() == g->GetBpp() && g->GetBpp() == b->GetBpp() && "
                         "b->GetBpp() == 8)' failed."));
  EXPECT_DEATH(
      target.Combine(&r, &g, &b, &colour, 0),
      testing::HasSubstr("Combine: Assertion `(rw == gw && gw == bw && bw == aw) && "
                         "(rh == gh && gh == bh && bh == ah) && (r->GetBpp() == g->GetBpp() && "
                         "g->GetBpp() == b->GetBpp() && b->GetBpp() == a->GetBpp() && "
                         "a->GetBpp() == 8)' failed."));
}

}  // namespace
