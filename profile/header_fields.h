// The header fields of a Profile as script properties. Each get reads the open
// profile's header; each set reads it, changes one field and writes it back.
#ifndef TINTWELL_PROFILE_HEADER_FIELDS_H
#define TINTWELL_PROFILE_HEADER_FIELDS_H

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "error_state.h"
#include "profile.h"
#include "signatures.h"

namespace header_fields {

// What a property does when the object has no open profile.
enum class NoProfile {
  Event,      // last error -1 with the error event; nothing read or written
  Silent,     // last error -1 without an event
  NotTested,  // go on: the header read (and any write) fails and reports the system error
};

template <NoProfile Policy>
bool HasProfile(const ProfileData* d) {
  if (Policy == NoProfile::NotTested || d->profile) return true;
  if (Policy == NoProfile::Event)
    SetCMError(kErrorInvalidObject);
  else
    LastCMError = kErrorInvalidObject;
  return false;
}

inline uint32_t Word(const PROFILEHEADER& h, std::size_t offset) {
  uint32_t w;
  std::memcpy(&w, reinterpret_cast<const char*>(&h) + offset, sizeof w);
  return w;
}

inline void PutWord(PROFILEHEADER& h, std::size_t offset, uint32_t w) {
  std::memcpy(reinterpret_cast<char*>(&h) + offset, &w, sizeof w);
}

// Field kinds: each knows its script type, how to read it and how to change it.
template <std::size_t Offset>
struct SignatureField {
  using Type = REALstring;
  static REALstring Get(const PROFILEHEADER& h) { return TagToString(Word(h, Offset)); }
  static void Set(PROFILEHEADER& h, REALstring v) { PutWord(h, Offset, TagFromString(v)); }
};

template <std::size_t Offset>
struct IntegerField {
  using Type = int32_t;
  static int32_t Get(const PROFILEHEADER& h) { return static_cast<int32_t>(Word(h, Offset)); }
  static void Set(PROFILEHEADER& h, int32_t v) { PutWord(h, Offset, static_cast<uint32_t>(v)); }
};

// A device-attributes word: only the value's low 16 bits are stored.
template <std::size_t Offset>
struct AttributeField {
  using Type = int32_t;
  static int32_t Get(const PROFILEHEADER& h) { return static_cast<int32_t>(Word(h, Offset)); }
  static void Set(PROFILEHEADER& h, int32_t v) { PutWord(h, Offset, static_cast<uint32_t>(v) & 0xFFFFu); }
};

// One 16-bit date field: the upper or lower half of a date word.
template <std::size_t Offset, bool Upper>
struct DateField {
  using Type = int32_t;
  static constexpr unsigned kShift = Upper ? 16 : 0;
  static int32_t Get(const PROFILEHEADER& h) { return static_cast<int32_t>(Word(h, Offset) >> kShift & 0xFFFFu); }
  static void Set(PROFILEHEADER& h, int32_t v) {
    const uint32_t kept = Word(h, Offset) & ~(0xFFFFu << kShift);
    PutWord(h, Offset, kept | (static_cast<uint32_t>(v) & 0xFFFFu) << kShift);
  }
};

// One flag bit; an inverted flag reads True when its bit is clear.
template <std::size_t Offset, unsigned Bit, bool Inverted>
struct BitField {
  using Type = bool;
  static bool Get(const PROFILEHEADER& h) { return ((Word(h, Offset) >> Bit & 1u) != 0) != Inverted; }
  static void Set(PROFILEHEADER& h, bool v) {
    uint32_t w = Word(h, Offset) & ~(1u << Bit);
    if (v != Inverted) w |= 1u << Bit;
    PutWord(h, Offset, w);
  }
};

// Profile flags bits 16-17.
struct QualityField {
  using Type = int32_t;
  static constexpr std::size_t kOffset = offsetof(PROFILEHEADER, phProfileFlags);
  static int32_t Get(const PROFILEHEADER& h) { return static_cast<int32_t>((Word(h, kOffset) & 0x30000u) >> 16); }
  static void Set(PROFILEHEADER& h, int32_t v) {
    PutWord(h, kOffset, (Word(h, kOffset) & ~0x30000u) | (static_cast<uint32_t>(v) << 16 & 0x30000u));
  }
};

// An illuminant component in s15Fixed16. Values whose fixed-point form leaves the
// signed 32-bit range store 0x80000000.
template <std::size_t Offset>
struct WhiteField {
  using Type = double;
  static double Get(const PROFILEHEADER& h) { return static_cast<int32_t>(Word(h, Offset)) / 65536.0; }
  static void Set(PROFILEHEADER& h, double v) {
    const double t = std::trunc(v * 65536.0);
    const int32_t fixed = (t >= -2147483648.0 && t <= 2147483647.0) ? static_cast<int32_t>(t) : INT32_MIN;
    PutWord(h, Offset, static_cast<uint32_t>(fixed));
  }
};

template <class Field, NoProfile Policy>
typename Field::Type Get(REALobject self, intptr_t) {
  const ProfileData* d = GetProfileData(self);
  if (!HasProfile<Policy>(d)) return typename Field::Type{};
  PROFILEHEADER header;
  ReadProfileHeader(d->profile, &header);
  return Field::Get(header);
}

template <class Field, NoProfile Policy>
void Set(REALobject self, intptr_t, typename Field::Type value) {
  const ProfileData* d = GetProfileData(self);
  if (!HasProfile<Policy>(d)) return;
  PROFILEHEADER header;
  // A header that cannot be read from an open profile is never overwritten with zeros.
  if (!ReadProfileHeader(d->profile, &header) && d->profile) return;
  Field::Set(header, value);
  if (!SetColorProfileHeader(d->profile, &header)) ReportSystemError();
}

}  // namespace header_fields

#endif
