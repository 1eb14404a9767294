// Device contexts over caller-owned pixel memory, kept in the one handle table.
#include <memory>

#include "api_result.h"
#include "gdi/surface.h"
#include "handle_table.h"
#include "win32_surface.h"

namespace win32::gdi {

Surface* FindSurface(HDC dc) {
  // One remembered lookup per thread: a picture is read pixel by pixel through the same
  // device context, and the table's lock and reference counting would cost more than
  // the read itself. The generation tells when any handle was closed since.
  struct Last {
    HANDLE handle;
    std::uint64_t generation;
    Surface* surface;
  };
  __attribute__((tls_model("initial-exec"))) static thread_local Last last{nullptr, 0, nullptr};
  static HandleTable& table = Handles();  // one call into the table's library, not one a pixel
  const HANDLE handle = static_cast<HANDLE>(dc);
  const std::uint64_t generation = table.Generation();
  if (handle && handle == last.handle && generation == last.generation) return last.surface;
  Surface* surface = table.Lookup<Surface>(handle, HandleKind::DeviceContext).get();
  if (surface) last = Last{handle, generation, surface};
  return surface;
}

}  // namespace win32::gdi

using win32::gdi::Surface;

HDC WINAPI CreateSurfaceDC(void* bits, LONG width, LONG height, LONG rowBytes) {
  if (!bits || width <= 0 || height <= 0 || rowBytes % 4 != 0 ||
      static_cast<std::int64_t>(rowBytes) < static_cast<std::int64_t>(width) * 4) {
    win32::Fail(ERROR_INVALID_PARAMETER);
    return nullptr;
  }
  auto surface = std::make_shared<Surface>(
      Surface{static_cast<std::uint8_t*>(bits), width, height, static_cast<std::size_t>(rowBytes)});
  const HANDLE handle = win32::Handles().Insert(win32::HandleKind::DeviceContext, std::move(surface));
  win32::Succeed();
  return static_cast<HDC>(handle);
}

BOOL WINAPI DeleteSurfaceDC(HDC dc) {
  if (!win32::Handles().Remove<Surface>(static_cast<HANDLE>(dc), win32::HandleKind::DeviceContext))
    return win32::Fail(ERROR_INVALID_HANDLE);
  return win32::Succeed();
}
