// What the tag-reader fuzz targets share: a blank profile in memory whose one tag holds
// the fuzz input, zeroed records standing in for the plugin's objects, and a check that
// names its line before aborting.
#ifndef TINTWELL_FUZZ_TAG_FUZZ_SUPPORT_H
#define TINTWELL_FUZZ_TAG_FUZZ_SUPPORT_H

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "plugin_records.h"

namespace tagfuzz {

inline void Check(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "check failed at line %d\n", line);
  std::abort();
}

// A header that opens: its size, version 2.1, the class and spaces given, 'acsp', no tags.
inline std::vector<std::uint8_t> BlankProfile(const char* profileClass, const char* dataSpace, const char* pcs) {
  std::vector<std::uint8_t> b(132, 0);
  b[3] = 132;
  b[8] = 0x02, b[9] = 0x10;
  std::memcpy(&b[12], profileClass, 4);
  std::memcpy(&b[16], dataSpace, 4);
  std::memcpy(&b[20], pcs, 4);
  std::memcpy(&b[36], "acsp", 4);
  return b;
}

// Opens the blank profile read-write, with tag holding the size bytes at data.
inline HPROFILE OpenWithTag(std::vector<std::uint8_t>& blank, TAGTYPE tag, const std::uint8_t* data,
                            std::size_t size) {
  PROFILE profile{PROFILE_MEMBUFFER, blank.data(), static_cast<DWORD>(blank.size())};
  HPROFILE h = OpenColorProfileA(&profile, PROFILE_READWRITE, 0, OPEN_EXISTING);
  Check(h != nullptr);
  std::vector<std::uint8_t> bytes(data, data + size);
  DWORD n = static_cast<DWORD>(size);
  Check(SetColorProfileElementSize(h, tag, n) == (size > 0));
  if (size > 0) Check(SetColorProfileElement(h, tag, 0, &n, bytes.data()) && n == size);
  return h;
}

// Before registration every class's instance offset is 0, so a zeroed record stands in
// for an object of its class.
template <class Record>
REALobject AsObject(Record* record) {
  return reinterpret_cast<REALobject>(record);
}

}  // namespace tagfuzz

#endif
