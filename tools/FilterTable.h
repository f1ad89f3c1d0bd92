// What the tool knows about each filter beyond its descriptor: the parameters its effect reads
// (most filters register none and take theirs from the host's properties, as a host's user
// interface table supplies them), their ranges and meanings, and the registered names that the
// published list does not show.
#pragma once

#include <string>
#include <vector>

namespace tfxtool {

// Values match enumNLEFilterPropertyType, so they go into kType unchanged.
enum class ParamType { kInt = 1, kDouble = 3, kString = 4 };

const char* ParamTypeName(ParamType type);

struct ParamInfo {
  const char* name;  // as the effect looks it up
  ParamType type;
  double defaultValue;  // numbers only; text parameters default to ""
  double min;
  double max;
  const char* meaning;
};

struct FilterInfo {
  const char* guid;
  const char* name;  // the published friendly name
  // Names of classes registered under the same GUID but hidden behind the published one. The
  // tool creates the CPU class, so these are what a user often means.
  std::vector<const char*> aliases;
  const char* summary;
  std::vector<ParamInfo> params;  // for a CPU class that registers parameters: in its order
};

const std::vector<FilterInfo>& KnownFilters();
// Case-insensitive lookups; null when the table has no such filter.
const FilterInfo* FindFilterByGuid(const std::string& guid);
const FilterInfo* FindFilterByName(const std::string& name);

bool EqualsNoCase(const std::string& a, const std::string& b);

}  // namespace tfxtool
