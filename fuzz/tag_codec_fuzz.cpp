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
#include "tag_codecs.h"
#include "vector.h"

namespace {

constexpr TAGTYPE kTag = 0x74657374;  // 'test'

void Check(bool condition) {
  if (!condition) std::abort();
}

// A header that opens: its size, version 2.1, 'acsp', no tags.
std::vector<std::uint8_t> BlankProfile() {
  std::vector<std::uint8_t> b(132, 0);
  b[3] = 132;
  b[8] = 0x02, b[9] = 0x10;
  std::memcpy(&b[12], "mntr", 4);
  std::memcpy(&b[16], "RGB ", 4);
  std::memcpy(&b[20], "XYZ ", 4);
  std::memcpy(&b[36], "acsp", 4);
  return b;
}

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
  static std::vector<std::uint8_t> blank = BlankProfile();
  PROFILE profile{PROFILE_MEMBUFFER, blank.data(), static_cast<DWORD>(blank.size())};
  HPROFILE h = OpenColorProfileA(&profile, PROFILE_READWRITE, 0, OPEN_EXISTING);
  Check(h != nullptr);
  std::vector<std::uint8_t> tag(data, data + size);
  DWORD n = static_cast<DWORD>(size);
  Check(SetColorProfileElementSize(h, kTag, n) == (size > 0));
  if (size > 0) Check(SetColorProfileElement(h, kTag, 0, &n, tag.data()) && n == size);

  // Before registration the Vector class's instance offset is 0, so a zeroed record
  // stands in for a Vector object.
  VectorData curve{};
  const int32_t entries = HALVO_ICMReadTagCurve(h, kTag, reinterpret_cast<REALobject>(&curve));
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
