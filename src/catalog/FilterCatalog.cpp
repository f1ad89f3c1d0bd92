#include "catalog/FilterCatalog.h"

#include <cctype>
#include <cstring>
#include <iterator>

namespace tfx::catalog {

namespace {

// Both spellings of one name from one literal.
#define TFX_NAME(text) text, L"" text

constexpr ParamType kD = ParamType::kDouble;
constexpr ParamType kI = ParamType::kInt;
constexpr ParamRole kAmount = ParamRole::kAmount;

// Ranges are what a host's slider offers. Most effects apply their formulas unchecked, so the
// limits keep values where the arithmetic stays meaningful: exposure, brightness and contrast
// diverge well beyond +-100 (brightness divides by zero near -250, contrast at 255), and the lens
// maps only stay inside the frame for +-100.
constexpr Param kColorAdjustParams[] = {
    {TFX_NAME("u_exposure"), kD, 0, -100, 100, 1, kAmount,
     "exposure: gain 2^(v*0.012), +50 = x1.52, -50 = x0.66"},
    {TFX_NAME("u_brightness"), kD, 0, -100, 100, 1, kAmount,
     "brightness: above 0 scales by 1+v/100 (100 doubles), below 0 subtracts"},
    {TFX_NAME("u_contrast"), kD, 0, -100, 100, 1, kAmount,
     "contrast: above 0 stretches away from mid grey, below 0 flattens"},
    {TFX_NAME("u_vib"), kD, 0, -100, 100, 1, kAmount,
     "vibrance: saturates muted colours more than vivid ones"},
    {TFX_NAME("u_sat"), kD, 0, -100, 100, 1, kAmount,
     "saturation: -100 gives grey, above 0 strengthens every colour"},
};

// Registered in this order by both white-balance classes. The gains' range of -100..100 around a
// default of 1 is what hosts have always been given.
constexpr Param kWhiteBalanceParams[] = {
    {TFX_NAME("u_temperature"), kD, 0, -100, 100, 1, kAmount,
     "temperature: above 0 warmer (more red, less blue), below 0 cooler"},
    {TFX_NAME("u_tint"), kD, 0, -100, 100, 1, kAmount,
     "tint: above 0 towards magenta (less green), below 0 towards green"},
    {TFX_NAME("u_rgain"), kD, 1, -100, 100, 1, kAmount, "red gain: accepted, not applied"},
    {TFX_NAME("u_ggain"), kD, 1, -100, 100, 1, kAmount, "green gain: accepted, not applied"},
    {TFX_NAME("u_bgain"), kD, 1, -100, 100, 1, kAmount, "blue gain: accepted, not applied"},
};

constexpr Param kLutParams[] = {
    {TFX_NAME("lut3dPath"), ParamType::kString, 0, 0, 0, 0, ParamRole::kFilePath,
     "path of a .cube or .3dl file; ~ and $VAR are expanded"},
};

constexpr Param kVignetteParams[] = {
    {TFX_NAME("amount"), kD, 0, -100, 100, 1, kAmount,
     "outside the ellipse: -100 black, 0 unchanged, 100 twice as bright"},
    {TFX_NAME("size"), kD, 100, 0, 100, 1, kAmount,
     "size of the clear ellipse: 0 is a fifth of the half-frame"},
    {TFX_NAME("roundness"), kD, 0, -100, 100, 1, kAmount,
     "100 makes the ellipse a circle; 0 and below follow the frame"},
    {TFX_NAME("feather"), kD, 50, 0, 100, 1, kAmount, "width of the soft edge"},
    {TFX_NAME("exposure"), kD, 0, -100, 100, 1, kAmount,
     "exposure inside the ellipse: gain 2^(v/100)"},
    {TFX_NAME("highlights"), kD, 50, 0, 100, 1, kAmount,
     "tone curve outside: 50 neutral, above lifts dark tones, below deepens them"},
};

#define TFX_HSL_BAND(band)                                                                        \
  {TFX_NAME("u_" band "_hue"),                                                                    \
   kD,                                                                                            \
   0,                                                                                             \
   -100,                                                                                          \
   100,                                                                                           \
   1,                                                                                             \
   kAmount,                                                                                       \
   band ": shifts its colours along the hue circle, +-100 onto the neighbouring centre"},         \
      {TFX_NAME("u_" band "_sat"),                                                                \
       kD,                                                                                        \
       0,                                                                                         \
       -100,                                                                                      \
       100,                                                                                       \
       1,                                                                                         \
       kAmount,                                                                                   \
       band ": chroma x (1 + v/100); -100 gives grey"},                                           \
      {TFX_NAME("u_" band "_light"),                                                              \
       kD,                                                                                        \
       0,                                                                                         \
       -100,                                                                                      \
       100,                                                                                       \
       1,                                                                                         \
       kAmount,                                                                                   \
       band ": +100 blends to white, -100 to black (fading out towards grey)"},                   \
      {TFX_NAME("u_" band "_width"), kD, 0, -100, 100, 1, kAmount, band ": reach x 2^(v/100)"}, { \
    TFX_NAME("u_" band "_soft"), kD, 0, -100, 100, 1, kAmount,                                    \
        band ": edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"            \
  }

// Absent values are 0, the neutral setting of every one of them.
constexpr Param kHslParams[] = {
    TFX_HSL_BAND("red"),  TFX_HSL_BAND("orange"), TFX_HSL_BAND("yellow"), TFX_HSL_BAND("green"),
    TFX_HSL_BAND("aqua"), TFX_HSL_BAND("blue"),   TFX_HSL_BAND("purple"), TFX_HSL_BAND("magenta"),
};
static_assert(std::size(kHslParams) == hsl::kBands * hsl::kValuesPerBand);

constexpr Param kLensParams[] = {
    {TFX_NAME("distortion"), kD, 0, -100, 100, 1, kAmount,
     "above 0 bulges the centre (barrel), below 0 pinches it (pincushion)"},
    {TFX_NAME("fringing"), kD, 0, -100, 100, 1, kAmount,
     "red and blue drift apart towards the edges, 3% of the radius at 100"},
};

constexpr Param kLightParams[] = {
    {TFX_NAME("u_highLight"), kD, 0, -100, 100, 1, kAmount,
     "highlights: brightens (or darkens) pixels by their brightest channel"},
    {TFX_NAME("u_shadow"), kD, 0, -100, 100, 1, kAmount,
     "shadows: lifts (or deepens) dark pixels; the lift is 4x the cut"},
    {TFX_NAME("u_whiteLevel"), kD, 0, -100, 100, 1, kAmount,
     "white level: moves the bright end; above 0 applies the curve twice"},
    {TFX_NAME("u_blackLevel"), kD, 0, -100, 100, 1, kAmount,
     "black level: moves the dark end; below 0 is 4x stronger"},
};

// Registered in this order by the CPU class, with these steps.
constexpr Param kChromeKeyParams[] = {
    {TFX_NAME("red"), kI, 0, 0, 255, 1, ParamRole::kKeyRed, "key colour, red"},
    {TFX_NAME("green"), kI, 0, 0, 255, 1, ParamRole::kKeyGreen, "key colour, green"},
    {TFX_NAME("blue"), kI, 0, 0, 255, 1, ParamRole::kKeyBlue, "key colour, blue"},
    {TFX_NAME("contrast"), kD, 50, 0, 100, 1, kAmount, "hardness of the key's edge"},
    {TFX_NAME("offset"), kD, 0, -100, 100, 0.1, kAmount, "moves the key threshold"},
    {TFX_NAME("mode"), kI, 0, 0, 1, 1, ParamRole::kChoice,
     "0 writes the key mask, 1 the corrected colours"},
};

constexpr const char* kLutAliases[] = {"ColorLut3dAdjust"};
constexpr const char* kChromeKeyAliases[] = {"ChromeKeyLut3d"};

template <class T, size_t N>
constexpr Span<T> All(const T (&items)[N]) {
  return {items, N};
}

constexpr Filter kFilters[] = {
    {TFX_NAME("18C6E879-4138-42D0-B0B9-6B4401AA97E6"),
     "ColorAdjust",
     {},
     "coloradjust",
     "exposure, brightness, contrast, vibrance and saturation, applied in that order",
     All(kColorAdjustParams),
     1,
     false},
    {TFX_NAME("39509FB9-39FB-4516-9464-3D891DD61D62"),
     "WhiteBalanceAdjust",
     {},
     "whitebalance",
     "shifts the blue-red and green-magenta balance",
     All(kWhiteBalanceParams),
     1,
     false},
    {TFX_NAME("41AA934B-757A-4EAD-8F7B-85E2E2952B6A"),
     "ChromeKeyCombine",
     {},
     "chromakeycombine",
     "joins a key mask (background) and a colour picture (foreground) into a keyed picture",
     {},
     2,
     false},
    {TFX_NAME("74EB022D-1D73-4D1E-9F70-487C356D46CD"), "Lut", All(kLutAliases), "lut",
     "applies a 3D look-up table file to every pixel", All(kLutParams), 1, false},
    {TFX_NAME("8622FC58-4DF1-44BD-9B37-2F633D4D3368"),
     "VignetteAdjust",
     {},
     "vignette",
     "darkens or lightens the frame outside a centred ellipse",
     All(kVignetteParams),
     1,
     true},
    {TFX_NAME("969C6D5D-43AC-42F9-8F6C-9AB868BA9356"),
     "lutAToWhiteEffect",
     {},
     "atowhite",
     "turns fully transparent pixels opaque black",
     {},
     1,
     false},
    {TFX_NAME("AF91FF05-6577-4A4B-C81E-652EE7D6596E"),
     "HSLAdjust",
     {},
     "hsl",
     "hue, saturation and lightness in eight overlapping colour bands",
     All(kHslParams),
     1,
     false},
    {TFX_NAME("CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735"),
     "DistortionFringingAdjust",
     {},
     "lens",
     "simulates or corrects lens distortion and colour fringing",
     All(kLensParams),
     1,
     true},
    {TFX_NAME("D8651B53-F47A-4B98-B8E9-35B491D5EADC"),
     "LightAdjust",
     {},
     "light",
     "highlights, shadows, white and black levels on one tone curve",
     All(kLightParams),
     1,
     false},
    {TFX_NAME("DB4BBA18-48FC-4164-B572-E59757B02796"), "ChromeKeyLut3dCL", All(kChromeKeyAliases),
     "chromakey", "chroma key through generated 3D LUTs: a key mask or the corrected colours",
     All(kChromeKeyParams), 1, false},
};

#undef TFX_HSL_BAND
#undef TFX_NAME

bool EqualsNoCase(const char* a, const char* b) {
  for (; *a && *b; ++a, ++b) {
    if (std::tolower(static_cast<unsigned char>(*a)) !=
        std::tolower(static_cast<unsigned char>(*b)))
      return false;
  }
  return *a == *b;
}

}  // namespace

const char* ParamTypeName(ParamType type) {
  switch (type) {
    case ParamType::kInt:
      return "int";
    case ParamType::kDouble:
      return "double";
    case ParamType::kString:
      return "string";
  }
  return "?";
}

Span<Filter> Filters() { return All(kFilters); }

const Filter& kColorAdjust = kFilters[0];
const Filter& kWhiteBalance = kFilters[1];
const Filter& kChromeKeyCombine = kFilters[2];
const Filter& kLut = kFilters[3];
const Filter& kVignette = kFilters[4];
const Filter& kAToWhite = kFilters[5];
const Filter& kHslAdjust = kFilters[6];
const Filter& kLens = kFilters[7];
const Filter& kLightAdjust = kFilters[8];
const Filter& kChromeKey = kFilters[9];

namespace color_adjust {
const Param& kExposure = kColorAdjustParams[0];
const Param& kBrightness = kColorAdjustParams[1];
const Param& kContrast = kColorAdjustParams[2];
const Param& kVibrance = kColorAdjustParams[3];
const Param& kSaturation = kColorAdjustParams[4];
}  // namespace color_adjust
namespace white_balance {
const Param& kTemperature = kWhiteBalanceParams[0];
const Param& kTint = kWhiteBalanceParams[1];
const Param& kRedGain = kWhiteBalanceParams[2];
const Param& kGreenGain = kWhiteBalanceParams[3];
const Param& kBlueGain = kWhiteBalanceParams[4];
}  // namespace white_balance
namespace lut {
const Param& kPath = kLutParams[0];
}
namespace vignette {
const Param& kAmount = kVignetteParams[0];
const Param& kSize = kVignetteParams[1];
const Param& kRoundness = kVignetteParams[2];
const Param& kFeather = kVignetteParams[3];
const Param& kExposure = kVignetteParams[4];
const Param& kHighlights = kVignetteParams[5];
}  // namespace vignette
namespace hsl {
const Param& Value(int band, int value) { return kHslParams[band * kValuesPerBand + value]; }
}  // namespace hsl
namespace lens {
const Param& kDistortion = kLensParams[0];
const Param& kFringing = kLensParams[1];
}  // namespace lens
namespace light {
const Param& kHighlight = kLightParams[0];
const Param& kShadow = kLightParams[1];
const Param& kWhiteLevel = kLightParams[2];
const Param& kBlackLevel = kLightParams[3];
}  // namespace light
namespace chroma_key {
const Param& kRed = kChromeKeyParams[0];
const Param& kGreen = kChromeKeyParams[1];
const Param& kBlue = kChromeKeyParams[2];
const Param& kContrast = kChromeKeyParams[3];
const Param& kOffset = kChromeKeyParams[4];
const Param& kMode = kChromeKeyParams[5];
}  // namespace chroma_key

const Filter* FindByGuid(const char* guid) {
  if (!guid) return nullptr;
  for (const Filter& f : kFilters) {
    if (EqualsNoCase(f.guid, guid)) return &f;
  }
  return nullptr;
}

const Filter* FindByName(const char* name) {
  if (!name) return nullptr;
  for (const Filter& f : kFilters) {
    if (EqualsNoCase(f.name, name)) return &f;
    for (const char* alias : f.aliases) {
      if (EqualsNoCase(alias, name)) return &f;
    }
  }
  return nullptr;
}

const Param* FindParam(const Filter& filter, const char* name) {
  if (!name) return nullptr;
  for (const Param& p : filter.params) {
    if (std::strcmp(p.name, name) == 0) return &p;
  }
  return nullptr;
}

}  // namespace tfx::catalog
