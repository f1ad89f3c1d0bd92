// Aligned blocks for the enhancement functions and their callers. Both pairs sit on
// posix_memalign, so a block from either one could be released by free(); each pair is still
// kept to its own release function in the interface, as a host that swaps the allocator expects.
#include "tessarofx/AlignedMemory.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>

namespace {

constexpr size_t kAllocAlignment = 32;

void* AllocateAligned(size_t size, size_t alignment) {
  // No object may span more than half the address space; refuse before the allocator sees it.
  if (size > static_cast<size_t>(PTRDIFF_MAX)) return nullptr;
  void* block = nullptr;
  // A request for nothing still gets a block of its own, which the caller may free.
  if (posix_memalign(&block, alignment, size == 0 ? 1 : size) != 0) return nullptr;
  return block;
}

}  // namespace

void* AllocMemory(uint32_t size, bool zero) {
  void* block = AllocateAligned(size, kAllocAlignment);
  if (block != nullptr && zero) std::memset(block, 0, size);
  return block;
}

void FreeMemory(void* block) { std::free(block); }

void* aligned_malloc(size_t size, size_t alignment) {
  if (alignment == 0 || (alignment & (alignment - 1)) != 0) return nullptr;
  // posix_memalign takes multiples of the pointer size only.
  if (alignment < sizeof(void*)) alignment = sizeof(void*);
  return AllocateAligned(size, alignment);
}

void aligned_free(void* block) { std::free(block); }
