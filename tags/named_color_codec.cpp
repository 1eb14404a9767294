// namedColor2Type: a named-colour list between a profile's tag and a VectorNC.
//
//   0 'ncl2'  4 zero  8 vendor flag  12 count N  16 device coordinates D
//   20 prefix (32)  52 suffix (32)  84 N colours of 38 + 2D bytes:
//   root name (32), PCS (3 × 16 bits), device (D × 16 bits); all big-endian.
#include <cstring>
#include <vector>

#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "signatures.h"
#include "tag_codecs.h"
#include "tag_io.h"
#include "vector_nc.h"

namespace {

constexpr std::size_t kHeaderBytes = 84;
constexpr std::size_t kNameBytes = 32;
constexpr std::size_t kPcsBytes = 6;

// What the reader does with the list once the tag has been checked.
enum class Into { Append, Replace };

int32_t ReadNamedColors(HPROFILE profile, TAGTYPE tag, VectorNCData* list, Into into) {
  std::vector<uint8_t> bytes;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok) {
    if (into == Into::Replace) VectorNCClear(list);
    return -1;
  }
  if (TagTypeOf(bytes) != kTypeNamedColor2) {
    RefuseTag("Tag is not a named colour list");
    return -1;
  }
  const ByteReader in(bytes.data(), bytes.size());
  uint32_t count = 0, device = 0;
  if (!in.Has(0, kHeaderBytes) || !in.U32(12, &count) || !in.U32(16, &device)) {
    RefuseTag("Named colour tag is too short");
    return -1;
  }
  // An entry has room for 8 device coordinates; a tag that claims more would overrun it.
  if (device > static_cast<uint32_t>(kMaxDeviceCoordinates)) {
    RefuseTag("Named colour tag has more than 8 device coordinates");
    return -1;
  }
  const std::size_t colorBytes = kNameBytes + kPcsBytes + 2 * std::size_t{device};
  if (count > in.Remaining(kHeaderBytes) / colorBytes) {
    RefuseTag("Named colour count exceeds the tag");
    return -1;
  }

  // The tag holds all it claims: from here on the list changes.
  if (into == Into::Replace) VectorNCClear(list);
  list->devicecount = static_cast<int32_t>(device);
  std::memcpy(list->prefix, in.At(20), sizeof list->prefix);
  list->prefix[sizeof list->prefix - 1] = 0;
  std::memcpy(list->suffix, in.At(52), sizeof list->suffix);
  list->suffix[sizeof list->suffix - 1] = 0;

  std::size_t at = kHeaderBytes;
  for (uint32_t n = 0; n < count; ++n, at += colorBytes) {
    NamedColorEntry entry;
    std::memset(&entry, 0, sizeof entry);
    std::memcpy(entry.rootName, in.At(at), kNameBytes);
    entry.rootName[kNameBytes - 1] = 0;
    for (std::size_t i = 0; i < 3; ++i) in.U16(at + kNameBytes + 2 * i, &entry.pcs[i]);
    for (std::size_t i = 0; i < device; ++i) in.U16(at + kNameBytes + kPcsBytes + 2 * i, &entry.device[i]);
    if (!VectorNCAppend(list, entry)) {
      SendDebugString("Not enough memory for the named colours");
      SetCMError(ERROR_NOT_ENOUGH_MEMORY);
      return -1;
    }
  }
  return static_cast<int32_t>(count);
}

}  // namespace

void HALVO_ICMWriteTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC) {
  TraceWriteBanner("--------> HALVO_ICMWriteTagNC", tag);
  if (!vectorNC) return;
  const VectorNCData* list = GetVectorNCData(vectorNC);
  const int32_t device = list->devicecount;
  // The list's own setters keep devicecount within an entry and its size within one
  // tag; a record that holds otherwise is not written.
  const uint64_t total = kHeaderBytes + uint64_t{list->count} * (kNameBytes + kPcsBytes + 2 * uint64_t(device));
  if (device < 0 || device > kMaxDeviceCoordinates || total > 0xFFFFFFFFu) {
    SetCMError(ERROR_INVALID_PARAMETER);
    return;
  }

  TagWriter out(profile, tag, static_cast<DWORD>(total));
  out.PutTypeHeader(kTypeNamedColor2, "SetColorProfileElement1 fail");
  out.PutU32(0, "SetColorProfileElement2 fail");
  out.PutU32(list->count, "SetColorProfileElement3 fail");
  out.PutU32(static_cast<uint32_t>(device), "SetColorProfileElement4 fail");
  out.Put(list->prefix, sizeof list->prefix, "SetColorProfileElement5 fail");
  out.Put(list->suffix, sizeof list->suffix, "SetColorProfileElement6 fail");
  // One piece per name and per coordinate; a failure ends the tag.
  for (uint32_t n = 0; n < list->count && !out.failed(); ++n) {
    const NamedColorEntry& entry = list->entries[n];
    // The field ends with a zero byte, so a 32-character name is cut to 31 as every
    // reader of the tag, this one included, would read it.
    char name[kNameBytes];
    std::memcpy(name, entry.rootName, kNameBytes);
    name[kNameBytes - 1] = 0;
    out.Put(name, kNameBytes, "SetColorProfileElement7 fail");
    for (uint16_t value : entry.pcs) out.PutU16(value, "SetColorProfileElement8 fail");
    for (int32_t i = 0; i < device; ++i) out.PutU16(entry.device[i], "SetColorProfileElement9 fail");
  }
}

int32_t HALVO_ICMReadTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC) {
  if (!vectorNC) return -1;
  return ReadNamedColors(profile, tag, GetVectorNCData(vectorNC), Into::Append);
}

namespace tag_members {

// v's colours become the tag's. When the tag cannot be fetched, v is left empty; a tag
// that does not hold what it claims is refused and leaves v as it was.
void GetNC(REALobject self, REALstring tag, REALobject vectorNC) {
  if (!vectorNC) return;
  ReadNamedColors(ProfileHandle(self), TagFromString(tag), GetVectorNCData(vectorNC), Into::Replace);
}

// Stores 0 first, so that CMError() tells whether the tag was written whole.
void SetNC(REALobject self, REALstring tag, REALobject vectorNC) {
  if (!vectorNC) return;
  LastCMError = 0;
  const TAGTYPE signature = TagFromString(tag);
  bridge::LockObject(vectorNC);
  HALVO_ICMWriteTagNC(ProfileHandle(self), signature, vectorNC);
  bridge::UnlockObject(vectorNC);
}

}  // namespace tag_members
