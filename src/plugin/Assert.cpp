#include "plugin/Assert.h"

#include <cstdio>
#include <cstdlib>

namespace tfx {

void AssertFail(const char* expr, const char* file, int line, const char* function) {
  std::fprintf(stderr, "%s:%d: %s: Assertion `%s' failed.\n", file, line, function, expr);
  std::fflush(stderr);
  std::abort();
}

}  // namespace tfx
