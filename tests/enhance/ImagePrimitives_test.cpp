#include "enhance/ImagePrimitives.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdint>
#include <cstring>
#include <vector>

#include "support/ImageBuilders.h"
#include "tessarofx/AlignedMemory.h"

namespace {

using Box = IppStatus (*)(const Ipp8u*, int, Ipp8u*, int, IppiSize, IppiSize, IppiPoint);

// Every anchor of small masks; corners and centre of large ones, whose sums outgrow 16 bits.
std::vector<IppiPoint> Anchors(IppiSize mask) {
  if (mask.width * mask.height > 64) {
    return {{0, 0}, {mask.width - 1, mask.height - 1}, {mask.width / 2, mask.height / 2}};
  }
  std::vector<IppiPoint> all;
  for (int y = 0; y < mask.height; ++y) {
    for (int x = 0; x < mask.width; ++x) all.push_back({x, y});
  }
  return all;
}

TEST(FilterBox, AveragesTheWindowAtEachAnchorReadingOnlyItsReach) {
  // Areas 2, 4 and 16 are powers of two, which OpenCV's own division gets wrong by one.
  const IppiSize masks[] = {{1, 1}, {3, 3}, {2, 1}, {1, 4}, {4, 4}, {7, 5}, {17, 17}, {31, 9}};
  const IppiSize regions[] = {{1, 1}, {7, 5}, {13, 2}};
  uint32_t salt = 1;
  for (const int channels : {1, 4}) {
    const Box box = channels == 1 ? ippiFilterBox_8u_C1R : ippiFilterBox_8u_C4R;
    for (const IppiSize mask : masks) {
      for (const IppiPoint anchor : Anchors(mask)) {
        for (const IppiSize region : regions) {
          SCOPED_TRACE(testing::Message()
                       << channels << " channels, mask " << mask.width << "x" << mask.height
                       << " anchor " << anchor.x << "," << anchor.y << " region " << region.width);
          // The source holds exactly the windows' reach, so ASan sees any read beyond it.
          const int reachWidth = (region.width + mask.width - 1) * channels;
          const int reachHeight = region.height + mask.height - 1;
          const int srcStep = reachWidth + 3;
          const std::vector<uint8_t> reach =
              tfx_test::NoiseBytes(size_t(reachHeight - 1) * srcStep + reachWidth, salt++);
          const uint8_t* src = reach.data() + anchor.y * srcStep + anchor.x * channels;
          const int dstStep = region.width * channels + 5;
          std::vector<uint8_t> dst(size_t(region.height) * dstStep, 0xA5);

          ASSERT_EQ(box(src, srcStep, dst.data(), dstStep, region, mask, anchor), ippStsNoErr);
          const int area = mask.width * mask.height;
          for (int y = 0; y < region.height; ++y) {
            for (int x = 0; x < region.width * channels; ++x) {
              int sum = 0;
              for (int j = 0; j < mask.height; ++j) {
                for (int i = 0; i < mask.width; ++i) {
                  sum += src[(y - anchor.y + j) * srcStep + x + (i - anchor.x) * channels];
                }
              }
              // The nearest integer; an exact half may go either way.
              const int got = dst[y * dstStep + x], low = sum / area, twice = 2 * (sum % area);
              ASSERT_TRUE(got == low + (twice > area) || (twice == area && got == low + 1))
                  << got << " for " << sum << " / " << area << " at " << x << "," << y;
            }
            for (int x = region.width * channels; x < dstStep; ++x) {
              ASSERT_EQ(dst[y * dstStep + x], 0xA5) << "padding written at " << x << "," << y;
            }
          }
        }
      }
    }
  }
}

TEST(CopyBorder, SurroundsTheSourceWithItsEdgePixelsOrAValue) {
  const IppiSize src{3, 2};
  const int srcStep = src.width * 4 + 8;
  const std::vector<uint8_t> source = tfx_test::NoiseBytes(size_t(src.height) * srcStep, 3);
  const uint8_t value[4] = {1, 2, 3, 4};
  const struct {
    int top, left;
    IppiSize dst;
  } layouts[] = {{0, 0, {3, 2}}, {1, 2, {7, 6}}, {0, 3, {6, 2}}, {2, 0, {3, 5}}};
  for (const bool replicate : {true, false}) {
    for (const auto& l : layouts) {
      SCOPED_TRACE(testing::Message() << (replicate ? "replicate" : "constant") << " top " << l.top
                                      << " left " << l.left);
      const int dstStep = l.dst.width * 4 + 4;
      std::vector<uint8_t> dst(size_t(l.dst.height) * dstStep, 0xA5);
      const IppStatus status =
          replicate ? ippiCopyReplicateBorder_8u_C4R(source.data(), srcStep, src, dst.data(),
                                                     dstStep, l.dst, l.top, l.left)
                    : ippiCopyConstBorder_8u_C4R(source.data(), srcStep, src, dst.data(), dstStep,
                                                 l.dst, l.top, l.left, value);
      ASSERT_EQ(status, ippStsNoErr);
      for (int y = 0; y < l.dst.height; ++y) {
        for (int x = 0; x < l.dst.width; ++x) {
          const int sx = x - l.left, sy = y - l.top;
          const bool inside = sx >= 0 && sx < src.width && sy >= 0 && sy < src.height;
          const uint8_t* expected = inside || replicate
                                        ? &source[std::clamp(sy, 0, src.height - 1) * srcStep +
                                                  std::clamp(sx, 0, src.width - 1) * 4]
                                        : value;
          for (int c = 0; c < 4; ++c) {
            ASSERT_EQ(dst[y * dstStep + x * 4 + c], expected[c]) << x << "," << y << " byte " << c;
          }
        }
        for (int b = l.dst.width * 4; b < dstStep; ++b) ASSERT_EQ(dst[y * dstStep + b], 0xA5);
      }
    }
  }
}

TEST(ImagePrimitives, ReportBadArgumentsAndLeaveTheDestination) {
  std::vector<uint8_t> src(64 * 64 * 4, 7), dst(64 * 64 * 4, 0xA5);
  const std::vector<uint8_t> untouched = dst;
  const uint8_t* s = src.data();
  uint8_t* d = dst.data();
  for (const int ch : {1, 4}) {
    SCOPED_TRACE(testing::Message() << ch << " channels");
    const Box box = ch == 1 ? ippiFilterBox_8u_C1R : ippiFilterBox_8u_C4R;
    const uint8_t* inner = s + 8 * 64 * ch + 8 * ch;
    const int step = 64 * ch;
    EXPECT_EQ(box(nullptr, step, d, step, {4, 4}, {3, 3}, {1, 1}), ippStsNullPtrErr);
    EXPECT_EQ(box(inner, step, nullptr, step, {4, 4}, {3, 3}, {1, 1}), ippStsNullPtrErr);
    EXPECT_EQ(box(inner, step, d, step, {0, 4}, {3, 3}, {1, 1}), ippStsSizeErr);
    EXPECT_EQ(box(inner, step, d, step, {4, 4}, {3, -3}, {1, 0}), ippStsMaskSizeErr);
    EXPECT_EQ(box(inner, step, d, step, {4, 4}, {INT_MAX, 1}, {0, 0}), ippStsMaskSizeErr);
    EXPECT_EQ(box(inner, step, d, step, {4, 4}, {3, 3}, {3, 1}), ippStsAnchorErr);
    EXPECT_EQ(box(inner, 5 * ch, d, step, {4, 4}, {3, 3}, {1, 1}), ippStsStepErr);  // reach is 6
    EXPECT_EQ(box(inner, step, d, 3 * ch, {4, 4}, {3, 3}, {1, 1}), ippStsStepErr);
    EXPECT_EQ(box(inner, -step, d, step, {4, 4}, {3, 3}, {1, 1}), ippStsStepErr);
    // OpenCV's rows of sums would outgrow int offsets: refused before anything is read.
    EXPECT_EQ(box(inner, INT_MAX, d, INT_MAX, {1 << 20, 1}, {1, 1000}, {0, 0}), ippStsNoMemErr);
  }
  const uint8_t v[4] = {};
  for (const bool replicate : {true, false}) {
    SCOPED_TRACE(replicate ? "replicate" : "constant");
    auto copy = [&](const uint8_t* from, int fromStep, IppiSize fromSize, uint8_t* to, int toStep,
                    IppiSize toSize, int top, int left) {
      return replicate ? ippiCopyReplicateBorder_8u_C4R(from, fromStep, fromSize, to, toStep,
                                                        toSize, top, left)
                       : ippiCopyConstBorder_8u_C4R(from, fromStep, fromSize, to, toStep, toSize,
                                                    top, left, v);
    };
    EXPECT_EQ(copy(nullptr, 64, {4, 4}, d, 64, {8, 8}, 1, 1), ippStsNullPtrErr);
    EXPECT_EQ(copy(s, 64, {4, 4}, nullptr, 64, {8, 8}, 1, 1), ippStsNullPtrErr);
    EXPECT_EQ(copy(s, 64, {0, 4}, d, 64, {8, 8}, 1, 1), ippStsSizeErr);
    EXPECT_EQ(copy(s, 64, {4, 4}, d, 64, {8, 8}, -1, 1), ippStsSizeErr);
    EXPECT_EQ(copy(s, 64, {4, 4}, d, 64, {8, 8}, 1, 5), ippStsSizeErr);  // too narrow
    EXPECT_EQ(copy(s, 64, {4, 4}, d, 64, {8, 8}, 5, 1), ippStsSizeErr);  // too short
    EXPECT_EQ(copy(s, 15, {4, 4}, d, 64, {8, 8}, 1, 1), ippStsStepErr);
    EXPECT_EQ(copy(s, 64, {4, 4}, d, 31, {8, 8}, 1, 1), ippStsStepErr);
  }
  EXPECT_EQ(ippiCopyConstBorder_8u_C4R(s, 64, {4, 4}, d, 64, {8, 8}, 1, 1, nullptr),
            ippStsNullPtrErr);
  EXPECT_EQ(ippiCopy_8u_C4R(nullptr, 64, d, 64, {4, 3}), ippStsNullPtrErr);
  EXPECT_EQ(ippiCopy_8u_C4R(s, 64, d, 64, {0, 3}), ippStsSizeErr);
  EXPECT_EQ(ippiCopy_8u_C4R(s, 64, d, 15, {4, 3}), ippStsStepErr);
  EXPECT_EQ(dst, untouched);
}

bool AlignedTo(const void* p, uintptr_t alignment) {
  return reinterpret_cast<uintptr_t>(p) % alignment == 0;
}

TEST(Allocation, AlignsRowsAndVectorsAndZeroesAsAskedAndRefusesBadSizes) {
  for (const int width : {1, 17, 1000}) {
    int step = 0;
    Ipp8u* image = ippiMalloc_8u_C4(width, 3, &step);
    ASSERT_NE(image, nullptr);
    EXPECT_TRUE(AlignedTo(image, 64) && step >= width * 4 && step % 64 == 0) << step;
    image[3 * step - 1] = 1;  // the last row is whole
    ippFree(image);
  }
  int step = 0;
  EXPECT_EQ(ippiMalloc_8u_C4(0, 4, &step), nullptr);
  EXPECT_EQ(ippiMalloc_8u_C4(1 << 15, 1 << 14, &step), nullptr);  // 2^31 bytes
  void* const vectors[] = {ippsMalloc_8u(3), ippsMalloc_16u(3), ippsMalloc_32s(3),
                           ippsMalloc_32f(5), ippMalloc(1)};
  for (void* p : vectors) EXPECT_TRUE(p && AlignedTo(p, 64));
  for (void* p : vectors) ippsFree(p);
  EXPECT_EQ(ippsMalloc_8u(0), nullptr);
  EXPECT_EQ(ippsMalloc_32f(INT_MAX / 2), nullptr);  // more than INT_MAX bytes
  for (const uint32_t size : {0u, 1u, 33u, 4103u}) {
    // Dirty a block first, which the zeroed one is likely to reuse.
    void* dirty = AllocMemory(size, false);
    ASSERT_TRUE(dirty != nullptr && AlignedTo(dirty, 32)) << size;
    std::memset(dirty, 0xa5, size);
    FreeMemory(dirty);
    auto* zeroed = static_cast<uint8_t*>(AllocMemory(size, true));
    ASSERT_TRUE(zeroed != nullptr && AlignedTo(zeroed, 32)) << size;
    for (uint32_t b = 0; b < size; ++b) ASSERT_EQ(zeroed[b], 0) << b;
    FreeMemory(zeroed);
  }
  for (const size_t alignment : {1, 2, 8, 64, 4096}) {
    void* p = aligned_malloc(100, alignment);
    ASSERT_TRUE(p != nullptr && AlignedTo(p, alignment)) << alignment;
    aligned_free(p);
  }
  for (const size_t alignment : {0, 3, 24, 100}) EXPECT_EQ(aligned_malloc(100, alignment), nullptr);
  EXPECT_EQ(aligned_malloc(SIZE_MAX - 64, 32), nullptr);
  FreeMemory(nullptr);
  aligned_free(nullptr);
}

}  // namespace
