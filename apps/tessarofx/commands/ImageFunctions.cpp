#include "commands/ImageFunctions.h"

#include <memory>
#include <opencv2/imgproc.hpp>

#include "commands/FxSupport.h"
#include "media/Text.h"
#include "plugin/FilterTable.h"
#include "tessarofx/ColorAdjust.h"
#include "tessarofx/CxImage.h"
#include "tessarofx/HSLAdjust.h"
#include "tessarofx/HueAdjust.h"
#include "tessarofx/LensAdjust.h"
#include "tessarofx/LightAdjust.h"
#include "tessarofx/Vignette.h"
#include "tessarofx/WhiteBalance.h"

namespace tfxtool {
namespace {

// Calls an image-making function with the input's size and copies the new image, read pixel by
// pixel, into the image (opaque). Such images are 24-bit and tagged RGB.
template <CxImage* (*Fn)(int, int)>
Status RunNewImage(const FxContext& fx) {
  cv::Mat& bgra = *fx.image;
  const std::unique_ptr<CxImage> made(Fn(bgra.cols, bgra.rows));
  if (!made) return Status::Error(std::string(fx.function.function) + " made no image");
  for (int y = 0; y < bgra.rows; ++y) {
    uint8_t* row = bgra.ptr<uint8_t>(y);
    for (int x = 0; x < bgra.cols; ++x) {
      const tagRGBQUAD c =
          made->GetPixelColor(static_cast<unsigned long>(x), static_cast<unsigned long>(y), false);
      // Made images store blue, green, red under an RGB tag, so the reader's red is blue.
      row[4 * x] = c.rgbRed;
      row[4 * x + 1] = c.rgbGreen;
      row[4 * x + 2] = c.rgbBlue;
      row[4 * x + 3] = 255;
    }
  }
  return Status::Ok();
}

Status RunTemperature(const FxContext& fx) {
  WrappedImage image(fx.image);
  temperatureAdjustment(image.get(), static_cast<long>(fx.values[0]));
  return Status::Ok();
}

Status RunVignette(const FxContext& fx) {
  WrappedImage image(fx.image);
  vignetteAdjustFilter(image.get(), ArgF(fx, 0), ArgF(fx, 1), ArgF(fx, 2), ArgF(fx, 3), ArgF(fx, 4),
                       ArgF(fx, 5));
  return Status::Ok();
}

Status RunHslBand(const FxContext& fx) {
  WrappedImage image(fx.image);
  HSLBands bands{};
  bands.band[ArgI(fx, 0)] =
      HSLBandValues{ArgF(fx, 1), ArgF(fx, 2), ArgF(fx, 3), ArgF(fx, 4), ArgF(fx, 5)};
  hslAdjustment(image.get(), bands);
  return Status::Ok();
}

}  // namespace

const std::vector<ImageFunction>& ImageFunctions() {
  // Ranges: where each function's arithmetic is defined. Brightness divides by b/253 + 0.99,
  // which reaches zero near -250.5; contrast divides by 1 - c/255.
  static const std::vector<ImageFunction> kFunctions = [] {
    std::vector<ImageFunction> all = {
        {"exposure",
         "exposureAdjustment",
         RunImageFloat<&exposureAdjustment>,
         {{"VALUE", -1000, 1000}},
         "gain 2^(v*0.012): +50 = x1.52"},
        {"brightness",
         "brightnessAdjustment",
         RunImageFloat<&brightnessAdjustment>,
         {{"VALUE", -250, 1000}},
         "above 0 scales by 1+v/100, below 0 subtracts"},
        {"contrast",
         "contrastAdjustment",
         RunImageFloat<&contrastAdjustment>,
         {{"VALUE", -1000, 254}},
         "above 0 stretches away from mid grey, below 0 flattens"},
        {"vibrance",
         "vibranceAdjustment",
         RunImageFloat<&vibranceAdjustment>,
         {{"VALUE", -1000, 1000}},
         "saturates muted colours more than vivid ones"},
        {"saturation",
         "saturationAdjustment",
         RunImageFloat<&saturationAdjustment>,
         {{"VALUE", -1000, 1000}},
         "-100 gives grey, above 0 strengthens colour"},
        {"highlight",
         "hdrHighlight",
         RunImageFloat<&hdrHighlight>,
         {{"VALUE", -100, 100}},
         "brightens (or darkens) pixels by their brightest channel"},
        {"shadow",
         "hdrShadow",
         RunImageFloat<&hdrShadow>,
         {{"VALUE", -100, 100}},
         "lifts (or deepens) dark pixels; the lift is 4x the cut"},
        {"white-level",
         "hdrWhiteLevel",
         RunImageFloat<&hdrWhiteLevel>,
         {{"VALUE", -100, 100}},
         "moves the white point: above 0 the curve is applied twice"},
        {"black-level",
         "hdrBlackLevel",
         RunImageFloat<&hdrBlackLevel>,
         {{"VALUE", -100, 100}},
         "moves the black point, weighted towards dark pixels"},
        {"auto-white",
         "whiteBalanceAdjustment",
         RunImageFloat<&whiteBalanceAdjustment>,
         {{"VALUE", -500, 500}},
         "scales channels so the brightest v/500 of the pixels average to white"},
        {"temperature",
         "temperatureAdjustment",
         RunTemperature,
         {{"VALUE", 0, 30000}},
         "tints towards a black-body colour; 11500 is neutral, the mapping jumps there"},
        {"tint",
         "tintAdjustment",
         RunImageFloat<&tintAdjustment>,
         {{"VALUE", -100, 100}},
         "above 0 towards magenta, below 0 towards green"},
        {"temperature-colors",
         "createTemperateColor",
         RunNewImage<&createTemperateColor>,
         {},
         "a black-body gradient of the input's size, 30000 K down by 100 K a column"},
        {"vignette",
         "vignetteAdjustFilter",
         RunVignette,
         {{"AMOUNT", -100, 100},
          {"FEATHER", 0, 100},
          {"HIGHLIGHTS", 0, 100},
          {"SIZE", 0, 100},
          {"ROUNDNESS", -100, 100},
          {"EXPOSURE", -100, 100}},
         "darkens or lightens outside a centred ellipse (arguments in the function's order)"},
        {"distort",
         "distortFilter",
         RunImageFloat<&distortFilter>,
         {{"VALUE", -100, 100}},
         "above 0 barrel, below 0 pincushion"},
        {"fringing",
         "fringingFilter",
         RunImageFloat<&fringingFilter>,
         {{"VALUE", -100, 100}},
         "red and blue drift apart towards the edges"},
        {"hue",
         "hueAdjustment",
         RunImageFloat<&hueAdjustment>,
         {{"DEGREES", -360, 360}},
         "rotates hue about the grey axis"},
        {"hsl",
         "hslAdjustment",
         RunHslBand,
         {{"BAND", 0, 7},
          {"HUE", -100, 100},
          {"SAT", -100, 100},
          {"LIGHT", -100, 100},
          {"WIDTH", -100, 100},
          {"SOFT", -100, 100}},
         "one colour band (0 red, 1 orange, 2 yellow, 3 green, 4 aqua, 5 blue, 6 purple, 7 "
         "magenta)"},
    };
    const std::vector<ImageFunction>& enhance = EnhanceFunctions();
    all.insert(all.end(), enhance.begin(), enhance.end());
    return all;
  }();
  return kFunctions;
}

const ImageFunction* FindImageFunction(const std::string& name) {
  for (const ImageFunction& fn : ImageFunctions()) {
    if (EqualsNoCase(fn.name, name) || EqualsNoCase(fn.function, name)) return &fn;
  }
  return nullptr;
}

Status PrepareImageCall(const ImageFunction& fn, const std::vector<std::string>& args,
                        ImageCall* call) {
  call->function = &fn;
  call->values.clear();
  if (args.size() != fn.args.size()) {
    std::string synopsis;
    for (const FxArg& arg : fn.args) synopsis += std::string(" ") + arg.name;
    return Status::Error(std::string(fn.name) + " takes " + std::to_string(fn.args.size()) +
                         " argument" + (fn.args.size() == 1 ? "" : "s") +
                         (synopsis.empty() ? "" : ":" + synopsis));
  }
  for (size_t i = 0; i < args.size(); ++i) {
    const FxArg& arg = fn.args[i];
    double v = 0;
    if (!ParseNumber(args[i], &v)) {
      return Status::Error("bad value '" + args[i] + "' for " + fn.name + " " + arg.name +
                           ": not a number");
    }
    if (v < arg.min || v > arg.max) {
      return Status::Error(std::string(fn.name) + " " + arg.name + " " + args[i] +
                           " is outside its range " + FormatNumber(arg.min) + ".." +
                           FormatNumber(arg.max));
    }
    call->values.push_back(v);
  }
  return Status::Ok();
}

Status CallImageFunction(const ImageCall& call, cv::Mat* bgra, const cv::Mat* second,
                         std::string* report) {
  const ImageFunction& fn = *call.function;
  if (fn.inputs > 1 && (!second || second->empty())) {
    return Status::Error(std::string(fn.name) + " needs a second image");
  }
  std::string ignored;
  const FxContext fx{fn, call.values, bgra, second, report ? report : &ignored};
  return fn.run(fx);
}

}  // namespace tfxtool
