// Programming errors that must stop the process, in release builds too.
#pragma once

namespace tfx {

// Prints "file:line: function: Assertion `expr' failed." to stderr and aborts.
[[noreturn]] void AssertFail(const char* expr, const char* file, int line, const char* function);

}  // namespace tfx

#define TFX_ASSERT(expr) \
  ((expr) ? static_cast<void>(0) : ::tfx::AssertFail(#expr, __FILE__, __LINE__, __func__))
