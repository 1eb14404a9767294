// Fuzz target for the named-colour reader: the input is one tag's bytes, stored in a
// blank profile held in memory and read as the profile members read it. A list read
// whole never holds more colours than the bytes carry, nor more than 8 device
// coordinates; written back and read again it must come out the same.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "tag_fuzz_support.h"
#include "tag_codecs.h"
#include "vector_nc.h"

namespace {

using tagfuzz::AsObject;
using tagfuzz::BlankProfile;
using tagfuzz::Check;
using tagfuzz::OpenWithTag;

constexpr TAGTYPE kTag = 0x6E636C32;   // 'ncl2'
constexpr TAGTYPE kCopy = 0x6E636C33;  // 'ncl3'

bool Same(const VectorNCData& a, const VectorNCData& b) {
  return a.count == b.count && a.devicecount == b.devicecount && std::memcmp(a.prefix, b.prefix, 32) == 0 &&
         std::memcmp(a.suffix, b.suffix, 32) == 0 &&
         (a.count == 0 || std::memcmp(a.entries, b.entries, a.count * sizeof(NamedColorEntry)) == 0);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static std::vector<std::uint8_t> blank = BlankProfile("nmcl", "RGB ", "Lab ");
  HPROFILE h = OpenWithTag(blank, kTag, data, size);

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
