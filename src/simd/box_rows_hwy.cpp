// Rows of the box blur's column pass, compiled once per instruction set by foreach_target.h.
// Integer sums and an exact multiply-and-shift quotient: every lane, vector or tail, gives the
// same byte.
#include "simd/box_rows.h"

#undef HWY_TARGET_INCLUDE
#define HWY_TARGET_INCLUDE "simd/box_rows_hwy.cpp"
#include <hwy/foreach_target.h>  // IWYU pragma: keep
#include <hwy/highway.h>

HWY_BEFORE_NAMESPACE();
namespace tfx {
namespace HWY_NAMESPACE {

namespace hn = hwy::HWY_NAMESPACE;

void BoxRowAccumulateOfTarget(uint32_t* HWY_RESTRICT sums, const uint8_t* HWY_RESTRICT row,
                              size_t lanes, uint32_t weight) {
  const hn::ScalableTag<uint32_t> du;
  const hn::Rebind<uint8_t, decltype(du)> d8;
  const size_t n = hn::Lanes(du);
  const auto w = hn::Set(du, weight);
  size_t j = 0;
  for (; j + n <= lanes; j += n) {
    const auto v = hn::PromoteTo(du, hn::LoadU(d8, row + j));
    hn::StoreU(hn::Add(hn::LoadU(du, sums + j), hn::Mul(v, w)), du, sums + j);
  }
  for (; j < lanes; ++j) sums[j] += weight * row[j];
}

void BoxRowStepOfTarget(uint32_t* HWY_RESTRICT sums, const uint8_t* entering,
                        const uint8_t* leaving, uint8_t* out, size_t lanes, BoxQuotient quotient) {
  const hn::ScalableTag<uint32_t> du;
  const hn::RebindToSigned<decltype(du)> di;
  const hn::Rebind<uint8_t, decltype(du)> d8;
  const size_t n = hn::Lanes(du);
  const auto mul = hn::Set(du, quotient.mul);
  size_t j = 0;
  for (; j + n <= lanes; j += n) {
    const auto sum = hn::LoadU(du, sums + j);
    const auto q = hn::ShiftRightSame(hn::Mul(sum, mul), quotient.shift);
    hn::StoreU(hn::DemoteTo(d8, hn::BitCast(di, q)), d8, out + j);
    const auto in = hn::PromoteTo(du, hn::LoadU(d8, entering + j));
    const auto gone = hn::PromoteTo(du, hn::LoadU(d8, leaving + j));
    hn::StoreU(hn::Sub(hn::Add(sum, in), gone), du, sums + j);
  }
  for (; j < lanes; ++j) {
    out[j] = static_cast<uint8_t>((sums[j] * quotient.mul) >> quotient.shift);
    sums[j] += entering[j] - leaving[j];
  }
}

void BoxRowDifferenceOfTarget(const uint32_t* running, size_t span, uint8_t* out, size_t lanes,
                              BoxQuotient quotient) {
  const hn::ScalableTag<uint32_t> du;
  const hn::RebindToSigned<decltype(du)> di;
  const hn::Rebind<uint8_t, decltype(du)> d8;
  const size_t n = hn::Lanes(du);
  const auto mul = hn::Set(du, quotient.mul);
  size_t j = 0;
  for (; j + n <= lanes; j += n) {
    const auto sum = hn::Sub(hn::LoadU(du, running + j + span), hn::LoadU(du, running + j));
    const auto q = hn::ShiftRightSame(hn::Mul(sum, mul), quotient.shift);
    hn::StoreU(hn::DemoteTo(d8, hn::BitCast(di, q)), d8, out + j);
  }
  for (; j < lanes; ++j) {
    const uint32_t sum = running[j + span] - running[j];
    out[j] = static_cast<uint8_t>((sum * quotient.mul) >> quotient.shift);
  }
}

// Taps are added a pair at a time from a row of pair sums, so each output adds half as many
// vectors and widens a single one. With m = ceil(2^16 / taps), n m / 2^16 overshoots n / taps
// by less than n / 2^16, which for n <= 255 taps is below 1 / taps while 255 taps^2 < 2^16: the
// floor is exact.
void BoxRowWindowOfTarget(const uint8_t* HWY_RESTRICT row, size_t pitch, size_t taps,
                          uint8_t* HWY_RESTRICT out, size_t lanes, uint16_t* HWY_RESTRICT pairs) {
  const hn::ScalableTag<uint16_t> d16;
  const hn::RebindToSigned<decltype(d16)> di16;
  const hn::Rebind<uint8_t, decltype(d16)> d8;
  const size_t n = hn::Lanes(d16);
  const size_t half = taps / 2;
  const size_t pairLanes = lanes + 2 * (half - 1) * pitch;
  // A row of at least one vector ends with a vector that overlaps the one before it, writing
  // some lanes twice with the same values.
  const auto pair = [&](size_t i) {
    const auto a = hn::PromoteTo(d16, hn::LoadU(d8, row + i));
    hn::StoreU(hn::Add(a, hn::PromoteTo(d16, hn::LoadU(d8, row + i + pitch))), d16, pairs + i);
  };
  if (pairLanes >= n) {
    for (size_t i = 0; i + n <= pairLanes; i += n) pair(i);
    pair(pairLanes - n);
  } else {
    for (size_t i = 0; i < pairLanes; ++i)
      pairs[i] = static_cast<uint16_t>(row[i] + row[i + pitch]);
  }
  const uint32_t mul = (65536 + static_cast<uint32_t>(taps) - 1) / static_cast<uint32_t>(taps);
  const auto m = hn::Set(d16, static_cast<uint16_t>(mul));
  const uint8_t* last = taps % 2 != 0 ? row + (taps - 1) * pitch : nullptr;
  const auto window = [&](size_t j) {
    auto sum = hn::LoadU(d16, pairs + j);
    for (size_t k = 1; k < half; ++k) sum = hn::Add(sum, hn::LoadU(d16, pairs + j + 2 * k * pitch));
    if (last) sum = hn::Add(sum, hn::PromoteTo(d16, hn::LoadU(d8, last + j)));
    hn::StoreU(hn::DemoteTo(d8, hn::BitCast(di16, hn::MulHigh(sum, m))), d8, out + j);
  };
  if (lanes >= n) {
    for (size_t j = 0; j + n <= lanes; j += n) window(j);
    window(lanes - n);
    return;
  }
  for (size_t j = 0; j < lanes; ++j) {
    uint32_t sum = 0;
    for (size_t t = 0; t < taps; ++t) sum += row[j + t * pitch];
    out[j] = static_cast<uint8_t>((sum * mul) >> 16);
  }
}

void BoxRowStep16OfTarget(uint16_t* HWY_RESTRICT sums, const uint8_t* entering,
                          const uint8_t* leaving, uint8_t* out, size_t lanes, size_t taps) {
  const hn::ScalableTag<uint16_t> d16;
  const hn::RebindToSigned<decltype(d16)> di16;
  const hn::Rebind<uint8_t, decltype(d16)> d8;
  const size_t n = hn::Lanes(d16);
  // The quotient of BoxRowWindow.
  const uint32_t mul = (65536 + static_cast<uint32_t>(taps) - 1) / static_cast<uint32_t>(taps);
  const auto m = hn::Set(d16, static_cast<uint16_t>(mul));
  size_t j = 0;
  for (; j + n <= lanes; j += n) {
    const auto sum = hn::LoadU(d16, sums + j);
    hn::StoreU(hn::DemoteTo(d8, hn::BitCast(di16, hn::MulHigh(sum, m))), d8, out + j);
    const auto in = hn::PromoteTo(d16, hn::LoadU(d8, entering + j));
    const auto gone = hn::PromoteTo(d16, hn::LoadU(d8, leaving + j));
    hn::StoreU(hn::Sub(hn::Add(sum, in), gone), d16, sums + j);
  }
  for (; j < lanes; ++j) {
    out[j] = static_cast<uint8_t>((sums[j] * mul) >> 16);
    sums[j] = static_cast<uint16_t>(sums[j] + entering[j] - leaving[j]);
  }
}

const char* BoxRowsTargetOfTarget() { return hwy::TargetName(HWY_TARGET); }

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(BoxRowAccumulateOfTarget);
HWY_EXPORT(BoxRowStepOfTarget);
HWY_EXPORT(BoxRowDifferenceOfTarget);
HWY_EXPORT(BoxRowWindowOfTarget);
HWY_EXPORT(BoxRowStep16OfTarget);
HWY_EXPORT(BoxRowsTargetOfTarget);

const char* BoxRowsTarget() { return HWY_DYNAMIC_DISPATCH(BoxRowsTargetOfTarget)(); }

void BoxRowDifference(const uint32_t* running, size_t span, uint8_t* out, size_t lanes,
                      BoxQuotient quotient) {
  HWY_DYNAMIC_DISPATCH(BoxRowDifferenceOfTarget)(running, span, out, lanes, quotient);
}

void BoxRowAccumulate(uint32_t* sums, const uint8_t* row, size_t lanes, uint32_t weight) {
  HWY_DYNAMIC_DISPATCH(BoxRowAccumulateOfTarget)(sums, row, lanes, weight);
}

void BoxRowStep(uint32_t* sums, const uint8_t* entering, const uint8_t* leaving, uint8_t* out,
                size_t lanes, BoxQuotient quotient) {
  HWY_DYNAMIC_DISPATCH(BoxRowStepOfTarget)(sums, entering, leaving, out, lanes, quotient);
}

void BoxRowWindow(const uint8_t* row, size_t pitch, size_t taps, uint8_t* out, size_t lanes,
                  uint16_t* pairs) {
  HWY_DYNAMIC_DISPATCH(BoxRowWindowOfTarget)(row, pitch, taps, out, lanes, pairs);
}

void BoxRowStep16(uint16_t* sums, const uint8_t* entering, const uint8_t* leaving, uint8_t* out,
                  size_t lanes, size_t taps) {
  HWY_DYNAMIC_DISPATCH(BoxRowStep16OfTarget)(sums, entering, leaving, out, lanes, taps);
}

}  // namespace tfx
#endif  // HWY_ONCE
