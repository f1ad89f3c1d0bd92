// The two generated 64-point tables of a chroma-key LUT effect and the parameters they were made
// for. Shared by the CPU and the OpenCL keyers.
#pragma once

#include <cstdint>
#include <memory>

#include "lut/ChromeKeyLut3dGenerator.h"
#include "lut/CubeLutApply.h"
#include "tessarofx/CubeLut.h"

class ChromeKeyTables {
 public:
  ChromeKeyTables();

  struct Rebuilt {
    bool beauty = false;
    bool alpha = false;
  };

  // Generating a table costs tens of milliseconds, so they follow the parameters only when these
  // move: the beauty LUT depends on the key colour alone, the alpha LUT on everything. A new
  // object builds both on its first call.
  Rebuilt KeepCurrent(int red, int green, int blue, double contrast, double offset);

  CubeLut& Beauty() { return *beauty_; }
  CubeLut& Alpha() { return *alpha_; }
  // The tables packed for the CPU rows, kept in step with every rebuild. The alpha table is grey
  // and packs to one float a point.
  const tfx::TetraPlan& BeautyPlan() const { return beautyPlan_; }
  const tfx::TetraPlan& AlphaPlan() const { return alphaPlan_; }

 private:
  std::unique_ptr<CubeLut> beauty_;
  std::unique_ptr<CubeLut> alpha_;
  tfx::TetraPlan beautyPlan_, alphaPlan_;
  NLEChromeKeyLut3dGenerator generator_;
  // -1 never matches a parameter, so the first frame builds both tables.
  int32_t lastRed_ = -1, lastGreen_ = -1, lastBlue_ = -1;
  double lastContrast_ = -1.0, lastOffset_ = -1.0;
};
