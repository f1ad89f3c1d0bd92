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

// x / 255 as float division rounds it, for whole numbers x from 0 to 510, without widening to
// double: 1 / 255 is 2^-8 + 2^-16 plus 2^-16 / 255. The product of x and the first part (9
// significant bits each) is exact; the product with the small rest and the sum each round, and
// for all 511 such x the result is the float quotient (the every-colour tests of the kernels
// that use this reach each of them).
template <class DF>
HWY_INLINE hn::Vec<DF> DivideWholeBy255(DF df, hn::Vec<DF> x) {
  return hn::Add(hn::Mul(x, hn::Set(df, 0x1.01p-8f)),
                 hn::Mul(x, hn::Set(df, (1.0f / 255.0f) * 0x1p-16f)));
}
