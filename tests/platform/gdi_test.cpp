// The GDI subset on device contexts over pixel memory: COLORREF order, CLR_INVALID outside
// the surface, and StretchDIBits of 24-bit DIBs with their row padding and both row orders.
#include <gtest/gtest.h>

#include <vector>

#include "icc_test_support.h"
#include "win32_surface.h"

namespace {

using icctest::kSentinel;

// A surface of w x h pixels filled with fill (0x00RRGGBB) and its device context.
struct Canvas {
  Canvas(int w, int h, std::uint32_t fill = 0x00ABCDEF) : width(w), pixels(static_cast<size_t>(w) * h, fill) {
    dc = CreateSurfaceDC(pixels.data(), w, h, w * 4);
  }
  ~Canvas() { DeleteSurfaceDC(dc); }
  std::uint32_t at(int x, int y) const { return pixels[static_cast<size_t>(y) * width + x]; }
  int width;
  std::vector<std::uint32_t> pixels;
  HDC dc;
};

BITMAPINFO Dib(LONG width, LONG height, WORD bits = 24, DWORD compression = BI_RGB) {
  BITMAPINFO info{};
  info.bmiHeader.biSize = sizeof(BITMAPINFOHEADER);
  info.bmiHeader.biWidth = width;
  info.bmiHeader.biHeight = height;
  info.bmiHeader.biPlanes = 1;
  info.bmiHeader.biBitCount = bits;
  info.bmiHeader.biCompression = compression;
  return info;
}

TEST(GdiSurface, CreateRefusesBadMemoryAndDeleteOnlyOnce) {
  std::uint32_t pixels[4] = {};
  const struct {
    void* bits;
    LONG w, h, row;
  } bad[] = {{nullptr, 1, 1, 4}, {pixels, 0, 1, 4}, {pixels, 1, -1, 4}, {pixels, 2, 1, 4}, {pixels, 1, 1, 6}};
  for (const auto& c : bad) EXPECT_WIN32(CreateSurfaceDC(c.bits, c.w, c.h, c.row), nullptr, ERROR_INVALID_PARAMETER);
  SetLastError(kSentinel);
  HDC dc = CreateSurfaceDC(pixels, 2, 2, 8);
  ASSERT_NE(dc, nullptr);
  EXPECT_EQ(GetLastError(), 0u);
  EXPECT_EQ(SetPixel(dc, 1, 1, RGB(1, 2, 3)), RGB(1, 2, 3));
  EXPECT_WIN32(DeleteSurfaceDC(dc), TRUE, ERROR_SUCCESS);
  // The handle is dead at once, even for the thread that just drew through it.
  EXPECT_WIN32(GetPixel(dc, 1, 1), CLR_INVALID, ERROR_INVALID_HANDLE);
  EXPECT_WIN32(DeleteSurfaceDC(dc), FALSE, ERROR_INVALID_HANDLE);
  EXPECT_EQ(pixels[3], 0x00010203u);
}

TEST(GdiPixels, ColorrefOrderAndBounds) {
  Canvas c(3, 2);
  EXPECT_WIN32(SetPixel(c.dc, 2, 1, RGB(0x11, 0x22, 0x33)), 0x00332211u, ERROR_SUCCESS);
  EXPECT_EQ(c.at(2, 1), 0x00112233u);  // memory B, G, R, x
  EXPECT_WIN32(GetPixel(c.dc, 2, 1), RGB(0x11, 0x22, 0x33), ERROR_SUCCESS);
  EXPECT_EQ(SetPixel(c.dc, 0, 0, 0x01FFFFFF), 0x00FFFFFFu);  // palette-form top byte dropped
  const int outside[][2] = {{-1, 0}, {0, -1}, {3, 0}, {0, 2}};
  for (const auto& p : outside) {
    EXPECT_WIN32(GetPixel(c.dc, p[0], p[1]), CLR_INVALID, ERROR_INVALID_PARAMETER);
    EXPECT_EQ(SetPixel(c.dc, p[0], p[1], 0), static_cast<COLORREF>(-1));
  }
  for (HDC bad : {static_cast<HDC>(nullptr), static_cast<HDC>(reinterpret_cast<void*>(0x1234))}) {
    EXPECT_WIN32(GetPixel(bad, 0, 0), CLR_INVALID, ERROR_INVALID_HANDLE);
    EXPECT_EQ(SetPixel(bad, 0, 0, 0), static_cast<COLORREF>(-1));
  }
  // Two device contexts used in turn each reach their own pixels.
  Canvas d(1, 1, 0x00000001);
  EXPECT_EQ(GetPixel(d.dc, 0, 0), 0x00010000u);
  EXPECT_EQ(GetPixel(c.dc, 2, 1), RGB(0x11, 0x22, 0x33));
}

// 2 x 2 DIB rows "11 22 33 44 55 66 EE EE" and "77 88 99 AA BB CC EE EE": padding skipped.
const BYTE kTwoByTwo[] = {0x11, 0x22, 0x33, 0x44, 0x55, 0x66, 0xEE, 0xEE,
                          0x77, 0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xEE, 0xEE};

TEST(GdiStretchDIBits, RowOrderAndPadding) {
  for (const LONG height : {-2, 2}) {
    SCOPED_TRACE(height);
    Canvas c(2, 2);
    const BITMAPINFO info = Dib(2, height);
    EXPECT_WIN32(StretchDIBits(c.dc, 0, 0, 2, 2, 0, 0, 2, 2, kTwoByTwo, &info, DIB_RGB_COLORS, SRCCOPY), 2,
                 ERROR_SUCCESS);
    const int first = height < 0 ? 0 : 1;  // the row drawn from the first row in memory
    EXPECT_EQ(GetPixel(c.dc, 0, first), 0x112233u);
    EXPECT_EQ(GetPixel(c.dc, 1, first), 0x445566u);
    EXPECT_EQ(GetPixel(c.dc, 0, 1 - first), 0x778899u);
    EXPECT_EQ(GetPixel(c.dc, 1, 1 - first), 0xAABBCCu);
  }
}

TEST(GdiStretchDIBits, ClipsAndStretches) {
  const BITMAPINFO info = Dib(2, -2);
  Canvas c(2, 2);
  // Shifted one column right: the first column keeps its colour, the DIB's second column
  // falls off the surface.
  EXPECT_EQ(StretchDIBits(c.dc, 1, 0, 2, 2, 0, 0, 2, 2, kTwoByTwo, &info, DIB_RGB_COLORS, SRCCOPY), 2);
  EXPECT_EQ(c.at(0, 0), 0x00ABCDEFu);
  EXPECT_EQ(c.at(1, 0), 0x00332211u);
  EXPECT_EQ(c.at(1, 1), 0x00998877u);
  // One source pixel (the bottom-right one) stretched over the whole surface.
  Canvas d(3, 3);
  EXPECT_EQ(StretchDIBits(d.dc, 0, 0, 3, 3, 1, 1, 1, 1, kTwoByTwo, &info, DIB_RGB_COLORS, SRCCOPY), 3);
  for (std::uint32_t p : d.pixels) EXPECT_EQ(p, 0x00CCBBAAu);
  // A source rectangle reaching past the DIB's right and bottom edges, stretched: what
  // lies outside the DIB is not drawn.
  Canvas f(4, 4);
  EXPECT_EQ(StretchDIBits(f.dc, 0, 0, 4, 4, 1, 1, 2, 2, kTwoByTwo, &info, DIB_RGB_COLORS, SRCCOPY), 4);
  for (int y = 0; y < 4; ++y)
    for (int x = 0; x < 4; ++x) EXPECT_EQ(f.at(x, y), x < 2 && y < 2 ? 0x00CCBBAAu : 0x00ABCDEFu) << x << "," << y;
  // A DIB one pixel wide: rows of 3 bytes padded to 4.
  const BYTE column[] = {1, 2, 3, 0xEE, 4, 5, 6, 0xEE};
  const BITMAPINFO narrow = Dib(1, -2);
  Canvas g(1, 2);
  EXPECT_EQ(StretchDIBits(g.dc, 0, 0, 1, 2, 0, 0, 1, 2, column, &narrow, DIB_RGB_COLORS, SRCCOPY), 2);
  EXPECT_EQ(g.at(0, 0), 0x00030201u);
  EXPECT_EQ(g.at(0, 1), 0x00060504u);
  // A 2 x 2 source onto 4 x 4: each source pixel covers a 2 x 2 block.
  Canvas e(4, 4);
  EXPECT_EQ(StretchDIBits(e.dc, 0, 0, 4, 4, 0, 0, 2, 2, kTwoByTwo, &info, DIB_RGB_COLORS, SRCCOPY), 4);
  EXPECT_EQ(e.at(1, 1), 0x00332211u);
  EXPECT_EQ(e.at(2, 1), 0x00665544u);
  EXPECT_EQ(e.at(1, 2), 0x00998877u);
  EXPECT_EQ(e.at(3, 3), 0x00CCBBAAu);
}

TEST(GdiStretchDIBits, RefusesWhatItDoesNotDraw) {
  Canvas c(2, 2);
  const BITMAPINFO good = Dib(2, -2);
  BITMAPINFO small = good;
  small.bmiHeader.biSize = 12;
  BITMAPINFO planes = good;
  planes.bmiHeader.biPlanes = 2;
  const BITMAPINFO zeroHeight = Dib(2, 0), thirtyTwo = Dib(2, -2, 32), rle = Dib(2, -2, 8, 1);
  const BITMAPINFO jpeg = Dib(2, -2, 0, 4), png = Dib(2, -2, 0, 5);
  // device context, destination width, source height, bits, header, usage, raster operation, result, error
  const std::tuple<HDC, int, int, const void*, const BITMAPINFO*, UINT, DWORD, int, DWORD> cases[] = {
      {nullptr, 2, 2, kTwoByTwo, &good, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_HANDLE},
      {c.dc, 2, 2, nullptr, &good, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 2, kTwoByTwo, nullptr, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 2, kTwoByTwo, &small, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 2, kTwoByTwo, &planes, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 2, kTwoByTwo, &zeroHeight, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 2, kTwoByTwo, &good, 2, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 0, 2, kTwoByTwo, &good, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, 2, 0, kTwoByTwo, &good, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_INVALID_PARAMETER},
      {c.dc, -2, 2, kTwoByTwo, &good, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_NOT_SUPPORTED},
      {c.dc, 2, 2, kTwoByTwo, &thirtyTwo, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_NOT_SUPPORTED},
      {c.dc, 2, 2, kTwoByTwo, &rle, DIB_RGB_COLORS, SRCCOPY, 0, ERROR_NOT_SUPPORTED},
      {c.dc, 2, 2, kTwoByTwo, &good, DIB_RGB_COLORS, 0x00EE0086 /* SRCPAINT */, 0, ERROR_NOT_SUPPORTED},
      {c.dc, 2, 2, kTwoByTwo, &jpeg, DIB_RGB_COLORS, SRCCOPY, static_cast<int>(GDI_ERROR), ERROR_NOT_SUPPORTED},
      {c.dc, 2, 2, kTwoByTwo, &png, DIB_RGB_COLORS, SRCCOPY, static_cast<int>(GDI_ERROR), ERROR_NOT_SUPPORTED},
  };
  for (const auto& [dc, destWidth, srcHeight, bits, info, usage, rop, result, error] : cases)
    EXPECT_WIN32(StretchDIBits(dc, 0, 0, destWidth, 2, 0, 0, 2, srcHeight, bits, info, usage, rop), result, error);
  for (std::uint32_t p : c.pixels) EXPECT_EQ(p, 0x00ABCDEFu);  // nothing drawn
}

}  // namespace
