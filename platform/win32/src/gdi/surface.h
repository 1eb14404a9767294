// The pixels behind a device context, and the lookup from a device context to them.
#ifndef TINTWELL_WIN32_GDI_SURFACE_H
#define TINTWELL_WIN32_GDI_SURFACE_H

#include <cstddef>
#include <cstdint>

#include "windows.h"

namespace win32::gdi {

struct Surface {
  std::uint8_t* bits;     // 32-bit pixels, little-endian 0x00RRGGBB, rows top-down
  std::int32_t width;
  std::int32_t height;
  std::size_t rowBytes;

  std::uint32_t* Row(std::int32_t y) const { return reinterpret_cast<std::uint32_t*>(bits + rowBytes * static_cast<std::size_t>(y)); }
  bool Contains(int x, int y) const { return x >= 0 && y >= 0 && x < width && y < height; }
};

// The surface of a live device context, or null. Cheap enough to call per pixel: it
// answers from the thread's last lookup while no handle has been closed since.
Surface* FindSurface(HDC dc);

}  // namespace win32::gdi

#endif
