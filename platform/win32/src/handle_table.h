// One table for every handle the stand-in hands out (profiles, transforms, find and
// file handles, device contexts). Each entry carries its kind, so a transform handle
// passed where a profile is expected is refused, and handle values are never reused, so
// a closed handle stays invalid.
//
// The table lives in a shared library of its own: the host and a plugin each link the
// rest of the stand-in statically, and a handle one of them makes (a device context on
// a host picture) must be found by the other, as one process-wide table on Windows.
#ifndef TINTWELL_WIN32_HANDLE_TABLE_H
#define TINTWELL_WIN32_HANDLE_TABLE_H

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <unordered_map>

#include "windows.h"

namespace win32 {

enum class HandleKind { Profile, Transform, Find, File, DeviceContext };

class HandleTable {
 public:
  HANDLE Insert(HandleKind kind, std::shared_ptr<void> object);

  // The object behind a live handle of this kind, or null.
  template <class T>
  std::shared_ptr<T> Lookup(HANDLE handle, HandleKind kind) const {
    return std::static_pointer_cast<T>(Find(handle, kind));
  }

  // Removes a live handle of this kind; returns its object, or null if there was none.
  template <class T>
  std::shared_ptr<T> Remove(HANDLE handle, HandleKind kind) {
    return std::static_pointer_cast<T>(Take(handle, kind));
  }

  // Grows each time a handle is removed. A caller may remember what a lookup found
  // together with this value, and use it without a new lookup while the value is
  // unchanged (the per-pixel GDI calls do).
  std::uint64_t Generation() const { return removals_.load(std::memory_order_acquire); }

 private:
  struct Entry {
    HandleKind kind;
    std::shared_ptr<void> object;
  };
  std::shared_ptr<void> Find(HANDLE handle, HandleKind kind) const;
  std::shared_ptr<void> Take(HANDLE handle, HandleKind kind);

  mutable std::mutex mutex_;
  std::unordered_map<std::uintptr_t, Entry> entries_;
  std::uintptr_t next_ = 0x1000;
  std::atomic<std::uint64_t> removals_{0};
};

HandleTable& Handles();

}  // namespace win32

#endif
