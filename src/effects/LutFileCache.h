// The LUT file a "lut3dPath" parameter names, read when the parameter changes and kept between
// frames. Shared by the CPU and the OpenCL LUT effects.
#pragma once

#include <memory>
#include <string>

#include "tessarofx/CubeLut.h"

class LutFileCache {
 public:
  // Makes the table follow `path` (not empty) and answers true when the file was read on this
  // call, whatever the outcome: the caller's device copies are then out of date.
  //
  // The stored path is the translated one while the parameter is compared untranslated, so a
  // path that the host's translation changes ("~/...", "$LUTS/...") is read again on every
  // frame, and a failed load of one is retried. The effects have always behaved so; keep it.
  bool Refresh(const std::wstring& path);

  // Created on first use, so that an effect whose path is never set holds no lattice.
  CubeLut& Table();
  bool Loaded() const { return loaded_; }

 private:
  std::wstring loadedPath_;
  std::unique_ptr<CubeLut> table_;
  bool loaded_ = false;
};
