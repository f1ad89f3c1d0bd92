#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <opencv2/imgproc.hpp>
#include <vector>

#include "lut/ChromeKeyLut3dGenerator.h"
#include "media/DemoScene.h"
#include "support/EffectHarness.h"
#include "tessarofx/NLEHost.h"
#include "tessarofx/TessaroFx.h"

namespace {

using tfx_test::CreateEffect;
using tfx_test::kChromeKey;
using tfx_test::kCombine;
using tfx_test::SetParam;
using tfx_test::Settings;

// B, G, R, A: the screen, skin, a grey, a warm colour with green spill (half the screen's
// chroma), a grey as bright as the screen with a quarter of its chroma.
const std::vector<uint8_t> kPixels = {60,  200, 40,  255, 138, 170, 222, 200, 128, 128,
                                      128, 9,   120, 200, 150, 0,   165, 200, 160, 255};

// One frame through the filter; the five output pixels.
std::vector<uint8_t> RunFrame(INLECGFilter* filter, int dstStride = 0) {
  const std::vector<uint8_t> out =
      tfx_test::RunFrame(filter, new TestFrame(5, 1, kPixels), new TestFrame(5, 1, dstStride));
  return std::vector<uint8_t>(out.begin(), out.begin() + 20);
}

// The keyer for a screen colour, at the default contrast and offset; mode 0 makes the mask, 1 the
// despilled colours.
NLEComPtr<INLECGFilter> Keyer(int red, int green, int blue, double mode) {
  return CreateEffect(kChromeKey, Settings({{L"red", red},
                                            {L"green", green},
                                            {L"blue", blue},
                                            {L"contrast", 50},
                                            {L"offset", 0},
                                            {L"mode", mode}}));
}

NLEComPtr<INLECGFilter> GreenKey(double mode) { return Keyer(40, 200, 60, mode); }

TEST(ChromeKeyLut3dEffect, ModeSelectsMaskOrBeauty) {
  const std::vector<uint8_t> mask = RunFrame(GreenKey(0).get());
  const int expectedMask[5] = {0, 255, 255, 128, 255};
  for (int p = 0; p < 5; ++p) {
    SCOPED_TRACE(p);
    const uint8_t* m = &mask[p * 4];
    EXPECT_TRUE(m[0] == m[1] && m[1] == m[2]);
    EXPECT_EQ(m[3], kPixels[p * 4 + 3]);
    EXPECT_NEAR(m[0], expectedMask[p], 3);
  }

  // Padded destination rows go through the pipeline's private copy.
  const std::vector<uint8_t> beauty = RunFrame(GreenKey(1).get(), 64);
  for (int p = 0; p < 5; ++p) EXPECT_EQ(beauty[p * 4 + 3], kPixels[p * 4 + 3]);
  for (int p : {1, 2}) {
    for (int c = 0; c < 3; ++c) EXPECT_NEAR(beauty[p * 4 + c], kPixels[p * 4 + c], 1);
  }
  const uint8_t* spill = &beauty[12];
  EXPECT_LE(spill[1], std::max(spill[0], spill[2]) + 1);
}

// The beauty LUT depends on the key colour alone: contrast and offset rebuild only the alpha LUT,
// and an unchanged setting rebuilds nothing.
TEST(ChromeKeyLut3dEffect, RebuildsOnlyTheTablesAChangeAffects) {
  NLEComPtr<INLECGFilter> filter = GreenKey(0);
  using Gen = NLEChromeKeyLut3dGenerator;
  uint64_t beauty = Gen::beautyLutsBuilt(), alpha = Gen::alphaLutsBuilt();
  auto built = [&](int expectBeauty, int expectAlpha) {
    EXPECT_EQ(Gen::beautyLutsBuilt() - beauty, static_cast<uint64_t>(expectBeauty));
    EXPECT_EQ(Gen::alphaLutsBuilt() - alpha, static_cast<uint64_t>(expectAlpha));
    beauty = Gen::beautyLutsBuilt();
    alpha = Gen::alphaLutsBuilt();
  };

  const std::vector<uint8_t> first = RunFrame(filter.get());
  built(1, 1);
  RunFrame(filter.get());
  built(0, 0);

  SetParam(filter.get(), L"contrast", 0);
  const std::vector<uint8_t> softer = RunFrame(filter.get());
  built(0, 1);
  EXPECT_LE(softer[0], 3);
  EXPECT_NEAR(softer[16], 191, 3);  // alpha = 1 - share of the screen

  SetParam(filter.get(), L"offset", 20);
  RunFrame(filter.get());
  built(0, 1);

  SetParam(filter.get(), L"green", 180);
  SetParam(filter.get(), L"mode", 1);
  const std::vector<uint8_t> beautyAfterKey = RunFrame(filter.get());
  built(1, 1);
  SetParam(filter.get(), L"green", 180);  // the same value again
  RunFrame(filter.get());
  built(0, 0);

  // The colours follow the new key: the contrast change did not leave a stale beauty LUT.
  NLEComPtr<INLECGFilter> fresh = GreenKey(1);
  SetParam(fresh.get(), L"green", 180);
  EXPECT_EQ(RunFrame(fresh.get()), beautyAfterKey);
}

// ---- The chain, judged on the demo's green-screen scene and on a synthetic blue screen ------

// One filter over `fg` (and `bg`), BGRA images of one size, into a new image.
cv::Mat RunFilter(INLECGFilter* filter, const cv::Mat& fg, const cv::Mat* bg = nullptr) {
  const auto frame = [](const cv::Mat& m) {
    return new TestFrame(m.cols, m.rows, tfx_test::Bytes(m.data, m.data + m.total() * 4));
  };
  tfx_test::Bytes out = tfx_test::RunFrame(filter, frame(fg), new TestFrame(fg.cols, fg.rows),
                                           bg ? frame(*bg) : nullptr);
  return cv::Mat(fg.rows, fg.cols, CV_8UC4, out.data()).clone();
}

// The keyer's chain as a host runs it: the mask, the despilled colours, and ChromeKeyCombine
// joining them.
cv::Mat Key(const cv::Mat& scene, int red, int green, int blue) {
  const cv::Mat mask = RunFilter(Keyer(red, green, blue, 0).get(), scene);
  return RunFilter(CreateEffect(kCombine, nullptr).get(),
                   RunFilter(Keyer(red, green, blue, 1).get(), scene), &mask);
}

struct Matte {
  int screen = 0, screenNotClear = 0;          // pure screen pixels, and those with alpha > 0
  int interior = 0, interiorNotOpaque = 0;     // subject pixels 3+ pixels from the screen
  int intermediate = 0, intermediateAway = 0;  // 0 < alpha < 255, and those not at the edge
  int worstCast = 0;  // largest excess of the screen's channel on a kept pixel
  int worstInteriorChange = 0;
};

// Inside `area`, a pixel is screen when it equals the screen pixel at column `screenColumn` of
// its row (the screen is lit evenly along rows). Pixels within two pixels of the screen or of a
// pixel dominated by the screen's channel (`castChannel`: B, G, R = 0, 1, 2), which is how an
// edge mixed with the screen looks, are the edge; the other subject pixels are interior. The
// subjects have no colours dominated by that channel.
Matte Judge(const cv::Mat& scene, const cv::Mat& keyed, cv::Rect area, int screenColumn,
            int castChannel) {
  cv::Mat isScreen(scene.size(), CV_8U, cv::Scalar(0)), screenLike = isScreen.clone();
  for (int y = area.y; y < area.br().y; ++y) {
    const cv::Vec4b ref = scene.at<cv::Vec4b>(y, screenColumn);
    for (int x = area.x; x < area.br().x; ++x) {
      const cv::Vec4b p = scene.at<cv::Vec4b>(y, x);
      isScreen.at<uchar>(y, x) = p[0] == ref[0] && p[1] == ref[1] && p[2] == ref[2];
      const int others = std::max(p[(castChannel + 1) % 3], p[(castChannel + 2) % 3]);
      screenLike.at<uchar>(y, x) = isScreen.at<uchar>(y, x) || p[castChannel] > others + 16;
    }
  }
  cv::Mat nearScreen;
  cv::dilate(screenLike, nearScreen, cv::Mat::ones(5, 5, CV_8U));
  Matte m;
  for (int y = area.y; y < area.br().y; ++y) {
    for (int x = area.x; x < area.br().x; ++x) {
      const cv::Vec4b in = scene.at<cv::Vec4b>(y, x), out = keyed.at<cv::Vec4b>(y, x);
      const int alpha = out[3];
      const bool screen = isScreen.at<uchar>(y, x), edge = nearScreen.at<uchar>(y, x);
      if (screen) {
        ++m.screen;
        m.screenNotClear += alpha != 0;
      } else if (!edge) {
        ++m.interior;
        m.interiorNotOpaque += alpha != 255;
        for (int c = 0; c < 3; ++c) {
          m.worstInteriorChange = std::max(m.worstInteriorChange, std::abs(out[c] - in[c]));
        }
      }
      if (alpha > 0 && alpha < 255) {
        ++m.intermediate;
        m.intermediateAway += screen || !edge;
      }
      if (alpha > 0) {
        const int others = std::max(out[(castChannel + 1) % 3], out[(castChannel + 2) % 3]);
        m.worstCast = std::max(m.worstCast, out[castChannel] - others);
      }
    }
  }
  return m;
}

void ExpectCleanMatte(const Matte& m, int maxIntermediate) {
  EXPECT_GT(m.screen, 0);
  EXPECT_GT(m.interior, 0);
  EXPECT_EQ(m.screenNotClear, 0) << "of " << m.screen << " screen pixels";
  EXPECT_EQ(m.interiorNotOpaque, 0) << "of " << m.interior << " subject pixels";
  EXPECT_EQ(m.intermediateAway, 0) << "of " << m.intermediate << " soft pixels";
  EXPECT_LE(m.intermediate, maxIntermediate);
  EXPECT_LE(m.worstCast, 3);
  EXPECT_LE(m.worstInteriorChange, 2);
}

TEST(ChromeKeyChain, KeysTheDemoGreenScreenCleanly) {
  const cv::Mat scene = tfxtool::MakeDemoScene(960, 540);
  const tfxtool::Rgb screen = tfxtool::DemoScreenColour();
  const cv::Mat keyed = Key(scene, screen.r, screen.g, screen.b);
  // The screen and the figure in front of it; the figure stays clear of the right edge.
  const Matte m = Judge(scene, keyed, cv::Rect(480, 48, 480, 372), 959, 1);
  // The figure's outline is about 1000 pixels long; a one-pixel soft edge stays below that.
  ExpectCleanMatte(m, 1000);

  // Patches whose hue is far from the screen's are kept and come back as they were: skin,
  // primaries and secondaries away from green, neutrals.
  for (int i : {0, 1, 2, 3, 6, 8, 9, 10, 12, 13, 14, 15, 16, 17}) {
    SCOPED_TRACE(i);
    const cv::Point centre(4 + (i % 6) * 79 + 37, 52 + (i / 6) * 82 + 39);
    const cv::Vec4b in = scene.at<cv::Vec4b>(centre), out = keyed.at<cv::Vec4b>(centre);
    EXPECT_EQ(out[3], 255);
    for (int c = 0; c < 3; ++c) EXPECT_NEAR(out[c], in[c], 2);
  }
}

TEST(ChromeKeyChain, KeysABlueScreenCleanly) {
  const cv::Scalar screen(200, 60, 30, 255);  // B, G, R, A
  cv::Mat scene(180, 320, CV_8UC4);
  for (int y = 0; y < scene.rows; ++y) {  // lit a little unevenly from top to bottom
    const double light = 0.95 + 0.1 * y / (scene.rows - 1);
    scene.row(y).setTo(cv::Scalar(screen[0] * light, screen[1] * light, screen[2] * light, 255));
  }
  const int aa = cv::LINE_AA;
  cv::circle(scene, {80, 90}, 50, cv::Scalar(138, 170, 222, 255), cv::FILLED, aa);  // skin
  cv::rectangle(scene, cv::Rect(150, 30, 60, 120), cv::Scalar(128, 128, 128, 255), cv::FILLED);
  cv::ellipse(scene, {260, 60}, {35, 22}, 30, 0, 360, cv::Scalar(30, 200, 230, 255), cv::FILLED,
              aa);                                                                   // yellow
  cv::circle(scene, {260, 130}, 28, cv::Scalar(36, 30, 220, 255), cv::FILLED, aa);   // red
  cv::circle(scene, {180, 90}, 14, cv::Scalar(240, 245, 245, 255), cv::FILLED, aa);  // white
  const cv::Mat keyed = Key(scene, 30, 60, 200);
  // About 700 pixels of outline.
  ExpectCleanMatte(Judge(scene, keyed, cv::Rect(0, 0, 320, 180), 0, 0), 700);
}

}  // namespace
