// The lattice side of CubeLut: construction, the interpolation tables, the byte atlas, the
// identity-like lattices and the tetrahedral application. The file readers and the writer are in
// CubeLutFile.cpp.
#include "tessarofx/CubeLut.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>

#include "lut/CubeLutApply.h"

std::atomic<CubeLut*> CubeLut::mLut3d{nullptr};

CubeLut::CubeLut() : CubeLut(Unlisted{}) { mLut3d.store(this); }

CubeLut::CubeLut(Unlisted)
    : status_(1),
      size_(0),
      rowTable_(nullptr),
      atlas_(nullptr),
      pointCount_(0),
      atlasState_(2),
      domainMin_{0.0f, 0.0f, 0.0f},
      domainMax_{1.0f, 1.0f, 1.0f},
      atlasBytes_(0) {
  // The tables and the lattice start out unwritten; size 0 keeps doLUT away from them.
}

CubeLut::~CubeLut() {
  delete[] rowTable_;
  delete[] atlas_;
  // A host that destroys the registered object itself must not find it through getInstance.
  CubeLut* self = this;
  mLut3d.compare_exchange_strong(self, nullptr);
}

CubeLut* CubeLut::getInstance() {
  CubeLut* instance = mLut3d.load();
  return instance ? instance : new CubeLut();
}

void CubeLut::releaseInstance() { delete mLut3d.exchange(nullptr); }

const char* CubeLut::getTitle() const { return title_.c_str(); }

void CubeLut::getDomain(float minimum[3], float maximum[3]) const {
  for (int c = 0; c < 3; ++c) {
    minimum[c] = domainMin_[c];
    maximum[c] = domainMax_[c];
  }
}

void CubeLut::buildTables() {
  // Single precision throughout: 255 / (N - 1) is a float, and so is the quotient, which is what
  // makes FT[255] a few ulps above 0 for some sizes. A capped upper neighbour makes that harmless.
  const float cell = 255.0f / static_cast<float>(size_ - 1);
  for (int v = 0; v < 256; ++v) {
    const float s = static_cast<float>(v) / cell;
    gt_[v] = static_cast<int32_t>(std::floor(s));
    ft_[v] = s - static_cast<float>(gt_[v]);
  }
}

int CubeLut::atlasIndex(int i, int j, int k) const {
  return ((k % 8 + (k / 8 * size_ + j) * 8) * size_ + i) * 3;
}

int CubeLut::doLUT(unsigned char* pixels, int width, int height, int pitch, int bytesPerPixel) {
  status_ = 0;
  if (static_cast<unsigned>(size_ - 1) > 63u) return 23;
  if (rowTable_ || height < 1) return 0;
  if (!pixels || width < 1 || bytesPerPixel < 3) return 0;
  // The lattice is public and may change between calls, so it is packed afresh every time; the
  // storage stays with the thread.
  thread_local tfx::TetraPlan plan;
  plan.Prepare(tfx::TetraTable{&lattice_[0][0][0][0], ft_, gt_, size_});
  tfx::TetraImage(plan, pixels, pitch, pixels, width, height, pitch, bytesPerPixel);
  return status_;
}

void CubeLut::interpolate(const float* points, int size, float red, float green, float blue,
                          float out[3]) {
  if (!points || size < 1) {
    out[0] = out[1] = out[2] = 0.0f;
    return;
  }
  const float position[3] = {red, green, blue};
  const ptrdiff_t stride[3] = {ptrdiff_t{size} * size * 3, ptrdiff_t{size} * 3, 3};
  const float* c000 = points;
  ptrdiff_t step[3];
  float fraction[3];
  for (int axis = 0; axis < 3; ++axis) {
    float p = position[axis];
    if (!(p > 0.0f)) p = 0.0f;
    p = std::min(p, static_cast<float>(size - 1));
    // The lower point and the offset inside its cell, in float as doLUT's tables are.
    const int lower = static_cast<int>(p);
    fraction[axis] = p - static_cast<float>(lower);
    step[axis] = lower + 1 < size ? stride[axis] : 0;
    c000 += lower * stride[axis];
  }
  tfx::Tetrahedral(c000, step[0], step[1], step[2], fraction[0], fraction[1], fraction[2], out);
}

CubeLut* CubeLut::clone() {
  CubeLut* copy = new CubeLut();
  copy->status_ = status_;
  copy->title_ = title_;
  copy->size_ = size_;
  std::memcpy(copy->ft_, ft_, sizeof ft_);
  std::memcpy(copy->gt_, gt_, sizeof gt_);
  std::memcpy(copy->lattice_, lattice_, sizeof lattice_);
  copy->pointCount_ = pointCount_;
  copy->atlasState_ = atlasState_;
  std::memcpy(copy->domainMin_, domainMin_, sizeof domainMin_);
  std::memcpy(copy->domainMax_, domainMax_, sizeof domainMax_);
  copy->allocateAtlas();
  if (atlas_) {
    std::memcpy(copy->atlas_, atlas_, std::min<size_t>(copy->atlasBytes_, atlasBytes_));
  }
  return copy;
}

void CubeLut::generateLUT3DData(int n) {
  // Sizes the lattice cannot hold are refused, so nothing below writes outside it.
  if (n < 1 || n > kMaxSize) return;
  size_ = n;
  buildTables();
  pointCount_ = n * n * n;
  // An attached atlas is kept even if it was sized for another N, so it is only written when it
  // is large enough for this one.
  if (!atlas_) allocateAtlas();
  for (int k = 0; k < n; ++k) {
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i < n; ++i) {
        // The divisor is 31 whatever N is: the lattice is the identity only for N = 32.
        float* p = lattice_[i][j][k];
        p[0] = static_cast<float>(i) * 255.0f / 31.0f;
        p[1] = static_cast<float>(j) * 255.0f / 31.0f;
        p[2] = static_cast<float>(k) * 255.0f / 31.0f;
        updateCalcuatedData(k, j, i, PR{p[0], p[1], p[2]});
      }
    }
  }
}

void CubeLut::reset() {
  if (!atlas_ || size_ == 0) return;
  for (int k = 0; k < size_; ++k) {
    for (int j = 0; j < size_; ++j) {
      for (int i = 0; i < size_; ++i) {
        const int r = i * 255 / 31, g = j * 255 / 31, b = k * 255 / 31;
        float* p = lattice_[i][j][k];
        p[0] = static_cast<float>(r);
        p[1] = static_cast<float>(g);
        p[2] = static_cast<float>(b);
        updateCalcuatedData(k, j, i, PR{p[0], p[1], p[2]});
      }
    }
  }
}

void CubeLut::updateLUT3DData() {
  if (!atlas_) return;
  if (atlasState_ == 0) {
    for (int k = 0; k < size_; ++k) {
      for (int j = 0; j < size_; ++j) {
        for (int i = 0; i < size_; ++i) {
          const uint8_t* a = atlas_ + atlasIndex(i, j, k);
          for (int c = 0; c < 3; ++c) lattice_[i][j][k][c] = static_cast<float>(a[c]);
        }
      }
    }
  }
  atlasState_ = 2;
}

void CubeLut::updateCalcuatedData(int k, int j, int i, const PR& p) {
  if (!atlas_ || i < 0 || j < 0 || k < 0 || i >= size_ || j >= size_ || k >= size_) return;
  // An atlas kept from a smaller size (generateLUT3DData reuses it) may have no room for it.
  const int index = atlasIndex(i, j, k);
  if (index + 3 > atlasBytes_) return;
  uint8_t* a = atlas_ + index;
  a[0] = tfx::TruncatedLowByte(p.red);
  a[1] = tfx::TruncatedLowByte(p.green);
  a[2] = tfx::TruncatedLowByte(p.blue);
}

float* CubeLut::getFTData(int* count) {
  if (count) *count = 256;
  return ft_;
}

int* CubeLut::getGTData(int* count) {
  if (count) *count = 256;
  return gt_;
}

float* CubeLut::getLut3DData(int* width, int* height, int* depth, int* channels) {
  if (width) *width = size_;
  if (height) *height = size_;
  if (depth) *depth = size_;
  if (channels) *channels = 3;
  return &lattice_[0][0][0][0];
}

const uint8_t* CubeLut::getAtlasData(int* bytes) const {
  if (bytes) *bytes = atlas_ ? atlasBytes_ : 0;
  return atlas_;
}

void CubeLut::allocateAtlas() {
  delete[] atlas_;
  // The whole tile image: N^3 points fill it only when N is a multiple of 8, and the last tile
  // row of any other size reaches past N^3 * 3 bytes.
  const int tileRows = (size_ + 7) / 8;
  atlasBytes_ = 8 * size_ * tileRows * size_ * 3;
  atlas_ = new uint8_t[static_cast<size_t>(atlasBytes_)]();
}

void CubeLut::setRowTable(float (*rows)[3]) {
  if (rows != rowTable_) delete[] rowTable_;
  rowTable_ = rows;
}
