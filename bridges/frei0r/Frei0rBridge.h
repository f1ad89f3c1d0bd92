// A frei0r plug-in over one published filter: the frei0r entry points of every TessaroFx frei0r
// module, driven by the filter catalogue. Each module is this code plus the name of its filter
// (Frei0rPlugin.cpp); it is a host of the plug-in ABI like any other: it creates the filter by
// GUID through the entry points, sets its parameters and calls Running on the host's frames.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "catalog/FilterCatalog.h"

namespace tfx::frei0r {

// frei0r's parameter types, as the header numbers them.
enum class Kind { kBool = 0, kDouble = 1, kColor = 2, kString = 4 };

// One frei0r parameter and the catalogued parameters behind it.
struct BridgeParam {
  std::string name;
  Kind kind;
  std::string explanation;
  // The parameter it sets; for a colour, the red one, followed in the catalogue by green and
  // blue.
  const catalog::Param* param;
  const catalog::Param* green = nullptr;
  const catalog::Param* blue = nullptr;
};

// The frei0r face of a filter: plug-in name and parameters, derived from the catalogue alone.
struct BridgeInfo {
  const catalog::Filter* filter = nullptr;
  std::string pluginName;   // "tessarofx-coloradjust", as the module's file is named
  std::string explanation;  // the filter's summary
  std::vector<BridgeParam> params;
};

// Null when no catalogued filter has this slug.
const BridgeInfo* InfoForSlug(const char* slug);

// The number a frei0r double in 0..1 stands for in a parameter's own range, and back. The
// mapping is linear; integers round to the nearest one.
double FromUnit(const catalog::Param& p, double unit);
double ToUnit(const catalog::Param& p, double value);

}  // namespace tfx::frei0r
