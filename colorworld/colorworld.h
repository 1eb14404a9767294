// ColorWorld: one colour transform built from open profiles, matching CMColor values
// in place and checking Lab colours against the transform's gamut.
#ifndef TINTWELL_COLORWORLD_COLORWORLD_H
#define TINTWELL_COLORWORLD_COLORWORLD_H

#include <cstdint>

#include "plugin_records.h"
#include "win32_api.h"

struct ColorWorldData {
  HTRANSFORM transform;  // null when the colour world has none
  uint8_t inType;        // COLORTYPE of the colours handed to the transform
  uint8_t outType;       // COLORTYPE of the colours it delivers
};

extern REALclassDefinition ColorWorldClass;

// The colour type under which colours of an ICC data colour space are exchanged.
COLORTYPE ColorTypeForSpace(uint32_t space);

// Global method: a new colour world built from up to four profiles.
REALobject NewConcatColorWorld(int32_t keyindex, REALobject p1, REALobject p2, REALobject p3, REALobject p4);

#endif
