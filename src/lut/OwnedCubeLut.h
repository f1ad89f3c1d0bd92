// A lattice that belongs to one filter.
#pragma once

#include "tessarofx/CubeLut.h"

// Never the process-wide instance, so no host call to CubeLut::getInstance() or
// releaseInstance() can reach or destroy it behind its filter's back.
class OwnedCubeLut final : public CubeLut {
 public:
  OwnedCubeLut() : CubeLut(Unlisted{}) {}
};
