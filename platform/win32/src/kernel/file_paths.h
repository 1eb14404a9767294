// Path arguments of the kernel file calls: checked and mapped to POSIX paths in one way,
// so every call refuses the same inputs with the same codes.
#ifndef TINTWELL_WIN32_FILE_PATHS_H
#define TINTWELL_WIN32_FILE_PATHS_H

#include <string>

#include "windows.h"

namespace win32 {

// Maps a Windows file path to *posix. Returns ERROR_SUCCESS, or the code the call fails
// with: ERROR_PATH_NOT_FOUND for a null or empty path or one off drive Z:, and
// ERROR_FILENAME_EXCED_RANGE for a path of MAX_PATH characters or more.
DWORD PosixFileFromWindows(LPCSTR path, std::string* posix);

// The code for a path that names nothing: ERROR_FILE_NOT_FOUND when its folder exists,
// ERROR_PATH_NOT_FOUND when the folder itself is missing.
DWORD MissingFileError(const std::string& posix);

// The code for a failed open, stat or unlink of posix, from its errno.
DWORD FileErrorFromErrno(int err, const std::string& posix);

// A file the calls must treat as read-only: its owner-write bit is clear (checked
// explicitly, since root may write anything).
bool IsReadOnlyMode(unsigned mode);

}  // namespace win32

#endif
