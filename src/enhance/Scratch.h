// Scratch memory for the enhancement functions: one aligned block per call, released on scope
// exit. Allocation failure gives a null block, never an exception.
#pragma once

#include <cstddef>

#include "tessarofx/AlignedMemory.h"

namespace tfx {

class ScratchBlock {
 public:
  explicit ScratchBlock(size_t bytes) : block_(aligned_malloc(bytes, 64)) {}
  ~ScratchBlock() { aligned_free(block_); }
  ScratchBlock(const ScratchBlock&) = delete;
  ScratchBlock& operator=(const ScratchBlock&) = delete;

  explicit operator bool() const { return block_ != nullptr; }
  template <class T>
  T* As(size_t byte_offset = 0) const {
    return reinterpret_cast<T*>(static_cast<unsigned char*>(block_) + byte_offset);
  }

 private:
  void* block_;
};

}  // namespace tfx
