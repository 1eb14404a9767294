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
#include "tag_fuzz_support.h"
#include "matrix.h"
#include "tag_codecs.h"
#include "vector.h"

namespace {

using tagfuzz::AsObject;
using tagfuzz::BlankProfile;
using tagfuzz::Check;
using tagfuzz::OpenWithTag;

constexpr TAGTYPE kTag = 0x41324230;   // 'A2B0'
constexpr TAGTYPE kCopy = 0x41324231;  // 'A2B1'

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
  static std::vector<std::uint8_t> blank = BlankProfile("prtr", "CMYK", "Lab ");
  HPROFILE h = OpenWithTag(blank, kTag, data, size);

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
