// Aligned scratch memory as the enhancement functions allocate it, published so that a host can
// hand those functions buffers with the same alignment and release what they return.
#pragma once

#include <cstddef>
#include <cstdint>

#include "tessarofx/Export.h"

// A block of `size` bytes aligned to 32 bytes, zero-filled when `zero` is true; null when the
// allocation fails. Release it with FreeMemory.
TFX_API void* AllocMemory(uint32_t size, bool zero);
// Releases an AllocMemory block; null is ignored.
TFX_API void FreeMemory(void* block);

// A block of `size` bytes aligned to `alignment` (a power of two; smaller values are raised to
// the pointer size); null when the allocation fails, the alignment is not a power of two or the
// size exceeds PTRDIFF_MAX.
// Release it with aligned_free.
TFX_API void* aligned_malloc(size_t size, size_t alignment);
// Releases an aligned_malloc block; null is ignored.
TFX_API void aligned_free(void* block);
