#include "icm/profile_validity.h"

#include "icm.h"

namespace win32::icm {

namespace {

constexpr std::uint32_t kA2B0 = 0x41324230;
constexpr std::uint32_t kB2A0 = 0x42324130;
constexpr std::uint32_t kNcl2 = 0x6E636C32;
constexpr std::uint32_t kGrayTRC = 0x6B545243;
constexpr std::uint32_t kMatrixShaperTags[] = {
    0x7258595A, 0x6758595A, 0x6258595A,  // rXYZ gXYZ bXYZ
    0x72545243, 0x67545243, 0x62545243,  // rTRC gTRC bTRC
};
constexpr std::size_t kMinTagSize = 12;

bool Usable(const IccContainer& profile, std::uint32_t signature) {
  const Block* block = profile.Element(signature);
  return block != nullptr && block->size() >= kMinTagSize && ReadBE32(block->data()) != 0;
}

}  // namespace

bool IsUsableProfile(const IccContainer& profile) {
  const std::uint8_t* header = profile.Header().data();
  if (ReadBE32(header + kOffsetSignature) != kSignatureAcsp) return false;
  const std::uint8_t major = header[kOffsetVersion];
  if (major < 2 || major > 4) return false;
  if (ReadBE32(header + kOffsetSize) != profile.ByteSize()) return false;

  switch (ReadBE32(header + kOffsetClass)) {
    case CLASS_LINK:
    case CLASS_ABSTRACT:
      return Usable(profile, kA2B0);
    case CLASS_NAMED:
      return Usable(profile, kNcl2);
    case CLASS_SCANNER:
    case CLASS_MONITOR:
    case CLASS_PRINTER:
    case CLASS_COLORSPACE:
      break;
    default:
      return false;
  }
  if (Usable(profile, kA2B0) || Usable(profile, kB2A0)) return true;
  switch (ReadBE32(header + kOffsetDataSpace)) {
    case SPACE_GRAY:
      return Usable(profile, kGrayTRC);
    case SPACE_RGB:
      for (std::uint32_t signature : kMatrixShaperTags)
        if (!Usable(profile, signature)) return false;
      return true;
    default:
      return false;
  }
}

}  // namespace win32::icm
