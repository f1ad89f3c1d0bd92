#include "commands/ImageFunctions.h"

#include <new>
#include <opencv2/imgproc.hpp>
#include <type_traits>

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

// Why symbols and not a link: a host that links libTessaroFx.so would call these functions
// directly, but the tool is a dlopen host, so it asks the loaded library for the same symbols
// the linker would have bound. The names are Itanium-mangled; the pointer types below are tied
// to the public declarations at compile time, and the tool's tests check at run time that every
// name in the tables resolves in the built plug-in, so a changed signature cannot slip through
// either side unnoticed.
using ImageFloatFn = CxImage* (*)(CxImage*, float);
using ImageLongFn = CxImage* (*)(CxImage*, long);
using ImageFloat6Fn = CxImage* (*)(CxImage*, float, float, float, float, float, float);
using NewImageFn = CxImage* (*)(int, int);
using HslFn = CxImage* (*)(CxImage*, const HSLBands&);
static_assert(std::is_same_v<decltype(&exposureAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&brightnessAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&contrastAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&vibranceAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&saturationAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hdrHighlight), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hdrShadow), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hdrWhiteLevel), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hdrBlackLevel), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&whiteBalanceAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&tintAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&temperatureAdjustment), ImageLongFn>);
static_assert(std::is_same_v<decltype(&createTemperateColor), NewImageFn>);
static_assert(std::is_same_v<decltype(&vignetteAdjustFilter), ImageFloat6Fn>);
static_assert(std::is_same_v<decltype(&distortFilter), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&fringingFilter), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hueAdjustment), ImageFloatFn>);
static_assert(std::is_same_v<decltype(&hslAdjustment), HslFn>);

// The functions take a CxImage, whose constructor and destructor also live in the plug-in.
// Rather than asking the library for a factory it does not have, the tool does what the
// compiler would emit for a local `CxImage img(&bits, ...)`: storage of the class's size and
// alignment, then the complete-object constructor (C1) called on it, and later the
// complete-object destructor (D1, not the deleting one, as the storage is ours). In the
// Itanium ABI both take `this` as a hidden first argument and return nothing, which is what
// these pointer types spell out.
using WrapCtorFn = void (*)(CxImage*, unsigned char**, unsigned, unsigned, unsigned, unsigned,
                            _ImagePixelFormat);
using DtorFn = void (*)(CxImage*);
constexpr const char* kWrapCtorSymbol = "_ZN7CxImageC1EPPhjjjj17_ImagePixelFormat";
constexpr const char* kDtorSymbol = "_ZN7CxImageD1Ev";
// An image the plug-in made is read and freed through its own code as well: the pixel reader
// and the deleting destructor (D0), called like the constructor with `this` first. The tool
// never calls a CxImage member itself, as that would need the class's type information.
using GetPixelFn = tagRGBQUAD (*)(const CxImage*, unsigned long, unsigned long, bool);
using DeleteFn = void (*)(CxImage*);
constexpr const char* kGetPixelSymbol = "_ZNK7CxImage13GetPixelColorEmmb";
constexpr const char* kDeleteSymbol = "_ZN7CxImageD0Ev";

// A non-owning CxImage over a BGRA matrix, alive for one call.
class WrappedImage {
 public:
  WrappedImage(WrapCtorFn ctor, DtorFn dtor, cv::Mat* bgra) : dtor_(dtor), bits_(bgra->data) {
    // The image keeps &bits_ as its owner's pointer variable, so bits_ must outlive it.
    ctor(reinterpret_cast<CxImage*>(storage_), &bits_, static_cast<unsigned>(bgra->cols),
         static_cast<unsigned>(bgra->rows), 32, static_cast<unsigned>(bgra->step[0]), IPF_BGRA);
  }
  WrappedImage(const WrappedImage&) = delete;
  WrappedImage& operator=(const WrappedImage&) = delete;
  ~WrappedImage() { dtor_(image()); }

  CxImage* image() { return std::launder(reinterpret_cast<CxImage*>(storage_)); }

 private:
  alignas(CxImage) unsigned char storage_[sizeof(CxImage)];
  DtorFn dtor_;
  unsigned char* bits_;
};

// Calls an image-making function with the input's size and copies the new image, read pixel by
// pixel, into the image (opaque). Such images are 24-bit and tagged RGB.
Status RunNewImage(const FxContext& fx) {
  NewImageFn create = nullptr;
  GetPixelFn getPixel = nullptr;
  DeleteFn destroy = nullptr;
  if (Status s = fx.plugin.Resolve(fx.function.symbol, &create); !s.ok()) return s;
  if (Status s = fx.plugin.Resolve(kGetPixelSymbol, &getPixel); !s.ok()) return s;
  if (Status s = fx.plugin.Resolve(kDeleteSymbol, &destroy); !s.ok()) return s;
  cv::Mat& bgra = *fx.image;
  CxImage* made = create(bgra.cols, bgra.rows);
  if (!made) return Status::Error(std::string(fx.function.function) + " made no image");
  for (int y = 0; y < bgra.rows; ++y) {
    uint8_t* row = bgra.ptr<uint8_t>(y);
    for (int x = 0; x < bgra.cols; ++x) {
      const tagRGBQUAD c =
          getPixel(made, static_cast<unsigned long>(x), static_cast<unsigned long>(y), false);
      // Made images store blue, green, red under an RGB tag, so the reader's red is blue.
      row[4 * x] = c.rgbRed;
      row[4 * x + 1] = c.rgbGreen;
      row[4 * x + 2] = c.rgbBlue;
      row[4 * x + 3] = 255;
    }
  }
  destroy(made);
  return Status::Ok();
}

// Resolves the function as type Fn and calls `call` with it on the wrapped image.
template <class Fn, class Call>
Status OnImage(const FxContext& fx, Call call) {
  Fn fn = nullptr;
  if (Status s = fx.plugin.Resolve(fx.function.symbol, &fn); !s.ok()) return s;
  return WithPluginImage(fx.plugin, fx.image, [&](CxImage* image) { call(fn, image); });
}

Status RunImageLong(const FxContext& fx) {
  return OnImage<ImageLongFn>(
      fx, [&](ImageLongFn fn, CxImage* image) { fn(image, static_cast<long>(fx.values[0])); });
}

Status RunImageFloat6(const FxContext& fx) {
  return OnImage<ImageFloat6Fn>(fx, [&](ImageFloat6Fn fn, CxImage* image) {
    fn(image, ArgF(fx, 0), ArgF(fx, 1), ArgF(fx, 2), ArgF(fx, 3), ArgF(fx, 4), ArgF(fx, 5));
  });
}

Status RunHslBand(const FxContext& fx) {
  return OnImage<HslFn>(fx, [&](HslFn fn, CxImage* image) {
    HSLBands bands{};
    bands.band[ArgI(fx, 0)] =
        HSLBandValues{ArgF(fx, 1), ArgF(fx, 2), ArgF(fx, 3), ArgF(fx, 4), ArgF(fx, 5)};
    fn(image, bands);
  });
}

}  // namespace

Status WithPluginImage(const PluginLibrary& plugin, cv::Mat* bgra,
                       const std::function<void(CxImage*)>& use) {
  WrapCtorFn ctor = nullptr;
  DtorFn dtor = nullptr;
  if (Status s = plugin.Resolve(kWrapCtorSymbol, &ctor); !s.ok()) return s;
  if (Status s = plugin.Resolve(kDtorSymbol, &dtor); !s.ok()) return s;
  WrappedImage image(ctor, dtor, bgra);
  use(image.image());
  return Status::Ok();
}

Status RunImageFloat(const FxContext& fx) {
  return OnImage<ImageFloatFn>(fx,
                               [&](ImageFloatFn fn, CxImage* image) { fn(image, ArgF(fx, 0)); });
}

const std::vector<ImageFunction>& ImageFunctions() {
  // Ranges: where each function's arithmetic is defined. Brightness divides by b/253 + 0.99,
  // which reaches zero near -250.5; contrast divides by 1 - c/255.
  static const std::vector<ImageFunction> kFunctions = [] {
    std::vector<ImageFunction> all = {
        {"exposure",
         "exposureAdjustment",
         "_Z18exposureAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -1000, 1000}},
         "gain 2^(v*0.012): +50 = x1.52"},
        {"brightness",
         "brightnessAdjustment",
         "_Z20brightnessAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -250, 1000}},
         "above 0 scales by 1+v/100, below 0 subtracts"},
        {"contrast",
         "contrastAdjustment",
         "_Z18contrastAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -1000, 254}},
         "above 0 stretches away from mid grey, below 0 flattens"},
        {"vibrance",
         "vibranceAdjustment",
         "_Z18vibranceAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -1000, 1000}},
         "saturates muted colours more than vivid ones"},
        {"saturation",
         "saturationAdjustment",
         "_Z20saturationAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -1000, 1000}},
         "-100 gives grey, above 0 strengthens colour"},
        {"highlight",
         "hdrHighlight",
         "_Z12hdrHighlightP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "brightens (or darkens) pixels by their brightest channel"},
        {"shadow",
         "hdrShadow",
         "_Z9hdrShadowP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "lifts (or deepens) dark pixels; the lift is 4x the cut"},
        {"white-level",
         "hdrWhiteLevel",
         "_Z13hdrWhiteLevelP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "moves the white point: above 0 the curve is applied twice"},
        {"black-level",
         "hdrBlackLevel",
         "_Z13hdrBlackLevelP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "moves the black point, weighted towards dark pixels"},
        {"auto-white",
         "whiteBalanceAdjustment",
         "_Z22whiteBalanceAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -500, 500}},
         "scales channels so the brightest v/500 of the pixels average to white"},
        {"temperature",
         "temperatureAdjustment",
         "_Z21temperatureAdjustmentP7CxImagel",
         RunImageLong,
         {{"VALUE", 0, 30000}},
         "tints towards a black-body colour; 11500 is neutral, the mapping jumps there"},
        {"tint",
         "tintAdjustment",
         "_Z14tintAdjustmentP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "above 0 towards magenta, below 0 towards green"},
        {"temperature-colors",
         "createTemperateColor",
         "_Z20createTemperateColorii",
         RunNewImage,
         {},
         "a black-body gradient of the input's size, 30000 K down by 100 K a column"},
        {"vignette",
         "vignetteAdjustFilter",
         "_Z20vignetteAdjustFilterP7CxImageffffff",
         RunImageFloat6,
         {{"AMOUNT", -100, 100},
          {"FEATHER", 0, 100},
          {"HIGHLIGHTS", 0, 100},
          {"SIZE", 0, 100},
          {"ROUNDNESS", -100, 100},
          {"EXPOSURE", -100, 100}},
         "darkens or lightens outside a centred ellipse (arguments in the function's order)"},
        {"distort",
         "distortFilter",
         "_Z13distortFilterP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "above 0 barrel, below 0 pincushion"},
        {"fringing",
         "fringingFilter",
         "_Z14fringingFilterP7CxImagef",
         RunImageFloat,
         {{"VALUE", -100, 100}},
         "red and blue drift apart towards the edges"},
        {"hue",
         "hueAdjustment",
         "_Z13hueAdjustmentP7CxImagef",
         RunImageFloat,
         {{"DEGREES", -360, 360}},
         "rotates hue about the grey axis"},
        {"hsl",
         "hslAdjustment",
         "_Z13hslAdjustmentP7CxImageRK8HSLBands",
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

const std::vector<SupportSymbol>& ImageSupportSymbols() {
  static const std::vector<SupportSymbol> kSymbols = {
      {"CxImage wrapping constructor", kWrapCtorSymbol},
      {"CxImage destructor", kDtorSymbol},
      {"CxImage pixel reader", kGetPixelSymbol},
      {"CxImage deleting destructor", kDeleteSymbol},
  };
  return kSymbols;
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

Status CallImageFunction(const PluginLibrary& plugin, const ImageCall& call, cv::Mat* bgra,
                         const cv::Mat* second, std::string* report) {
  const ImageFunction& fn = *call.function;
  if (fn.inputs > 1 && (!second || second->empty())) {
    return Status::Error(std::string(fn.name) + " needs a second image");
  }
  std::string ignored;
  const FxContext fx{plugin, fn, call.values, bgra, second, report ? report : &ignored};
  return fn.run(fx);
}

}  // namespace tfxtool
