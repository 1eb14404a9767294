#include "vector.h"

#include <cstdlib>
#include <cstring>

#include "class_tables.h"
#include "growable.h"
#include "debugger.h"

namespace {

// The most elements a Vector holds: 1 GiB of doubles, about the largest block a 32-bit
// process can hope for. The same limit holds on every platform, so that a script (or a
// tag that claims billions of entries) meets the same refusal everywhere, at once,
// instead of an attempt to allocate and fill many gigabytes.
constexpr uint32_t kMaxCount = 0x08000000u;

VectorData* Data(REALobject self) { return GetVectorData(self); }

bool Reserve(VectorData* v, uint64_t needed) { return GrowStorage(v->elements, v->capacity, needed, kMaxCount); }

bool InRange(const VectorData* v, int32_t index) { return index >= 0 && static_cast<uint32_t>(index) < v->count; }

int32_t GetSize(REALobject self, intptr_t) { return static_cast<int32_t>(Data(self)->count); }

// Surplus elements are dropped, missing ones appended as 0.0; a negative size or one
// that cannot be held leaves the list as it is.
void SetSize(REALobject self, intptr_t, int32_t size) {
  VectorData* v = Data(self);
  if (size < 0) return;
  const uint32_t n = static_cast<uint32_t>(size);
  if (n > v->count) {
    if (!Reserve(v, n)) return;
    std::memset(v->elements + v->count, 0, (n - v->count) * sizeof(double));
  }
  v->count = n;
}

void Construct(REALobject self) { Data(self)->count = 0; }

double Get(REALobject self, int32_t index) {
  const VectorData* v = Data(self);
  return InRange(v, index) ? v->elements[index] : 0.0;
}

void Set(REALobject self, int32_t index, double value) {
  VectorData* v = Data(self);
  if (InRange(v, index)) v->elements[index] = value;
}

void Append(REALobject self, double value) { VectorAppend(Data(self), value); }

// An index at or past the end appends, whatever its size; a negative one does nothing.
void Insert(REALobject self, int32_t index, double value) {
  VectorData* v = Data(self);
  if (index >= 0 && static_cast<uint32_t>(index) >= v->count) {
    VectorAppend(v, value);
    return;
  }
  if (index < 0 || !Reserve(v, static_cast<uint64_t>(v->count) + 1)) return;
  double* at = v->elements + index;
  std::memmove(at + 1, at, (v->count - static_cast<uint32_t>(index)) * sizeof(double));
  *at = value;
  ++v->count;
}

void Delete(REALobject self, int32_t index) {
  VectorData* v = Data(self);
  if (!InRange(v, index)) return;
  double* at = v->elements + index;
  std::memmove(at, at + 1, (v->count - static_cast<uint32_t>(index) - 1) * sizeof(double));
  --v->count;
}

void Clear(REALobject self) { VectorClear(Data(self)); }

void Debug(REALobject self) { VectorDebug(Data(self)); }

// Nothing uses the storage once the object is gone: release it.
void Destruct(REALobject self) {
  VectorData* v = Data(self);
  std::free(v->elements);
  v->elements = nullptr;
  v->capacity = 0;
  v->count = 0;
}

REALproperty properties[] = {
    {nullptr, "size", "Integer", 0, AsProc(&GetSize), AsProc(&SetSize), 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&Construct), nullptr, "vector()"},
    {AsProc(&Get), nullptr, "Get(index as Integer) as Double"},
    {AsProc(&Set), nullptr, "Set(index as Integer, val as Double)"},
    {AsProc(&Append), nullptr, "Append(val as Double)"},
    {AsProc(&Insert), nullptr, "Insert(index as Integer, val as Double)"},
    {AsProc(&Delete), nullptr, "Delete(index as Integer)"},
    {AsProc(&Clear), nullptr, "Clear()"},
    {AsProc(&Debug), nullptr, "Debug()"},
};

}  // namespace

bool VectorAppend(VectorData* v, double value) {
  if (!Reserve(v, static_cast<uint64_t>(v->count) + 1)) return false;
  v->elements[v->count++] = value;
  return true;
}

void VectorClear(VectorData* v) { v->count = 0; }

void VectorDebug(const VectorData* v) {
  for (uint32_t i = 0; i < v->count; ++i) SendDebugDouble(v->elements[i]);
}

REALclassDefinition VectorClass =
    ClassDefinition("Vector", sizeof(VectorData), nullptr, AsProc(&Destruct), properties, methods);
