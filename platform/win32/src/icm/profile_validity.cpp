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

constexpr std::uint32_t kLut8 = 0x6D667431;   // 'mft1'
constexpr std::uint32_t kLut16 = 0x6D667432;  // 'mft2'

// A lut8 or lut16 table must hold the tables its channel counts and grid size claim;
// one written short would otherwise be taken for a usable transform. Sizes in 64 bits,
// the grid capped as soon as it passes what any element can hold.
bool LutFits(const Block& block) {
  const std::uint8_t* data = block.data();
  const std::uint32_t type = ReadBE32(data);
  if (type != kLut8 && type != kLut16) return true;  // other types are judged by the engine
  if (block.size() < 52) return false;
  const std::uint64_t in = data[8], out = data[9], grid = data[10];
  std::uint64_t cells = 1;
  for (std::uint64_t k = 0; k < in && cells <= block.size(); ++k) cells *= grid;
  if (type == kLut8) return 48 + 256 * in + cells * out + 256 * out <= block.size();
  const std::uint64_t inEntries = std::uint64_t{data[48]} << 8 | data[49];
  const std::uint64_t outEntries = std::uint64_t{data[50]} << 8 | data[51];
  return 52 + 2 * (inEntries * in + cells * out + outEntries * out) <= block.size();
}

bool Usable(const IccContainer& profile, std::uint32_t signature) {
  const Block* block = profile.Element(signature);
  return block != nullptr && block->size() >= kMinTagSize && block->Load() && ReadBE32(block->data()) != 0;
}

// The tags that hold lookup tables: A2B0-2, B2A0-2, gamt, pre0-2.
constexpr std::uint32_t kLutTags[] = {0x41324230, 0x41324231, 0x41324232, 0x42324130, 0x42324131,
                                      0x42324132, 0x67616D74, 0x70726530, 0x70726531, 0x70726532};

}  // namespace

bool IsUsableProfile(const IccContainer& profile) {
  const std::uint8_t* header = profile.Header().data();
  if (ReadBE32(header + kOffsetSignature) != kSignatureAcsp) return false;
  const std::uint8_t major = header[kOffsetVersion];
  if (major < 2 || major > 4) return false;
  if (ReadBE32(header + kOffsetSize) != profile.ByteSize()) return false;
  for (std::uint32_t signature : kLutTags) {
    const Block* block = profile.Element(signature);
    // A table whose bytes can no longer be read makes the profile unusable.
    if (block != nullptr && block->size() >= 4 && (!block->Load() || !LutFits(*block))) return false;
  }

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
