#include "kernel/file_paths.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include "kernel/errno_map.h"
#include "win32_paths.h"

namespace win32 {

DWORD PosixFileFromWindows(LPCSTR path, std::string* posix) {
  if (path == nullptr || path[0] == '\0') return ERROR_PATH_NOT_FOUND;
  // An ANSI path holds at most MAX_PATH - 1 characters; bounded so a long text is not walked.
  if (strnlen(path, MAX_PATH) >= MAX_PATH) return ERROR_FILENAME_EXCED_RANGE;
  auto mapped = PosixPathFromWindows(path);
  if (!mapped) return ERROR_PATH_NOT_FOUND;
  *posix = std::move(*mapped);
  return ERROR_SUCCESS;
}

DWORD MissingFileError(const std::string& posix) {
  std::string folder = posix;
  while (folder.size() > 1 && folder.back() == '/') folder.pop_back();
  const std::size_t slash = folder.rfind('/');
  folder = slash == 0 || slash == std::string::npos ? "/" : folder.substr(0, slash);
  struct stat st;
  if (stat(folder.c_str(), &st) == 0 && S_ISDIR(st.st_mode)) return ERROR_FILE_NOT_FOUND;
  return ERROR_PATH_NOT_FOUND;
}

DWORD FileErrorFromErrno(int err, const std::string& posix) {
  if (err == ENOENT) return MissingFileError(posix);
  return ErrorFromErrno(err);
}

bool IsReadOnlyMode(unsigned mode) { return (mode & S_IWUSR) == 0; }

}  // namespace win32
