// Conformance of TranslateBitmapBits: byte orders, strides, in place, threads, the
// callback and bad input. Pixels are compared with Little CMS run directly in double
// precision (within the kernels' bounds) and with the same pixels converted packed.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <random>
#include <vector>

#include "icm/bitmap.h"
#include "transform_test_util.h"

namespace {

using namespace transform_test;

// Little CMS in double precision on 8-bit pixels, rounded back to bytes.
std::vector<BYTE> Exact(const std::vector<std::string>& names, unsigned in_n, unsigned out_n,
                        const std::vector<BYTE>& in) {
  LcmsChain l(names, std::vector<cmsUInt32Number>(names.size(), kRel),
              FLOAT_SH(1) | CHANNELS_SH(in_n) | BYTES_SH(0), FLOAT_SH(1) | CHANNELS_SH(out_n) | BYTES_SH(0));
  std::vector<double> unit(in.begin(), in.end()), out(in.size() / in_n * out_n);
  for (double& u : unit) u /= 255;
  cmsDoTransform(l.get(), unit.data(), out.data(), static_cast<cmsUInt32Number>(in.size() / in_n));
  std::vector<BYTE> bytes(out.size());
  for (size_t i = 0; i < out.size(); ++i) bytes[i] = static_cast<BYTE>(std::lround(std::clamp(out[i], 0.0, 1.0) * 255));
  return bytes;
}

void ExpectNear(const std::vector<BYTE>& got, const std::vector<BYTE>& want, int levels) {
  ASSERT_EQ(got.size(), want.size());
  int worst = 0;
  for (size_t i = 0; i < got.size(); ++i) worst = std::max(worst, std::abs(got[i] - want[i]));
  EXPECT_LE(worst, levels);
}

std::vector<BYTE> Noise(size_t n, unsigned seed) {
  std::mt19937 rng(seed);
  std::vector<BYTE> v(n);
  for (BYTE& b : v) b = static_cast<BYTE>(rng());
  return v;
}

class BitmapTest : public ::testing::Test {
 protected:
  void TearDown() override { win32::icm::SetBitmapThreadLimit(0); }
  Profile srgb_{"sRGB.icc"};
  Profile adobe_{"compatibleWithAdobeRGB1998.icc"};
  Profile cmyk_{"ghostscript/default_cmyk.icc"};
  Profile gray_{"Gray.icc"};
  const std::string cmyk_name_ = "ghostscript/default_cmyk.icc";
};

TEST_F(BitmapTest, RefusesBadArguments) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel, kRel});
  BYTE src[64] = {}, dst[64] = {};
  const struct {
    void* src;
    BMFORMAT in;
    DWORD width, in_stride;
    void* dst;
    BMFORMAT out;
    DWORD out_stride, error;
  } cases[] = {
      {nullptr, BM_RGBTRIPLETS, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},
      {src, BM_RGBTRIPLETS, 1, 0, nullptr, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},
      {src, static_cast<BMFORMAT>(0x0777), 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},
      {src, BM_16b_RGB, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_NOT_SUPPORTED},
      {src, BM_RGBTRIPLETS, 1, 0, dst, BM_x555RGB, 0, ERROR_NOT_SUPPORTED},
      {src, BM_GRAY, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_COLORSPACE_MISMATCH},
      {src, BM_RGBTRIPLETS, 1, 0, dst, BM_KYMCQUADS, 0, ERROR_COLORSPACE_MISMATCH},
      {src, BM_RGBTRIPLETS, 4, 11, dst, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},  // stride short of a row
      {src, BM_RGBTRIPLETS, 4, 0, dst, BM_xRGBQUADS, 12, ERROR_INVALID_PARAMETER},
      {src, BM_xRGBQUADS, 0x40000000, 0, dst, BM_xRGBQUADS, 0, ERROR_INVALID_PARAMETER},  // row beyond 4 GB
  };
  for (size_t i = 0; i < std::size(cases); ++i) {
    SCOPED_TRACE(i);
    const auto& c = cases[i];
    SetLastError(kSentinel);
    EXPECT_FALSE(
        TranslateBitmapBits(x.get(), c.src, c.in, c.width, 2, c.in_stride, c.dst, c.out, c.out_stride, nullptr, 0));
    EXPECT_EQ(GetLastError(), c.error);
  }
  SetLastError(kSentinel);  // an empty image
  EXPECT_TRUE(TranslateBitmapBits(x.get(), src, BM_RGBTRIPLETS, 0, 5, 0, dst, BM_RGBTRIPLETS, 0, nullptr, 0));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
}

TEST_F(BitmapTest, ByteOrderOfEachLayout) {
  Xform x({srgb_.get(), srgb_.get()}, {kRel, kRel});
  // Pure red in each layout; x bytes are 0 when the input has none.
  const struct {
    BMFORMAT format;
    std::vector<BYTE> red;
  } layouts[] = {
      {BM_RGBTRIPLETS, {0x00, 0x00, 0xFF}},
      {BM_BGRTRIPLETS, {0xFF, 0x00, 0x00}},
      {BM_xRGBQUADS, {0x00, 0x00, 0xFF, 0x00}},
      {BM_xBGRQUADS, {0xFF, 0x00, 0x00, 0x00}},
  };
  for (const auto& from : layouts) {
    for (const auto& to : layouts) {
      SCOPED_TRACE(testing::Message() << from.format << " -> " << to.format);
      std::vector<BYTE> out(4, 0xEE);
      ASSERT_TRUE(TranslateBitmapBits(x.get(), const_cast<BYTE*>(from.red.data()), from.format, 1, 1, 0,
                                      out.data(), to.format, 0, nullptr, 0));
      for (size_t i = 0; i < to.red.size(); ++i) EXPECT_NEAR(out[i], to.red[i], 1) << i;  // 8-bit: one level
    }
  }
  BYTE quad[4] = {0x10, 0x20, 0x30, 0x99}, out[4] = {};
  ASSERT_TRUE(TranslateBitmapBits(x.get(), quad, BM_xRGBQUADS, 1, 1, 0, out, BM_xBGRQUADS, 0, nullptr, 0));
  EXPECT_EQ(out[3], 0x99);  // copied from an x input
}

TEST_F(BitmapTest, CmykAndGrayLayouts) {
  Xform to_cmyk({srgb_.get(), cmyk_.get()}, {kRel, kRel});
  Xform to_gray({srgb_.get(), gray_.get()}, {kRel, kRel});
  const DWORD w = 37, h = 3;
  const std::vector<BYTE> rgb = Noise(w * h * 3, 1);
  std::vector<BYTE> kymc(w * h * 4), cmyk(w * h * 4), gray(w * h);
  BYTE* src = const_cast<BYTE*>(rgb.data());
  ASSERT_TRUE(TranslateBitmapBits(to_cmyk.get(), src, BM_BGRTRIPLETS, w, h, w * 3, kymc.data(), BM_KYMCQUADS, w * 4,
                                  nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(to_cmyk.get(), src, BM_BGRTRIPLETS, w, h, w * 3, cmyk.data(), BM_CMYKQUADS, w * 4,
                                  nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(to_gray.get(), src, BM_BGRTRIPLETS, w, h, w * 3, gray.data(), BM_GRAY, w, nullptr,
                                  0));
  ExpectNear(kymc, Exact({"sRGB.icc", cmyk_name_}, 3, 4, rgb), 10);  // KYMC quads: C, M, Y, K in memory
  ExpectNear(gray, Exact({"sRGB.icc", "Gray.icc"}, 3, 1, rgb), 1);
  std::vector<BYTE> reversed(cmyk);  // CMYK quads: K, Y, M, C
  for (size_t i = 0; i < w * h; ++i) std::reverse(&reversed[i * 4], &reversed[i * 4 + 4]);
  EXPECT_EQ(reversed, kymc);
}

TEST_F(BitmapTest, PaddedRowsKeepTheirPadding) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel, kRel});
  for (DWORD w : {1u, 3u, 5u}) {
    for (DWORD out_stride : {0u, 3 * w + 9}) {
      SCOPED_TRACE(testing::Message() << "width " << w << " out stride " << out_stride);
      const DWORD h = 4;
      const size_t in_stride = (3 * w + 3) & ~3u;  // what stride 0 means
      const size_t stride = out_stride ? out_stride : in_stride;
      std::vector<BYTE> src = Noise(in_stride * h, w), dst(stride * h, 0xEE);
      ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, dst.data(), BM_RGBTRIPLETS,
                                      out_stride, nullptr, 0));
      for (DWORD r = 0; r < h; ++r) {
        BYTE expect[15];
        ASSERT_TRUE(TranslateBitmapBits(x.get(), &src[r * in_stride], BM_RGBTRIPLETS, w, 1, 0, expect, BM_RGBTRIPLETS,
                                        0, nullptr, 0));
        EXPECT_EQ(0, std::memcmp(&dst[r * stride], expect, 3 * w)) << "row " << r;
        for (size_t i = 3 * w; i < stride; ++i) EXPECT_EQ(dst[r * stride + i], 0xEE) << "row " << r;
      }
    }
  }
}

TEST_F(BitmapTest, InPlaceMatchesOutOfPlace) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel, kRel});
  const DWORD w = 5, h = 7;
  const struct {
    BMFORMAT in;
    DWORD in_stride;
    BMFORMAT out;
    DWORD out_stride, out_bytes;
  } cases[] = {
      {BM_RGBTRIPLETS, 0, BM_BGRTRIPLETS, 0, 3},   // same size
      {BM_xRGBQUADS, 20, BM_RGBTRIPLETS, 20, 3},   // smaller pixels, same rows
      {BM_xRGBQUADS, 0, BM_RGBTRIPLETS, 0, 3},     // smaller pixels and rows
      {BM_RGBTRIPLETS, 0, BM_xBGRQUADS, 0, 4},     // bigger pixels
      {BM_RGBTRIPLETS, 16, BM_RGBTRIPLETS, 40, 3}, // bigger rows
      {BM_xRGBQUADS, 22, BM_xRGBQUADS, 20, 4},     // x bytes kept, smaller rows
  };
  for (size_t i = 0; i < std::size(cases); ++i) {
    SCOPED_TRACE(i);
    const auto& c = cases[i];
    std::vector<BYTE> image = Noise(h * 40 + 64, 3), separate(image.size(), 0);
    ASSERT_TRUE(TranslateBitmapBits(x.get(), image.data(), c.in, w, h, c.in_stride, separate.data(), c.out,
                                    c.out_stride, nullptr, 0));
    ASSERT_TRUE(TranslateBitmapBits(x.get(), image.data(), c.in, w, h, c.in_stride, image.data(), c.out,
                                    c.out_stride, nullptr, 0));
    const size_t stride = c.out_stride ? c.out_stride : (w * c.out_bytes + 3) & ~size_t{3};
    for (DWORD r = 0; r < h; ++r) EXPECT_EQ(0, std::memcmp(&image[r * stride], &separate[r * stride], w * c.out_bytes));
  }
}

TEST_F(BitmapTest, ThreadsGiveTheSameBytes) {
  Xform x({srgb_.get(), cmyk_.get()}, {kRel, kRel});
  const DWORD w = 1023, h = 300;  // above the threading threshold; rows padded
  static_assert(1023 * 300 >= win32::icm::kBitmapThreadingPixels, "large enough to share");
  const size_t in_stride = (3 * w + 3) & ~3u;
  std::vector<BYTE> src = Noise(in_stride * h, 11), one(w * 4 * h), two(w * 4 * h);
  for (auto [limit, out] : {std::pair{1u, &one}, std::pair{2u, &two}}) {
    win32::icm::SetBitmapThreadLimit(limit);
    ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, out->data(), BM_KYMCQUADS, 0,
                                    nullptr, 0));
  }
  EXPECT_TRUE(one == two);
  // In place onto smaller pixels, shares may not cut rows: a pixel's output overwrites
  // the input of earlier pixels in its row.
  Xform back({cmyk_.get(), srgb_.get()}, {kRel, kRel});
  std::vector<BYTE> quads = Noise(size_t{w} * 4 * h, 12), apart(quads.size());
  ASSERT_TRUE(TranslateBitmapBits(back.get(), quads.data(), BM_KYMCQUADS, w, h, w * 4, apart.data(), BM_RGBTRIPLETS,
                                  w * 4, nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(back.get(), quads.data(), BM_KYMCQUADS, w, h, w * 4, quads.data(), BM_RGBTRIPLETS,
                                  w * 4, nullptr, 0));
  for (DWORD r = 0; r < h; ++r) ASSERT_EQ(0, std::memcmp(&quads[r * w * 4], &apart[r * w * 4], w * 3)) << r;
  std::vector<BYTE> rgb;  // the first row, R, G, B
  for (DWORD i = 0; i < w; ++i) rgb.insert(rgb.end(), {src[i * 3 + 2], src[i * 3 + 1], src[i * 3]});
  ExpectNear(std::vector<BYTE>(one.begin(), one.begin() + w * 4), Exact({"sRGB.icc", cmyk_name_}, 3, 4, rgb), 10);
}

struct Progress {
  std::vector<ULONG> seen;
  ULONG max = 0;
  size_t stop_after = SIZE_MAX;
};

BOOL WINAPI OnProgress(ULONG max, ULONG current, LPARAM data) {
  auto* p = reinterpret_cast<Progress*>(data);
  p->max = max;
  p->seen.push_back(current);
  return p->seen.size() < p->stop_after;
}

TEST_F(BitmapTest, CallbackReportsRowsAndCanCancel) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel, kRel});
  const DWORD w = 2048, h = 1200;  // several bands
  std::vector<BYTE> src = Noise(w * 3 * h, 5), dst(w * 3 * h, 0), partial(w * 3 * h, 0);
  Progress all;
  ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, dst.data(), BM_RGBTRIPLETS, 0,
                                  OnProgress, reinterpret_cast<LPARAM>(&all)));
  EXPECT_EQ(all.max, h);
  ASSERT_GT(all.seen.size(), 1u);
  EXPECT_EQ(all.seen.back(), h);
  EXPECT_TRUE(std::is_sorted(all.seen.begin(), all.seen.end()));
  Progress cancel;
  cancel.stop_after = 1;
  SetLastError(kSentinel);
  EXPECT_FALSE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, partial.data(), BM_RGBTRIPLETS, 0,
                                   OnProgress, reinterpret_cast<LPARAM>(&cancel)));
  EXPECT_EQ(GetLastError(), ERROR_CANCELLED);
  ASSERT_EQ(cancel.seen.size(), 1u);
  const size_t done = size_t{cancel.seen[0]} * w * 3;  // the first band only
  EXPECT_EQ(0, std::memcmp(partial.data(), dst.data(), done));
  EXPECT_TRUE(std::all_of(partial.begin() + done, partial.end(), [](BYTE b) { return b == 0; }));
}

}  // namespace
