// The portable kernel: one pixel at a time, on every architecture.
#include "icm/kernels/fast_path.h"
#include "icm/kernels/pixel_ops.h"

namespace win32::icm::kernels::detail {

namespace {

template <typename PixelFn>
void Each(const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst, const PixelLayout& out, std::size_t n,
          PixelFn pixel) {
  for (std::size_t i = 0; i < n; ++i) pixel(src + i * in.bytes, dst + i * out.bytes);
}

}  // namespace

void RunScalar(const FastPath& p, const std::uint8_t* src, const PixelLayout& in, std::uint8_t* dst,
               const PixelLayout& out, std::size_t n) {
  switch (p.kind) {
    case Kind::Table1:
      return Each(src, in, dst, out, n, [&](const std::uint8_t* s, std::uint8_t* d) { ops::Table1Pixel(p, s, in, d, out); });
    case Kind::Matrix:
      return Each(src, in, dst, out, n, [&](const std::uint8_t* s, std::uint8_t* d) { ops::MatrixPixel(p, s, in, d, out); });
    case Kind::Clut3:
      return Each(src, in, dst, out, n, [&](const std::uint8_t* s, std::uint8_t* d) { ops::ClutPixel<3>(p, s, in, d, out); });
    case Kind::Clut4:
      return Each(src, in, dst, out, n, [&](const std::uint8_t* s, std::uint8_t* d) { ops::ClutPixel<4>(p, s, in, d, out); });
    case Kind::ShapedClut3:
      return Each(src, in, dst, out, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { ops::ShapedClutPixel<3>(p, s, in, d, out); });
    case Kind::ShapedClut4:
      return Each(src, in, dst, out, n,
                  [&](const std::uint8_t* s, std::uint8_t* d) { ops::ShapedClutPixel<4>(p, s, in, d, out); });
    case Kind::Staged:
      return Each(src, in, dst, out, n, [&](const std::uint8_t* s, std::uint8_t* d) { ops::StagedPixel(p, s, in, d, out); });
  }
}

}  // namespace win32::icm::kernels::detail
