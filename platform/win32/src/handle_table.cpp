#include "handle_table.h"

namespace win32 {

HANDLE HandleTable::Insert(HandleKind kind, std::shared_ptr<void> object) {
  std::lock_guard<std::mutex> lock(mutex_);
  // Steps of 4 keep handles looking like Windows handles and never hit INVALID_HANDLE_VALUE.
  const std::uintptr_t value = next_;
  next_ += 4;
  entries_.emplace(value, Entry{kind, std::move(object)});
  return reinterpret_cast<HANDLE>(value);
}

std::shared_ptr<void> HandleTable::Find(HANDLE handle, HandleKind kind) const {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = entries_.find(reinterpret_cast<std::uintptr_t>(handle));
  if (it == entries_.end() || it->second.kind != kind) return nullptr;
  return it->second.object;
}

std::shared_ptr<void> HandleTable::Take(HANDLE handle, HandleKind kind) {
  std::lock_guard<std::mutex> lock(mutex_);
  auto it = entries_.find(reinterpret_cast<std::uintptr_t>(handle));
  if (it == entries_.end() || it->second.kind != kind) return nullptr;
  std::shared_ptr<void> object = std::move(it->second.object);
  entries_.erase(it);
  removals_.fetch_add(1, std::memory_order_acq_rel);
  return object;
}

HandleTable& Handles() {
  // Never destroyed: the table outlives every library that put handles in it, and a
  // handle left open by a plugin already unloaded must not be released into its code.
  static HandleTable* table = new HandleTable;
  return *table;
}

}  // namespace win32
