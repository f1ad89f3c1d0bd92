// Every set of kernels a table exported with HWY_EXPORT holds for this CPU, for the tests that
// hold each instruction set against the scalar forms. Include after <hwy/highway.h>, in the
// HWY_ONCE part of a kernel file.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

namespace tfx {

// The entry of `target` in an HWY_EXPORT table, by the rule hwy::ChosenTarget applies to the
// mask of supported targets, here holding that one target: dynamic targets in their own slots,
// EMU128 or SCALAR in the last.
inline size_t DispatchSlot(int64_t target) {
#if (HWY_TARGETS & (HWY_TARGETS - 1)) == 0
  static_cast<void>(target);
  return 0;  // a single target gets a single-entry table
#else
  const int64_t mask = (HWY_CHOSEN_TARGET_SHIFT(target) | HWY_CHOSEN_TARGET_MASK_SCALAR) &
                       HWY_CHOSEN_TARGET_MASK_TARGETS;
  return hwy::Num0BitsBelowLS1Bit_Nonzero64(static_cast<uint64_t>(mask));
#endif
}

// What `table[slot]()` returns for each target both compiled in and run by this CPU, best
// (lowest bit) first: the targets of hwy::SupportedAndGeneratedTargets(), walked here because its
// std::vector<int64_t> would be instantiated with default visibility and exported.
template <class T>
std::vector<T*> EverySupportedSet(T* (*const* table)()) {
  std::vector<T*> sets;
  for (int64_t targets = hwy::SupportedTargets() & HWY_TARGETS; targets != 0;
       targets &= targets - 1) {
    sets.push_back(table[DispatchSlot(targets & ~(targets - 1))]());
  }
  return sets;
}

}  // namespace tfx
