#include "base/Assert.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>

namespace tfx {

// Prints what glibc's assert prints, so that logs read the same in every build type.
void AssertFail(const char* expr, const char* file, int line, const char* function) {
#if defined(__GLIBC__)
  std::fprintf(stderr, "%s: ", program_invocation_short_name);
#endif
  std::fprintf(stderr, "%s:%d: %s: Assertion `%s' failed.\n", file, line, function, expr);
  std::fflush(stderr);
  std::abort();
}

}  // namespace tfx
