// CMColor: one colour value in the COLOR form that colour translation reads and writes in
// place, with one set of accessors per colour space over the same bytes. A colour's data
// take 8 bytes; COLOR itself is the platform's (16 bytes on 64-bit platforms, where the
// union also holds a pointer), and the plugin only ever copies sizeof(COLOR).
#ifndef TINTWELL_VALUES_CMCOLOR_H
#define TINTWELL_VALUES_CMCOLOR_H

#include <cstdint>

#include "plugin_records.h"
#include "win32_api.h"

struct CMColorData {
  COLOR value;        // the colour, in the layout of the colour type last written
  uint8_t colorType;  // COLORTYPE of the last space-specific setter; 0 in a new object
};
static_assert(sizeof(COLOR) >= sizeof(HiFiCOLOR), "a COLOR holds eight one-byte channels");

extern REALclassDefinition CMColorClass;

// The store rule: truncate toward zero to a signed 32-bit integer (0x80000000 when out
// of range or not a number) and keep the low 16 bits, wrapping without clamping.
uint16_t StoreRuleWord(double v);

#endif
