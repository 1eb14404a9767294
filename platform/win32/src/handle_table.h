// One table for every handle the stand-in hands out (profiles, transforms, find and
// file handles). Each entry carries its kind, so a transform handle passed where a
// profile is expected is refused, and handle values are never reused, so a closed
// handle stays invalid.
#ifndef TINTWELL_WIN32_HANDLE_TABLE_H
#define TINTWELL_WIN32_HANDLE_TABLE_H

#include <cstdint>
#include <memory>
#include <mutex>
#include <unordered_map>

#include "windows.h"

namespace win32 {

enum class HandleKind { Profile, Transform, Find, File };

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
};

HandleTable& Handles();

}  // namespace win32

#endif
