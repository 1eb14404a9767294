// Vector: a script's growable list of doubles, and the operations that the tag codecs
// and the other container classes perform on its record directly.
#ifndef TINTWELL_VALUES_VECTOR_H
#define TINTWELL_VALUES_VECTOR_H

#include <cstdint>

#include "instance_data.h"
#include "plugin_records.h"

// Valid when all its bytes are zero (the host zero-fills instance data): no storage,
// nothing held. Removing elements never shrinks the storage.
struct VectorData {
  uint32_t capacity;  // doubles the storage holds
  uint32_t count;     // elements 0 .. count-1 are valid; count <= capacity
  double* elements;   // owned (malloc'd); null while capacity is 0
};

extern REALclassDefinition VectorClass;

inline VectorData* GetVectorData(REALobject vector) { return GetInstanceData<VectorData>(vector, VectorClass); }

// Appends value, growing the storage as needed. False, and the list unchanged, when the
// storage cannot grow.
bool VectorAppend(VectorData* v, double value);
// Empties the list; the storage stays.
void VectorClear(VectorData* v);
// Traces every element in order with SendDebugDouble.
void VectorDebug(const VectorData* v);

#endif
