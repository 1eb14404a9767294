// VectorF: a script's growable list of folder items. The list holds one host reference
// to each item in it, taken as the item enters and given up as it leaves.
#ifndef TINTWELL_VALUES_VECTOR_F_H
#define TINTWELL_VALUES_VECTOR_F_H

#include <cstdint>

#include "instance_data.h"
#include "plugin_records.h"

// Valid when all its bytes are zero (the host zero-fills instance data): no storage,
// nothing held. Removing elements never shrinks the storage.
struct VectorFData {
  uint32_t capacity;      // references the storage holds
  uint32_t count;         // elements 0 .. count-1 are valid; count <= capacity
  REALobject* elements;   // owned (malloc'd); null while capacity is 0; nil elements allowed
};

extern REALclassDefinition VectorFClass;

inline VectorFData* GetVectorFData(REALobject list) { return GetInstanceData<VectorFData>(list, VectorFClass); }

// Adds item after the last element, taking over the reference the caller holds on it
// (none is added). False when the storage cannot grow: the list is unchanged and the
// reference stays the caller's.
bool VectorFAdopt(VectorFData* v, REALobject item);

#endif
