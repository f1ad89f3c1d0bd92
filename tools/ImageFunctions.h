// The plug-in's exported free image functions, as the fx command calls them. The tool does not
// link the plug-in, so each function is found by its C++ symbol name in the loaded library and
// called through a pointer of the matching type.
#pragma once

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "PluginLibrary.h"
#include "Status.h"

namespace tfxtool {

// How a function is called; each kind has one pointer type in ImageFunctions.cpp.
enum class FxKind {
  kImageFloat,   // CxImage* f(CxImage*, float), in place
  kImageLong,    // CxImage* f(CxImage*, long), in place
  kImageFloat6,  // CxImage* f(CxImage*, float, float, float, float, float, float), in place
  kNewImage,     // CxImage* f(int width, int height): a new image of the input's size
  kHslBand,      // CxImage* f(CxImage*, const HSLBands&), one band set from five arguments
};

// One numeric argument: its name in the usage text and the range where the function's
// arithmetic is defined.
struct FxArg {
  const char* name;
  double min;
  double max;
};

struct ImageFunction {
  const char* name;      // what the user types
  const char* function;  // the exported function, also accepted on the command line
  const char* symbol;    // its mangled name in the plug-in
  FxKind kind;
  std::vector<FxArg> args;  // in call order
  const char* meaning;
};

const std::vector<ImageFunction>& ImageFunctions();
const ImageFunction* FindImageFunction(const std::string& name);

// Symbols the tool needs besides the functions themselves: the image class's wrapping
// constructor and its destructor.
struct SupportSymbol {
  const char* what;
  const char* symbol;
};
const std::vector<SupportSymbol>& ImageSupportSymbols();

// A function with its arguments parsed and checked, ready to call.
struct ImageCall {
  const ImageFunction* function = nullptr;
  std::vector<double> values;  // one per argument, checked against its range
};

Status PrepareImageCall(const ImageFunction& fn, const std::vector<std::string>& args,
                        ImageCall* call);

// Applies the call in place to a BGRA image.
Status CallImageFunction(const PluginLibrary& plugin, const ImageCall& call, cv::Mat* bgra);

}  // namespace tfxtool
