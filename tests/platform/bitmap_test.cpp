// TranslateBitmapBits: x bytes, strides, in place, threads, the callback and bad input.
// The kernels' accuracy in every layout is bitmap_kernel_test's.
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

class BitmapTest : public ChainTest {
 protected:
  void TearDown() override { win32::icm::SetBitmapThreadLimit(0); }
};

TEST_F(BitmapTest, RefusesBadArguments) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel, kRel});
  BYTE src[64] = {}, dst[64] = {};
  // source, its format, width, its stride, destination, its format and stride, error
  const std::tuple<void*, BMFORMAT, DWORD, DWORD, void*, BMFORMAT, DWORD, DWORD> cases[] = {
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
  for (const auto& [in, in_format, width, in_stride, out, out_format, out_stride, error] : cases)
    EXPECT_WIN32(TranslateBitmapBits(x.get(), in, in_format, width, 2, in_stride, out, out_format, out_stride, nullptr, 0),
                 FALSE, error);
  EXPECT_WIN32(TranslateBitmapBits(x.get(), src, BM_RGBTRIPLETS, 0, 5, 0, dst, BM_RGBTRIPLETS, 0, nullptr, 0), TRUE,
               ERROR_SUCCESS);  // an empty image
}

// An x byte is copied from an x input and 0 without one.
TEST_F(BitmapTest, XBytesAreCopiedOrZero) {
  Xform x({srgb_.get(), srgb_.get()}, {kRel, kRel});
  BYTE quad[4] = {0x10, 0x20, 0x30, 0x99}, out[4] = {};
  ASSERT_TRUE(TranslateBitmapBits(x.get(), quad, BM_xRGBQUADS, 1, 1, 0, out, BM_xBGRQUADS, 0, nullptr, 0));
  EXPECT_EQ(out[3], 0x99);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), quad, BM_RGBTRIPLETS, 1, 1, 0, out, BM_xRGBQUADS, 0, nullptr, 0));
  EXPECT_EQ(out[3], 0);
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
