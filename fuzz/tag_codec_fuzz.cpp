// Fuzz target for the curve, XYZ, text and description readers: the input is one tag's
// bytes, stored in a blank profile held in memory, and every reader is called on it as
// the profile members call them. The text readers' two calls must keep their promise:
// the second writes no more than the first asked to allocate (the sanitizer sees any
// byte past the buffer) and answers less than it.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "tag_fuzz_support.h"
#include "tag_codecs.h"
#include "vector.h"

namespace {

using tagfuzz::AsObject;
using tagfuzz::BlankProfile;
using tagfuzz::Check;
using tagfuzz::OpenWithTag;

constexpr TAGTYPE kTag = 0x74657374;  // 'test'

void TwoCalls(int32_t (*reader)(HPROFILE, TAGTYPE, char*), HPROFILE h) {
  const int32_t size = reader(h, kTag, nullptr);
  if (size < 1) return;
  std::vector<char> buffer(static_cast<std::size_t>(size));
  const int32_t length = reader(h, kTag, buffer.data());
  Check(length < size);
  if (length >= 0) Check(buffer[static_cast<std::size_t>(length)] == '\0');
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static std::vector<std::uint8_t> blank = BlankProfile("mntr", "RGB ", "XYZ ");
  HPROFILE h = OpenWithTag(blank, kTag, data, size);

  VectorData curve{};
  const int32_t entries = HALVO_ICMReadTagCurve(h, kTag, AsObject(&curve));
  Check(curve.count == static_cast<uint32_t>(entries < 0 ? 0 : entries));
  // Never more entries than bytes came back.
  Check(entries < 0 || entries == 256 || static_cast<std::size_t>(entries) <= size / 2);
  std::free(curve.elements);

  double xyz[3] = {-1, -1, -1};
  const int32_t read = HALVO_ICMReadTagXYZ(h, kTag, &xyz[0], &xyz[1], &xyz[2]);
  Check(read == 12 ? size >= 20 : xyz[0] == -1 && xyz[1] == -1 && xyz[2] == -1);

  TwoCalls(&HALVO_ICMReadTagText, h);
  TwoCalls(&HALVO_ICMReadTagDesc, h);
  CloseColorProfile(h);
  return 0;
}
