// Conformance of TranslateBitmapBits: byte orders, strides, in place, threads, the
// callback and bad input. Pixels are compared with Little CMS run directly on the
// same formats, which must agree byte for byte.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <random>
#include <vector>

#include "icm/bitmap.h"
#include "transform_test_util.h"

namespace {

using namespace transform_test;

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
  const std::vector<DWORD> rel_ = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  const std::vector<cmsUInt32Number> lrel_ = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
};

TEST_F(BitmapTest, RefusesBadArguments) {
  Xform x({srgb_.get(), adobe_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  HTRANSFORM deleted;
  {
    Xform gone({srgb_.get(), adobe_.get()}, rel_);
    deleted = gone.get();
  }
  BYTE src[64] = {}, dst[64] = {};
  for (HTRANSFORM bad : {HTRANSFORM{nullptr}, deleted, HTRANSFORM{srgb_.get()}}) {
    SetLastError(kSentinel);
    EXPECT_FALSE(TranslateBitmapBits(bad, src, BM_RGBTRIPLETS, 1, 1, 0, dst, BM_RGBTRIPLETS, 0, nullptr, 0));
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  const struct {
    const char* what;
    void* src;
    BMFORMAT in;
    DWORD width, height, in_stride;
    void* dst;
    BMFORMAT out;
    DWORD out_stride;
    DWORD error;
  } cases[] = {
      {"null source", nullptr, BM_RGBTRIPLETS, 1, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},
      {"null destination", src, BM_RGBTRIPLETS, 1, 1, 0, nullptr, BM_RGBTRIPLETS, 0, ERROR_INVALID_PARAMETER},
      {"unknown format", src, static_cast<BMFORMAT>(0x0777), 1, 1, 0, dst, BM_RGBTRIPLETS, 0,
       ERROR_INVALID_PARAMETER},
      {"16-bit RGB", src, BM_16b_RGB, 1, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_NOT_SUPPORTED},
      {"5-5-5 RGB out", src, BM_RGBTRIPLETS, 1, 1, 0, dst, BM_x555RGB, 0, ERROR_NOT_SUPPORTED},
      {"Lab triplets", src, BM_LabTRIPLETS, 1, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_NOT_SUPPORTED},
      {"gray into RGB", src, BM_GRAY, 1, 1, 0, dst, BM_RGBTRIPLETS, 0, ERROR_COLORSPACE_MISMATCH},
      {"CMYK out of RGB", src, BM_RGBTRIPLETS, 1, 1, 0, dst, BM_KYMCQUADS, 0, ERROR_COLORSPACE_MISMATCH},
      {"input stride short of a row", src, BM_RGBTRIPLETS, 4, 2, 11, dst, BM_RGBTRIPLETS, 0,
       ERROR_INVALID_PARAMETER},
      {"output stride short of a row", src, BM_RGBTRIPLETS, 4, 2, 0, dst, BM_xRGBQUADS, 12,
       ERROR_INVALID_PARAMETER},
      {"row wider than a DWORD stride", src, BM_xRGBQUADS, 0x40000000, 1, 0, dst, BM_xRGBQUADS, 0,
       ERROR_INVALID_PARAMETER},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    SetLastError(kSentinel);
    EXPECT_FALSE(TranslateBitmapBits(x.get(), c.src, c.in, c.width, c.height, c.in_stride, c.dst, c.out,
                                     c.out_stride, nullptr, 0));
    EXPECT_EQ(GetLastError(), c.error);
  }
  // An empty image converts nothing and succeeds.
  SetLastError(kSentinel);
  EXPECT_TRUE(TranslateBitmapBits(x.get(), src, BM_RGBTRIPLETS, 0, 5, 0, dst, BM_RGBTRIPLETS, 0, nullptr, 0));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
}

TEST_F(BitmapTest, ByteOrderOfEachLayout) {
  Xform x({srgb_.get(), srgb_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  // Pure red in each input layout, and what each output layout must hold for it.
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
      SetLastError(kSentinel);
      ASSERT_TRUE(TranslateBitmapBits(x.get(), const_cast<BYTE*>(from.red.data()), from.format, 1, 1, 0,
                                      out.data(), to.format, 0, nullptr, 0));
      EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
      out.resize(to.red.size());
      // sRGB to itself in 8 bits: the primaries come back within one level.
      for (size_t i = 0; i < out.size(); ++i) EXPECT_NEAR(out[i], to.red[i], 1) << i;
    }
  }
  // The x byte is copied from an x input.
  BYTE quad[4] = {0x10, 0x20, 0x30, 0x99}, out[4] = {};
  ASSERT_TRUE(TranslateBitmapBits(x.get(), quad, BM_xRGBQUADS, 1, 1, 0, out, BM_xBGRQUADS, 0, nullptr, 0));
  EXPECT_EQ(out[3], 0x99);
  EXPECT_NEAR(out[0], 0x30, 1);
}

TEST_F(BitmapTest, CmykAndGrayLayouts) {
  Xform to_cmyk({srgb_.get(), cmyk_.get()}, rel_);
  Xform to_gray({srgb_.get(), gray_.get()}, rel_);
  ASSERT_NE(to_cmyk.get(), nullptr);
  ASSERT_NE(to_gray.get(), nullptr);
  const DWORD w = 37, h = 3;
  std::vector<BYTE> rgb = Noise(w * h * 3, 1);
  std::vector<BYTE> kymc(w * h * 4), cmyk(w * h * 4), gray(w * h), expect_cmyk(w * h * 4), expect_gray(w * h);
  // Tight strides, given explicitly.
  ASSERT_TRUE(TranslateBitmapBits(to_cmyk.get(), rgb.data(), BM_BGRTRIPLETS, w, h, w * 3, kymc.data(),
                                  BM_KYMCQUADS, w * 4, nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(to_cmyk.get(), rgb.data(), BM_BGRTRIPLETS, w, h, w * 3, cmyk.data(),
                                  BM_CMYKQUADS, w * 4, nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(to_gray.get(), rgb.data(), BM_BGRTRIPLETS, w, h, w * 3, gray.data(), BM_GRAY,
                                  w, nullptr, 0));
  LcmsChain l_cmyk({"sRGB.icc", "ghostscript/default_cmyk.icc"}, lrel_, TYPE_RGB_8, TYPE_CMYK_8,
                   cmsFLAGS_COPY_ALPHA);
  LcmsChain l_gray({"sRGB.icc", "Gray.icc"}, lrel_, TYPE_RGB_8, TYPE_GRAY_8, cmsFLAGS_COPY_ALPHA);
  cmsDoTransform(l_cmyk.get(), rgb.data(), expect_cmyk.data(), w * h);
  cmsDoTransform(l_gray.get(), rgb.data(), expect_gray.data(), w * h);
  EXPECT_EQ(kymc, expect_cmyk);  // KYMC quads hold C, M, Y, K in memory
  EXPECT_EQ(gray, expect_gray);
  for (size_t i = 0; i < w * h; ++i) {  // CMYK quads hold K, Y, M, C
    ASSERT_EQ(cmyk[i * 4], kymc[i * 4 + 3]);
    ASSERT_EQ(cmyk[i * 4 + 1], kymc[i * 4 + 2]);
    ASSERT_EQ(cmyk[i * 4 + 2], kymc[i * 4 + 1]);
    ASSERT_EQ(cmyk[i * 4 + 3], kymc[i * 4]);
  }
}

TEST_F(BitmapTest, PaddedRowsKeepTheirPadding) {
  Xform x({srgb_.get(), adobe_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  LcmsChain l({"sRGB.icc", "compatibleWithAdobeRGB1998.icc"}, lrel_, TYPE_BGR_8, TYPE_BGR_8, cmsFLAGS_COPY_ALPHA);
  for (DWORD w : {1u, 3u, 5u}) {
    for (DWORD out_stride : {0u, 3 * w + 9}) {
      SCOPED_TRACE(testing::Message() << "width " << w << " out stride " << out_stride);
      const DWORD h = 4;
      const size_t in_stride = (3 * w + 3) & ~3u;  // what stride 0 means
      const size_t stride = out_stride ? out_stride : in_stride;
      std::vector<BYTE> src = Noise(in_stride * h, w);
      std::vector<BYTE> dst(stride * h, 0xEE);
      ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, dst.data(), BM_RGBTRIPLETS,
                                      out_stride, nullptr, 0));
      for (DWORD r = 0; r < h; ++r) {
        BYTE expect[3 * 5];
        cmsDoTransform(l.get(), &src[r * in_stride], expect, w);
        EXPECT_EQ(0, std::memcmp(&dst[r * stride], expect, 3 * w)) << "row " << r;
        for (size_t i = 3 * w; i < stride; ++i) EXPECT_EQ(dst[r * stride + i], 0xEE) << "row " << r;
      }
    }
  }
}

TEST_F(BitmapTest, InPlaceMatchesOutOfPlace) {
  Xform x({srgb_.get(), adobe_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  const DWORD w = 5, h = 7;
  const struct {
    const char* what;
    BMFORMAT in;
    DWORD in_stride;
    BMFORMAT out;
    DWORD out_stride;
  } cases[] = {
      {"same size", BM_RGBTRIPLETS, 0, BM_BGRTRIPLETS, 0},
      {"smaller pixels, same stride", BM_xRGBQUADS, 20, BM_RGBTRIPLETS, 20},
      {"smaller pixels and rows", BM_xRGBQUADS, 0, BM_RGBTRIPLETS, 0},
      {"bigger pixels", BM_RGBTRIPLETS, 0, BM_xBGRQUADS, 0},
      {"bigger rows", BM_RGBTRIPLETS, 16, BM_RGBTRIPLETS, 40},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    std::vector<BYTE> image = Noise(h * 40 + 64, 3);
    std::vector<BYTE> separate(image.size(), 0);
    ASSERT_TRUE(TranslateBitmapBits(x.get(), image.data(), c.in, w, h, c.in_stride, separate.data(), c.out,
                                    c.out_stride, nullptr, 0));
    ASSERT_TRUE(TranslateBitmapBits(x.get(), image.data(), c.in, w, h, c.in_stride, image.data(), c.out,
                                    c.out_stride, nullptr, 0));
    const size_t bytes = c.out == BM_xBGRQUADS ? 4 : 3;
    const size_t stride = c.out_stride ? c.out_stride : (w * bytes + 3) & ~size_t{3};
    for (DWORD r = 0; r < h; ++r) {
      EXPECT_EQ(0, std::memcmp(&image[r * stride], &separate[r * stride], w * bytes)) << "row " << r;
    }
  }
}

TEST_F(BitmapTest, ThreadsGiveTheSameBytes) {
  Xform x({srgb_.get(), cmyk_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  const DWORD w = 1023, h = 300;  // beyond the threading threshold; odd rows are padded
  static_assert(1023 * 300 >= win32::icm::kBitmapThreadingPixels, "large enough to share");
  const size_t in_stride = (3 * w + 3) & ~3u;
  std::vector<BYTE> src = Noise(in_stride * h, 11);
  std::vector<BYTE> one(w * 4 * h), two(w * 4 * h);
  win32::icm::SetBitmapThreadLimit(1);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, one.data(), BM_KYMCQUADS, 0,
                                  nullptr, 0));
  win32::icm::SetBitmapThreadLimit(2);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, two.data(), BM_KYMCQUADS, 0,
                                  nullptr, 0));
  EXPECT_TRUE(one == two);
  // And both are what Little CMS gives, row by row.
  LcmsChain l({"sRGB.icc", "ghostscript/default_cmyk.icc"}, lrel_, TYPE_BGR_8, TYPE_CMYK_8, cmsFLAGS_COPY_ALPHA);
  std::vector<BYTE> expect(w * 4);
  for (DWORD r = 0; r < h; r += 37) {
    cmsDoTransform(l.get(), &src[r * in_stride], expect.data(), w);
    ASSERT_EQ(0, std::memcmp(&one[r * w * 4], expect.data(), w * 4)) << "row " << r;
  }
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
  Xform x({srgb_.get(), adobe_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  const DWORD w = 2048, h = 1200;  // several bands
  std::vector<BYTE> src = Noise(w * 3 * h, 5), dst(w * 3 * h, 0);
  Progress all;
  SetLastError(kSentinel);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, dst.data(), BM_RGBTRIPLETS, 0,
                                  OnProgress, reinterpret_cast<LPARAM>(&all)));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  EXPECT_EQ(all.max, h);
  ASSERT_GT(all.seen.size(), 1u);
  EXPECT_EQ(all.seen.back(), h);
  for (size_t i = 1; i < all.seen.size(); ++i) EXPECT_GT(all.seen[i], all.seen[i - 1]);

  Progress cancel;
  cancel.stop_after = 1;
  std::vector<BYTE> partial(dst.size(), 0);
  SetLastError(kSentinel);
  EXPECT_FALSE(TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, w, h, 0, partial.data(), BM_RGBTRIPLETS, 0,
                                   OnProgress, reinterpret_cast<LPARAM>(&cancel)));
  EXPECT_EQ(GetLastError(), ERROR_CANCELLED);
  ASSERT_EQ(cancel.seen.size(), 1u);
  // The first band was converted, the rest never started.
  const size_t done = size_t{cancel.seen[0]} * w * 3;
  EXPECT_EQ(0, std::memcmp(partial.data(), dst.data(), done));
  EXPECT_TRUE(std::all_of(partial.begin() + done, partial.end(), [](BYTE b) { return b == 0; }));
}

}  // namespace
