// Fuzz target for the lut8/lut16 reader: the input is one tag's bytes, stored in a
// blank profile held in memory and read as GetMFT reads it. A table read whole never
// holds more entries than the bytes carry; written back and read again it must come out
// the same.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "clut.h"
#include "icm.h"
#include "matrix.h"
#include "tag_codecs.h"
#include "vector.h"

namespace {

constexpr TAGTYPE kTag = 0x41324230;   // 'A2B0'
constexpr TAGTYPE kCopy = 0x41324231;  // 'A2B1'

// Names the failed check's line before aborting, so a crash says which property broke.
void Check(bool condition, int line = __builtin_LINE()) {
  if (condition) return;
  std::fprintf(stderr, "lut_fuzz.cpp:%d: check failed\n", line);
  std::abort();
}

// A header that opens: its size, version 2.1, 'acsp', no tags.
std::vector<std::uint8_t> BlankProfile() {
  std::vector<std::uint8_t> b(132, 0);
  b[3] = 132;
  b[8] = 0x02, b[9] = 0x10;
  std::memcpy(&b[12], "prtr", 4);
  std::memcpy(&b[16], "CMYK", 4);
  std::memcpy(&b[20], "Lab ", 4);
  std::memcpy(&b[36], "acsp", 4);
  return b;
}

// Before registration every class's instance offset is 0, so zeroed records stand in
// for the cLut and the Vector and Matrix objects it holds.
template <class Record>
REALobject AsObject(Record* record) {
  return reinterpret_cast<REALobject>(record);
}

// A cLut as its constructor leaves it, over records the caller owns.
struct Lut {
  VectorData in{}, grid{}, out{};
  MatrixData matrix{};
  ClutData clut{};
  Lut() {
    clut.is16Bit = true;
    clut.inChannelCount = 1;
    clut.outChannelCount = 1;
    clut.matrix3D = AsObject(&matrix);
    clut.inCurve = AsObject(&in);
    clut.lut = AsObject(&grid);
    clut.outCurve = AsObject(&out);
  }
  ~Lut() {
    std::free(in.elements);
    std::free(grid.elements);
    std::free(out.elements);
  }
  REALobject object() { return AsObject(&clut); }
};

bool SameTable(const VectorData& a, const VectorData& b) {
  return a.count == b.count && (a.count == 0 || std::memcmp(a.elements, b.elements, a.count * sizeof(double)) == 0);
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

  Lut first;
  if (HALVO_ICMReadTagClut(h, kTag, first.object()) == 0) {
    const ClutData& c = first.clut;
    Check(c.inChannelCount >= 0 && c.inChannelCount <= 255 && c.outChannelCount >= 0 && c.outChannelCount <= 255);
    const std::uint64_t entries = std::uint64_t{first.in.count} + first.grid.count + first.out.count;
    Check((c.is16Bit ? 52 + 2 * entries : 48 + entries) <= size);
    Check(first.in.count % 256 == 0 || c.is16Bit);

    HALVO_ICMWriteTagClut(h, kCopy, first.object());
    Lut second;
    Check(HALVO_ICMReadTagClut(h, kCopy, second.object()) == 0);
    Check(second.clut.is16Bit == c.is16Bit && second.clut.inChannelCount == c.inChannelCount &&
          second.clut.outChannelCount == c.outChannelCount && second.clut.gridPointCount == c.gridPointCount);
    Check(std::memcmp(&first.matrix, &second.matrix, sizeof first.matrix) == 0);
    Check(SameTable(first.in, second.in) && SameTable(first.grid, second.grid) && SameTable(first.out, second.out));
  } else {
    // A refused or unreadable tag leaves the constructor's values.
    Check(first.in.count == 0 && first.grid.count == 0 && first.out.count == 0 && first.clut.inChannelCount == 1);
  }
  CloseColorProfile(h);
  return 0;
}
