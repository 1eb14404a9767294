// XYZType: one XYZ number of three s15Fixed16Numbers behind the type header.
#include <vector>

#include "debugger.h"
#include "tag_codecs.h"
#include "tag_io.h"

namespace {

constexpr DWORD kTagSize = 20;
constexpr DWORD kNumbersSize = 12;

}  // namespace

void HALVO_ICMWriteTagXYZ(HPROFILE profile, TAGTYPE tag, double x, double y, double z) {
  TraceWriteBanner("--------> HALVO_ICMWriteTagXYZ", tag);
  SendDebugDouble(kTagSize);
  TagWriter writer(profile, tag, kTagSize);
  if (!writer.PutTypeHeader(kTypeXYZ, "SetColorProfileElement1 fail")) return;
  uint8_t numbers[kNumbersSize];
  StoreS15Fixed16(numbers, x);
  StoreS15Fixed16(numbers + 4, y);
  StoreS15Fixed16(numbers + 8, z);
  SendDebugDouble(kNumbersSize);
  writer.Put(numbers, kNumbersSize, "SetColorProfileElement3 fail");
}

// Reads the first XYZ number; the outputs change only when all three are there.
int32_t HALVO_ICMReadTagXYZ(HPROFILE profile, TAGTYPE tag, double* x, double* y, double* z) {
  if (!x || !y || !z) return -1;
  std::vector<uint8_t> bytes;
  if (ReadWholeTag(profile, tag, bytes) != TagRead::Ok) return -1;
  if (TagTypeOf(bytes) != kTypeXYZ) {
    RefuseTag("Unexpected tag type");
    return -1;
  }
  const ByteReader in(bytes.data(), bytes.size());
  double read[3];
  if (!in.S15Fixed16(8, &read[0]) || !in.S15Fixed16(12, &read[1]) || !in.S15Fixed16(16, &read[2])) {
    RefuseTag("XYZ tag too short");
    return -1;
  }
  *x = read[0];
  *y = read[1];
  *z = read[2];
  return kNumbersSize;
}
