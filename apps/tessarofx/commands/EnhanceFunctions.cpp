// The enhancement library in the fx table: blurs, denoisers, detail and haze filters, the
// white-balance measures and the compositing functions.
//
// Plane functions run once on each of the blue, green and red planes and keep alpha; grey
// results (the dark channel, the haze veil) come out as opaque grey. Compositing functions that
// make a new buffer replace the image with it, so the output may differ in size from the input.
// Functions that work on plain buffers rather than a CxImage get the image's own packed rows.
#include <cstdio>
#include <cstring>
#include <memory>
#include <opencv2/imgproc.hpp>

#include "commands/FxSupport.h"
#include "tessarofx/Blur.h"
#include "tessarofx/Compositing.h"
#include "tessarofx/Denoise.h"
#include "tessarofx/DetailFilters.h"
#include "tessarofx/WhiteBalanceEstimate.h"

namespace tfxtool {
namespace {

// The buffer functions take packed rows; a Mat from the image reader is packed already.
cv::Mat Packed(const cv::Mat& m) { return m.isContinuous() ? m : m.clone(); }

template <CxImage* (*Fn)(CxImage*, float, float)>
Status RunImageFloat2(const FxContext& fx) {
  WrappedImage image(fx.image);
  Fn(image.get(), ArgF(fx, 0), ArgF(fx, 1));
  return Status::Ok();
}

// gaussianBlur on the BGRA rows themselves: 4 channels, colour held at or below alpha.
Status RunBgraBlur(const FxContext& fx) {
  *fx.image = Packed(*fx.image);
  gaussianBlur(fx.image->data, fx.image->cols, fx.image->rows, 4, ArgI(fx, 0));
  return Status::Ok();
}

Status RunStackPass(const FxContext& fx) {
  *fx.image = Packed(*fx.image);
  stackblur(fx.image->data, static_cast<unsigned>(fx.image->cols),
            static_cast<unsigned>(fx.image->rows), 4, static_cast<unsigned>(ArgI(fx, 0)),
            ArgI(fx, 1));
  return Status::Ok();
}

// fastAverageBlur on three channels: with four it would blur blue alone.
Status RunBgrBlur(const FxContext& fx) {
  cv::Mat bgr;
  cv::cvtColor(*fx.image, bgr, cv::COLOR_BGRA2BGR);
  fastAverageBlur(bgr.data, bgr.cols, bgr.rows, 3, ArgI(fx, 0));
  const int fromTo[] = {0, 0, 1, 1, 2, 2};
  cv::mixChannels(&bgr, 1, fx.image, 1, fromTo, 3);
  return Status::Ok();
}

// Runs `each` on the blue, green and red planes in turn, each packed (stride = width), and puts
// the results back; alpha is kept.
template <class Each>
void OnColourPlanes(cv::Mat* bgra, Each each) {
  for (int c = 0; c < 3; ++c) {
    cv::Mat plane;
    cv::extractChannel(*bgra, plane, c);
    cv::Mat out = plane.clone();
    each(plane, out);
    cv::insertChannel(out, *bgra, c);
  }
}

template <void (*Fn)(const unsigned char*, unsigned char*, int, int, int)>
Status RunWindow(const FxContext& fx) {
  OnColourPlanes(fx.image, [&](const cv::Mat& in, cv::Mat& out) {
    Fn(in.data, out.data, in.cols, in.rows, ArgI(fx, 0));
  });
  return Status::Ok();
}

Status RunPercentile(const FxContext& fx) {
  OnColourPlanes(fx.image, [&](const cv::Mat& in, cv::Mat& out) {
    fastFilter(in.data, out.data, in.cols, in.rows, ArgI(fx, 0), ArgF(fx, 1));
  });
  return Status::Ok();
}

Status RunDct(const FxContext& fx) {
  OnColourPlanes(fx.image, [&](const cv::Mat& in, cv::Mat& out) {
    dct_Denosing(in.data, out.data, in.cols, in.rows, in.cols, ArgF(fx, 0));
  });
  return Status::Ok();
}

Status RunPlaneDenoise(const FxContext& fx) {
  OnColourPlanes(fx.image, [&](const cv::Mat&, cv::Mat& out) {
    channelDenoise(out.data, out.cols, out.rows, ArgI(fx, 0), ArgF(fx, 1));
  });
  return Status::Ok();
}

// A plane the library allocated with array new; the tool frees it with delete[], as the
// functions' headers ask.
using PluginPlane = std::unique_ptr<unsigned char[]>;

void ShowGrey(const unsigned char* plane, cv::Mat* bgra) {
  const cv::Mat grey(bgra->rows, bgra->cols, CV_8UC1, const_cast<unsigned char*>(plane));
  cv::cvtColor(grey, *bgra, cv::COLOR_GRAY2BGRA);
}

Status DarkChannel(const FxContext& fx, PluginPlane* dark) {
  WrappedImage image(fx.image);
  dark->reset(getMinDarkChannel(image.get(), nullptr, nullptr));
  return *dark ? Status::Ok() : Status::Error("getMinDarkChannel made no plane");
}

Status RunDarkChannel(const FxContext& fx) {
  PluginPlane dark;
  if (Status s = DarkChannel(fx, &dark); !s.ok()) return s;
  ShowGrey(dark.get(), fx.image);
  return Status::Ok();
}

// The veil dehaze subtracts: the dark channel against its 15 x 15 mean times FACTOR.
Status RunHazeVeil(const FxContext& fx) {
  PluginPlane dark;
  if (Status s = DarkChannel(fx, &dark); !s.ok()) return s;
  const int w = fx.image->cols, h = fx.image->rows;
  std::vector<unsigned char> averaged(static_cast<size_t>(w) * h);
  fastWindowAverageFilter(dark.get(), averaged.data(), w, h, 7);
  const PluginPlane result(calL(dark.get(), averaged.data(), w, h, ArgF(fx, 0)));
  if (!result) return Status::Error("calL made no plane");
  ShowGrey(result.get(), fx.image);
  return Status::Ok();
}

std::string Line(const char* format, double a, double b = 0, double c = 0) {
  char text[160];
  std::snprintf(text, sizeof text, format, a, b, c);
  return text;
}

// The mean colour and what the colour-science steps make of it.
Status RunWhitePoint(const FxContext& fx) {
  const cv::Mat px = Packed(*fx.image);
  const int w = px.cols, h = px.rows;
  const unsigned char r = channelMean(px.data, w, h, 2), g = channelMean(px.data, w, h, 1),
                      b = channelMean(px.data, w, h, 0);
  float X = 0, Y = 0, Z = 0, x = 0, y = 0, Yxy = 0;
  rgb2xyz(r, g, b, X, Y, Z);
  xyz2xy(X, Y, Z, x, y, Yxy);
  const int64_t mireds = xy_to_CCT_Hernandez1999(x, y);
  *fx.report += Line("mean colour (channelMean)      R %.0f G %.0f B %.0f\n", r, g, b);
  *fx.report += Line("XYZ (rgb2xyz)                  %.6f %.6f %.6f\n", X, Y, Z);
  *fx.report += Line("xy (xyz2xy)                    %.6f %.6f\n", x, y);
  *fx.report +=
      Line("reciprocal CCT (xy_to_CCT_Hernandez1999)  %.0f mired\n", static_cast<double>(mireds));
  *fx.report += Line("black-body match (rgb2temperature)        %.0f K\n",
                     static_cast<double>(rgb2temperature(r, g, b)));
  return Status::Ok();
}

// How far the second image moved from the first, in slider units.
Status RunWhiteBalanceRates(const FxContext& fx) {
  if (fx.second->size() != fx.image->size()) {
    return Status::Error("the corrected image must have the source's size");
  }
  const cv::Mat src = Packed(*fx.image), corrected = Packed(*fx.second);
  *fx.report +=
      Line("temperature change (getAutoWhiteBalanceCCTChangeRate)   %.2f\n",
           getAutoWhiteBalanceCCTChangeRate(src.data, corrected.data, src.cols, src.rows));
  *fx.report +=
      Line("tint change (getAutoWhiteBalanceTintChangeRate)         %.2f\n",
           getAutoWhiteBalanceTintChangeRate(src.data, corrected.data, src.cols, src.rows));
  return Status::Ok();
}

// The placeholder copies one row into a transparent black image.
Status RunCopyRow(const FxContext& fx) {
  cv::Mat src = Packed(*fx.image);
  cv::Mat dst = cv::Mat::zeros(src.size(), CV_8UC4);
  doAutoWhiteBalance(src.data, dst.data, src.cols, src.rows);
  *fx.image = dst;
  return Status::Ok();
}

// Takes over a buffer the plug-in made (w x h BGRA, array new) as the image.
Status TakeBuffer(unsigned char* buffer, int w, int h, cv::Mat* image) {
  const PluginPlane owned(buffer);
  if (!buffer || w < 1 || h < 1) return Status::Error("no image was made");
  cv::Mat(h, w, CV_8UC4, buffer).copyTo(*image);
  return Status::Ok();
}

PIPNLERGB Colour(const FxContext& fx) {
  return PIPNLERGB{ArgI(fx, 0), ArgI(fx, 1), ArgI(fx, 2), ArgI(fx, 3)};
}

// The outcome of a function that makes a buffer: on success the buffer becomes the image; on
// failure whatever it allocated is freed.
Status Adopt(const FxContext& fx, int ok, unsigned char* out, int w, int h) {
  if (!ok) {
    delete[] out;
    return Status::Error(std::string(fx.function.function) + " failed");
  }
  return TakeBuffer(out, w, h, fx.image);
}

Status RunFrame(const FxContext& fx) {
  const cv::Mat src = Packed(*fx.image);
  unsigned char* out = nullptr;
  int w = 0, h = 0;
  const int ok = makeImageFrame(&out, &w, &h, src.data, src.cols, src.rows,
                                static_cast<int>(src.step[0]), 32, Colour(fx), ArgI(fx, 4));
  return Adopt(fx, ok, out, w, h);
}

Status RunScaleAlpha(const FxContext& fx) {
  const cv::Mat src = Packed(*fx.image);
  unsigned char* out = nullptr;
  int w = 0, h = 0;
  const int ok =
      scaleImage(&out, &w, &h, src.data, src.cols, src.rows, 32, Colour(fx), ArgI(fx, 4));
  return Adopt(fx, ok, out, w, h);
}

Status RunPadBlur(const FxContext& fx) {
  const cv::Mat src = Packed(*fx.image);
  unsigned char* out = nullptr;
  int w = 0, h = 0;
  const int ok = blurImage(&out, &w, &h, src.data, src.cols, src.rows, 32, ArgI(fx, 0));
  return Adopt(fx, ok, out, w, h);
}

// The second image over the first at (X, Y), top-down as images are read; the function itself
// counts rows bottom-up, so both go in flipped.
Status RunMerge(const FxContext& fx) {
  cv::Mat dst, src;
  cv::flip(*fx.image, dst, 0);
  cv::flip(*fx.second, src, 0);
  if (!mergeImage(dst.data, src.data, dst.cols, dst.rows, src.cols, src.rows,
                  static_cast<int>(src.step[0]), ArgI(fx, 0), ArgI(fx, 1), -1, -1, 0, 0,
                  ArgI(fx, 2), ArgI(fx, 3))) {
    return Status::Error("mergeImage failed");
  }
  cv::flip(dst, *fx.image, 0);
  return Status::Ok();
}

Status RunClip(const FxContext& fx) {
  const cv::Mat src = Packed(*fx.image);
  const int w = ArgI(fx, 0), h = ArgI(fx, 1);
  if (w > src.cols || h > src.rows) {
    return Status::Error("clip " + std::to_string(w) + "x" + std::to_string(h) +
                         " is larger than the image, " + std::to_string(src.cols) + "x" +
                         std::to_string(src.rows));
  }
  cv::Mat dst(h, w, CV_8UC4);
  if (!clipOutBorder(src.data, dst.data, src.cols, src.rows, static_cast<int>(src.step[0]), w, h,
                     static_cast<int>(dst.step[0]))) {
    return Status::Error("clipOutBorder failed");
  }
  *fx.image = dst;
  return Status::Ok();
}

const std::vector<FxArg> kColourArgs = {
    {"RED", 0, 255}, {"GREEN", 0, 255}, {"BLUE", 0, 255}, {"ALPHA", 0, 255}};

std::vector<FxArg> ColourAnd(FxArg last) {
  std::vector<FxArg> args = kColourArgs;
  args.push_back(last);
  return args;
}

}  // namespace

const std::vector<ImageFunction>& EnhanceFunctions() {
  static const std::vector<ImageFunction> kFunctions = {
      {"blur",
       "gaussianBlur",
       RunBgraBlur,
       {{"RADIUS", 1, 254}},
       "Stack Blur, rows then columns; colour stays at or below alpha (premultiplied)"},
      {"stack-pass",
       "stackblur",
       RunStackPass,
       {{"RADIUS", 0, 255}, {"PASS", 1, 2}},
       "one Stack Blur pass: 1 along rows, 2 along columns"},
      {"box-blur",
       "fastAverageBlur",
       RunBgrBlur,
       {{"RADIUS", 1, 1000}},
       "box blur of the colours (2r+1)^2; needs an image taller than the radius"},
      {"window-mean",
       "fastWindowAverageFilter",
       RunWindow<&fastWindowAverageFilter>,
       {{"RADIUS", 0, 1000}},
       "each colour plane: mean of the window clipped to the image"},
      {"window-variance",
       "fastWindowVarianceFilter",
       RunWindow<&fastWindowVarianceFilter>,
       {{"RADIUS", 0, 1000}},
       "each colour plane: window variance, low byte (above 255 it wraps)"},
      {"percentile",
       "fastFilter",
       RunPercentile,
       {{"RADIUS", 0, 1000}, {"PERCENTILE", 0, 1}},
       "each colour plane: 0 minimum, 0.5 median, 1 maximum (its 8-bit counts wrap above radius "
       "7)"},
      {"denoise",
       "deNoiseRGB",
       RunImageFloat<&deNoiseRGB>,
       {{"STRENGTH", 0, 1000}},
       "8x8 DCT threshold denoise of R, G, B; sigma = 0.15 strength"},
      {"denoise-hsl",
       "deNoiseLumiance",
       RunImageFloat<&deNoiseLumiance>,
       {{"STRENGTH", 0, 1000}},
       "the same on hue, saturation and lightness"},
      {"dct-denoise",
       "dct_Denosing",
       RunDct,
       {{"SIGMA", 0, 1000}},
       "each colour plane: DCT threshold 3 sigma; the last 8 rows and columns pass through"},
      {"local-denoise",
       "channelDenoise",
       RunPlaneDenoise,
       {{"WINDOW", 1, 1001}, {"NOISE", 0, 65025}},
       "each colour plane: local mean/variance (Lee) filter"},
      {"dehaze",
       "dehaze",
       RunImageFloat<&dehaze>,
       {{"STRENGTH", -100, 100}},
       "above 0 removes haze (dark channel), below 0 adds it"},
      {"dark-channel",
       "getMinDarkChannel",
       RunDarkChannel,
       {},
       "grey: the smallest of each pixel's colour bytes"},
      {"haze-veil",
       "calL",
       RunHazeVeil,
       {{"FACTOR", 0, 1}},
       "grey: min(dark channel, its 15x15 mean x FACTOR), the veil dehaze removes",
       1,
       true,
       {"getMinDarkChannel", "fastWindowAverageFilter"}},
      {"sharpen",
       "sharpen",
       RunImageFloat<&sharpen>,
       {{"AMOUNT", -1000, 1000}},
       "Laplacian by AMOUNT/255; the result sits one pixel to the right"},
      {"clarity",
       "clarity",
       RunImageFloat<&clarity>,
       {{"AMOUNT", -300, 300}},
       "unsharp mask, radius AMOUNT/2; below 0 softens"},
      {"diffuse",
       "diffuse",
       RunImageFloat<&diffuse>,
       {{"AMOUNT", -1440, 1440}},
       "brightens by 1+|sin(pi a/1440)|; above 0 also a radius-1 blur"},
      {"grain",
       "addNoiseFilter",
       RunImageFloat2<&addNoiseFilter>,
       {{"AMOUNT", -1000, 1000}, {"FACTOR", -1000, 1000}},
       "monochrome grain of AMOUNT% x FACTOR%, the same on every call"},
      {"white-point",
       "channelMean",
       RunWhitePoint,
       {},
       "prints the mean colour, its XYZ, xy, reciprocal CCT and black-body match (no OUTPUT)",
       1,
       false,
       {"rgb2xyz", "xyz2xy", "xy_to_CCT_Hernandez1999", "rgb2temperature"}},
      {"wb-rates",
       "getAutoWhiteBalanceCCTChangeRate",
       RunWhiteBalanceRates,
       {},
       "prints the temperature and tint change from INPUT to CORRECTED (no OUTPUT)",
       2,
       false,
       {"getAutoWhiteBalanceTintChangeRate"},
       "CORRECTED"},
      {"first-row",
       "doAutoWhiteBalance",
       RunCopyRow,
       {},
       "the balance placeholder: copies the first row into a transparent image"},
      {"frame", "makeImageFrame", RunFrame, ColourAnd({"BORDER", 0, 200}),
       "an outline BORDER wide around the opaque part (alpha > 50), on a canvas 2 BORDER larger; "
       "RED lands in byte 0 (blue in BGRA), BLUE in byte 2"},
      {"scale-alpha", "scaleImage", RunScaleAlpha, ColourAnd({"BORDER", 0, 1000}),
       "the colour with the image's alpha, on a canvas 2 BORDER larger"},
      {"merge",
       "mergeImage",
       RunMerge,
       {{"X", -100000, 100000}, {"Y", -100000, 100000}, {"OVER%", 0, 100}, {"UNDER%", 0, 100}},
       "OVERLAY over INPUT at (X, Y), each alpha scaled by its opacity",
       2,
       true,
       {},
       "OVERLAY"},
      {"clip",
       "clipOutBorder",
       RunClip,
       {{"WIDTH", 1, 100000}, {"HEIGHT", 1, 100000}},
       "the centred WIDTH x HEIGHT block"},
      {"pad-blur",
       "blurImage",
       RunPadBlur,
       {{"RADIUS", 0, 500}},
       "pads by RADIUS with the edge pixels and box-blurs, fading out at the edge"},
  };
  return kFunctions;
}

}  // namespace tfxtool
