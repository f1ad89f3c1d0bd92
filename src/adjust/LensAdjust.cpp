// Lens distortion and fringing: resampling through cached coordinate maps.
//
// Every map entry depends on |x - cx| and |y - cy| up to the sign of its offset from the centre,
// and negating a product is exact, so the trigonometry and the powers run over one quadrant and
// the centre is added per pixel with the sign of that pixel's side.
//
// The cache keeps the two most recently used map sets of each kind under a mutex, handed out as
// counted references: two filter objects with different settings on two threads keep their maps
// instead of rebuilding each frame, a third setting evicts the least recently used set, and a
// set that one thread is reading stays alive when another evicts or releases it.
#include "tessarofx/LensAdjust.h"

#include <sys/mman.h>

#include <atomic>
#include <climits>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <utility>

#include "adjust/LensMaps.h"
#include "image/ImageLayout.h"
#include "simd/lens_resample.h"

namespace tfx {
namespace {

constexpr int kSlots = 2;

struct MapCache {
  std::mutex mutex;
  LensMapsRef slots[kSlots];  // most recently used first
};

MapCache& DistortCache() {
  static MapCache cache;
  return cache;
}

MapCache& FringingCache() {
  static MapCache cache;
  return cache;
}

std::atomic<uint64_t> g_builds{0};

// The low 16 bits, as a two's-complement value.
int16_t Low16(int v) { return static_cast<int16_t>(static_cast<uint16_t>(v)); }

std::unique_ptr<LensMaps> NewMaps(float ratio, int width, int height, int planes) {
  std::unique_ptr<LensMaps> maps(new (std::nothrow) LensMaps);
  if (!maps) return maps;
  maps->ratio = ratio;
  maps->width = width;
  maps->height = height;
  const size_t count = size_t(width) * size_t(height);
  for (int p = 0; p < planes; ++p) {
    maps->plane[p].reset(new (std::nothrow) LensPoint[count]);
    if (!maps->plane[p]) return nullptr;
  }
  return maps;
}

// Offsets from the centre over one quadrant (dx, dy >= 0), in the precision of their formulas.
template <class T>
struct Quadrant {
  int qw = 0;
  std::unique_ptr<T[]> x;
  std::unique_ptr<T[]> y;

  bool Alloc(int width, int height) {
    qw = (width >> 1) + 1;
    const size_t count = size_t(qw) * size_t((height >> 1) + 1);
    x.reset(new (std::nothrow) T[count]);
    y.reset(new (std::nothrow) T[count]);
    return x && y;
  }
};

// Each pixel's offset is the quadrant's, negated left of and above the centre; `finish` turns
// offset + centre, summed in T, into the stored coordinate.
template <class T, class Finish>
void Assemble(const Quadrant<T>& q, int width, int height, LensPoint* out, Finish finish) {
  const int cx = width >> 1;
  const int cy = height >> 1;
  const T fcx = static_cast<float>(cx);
  const T fcy = static_cast<float>(cy);
  for (int y = 0; y < height; ++y) {
    const size_t row = size_t(y < cy ? cy - y : y - cy) * size_t(q.qw);
    for (int x = 0; x < width; ++x, ++out) {
      const size_t i = row + size_t(x < cx ? cx - x : x - cx);
      const T ox = x < cx ? -q.x[i] : q.x[i];
      const T oy = y < cy ? -q.y[i] : q.y[i];
      *out = finish(ox + fcx, oy + fcy);
    }
  }
}

// Unit direction of (u, v), 0 at the centre.
void Direction(float u, float v, float r, float* cosT, float* sinT) {
  *cosT = r == 0.0f ? 0.0f : u / r;
  *sinT = r == 0.0f ? 0.0f : v / r;
}

// What a distortion map takes from the frame size and the sign of k alone, per quadrant point:
// the radius, r^e (taken in double, rounded to float) and the direction. A strength that changes
// every frame keeps its sign, so only the cheap per-strength step is redone.
struct DistortBasis {
  int width = 0;
  int height = 0;
  int kind = -1;  // 0 for k < 0, 1 for k > 0, 2 otherwise
  std::unique_ptr<float[]> r, power, cosT, sinT;
};

struct BasisCache {
  std::mutex mutex;  // held while a build reads the basis
  DistortBasis basis;
};

BasisCache& DistortBasisCache() {
  static BasisCache cache;
  return cache;
}

// All in float. The basis's rows are qw points apart.
bool FillBasis(DistortBasis* b, int width, int height, int kind, int qw, float nx, float ny,
               double power) {
  const size_t count = size_t(qw) * size_t((height >> 1) + 1);
  b->kind = -1;
  for (auto* plane : {&b->r, &b->power, &b->cosT, &b->sinT}) {
    plane->reset(new (std::nothrow) float[count]);
    if (!*plane) return false;
  }
  for (int j = 0; j <= (height >> 1); ++j) {
    for (int i = 0; i < qw; ++i) {
      const float u = static_cast<float>(i) / nx;
      const float v = static_cast<float>(j) / ny;
      const float r = std::sqrt(u * u + v * v);
      const size_t q = size_t(j) * size_t(qw) + size_t(i);
      Direction(u, v, r, &b->cosT[q], &b->sinT[q]);
      b->r[q] = r;
      b->power[q] = static_cast<float>(std::pow(static_cast<double>(r), power));
    }
  }
  b->width = width;
  b->height = height;
  b->kind = kind;
  return true;
}

// All in float but r^e, which is taken in double and rounded to float. Each quadrant row gives
// the map rows at that distance above and below the centre.
LensMapsRef BuildDistort(float d, int width, int height) {
  std::unique_ptr<LensMaps> maps = NewMaps(d, width, height, 1);
  const int qw = (width >> 1) + 1;
  std::unique_ptr<float[]> rowX(new (std::nothrow) float[size_t(qw)]);
  std::unique_ptr<float[]> rowY(new (std::nothrow) float[size_t(qw)]);
  if (!maps || !rowX || !rowY) return LensMapsRef();
  const float k = d / 100.0f;
  const int cx = width >> 1;
  const int cy = height >> 1;
  const float fcx = static_cast<float>(cx);
  const float fcy = static_cast<float>(cy);
  const float diagonal = std::sqrt(fcx * fcx + fcy * fcy);
  const float nx = k < 0.0f ? static_cast<float>(width) : diagonal;
  const float ny = k < 0.0f ? static_cast<float>(height) : diagonal;
  const double power = k > 0.0f ? 3.0 : 6.0;
  const float rescale = k >= 0.0f ? 1.0f / (k + 1.0f) : 1.0f;
  const int kind = k < 0.0f ? 0 : k > 0.0f ? 1 : 2;
  const float scale[4] = {k, rescale, nx, ny};

  const LensResampleRows& rows = BestLensResampleRows();
  BasisCache& cache = DistortBasisCache();
  std::lock_guard<std::mutex> lock(cache.mutex);
  DistortBasis& b = cache.basis;
  if ((b.width != width || b.height != height || b.kind != kind) &&
      !FillBasis(&b, width, height, kind, qw, nx, ny, power)) {
    return LensMapsRef();
  }
  // No clamping.
  LensPoint* out = maps->plane[0].get();
  for (int j = 0; j <= cy; ++j) {
    const size_t q = size_t(j) * size_t(qw);
    rows.distortOffsets(&b.r[q], &b.power[q], &b.cosT[q], &b.sinT[q], size_t(qw), scale, rowX.get(),
                        rowY.get());
    if (cy + j < height) {
      rows.assembleRow(rowX.get(), rowY.get(), false, width, cx, fcx, fcy,
                       out + size_t(cy + j) * size_t(width));
    }
    if (j > 0) {
      rows.assembleRow(rowX.get(), rowY.get(), true, width, cx, fcx, fcy,
                       out + size_t(cy - j) * size_t(width));
    }
  }
  return LensMapsRef(maps.release());
}

// u, v, r and the direction in float; s, t, R and the coordinates in double.
LensMapsRef BuildFringing(float f, int width, int height) {
  std::unique_ptr<LensMaps> maps = NewMaps(f, width, height, 3);
  Quadrant<double> o;
  Quadrant<float> direction;
  if (!maps || !o.Alloc(width, height) || !direction.Alloc(width, height)) return LensMapsRef();
  const size_t count = size_t(o.qw) * size_t((height >> 1) + 1);
  std::unique_ptr<double[]> radius(new (std::nothrow) double[count]);
  if (!radius) return LensMapsRef();

  const float k = f / 100.0f;
  const double s = 1.0 + 0.03 * k;
  const double t = 1.0 - 0.03 * k;
  for (int j = 0; j <= (height >> 1); ++j) {
    for (int i = 0; i < o.qw; ++i) {
      const float u = static_cast<float>(i) / static_cast<float>(width);
      const float v = static_cast<float>(j) / static_cast<float>(height);
      const float r = std::sqrt(u * u + v * v);
      const size_t q = size_t(j) * size_t(o.qw) + size_t(i);
      Direction(u, v, r, &direction.x[q], &direction.y[q]);
      radius[q] = (std::pow(static_cast<double>(r), 10.0) * k + r) * s;
    }
  }

  const double margin = k > 0.0f ? 2.0 : 1.0;
  const double maxX = width - margin;
  const double maxY = height - margin;
  // Clamped into 0..max; a NaN goes to 0, and on frames too small for the margin 0 wins.
  const auto clamp = [](double v, double hi) {
    const double below = v < hi ? v : hi;
    return below > 0.0 ? below : 0.0;
  };
  // `scale` is t for blue, s for red; green has none.
  const auto fill = [&](const double* scale, LensPoint* out) {
    for (size_t q = 0; q < count; ++q) {
      const double cosT = direction.x[q];
      const double sinT = direction.y[q];
      o.x[q] = (scale ? *scale * cosT * radius[q] : cosT * radius[q]) * width;
      o.y[q] = (scale ? *scale * sinT * radius[q] : sinT * radius[q]) * height;
    }
    Assemble(o, width, height, out, [&](double sx, double sy) {
      return LensPoint{Low16(static_cast<int>(clamp(sx, maxX))),
                       Low16(static_cast<int>(clamp(sy, maxY)))};
    });
  };
  fill(&t, maps->plane[0].get());
  fill(nullptr, maps->plane[1].get());
  fill(&s, maps->plane[2].get());
  return LensMapsRef(maps.release());
}

using Builder = LensMapsRef (*)(float, int, int);

LensMapsRef Lookup(MapCache& cache, float ratio, int width, int height, Builder build) {
  const auto matches = [&](const LensMapsRef& m) {
    return m && m->ratio == ratio && m->width == width && m->height == height;
  };
  {
    std::lock_guard<std::mutex> lock(cache.mutex);
    for (int i = 0; i < kSlots; ++i) {
      if (!matches(cache.slots[i])) continue;
      LensMapsRef found = cache.slots[i];
      for (; i > 0; --i) cache.slots[i] = std::move(cache.slots[i - 1]);
      cache.slots[0] = found;
      return found;
    }
  }
  // Built outside the lock so that other settings are not held up; a thread that races us to the
  // same settings builds an identical set.
  LensMapsRef built = build(ratio, width, height);
  if (!built) return built;
  g_builds.fetch_add(1, std::memory_order_relaxed);
  LensMapsRef evicted;
  {
    std::lock_guard<std::mutex> lock(cache.mutex);
    evicted = std::move(cache.slots[kSlots - 1]);
    for (int i = kSlots - 1; i > 0; --i) cache.slots[i] = std::move(cache.slots[i - 1]);
    cache.slots[0] = built;
  }
  return built;  // `evicted` is freed here, outside the lock, unless someone still reads it
}

// Sound, and small enough for a map of int-indexed points.
bool HasPixels(const CxImage* img) {
  return IsSoundImage(img) && img->GetWidth() <= INT_MAX / img->GetHeight();
}

// The byte-offset walk; see distortFilter in the header. A source outside the buffer leaves the
// pixel as it was, which in a target laid out like its source is the source's pixel.
template <size_t kBytes>
void ResampleBytes(const LensPoint* map, size_t count, size_t rowBytes, const uint8_t* src,
                   size_t srcSize, uint8_t* dst, size_t pixelBytes) {
  const size_t bytes = kBytes ? kBytes : pixelBytes;
  for (size_t i = 0; i < count; ++i) {
    const int64_t pos = int64_t{map[i].y} * int64_t(rowBytes) + map[i].x;
    const bool inside = pos >= 0 && uint64_t(pos) + bytes <= srcSize;
    std::memcpy(dst + i * bytes, src + (inside ? size_t(pos) : i * bytes), bytes);
  }
}

bool SameLayout(const CxImage& a, const CxImage& b) {
  return a.GetWidth() == b.GetWidth() && a.GetHeight() == b.GetHeight() &&
         a.GetBpp() == b.GetBpp() && a.GetEffWidth() == b.GetEffWidth() &&
         a.GetSize() == b.GetSize() && a.getFormat() == b.getFormat();
}

}  // namespace

LensMapsRef DistortMaps(float d, int width, int height) {
  return Lookup(DistortCache(), d, width, height, BuildDistort);
}

LensMapsRef FringingMaps(float f, int width, int height) {
  return Lookup(FringingCache(), f, width, height, BuildFringing);
}

uint64_t LensMapBuilds() { return g_builds.load(std::memory_order_relaxed); }

bool DistortFrom(const CxImage& source, CxImage* target, float d) {
  if (d == 0.0f || !HasPixels(target) || !source.GetBits() || !SameLayout(source, *target)) {
    return false;
  }
  const size_t pixelBytes = target->GetBpp() / 8;
  if (pixelBytes == 0) return false;
  const int width = static_cast<int>(target->GetWidth());
  const int height = static_cast<int>(target->GetHeight());
  const LensMapsRef maps = DistortMaps(d, width, height);
  if (!maps) return false;

  const size_t pixels = size_t(width) * size_t(height);
  const size_t fits = target->GetSize() / pixelBytes;
  const size_t count = pixels < fits ? pixels : fits;
  const size_t rowBytes = size_t(width) * pixelBytes;
  const LensPoint* map = maps->plane[0].get();
  if (pixelBytes == 4 && rowBytes <= 65535 && source.GetSize() <= INT32_MAX) {
    BestLensResampleRows().distort(map, count, static_cast<int32_t>(rowBytes), source.GetBits(),
                                   static_cast<int32_t>(source.GetSize()), target->GetBits());
  } else if (pixelBytes == 4) {
    ResampleBytes<4>(map, count, rowBytes, source.GetBits(), source.GetSize(), target->GetBits(),
                     4);
  } else {
    ResampleBytes<0>(map, count, rowBytes, source.GetBits(), source.GetSize(), target->GetBits(),
                     pixelBytes);
  }
  return true;
}

bool FringeFrom(const CxImage& source, CxImage* target, float f) {
  if (f == 0.0f || !HasPixels(target) || !source.GetBits() || !SameLayout(source, *target)) {
    return false;
  }
  const int width = static_cast<int>(target->GetWidth());
  const int height = static_cast<int>(target->GetHeight());
  const LensMapsRef maps = FringingMaps(f, width, height);
  if (!maps) return false;

  const LensPoint* blue = maps->plane[0].get();
  const LensPoint* green = maps->plane[1].get();
  const LensPoint* red = maps->plane[2].get();
  if (target->GetBpp() != 32 || target->getFormat() != IPF_BGRA) {
    for (int y = 0, i = 0; y < height; ++y) {
      for (int x = 0; x < width; ++x, ++i) {
        // Coordinates that wrapped negative (frames over 32767 pixels) are out of range, so
        // they read as zero.
        const tagRGBQUAD b = source.GetPixelColor(long(blue[i].x), long(blue[i].y), true);
        const tagRGBQUAD g = source.GetPixelColor(long(green[i].x), long(green[i].y), true);
        const tagRGBQUAD r = source.GetPixelColor(long(red[i].x), long(red[i].y), true);
        target->SetPixelColor(x, y, tagRGBQUAD{b.rgbBlue, g.rgbGreen, r.rgbRed, g.rgbReserved});
      }
    }
    return true;
  }
  // GetPixelColor's addressing and bounds on BGRA words (blue in the low byte). Clamped
  // coordinates always lie inside frames of up to 32768 pixels a side; only larger ones can
  // wrap to negative values and need the check.
  const uint8_t* src = source.GetBits();
  const size_t stride = source.GetEffWidth();
  const auto word = [&](LensPoint p) {
    uint32_t w;
    std::memcpy(&w, src + size_t(p.y) * stride + size_t(p.x) * 4, 4);
    return w;
  };
  const bool checked = width > 32768 || height > 32768;
  if (!checked && source.GetSize() <= INT32_MAX) {
    const LensResampleRows& rows = BestLensResampleRows();
    for (int y = 0; y < height; ++y) {
      const size_t i0 = size_t(y) * size_t(width);
      rows.fringe(blue + i0, green + i0, red + i0, size_t(width), src, static_cast<int32_t>(stride),
                  target->GetBits() + size_t(y) * target->GetEffWidth());
    }
    return true;
  }
  const auto checkedWord = [&](LensPoint p) -> uint32_t {
    if (p.x < 0 || p.y < 0 || p.x >= width || p.y >= height) return 0;
    return word(p);
  };
  for (int y = 0; y < height; ++y) {
    uint8_t* out = target->GetBits() + size_t(y) * target->GetEffWidth();
    const size_t i0 = size_t(y) * size_t(width);
    for (int x = 0; x < width; ++x, out += 4) {
      const size_t i = i0 + size_t(x);
      const uint32_t b = checked ? checkedWord(blue[i]) : word(blue[i]);
      const uint32_t g = checked ? checkedWord(green[i]) : word(green[i]);
      const uint32_t r = checked ? checkedWord(red[i]) : word(red[i]);
      const uint32_t pixel = (b & 0x000000ffu) | (g & 0xff00ff00u) | (r & 0x00ff0000u);
      std::memcpy(out, &pixel, 4);
    }
  }
  return true;
}

namespace {

bool PackedBgra(const CxImage& image, int width, int height) {
  return image.GetBits() && image.GetBpp() == 32 && image.getFormat() == IPF_BGRA &&
         image.GetWidth() == unsigned(width) && image.GetHeight() == unsigned(height) &&
         image.GetEffWidth() == unsigned(width) * 4 &&
         image.GetSize() == size_t(width) * size_t(height) * 4;
}

// Large composites in whole huge pages where the system lends them: the composite is written
// once, all of it, and a fault per 4 KiB page costs a good share of building it.
LensBlock* AllocateBlocks(size_t count) {
  const size_t huge = size_t{2} << 20;
  const size_t bytes = count * sizeof(LensBlock);
  const bool large = bytes >= huge;
  const size_t rounded = large ? (bytes + huge - 1) / huge * huge : bytes;
  void* memory = nullptr;
  if (posix_memalign(&memory, large ? huge : alignof(LensBlock), rounded) != 0) return nullptr;
#ifdef MADV_HUGEPAGE
  if (large) madvise(memory, rounded, MADV_HUGEPAGE);
#endif
  return static_cast<LensBlock*>(memory);
}

}  // namespace

void LensComposite::Free::operator()(LensBlock* memory) const { std::free(memory); }

bool ComposeLens(float d, float f, int width, int height, LensComposite* out) {
  *out = LensComposite();
  // Rows of at most 32764 bytes keep DistortFrom on its int32 walk and every offset in range.
  if (d == 0.0f || f == 0.0f || width <= 0 || height <= 0 || width > 8191 || height > 8191) {
    return false;
  }
  const LensMapsRef distort = DistortMaps(d, width, height);
  const LensMapsRef fringe = FringingMaps(f, width, height);
  if (!distort || !fringe) return false;
  const size_t count = size_t(width) * size_t(height);
  const size_t blocks = (count + 15) / 16;
  out->blocks.reset(AllocateBlocks(blocks));
  if (!out->blocks) return false;
  // A fringing point is a pixel j of the distorted frame (always inside it), which holds the
  // source's bytes at the distortion's offset, or the source's own pixel j when that offset
  // leaves the buffer.
  const int32_t rowBytes = width * 4;
  const int64_t size = int64_t(count) * 4;
  const LensPoint* d0 = distort->plane[0].get();
  const LensPoint* planes[3] = {fringe->plane[0].get(), fringe->plane[1].get(),
                                fringe->plane[2].get()};
  LensBlock* coded = out->blocks.get();
  BestLensResampleRows().composeBlocks(planes[0], planes[1], planes[2], d0, count, width, coded);
  try {
    for (size_t b = 0; b < blocks; ++b) {
      if (coded[b].spill != -2) continue;
      coded[b] = LensBlock();
      coded[b].spill = static_cast<int32_t>(out->spill.size() / 48);
      const size_t i0 = b * 16;
      for (int p = 0; p < 3; ++p) {
        for (size_t l = 0; l < 16; ++l) {
          // Lanes past the last pixel are padding, never resampled.
          int32_t offset = 0;
          if (i0 + l < count) {
            const LensPoint point = planes[p][i0 + l];
            const size_t j = size_t(point.y) * size_t(width) + size_t(point.x);
            const int64_t pos = int64_t{d0[j].y} * rowBytes + d0[j].x;
            offset = static_cast<int32_t>(pos >= 0 && pos + 4 <= size ? pos : int64_t(j) * 4);
          }
          out->spill.push_back(offset);
        }
      }
    }
  } catch (const std::bad_alloc&) {
    *out = LensComposite();
    return false;
  }
  out->distortion = d;
  out->fringing = f;
  out->width = width;
  out->height = height;
  return true;
}

bool DistortFringeFrom(const CxImage& source, CxImage* target, const LensComposite& composite) {
  if (!composite.blocks || !PackedBgra(source, composite.width, composite.height) ||
      !PackedBgra(*target, composite.width, composite.height)) {
    return false;
  }
  BestLensResampleRows().fringeBlocks(composite.blocks.get(),
                                      size_t(composite.width) * size_t(composite.height),
                                      composite.spill.data(), composite.width * 4, source.GetBits(),
                                      static_cast<int32_t>(source.GetSize()), target->GetBits());
  return true;
}

}  // namespace tfx

CxImage* distortFilter(CxImage* img, float d) {
  if (d == 0.0f || !tfx::HasPixels(img)) return img;
  CxImage copy;
  copy.Copy(img);
  tfx::DistortFrom(copy, img, d);
  return img;
}

CxImage* fringingFilter(CxImage* img, float f) {
  if (f == 0.0f || !tfx::HasPixels(img)) return img;
  CxImage copy;
  copy.Copy(img);
  tfx::FringeFrom(copy, img, f);
  return img;
}

void releaseLensVariables() {
  {
    tfx::DistortBasis dropped;
    std::lock_guard<std::mutex> lock(tfx::DistortBasisCache().mutex);
    std::swap(dropped, tfx::DistortBasisCache().basis);
  }
  for (tfx::MapCache* cache : {&tfx::DistortCache(), &tfx::FringingCache()}) {
    tfx::LensMapsRef dropped[tfx::kSlots];
    {
      std::lock_guard<std::mutex> lock(cache->mutex);
      for (int i = 0; i < tfx::kSlots; ++i) dropped[i] = std::move(cache->slots[i]);
    }
  }
}
