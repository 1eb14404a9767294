// GetPixel, SetPixel and StretchDIBits on device contexts over 32-bit pixel memory.
//
// The subset: pixels are exact (a 32-bit surface stores every COLORREF as given), and
// StretchDIBits draws 24-bit uncompressed DIBs, top-down or bottom-up, with source
// copy, stretching by nearest pixel. Other formats and raster operations are refused
// with ERROR_NOT_SUPPORTED, JPEG and PNG DIBs with GDI_ERROR as on Windows; mirroring
// (sizes of different sign) is refused as well.
#include <algorithm>
#include <cstdint>
#include <vector>

#include "api_result.h"
#include "gdi/surface.h"

namespace {

using win32::gdi::Surface;

constexpr DWORD kBiJpeg = 4;
constexpr DWORD kBiPng = 5;

// COLORREF is 0x00BBGGRR; the surface holds 0x00RRGGBB.
inline std::uint32_t SwapRedBlue(std::uint32_t v) { return ((v & 0xFF) << 16) | (v & 0xFF00) | ((v >> 16) & 0xFF); }

int FailDraw(DWORD code) {
  SetLastError(code);
  return 0;
}

}  // namespace

COLORREF WINAPI GetPixel(HDC hdc, int x, int y) {
  const Surface* s = win32::gdi::FindSurface(hdc);
  if (!s) {
    SetLastError(ERROR_INVALID_HANDLE);
    return CLR_INVALID;
  }
  if (!s->Contains(x, y)) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return CLR_INVALID;
  }
  SetLastError(ERROR_SUCCESS);
  return SwapRedBlue(s->Row(y)[x]);
}

COLORREF WINAPI SetPixel(HDC hdc, int x, int y, COLORREF color) {
  const Surface* s = win32::gdi::FindSurface(hdc);
  if (!s) {
    SetLastError(ERROR_INVALID_HANDLE);
    return static_cast<COLORREF>(-1);
  }
  if (!s->Contains(x, y)) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return static_cast<COLORREF>(-1);
  }
  // The top byte selects palette forms of a COLORREF; a 32-bit surface has no palette.
  const COLORREF set = color & 0x00FFFFFF;
  s->Row(y)[x] = SwapRedBlue(set);
  SetLastError(ERROR_SUCCESS);
  return set;
}

int WINAPI StretchDIBits(HDC hdc, int xDest, int yDest, int DestWidth, int DestHeight, int xSrc, int ySrc,
                         int SrcWidth, int SrcHeight, const VOID* lpBits, const BITMAPINFO* lpbmi, UINT iUsage,
                         DWORD rop) {
  const Surface* s = win32::gdi::FindSurface(hdc);
  if (!s) return FailDraw(ERROR_INVALID_HANDLE);
  if (!lpBits || !lpbmi) return FailDraw(ERROR_INVALID_PARAMETER);
  const BITMAPINFOHEADER& h = lpbmi->bmiHeader;
  if (h.biSize < sizeof(BITMAPINFOHEADER) || h.biPlanes != 1 || h.biWidth <= 0 || h.biHeight == 0 ||
      (iUsage != DIB_RGB_COLORS && iUsage != DIB_PAL_COLORS))
    return FailDraw(ERROR_INVALID_PARAMETER);
  if (h.biCompression == kBiJpeg || h.biCompression == kBiPng) {
    SetLastError(ERROR_NOT_SUPPORTED);
    return static_cast<int>(GDI_ERROR);
  }
  if (h.biCompression != BI_RGB || h.biBitCount != 24 || rop != SRCCOPY) return FailDraw(ERROR_NOT_SUPPORTED);
  if (DestWidth == 0 || DestHeight == 0 || SrcWidth == 0 || SrcHeight == 0) return FailDraw(ERROR_INVALID_PARAMETER);
  if (DestWidth < 0 || DestHeight < 0 || SrcWidth < 0 || SrcHeight < 0) return FailDraw(ERROR_NOT_SUPPORTED);

  // Rows are padded to 4 bytes; a positive height stores the bottom row first, and then
  // the source rectangle's y counts from the bottom too.
  const std::int64_t dibWidth = h.biWidth;
  const bool bottomUp = h.biHeight > 0;
  const std::int64_t dibHeight = bottomUp ? h.biHeight : -static_cast<std::int64_t>(h.biHeight);
  const std::int64_t stride = (dibWidth * 3 + 3) & ~std::int64_t{3};
  const std::int64_t srcTop = bottomUp ? dibHeight - ySrc - SrcHeight : ySrc;
  const auto* bits = static_cast<const std::uint8_t*>(lpBits);

  // Only the part of the destination that lies on the surface is drawn.
  const std::int64_t x0 = std::max<std::int64_t>(xDest, 0);
  const std::int64_t x1 = std::min<std::int64_t>(std::int64_t{xDest} + DestWidth, s->width);
  const std::int64_t y0 = std::max<std::int64_t>(yDest, 0);
  const std::int64_t y1 = std::min<std::int64_t>(std::int64_t{yDest} + DestHeight, s->height);
  if (x0 < x1 && y0 < y1) {
    // One source pixel per destination pixel, all inside the DIB: rows copied straight.
    if (DestWidth == SrcWidth && DestHeight == SrcHeight && x0 - xDest + xSrc >= 0 && x1 - xDest + xSrc <= dibWidth) {
      for (std::int64_t y = y0; y < y1; ++y) {
        const std::int64_t sy = srcTop + (y - yDest);
        if (sy < 0 || sy >= dibHeight) continue;
        const std::uint8_t* p = bits + (bottomUp ? dibHeight - 1 - sy : sy) * stride + (x0 - xDest + xSrc) * 3;
        std::uint32_t* out = s->Row(static_cast<std::int32_t>(y));
        for (std::int64_t x = x0; x < x1; ++x, p += 3)
          out[x] = static_cast<std::uint32_t>(p[0]) | static_cast<std::uint32_t>(p[1]) << 8 |
                   static_cast<std::uint32_t>(p[2]) << 16;
      }
      SetLastError(ERROR_SUCCESS);
      return DestHeight;
    }
    // Source column for each destination column drawn, or -1 outside the DIB.
    std::vector<std::int64_t> columns(static_cast<std::size_t>(x1 - x0));
    for (std::int64_t x = x0; x < x1; ++x) {
      const std::int64_t sx = xSrc + (x - xDest) * SrcWidth / DestWidth;
      columns[static_cast<std::size_t>(x - x0)] = sx >= 0 && sx < dibWidth ? sx * 3 : -1;
    }
    for (std::int64_t y = y0; y < y1; ++y) {
      const std::int64_t sy = srcTop + (y - yDest) * SrcHeight / DestHeight;
      if (sy < 0 || sy >= dibHeight) continue;
      const std::uint8_t* row = bits + (bottomUp ? dibHeight - 1 - sy : sy) * stride;
      std::uint32_t* out = s->Row(static_cast<std::int32_t>(y)) + x0;
      for (std::size_t i = 0; i < columns.size(); ++i) {
        if (columns[i] < 0) continue;
        const std::uint8_t* p = row + columns[i];  // B, G, R
        out[i] = static_cast<std::uint32_t>(p[0]) | static_cast<std::uint32_t>(p[1]) << 8 |
                 static_cast<std::uint32_t>(p[2]) << 16;
      }
    }
  }
  SetLastError(ERROR_SUCCESS);
  return DestHeight;
}
