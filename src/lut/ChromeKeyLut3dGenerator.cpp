#include "lut/ChromeKeyLut3dGenerator.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <opencv2/core.hpp>
#include <opencv2/imgproc.hpp>

namespace {

constexpr int kN = NLEChromeKeyLut3dGenerator::kPoints;
constexpr int kCount = kN * kN * kN;
constexpr double kPi = 3.14159265358979323846;
constexpr double kRadians = kPi / 180.0;

std::atomic<uint64_t> g_beautyBuilt{0};
std::atomic<uint64_t> g_alphaBuilt{0};

// Signed hue difference a - b, wrapped into (-180, 180].
double HueDelta(double a, double b) {
  double d = std::fmod(a - b, 360.0);
  if (d > 180.0) d -= 360.0;
  if (d <= -180.0) d += 360.0;
  return d;
}

double WrapHue(double h) {
  h = std::fmod(h, 360.0);
  return h < 0.0 ? h + 360.0 : h;
}

double Clamp01(double x) { return x < 0.0 ? 0.0 : (x > 1.0 ? 1.0 : x); }

// A non-finite setting falls back to its default rather than poisoning every lattice point.
double Finite(double x, double fallback) { return std::isfinite(x) ? x : fallback; }

}  // namespace

NLEChromeKeyLut3dGenerator::NLEChromeKeyLut3dGenerator()
    : param_(DefaultParam(0, 0, 0, 50.0, 0.0)), key_(), prepared_(false) {}

lutParam NLEChromeKeyLut3dGenerator::DefaultParam(uint8_t red, uint8_t green, uint8_t blue,
                                                  double contrast, double offset) {
  return lutParam{red, green, blue, 0,   40,   30,    0,        255,
                  0,   255,   50.0, 0.0, 50.0, 100.0, contrast, offset};
}

void NLEChromeKeyLut3dGenerator::setLutParam(lutParam param) {
  param_ = param;
  prepared_ = false;
}

void NLEChromeKeyLut3dGenerator::preProcess() {
  if (input_.empty()) {
    // The lattice points as RGB in 0..1, then as HSV through the same conversion family that
    // turns the beauty table back, so untouched points make the round trip unchanged.
    std::vector<float> rgb(static_cast<size_t>(kCount) * 3);
    float* p = rgb.data();
    for (int i = 0; i < kN; ++i) {
      for (int j = 0; j < kN; ++j) {
        for (int k = 0; k < kN; ++k, p += 3) {
          p[0] = static_cast<float>(i) / (kN - 1);
          p[1] = static_cast<float>(j) / (kN - 1);
          p[2] = static_cast<float>(k) / (kN - 1);
        }
      }
    }
    input_.resize(rgb.size());
    cv::Mat in(kN * kN, kN, CV_32FC3, rgb.data());
    cv::Mat out(kN * kN, kN, CV_32FC3, input_.data());
    cv::cvtColor(in, out, cv::COLOR_RGB2HSV_FULL);
  }

  const lutParam& q = param_;
  float screenRgb[3] = {q.keyRed / 255.0f, q.keyGreen / 255.0f, q.keyBlue / 255.0f};
  float screenHsv[3];
  cv::Mat in(1, 1, CV_32FC3, screenRgb), out(1, 1, CV_32FC3, screenHsv);
  cv::cvtColor(in, out, cv::COLOR_RGB2HSV_FULL);

  Key& key = key_;
  key.hue = screenHsv[0];
  key.value = screenHsv[2];
  key.chroma = static_cast<double>(screenHsv[1]) * screenHsv[2];
  key.keys = key.chroma > 0.0;
  key.tolerance = std::clamp(static_cast<double>(q.hueTolerance), 0.0, 180.0);
  key.softness = std::clamp(static_cast<double>(q.hueSoftness), 0.0, 180.0);
  // Below 180 degrees, so that the wedge's edge has a finite cotangent.
  key.spillWedge = std::min(key.tolerance + key.softness, 179.0);
  key.saturationLow = q.saturationLow / 255.0;
  key.saturationHigh = q.saturationHigh / 255.0;
  key.valueLow = q.valueLow / 255.0;
  key.valueHigh = q.valueHigh / 255.0;
  key.shadow = Clamp01(Finite(q.shadowTolerance, 50.0) / 100.0);
  key.highlight = std::max(0.0, Finite(q.highlightTolerance, 0.0) / 100.0);
  key.restore = Clamp01(Finite(q.lumaRestore, 50.0) / 100.0);
  key.strength = Clamp01(Finite(q.spillStrength, 100.0) / 100.0);
  const double contrast = std::clamp(Finite(q.contrast, 50.0), 0.0, 100.0);
  const double offset = std::clamp(Finite(q.offset, 0.0), -100.0, 100.0);
  key.bandWidth = 1.0 - contrast / 100.0;
  key.bandHigh = 0.5 + offset / 200.0 + key.bandWidth / 2.0;
  prepared_ = true;
}

bool NLEChromeKeyLut3dGenerator::Protected(double s, double v) const {
  return s < key_.saturationLow || s > key_.saturationHigh || v < key_.valueLow ||
         v > key_.valueHigh;
}

double NLEChromeKeyLut3dGenerator::KeyLikeness(double h, double s, double v) const {
  const Key& key = key_;
  const double chroma = s * v;
  if (chroma <= 0.0 || Protected(s, v)) return 0.0;
  const double d = std::fabs(HueDelta(h, key.hue));
  double w = 1.0;
  if (d >= key.tolerance + key.softness) return 0.0;
  if (d > key.tolerance) {
    const double t = (key.tolerance + key.softness - d) / key.softness;
    w = t * t * (3.0 - 2.0 * t);
  }
  // A black screen has no hue, so value is positive here whenever chroma is.
  const double x = v / key.value;
  const double g = x < 1.0 ? 1.0 - key.shadow * (1.0 - x) : 1.0 + key.highlight * (x - 1.0);
  return w * chroma / (key.chroma * g);
}

void NLEChromeKeyLut3dGenerator::getAlphaLut(float* lattice) {
  if (!prepared_) preProcess();
  ++g_alphaBuilt;
  const float* in = input_.data();
  for (int n = 0; n < kCount; ++n, in += 3, lattice += 3) {
    double alpha = 1.0;
    if (key_.keys) {
      const double k = KeyLikeness(in[0], in[1], in[2]);
      if (key_.bandWidth > 0.0) {
        alpha = Clamp01((key_.bandHigh - k) / key_.bandWidth);
      } else {
        alpha = k < key_.bandHigh ? 1.0 : 0.0;
      }
    }
    const float mask = static_cast<float>(alpha * 255.0);
    lattice[0] = lattice[1] = lattice[2] = mask;
  }
}

void NLEChromeKeyLut3dGenerator::getBeautyLut(float* lattice) {
  preProcess();
  ++g_beautyBuilt;
  std::vector<float> hsv(input_);
  const Key& key = key_;
  const double wedge = key.spillWedge * kRadians;
  const double edgeCot = std::cos(wedge) / std::sin(wedge);
  float* p = hsv.data();
  for (int n = 0; key.keys && key.strength > 0.0 && n < kCount; ++n, p += 3) {
    const double h = p[0], s = p[1], v = p[2];
    const double chroma = s * v;
    const double d = HueDelta(h, key.hue);
    const double angle = std::fabs(d) * kRadians;
    if (chroma <= 0.0 || angle >= wedge || Protected(s, v)) continue;
    // Along the screen's direction x, across it y; only x is taken away, down to the wedge's
    // edge at full strength.
    const double x = chroma * std::cos(angle), y = chroma * std::sin(angle);
    const double xs = x - key.strength * (x - y * edgeCot);
    const double chromaOut = std::min(chroma, std::hypot(xs, y));
    const double angleOut = std::atan2(y, xs) / kRadians;
    const double valueOut = v - (1.0 - key.restore) * (chroma - chromaOut);
    p[0] = static_cast<float>(WrapHue(key.hue + (d < 0.0 ? -angleOut : angleOut)));
    p[1] = static_cast<float>(valueOut > 0.0 ? std::min(1.0, chromaOut / valueOut) : 0.0);
    p[2] = static_cast<float>(std::max(0.0, valueOut));
  }
  // Converted straight into the lattice, which has exactly the table's shape.
  cv::Mat table(kN * kN, kN, CV_32FC3, hsv.data());
  cv::Mat rgb(kN * kN, kN, CV_32FC3, lattice);
  cv::cvtColor(table, rgb, cv::COLOR_HSV2RGB_FULL);
  if (rgb.data != reinterpret_cast<uchar*>(lattice)) {
    rgb.copyTo(cv::Mat(kN * kN, kN, CV_32FC3, lattice));
  }
  for (int n = 0; n < kCount * 3; ++n) lattice[n] *= 255.0f;
}

uint64_t NLEChromeKeyLut3dGenerator::beautyLutsBuilt() { return g_beautyBuilt.load(); }
uint64_t NLEChromeKeyLut3dGenerator::alphaLutsBuilt() { return g_alphaBuilt.load(); }
