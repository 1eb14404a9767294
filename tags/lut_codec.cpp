// lut8Type ("mft1") and lut16Type ("mft2"): a lookup-table tag between a profile and a
// cLut. Table entries stay the tag's raw integers (0..255 or 0..65535) held as doubles.
//
//   0 type  4 zero  8 i  9 o  10 g  11 zero  12 matrix (9 x s15Fixed16)
//   lut8:  48 input tables (256 x i bytes), grid (g^i x o bytes), output tables (256 x o)
//   lut16: 48 n  50 m  52 input tables (n x i), grid (g^i x o), output tables (m x o),
//          every entry 16 bits; all big-endian.
#include <cmath>
#include <cstdint>
#include <vector>

#include "clut.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "matrix.h"
#include "profile.h"
#include "signatures.h"
#include "tag_codecs.h"
#include "tag_io.h"
#include "vector.h"

namespace {

constexpr uint32_t kTypeLut8 = 0x6D667431;   // 'mft1'
constexpr uint32_t kTypeLut16 = 0x6D667432;  // 'mft2'
constexpr std::size_t kLut8Header = 48;
constexpr std::size_t kLut16Header = 52;
constexpr uint32_t kLut8TableEntries = 256;
constexpr char kPieceFailed[] = "SetColorProfileElement1 fail";

const double kIdentity[9] = {1, 0, 0, 0, 1, 0, 0, 0, 1};

// trunc(value) as a signed 32-bit integer whose low bits the caller stores, so that
// values outside the entry's range wrap (300.7 -> 300 -> 44 in a byte). Beyond the
// 32-bit range the word saturates and NaN gives 0, where a plain conversion would be
// undefined.
uint32_t TruncatedWord(double value) {
  int32_t word = 0;
  if (value >= 2147483647.0) {
    word = INT32_MAX;
  } else if (value <= -2147483648.0) {
    word = INT32_MIN;
  } else if (!std::isnan(value)) {
    word = static_cast<int32_t>(value);
  }
  return static_cast<uint32_t>(word);
}

// A nil table is written as an empty one.
const VectorData* TableOf(REALobject vector) {
  static const VectorData kEmpty = {0, 0, nullptr};
  return vector ? GetVectorData(vector) : &kEmpty;
}

// One piece per entry, in table order; the first failure ends the tag.
void PutEntries(TagWriter& out, const VectorData* table, bool wide, const char* failMessage) {
  for (uint32_t n = 0; n < table->count && !out.failed(); ++n) {
    const uint32_t word = TruncatedWord(table->elements[n]);
    if (wide) {
      out.PutU16(static_cast<uint16_t>(word), failMessage);
    } else {
      const uint8_t byte = static_cast<uint8_t>(word);
      out.Put(&byte, 1, failMessage);
    }
  }
}

// g^i entries per output channel, or more than limit when that is all the caller needs
// to know: the product stops growing once it passes limit, so it never overflows. A
// zero grid has no cells, but for no inputs (0^0 is 1).
uint64_t GridCells(uint32_t g, uint32_t i, uint64_t limit) {
  if (g == 0) return i == 0 ? 1 : 0;
  uint64_t cells = 1;
  for (uint32_t n = 0; n < i && cells <= limit; ++n) cells *= g;
  return cells;
}

// Appends count entries read from at (one or two bytes each) to the table.
bool AppendEntries(const ByteReader& in, std::size_t at, uint64_t count, bool wide, REALobject vector) {
  if (!vector) return true;
  VectorData* table = GetVectorData(vector);
  for (uint64_t n = 0; n < count; ++n) {
    double value = 0;
    if (wide) {
      uint16_t entry = 0;
      in.U16(at + 2 * static_cast<std::size_t>(n), &entry);
      value = entry;
    } else {
      value = *in.At(at + static_cast<std::size_t>(n));
    }
    if (!VectorAppend(table, value)) {
      SendDebugString("Vector cannot hold the lut table");
      SetCMError(ERROR_NOT_ENOUGH_MEMORY);
      return false;
    }
  }
  return true;
}

}  // namespace

void HALVO_ICMWriteTagClut(HPROFILE profile, TAGTYPE tag, REALobject clut) {
  TraceWriteBanner("--------> HALVO_ICMWriteTagClut", tag);
  if (!clut) return;
  const ClutData* d = GetClutData(clut);
  const bool wide = d->is16Bit;
  const VectorData* inCurve = TableOf(d->inCurve);
  const VectorData* lut = TableOf(d->lut);
  const VectorData* outCurve = TableOf(d->outCurve);
  const double* matrix = d->matrix3D ? GetMatrixData(d->matrix3D)->elements : kIdentity;

  const uint64_t entries = uint64_t{inCurve->count} + lut->count + outCurve->count;
  const uint64_t total = wide ? kLut16Header + 2 * entries : kLut8Header + entries;
  SendDebugString("Size:");
  SendDebugDouble(static_cast<double>(total));
  if (total > 0xFFFFFFFFu) {
    SendDebugString("Lut too large for a tag");
    SetCMError(ERROR_INVALID_PARAMETER);
    return;
  }

  TagWriter out(profile, tag, static_cast<DWORD>(total));
  out.PutTypeHeader(wide ? kTypeLut16 : kTypeLut8, kPieceFailed);
  const uint8_t counts[4] = {static_cast<uint8_t>(d->inChannelCount), static_cast<uint8_t>(d->outChannelCount),
                             static_cast<uint8_t>(d->gridPointCount), 0};
  for (uint8_t byte : counts) out.Put(&byte, 1, kPieceFailed);
  uint8_t words[36];
  for (int n = 0; n < 9; ++n) StoreS15Fixed16(words + 4 * n, matrix[n]);
  out.Put(words, sizeof words, kPieceFailed);
  if (wide) {
    out.PutU16(static_cast<uint16_t>(EntriesPerChannel(inCurve->count, d->inChannelCount)), kPieceFailed);
    out.PutU16(static_cast<uint16_t>(EntriesPerChannel(outCurve->count, d->outChannelCount)), kPieceFailed);
  }
  PutEntries(out, inCurve, wide, "SetColorProfileElement1 fai3");
  PutEntries(out, lut, wide, "SetColorProfileElement1 fail4");
  PutEntries(out, outCurve, wide, "SetColorProfileElement1 fail5");
}

int32_t HALVO_ICMReadTagClut(HPROFILE profile, TAGTYPE tag, REALobject clut) {
  if (!clut) return -1;
  std::vector<uint8_t> bytes;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok) return -1;
  const uint32_t type = TagTypeOf(bytes);
  if (type != kTypeLut8 && type != kTypeLut16) {
    RefuseTag("Tag is not a lut8 or lut16 table");
    return -1;
  }
  const bool wide = type == kTypeLut16;
  const ByteReader in(bytes.data(), bytes.size());
  const std::size_t header = wide ? kLut16Header : kLut8Header;
  uint8_t i = 0, o = 0, g = 0;
  uint16_t n = kLut8TableEntries, m = kLut8TableEntries;
  if (!in.Has(0, header) || !in.U8(8, &i) || !in.U8(9, &o) || !in.U8(10, &g) ||
      (wide && (!in.U16(48, &n) || !in.U16(50, &m)))) {
    RefuseTag("Lut tag is too short");
    return -1;
  }

  // Every table must lie inside the element before anything is sized from the counts.
  // The counts are at most 255 and 65535, so each product fits 64 bits; the grid's is
  // cut short once it passes what the element could hold.
  const uint64_t entryBytes = wide ? 2 : 1;
  const uint64_t room = in.Remaining(header) / entryBytes;
  const uint64_t inEntries = uint64_t{i} * n;
  const uint64_t outEntries = uint64_t{o} * m;
  const uint64_t cells = GridCells(g, i, room);
  const uint64_t gridEntries = cells > room ? (o ? room + 1 : 0) : cells * o;
  if (inEntries > room || gridEntries > room - inEntries || outEntries > room - inEntries - gridEntries) {
    RefuseTag("Lut tables exceed the tag");
    return -1;
  }

  // The tag holds all it claims: from here on the cLut changes.
  ClutData* d = GetClutData(clut);
  d->is16Bit = wide;
  d->inChannelCount = i;
  d->outChannelCount = o;
  d->gridPointCount = g;
  SendDebugString("inChan");
  SendDebugInteger(i);
  SendDebugString("outChan");
  SendDebugInteger(o);
  SendDebugString("clutPts");
  SendDebugInteger(g);
  if (d->matrix3D) {
    double* matrix = GetMatrixData(d->matrix3D)->elements;
    for (std::size_t k = 0; k < 9; ++k) in.S15Fixed16(12 + 4 * k, &matrix[k]);
  }
  const std::size_t gridAt = header + static_cast<std::size_t>(inEntries * entryBytes);
  const std::size_t outAt = gridAt + static_cast<std::size_t>(gridEntries * entryBytes);
  if (!AppendEntries(in, header, inEntries, wide, d->inCurve) ||
      !AppendEntries(in, gridAt, gridEntries, wide, d->lut) ||
      !AppendEntries(in, outAt, outEntries, wide, d->outCurve)) {
    return -1;
  }
  return 0;
}

namespace tag_members {

// A new cLut, whatever the read gives: a tag that cannot be read or is refused leaves
// it with its constructor's values, the reason traced and in LastCMError.
REALobject GetMFT(REALobject self, REALstring tag) {
  LastCMError = 0;
  REALobject clut = bridge::NewInstance("Clut");
  if (!clut) {
    SetCMError(kErrorInvalidObject);
    return nullptr;
  }
  HALVO_ICMReadTagClut(ProfileHandle(self), TagFromString(tag), clut);
  return clut;
}

// Stores 0 first, so that CMError() tells whether the tag was written whole.
void SetMFT(REALobject self, REALstring tag, REALobject clut) {
  if (!clut || !tag) {
    SetCMError(kErrorInvalidObject);
    return;
  }
  LastCMError = 0;
  const TAGTYPE signature = TagFromString(tag);
  bridge::LockObject(clut);
  HALVO_ICMWriteTagClut(ProfileHandle(self), signature, clut);
  bridge::UnlockObject(clut);
}

}  // namespace tag_members
