// Running a check once per Highway instruction set, for code that dispatches at run time.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>

#include <hwy/targets.h>

namespace tfx_test {

// Runs `body` once with the kernels of each instruction set compiled in and run by this CPU.
template <class Body>
void ForEveryTarget(Body body) {
  for (const int64_t target : hwy::SupportedAndGeneratedTargets()) {
    SCOPED_TRACE(hwy::TargetName(target));
    hwy::SetSupportedTargetsForTest(target);
    body();
  }
  hwy::SetSupportedTargetsForTest(0);
}

}  // namespace tfx_test
