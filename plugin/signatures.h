// Four-character ICC signatures between script strings and 32-bit values, and the byte
// swaps for the big-endian numbers in ICC data.
#ifndef TINTWELL_PLUGIN_SIGNATURES_H
#define TINTWELL_PLUGIN_SIGNATURES_H

#include <cstdint>

#include "plugin_records.h"

// The first four bytes of the string's text, the first most significant. A shorter
// text contributes its characters and then zero bytes; nothing past it is read.
uint32_t TagFromString(REALstring text);

// A new host string of exactly four characters, the most significant byte first.
REALstring TagToString(uint32_t signature);

inline uint16_t SwapBytes16(uint16_t v) { return static_cast<uint16_t>(v >> 8 | v << 8); }
inline uint32_t SwapBytes32(uint32_t v) {
  return v >> 24 | (v >> 8 & 0xFF00u) | (v << 8 & 0xFF0000u) | v << 24;
}

#endif
