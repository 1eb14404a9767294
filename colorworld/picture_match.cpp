#include "picture_match.h"

#include <cstdlib>
#include <cstring>

#include "colorworld.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "instance_data.h"

namespace {

PictureAllocator g_copyAllocator = nullptr;

void* AllocateCopy(std::size_t bytes) { return g_copyAllocator ? g_copyAllocator(bytes) : std::malloc(bytes); }

// Rows of a 24-bit DIB are padded to a multiple of 4 bytes.
std::size_t PaddedRow(std::size_t row) { return (row + 3) & ~static_cast<std::size_t>(3); }

}  // namespace

std::size_t PictureImageBytes(int32_t width, int32_t height) {
  if (width <= 0 || height <= 0) return 0;
  // In 64 bits, then against the address space and the 32-bit sizes a DIB carries.
  const uint64_t row = static_cast<uint64_t>(width) * 3;
  const uint64_t padded = (row + 3) & ~static_cast<uint64_t>(3);
  const uint64_t total = padded * static_cast<uint64_t>(height);
  if (total > 0x7FFFFFFFu || total > static_cast<uint64_t>(static_cast<std::size_t>(-1))) return 0;
  return static_cast<std::size_t>(row * static_cast<uint64_t>(height));
}

void SetPictureCopyAllocator(PictureAllocator allocator) { g_copyAllocator = allocator; }

bool BuildImageDataFromPicture(REALpicture picture, int32_t width, int32_t height, BYTE* image) {
  SendDebugString("BuildImageDataFromPicture");
  REALgraphics graphics = bridge::PictureGraphics(picture);
  if (!graphics) {
    SendDebugString("REALGetPictureGraphics fail");
    SetCMError(kErrorInvalidObject);
    return false;
  }
  HDC dc = static_cast<HDC>(bridge::GraphicsDC(graphics));
  if (!dc) {
    SendDebugString("REALGraphicsDC fail");
    SetCMError(kErrorSecondStage);
    return false;
  }
  // A COLORREF is 0x00BBGGRR: its bytes from the top are blue, green, red, the order of
  // an RGB triplet in memory. Pixels outside the picture read as CLR_INVALID: white.
  BYTE* p = image;
  for (int32_t y = 0; y < height; ++y) {
    for (int32_t x = 0; x < width; ++x, p += 3) {
      const COLORREF c = GetPixel(dc, x, y);
      p[0] = static_cast<BYTE>(c >> 16);
      p[1] = static_cast<BYTE>(c >> 8);
      p[2] = static_cast<BYTE>(c);
    }
  }
  return true;
}

REALpicture BuildPictureFromImageData(int32_t width, int32_t height, const BYTE* image) {
  REALpicture result = bridge::NewPicture(width, height, 32);
  if (!result) return nullptr;
  REALgraphics graphics = bridge::PictureGraphics(result);
  HDC dc = graphics ? static_cast<HDC>(bridge::GraphicsDC(graphics)) : nullptr;
  if (!dc) {
    // A picture that cannot be drawn on would come back blank: no result instead.
    bridge::UnlockObject(result);
    return nullptr;
  }
  const std::size_t row = static_cast<std::size_t>(width) * 3;
  const std::size_t padded = PaddedRow(row);
  const BYTE* bits = image;
  BYTE* copy = nullptr;
  if (row != padded) {
    copy = static_cast<BYTE*>(AllocateCopy(padded * static_cast<std::size_t>(height)));
    bits = copy;
    if (copy) {
      for (int32_t y = 0; y < height; ++y) {
        BYTE* out = copy + padded * static_cast<std::size_t>(y);
        std::memcpy(out, image + row * static_cast<std::size_t>(y), row);
        std::memset(out + row, 0, padded - row);
      }
    }
  }
  if (bits) {
    BITMAPINFO info;
    std::memset(&info, 0, sizeof info);
    info.bmiHeader.biSize = sizeof(BITMAPINFOHEADER);
    info.bmiHeader.biWidth = width;
    info.bmiHeader.biHeight = -height;  // rows top-down
    info.bmiHeader.biPlanes = 1;
    info.bmiHeader.biBitCount = 24;
    info.bmiHeader.biCompression = BI_RGB;
    StretchDIBits(dc, 0, 0, width, height, 0, 0, width, height, bits, &info, DIB_RGB_COLORS, SRCCOPY);
  } else {
    const BYTE* p = image;
    for (int32_t y = 0; y < height; ++y)
      for (int32_t x = 0; x < width; ++x, p += 3)
        SetPixel(dc, x, y, static_cast<COLORREF>(p[0]) << 16 | static_cast<COLORREF>(p[1]) << 8 | p[2]);
  }
  std::free(copy);
  return result;
}

REALpicture MatchPicture(REALobject self, REALpicture picture, int32_t width, int32_t height, int32_t, bool) {
  const HTRANSFORM transform = GetInstanceData<ColorWorldData>(self, ColorWorldClass)->transform;
  const std::size_t bytes = PictureImageBytes(width, height);
  if (!bytes) {
    SendDebugString("Error: Picture size out of range");
    SetCMError(kErrorPictureSize);
    return nullptr;
  }
  BYTE* image = static_cast<BYTE*>(std::malloc(bytes));
  if (!image) {
    SendDebugString("Error: Not enough memory for the picture");
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
  if (!BuildImageDataFromPicture(picture, width, height, image)) {
    std::free(image);
    return nullptr;
  }
  // The image holds B, G, R in memory: BM_RGBTRIPLETS (BM_BGRTRIPLETS is R, G, B).
  const DWORD row = static_cast<DWORD>(width) * 3;
  if (!TranslateBitmapBits(transform, image, BM_RGBTRIPLETS, static_cast<DWORD>(width), static_cast<DWORD>(height),
                           row, image, BM_RGBTRIPLETS, row, nullptr, 0)) {
    SendDebugString("TranslateBitmapBits fail");
    ReportSystemError();
    std::free(image);
    return nullptr;
  }
  REALpicture result = BuildPictureFromImageData(width, height, image);
  std::free(image);
  return result;
}
