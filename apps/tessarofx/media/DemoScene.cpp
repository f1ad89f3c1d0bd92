#include "media/DemoScene.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <opencv2/imgproc.hpp>

namespace tfxtool {
namespace {

constexpr int kBaseWidth = 960;
constexpr int kBaseHeight = 540;
constexpr double kPi = 3.14159265358979323846;

cv::Scalar Bgra(int r, int g, int b) { return cv::Scalar(b, g, r, 255); }

// Patches chosen to exercise the adjustments: four skin tones, natural colours (sky, foliage),
// saturated primaries and secondaries that clip first, and neutrals that must stay neutral.
const Rgb kPatches[18] = {
    {92, 60, 48},    {160, 110, 85}, {198, 148, 122}, {234, 196, 176}, {98, 122, 157},
    {87, 108, 67},   {214, 40, 40},  {40, 170, 60},   {40, 70, 200},   {230, 200, 30},
    {200, 60, 170},  {30, 170, 200}, {235, 130, 30},  {100, 60, 160},  {245, 245, 240},
    {128, 128, 128}, {60, 60, 60},   {12, 12, 12},
};

void DrawGradient(cv::Mat& img, cv::Rect r, Rgb from, Rgb to, bool vertical) {
  for (int y = r.y; y < r.y + r.height; ++y) {
    cv::Vec4b* row = img.ptr<cv::Vec4b>(y);
    for (int x = r.x; x < r.x + r.width; ++x) {
      const double t =
          vertical ? double(y - r.y) / (r.height - 1) : double(x - r.x) / (r.width - 1);
      auto mix = [t](int a, int b) { return cv::saturate_cast<uchar>(a + (b - a) * t); };
      row[x] = cv::Vec4b(mix(from.b, to.b), mix(from.g, to.g), mix(from.r, to.r), 255);
    }
  }
}

void DrawFigure(cv::Mat& img) {
  const int lineAA = cv::LINE_AA;
  // Shoulders and shirt, neck, head, hair: skin and hair against green are what keyers get wrong.
  cv::ellipse(img, cv::Point(720, 400), cv::Size(150, 120), 0, 180, 360, Bgra(40, 64, 150),
              cv::FILLED, lineAA);
  cv::rectangle(img, cv::Rect(700, 250, 40, 50), Bgra(205, 150, 120), cv::FILLED, lineAA);
  cv::ellipse(img, cv::Point(720, 215), cv::Size(58, 72), 0, 0, 360, Bgra(222, 170, 138),
              cv::FILLED, lineAA);
  cv::ellipse(img, cv::Point(720, 190), cv::Size(62, 52), 0, 180, 360, Bgra(60, 38, 24), cv::FILLED,
              lineAA);
  // Eyes and a red ball held to one side.
  cv::circle(img, cv::Point(700, 215), 6, Bgra(40, 30, 30), cv::FILLED, lineAA);
  cv::circle(img, cv::Point(740, 215), 6, Bgra(40, 30, 30), cv::FILLED, lineAA);
  cv::circle(img, cv::Point(560, 330), 34, Bgra(220, 30, 36), cv::FILLED, lineAA);
  cv::circle(img, cv::Point(550, 318), 9, Bgra(250, 170, 170), cv::FILLED, lineAA);
}

}  // namespace

Rgb DemoScreenColour() { return {40, 200, 60}; }

cv::Mat MakeDemoScene(int width, int height) {
  cv::Mat img(kBaseHeight, kBaseWidth, CV_8UC4, Bgra(40, 40, 40));

  // Hue band across the top.
  cv::Mat hsv(48, kBaseWidth, CV_8UC3);
  for (int x = 0; x < kBaseWidth; ++x) {
    const uchar hue = static_cast<uchar>(x * 180 / kBaseWidth);
    for (int y = 0; y < 48; ++y) hsv.at<cv::Vec3b>(y, x) = cv::Vec3b(hue, 255, 255);
  }
  cv::Mat bgr, bgra;
  cv::cvtColor(hsv, bgr, cv::COLOR_HSV2BGR);
  cv::cvtColor(bgr, bgra, cv::COLOR_BGR2BGRA);
  bgra.copyTo(img(cv::Rect(0, 0, kBaseWidth, 48)));

  for (int i = 0; i < 18; ++i) {
    const cv::Rect cell(4 + (i % 6) * 79, 52 + (i / 6) * 82, 75, 78);
    cv::rectangle(img, cell, Bgra(kPatches[i].r, kPatches[i].g, kPatches[i].b), cv::FILLED);
  }

  DrawGradient(img, cv::Rect(0, 300, 240, 120), {120, 170, 230}, {240, 150, 70}, true);
  DrawGradient(img, cv::Rect(240, 300, 240, 120), {170, 20, 30}, {20, 200, 210}, false);

  // The screen is a little uneven, as lit screens are, so a key has to tolerate a range.
  const Rgb key = DemoScreenColour();
  for (int y = 48; y < 420; ++y) {
    const double light = 1.0 + 0.06 * std::sin((y - 48) * kPi / 372.0) - 0.03;
    for (int x = 480; x < kBaseWidth; ++x) {
      img.at<cv::Vec4b>(y, x) = cv::Vec4b(cv::saturate_cast<uchar>(key.b * light),
                                          cv::saturate_cast<uchar>(key.g * light),
                                          cv::saturate_cast<uchar>(key.r * light), 255);
    }
  }
  DrawFigure(img);

  for (int x = 0; x < kBaseWidth; ++x) {
    const uchar ramp = static_cast<uchar>(x * 256 / kBaseWidth);
    const uchar step = static_cast<uchar>(std::min(255, (x * 16 / kBaseWidth) * 17));
    for (int y = 420; y < 480; ++y) img.at<cv::Vec4b>(y, x) = cv::Vec4b(ramp, ramp, ramp, 255);
    for (int y = 480; y < kBaseHeight; ++y) {
      img.at<cv::Vec4b>(y, x) = cv::Vec4b(step, step, step, 255);
    }
  }

  if (width == kBaseWidth && height == kBaseHeight) return img;
  cv::Mat scaled;
  cv::resize(img, scaled, cv::Size(width, height), 0, 0, cv::INTER_AREA);
  return scaled;
}

std::string MakeDemoLut(int size) {
  std::string text =
      "TITLE \"warm highlights, cool shadows\"\nLUT_3D_SIZE " + std::to_string(size) + "\n";
  char line[96];
  // Red varies fastest, as the format requires.
  for (int b = 0; b < size; ++b) {
    for (int g = 0; g < size; ++g) {
      for (int r = 0; r < size; ++r) {
        double c[3] = {double(r) / (size - 1), double(g) / (size - 1), double(b) / (size - 1)};
        const double luma = 0.2126 * c[0] + 0.7152 * c[1] + 0.0722 * c[2];
        for (double& v : c) v = 0.75 * v + 0.25 * v * v * (3 - 2 * v);  // gentle S-curve
        c[0] += 0.07 * luma - 0.04 * (1 - luma);
        c[2] += 0.06 * (1 - luma) - 0.06 * luma;
        for (double& v : c) v = std::clamp(v, 0.0, 1.0);
        std::snprintf(line, sizeof line, "%.6f %.6f %.6f\n", c[0], c[1], c[2]);
        text += line;
      }
    }
  }
  return text;
}

cv::Mat MakeContactSheet(const std::string& heading, const std::vector<SheetTile>& tiles) {
  constexpr int kTileWidth = 320;
  constexpr int kMargin = 12;
  constexpr int kLabel = 40;
  constexpr int kHeading = 44;
  const int columns = std::max(1, std::min(4, static_cast<int>(tiles.size())));
  const int rows = (static_cast<int>(tiles.size()) + columns - 1) / columns;
  const int tileHeight =
      tiles.empty() ? 180 : std::max(1, tiles[0].image.rows * kTileWidth / tiles[0].image.cols);
  const int cellHeight = tileHeight + kLabel;
  cv::Mat sheet(kHeading + rows * (cellHeight + kMargin) + kMargin,
                columns * (kTileWidth + kMargin) + kMargin, CV_8UC4, Bgra(28, 28, 30));
  const int font = cv::FONT_HERSHEY_SIMPLEX;
  cv::putText(sheet, heading, cv::Point(kMargin, 30), font, 0.7, Bgra(240, 240, 240), 2,
              cv::LINE_AA);

  for (size_t i = 0; i < tiles.size(); ++i) {
    const int x = kMargin + static_cast<int>(i % columns) * (kTileWidth + kMargin);
    const int y = kHeading + static_cast<int>(i / columns) * (cellHeight + kMargin);
    cv::Mat thumb;
    cv::resize(tiles[i].image, thumb, cv::Size(kTileWidth, tileHeight), 0, 0, cv::INTER_AREA);
    // Over a checkerboard, so that what a keyer made transparent is visible as such.
    cv::Mat cell = sheet(cv::Rect(x, y, kTileWidth, tileHeight));
    for (int ty = 0; ty < tileHeight; ++ty) {
      for (int tx = 0; tx < kTileWidth; ++tx) {
        const cv::Vec4b p = thumb.at<cv::Vec4b>(ty, tx);
        const int check = ((tx / 8 + ty / 8) % 2) ? 200 : 150;
        cv::Vec4b& d = cell.at<cv::Vec4b>(ty, tx);
        for (int c = 0; c < 3; ++c)
          d[c] = static_cast<uchar>((p[c] * p[3] + check * (255 - p[3])) / 255);
        d[3] = 255;
      }
    }
    cv::putText(sheet, tiles[i].title, cv::Point(x, y + tileHeight + 17), font, 0.5,
                Bgra(240, 240, 240), 1, cv::LINE_AA);
    // Long captions shrink to fit the tile rather than running into the next one.
    double scale = 0.4;
    int baseline = 0;
    while (scale > 0.25 &&
           cv::getTextSize(tiles[i].caption, font, scale, 1, &baseline).width > kTileWidth) {
      scale -= 0.025;
    }
    cv::putText(sheet, tiles[i].caption, cv::Point(x, y + tileHeight + 34), font, scale,
                Bgra(170, 200, 230), 1, cv::LINE_AA);
  }
  return sheet;
}

}  // namespace tfxtool
