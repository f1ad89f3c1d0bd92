// The Khronos C++ bindings as every OpenCL effect's source file includes them. Each such file
// thereby holds the bindings' default context and queue holders and cl::NullRange: empty from
// load, released at exit, never used for work. Kernels run through the host's OpenCL classes
// only, so the filters work with whatever context the host made.
#pragma once

#define CL_HPP_TARGET_OPENCL_VERSION 120
#define CL_HPP_MINIMUM_OPENCL_VERSION 120
#include <CL/opencl.hpp>
