#include "tessarofx/Compositing.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cstdint>
#include <cstring>
#include <utility>
#include <vector>

#include "support/ImageBuilders.h"

namespace {

// A new[] output buffer as the functions manage it.
struct Output {
  unsigned char* bits = nullptr;
  int width = 0;
  int height = 0;
  ~Output() { delete[] bits; }
  const unsigned char* Pixel(int x, int y) const { return bits + (size_t(y) * width + x) * 4; }
  std::pair<int, int> Size() const { return {width, height}; }
};

using Px = std::vector<uint8_t>;

Px Pixel(const unsigned char* p) { return {p[0], p[1], p[2], p[3]}; }

int Frame(Output& out, const uint8_t* src, int w, int h, int stride, PIPNLERGB colour, int border) {
  return makeImageFrame(&out.bits, &out.width, &out.height, src, w, h, stride, 32, colour, border);
}

TEST(MakeImageFrame, BorderZeroCopiesAndATransparentSourceGivesAnEmptyFrame) {
  const int stride = 5 * 4 + 8;
  const std::vector<uint8_t> src = tfx_test::NoiseBytes(3 * stride, 1);
  Output copy;
  ASSERT_EQ(Frame(copy, src.data(), 5, 3, stride, {1, 2, 3, 4}, 0), 1);
  ASSERT_EQ(copy.Size(), std::pair(5, 3));
  for (int y = 0; y < 3; ++y) EXPECT_EQ(std::memcmp(copy.Pixel(0, y), &src[y * stride], 20), 0);

  std::vector<uint8_t> faint = tfx_test::NoiseBytes(6 * 4 * 4, 2);
  for (size_t i = 3; i < faint.size(); i += 4) faint[i] = faint[i] % 51;  // alpha at most 50
  Output empty;
  ASSERT_EQ(Frame(empty, faint.data(), 6, 4, 24, {200, 100, 50, 255}, 3), 1);
  ASSERT_EQ(empty.Size(), std::pair(12, 10));
  EXPECT_TRUE(std::all_of(empty.bits, empty.bits + 12 * 10 * 4, [](int v) { return v == 0; }));
}

// An opaque 4x4 block in an 8x8 source, border 2: the output is 12x12 with the block at 4..7.
TEST(MakeImageFrame, OutlinesTheOpaqueBlockInReversedColourOrderWithASoftEdge) {
  std::vector<uint8_t> src = tfx_test::NoiseBytes(8 * 8 * 4, 3);
  for (int i = 0; i < 64; ++i)
    src[i * 4 + 3] = i % 8 >= 2 && i % 8 < 6 && i / 8 >= 2 && i / 8 < 6 ? 255 : 0;
  const PIPNLERGB colour{10, 20, 30, 200};
  // A stale output of another size must be replaced, not written past its end.
  Output out;
  out.bits = new unsigned char[4]{9, 9, 9, 9};
  out.width = out.height = 1;
  ASSERT_EQ(Frame(out, src.data(), 8, 8, 32, colour, 2), 1);
  ASSERT_EQ(out.Size(), std::pair(12, 12));
  // Across the middle row: untouched, the outermost ring (colour, alpha 0), the soft edge
  // (6 of 9 covered: 200 * 170 / 255), full cover, and the same mirrored.
  const Px c0{0, 0, 0, 0}, ring{10, 20, 30, 0}, soft{10, 20, 30, 133}, full{10, 20, 30, 200};
  const Px row[] = {c0, ring, soft, full, full, full, full, full, full, soft, ring, c0};
  for (int x = 0; x < 12; ++x) {
    EXPECT_EQ(Pixel(out.Pixel(x, 5)), row[x]) << "x " << x;
    EXPECT_EQ(Pixel(out.Pixel(5, x)), row[x]) << "y " << x;
  }
  // The dilated square loses its corners before the soft edge: 1 of 9 left, 200 * 28 / 255.
  EXPECT_EQ(Pixel(out.Pixel(1, 1)), c0);
  EXPECT_EQ(Pixel(out.Pixel(2, 2)), (Px{10, 20, 30, 21}));

  // Same size again: kept, and pixels the outline does not reach stay as they were.
  std::memset(out.bits, 7, size_t(12) * 12 * 4);
  unsigned char* const kept = out.bits;
  ASSERT_EQ(Frame(out, src.data(), 8, 8, 32, colour, 2), 1);
  EXPECT_EQ(out.bits, kept);
  EXPECT_EQ(Pixel(out.Pixel(0, 5)), (Px{7, 7, 7, 7}));
  EXPECT_EQ(Pixel(out.Pixel(3, 5)), row[3]);
}

TEST(ScaleImage, MapsTheWholeCanvasOntoTheSourceAlpha) {
  // 4x2 source whose alphas are 1..8, border 1: a 6x4 canvas.
  std::vector<uint8_t> src(4 * 2 * 4, 99);
  for (int i = 0; i < 8; ++i) src[i * 4 + 3] = uint8_t(i + 1);
  Output out;
  ASSERT_EQ(
      scaleImage(&out.bits, &out.width, &out.height, src.data(), 4, 2, 32, {10, 20, 30, 77}, 1), 1);
  ASSERT_EQ(out.Size(), std::pair(6, 4));
  // Column x reads source column trunc(x * 4 / 6), row y source row trunc(y * 2 / 4); the
  // inclusive upper limits give column 5 and row 3 an alpha too.
  const int alpha[4][6] = {
      {0, 0, 0, 0, 0, 0}, {0, 1, 2, 3, 3, 4}, {0, 5, 6, 7, 7, 8}, {0, 5, 6, 7, 7, 8}};
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 6; ++x) {
      EXPECT_EQ(Pixel(out.Pixel(x, y)), (Px{30, 20, 10, uint8_t(alpha[y][x])})) << x << "," << y;
    }
  }
}

// Images stored bottom-up: logical row y is memory row height - 1 - y.
struct BottomUp {
  int width, height, stride;
  std::vector<uint8_t> bytes;
  uint8_t* Pixel(int x, int y) { return &bytes[size_t(height - 1 - y) * stride + x * 4]; }
};

BottomUp Noise(int width, int height, int stride, uint32_t salt) {
  return {width, height, stride, tfx_test::NoiseBytes(size_t(height) * stride, salt)};
}

TEST(MergeImage, CopiesTheClippedBlockBottomUp) {
  // Opacity 100 over opacity 0 copies opaque source pixels exactly.
  const struct {
    const char* name;
    int dstX, dstY, copyW, copyH, srcX, srcY;
    int firstX, firstY, width, height;  // expected source block, placed at max(dst, 0)
  } cases[] = {
      {"inside", 2, 1, 3, 2, 1, 2, 1, 2, 3, 2},
      {"left of the destination", -3, 1, 6, 3, 1, 2, 4, 2, 3, 3},
      {"above the destination", 1, -2, 3, 4, 0, 1, 0, 3, 3, 2},
      {"whole source, clipped", 4, 3, -1, -1, 0, 0, 0, 0, 4, 3},
      {"entirely right", 8, 0, 3, 3, 0, 0, 0, 0, 0, 0},
      {"entirely below", 0, 6, 3, 3, 0, 0, 0, 0, 0, 0},
      {"entirely left", -3, 0, 3, 3, 0, 0, 0, 0, 0, 0},
      {"source origin before the source", 0, 0, 3, 3, -1, 0, 0, 0, 0, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    BottomUp src = Noise(10, 7, 10 * 4 + 12, 5);
    for (size_t i = 3; i < src.bytes.size(); i += 4) src.bytes[i] = 255;
    BottomUp dst = Noise(8, 6, 8 * 4, 6);
    BottomUp expected = dst;
    for (int i = 0; i < c.height; ++i) {
      for (int j = 0; j < c.width; ++j) {
        std::memcpy(expected.Pixel(std::max(c.dstX, 0) + j, std::max(c.dstY, 0) + i),
                    src.Pixel(c.firstX + j, c.firstY + i), 4);
      }
    }
    EXPECT_TRUE(mergeImage(dst.bytes.data(), src.bytes.data(), 8, 6, 10, 7, src.stride, c.dstX,
                           c.dstY, c.copyW, c.copyH, c.srcX, c.srcY, 100, 0));
    EXPECT_EQ(dst.bytes, expected.bytes);
  }
}

TEST(MergeImage, BlendsEveryPixelAsTheFormulaDoes) {
  // Few alpha values, so that pairs repeat and change in runs, and zero alphas.
  const uint8_t alphas[] = {0, 255, 255, 128, 3};
  for (const auto& opacity : {std::pair{100, 100}, std::pair{37, 80}, std::pair{100, 0},
                              std::pair{0, 55}, std::pair{0, 0}}) {
    SCOPED_TRACE(testing::Message() << opacity.first << "% over " << opacity.second << "%");
    BottomUp src = Noise(9, 5, 9 * 4, 7), dst = Noise(9, 5, 9 * 4, 8);
    for (size_t i = 3; i < src.bytes.size(); i += 4) {
      src.bytes[i] = alphas[src.bytes[i] % 5];
      dst.bytes[i] = alphas[(dst.bytes[i] >> 3) % 5];
    }
    // The first pixel blended meets the weights prepared before the loop.
    src.Pixel(0, 0)[3] = dst.Pixel(0, 0)[3] = 255;
    std::vector<uint8_t> expected = dst.bytes;
    for (size_t i = 0; i < expected.size(); i += 4) {
      const int as = src.bytes[i + 3] * opacity.first / 100;
      const int ad = dst.bytes[i + 3] * opacity.second / 100;
      const int common = ad * as / 255, total = ad + as - common;
      for (int c = 0; c < 3; ++c) {
        expected[i + c] =
            total ? uint8_t((dst.bytes[i + c] * (ad - common) + src.bytes[i + c] * as) / total) : 0;
      }
      expected[i + 3] = total ? uint8_t((255 - as) * ad / 255 + as) : 0;
    }
    EXPECT_TRUE(mergeImage(dst.bytes.data(), src.bytes.data(), 9, 5, 9, 5, 9 * 4, 0, 0, -1, -1, 0,
                           0, opacity.first, opacity.second));
    EXPECT_EQ(dst.bytes, expected);
  }
}

TEST(MergeImage, RefusesNullImagesAndIgnoresWhatItCannotReach) {
  std::vector<uint8_t> src(4 * 4 * 4, 200), dst(4 * 4 * 4, 50);
  const std::vector<uint8_t> before = dst;
  EXPECT_FALSE(mergeImage(nullptr, src.data(), 4, 4, 4, 4, 16, 0, 0, -1, -1, 0, 0, 100, 100));
  EXPECT_FALSE(mergeImage(dst.data(), nullptr, 4, 4, 4, 4, 16, 0, 0, -1, -1, 0, 0, 100, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 0, 4, 4, 4, 16, 0, 0, -1, -1, 0, 0, 100, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, -4, 16, 0, 0, -1, -1, 0, 0, 100, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, 4, 15, 0, 0, -1, -1, 0, 0, 100, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, 4, 16, 0, 0, -1, -1, 0, 0, 101, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, 4, 16, 0, 0, -1, -1, 0, 0, 100, -1));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, 4, 16, 0, 0, INT_MIN, 4, 0, 0, 100, 100));
  EXPECT_TRUE(mergeImage(dst.data(), src.data(), 4, 4, 4, 4, 16, INT_MIN, INT_MIN, INT_MAX, INT_MAX,
                         0, 0, 100, 100));
  // Destinations and sources above INT_MAX bytes, the largest past 64-bit row offsets, are
  // refused before a row is touched.
  for (const auto& [dw, dh, sw, sh, stride] :
       {std::array{INT_MAX, INT_MAX, 4, 4, 16}, std::array{1 << 16, 1 << 14, 4, 4, 16},
        std::array{1 << 15, 1 << 14, 4, 4, 16}, std::array{4, 4, 4, 1 << 16, 1 << 16}}) {
    EXPECT_TRUE(
        mergeImage(dst.data(), src.data(), dw, dh, sw, sh, stride, 0, 0, -1, -1, 0, 0, 100, 100));
  }
  EXPECT_EQ(dst, before);
}

TEST(ClipOutBorder, CopiesTheCentredBlock) {
  const std::vector<uint8_t> src = tfx_test::NoiseBytes(6 * 32, 9);  // 7x6, stride 32
  std::vector<uint8_t> dst(3 * 20, 0xA5);                            // 4x3, stride 20
  ASSERT_TRUE(clipOutBorder(src.data(), dst.data(), 7, 6, 32, 4, 3, 20));
  for (int y = 0; y < 3; ++y) {
    EXPECT_EQ(std::memcmp(&dst[y * 20], &src[(y + 1) * 32 + 1 * 4], 16), 0) << "row " << y;
    EXPECT_EQ(dst[y * 20 + 16], 0xA5);
  }
  std::vector<uint8_t> whole(6 * 28);
  ASSERT_TRUE(clipOutBorder(src.data(), whole.data(), 7, 6, 32, 7, 6, 28));
  for (int y = 0; y < 6; ++y) EXPECT_EQ(std::memcmp(&whole[y * 28], &src[y * 32], 28), 0);

  EXPECT_FALSE(clipOutBorder(nullptr, dst.data(), 7, 6, 32, 4, 3, 20));
  EXPECT_FALSE(clipOutBorder(src.data(), nullptr, 7, 6, 32, 4, 3, 20));
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 7, 6, 32, 8, 3, 20));
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 7, 6, 32, 4, 7, 20));
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 7, 6, 27, 4, 3, 20));
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 7, 6, 32, 4, 3, 15));
  EXPECT_FALSE(clipOutBorder(src.data(), dst.data(), 7, 6, INT_MAX / 2, 4, 3, 20));
  EXPECT_TRUE(clipOutBorder(src.data(), dst.data(), 7, 6, 32, 4, 0, 20));
}

TEST(BlurImage, RadiusZeroCopiesAndAPaddedBlurFadesOutward) {
  const std::vector<uint8_t> src = tfx_test::NoiseBytes(3 * 2 * 4, 10);
  Output out;
  ASSERT_EQ(blurImage(&out.bits, &out.width, &out.height, src.data(), 3, 2, 32, 0), 1);
  ASSERT_EQ(out.Size(), std::pair(3, 2));
  EXPECT_EQ(std::memcmp(out.bits, src.data(), src.size()), 0);

  // A uniform image replicated by 1 and blurred 3x3 against the black beyond: corners see 4 of
  // 9 pixels, edges 6, the inside all 9 (nearest rounding).
  std::vector<uint8_t> flat(3 * 2 * 4);
  for (size_t i = 0; i < flat.size(); i += 4) std::memcpy(&flat[i], "\x5a\xb4\x1b\xff", 4);
  ASSERT_EQ(blurImage(&out.bits, &out.width, &out.height, flat.data(), 3, 2, 32, 1), 1);
  ASSERT_EQ(out.Size(), std::pair(5, 4));
  const Px corner{40, 80, 12, 113}, edge{60, 120, 18, 170}, inside{90, 180, 27, 255};
  for (int y = 0; y < 4; ++y) {
    for (int x = 0; x < 5; ++x) {
      const int outer = (x == 0 || x == 4) + (y == 0 || y == 3);
      EXPECT_EQ(Pixel(out.Pixel(x, y)), outer == 2   ? corner
                                        : outer == 1 ? edge
                                                     : inside)
          << x << "," << y;
    }
  }
}

// Bad input fails before the output is touched.
TEST(FrameFunctions, RefuseBadInputWithoutTouchingTheOutput) {
  const std::vector<uint8_t> src(16 * 16 * 4, 255);
  const uint8_t* s = src.data();
  Output out;
  unsigned char** o = &out.bits;
  int* w = &out.width;
  int* h = &out.height;
  const PIPNLERGB c{1, 2, 3, 4};
  const std::pair<const char*, int> cases[] = {
      {"frame: null output", makeImageFrame(nullptr, w, h, s, 4, 4, 16, 32, c, 1)},
      {"frame: null width", makeImageFrame(o, nullptr, h, s, 4, 4, 16, 32, c, 1)},
      {"frame: null source", makeImageFrame(o, w, h, nullptr, 4, 4, 16, 32, c, 1)},
      {"frame: 24 bits", makeImageFrame(o, w, h, s, 4, 4, 16, 24, c, 1)},
      {"frame: negative border", makeImageFrame(o, w, h, s, 4, 4, 16, 32, c, -1)},
      {"frame: no width", makeImageFrame(o, w, h, s, 0, 4, 16, 32, c, 1)},
      {"frame: negative height", makeImageFrame(o, w, h, s, 4, -4, 16, 32, c, 0)},
      {"frame: stride below row", makeImageFrame(o, w, h, s, 4, 4, 15, 32, c, 1)},
      {"frame: huge border", makeImageFrame(o, w, h, s, 4, 4, 16, 32, c, INT_MAX / 2)},
      {"frame: huge image", makeImageFrame(o, w, h, s, 1 << 16, 1 << 16, 1 << 18, 32, c, 0)},
      {"frame: huge stride", makeImageFrame(o, w, h, s, 2, 3, INT_MAX / 2, 32, c, 1)},
      {"scale: null output", scaleImage(nullptr, w, h, s, 4, 4, 32, c, 1)},
      {"scale: null height", scaleImage(o, w, nullptr, s, 4, 4, 32, c, 1)},
      {"scale: null source", scaleImage(o, w, h, nullptr, 4, 4, 32, c, 1)},
      {"scale: 8 bits", scaleImage(o, w, h, s, 4, 4, 8, c, 1)},
      {"scale: negative border", scaleImage(o, w, h, s, 4, 4, 32, c, -2)},
      {"scale: no height", scaleImage(o, w, h, s, 4, 0, 32, c, 1)},
      {"scale: huge border", scaleImage(o, w, h, s, 4, 4, 32, c, INT_MAX)},
      {"scale: huge image", scaleImage(o, w, h, s, 1 << 16, 1 << 15, 32, c, 0)},
      {"blur: null output", blurImage(nullptr, w, h, s, 4, 4, 32, 1)},
      {"blur: null width", blurImage(o, nullptr, h, s, 4, 4, 32, 1)},
      {"blur: null source", blurImage(o, w, h, nullptr, 4, 4, 32, 1)},
      {"blur: 24 bits", blurImage(o, w, h, s, 4, 4, 24, 1)},
      {"blur: negative radius", blurImage(o, w, h, s, 4, 4, 32, -1)},
      {"blur: no width", blurImage(o, w, h, s, -1, 4, 32, 1)},
      {"blur: huge radius", blurImage(o, w, h, s, 4, 4, 32, INT_MAX / 2)},
      {"blur: huge image", blurImage(o, w, h, s, 1 << 15, 1 << 15, 32, 0)},
  };
  for (const auto& [name, result] : cases) EXPECT_EQ(result, 0) << name;
  EXPECT_EQ(out.bits, nullptr);
  EXPECT_EQ(out.Size(), std::pair(0, 0));

  EXPECT_FALSE(reMallocImage(nullptr, 4, 4, 4));
  EXPECT_FALSE(reMallocImage(o, 0, 4, 4));
  EXPECT_FALSE(reMallocImage(o, 1 << 16, 1 << 16, 1));
  EXPECT_FALSE(reMallocImage(o, INT_MAX, INT_MAX, INT_MAX));
  EXPECT_EQ(out.bits, nullptr);
  ASSERT_TRUE(reMallocImage(o, 3, 2, 4));
  EXPECT_TRUE(std::all_of(out.bits, out.bits + 24, [](int v) { return v == 0; }));
}

}  // namespace
