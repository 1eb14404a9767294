// Where profiles live on Linux, and how a profile name becomes a POSIX path.
#ifndef TINTWELL_WIN32_ICM_COLOR_DIRECTORY_H
#define TINTWELL_WIN32_ICM_COLOR_DIRECTORY_H

#include <cstdint>
#include <string>
#include <vector>

#include "windows.h"

namespace win32::icm {

// The colour directory as a POSIX path without a trailing slash: $TINTWELL_COLOR_DIR
// when set, else $XDG_DATA_HOME/icc, else $HOME/.local/share/icc. Not created here.
std::string ColorDirectory();

// Creates the directory and any missing parents. Returns ERROR_SUCCESS or a Windows code.
DWORD EnsureDirectory(const std::string& posixPath);

// The POSIX path of a profile name: a full Windows path (drive Z:), a rooted path
// (taken on drive Z:), or a name relative to the colour directory, which is then
// created. Returns ERROR_SUCCESS or the Windows code of the failure.
DWORD ResolveProfilePath(const std::string& name, std::string& posixPath);

// Reads a whole file. Returns ERROR_SUCCESS, ERROR_FILE_NOT_FOUND, ERROR_PATH_NOT_FOUND
// (a missing folder), ERROR_ACCESS_DENIED (unreadable or a folder), ERROR_INVALID_PROFILE
// (larger than a profile can be) or another Windows code. May throw std::bad_alloc.
DWORD ReadFileBytes(const std::string& posixPath, std::vector<std::uint8_t>& bytes);

}  // namespace win32::icm

#endif
