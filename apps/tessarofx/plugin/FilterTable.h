// The tool's view of the filter catalogue: what it knows about each filter beyond its descriptor
// (most filters register no parameters and take theirs from the host's properties, as a host's
// user interface supplies them), their ranges and meanings, and the registered names that the
// published list does not show.
#pragma once

#include <string>

#include "catalog/FilterCatalog.h"

namespace tfxtool {

using ParamType = tfx::catalog::ParamType;
using ParamInfo = tfx::catalog::Param;
using FilterInfo = tfx::catalog::Filter;
using tfx::catalog::ParamTypeName;

// Case-insensitive lookups; null when the catalogue has no such filter.
inline const FilterInfo* FindFilterByGuid(const std::string& guid) {
  return tfx::catalog::FindByGuid(guid.c_str());
}
inline const FilterInfo* FindFilterByName(const std::string& name) {
  return tfx::catalog::FindByName(name.c_str());
}

bool EqualsNoCase(const std::string& a, const std::string& b);

}  // namespace tfxtool
