// An OpenCL runtime that aborts while the ICD loader starts it, as one that cannot find its machine
// (PoCL without /sys) or a broken driver does: the loader asks every runtime for this first.
#include <cstdlib>

extern "C" __attribute__((visibility("default"))) void* clGetExtensionFunctionAddress(const char*) {
  std::abort();
}
