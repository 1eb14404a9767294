// Whole-file writes that never leave a half-written file behind: the bytes go to a
// temporary file in the destination's folder, are flushed, and then renamed over it.
#ifndef TINTWELL_WIN32_ATOMIC_FILE_H
#define TINTWELL_WIN32_ATOMIC_FILE_H

#include <cstddef>
#include <string>

#include "windows.h"

namespace win32 {

// Writes size bytes to posixPath, replacing it atomically. Returns ERROR_SUCCESS or the
// Windows error code of the failure; on failure the destination is untouched.
DWORD WriteFileAtomically(const std::string& posixPath, const void* data, std::size_t size);

}  // namespace win32

#endif
