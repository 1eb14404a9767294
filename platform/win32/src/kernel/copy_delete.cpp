// CopyFileA and DeleteFileA.
#include <fcntl.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <new>
#include <string>
#include <vector>

#include "kernel/errno_map.h"
#include "kernel/file_paths.h"
#include "windows.h"

namespace {

class Fd {
 public:
  explicit Fd(int fd) : fd_(fd) {}
  Fd(const Fd&) = delete;
  Fd& operator=(const Fd&) = delete;
  ~Fd() {
    if (fd_ >= 0) close(fd_);
  }
  int get() const { return fd_; }
  // Closes now, so a failed close can be reported; returns 0 or an errno value.
  int Close() {
    const int result = close(fd_);
    fd_ = -1;
    return result == 0 ? 0 : errno;
  }

 private:
  int fd_;
};

// Writes all of data, retrying short and interrupted writes; returns 0 or an errno value.
int WriteAll(int fd, const char* data, std::size_t size) {
  while (size > 0) {
    const ssize_t n = write(fd, data, size);
    if (n < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    data += n;
    size -= static_cast<std::size_t>(n);
  }
  return 0;
}

// Streams in into out, then gives out the source's permissions and times; returns 0 or
// an errno value.
int CopyContent(int in, int out, const struct stat& source) {
  std::vector<char> buffer(1 << 16);
  for (;;) {
    const ssize_t n = read(in, buffer.data(), buffer.size());
    if (n < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    if (n == 0) break;
    if (const int err = WriteAll(out, buffer.data(), static_cast<std::size_t>(n))) return err;
  }
  if (fsync(out) != 0) return errno;
  // The permission bits carry the read-only attribute; the last write time is kept, as
  // Windows keeps it.
  if (fchmod(out, source.st_mode & 0777) != 0) return errno;
  const struct timespec times[2] = {source.st_atim, source.st_mtim};
  if (futimens(out, times) != 0) return errno;
  return 0;
}

// Moves temp onto target; with noReplace an existing target is kept and EEXIST returned.
int MoveIntoPlace(const std::string& temp, const std::string& target, bool noReplace) {
  if (!noReplace) return rename(temp.c_str(), target.c_str()) == 0 ? 0 : errno;
  if (renameat2(AT_FDCWD, temp.c_str(), AT_FDCWD, target.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  // File systems without the flag: check, then rename.
  struct stat st;
  if (lstat(target.c_str(), &st) == 0) return EEXIST;
  return rename(temp.c_str(), target.c_str()) == 0 ? 0 : errno;
}

DWORD CopyFileImpl(LPCSTR existing, LPCSTR target, bool failIfExists) {
  std::string from, to;
  if (const DWORD err = win32::PosixFileFromWindows(existing, &from)) return err;
  if (const DWORD err = win32::PosixFileFromWindows(target, &to)) return err;

  Fd in(open(from.c_str(), O_RDONLY | O_CLOEXEC));
  if (in.get() < 0) return win32::FileErrorFromErrno(errno, from);
  struct stat source;
  if (fstat(in.get(), &source) != 0) return win32::ErrorFromErrno(errno);
  if (S_ISDIR(source.st_mode)) return ERROR_ACCESS_DENIED;

  struct stat dest;
  if (stat(to.c_str(), &dest) == 0) {
    if (failIfExists) return ERROR_FILE_EXISTS;
    const bool same = dest.st_dev == source.st_dev && dest.st_ino == source.st_ino;
    if (same) return ERROR_SHARING_VIOLATION;
    if (S_ISDIR(dest.st_mode) || win32::IsReadOnlyMode(dest.st_mode)) return ERROR_ACCESS_DENIED;
  } else if (errno != ENOENT) {
    return win32::FileErrorFromErrno(errno, to);
  } else if (win32::MissingFileError(to) == ERROR_PATH_NOT_FOUND) {
    return ERROR_PATH_NOT_FOUND;
  }

  // The copy is made under a hidden temporary name in the destination's folder and
  // renamed over the destination only when whole, so a crash leaves either file intact.
  const std::size_t slash = to.rfind('/');
  std::string temp = to.substr(0, slash + 1) + ".tw-copy-XXXXXX";
  Fd out(mkostemp(temp.data(), O_CLOEXEC));
  if (out.get() < 0) return win32::FileErrorFromErrno(errno, to);
  int err = CopyContent(in.get(), out.get(), source);
  if (const int closeErr = out.Close(); err == 0) err = closeErr;
  if (err == 0) err = MoveIntoPlace(temp, to, failIfExists);
  if (err != 0) {
    unlink(temp.c_str());
    return err == EEXIST ? ERROR_FILE_EXISTS : win32::ErrorFromErrno(err);
  }
  return ERROR_SUCCESS;
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
