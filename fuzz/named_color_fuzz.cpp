// Fuzz target for the named-colour reader: the input is one tag's bytes, stored in a
// blank profile held in memory and read as the profile members read it. A list read
// whole never holds more colours than the bytes carry, nor more than 8 device
// coordinates; written back and read again it must come out the same.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "tag_codecs.h"
#include "vector_nc.h"

namespace {

constexpr TAGTYPE kTag = 0x6E636C32;   // 'ncl2'
constexpr TAGTYPE kCopy = 0x6E636C33;  // 'ncl3'

void Check(bool condition) {
  if (!condition) std::abort();
}

// A header that opens: its size, version 2.1, 'acsp', no tags.
std::vector<std::uint8_t> BlankProfile() {
  std::vector<std::uint8_t> b(132, 0);
  b[3] = 132;
  b[8] = 0x02, b[9] = 0x10;
  std::memcpy(&b[12], "nmcl", 4);
  std::memcpy(&b[16], "RGB ", 4);
  std::memcpy(&b[20], "Lab ", 4);
  std::memcpy(&b[36], "acsp", 4);
  return b;
}

// Before registration the VectorNC class's instance offset is 0, so a zeroed record
// stands in for a VectorNC object.
REALobject AsObject(VectorNCData* list) { return reinterpret_cast<REALobject>(list); }

bool Same(const VectorNCData& a, const VectorNCData& b) {
  return a.count == b.count && a.devicecount == b.devicecount && std::memcmp(a.prefix, b.prefix, 32) == 0 &&
         std::memcmp(a.suffix, b.suffix, 32) == 0 &&
         (a.count == 0 || std::memcmp(a.entries, b.entries, a.count * sizeof(NamedColorEntry)) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static std::vector<std::uint8_t> blank = BlankProfile();
  PROFILE profile{PROFILE_MEMBUFFER, blank.data(), static_cast<DWORD>(blank.size())};
  HPROFILE h = OpenColorProfileA(&profile, PROFILE_READWRITE, 0, OPEN_EXISTING);
  Check(h != nullptr);
  std::vector<std::uint8_t> tag(data, data + size);
  DWORD n = static_cast<DWORD>(size);
  Check(SetColorProfileElementSize(h, kTag, n) == (size > 0));
  if (size > 0) Check(SetColorProfileElement(h, kTag, 0, &n, tag.data()) && n == size);

  VectorNCData first{};
  const int32_t colors = HALVO_ICMReadTagNC(h, kTag, AsObject(&first));
  Check(first.count == static_cast<uint32_t>(colors < 0 ? 0 : colors));
  if (colors >= 0) {
    Check(first.devicecount >= 0 && first.devicecount <= kMaxDeviceCoordinates);
    Check(84 + std::uint64_t{first.count} * (38 + 2 * std::uint64_t(first.devicecount)) <= size);
    Check(first.prefix[31] == 0 && first.suffix[31] == 0);
    for (uint32_t i = 0; i < first.count; ++i) Check(first.entries[i].rootName[31] == 0);

    HALVO_ICMWriteTagNC(h, kCopy, AsObject(&first));
    VectorNCData second{};
    Check(HALVO_ICMReadTagNC(h, kCopy, AsObject(&second)) == colors);
    Check(Same(first, second));
    std::free(second.entries);
  }
  std::free(first.entries);
  CloseColorProfile(h);
  return 0;
}
