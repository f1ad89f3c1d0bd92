// The LUT file a "lut3dPath" parameter names, read when the parameter changes and kept between
// frames. Shared by the CPU and the OpenCL LUT effects.
#pragma once

#include <memory>
#include <string>

#include "lut/CubeLutApply.h"
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
  // The table as last read, packed for the CPU rows.
  const tfx::TetraPlan& Plan() const { return plan_; }

 private:
  tfx::TetraPlan plan_;
  std::wstring loadedPath_;
  std::unique_ptr<CubeLut> table_;
  bool loaded_ = false;
};

// The common case of the LUT effects' copy-then-apply, done in one pass: frames of one size with
// no padding between rows, so that the copy would be exactly the pixels the table rewrites.
// False (and nothing written) for any other shape, which the caller copies and applies itself.
bool CopyThroughTable(const tfx::TetraPlan& plan, uint8_t* dst, int dstWidth, int dstHeight,
                      int dstPitch, const uint8_t* src, int srcWidth, int srcHeight, int srcPitch);
