// Pictures the demo makes itself, so that it needs no files and every run gives the same bytes.
#pragma once

#include <opencv2/core.hpp>
#include <string>
#include <vector>

namespace tfxtool {

// An opaque BGRA test scene: a hue band, colour patches with skin tones, horizontal and vertical
// gradients, grey ramps and a green screen with a figure in front of it. Laid out for 960x540;
// other sizes scale the layout.
cv::Mat MakeDemoScene(int width, int height);

// The key colour of the scene's green screen, as red, green, blue.
struct Rgb {
  int r, g, b;
};
Rgb DemoScreenColour();

// A ".cube" 3D LUT text of `size` points per axis with a warm-highlights, cool-shadows look.
std::string MakeDemoLut(int size);

struct SheetTile {
  std::string title;
  std::string caption;
  cv::Mat image;  // BGRA
};

// Tiles in a grid, each reduced to a common width over a checkerboard (so transparency shows)
// with its title and caption underneath.
cv::Mat MakeContactSheet(const std::string& heading, const std::vector<SheetTile>& tiles);

}  // namespace tfxtool
