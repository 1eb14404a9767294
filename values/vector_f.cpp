#include "vector_f.h"

#include <cstdlib>
#include <cstring>

#include "class_tables.h"
#include "growable.h"
#include "host_bridge.h"

namespace {

// The most items a list holds: 1 GiB of 64-bit references, as for Vector, so a 32-bit
// and a 64-bit build refuse the same sizes, at once, before any allocation is tried.
constexpr uint32_t kMaxCount = 0x08000000u;

VectorFData* Data(REALobject self) { return GetVectorFData(self); }

bool Reserve(VectorFData* v, uint64_t needed) { return GrowStorage(v->elements, v->capacity, needed, kMaxCount); }

bool InRange(const VectorFData* v, int32_t index) { return index >= 0 && static_cast<uint32_t>(index) < v->count; }

// Drops elements from..count-1, unlocking each in index order.
void Truncate(VectorFData* v, uint32_t from) {
  // Lowered first, so that an unlock that runs a script's code never sees a released item.
  const uint32_t end = v->count;
  v->count = from;
  for (uint32_t i = from; i < end; ++i) bridge::UnlockObject(v->elements[i]);
}

// Stores item (already locked by the caller) before element index, 0 <= index <= count.
// False, and nothing stored, when the storage cannot grow.
bool Place(VectorFData* v, uint32_t index, REALobject item) {
  if (!Reserve(v, static_cast<uint64_t>(v->count) + 1)) return false;
  REALobject* at = v->elements + index;
  std::memmove(at + 1, at, (v->count - index) * sizeof(REALobject));
  *at = item;
  ++v->count;
  return true;
}

// Locks item and stores it before element index; an item that cannot be stored is
// neither locked nor kept.
void LockAndPlace(VectorFData* v, uint32_t index, REALobject item) {
  if (!Reserve(v, static_cast<uint64_t>(v->count) + 1)) return;
  bridge::LockObject(item);
  Place(v, index, item);
}

void Construct(REALobject self) { Data(self)->count = 0; }

int32_t GetSize(REALobject self, intptr_t) { return static_cast<int32_t>(Data(self)->count); }

// Surplus elements are unlocked and dropped, missing ones appended as nil; a negative
// size or one that cannot be held leaves the list as it is.
void SetSize(REALobject self, intptr_t, int32_t size) {
  VectorFData* v = Data(self);
  if (size < 0) return;
  const uint32_t n = static_cast<uint32_t>(size);
  if (n < v->count) {
    Truncate(v, n);
  } else if (n > v->count) {
    if (!Reserve(v, n)) return;
    std::memset(v->elements + v->count, 0, (n - v->count) * sizeof(REALobject));
    v->count = n;
  }
}

// The caller gets a reference of its own; the list keeps its lock.
REALfolderItem Get(REALobject self, int32_t index) {
  const VectorFData* v = Data(self);
  if (!InRange(v, index)) return nullptr;
  REALobject item = v->elements[index];
  bridge::LockObject(item);
  return item;
}

// The new item is locked before the replaced one is unlocked, so that setting an element
// to the item it holds keeps that item alive.
void Set(REALobject self, int32_t index, REALfolderItem item) {
  VectorFData* v = Data(self);
  if (!InRange(v, index)) return;
  bridge::LockObject(item);
  REALobject replaced = v->elements[index];
  v->elements[index] = item;
  bridge::UnlockObject(replaced);
}

void Append(REALobject self, REALfolderItem item) {
  VectorFData* v = Data(self);
  LockAndPlace(v, v->count, item);
}

// index = count appends; beyond it, or negative, nothing happens.
void Insert(REALobject self, int32_t index, REALfolderItem item) {
  VectorFData* v = Data(self);
  if (index < 0 || static_cast<uint32_t>(index) > v->count) return;
  LockAndPlace(v, static_cast<uint32_t>(index), item);
}

void Delete(REALobject self, int32_t index) {
  VectorFData* v = Data(self);
  if (!InRange(v, index)) return;
  REALobject* at = v->elements + index;
  REALobject removed = *at;
  std::memmove(at, at + 1, (v->count - static_cast<uint32_t>(index) - 1) * sizeof(REALobject));
  --v->count;
  bridge::UnlockObject(removed);
}

void Clear(REALobject self) { Truncate(Data(self), 0); }

int32_t Count(REALobject self) { return static_cast<int32_t>(Data(self)->count); }

int32_t Ubound(REALobject self) { return static_cast<int32_t>(Data(self)->count) - 1; }

// Unlocks every item, then releases the storage: nothing uses it once the object is gone.
void Destruct(REALobject self) {
  VectorFData* v = Data(self);
  Truncate(v, 0);
  std::free(v->elements);
  v->elements = nullptr;
  v->capacity = 0;
}

REALproperty properties[] = {
    {nullptr, "size", "Integer", 0, AsProc(&GetSize), AsProc(&SetSize), 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&Get), nullptr, "Get(index as Integer) as Folderitem"},
    {AsProc(&Set), nullptr, "Set(index as Integer, val as Folderitem)"},
    {AsProc(&Append), nullptr, "Append(val as Folderitem)"},
    {AsProc(&Insert), nullptr, "Insert(index as Integer, val as Folderitem)"},
    {AsProc(&Delete), nullptr, "Delete(index as Integer)"},
    {AsProc(&Clear), nullptr, "Clear()"},
    {AsProc(&Count), nullptr, "Count() as integer"},
    {AsProc(&Ubound), nullptr, "Ubound() as integer"},
};

}  // namespace

bool VectorFAdopt(VectorFData* v, REALobject item) { return Place(v, v->count, item); }

REALclassDefinition VectorFClass =
    ClassDefinition("VectorF", sizeof(VectorFData), AsProc(&Construct), AsProc(&Destruct), properties, methods);
