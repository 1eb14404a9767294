/* Device contexts over pixel memory that the caller owns: how a host on Linux lets the
 * GDI calls (GetPixel, SetPixel, StretchDIBits) draw on its pictures. These are not
 * Win32 calls; on Windows a host hands out its own GDI device contexts instead.
 *
 * The memory holds 32 bits per pixel, rows top to bottom, each pixel a little-endian
 * word 0x00RRGGBB (bytes B, G, R, unused), as a 32-bit top-down DIB section. */
#ifndef TINTWELL_WIN32_SURFACE_H
#define TINTWELL_WIN32_SURFACE_H

#include "windows.h"

#ifdef __cplusplus
extern "C" {
#endif

/* A device context drawing on width x height pixels at bits, rowBytes apart (at least
 * width * 4, a multiple of 4). Null with ERROR_INVALID_PARAMETER for a null buffer or a
 * size that is not positive. The memory must outlive the device context. */
HDC WINAPI CreateSurfaceDC(void* bits, LONG width, LONG height, LONG rowBytes);

/* Releases a device context made by CreateSurfaceDC; the memory is left as it is.
 * FALSE with ERROR_INVALID_HANDLE for anything else. */
BOOL WINAPI DeleteSurfaceDC(HDC dc);

#ifdef __cplusplus
}
#endif

#endif
