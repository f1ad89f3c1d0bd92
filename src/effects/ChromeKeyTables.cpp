#include "effects/ChromeKeyTables.h"

#include "lut/OwnedCubeLut.h"

namespace {

uint8_t KeyByte(int v) { return static_cast<uint8_t>(v < 0 ? 0 : (v > 255 ? 255 : v)); }

void PreparePlan(CubeLut& lut, tfx::TetraPlan& plan) {
  plan.Prepare(tfx::TetraTable{lut.getLut3DData(nullptr, nullptr, nullptr, nullptr),
                               lut.getFTData(nullptr), lut.getGTData(nullptr), lut.getLutSize()});
}

}  // namespace

ChromeKeyTables::ChromeKeyTables() : beauty_(new OwnedCubeLut()), alpha_(new OwnedCubeLut()) {
  // 64 points, so that the tables are applied over the whole lattice the generator fills.
  beauty_->generateLUT3DData(NLEChromeKeyLut3dGenerator::kPoints);
  alpha_->generateLUT3DData(NLEChromeKeyLut3dGenerator::kPoints);
}

ChromeKeyTables::Rebuilt ChromeKeyTables::KeepCurrent(int red, int green, int blue, double contrast,
                                                      double offset) {
  const bool keyChanged = red != lastRed_ || green != lastGreen_ || blue != lastBlue_;
  if (keyChanged) {
    lastRed_ = red;
    lastGreen_ = green;
    lastBlue_ = blue;
  }
  const bool shapeChanged = contrast != lastContrast_ || offset != lastOffset_;
  if (shapeChanged) {
    lastContrast_ = contrast;
    lastOffset_ = offset;
  }
  if (!keyChanged && !shapeChanged) return {};
  generator_.setLutParam(NLEChromeKeyLut3dGenerator::DefaultParam(KeyByte(red), KeyByte(green),
                                                                  KeyByte(blue), contrast, offset));
  if (keyChanged) {
    generator_.getBeautyLut(beauty_->getLut3DData(nullptr, nullptr, nullptr, nullptr));
    PreparePlan(*beauty_, beautyPlan_);
  }
  generator_.getAlphaLut(alpha_->getLut3DData(nullptr, nullptr, nullptr, nullptr));
  PreparePlan(*alpha_, alphaPlan_);
  return {keyChanged, true};
}
