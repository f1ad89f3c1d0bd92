// The library's exported free image functions, as the fx command calls them: linked and called
// like any C++ function, so the compiler checks every call against the public declarations.
#pragma once

#include <opencv2/core.hpp>
#include <string>
#include <vector>

#include "Status.h"

namespace tfxtool {

// One numeric argument: its name in the usage text and the range where the function's
// arithmetic is defined.
struct FxArg {
  const char* name;
  double min;
  double max;
};

struct ImageFunction;

// What one call works on. `image` is the input, packed 8-bit BGRA, and receives the result
// (possibly of another size); `second` is the second input of functions that take two images.
// Functions that measure rather than change an image write lines of text to `report`.
struct FxContext {
  const ImageFunction& function;
  const std::vector<double>& values;  // one per argument, checked against its range
  cv::Mat* image;
  const cv::Mat* second;
  std::string* report;
};

// Calls the function the way its signature asks.
using FxRunner = Status (*)(const FxContext& fx);

struct ImageFunction {
  const char* name;      // what the user types
  const char* function;  // the exported function, also accepted on the command line
  FxRunner run;
  std::vector<FxArg> args;  // in call order
  const char* meaning;
  int inputs = 1;                    // images read: INPUT, or INPUT and a second image
  bool writes = true;                // false: prints a measurement instead of writing OUTPUT
  std::vector<const char*> also{};   // further exported functions it calls
  const char* secondName = nullptr;  // what the second image is, for the usage text
};

// Every function, colour adjustments first, then the enhancement library.
const std::vector<ImageFunction>& ImageFunctions();
const ImageFunction* FindImageFunction(const std::string& name);

// A function with its arguments parsed and checked, ready to call.
struct ImageCall {
  const ImageFunction* function = nullptr;
  std::vector<double> values;  // one per argument, checked against its range
};

Status PrepareImageCall(const ImageFunction& fn, const std::vector<std::string>& args,
                        ImageCall* call);

// Runs the call on a BGRA image (and the second image where the function takes one). A
// measuring function leaves the image alone and returns its text in *report.
Status CallImageFunction(const ImageCall& call, cv::Mat* bgra, const cv::Mat* second = nullptr,
                         std::string* report = nullptr);

}  // namespace tfxtool
