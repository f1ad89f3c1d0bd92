// An OpenCL runtime that aborts the process while the ICD loader starts it, as a runtime does
// that cannot find its machine (PoCL without /sys) or a broken driver: the loader asks every
// runtime for this function first.
#include <cstdlib>

extern "C" __attribute__((visibility("default"))) void* clGetExtensionFunctionAddress(const char*) {
  std::abort();
}
