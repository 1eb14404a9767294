// Fuzz target for the ICC container: opens the bytes as a memory profile and walks
// every profile call. Whatever the layer saves must open again with the same tags.
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "icm/profile_store.h"

namespace {

constexpr DWORD kMaxTagsWalked = 64;

void Check(bool condition) {
  if (!condition) std::abort();
}

void WalkElement(HPROFILE h, TAGTYPE tag) {
  BOOL present = FALSE;
  Check(IsColorProfileTagPresent(h, tag, &present) && present);
  DWORD size = 0;
  Check(!GetColorProfileElement(h, tag, 0, &size, nullptr, nullptr));
  std::uint8_t buffer[64];
  const DWORD offsets[] = {0, 1, size / 2, size > 4 ? size - 4 : 0, size, size + 1};
  for (DWORD offset : offsets) {
    DWORD n = sizeof buffer;
    BOOL reference = FALSE;
    const BOOL ok = GetColorProfileElement(h, tag, offset, &n, buffer, &reference);
    Check(ok == (offset <= size));
    if (ok) Check(n <= sizeof buffer && n <= size - offset);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::vector<std::uint8_t> copy(data, data + size);  // the layer must not write into it
  PROFILE profile{PROFILE_MEMBUFFER, copy.data(), static_cast<DWORD>(size)};
  HPROFILE h = OpenColorProfileA(&profile, PROFILE_READWRITE, 0, OPEN_EXISTING);
  if (h == nullptr) return 0;

  PROFILEHEADER header;
  Check(GetColorProfileHeader(h, &header));
  BOOL valid = FALSE;
  IsColorProfileValid(h, &valid);
  DWORD count = 0;
  Check(GetCountColorProfileElements(h, &count));
  TAGTYPE first = 0, last = 0;
  for (DWORD i = 1; i <= count && i <= kMaxTagsWalked; ++i) {
    TAGTYPE tag = 0;
    Check(GetColorProfileElementTag(h, i, &tag));
    if (i == 1) first = tag;
    last = tag;
    WalkElement(h, tag);
  }
  TAGTYPE beyond = 0;
  Check(!GetColorProfileElementTag(h, count + 1, &beyond));

  // Edits: overwrite the middle of the first element, grow it, drop the last one,
  // add a new one, rewrite the header.
  std::uint8_t pattern[16];
  std::memset(pattern, 0xA5, sizeof pattern);
  if (first != 0) {
    DWORD size0 = 0;
    GetColorProfileElement(h, first, 0, &size0, nullptr, nullptr);
    DWORD n = sizeof pattern;
    Check(SetColorProfileElement(h, first, size0 / 2, &n, pattern));
    Check(SetColorProfileElementSize(h, first, size0 + 5));
  }
  if (last != 0 && last != first) Check(SetColorProfileElementSize(h, last, 0));
  const TAGTYPE added = 0x7A7A7A7A;  // 'zzzz'
  SetColorProfileElementSize(h, added, 17);
  Check(SetColorProfileHeader(h, &header));

  std::vector<std::uint8_t> saved;
  Check(win32::icm::SerializeProfile(h, saved));
  DWORD countBefore = 0;
  Check(GetCountColorProfileElements(h, &countBefore));
  Check(CloseColorProfile(h));
  Check(std::memcmp(copy.data(), data, size) == 0);

  // What was saved reads back with the same tag count.
  PROFILE again{PROFILE_MEMBUFFER, saved.data(), static_cast<DWORD>(saved.size())};
  HPROFILE h2 = OpenColorProfileA(&again, PROFILE_READ, 0, OPEN_EXISTING);
  Check(h2 != nullptr);
  DWORD countAfter = 0;
  Check(GetCountColorProfileElements(h2, &countAfter) && countAfter == countBefore);
  Check(CloseColorProfile(h2));
  return 0;
}
