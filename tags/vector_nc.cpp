#include "vector_nc.h"

#include <cstdlib>
#include <cstring>

#include "class_tables.h"
#include "growable.h"
#include "cmcolor.h"
#include "error_state.h"
#include "host_bridge.h"
#include "vector.h"
#include "win32_api.h"

namespace {

// The most colours a list holds: any list, at any device-coordinate count, then still
// fits one tag whose size is a 32-bit number (84 + N × (38 + 2 × 8) bytes).
constexpr uint32_t kMaxEntries = (0xFFFFFFFFu - 84u) / (38u + 2u * kMaxDeviceCoordinates);

VectorNCData* Data(REALobject self) { return GetVectorNCData(self); }

bool Reserve(VectorNCData* list, uint64_t needed) {
  return GrowStorage(list->entries, list->capacity, needed, kMaxEntries);
}

bool InRange(const VectorNCData* list, int32_t index) {
  return index >= 0 && static_cast<uint32_t>(index) < list->count;
}

// The code a conversion goes by: a record that was never constructed holds 0, which
// reads as Lab, as every code outside the table does.
uint16_t PcsSpace(const VectorNCData* list) {
  return list->pcsspace >= COLOR_GRAY && list->pcsspace <= COLOR_NAMED ? list->pcsspace : uint16_t{COLOR_Lab};
}

const char* const kSpaceNames[] = {"COLOR_GRAY",      "COLOR_RGB",       "COLOR_XYZ",       "COLOR_Yxy",
                                   "COLOR_Lab",       "COLOR_3_CHANNEL", "COLOR_CMYK",      "COLOR_5_CHANNEL",
                                   "COLOR_6_CHANNEL", "COLOR_7_CHANNEL", "COLOR_8_CHANNEL", "COLOR_NAMED"};

// A host string of text up to its first zero byte, max bytes at most.
REALstring TextOf(const char* text, std::size_t max) {
  std::size_t n = 0;
  while (n < max && text[n]) ++n;
  return bridge::BuildString(text, static_cast<int32_t>(n));
}

// The first bytes of a string's text into a zero-padded field of size bytes.
void CopyText(REALstring s, char* field, std::size_t size) {
  std::memset(field, 0, size);
  bridge::LockString(s);
  const int32_t length = bridge::StringLength(s);
  const std::size_t n = length < 0 ? 0 : static_cast<std::size_t>(length);
  std::memcpy(field, bridge::StringText(s), n < size ? n : size);
  bridge::UnlockString(s);
}

double ValueAt(const VectorData* v, uint32_t i) { return i < v->count ? v->elements[i] : 0.0; }

// Builds an entry from a script's arguments; false when an argument it needs is missing.
// PCS values that are neither Lab nor XYZ, and device values when the Device Vector's
// size is not devicecount, are left zero; a PCS Vector shorter than three gives 0.0 for
// the values it lacks. Doubles become words by the store rule (StoreRuleWord): truncated,
// low 16 bits kept, and 0 for NaN, infinities and values beyond the 32-bit range.
bool BuildEntry(const VectorNCData* list, REALstring rootname, REALobject pcs, REALobject device,
                NamedColorEntry* entry) {
  if (!pcs || (!device && list->devicecount != 0) || !rootname) return false;
  std::memset(entry, 0, sizeof *entry);
  CopyText(rootname, entry->rootName, sizeof entry->rootName);

  bridge::LockObject(pcs);
  const VectorData* p = GetVectorData(pcs);
  switch (PcsSpace(list)) {
    case COLOR_Lab:
      entry->pcs[0] = StoreRuleWord(ValueAt(p, 0) * 652.8);
      entry->pcs[1] = StoreRuleWord((ValueAt(p, 1) + 128.0) * 256.0);
      entry->pcs[2] = StoreRuleWord((ValueAt(p, 2) + 128.0) * 256.0);
      break;
    case COLOR_XYZ:
      for (uint32_t i = 0; i < 3; ++i) entry->pcs[i] = StoreRuleWord(ValueAt(p, i));
      break;
    default: break;
  }
  bridge::UnlockObject(pcs);

  if (device) {
    bridge::LockObject(device);
    const VectorData* d = GetVectorData(device);
    if (d->count == static_cast<uint32_t>(list->devicecount))
      for (uint32_t i = 0; i < d->count; ++i) entry->device[i] = StoreRuleWord(d->elements[i] * 65535.0);
    bridge::UnlockObject(device);
  }
  return true;
}

// ---- Members ----

void ConstructList(REALobject self) {
  VectorNCData* list = Data(self);
  VectorNCClear(list);
  list->devicecount = 0;
  list->pcsspace = COLOR_Lab;
}

void Destruct(REALobject self) {
  VectorNCData* list = Data(self);
  std::free(list->entries);
  list->entries = nullptr;
  list->count = list->capacity = 0;
}

int32_t GetSize(REALobject self, intptr_t) { return static_cast<int32_t>(Data(self)->count); }

// Shrinks from the end, or grows with zero entries (an empty name, PCS and device
// values 0). A negative size, or one the storage cannot reach, changes nothing.
void SetSize(REALobject self, intptr_t, int32_t size) {
  VectorNCData* list = Data(self);
  if (size < 0) return;
  const uint32_t n = static_cast<uint32_t>(size);
  if (n > list->count) {
    if (!Reserve(list, n)) return;
    std::memset(list->entries + list->count, 0, (n - list->count) * sizeof(NamedColorEntry));
  }
  list->count = n;
}

int32_t GetDeviceCount(REALobject self, intptr_t) { return Data(self)->devicecount; }

// An entry holds 8 device coordinates: a count outside 0 to 8 is refused with
// ERROR_INVALID_PARAMETER and the list keeps its count; an accepted one stores 0.
void SetDeviceCount(REALobject self, intptr_t, int32_t count) {
  if (count < 0 || count > kMaxDeviceCoordinates) {
    SetCMError(ERROR_INVALID_PARAMETER);
    return;
  }
  Data(self)->devicecount = count;
  LastCMError = 0;
}

REALstring GetPcsSpace(REALobject self, intptr_t) {
  const char* name = kSpaceNames[PcsSpace(Data(self)) - 1];
  return bridge::BuildString(name, static_cast<int32_t>(std::strlen(name)));
}

// Any name of the table sets its code; another text leaves the code as it is.
void SetPcsSpace(REALobject self, intptr_t, REALstring name) {
  bridge::LockString(name);
  const char* text = bridge::StringText(name);
  const int32_t length = bridge::StringLength(name);
  for (uint16_t code = COLOR_GRAY; code <= COLOR_NAMED; ++code) {
    const char* candidate = kSpaceNames[code - 1];
    if (static_cast<std::size_t>(length) == std::strlen(candidate) && std::memcmp(text, candidate, length) == 0) {
      Data(self)->pcsspace = code;
      break;
    }
  }
  bridge::UnlockString(name);
}

// prefix and suffix keep 31 bytes at most, so their last byte is always zero.
REALstring GetPrefix(REALobject self, intptr_t) { return TextOf(Data(self)->prefix, sizeof Data(self)->prefix); }
REALstring GetSuffix(REALobject self, intptr_t) { return TextOf(Data(self)->suffix, sizeof Data(self)->suffix); }
void SetPrefix(REALobject self, intptr_t, REALstring text) {
  CopyText(text, Data(self)->prefix, sizeof Data(self)->prefix - 1);
  Data(self)->prefix[sizeof Data(self)->prefix - 1] = 0;
}
void SetSuffix(REALobject self, intptr_t, REALstring text) {
  CopyText(text, Data(self)->suffix, sizeof Data(self)->suffix - 1);
  Data(self)->suffix[sizeof Data(self)->suffix - 1] = 0;
}

void Get(REALobject self, int32_t index, REALstring* rootname, REALobject pcs, REALobject device) {
  const VectorNCData* list = Data(self);
  if (!pcs || !device || !InRange(list, index)) return;
  const NamedColorEntry& entry = list->entries[index];
  if (rootname) {
    REALstring name = TextOf(entry.rootName, sizeof entry.rootName);
    if (*rootname) bridge::UnlockString(*rootname);
    *rootname = name;
  }
  VectorData* p = GetVectorData(pcs);
  VectorData* d = GetVectorData(device);
  VectorClear(p);
  VectorClear(d);
  switch (PcsSpace(list)) {
    case COLOR_Lab:
      VectorAppend(p, entry.pcs[0] / 652.8);
      VectorAppend(p, entry.pcs[1] / 256.0 - 128.0);
      VectorAppend(p, entry.pcs[2] / 256.0 - 128.0);
      break;
    case COLOR_XYZ:
      for (uint16_t value : entry.pcs) VectorAppend(p, value);
      break;
    default: break;
  }
  for (int32_t i = 0; i < list->devicecount; ++i) VectorAppend(d, entry.device[i] / 65535.0);
}

void Set(REALobject self, int32_t index, REALstring rootname, REALobject pcs, REALobject device) {
  VectorNCData* list = Data(self);
  NamedColorEntry entry;
  if (!InRange(list, index) || !BuildEntry(list, rootname, pcs, device, &entry)) return;
  list->entries[index] = entry;
}

void Append(REALobject self, REALstring rootname, REALobject pcs, REALobject device) {
  VectorNCData* list = Data(self);
  NamedColorEntry entry;
  if (BuildEntry(list, rootname, pcs, device, &entry)) VectorNCAppend(list, entry);
}

// Before position index: below 0 at the front, at or above size at the end.
void Insert(REALobject self, int32_t index, REALstring rootname, REALobject pcs, REALobject device) {
  VectorNCData* list = Data(self);
  NamedColorEntry entry;
  if (!BuildEntry(list, rootname, pcs, device, &entry) || !Reserve(list, uint64_t{list->count} + 1)) return;
  const uint32_t at = index < 0 ? 0 : static_cast<uint32_t>(index) < list->count ? static_cast<uint32_t>(index)
                                                                                   : list->count;
  std::memmove(list->entries + at + 1, list->entries + at, (list->count - at) * sizeof(NamedColorEntry));
  list->entries[at] = entry;
  ++list->count;
}

void Delete(REALobject self, int32_t index) {
  VectorNCData* list = Data(self);
  if (!InRange(list, index)) return;
  const uint32_t at = static_cast<uint32_t>(index);
  std::memmove(list->entries + at, list->entries + at + 1, (list->count - at - 1) * sizeof(NamedColorEntry));
  --list->count;
}

void Clear(REALobject self) { VectorNCClear(Data(self)); }

REALproperty properties[] = {
    {nullptr, "size", "Integer", 0, AsProc(&GetSize), AsProc(&SetSize), 0, 0, 0, 0},
    {nullptr, "devicecount", "Integer", 0, AsProc(&GetDeviceCount), AsProc(&SetDeviceCount), 0, 0, 0, 0},
    {nullptr, "pcsspace", "String", 0, AsProc(&GetPcsSpace), AsProc(&SetPcsSpace), 0, 0, 0, 0},
    {nullptr, "prefix", "String", 0, AsProc(&GetPrefix), AsProc(&SetPrefix), 0, 0, 0, 0},
    {nullptr, "suffix", "String", 0, AsProc(&GetSuffix), AsProc(&SetSuffix), 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&ConstructList), nullptr, "vectornc()"},
    {AsProc(&Get), nullptr, "Get(index as Integer, ByRef rootname as String, PCS as Vector, Device as Vector)"},
    {AsProc(&Set), nullptr, "Set(index as Integer, rootname as String, PCS as Vector, Device as Vector)"},
    {AsProc(&Append), nullptr, "Append(rootname as String, PCS as Vector, Device as Vector)"},
    {AsProc(&Insert), nullptr, "Insert(index as Integer, rootname as String, PCS as Vector, Device as Vector)"},
    {AsProc(&Delete), nullptr, "Delete(index as Integer)"},
    {AsProc(&Clear), nullptr, "Clear()"},
};

}  // namespace

bool VectorNCAppend(VectorNCData* list, const NamedColorEntry& entry) {
  if (!Reserve(list, uint64_t{list->count} + 1)) return false;
  list->entries[list->count++] = entry;
  return true;
}

void VectorNCClear(VectorNCData* list) { list->count = 0; }

REALclassDefinition VectorNCClass =
    ClassDefinition("VectorNC", sizeof(VectorNCData), nullptr, AsProc(&Destruct), properties, methods);
