// Whole-file writes that never leave a half-written file behind: the bytes are staged in
// the destination's folder, flushed, and then renamed over it.
#ifndef TINTWELL_WIN32_ATOMIC_FILE_H
#define TINTWELL_WIN32_ATOMIC_FILE_H

#include <sys/types.h>

#include <cstddef>
#include <functional>
#include <string>

#include "windows.h"

namespace win32 {

// The file that a write to posixPath reaches: symbolic links on the way to the last
// component are followed, as Windows writes through a link to its target. Fails with
// ERROR_CANT_RESOLVE_FILENAME for a loop of links.
DWORD ResolveWriteTarget(const std::string& posixPath, std::string* target);

struct ReplaceOptions {
  // Permissions of the result; by default a replaced file keeps its own and a new one
  // is readable by all.
  mode_t mode = 0644;
  bool keepTargetMode = true;
  bool keepExisting = false;  // fail with ERROR_FILE_EXISTS rather than replace
};

// Replaces the file at posixPath (through any symbolic links) with the bytes that fill
// writes to the descriptor it is given; fill returns 0 or an errno value. Only a regular
// file is replaced (anything else: ERROR_ACCESS_DENIED). A hard-linked file is replaced
// by a new file under this name; its other names keep the old bytes. Returns
// ERROR_SUCCESS or the Windows code of the failure; on failure the destination is
// untouched and nothing is left beside it.
DWORD ReplaceFileWith(const std::string& posixPath, const std::function<int(int fd)>& fill,
                      const ReplaceOptions& options = {});

// Writes size bytes to posixPath, replacing it atomically.
DWORD WriteFileAtomically(const std::string& posixPath, const void* data, std::size_t size);

// Writes all of data to fd, retrying short and interrupted writes; returns 0 or an errno value.
int WriteAll(int fd, const void* data, std::size_t size);

}  // namespace win32

#endif
