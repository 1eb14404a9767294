// Fuzz target for TranslateBitmapBits: formats (supported, known but unsupported, and
// values no format has), widths, heights and strides from the input, over transforms
// made once at start-up. Buffers are sized from the arguments as a careful caller
// would, to the last pixel of the last row, so any byte touched beyond them is caught.
// Arguments no buffer can back must be refused. A converted image must leave the row
// padding alone, report its rows to the callback in order, and come out the same when
// source and destination share a buffer or overlap, and with each instruction set the
// image kernels can use (their vector blocks and scalar tails meet at odd widths).
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

#include "fuzz_profiles.h"
#include "icm/kernels/fast_path.h"

namespace {

constexpr std::uint64_t kMaxBuffer = std::uint64_t{1} << 20;

// Transforms between the built-in profiles (by their place in BuiltinProfiles()),
// kept for the whole run: RGB, gray and CMYK at either end, and two that no bitmap
// format fits (an end in Lab, a named list).
std::vector<HTRANSFORM> MakeTransforms() {
  const int chains[][2] = {{0, 1}, {0, 6}, {6, 0}, {5, 0}, {0, 5}, {7, -1}, {11, -1}, {0, 2}, {9, 0}};
  std::vector<fuzz::Bytes> bytes = fuzz::BuiltinProfiles();
  std::vector<HPROFILE> opened;
  for (fuzz::Bytes& b : bytes) opened.push_back(fuzz::OpenBytes(b));
  std::vector<HTRANSFORM> out;
  for (const auto& c : chains) {
    HPROFILE chain[2] = {opened[c[0]], c[1] >= 0 ? opened[c[1]] : nullptr};
    DWORD intent = INTENT_PERCEPTUAL;
    out.push_back(CreateMultiProfileTransform(chain, c[1] >= 0 ? 2 : 1, &intent, 1, BEST_MODE, INDEX_DONT_CARE));
    fuzz::Check(out.back() != nullptr);
  }
  for (HPROFILE h : opened) CloseColorProfile(h);
  return out;
}

struct Format {
  BMFORMAT format;
  unsigned bytes;  // per pixel; 0 for formats the call must refuse
};

constexpr Format kSupported[] = {{BM_RGBTRIPLETS, 3}, {BM_BGRTRIPLETS, 3}, {BM_xRGBQUADS, 4}, {BM_xBGRQUADS, 4},
                                 {BM_GRAY, 1},        {BM_KYMCQUADS, 4},   {BM_CMYKQUADS, 4}};
constexpr BMFORMAT kUnsupported[] = {BM_x555RGB, BM_565RGB, BM_16b_RGB, BM_LabTRIPLETS, BM_5CHANNEL, BM_NAMED_INDEX};

Format ReadFormat(fuzz::Input& in) {
  const std::uint8_t b = in.Byte();
  if (b < 0xE0) return kSupported[b % std::size(kSupported)];
  if (b < 0xF0) return {kUnsupported[b % std::size(kUnsupported)], 0};
  // Any value within the enumeration's range (eleven bits), a supported one included.
  const auto any = static_cast<BMFORMAT>(in.Word() & 0x7FF);
  for (const Format& f : kSupported) {
    if (f.format == any) return f;
  }
  return {any, 0};
}

DWORD ReadExtent(fuzz::Input& in) {
  const std::uint8_t mode = in.Byte();
  switch (mode & 3) {
    case 0: return mode >> 2;
    case 1: return in.Byte();
    case 2: return in.Word();
    default: return in.Dword();
  }
}

// 0 (rows padded to four bytes), about one row (a little short of it or padded), or any.
DWORD ReadStride(fuzz::Input& in, std::uint64_t row) {
  const std::uint8_t mode = in.Byte();
  if (mode < 0x40) return 0;
  if (mode < 0xC0) {
    const std::int64_t s = static_cast<std::int64_t>(row) + (mode & 15) - 4;
    return static_cast<DWORD>(std::clamp<std::int64_t>(s, 0, 0xFFFFFFFF));
  }
  return mode < 0xE0 ? in.Word() : in.Dword();
}

struct Geometry {
  std::uint64_t row, stride;
  unsigned __int128 extent;  // bytes from the first pixel to the end of the last row's pixels
  bool valid;                // a stride that holds a row and fits a DWORD
};

Geometry Resolve(DWORD width, DWORD height, unsigned bytes, DWORD given) {
  Geometry g;
  g.row = std::uint64_t{width} * bytes;
  g.stride = given ? given : (g.row + 3) & ~std::uint64_t{3};
  g.valid = g.stride >= g.row && g.stride <= 0xFFFFFFFFu;
  g.extent = width && height ? static_cast<unsigned __int128>(height - 1) * g.stride + g.row : 0;
  return g;
}

struct Progress {
  ULONG height;
  ULONG done = 0;
  int calls = 0;
  int stop_at;  // 0: never
};

BOOL WINAPI OnBand(ULONG total, ULONG done, LPARAM data) {
  auto* p = reinterpret_cast<Progress*>(data);
  fuzz::Check(total == p->height && done > p->done && done <= total);
  p->done = done;
  return ++p->calls != p->stop_at;
}

// The pixel bytes of each row, without the padding.
fuzz::Bytes Pixels(const std::uint8_t* base, const Geometry& g, DWORD height) {
  fuzz::Bytes out;
  for (DWORD r = 0; r < height; ++r) out.insert(out.end(), base + r * g.stride, base + r * g.stride + g.row);
  return out;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const std::vector<HTRANSFORM> transforms = MakeTransforms();
  fuzz::Input in(data, size);
  HTRANSFORM x = transforms[in.Byte() % transforms.size()];
  const Format fin = ReadFormat(in), fout = ReadFormat(in);
  const DWORD width = ReadExtent(in), height = ReadExtent(in);
  const DWORD in_given = ReadStride(in, std::uint64_t{width} * fin.bytes);
  const DWORD out_given = ReadStride(in, std::uint64_t{width} * fout.bytes);
  const std::uint8_t layout = in.Byte();
  const Geometry gin = Resolve(width, height, fin.bytes, in_given);
  const Geometry gout = Resolve(width, height, fout.bytes, out_given);
  Progress progress{height, 0, 0, layout >> 6};
  const bool callback = layout & 1;

  const bool must_fail =
      !fin.bytes || !fout.bytes || !gin.valid || !gout.valid || gin.extent > PTRDIFF_MAX || gout.extent > PTRDIFF_MAX;
  if (must_fail) {
    std::uint8_t src[16] = {}, dst[16] = {};
    SetLastError(fuzz::kSentinel);
    fuzz::Check(!TranslateBitmapBits(x, src, fin.format, width, height, in_given, dst, fout.format, out_given,
                                     callback ? OnBand : nullptr, reinterpret_cast<LPARAM>(&progress)));
    fuzz::CheckEnding(false);
    if (fin.bytes && fout.bytes && (!gin.valid || !gout.valid)) fuzz::Check(GetLastError() == ERROR_INVALID_PARAMETER);
    fuzz::Check(progress.calls == 0);
    return 0;
  }
  if (gin.extent > kMaxBuffer || gout.extent > kMaxBuffer) return 0;  // valid, but too large to back here

  // Exact-size blocks (at least one byte, so null is never passed).
  const std::size_t in_extent = static_cast<std::size_t>(gin.extent),
                    out_extent = static_cast<std::size_t>(gout.extent);
  fuzz::Bytes pattern = in.Take(64);
  if (pattern.empty()) pattern.push_back(0x5A);
  fuzz::Bytes src(std::max<std::size_t>(in_extent, 1)), dst(std::max<std::size_t>(out_extent, 1), 0xA5);
  for (std::size_t i = 0; i < src.size(); ++i)
    src[i] = static_cast<std::uint8_t>(pattern[i % pattern.size()] + i / pattern.size());
  const fuzz::Bytes src_before = src, dst_before = dst;

  SetLastError(fuzz::kSentinel);
  const BOOL ok = TranslateBitmapBits(x, src.data(), fin.format, width, height, in_given, dst.data(), fout.format,
                                      out_given, callback ? OnBand : nullptr, reinterpret_cast<LPARAM>(&progress));
  fuzz::CheckEnding(ok);
  fuzz::Check(src == src_before);
  const bool cancelled = !ok && GetLastError() == ERROR_CANCELLED;
  fuzz::Check(cancelled == (progress.stop_at != 0 && progress.calls == progress.stop_at));
  if (!ok && !cancelled) {
    fuzz::Check(dst == dst_before && progress.calls == 0);
    return 0;
  }
  // Padding between rows is the caller's.
  for (DWORD r = 0; out_extent && r + 1 < height; ++r) {
    const std::size_t from = r * gout.stride + gout.row, to = (r + 1) * gout.stride;
    fuzz::Check(std::equal(dst.begin() + from, dst.begin() + to, dst_before.begin() + from));
  }
  if (!ok) return 0;
  fuzz::Check(!callback || width == 0 || height == 0 || progress.done == height);
  if (layout & 16) {
    using win32::icm::kernels::Isa;
    for (Isa isa : {Isa::Scalar, Isa::Sse2}) {
      if (!win32::icm::kernels::IsaAvailable(isa)) continue;
      fuzz::Bytes again(dst_before);
      win32::icm::kernels::ForceIsa(isa);
      const BOOL same_ok = TranslateBitmapBits(x, src.data(), fin.format, width, height, in_given, again.data(),
                                               fout.format, out_given, nullptr, 0);
      win32::icm::kernels::ForceIsa(Isa::Avx2);
      fuzz::Check(same_ok && again == dst);
    }
  }
  if (!(layout & 2) || in_extent == 0) return 0;

  // The same conversion with both images in one block: the same buffer, or the output
  // starting `shift` bytes before or after the input.
  const std::size_t shift = (layout & 4) ? 0 : in.Word() % (std::max(in_extent, out_extent) + 1);
  const bool output_first = layout & 8;
  const std::size_t src_at = output_first ? shift : 0, dst_at = output_first ? 0 : shift;
  fuzz::Bytes shared(std::max(src_at + in_extent, dst_at + out_extent));
  std::copy(src.begin(), src.begin() + in_extent, shared.begin() + src_at);
  SetLastError(fuzz::kSentinel);
  fuzz::Check(TranslateBitmapBits(x, shared.data() + src_at, fin.format, width, height, in_given,
                                  shared.data() + dst_at, fout.format, out_given, nullptr, 0));
  fuzz::CheckEnding(true);
  fuzz::Check(Pixels(shared.data() + dst_at, gout, height) == Pixels(dst.data(), gout, height));
  return 0;
}
