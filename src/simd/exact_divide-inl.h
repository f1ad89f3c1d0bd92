// Exact float division by a small constant, for the Highway kernels. Included inside each
// kernel file's HWY_NAMESPACE, once per target, like the kernels themselves.
//
// x / kDivisor as float division rounds it: the double product with 1 / kDivisor lies within
// 2^-52 (relative) of the quotient, which is never closer than 2^-25 / kDivisor to a point where
// float rounding changes (x has 24 significant bits), so both round alike; and two multiplies
// cost a fraction of a divide.
template <int kDivisor, class DF>
HWY_INLINE hn::Vec<DF> DivideBy(DF df, hn::Vec<DF> x) {
#if HWY_TARGET == HWY_SCALAR
  return hn::Div(x, hn::Set(df, static_cast<float>(kDivisor)));
#else
  const hn::Half<DF> dh;
  const hn::Repartition<double, DF> dd;
  const auto r = hn::Set(dd, 1.0 / kDivisor);
  const auto low = hn::DemoteTo(dh, hn::Mul(hn::PromoteTo(dd, hn::LowerHalf(dh, x)), r));
  const auto high = hn::DemoteTo(dh, hn::Mul(hn::PromoteTo(dd, hn::UpperHalf(dh, x)), r));
  return hn::Combine(df, high, low);
#endif
}
