// Growth of the plugin's list records (Vector, VectorF, VectorNC): plain storage from
// realloc, valid when zero-filled, that grows geometrically up to a fixed limit.
#ifndef TINTWELL_VALUES_GROWABLE_H
#define TINTWELL_VALUES_GROWABLE_H

#include <cstddef>
#include <cstdint>
#include <cstdlib>

// Makes room for at least needed elements, keeping those held. False, and nothing
// changed, when needed is beyond limit or the storage cannot grow to it. Growth doubles
// (from 8) so that appends stay cheap; a doubling that cannot be had falls back to
// exactly what is needed.
template <class T>
bool GrowStorage(T*& elements, uint32_t& capacity, uint64_t needed, uint32_t limit) {
  if (needed <= capacity) return true;
  if (needed > limit) return false;
  uint64_t target = uint64_t{capacity} * 2;
  if (target < 8) target = 8;
  if (target > limit) target = limit;
  if (target < needed) target = needed;
  void* grown = nullptr;
  for (;;) {
    const uint64_t bytes = target * sizeof(T);
    // Beyond a 32-bit address space there is nothing to ask for.
    if (bytes == static_cast<std::size_t>(bytes)) grown = std::realloc(elements, static_cast<std::size_t>(bytes));
    if (grown || target == needed) break;
    target = needed;
  }
  if (!grown) return false;  // realloc left the old storage in place
  elements = static_cast<T*>(grown);
  capacity = static_cast<uint32_t>(target);
  return true;
}

#endif
