// What the fx tables share: the plug-in's image class reached through its symbols, and the
// runners for the common signatures.
#pragma once

#include <functional>
#include <vector>

#include "commands/ImageFunctions.h"
#include "tessarofx/CxImage.h"

namespace tfxtool {

// Wraps `bgra` as a non-owning 32-bit BGRA CxImage made by the plug-in's own constructor and
// hands it to `use`; the plug-in's destructor runs afterwards.
Status WithPluginImage(const PluginLibrary& plugin, cv::Mat* bgra,
                       const std::function<void(CxImage*)>& use);

// CxImage* f(CxImage*, float) with the first argument.
Status RunImageFloat(const FxContext& fx);

// The argument i as the float the functions take.
inline float ArgF(const FxContext& fx, size_t i) { return static_cast<float>(fx.values[i]); }
inline int ArgI(const FxContext& fx, size_t i) { return static_cast<int>(fx.values[i]); }

// The enhancement library's part of the table.
const std::vector<ImageFunction>& EnhanceFunctions();

}  // namespace tfxtool
