// What the host kit's sources share among themselves: the constructors behind the class factory
// and the guard that keeps exceptions from crossing an interface. Nothing here is exported.
#pragma once

#include <cstdint>
#include <new>
#include <stdexcept>

#include "tessarofx/NLEComBase.h"
#include "tessarofx/NLEFrame.h"
#include "tessarofx/NLEHost.h"

namespace tfx::host {

// New objects start with no reference; the factory takes the first one. `outer`, when given,
// aggregates the object. They throw std::bad_alloc when memory runs out.
scombase::CUnknown* NewPropertyBag(IUnknown* outer);
scombase::CUnknown* NewEnvironment(IUnknown* outer);
scombase::CUnknown* NewMemoryFrame(IUnknown* outer);

// The process-wide environment service. It is never destroyed, so late users at exit are safe.
INLEEnviroment* SharedEnvironment();

// A frame's storage object, describing the storage as it is when it is asked for. Any frame
// kind can hand one out, whatever memory its pixels live in.
HRESULT CreateFrameBuffer(int32_t stride, int32_t size, INLEFrameBuffer** out);

// Runs `body` and turns the only exceptions the kit's code can raise (running out of memory, or
// a string too long to hold) into a result code.
template <class F>
HRESULT CallGuarded(F&& body) noexcept {
  try {
    return body();
  } catch (const std::bad_alloc&) {
    return NLE_E_OUTOFMEMORY;
  } catch (const std::length_error&) {
    return NLE_E_OUTOFMEMORY;
  }
}

}  // namespace tfx::host
