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

}  // namespace HWY_NAMESPACE
}  // namespace tfx
HWY_AFTER_NAMESPACE();

#if HWY_ONCE
namespace tfx {

HWY_EXPORT(BoxRowAccumulateOfTarget);
HWY_EXPORT(BoxRowStepOfTarget);
HWY_EXPORT(BoxRowDifferenceOfTarget);

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

}  // namespace tfx
#endif  // HWY_ONCE
