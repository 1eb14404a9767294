// GlobalAlloc and GlobalFree. Only fixed blocks exist here: the subset has no
// GlobalLock, so GMEM_MOVEABLE is refused with ERROR_NOT_SUPPORTED. Live blocks are
// remembered, so freeing an unknown or already freed pointer fails cleanly instead of
// corrupting the heap.
#include <cstdlib>
#include <mutex>
#include <new>
#include <unordered_set>

#include "windows.h"

namespace {

// Far beyond any real request; keeps absurd sizes away from the allocator, which
// under the sanitizers would abort rather than return null.
constexpr SIZE_T kMaxBlock = SIZE_T{1} << 40;

struct Blocks {
  std::mutex mutex;
  std::unordered_set<void*> live;
};

// A static object, so that a library unloaded with the plugin leaves no allocation
// behind; nothing frees blocks from static destructors.
Blocks& LiveBlocks() {
  static Blocks blocks;
  return blocks;
}

}  // namespace

extern "C" HGLOBAL WINAPI GlobalAlloc(UINT uFlags, SIZE_T dwBytes) {
  if (uFlags & ~static_cast<UINT>(GMEM_VALID_FLAGS)) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return nullptr;
  }
  if (uFlags & GMEM_MOVEABLE) {
    SetLastError(ERROR_NOT_SUPPORTED);
    return nullptr;
  }
  if (dwBytes > kMaxBlock) {
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
  // A zero-byte request still gets a distinct block. malloc's alignment (16 on
  // 64-bit glibc) covers the 8 bytes Windows promises.
  const SIZE_T size = dwBytes ? dwBytes : 1;
  void* block = (uFlags & GMEM_ZEROINIT) ? std::calloc(1, size) : std::malloc(size);
  if (!block) {
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
  try {
    Blocks& blocks = LiveBlocks();
    std::lock_guard<std::mutex> lock(blocks.mutex);
    blocks.live.insert(block);
  } catch (const std::bad_alloc&) {
    std::free(block);
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
  SetLastError(ERROR_SUCCESS);
  return block;
}

extern "C" HGLOBAL WINAPI GlobalFree(HGLOBAL hMem) {
  // Freeing null is a no-op that succeeds, as with free().
  if (hMem) {
    Blocks& blocks = LiveBlocks();
    std::lock_guard<std::mutex> lock(blocks.mutex);
    if (blocks.live.erase(hMem) == 0) {
      SetLastError(ERROR_INVALID_HANDLE);
      return hMem;
    }
    std::free(hMem);
  }
  SetLastError(ERROR_SUCCESS);
  return nullptr;
}
