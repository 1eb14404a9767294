// VectorNC: a script's list of named colours, as a namedColor2Type tag holds them.
#ifndef TINTWELL_TAGS_VECTOR_NC_H
#define TINTWELL_TAGS_VECTOR_NC_H

#include <cstdint>

#include "instance_data.h"
#include "plugin_records.h"

// An entry holds at most this many device coordinates; a tag or a script asking for
// more is refused.
constexpr int32_t kMaxDeviceCoordinates = 8;

struct NamedColorEntry {
  char rootName[32];  // zero-padded; a 32-character name fills it without a terminator
  uint16_t pcs[3];    // ICC 16-bit encoding, host byte order
  uint16_t device[kMaxDeviceCoordinates];
};

// Valid when all its bytes are zero (the host zero-fills instance data).
struct VectorNCData {
  NamedColorEntry* entries;  // owned (malloc'd); null while capacity is 0
  uint32_t count;
  uint32_t capacity;
  char prefix[32];      // zero-terminated
  char suffix[32];      // zero-terminated
  int32_t devicecount;  // 0 .. kMaxDeviceCoordinates
  uint16_t pcsspace;    // a COLORTYPE code; 5 (COLOR_Lab) after construction
};

extern REALclassDefinition VectorNCClass;

inline VectorNCData* GetVectorNCData(REALobject list) { return GetInstanceData<VectorNCData>(list, VectorNCClass); }

// Appends entry, growing the storage as needed; false, and the list unchanged, when it
// cannot grow.
bool VectorNCAppend(VectorNCData* list, const NamedColorEntry& entry);
// Empties the list; prefix, suffix, devicecount and pcsspace stay.
void VectorNCClear(VectorNCData* list);

#endif
