// The largest buffer the library walks. No caller holds an image above INT_MAX bytes, and within
// one every byte offset fits an int, so refusing larger ones keeps all offset arithmetic exact.
#pragma once

#include <climits>
#include <cstdint>

namespace tfx {

// Whether count x size x bytesPerItem (all non-negative, bytesPerItem at least 1) stays within
// INT_MAX bytes, decided without overflowing.
inline bool FitsInt(int64_t count, int64_t size, int64_t bytesPerItem) {
  return count <= INT_MAX && size <= INT_MAX && count * size <= INT_MAX / bytesPerItem;
}

}  // namespace tfx
