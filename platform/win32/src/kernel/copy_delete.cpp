// CopyFileA, DeleteFileA, RemoveDirectoryA and SetFileAttributesA.
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <new>
#include <string>
#include <vector>

#include "icm/icc_container.h"
#include "kernel/atomic_file.h"
#include "kernel/errno_map.h"
#include "kernel/file_paths.h"
#include "windows.h"

namespace {

// Closes a descriptor when it goes.
class Fd {
 public:
  explicit Fd(int fd) : fd_(fd) {}
  Fd(const Fd&) = delete;
  Fd& operator=(const Fd&) = delete;
  ~Fd() {
    if (fd_ >= 0) close(fd_);
  }
  int get() const { return fd_; }

 private:
  int fd_;
};

// Streams in into out, no more than the largest profile the layer reads, then gives out
// the source's last write time, as Windows keeps it; returns 0 or an errno value.
int CopyContent(int in, int out, const struct stat& source) {
  std::vector<char> buffer(1 << 16);
  std::uint64_t copied = 0;
  for (;;) {
    const ssize_t n = read(in, buffer.data(), buffer.size());
    if (n < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    if (n == 0) break;
    copied += static_cast<std::uint64_t>(n);
    if (copied > win32::icm::kMaxProfileSize) return EFBIG;
    if (const int err = win32::WriteAll(out, buffer.data(), static_cast<std::size_t>(n))) return err;
  }
  const struct timespec times[2] = {source.st_atim, source.st_mtim};
  return futimens(out, times) == 0 ? 0 : errno;
}

DWORD CopyFileImpl(LPCSTR existing, LPCSTR target, bool failIfExists) {
  std::string from, to;
  if (const DWORD err = win32::PosixFileFromWindows(existing, &from)) return err;
  if (const DWORD err = win32::PosixFileFromWindows(target, &to)) return err;

  // Not blocking, so that a named pipe is refused rather than waited on.
  Fd in(open(from.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (in.get() < 0) return win32::FileErrorFromErrno(errno, from);
  struct stat source;
  if (fstat(in.get(), &source) != 0) return win32::ErrorFromErrno(errno);
  // Only files are copied: a folder, device or pipe has no end to copy to.
  if (!S_ISREG(source.st_mode)) return ERROR_ACCESS_DENIED;
  if (static_cast<std::uint64_t>(source.st_size) > win32::icm::kMaxProfileSize) return ERROR_FILE_TOO_LARGE;

  std::string resolved;
  if (const DWORD err = win32::ResolveWriteTarget(to, &resolved)) return err;
  struct stat dest;
  if (stat(resolved.c_str(), &dest) == 0) {
    if (failIfExists) return ERROR_FILE_EXISTS;
    if (dest.st_dev == source.st_dev && dest.st_ino == source.st_ino) return ERROR_SHARING_VIOLATION;
    if (!S_ISREG(dest.st_mode) || win32::IsReadOnlyMode(dest.st_mode)) return ERROR_ACCESS_DENIED;
  } else if (errno != ENOENT) {
    return win32::FileErrorFromErrno(errno, resolved);
  } else if (win32::MissingFileError(resolved) == ERROR_PATH_NOT_FOUND) {
    return ERROR_PATH_NOT_FOUND;
  }

  // The copy takes the source's permissions, which carry the read-only attribute, as
  // Windows copies attributes.
  win32::ReplaceOptions options;
  options.mode = source.st_mode & 0777;
  options.keepTargetMode = false;
  options.keepExisting = failIfExists;
  return win32::ReplaceFileWith(resolved, [&](int out) { return CopyContent(in.get(), out, source); }, options);
}

DWORD DeleteFileImpl(LPCSTR name) {
  std::string path;
  if (const DWORD err = win32::PosixFileFromWindows(name, &path)) return err;
  struct stat st;
  if (lstat(path.c_str(), &st) != 0) return win32::FileErrorFromErrno(errno, path);
  if (S_ISDIR(st.st_mode)) return ERROR_ACCESS_DENIED;
  // Windows refuses to delete a read-only file; a link has no such attribute of its own.
  if (!S_ISLNK(st.st_mode) && win32::IsReadOnlyMode(st.st_mode)) return ERROR_ACCESS_DENIED;
  if (unlink(path.c_str()) != 0) return win32::FileErrorFromErrno(errno, path);
  return ERROR_SUCCESS;
}

DWORD RemoveDirectoryImpl(LPCSTR name) {
  std::string path;
  if (const DWORD err = win32::PosixFileFromWindows(name, &path)) return err;
  struct stat st;
  if (lstat(path.c_str(), &st) != 0) return win32::FileErrorFromErrno(errno, path);
  if (!S_ISDIR(st.st_mode)) return ERROR_DIRECTORY;
  if (rmdir(path.c_str()) != 0) return errno == ENOTEMPTY || errno == EEXIST ? ERROR_DIR_NOT_EMPTY
                                                                              : win32::FileErrorFromErrno(errno, path);
  return ERROR_SUCCESS;
}

// Only the read-only attribute has a POSIX meaning: it clears every write bit, and its
// absence gives the owner write access back.
DWORD SetFileAttributesImpl(LPCSTR name, DWORD attributes) {
  std::string path;
  if (const DWORD err = win32::PosixFileFromWindows(name, &path)) return err;
  struct stat st;
  if (stat(path.c_str(), &st) != 0) return win32::FileErrorFromErrno(errno, path);
  const mode_t mode = (attributes & FILE_ATTRIBUTE_READONLY) ? (st.st_mode & 07555) : (st.st_mode | S_IWUSR);
  if (chmod(path.c_str(), mode & 07777) != 0) return win32::FileErrorFromErrno(errno, path);
  return ERROR_SUCCESS;
}

BOOL Finish(DWORD err) {
  SetLastError(err);
  return err == ERROR_SUCCESS ? TRUE : FALSE;
}

}  // namespace

extern "C" BOOL WINAPI CopyFileA(LPCSTR lpExistingFileName, LPCSTR lpNewFileName,
                                 BOOL bFailIfExists) {
  try {
    return Finish(CopyFileImpl(lpExistingFileName, lpNewFileName, bFailIfExists != FALSE));
  } catch (const std::bad_alloc&) {
    return Finish(ERROR_NOT_ENOUGH_MEMORY);
  }
}

extern "C" BOOL WINAPI DeleteFileA(LPCSTR lpFileName) {
  try {
    return Finish(DeleteFileImpl(lpFileName));
  } catch (const std::bad_alloc&) {
    return Finish(ERROR_NOT_ENOUGH_MEMORY);
  }
}

extern "C" BOOL WINAPI RemoveDirectoryA(LPCSTR lpPathName) {
  try {
    return Finish(RemoveDirectoryImpl(lpPathName));
  } catch (const std::bad_alloc&) {
    return Finish(ERROR_NOT_ENOUGH_MEMORY);
  }
}

extern "C" BOOL WINAPI SetFileAttributesA(LPCSTR lpFileName, DWORD dwFileAttributes) {
  try {
    return Finish(SetFileAttributesImpl(lpFileName, dwFileAttributes));
  } catch (const std::bad_alloc&) {
    return Finish(ERROR_NOT_ENOUGH_MEMORY);
  }
}
