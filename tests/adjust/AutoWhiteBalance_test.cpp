#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>
#include <cstdint>
#include <opencv2/core.hpp>
#include <random>
#include <vector>

#include "tessarofx/WhiteBalance.h"

namespace {

struct Scene {
  int width;
  int height;
  std::vector<uint8_t> pixels;  // packed BGRA

  uint8_t* Pixel(int x, int y) { return &pixels[(size_t(y) * width + x) * 4]; }
};

// A neutrally lit scene: 40-pixel patches (deliberately not aligned to the blocks) of greys from
// dark to near white, clipped whites, and saturated and muted colours, with a little noise.
Scene NeutralScene() {
  const uint8_t patches[][3] = {// B, G, R
                                {60, 60, 60},    {90, 90, 90},    {120, 120, 120}, {150, 150, 150},
                                {180, 180, 180}, {205, 205, 205}, {255, 255, 255}, {245, 245, 245},
                                {30, 30, 200},   {40, 180, 40},   {200, 60, 30},   {120, 150, 200},
                                {90, 140, 160},  {200, 170, 120}, {60, 200, 220},  {170, 80, 170},
                                {20, 20, 20},    {100, 100, 100}, {40, 90, 60},    {140, 140, 140}};
  Scene scene{320, 200, std::vector<uint8_t>(320 * 200 * 4)};
  std::mt19937 rng(5);
  std::uniform_int_distribution<int> noise(-2, 2);
  for (int y = 0; y < scene.height; ++y) {
    for (int x = 0; x < scene.width; ++x) {
      const uint8_t* c = patches[(y / 40 * 8 + x / 40) % 20];
      uint8_t* p = scene.Pixel(x, y);
      for (int i = 0; i < 3; ++i) p[i] = uint8_t(std::clamp(c[i] + noise(rng), 0, 255));
      p[3] = 255;
    }
  }
  return scene;
}

// Red, green, blue, for comparisons that print.
std::array<float, 3> Gains(const AutoWhiteBalance& awb) {
  return {awb.Gain().r, awb.Gain().g, awb.Gain().b};
}
constexpr std::array<float, 3> kUnit = {1, 1, 1};

Scene Cast(Scene scene, float r, float g, float b) {
  for (size_t i = 0; i < scene.pixels.size(); i += 4) {
    const float gains[3] = {b, g, r};
    for (int c = 0; c < 3; ++c) {
      scene.pixels[i + c] = uint8_t(std::min(255.0f, std::round(scene.pixels[i + c] * gains[c])));
    }
  }
  return scene;
}

TEST(AutoWhiteBalance, UndoesAColourCast) {
  const struct {
    float r, g, b;
  } casts[] = {{1.15f, 1.0f, 0.85f}, {0.85f, 1.0f, 1.15f}, {1.0f, 1.0f, 1.0f}, {1.1f, 1.0f, 1.0f}};
  const Scene neutral = NeutralScene();
  for (const auto& cast : casts) {
    SCOPED_TRACE(testing::Message() << "cast " << cast.r << ' ' << cast.g << ' ' << cast.b);
    Scene scene = Cast(neutral, cast.r, cast.g, cast.b);
    AutoWhiteBalance awb;
    ASSERT_TRUE(awb.AutoCalcGain(scene.pixels.data(), scene.width, scene.height, scene.width * 4));
    const ColorGain gain = awb.Gain();
    EXPECT_NEAR(gain.r * cast.r, 1.0f, 0.05f);
    EXPECT_NEAR(gain.g * cast.g, 1.0f, 0.05f);
    EXPECT_NEAR(gain.b * cast.b, 1.0f, 0.05f);

    // Applying the gains makes the mid grey patch (150) grey again.
    ASSERT_TRUE(awb.Process(scene.pixels.data(), scene.pixels.data(), scene.width, scene.height,
                            scene.width * 4, scene.width * 4));
    const uint8_t* grey = scene.Pixel(140, 20);
    EXPECT_NEAR(grey[0], grey[1], 6);
    EXPECT_NEAR(grey[2], grey[1], 6);

    // The effect's positions for these gains turn the cast grey neutral too.
    float temperature = 0, tint = 0;
    awb.CalcAdjustPos(&temperature, &tint);
    std::vector<uint8_t> pixel = {uint8_t(std::lround(150 * cast.b)),
                                  uint8_t(std::lround(150 * cast.g)),
                                  uint8_t(std::lround(150 * cast.r)), 255};
    cv::Mat mat(1, 1, CV_8UC4, pixel.data());
    AdjustWhiteBalance().Process(mat, mat, gain, temperature / 200, tint / 200);
    EXPECT_NEAR(pixel[0], pixel[1], 6);
    EXPECT_NEAR(pixel[2], pixel[1], 6);
  }
}

TEST(AutoWhiteBalance, UniformImagesGiveUnitGains) {
  const int w = 70, h = 50;
  for (const uint8_t level : {128, 255, 0}) {
    SCOPED_TRACE(int(level));
    std::vector<uint8_t> image(w * h * 4, level);
    AutoWhiteBalance awb;
    // Mid grey is its own white point; clipped white and black are not measurable.
    EXPECT_EQ(awb.AutoCalcGain(image.data(), w, h, w * 4), level == 128);
    EXPECT_EQ(Gains(awb), kUnit);
    float position[2] = {1, 1};
    awb.CalcAdjustPos(&position[0], &position[1]);
    EXPECT_TRUE(position[0] == 0 && position[1] == 0) << position[0] << ' ' << position[1];
  }
}

TEST(AutoWhiteBalance, BlocksAreJudgedByBrightnessClippingSpreadAndChroma) {
  // Four blocks: a grey, a saturated red, a checkerboard of two complementary colours (neutral
  // on average, but not one surface), and a dark grey.
  const int w = 64, h = 64, block = AutoWhiteBalance::kBlockSize;
  std::vector<uint8_t> image(w * h * 4, 255);
  for (int y = 0; y < h; ++y) {
    for (int x = 0; x < w; ++x) {
      const uint8_t grey[3] = {160, 160, 160}, red[3] = {30, 30, 200}, bluish[3] = {200, 160, 120},
                    orange[3] = {120, 160, 200}, dark[3] = {25, 25, 25};
      const int which = (y / block) * 2 + x / block;
      const uint8_t* c = which == 0   ? grey
                         : which == 1 ? red
                         : which == 3 ? dark
                                      : ((x + y) % 2 ? bluish : orange);
      std::copy(c, c + 3, &image[(y * w + x) * 4]);
    }
  }
  AutoWhiteBalance awb;
  ASSERT_TRUE(awb.AutoCalcGain(image.data(), w, h, w * 4));
  ASSERT_EQ(awb.Blocks().size(), 4u);
  EXPECT_TRUE(awb.Blocks()[0].candidate);
  EXPECT_FALSE(awb.Blocks()[1].candidate);
  EXPECT_GT(awb.Blocks()[2].avdCb, AutoWhiteBalance::kMaxAVD);
  EXPECT_FALSE(awb.Blocks()[2].candidate);
  EXPECT_FALSE(awb.Blocks()[3].candidate);
  EXPECT_EQ(awb.WhitePoint().g, 160);
  EXPECT_EQ(Gains(awb), kUnit);

  // Lookup-table conversion: greys have no chroma, primaries the BT.601 values.
  int y = 0, cb = 0, cr = 0;
  for (int v = 0; v < 256; ++v) {
    awb.BGR2YCbCr(uint8_t(v), uint8_t(v), uint8_t(v), &y, &cb, &cr);
    ASSERT_EQ(y, v);
    ASSERT_EQ(cb, 0);
    ASSERT_EQ(cr, 0);
  }
  awb.BGR2YCbCr(0, 0, 255, &y, &cb, &cr);
  EXPECT_EQ(y, 76);
  EXPECT_EQ(cb, -43);
  EXPECT_EQ(cr, 128);
}

TEST(AutoWhiteBalance, PickedWhitePointAndBadInput) {
  Scene scene = Cast(NeutralScene(), 1.15f, 1.0f, 0.85f);
  AutoWhiteBalance awb;
  // Inside the 150 grey patch; the 5x5 mean smooths the noise.
  ASSERT_TRUE(awb.SetWhitePointPos(scene.pixels.data(), scene.width, scene.height, scene.width * 4,
                                   140, 20));
  EXPECT_NEAR(awb.Gain().r * 1.15f, 1.0f, 0.03f);
  EXPECT_NEAR(awb.Gain().b * 0.85f, 1.0f, 0.03f);

  awb.SetWhitePoint(BGRAColor{200, 100, 50, 255});
  EXPECT_FLOAT_EQ(awb.Gain().r, 2.0f);
  EXPECT_FLOAT_EQ(awb.Gain().b, 0.5f);
  awb.Reset();
  EXPECT_EQ(Gains(awb), kUnit);

  uint8_t* none = nullptr;
  EXPECT_FALSE(awb.SetWhitePointPos(scene.pixels.data(), scene.width, scene.height, scene.width * 4,
                                    scene.width, 0));
  EXPECT_FALSE(awb.AutoCalcGain(none, 10, 10, 40));
  EXPECT_FALSE(awb.AutoCalcGain(scene.pixels.data(), 0, 10, 40));
  EXPECT_FALSE(awb.AutoCalcGain(scene.pixels.data(), 10, 10, 39));
  EXPECT_FALSE(awb.FindWhitePoint(scene.pixels.data(), 40));
  EXPECT_FALSE(awb.Process(none, none, 10, 10, 40, 40));
  EXPECT_EQ(Gains(awb), kUnit);

  // Extreme positions and blocks on a 4 x 4 image of its exact size: nothing past it is read.
  std::vector<uint8_t> image(4 * 4 * 4);
  const uint8_t bgr[] = {10, 20, 30};
  for (size_t i = 0; i < image.size(); i += 4) std::copy_n(bgr, 3, &image[i]);
  for (const int at : {0, 3}) {
    ASSERT_TRUE(awb.SetWhitePointPos(image.data(), 4, 4, 16, at, at, INT_MAX));
    const BGRAColor white = awb.WhitePoint();
    EXPECT_TRUE(white.b == 10 && white.g == 20 && white.r == 30) << at;
  }
  EXPECT_FALSE(awb.SetWhitePointPos(image.data(), 4, 4, 12, 0, 0, 1));
  // A buffer described as larger than INT_MAX bytes is not walked, nor are samples made for it.
  EXPECT_FALSE(awb.BGR2YCbCr(image.data(), 65536, 65536, 262144));
  EXPECT_FALSE(awb.SetWhitePointPos(image.data(), 65536, 65536, 262144, 0, 0, 1));
  // Blocks reaching outside the converted image are left as they are.
  ASSERT_TRUE(awb.BGR2YCbCr(image.data(), 4, 4, 16));
  const struct {
    int x, y, width, height;
  } outside[] = {{-4, 0, 4, 4}, {2, 0, 4, 4}, {0, 1, 4, INT_MAX}, {0, 0, 0, 0}};
  for (const auto& o : outside) {
    SCOPED_TRACE(testing::Message() << o.x << "," << o.y << " " << o.width << "x" << o.height);
    // Marked in meanY and avdCb.
    WhitePointinfo block{o.x, o.y, o.width, o.height, -1, 0, 0, -1, 0, 0, 0, 0, 0, false, false};
    awb.CalcMean(&block);
    awb.CalcAVD(&block);
    EXPECT_EQ(block.meanY, -1.0f);
    EXPECT_EQ(block.avdCb, -1.0f);
  }
  awb.CalcMean(nullptr);
  EXPECT_EQ(awb.FindWhitePointBlock(image.data(), 12, 0, 0).width, 0);
}

}  // namespace
