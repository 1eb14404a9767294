// Profile tag access: listing, raw reads and writes, shared tags, the typed XYZ, text
// and description members, and the answers read from the named-colour tag.
#include <cstdlib>
#include <cstring>
#include <string>

#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "signatures.h"
#include "tag_codecs.h"
#include "vector_nc.h"

namespace {

constexpr TAGTYPE kDescTag = 0x64657363;        // 'desc'
constexpr TAGTYPE kCopyrightTag = 0x63707274;   // 'cprt'
constexpr TAGTYPE kNamedColorTag = 0x6E636C32;  // 'ncl2'
constexpr DWORD kTypeHeaderBytes = 8;
constexpr std::size_t kNameBuffer = 128;  // a Name holds at most 127 characters

HPROFILE Handle(REALobject self) { return GetProfileData(self)->profile; }

// Members that need an open profile report -1 when there is none, with the error event
// or (Name's getter) without it.
bool HasProfile(REALobject self) {
  if (Handle(self)) return true;
  SetCMError(kErrorInvalidObject);
  return false;
}

REALstring EmptyString() { return bridge::BuildString("", 0); }

// Raw read: the element's bytes as a host string, or nil with the system error. The
// size query fails by design (no buffer), so only the size it reports tells whether
// the tag could be sized.
REALstring ReadRawTag(HPROFILE profile, TAGTYPE tag) {
  DWORD size = 0;
  BOOL reference = FALSE;
  GetColorProfileElement(profile, tag, 0, &size, nullptr, &reference);
  if (size == 0) {
    ReportSystemError();
    return nullptr;
  }
  // A host string's length is a signed 32-bit count.
  if (size > 0x7FFFFFFFu) {
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
  HGLOBAL buffer = GlobalAlloc(GMEM_FIXED | GMEM_ZEROINIT, size);
  if (!buffer) {
    ReportSystemError();
    return nullptr;
  }
  DWORD copied = size;
  REALstring result = nullptr;
  if (GetColorProfileElement(profile, tag, 0, &copied, buffer, &reference))
    result = bridge::BuildString(static_cast<const char*>(buffer), static_cast<int32_t>(copied));
  else
    ReportSystemError();
  GlobalFree(buffer);
  return result;
}

// The two-call read of the text and description readers: a size to allocate, then the
// bytes. Whatever the reader answers, nothing is taken from outside the buffer.
using TextReader = int32_t (*)(HPROFILE, TAGTYPE, char*);

REALstring ReadText(HPROFILE profile, TAGTYPE tag, TextReader reader) {
  const int32_t size = reader(profile, tag, nullptr);
  if (size < 1) return EmptyString();
  char* buffer = static_cast<char*>(std::calloc(static_cast<std::size_t>(size) + 1, 1));
  if (!buffer) {
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return EmptyString();
  }
  const int32_t length = reader(profile, tag, buffer);
  REALstring result = bridge::BuildString(buffer, length < 0 || length > size ? 0 : length);
  std::free(buffer);
  return result;
}

// Writes a script's text with a text or description writer; the string is locked
// while the writer reads it.
void WriteText(HPROFILE profile, REALstring tag, REALstring data, void (*writer)(HPROFILE, TAGTYPE, const char*)) {
  bridge::LockString(data);
  writer(profile, TagFromString(tag), bridge::StringText(data));
  bridge::UnlockString(data);
}

// A VectorNC made for one member's answer and filled from the profile's "ncl2" tag;
// the member's reference to it is released when the answer has been taken.
class NamedColors {
 public:
  explicit NamedColors(REALobject self) : list_(bridge::NewInstance("VectorNC")) {
    if (list_) HALVO_ICMReadTagNC(Handle(self), kNamedColorTag, list_);
  }
  ~NamedColors() {
    if (list_) bridge::UnlockObject(list_);
  }
  NamedColors(const NamedColors&) = delete;
  NamedColors& operator=(const NamedColors&) = delete;

  // Null when no VectorNC could be created.
  const VectorNCData* list() const { return list_ ? GetVectorNCData(list_) : nullptr; }

  // The entry of a script's 1-based index; null, with the plugin's index error, outside
  // 1 to the count.
  const NamedColorEntry* Entry(int32_t index) const {
    const VectorNCData* l = list();
    if (!l) return nullptr;
    if (index < 1 || static_cast<uint32_t>(index) > l->count) {
      SetCMError(kErrorNamedColorIndex);
      return nullptr;
    }
    return &l->entries[index - 1];
  }

 private:
  REALobject list_;
};

// A fixed text field up to its first zero byte, never past the field.
std::size_t FieldLength(const char* field, std::size_t size) {
  const void* zero = std::memchr(field, 0, size);
  return zero ? static_cast<std::size_t>(static_cast<const char*>(zero) - field) : size;
}

REALstring FieldString(const char* field, std::size_t size) {
  return bridge::BuildString(field, static_cast<int32_t>(FieldLength(field, size)));
}

bool Equals(const std::string& text, const char* bytes, int32_t length) {
  return text.size() == static_cast<std::size_t>(length) && std::memcmp(text.data(), bytes, text.size()) == 0;
}

}  // namespace

namespace profile_members {

// ---- listing and raw access ----

int32_t GetTagCount(REALobject self, intptr_t) {
  if (!HasProfile(self)) return 0;
  DWORD count = 0;
  if (!GetCountColorProfileElements(Handle(self), &count)) {
    ReportSystemError();
    return 0;
  }
  return static_cast<int32_t>(count);
}

bool TagExists(REALobject self, REALstring tag) {
  LastCMError = 0;
  BOOL present = FALSE;
  return IsColorProfileTagPresent(Handle(self), TagFromString(tag), &present) && present;
}

// An index ICM cannot name gives nil, and no error is reported.
REALstring TagName(REALobject self, int32_t index) {
  TAGTYPE tag = 0;
  if (!GetColorProfileElementTag(Handle(self), static_cast<DWORD>(index), &tag)) return nullptr;
  return TagToString(tag);
}

REALstring TagDataAt(REALobject self, int32_t index) {
  TAGTYPE tag = 0;
  if (!GetColorProfileElementTag(Handle(self), static_cast<DWORD>(index), &tag)) {
    ReportSystemError();
    return nullptr;
  }
  return ReadRawTag(Handle(self), tag);
}

REALstring TagDataOf(REALobject self, REALstring tag) {
  LastCMError = 0;
  return ReadRawTag(Handle(self), TagFromString(tag));
}

int32_t RemoveTag(REALobject self, REALstring tag) {
  LastCMError = 0;
  if (SetColorProfileElementSize(Handle(self), TagFromString(tag), 0)) return 1;
  ReportSystemError();
  return 0;
}

// Replaces the tag with data, which must hold at least a type header.
int32_t SetTagData(REALobject self, REALstring tag, REALstring data) {
  LastCMError = 0;
  if (!HasProfile(self)) return 0;
  const HPROFILE profile = Handle(self);
  const TAGTYPE signature = TagFromString(tag);
  bridge::LockString(data);
  const DWORD size = static_cast<DWORD>(bridge::StringLength(data));
  BOOL written = FALSE;
  if (size < kTypeHeaderBytes) {
    SetLastError(ERROR_INVALID_PARAMETER);
  } else if (SetColorProfileElementSize(profile, signature, size)) {
    DWORD count = size;
    written = SetColorProfileElement(profile, signature, 0, &count,
                                     const_cast<char*>(bridge::StringText(data))) && count == size;
  }
  bridge::UnlockString(data);
  if (written) return 1;
  ReportSystemError();
  return 0;
}

// Makes tag a second entry for ref's data, replacing what tag held. Tag is removed only
// once ref is known to exist, so a failed call leaves the profile as it was.
int32_t SetTagRef(REALobject self, REALstring tag, REALstring ref) {
  LastCMError = 0;
  if (!HasProfile(self)) return 0;
  const HPROFILE profile = Handle(self);
  const TAGTYPE signature = TagFromString(tag);
  const TAGTYPE shared = TagFromString(ref);
  BOOL present = FALSE;
  if (!IsColorProfileTagPresent(profile, shared, &present)) {
    ReportSystemError();
    return 0;
  }
  if (!present) {
    SetCMError(ERROR_TAG_NOT_FOUND);
    return 0;
  }
  if (signature != shared && IsColorProfileTagPresent(profile, signature, &present) && present &&
      !SetColorProfileElementSize(profile, signature, 0)) {
    ReportSystemError();
    return 0;
  }
  if (SetColorProfileElementReference(profile, signature, shared)) return 1;
  ReportSystemError();
  return 0;
}

// ---- typed tags ----

void GetXYZTag(REALobject self, REALstring tag, double* wx, double* wy, double* wz) {
  SendDebugString("getxyztag start");
  LastCMError = 0;
  double x = 0, y = 0, z = 0;
  if (HALVO_ICMReadTagXYZ(Handle(self), TagFromString(tag), &x, &y, &z) < 0) return;
  *wx = x;
  *wy = y;
  *wz = z;
}

void SetXYZTag(REALobject self, REALstring tag, double wx, double wy, double wz) {
  LastCMError = 0;
  HALVO_ICMWriteTagXYZ(Handle(self), TagFromString(tag), wx, wy, wz);
}

REALstring GetTextTypeTag(REALobject self, REALstring tag) {
  LastCMError = 0;
  return ReadText(Handle(self), TagFromString(tag), &HALVO_ICMReadTagText);
}

void SetTextTypeTag(REALobject self, REALstring tag, REALstring data) {
  WriteText(Handle(self), tag, data, &HALVO_ICMWriteTagText);
}

REALstring GetDescTypeTag(REALobject self, REALstring tag) {
  if (!HasProfile(self)) return nullptr;
  return ReadText(Handle(self), TagFromString(tag), &HALVO_ICMReadTagDesc);
}

void SetDescTypeTag(REALobject self, REALstring tag, REALstring data) {
  if (!HasProfile(self)) return;
  WriteText(Handle(self), tag, data, &HALVO_ICMWriteTagDesc);
}

REALstring GetName(REALobject self, intptr_t) {
  if (!Handle(self)) {
    LastCMError = kErrorInvalidObject;
    return nullptr;
  }
  return ReadText(Handle(self), kDescTag, &HALVO_ICMReadTagDesc);
}

// The name is copied at once into a 128-byte buffer: a longer text is cut after its
// first 127 characters.
void SetName(REALobject self, intptr_t, REALstring value) {
  if (!HasProfile(self)) return;
  char name[kNameBuffer] = {};
  bridge::LockString(value);
  const int32_t length = bridge::StringLength(value);
  const std::size_t kept = length < static_cast<int32_t>(kNameBuffer) ? static_cast<std::size_t>(length) : kNameBuffer - 1;
  std::memcpy(name, bridge::StringText(value), kept);
  bridge::UnlockString(value);
  HALVO_ICMWriteTagDesc(Handle(self), kDescTag, name);
}

REALstring GetCopyright(REALobject self, intptr_t) {
  if (!HasProfile(self)) return nullptr;
  return ReadText(Handle(self), kCopyrightTag, &HALVO_ICMReadTagText);
}

void SetCopyright(REALobject self, intptr_t, REALstring value) {
  if (!HasProfile(self)) return;
  bridge::LockString(value);
  HALVO_ICMWriteTagText(Handle(self), kCopyrightTag, bridge::StringText(value));
  bridge::UnlockString(value);
}

// ---- the named-colour tag ----

int32_t GetNamedColorCount(REALobject self, intptr_t) {
  const NamedColors colors(self);
  return colors.list() ? static_cast<int32_t>(colors.list()->count) : -1;
}

int32_t GetNamedColorChannels(REALobject self, intptr_t) {
  const NamedColors colors(self);
  return colors.list() ? colors.list()->devicecount : -1;
}

REALstring GetNamedColorPrefix(REALobject self, intptr_t) {
  const NamedColors colors(self);
  return colors.list() ? FieldString(colors.list()->prefix, sizeof colors.list()->prefix) : nullptr;
}

REALstring GetNamedColorSuffix(REALobject self, intptr_t) {
  const NamedColors colors(self);
  return colors.list() ? FieldString(colors.list()->suffix, sizeof colors.list()->suffix) : nullptr;
}

REALstring GetNamedColorDevicespace(REALobject, intptr_t) { return nullptr; }
REALstring GetNamedColorPCSspace(REALobject, intptr_t) { return nullptr; }

REALstring GetNamedColorName(REALobject self, int32_t index) {
  const NamedColors colors(self);
  const NamedColorEntry* entry = colors.Entry(index);
  return entry ? FieldString(entry->rootName, sizeof entry->rootName) : nullptr;
}

// The entry's PCS values in the ICC version 2 Lab encoding, as L*, a*, b*.
void GetIndNamedColorPCS(REALobject self, int32_t index, double* l, double* a, double* b) {
  const NamedColors colors(self);
  const NamedColorEntry* entry = colors.Entry(index);
  if (!entry) return;
  *l = entry->pcs[0] / 652.8;
  *a = entry->pcs[1] / 256.0 - 128.0;
  *b = entry->pcs[2] / 256.0 - 128.0;
}

// The 1-based index of the first colour whose full name (prefix, root, suffix) or root
// name is name; 0 when none is.
int32_t GetNamedColorIndex(REALobject self, REALstring name) {
  const NamedColors colors(self);
  const VectorNCData* list = colors.list();
  if (!list) return 0;
  const std::string prefix(list->prefix, FieldLength(list->prefix, sizeof list->prefix));
  const std::string suffix(list->suffix, FieldLength(list->suffix, sizeof list->suffix));
  bridge::LockString(name);
  const char* text = bridge::StringText(name);
  const int32_t length = bridge::StringLength(name);
  int32_t found = 0;
  for (uint32_t i = 0; i < list->count && found == 0; ++i) {
    const NamedColorEntry& e = list->entries[i];
    const std::string root(e.rootName, FieldLength(e.rootName, sizeof e.rootName));
    if (Equals(prefix + root + suffix, text, length) || Equals(root, text, length)) found = static_cast<int32_t>(i + 1);
  }
  bridge::UnlockString(name);
  return found;
}

}  // namespace profile_members
