// cLut: a script's lookup-table tag (lut8Type or lut16Type) as channel counts, a grid
// size, a 3 x 3 matrix and three flat tables held in Vector and Matrix objects.
#ifndef TINTWELL_TAGS_CLUT_H
#define TINTWELL_TAGS_CLUT_H

#include <cstdint>

#include "instance_data.h"
#include "plugin_records.h"

// Valid when all its bytes are zero (the host zero-fills instance data): no members
// held, which every user reads as empty tables and the identity matrix. Each member set
// carries one host reference that the record owns.
struct ClutData {
  bool is16Bit;             // lut16Type ("mft2") when true, lut8Type ("mft1") otherwise
  int32_t gridPointCount;   // g: grid points along each input axis
  int32_t inChannelCount;   // i
  int32_t outChannelCount;  // o
  REALobject matrix3D;      // Matrix
  REALobject inCurve;       // Vector: the input tables, channel after channel
  REALobject lut;           // Vector: the grid entries in tag order
  REALobject outCurve;      // Vector: the output tables, channel after channel
};

extern REALclassDefinition ClutClass;

inline ClutData* GetClutData(REALobject clut) { return GetInstanceData<ClutData>(clut, ClutClass); }

// count / channels, truncating; 0 for no channels, so a script's zero count never traps.
int32_t EntriesPerChannel(uint32_t count, int32_t channels);

#endif
