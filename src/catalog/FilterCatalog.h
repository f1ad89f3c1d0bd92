// Every published filter and the parameters its effect reads: names, types, defaults, ranges
// and meanings, in one table that the effects, the command-line tool, the frei0r plug-ins and
// the Python module all read. Most effects register no parameters and take theirs by name from
// the host's settings; the two that register some do so from this table, so a descriptor and
// the table cannot drift apart.
//
// A parameter's default is also the value its effect uses when the host does not set it.
#pragma once

#include <cstddef>

namespace tfx::catalog {

// Values match enumNLEFilterPropertyType, so they go into a descriptor unchanged.
enum class ParamType { kInt = 1, kDouble = 3, kString = 4 };

const char* ParamTypeName(ParamType type);

// What a parameter stands for beyond its number, for front ends that offer more than sliders.
enum class ParamRole {
  kAmount,  // a number on a slider
  kChoice,  // an integer picking one of min..max
  kKeyRed,  // the three channels of one colour, 0..255
  kKeyGreen,
  kKeyBlue,
  kFilePath,  // text naming a file
};

struct Param {
  const char* name;  // as the effect looks it up
  const wchar_t* wideName;
  ParamType type;
  double defaultValue;  // numbers only; text parameters default to ""
  double min;
  double max;
  double step;
  ParamRole role;
  const char* meaning;
};

template <class T>
struct Span {
  const T* data = nullptr;
  size_t count = 0;
  const T* begin() const { return data; }
  const T* end() const { return data + count; }
  size_t size() const { return count; }
  bool empty() const { return count == 0; }
  const T& operator[](size_t i) const { return data[i]; }
};

struct Filter {
  const char* guid;
  const wchar_t* wideGuid;
  const char* name;  // the published friendly name
  // Names of classes registered under the same GUID but hidden behind the published one. The
  // CPU class is what tools create, so these are what a user often means.
  Span<const char*> aliases;
  // Lower-case name for file and element names outside the plug-in ABI.
  const char* slug;
  const char* summary;
  Span<Param> params;  // for a class that registers parameters: in its registration order
  // 2 for a filter that joins a background and a foreground; 1 for one that rewrites the
  // foreground.
  int inputs;
  // The result at a pixel depends on where it lies in the frame, so the frame must not be cut
  // into slices processed apart.
  bool positional;
};

// The ten published filters, in ascending GUID order.
Span<Filter> Filters();

// Each filter and the parameters its effect reads, by name, for the code that sets or reads one.
extern const Filter& kColorAdjust;
extern const Filter& kWhiteBalance;
extern const Filter& kChromeKeyCombine;
extern const Filter& kLut;
extern const Filter& kVignette;
extern const Filter& kAToWhite;
extern const Filter& kHslAdjust;
extern const Filter& kLens;
extern const Filter& kLightAdjust;
extern const Filter& kChromeKey;

namespace color_adjust {
extern const Param& kExposure;
extern const Param& kBrightness;
extern const Param& kContrast;
extern const Param& kVibrance;
extern const Param& kSaturation;
}  // namespace color_adjust
namespace white_balance {
extern const Param& kTemperature;
extern const Param& kTint;
extern const Param& kRedGain;
extern const Param& kGreenGain;
extern const Param& kBlueGain;
}  // namespace white_balance
namespace lut {
extern const Param& kPath;
}
namespace vignette {
extern const Param& kAmount;
extern const Param& kSize;
extern const Param& kRoundness;
extern const Param& kFeather;
extern const Param& kExposure;
extern const Param& kHighlights;
}  // namespace vignette
namespace hsl {
// Five values per colour band, band after band: hue, sat, light, width, soft.
constexpr int kBands = 8;
constexpr int kValuesPerBand = 5;
const Param& Value(int band, int value);
}  // namespace hsl
namespace lens {
extern const Param& kDistortion;
extern const Param& kFringing;
}  // namespace lens
namespace light {
extern const Param& kHighlight;
extern const Param& kShadow;
extern const Param& kWhiteLevel;
extern const Param& kBlackLevel;
}  // namespace light
namespace chroma_key {
extern const Param& kRed;
extern const Param& kGreen;
extern const Param& kBlue;
extern const Param& kContrast;
extern const Param& kOffset;
extern const Param& kMode;
}  // namespace chroma_key
// Case-insensitive lookups by GUID, or by published name or alias; null when there is none.
const Filter* FindByGuid(const char* guid);
const Filter* FindByName(const char* name);
// A filter's parameter by exact name; null when it has none such.
const Param* FindParam(const Filter& filter, const char* name);

}  // namespace tfx::catalog
