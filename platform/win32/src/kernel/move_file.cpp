// MoveFileExA: renames a file or folder, replacing an existing file when asked. A rename
// within one file system is atomic: the destination is at every instant either the old
// file or the new one, which is what callers that write a file beside its destination
// and then move it into place rely on.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <new>
#include <string>

#include "kernel/errno_map.h"
#include "kernel/file_paths.h"
#include "windows.h"

namespace {

// Moving at the next restart (and hard links, tracking) are not offered.
constexpr DWORD kKnownFlags = MOVEFILE_REPLACE_EXISTING | MOVEFILE_COPY_ALLOWED | MOVEFILE_WRITE_THROUGH;

std::string FolderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  return slash == 0 || slash == std::string::npos ? "/" : path.substr(0, slash);
}

// Flushes the folder that holds path, so that the rename itself is on disk.
void SyncFolderOf(const std::string& path) {
  const int fd = open(FolderOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return;
  fsync(fd);
  close(fd);
}

// Another volume: a copy and a deletion, when the caller allows it. Only files are
// copied so; a folder cannot be moved across volumes.
DWORD MoveAcrossVolumes(LPCSTR existing, LPCSTR target, const struct stat& source, DWORD flags) {
  if (!(flags & MOVEFILE_COPY_ALLOWED)) return ERROR_NOT_SAME_DEVICE;
  if (!S_ISREG(source.st_mode)) return ERROR_ACCESS_DENIED;
  if (!CopyFileA(existing, target, (flags & MOVEFILE_REPLACE_EXISTING) ? FALSE : TRUE)) return GetLastError();
  if (!DeleteFileA(existing)) return GetLastError();
  return ERROR_SUCCESS;
}

DWORD MoveFileImpl(LPCSTR existing, LPCSTR target, DWORD flags) {
  if (flags & ~kKnownFlags) return ERROR_INVALID_PARAMETER;
  std::string from, to;
  if (const DWORD err = win32::PosixFileFromWindows(existing, &from)) return err;
  if (const DWORD err = win32::PosixFileFromWindows(target, &to)) return err;

  // The names themselves are moved: a symbolic link is moved or replaced, not its target.
  struct stat source;
  if (lstat(from.c_str(), &source) != 0) return win32::FileErrorFromErrno(errno, from);
  struct stat dest;
  bool same = false;
  if (lstat(to.c_str(), &dest) == 0) {
    same = dest.st_dev == source.st_dev && dest.st_ino == source.st_ino;
    if (!same) {
      if (!(flags & MOVEFILE_REPLACE_EXISTING)) return ERROR_ALREADY_EXISTS;
      // Only a file (or a link) is replaced, never by a folder; and Windows replaces no
      // read-only file.
      if (S_ISDIR(source.st_mode) || !(S_ISREG(dest.st_mode) || S_ISLNK(dest.st_mode))) return ERROR_ACCESS_DENIED;
      if (S_ISREG(dest.st_mode) && win32::IsReadOnlyMode(dest.st_mode)) return ERROR_ACCESS_DENIED;
    }
  } else if (errno != ENOENT) {
    return win32::FileErrorFromErrno(errno, to);
  } else if (win32::MissingFileError(to) == ERROR_PATH_NOT_FOUND) {
    return ERROR_PATH_NOT_FOUND;
  }

  // Without REPLACE_EXISTING a file that appears after the check above must survive:
  // the rename itself refuses to replace, where the file system can say so.
  const bool keepExisting = !(flags & MOVEFILE_REPLACE_EXISTING) && !same;
  int rc = keepExisting ? renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) : -1;
  if (!keepExisting || (rc != 0 && errno == EINVAL)) rc = rename(from.c_str(), to.c_str());
  if (rc != 0) {
    if (errno == EEXIST) return ERROR_ALREADY_EXISTS;
    if (errno == EXDEV) return MoveAcrossVolumes(existing, target, source, flags);
    // A folder moved into itself is no rename Windows makes either.
    if (errno == EINVAL) return ERROR_ACCESS_DENIED;
    return win32::FileErrorFromErrno(errno, to);
  }
  if (flags & MOVEFILE_WRITE_THROUGH) SyncFolderOf(to);
  return ERROR_SUCCESS;
}

}  // namespace

extern "C" BOOL WINAPI MoveFileExA(LPCSTR lpExistingFileName, LPCSTR lpNewFileName, DWORD dwFlags) {
  DWORD err;
  try {
    err = MoveFileImpl(lpExistingFileName, lpNewFileName, dwFlags);
  } catch (const std::bad_alloc&) {
    err = ERROR_NOT_ENOUGH_MEMORY;
  }
  SetLastError(err);
  return err == ERROR_SUCCESS ? TRUE : FALSE;
}
