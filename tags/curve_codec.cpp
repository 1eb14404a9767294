// Tone curves between a profile's tags and a script's Vector: curveType written and
// read, parametricCurveType read. A one-entry curve holds a gamma as a u8Fixed8Number
// (value x 256), the encoding every reader of ICC profiles uses; longer curves hold
// entries scaled by 65535.
#include <cmath>
#include <cstdlib>
#include <vector>

#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "signatures.h"
#include "tag_codecs.h"
#include "tag_io.h"
#include "vector.h"

namespace {

constexpr char kPieceFailed[] = "SetColorProfileElement1 fail";
constexpr char kCountBeyondTag[] = "Curve count exceeds the tag";
constexpr double kGammaScale = 256.0;
constexpr double kEntryScale = 65535.0;
// Function types 0 to 4 of a parametric curve take this many parameters.
constexpr int kParameterCount[] = {1, 3, 4, 5, 7};
constexpr uint32_t kParametricSamples = 256;

// trunc(scaled) as a signed 32-bit integer, its low 16 bits stored, so that values
// outside the range wrap. A value beyond the 32-bit range saturates and NaN gives 0,
// as the s15Fixed16 encoder does, where a plain conversion would be undefined.
uint16_t EncodeEntry(double scaled) {
  int32_t word = 0;
  if (scaled >= 2147483647.0) {
    word = INT32_MAX;
  } else if (scaled <= -2147483648.0) {
    word = INT32_MIN;
  } else if (!std::isnan(scaled)) {
    word = static_cast<int32_t>(scaled);
  }
  return static_cast<uint16_t>(static_cast<uint32_t>(word));
}

// Appends n values, valueAt(i) for each, all or none: should the list fail to grow, the
// entries already appended are dropped again, so a failed read leaves the list as it was.
template <class ValueAt>
int32_t AppendAll(VectorData* v, uint32_t n, ValueAt valueAt) {
  const uint32_t before = v->count;
  for (uint32_t i = 0; i < n; ++i) {
    if (!VectorAppend(v, valueAt(i))) {
      v->count = before;
      SendDebugString("Vector cannot hold the curve");
      SetCMError(ERROR_NOT_ENOUGH_MEMORY);
      return -1;
    }
  }
  return static_cast<int32_t>(n);
}

int32_t ReadCurv(const ByteReader& in, VectorData* v) {
  uint32_t count = 0;
  // The count must fit the bytes behind it before it decides anything.
  if (!in.U32(8, &count) || count > in.Remaining(12) / 2) {
    RefuseTag(kCountBeyondTag);
    return -1;
  }
  const double scale = count == 1 ? kGammaScale : kEntryScale;
  return AppendAll(v, count, [&](uint32_t i) {
    uint16_t entry = 0;
    in.U16(12 + 2 * static_cast<std::size_t>(i), &entry);
    return entry / scale;
  });
}

// y = f(x) for the ICC's parametric function types 1 to 4 (g, a, b, c, d, e, f), kept to
// 0..1 like the entries of a sampled curve. A negative base has no real power: it counts
// as 0, the value the function takes below its threshold.
double Parametric(uint16_t type, const double p[7], double x) {
  const double base = p[1] * x + p[2];
  const double power = base > 0 ? std::pow(base, p[0]) : 0.0;
  double y = 0;
  switch (type) {
    case 1: y = power; break;
    case 2: y = power + p[3]; break;
    case 3: y = x >= p[4] ? power : p[3] * x; break;
    default: y = x >= p[4] ? power + p[5] : p[3] * x + p[6]; break;
  }
  if (!(y > 0)) return 0.0;  // NaN included
  return y < 1 ? y : 1.0;
}

int32_t ReadPara(const ByteReader& in, VectorData* v) {
  uint16_t type = 0;
  if (!in.U16(8, &type) || type >= sizeof kParameterCount / sizeof kParameterCount[0]) {
    RefuseTag("Unknown parametric curve");
    return -1;
  }
  double p[7] = {};
  for (int i = 0; i < kParameterCount[type]; ++i) {
    if (!in.S15Fixed16(12 + 4 * static_cast<std::size_t>(i), &p[i])) {
      RefuseTag(kCountBeyondTag);
      return -1;
    }
  }
  // A pure power is the one-entry curve: its gamma.
  if (type == 0) return AppendAll(v, 1, [&](uint32_t) { return p[0]; });
  return AppendAll(v, kParametricSamples,
                   [&](uint32_t i) { return Parametric(type, p, i / double(kParametricSamples - 1)); });
}

}  // namespace

void HALVO_ICMWriteTagCurve(HPROFILE profile, TAGTYPE tag, REALobject vector) {
  if (!vector) return;
  const VectorData* v = GetVectorData(vector);
  TraceWriteBanner("--------> HALVO_ICMWriteTagCurve", tag);
  const uint32_t n = v->count;
  SendDebugString("CURVE SIZE");
  SendDebugInteger(static_cast<int32_t>(n));
  const uint64_t total = 12 + 2 * static_cast<uint64_t>(n);
  if (total > 0xFFFFFFFFu) {
    SendDebugString("Curve too long for a tag");
    SetCMError(ERROR_INVALID_PARAMETER);
    return;
  }
  TagWriter writer(profile, tag, static_cast<DWORD>(total));
  if (!writer.PutTypeHeader(kTypeCurve, kPieceFailed) || !writer.PutU32(n, kPieceFailed) || n == 0) return;
  uint8_t* entries = static_cast<uint8_t*>(std::malloc(static_cast<std::size_t>(2 * static_cast<uint64_t>(n))));
  if (!entries) {
    SendDebugString(kPieceFailed);
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return;
  }
  const double scale = n == 1 ? kGammaScale : kEntryScale;
  for (uint32_t i = 0; i < n; ++i) {
    SendDebugDouble(v->elements[i]);
    StoreU16(entries + 2 * static_cast<std::size_t>(i), EncodeEntry(v->elements[i] * scale));
  }
  writer.Put(entries, 2 * n, kPieceFailed);
  std::free(entries);
}

int32_t HALVO_ICMReadTagCurve(HPROFILE profile, TAGTYPE tag, REALobject vector) {
  if (!vector) return -1;
  std::vector<uint8_t> bytes;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok) return -1;
  const ByteReader in(bytes.data(), bytes.size());
  VectorData* v = GetVectorData(vector);
  switch (TagTypeOf(bytes)) {
    case kTypeCurve: return ReadCurv(in, v);
    case kTypeParametric: return ReadPara(in, v);
    default: RefuseTag("Unexpected tag type"); return -1;
  }
}

namespace tag_members {

// Replaces v's contents with the curve; LastCMError changes only when the read fails.
void GetTRC(REALobject self, REALstring tag, REALobject vector) {
  if (!vector) {
    SetCMError(kErrorInvalidObject);
    return;
  }
  VectorClear(GetVectorData(vector));
  HALVO_ICMReadTagCurve(ProfileHandle(self), TagFromString(tag), vector);
}

void SetTRC(REALobject self, REALstring tag, REALobject vector) {
  if (!vector) {
    SetCMError(kErrorInvalidObject);
    return;
  }
  LastCMError = 0;
  const TAGTYPE signature = TagFromString(tag);
  bridge::LockObject(vector);
  HALVO_ICMWriteTagCurve(ProfileHandle(self), signature, vector);
  bridge::UnlockObject(vector);
}

}  // namespace tag_members
