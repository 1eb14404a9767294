// Fuzz target for transforms: up to four profiles (built-in ones, patched, or raw
// bytes) and intents from the input make a chain; when it builds, colours of any type
// go through TranslateColors and CheckColors. Every call must end with the right last
// error, and refused colours must leave the output untouched.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_profiles.h"

namespace {

constexpr DWORD kMaxColors = 12;

// 0 and 13 are not colour types; all stay within the enumeration's range.
COLORTYPE ReadType(fuzz::Input& in) { return static_cast<COLORTYPE>(in.Byte() % 14); }

// The bytes of a COLOR that a colour of this type occupies; the rest are the caller's.
std::size_t Width(COLORTYPE type) {
  switch (type) {
    case COLOR_GRAY: return 2;
    case COLOR_CMYK: return 8;
    case COLOR_5_CHANNEL:
    case COLOR_6_CHANNEL:
    case COLOR_7_CHANNEL:
    case COLOR_8_CHANNEL: return 5 + (type - COLOR_5_CHANNEL);
    case COLOR_NAMED: return 4;
    default: return 6;
  }
}

// Whether the first `width` bytes of every colour agree.
bool Same(const std::vector<COLOR>& a, const std::vector<COLOR>& b, std::size_t width = sizeof(COLOR)) {
  for (std::size_t i = 0; i < a.size(); ++i) {
    if (std::memcmp(&a[i], &b[i], width) != 0) return false;
  }
  return true;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input in(data, size);
  fuzz::Profiles profiles(in);
  std::vector<HPROFILE>& handles = profiles.handles();
  std::vector<DWORD> intents = fuzz::ReadIntents(in, handles.size());
  const DWORD flags = in.Byte() & 1 ? ENABLE_GAMUT_CHECKING : BEST_MODE;

  SetLastError(fuzz::kSentinel);
  HTRANSFORM x = CreateMultiProfileTransform(handles.data(), static_cast<DWORD>(handles.size()), intents.data(),
                                             static_cast<DWORD>(intents.size()), flags, INDEX_DONT_CARE);
  fuzz::CheckEnding(x != nullptr);
  if (!x) return 0;

  for (int round = in.Byte() % 3; round >= 0; --round) {
    const COLORTYPE in_type = ReadType(in), out_type = ReadType(in);
    const DWORD n = in.Byte() % (kMaxColors + 1);
    std::vector<COLOR> colors(n), out(n);
    for (COLOR& c : out) std::memset(&c, 0xA5, sizeof c);
    for (COLOR& c : colors) {
      const fuzz::Bytes b = in.Take(sizeof c);
      if (!b.empty()) std::memcpy(&c, b.data(), b.size());
      if (in_type == COLOR_NAMED) c.named.dwIndex %= 8;  // mostly near a short list
    }
    const std::vector<COLOR> before = out;
    SetLastError(fuzz::kSentinel);
    const BOOL ok = TranslateColors(x, colors.data(), n, in_type, out.data(), out_type);
    fuzz::CheckEnding(ok);
    if (!ok) fuzz::Check(Same(out, before));
    // A colour is written in its type's bytes only: the caller may keep a shorter COLOR.
    for (std::size_t i = 0; ok && i < n; ++i) {
      const auto* tail = reinterpret_cast<const std::uint8_t*>(&out[i]) + Width(out_type);
      fuzz::Check(std::all_of(tail, reinterpret_cast<const std::uint8_t*>(&out[i] + 1),
                              [](std::uint8_t b) { return b == 0xA5; }));
    }

    // In place must give what separate arrays gave.
    if (ok && in.Byte() & 1) {
      std::vector<COLOR> same = colors;
      SetLastError(fuzz::kSentinel);
      fuzz::Check(TranslateColors(x, same.data(), n, in_type, same.data(), out_type));
      fuzz::CheckEnding(true);
      fuzz::Check(Same(same, out, Width(out_type)));
    }

    std::vector<BYTE> result(n);
    SetLastError(fuzz::kSentinel);
    const BOOL checked = CheckColors(x, colors.data(), std::min<DWORD>(n, 4), in_type, result.data());
    fuzz::CheckEnding(checked);
  }

  SetLastError(fuzz::kSentinel);
  fuzz::Check(DeleteColorTransform(x));
  fuzz::CheckEnding(true);
  return 0;
}
