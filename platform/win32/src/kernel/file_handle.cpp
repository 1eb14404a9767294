// CreateFileA, ReadFile, WriteFile, GetFileSizeEx and CloseHandle for files read and
// written in binary, as the plugin reads images and writes the files it builds.
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <memory>
#include <new>
#include <string>

#include "handle_table.h"
#include "kernel/errno_map.h"
#include "kernel/file_paths.h"
#include "windows.h"

namespace {

struct OpenFile {
  OpenFile(bool canRead, bool canWrite) : readable(canRead), writable(canWrite) {}
  OpenFile(const OpenFile&) = delete;
  OpenFile& operator=(const OpenFile&) = delete;
  ~OpenFile() {
    if (fd >= 0) close(fd);
  }
  int fd = -1;
  const bool readable;
  const bool writable;
};

constexpr DWORD kKnownAccess = GENERIC_READ | GENERIC_WRITE;

// Opens path as the creation disposition asks. Sets *existed when the file was already
// there. Returns the descriptor, or -1 with *err set to the Windows code.
int OpenAs(const std::string& path, DWORD disposition, int accessFlags, mode_t mode,
           bool* existed, DWORD* err) {
  struct stat st;
  const bool wantsWrite = (accessFlags & O_ACCMODE) != O_RDONLY;
  const bool truncates = disposition == CREATE_ALWAYS || disposition == TRUNCATE_EXISTING;
  for (;;) {
    *existed = stat(path.c_str(), &st) == 0;
    if (*existed) {
      if (disposition == CREATE_NEW) {
        *err = ERROR_FILE_EXISTS;
        return -1;
      }
      // Windows opens no folder as a file and writes no read-only file; checked
      // here because root may write anything.
      if (S_ISDIR(st.st_mode) || ((wantsWrite || truncates) && win32::IsReadOnlyMode(st.st_mode))) {
        *err = ERROR_ACCESS_DENIED;
        return -1;
      }
      // Not blocking, so that opening a named pipe does not wait for its other end.
      const int fd = open(path.c_str(), accessFlags | O_CLOEXEC | O_NONBLOCK | (truncates ? O_TRUNC : 0));
      if (fd >= 0 || errno != ENOENT) {
        if (fd < 0) *err = win32::FileErrorFromErrno(errno, path);
        return fd;
      }
      continue;  // removed since the stat: look again
    }
    if (errno != ENOENT) {
      *err = win32::FileErrorFromErrno(errno, path);
      return -1;
    }
    if (disposition == OPEN_EXISTING || disposition == TRUNCATE_EXISTING) {
      *err = win32::MissingFileError(path);
      return -1;
    }
    const int fd = open(path.c_str(), accessFlags | O_CLOEXEC | O_CREAT | O_EXCL, mode);
    if (fd >= 0 || errno != EEXIST) {
      if (fd < 0) *err = win32::FileErrorFromErrno(errno, path);
      return fd;
    }
    // Created by someone else since the stat: decide again with the file in place.
  }
}

// Share modes between handles of this call: a handle that shares nothing holds an
// exclusive lock, any other a shared one, so an open that would conflict fails with
// ERROR_SHARING_VIOLATION, across processes too. The lock goes with the last handle, or
// with the process. Other file calls take no part.
DWORD LockAsShared(int fd, DWORD shareMode) {
  const int lock = shareMode == 0 ? LOCK_EX : LOCK_SH;
  if (flock(fd, lock | LOCK_NB) == 0) return ERROR_SUCCESS;
  return errno == EWOULDBLOCK ? ERROR_SHARING_VIOLATION : win32::ErrorFromErrno(errno);
}

HANDLE CreateFileImpl(LPCSTR name, DWORD access, DWORD shareMode, DWORD disposition, DWORD attributes) {
  std::string path;
  DWORD err = win32::PosixFileFromWindows(name, &path);
  if (err == ERROR_SUCCESS && ((access & ~kKnownAccess) != 0 || disposition < CREATE_NEW ||
                               disposition > TRUNCATE_EXISTING ||
                               (disposition == TRUNCATE_EXISTING && !(access & GENERIC_WRITE))))
    err = ERROR_INVALID_PARAMETER;
  if (err != ERROR_SUCCESS) {
    SetLastError(err);
    return INVALID_HANDLE_VALUE;
  }
  const bool canWrite = (access & GENERIC_WRITE) != 0;
  const int accessFlags = !canWrite ? O_RDONLY : (access & GENERIC_READ) ? O_RDWR : O_WRONLY;
  // A new file asked to be read-only is made so; this handle may still write it.
  const mode_t mode = (attributes & FILE_ATTRIBUTE_READONLY) ? 0444 : 0666;
  // Made before the open, so an allocation failure never orphans a descriptor.
  auto file = std::make_shared<OpenFile>((access & GENERIC_READ) != 0, canWrite);
  bool existed = false;
  file->fd = OpenAs(path, disposition, accessFlags, mode, &existed, &err);
  if (file->fd >= 0) {
    err = LockAsShared(file->fd, shareMode);
    const int flags = fcntl(file->fd, F_GETFL);
    if (flags >= 0) fcntl(file->fd, F_SETFL, flags & ~O_NONBLOCK);
  }
  if (file->fd < 0 || err != ERROR_SUCCESS) {
    SetLastError(err);
    return INVALID_HANDLE_VALUE;
  }
  HANDLE handle = win32::Handles().Insert(win32::HandleKind::File, file);
  // Windows reports an existing file it opened or replaced for these two dispositions.
  const bool reportsExisting = disposition == CREATE_ALWAYS || disposition == OPEN_ALWAYS;
  SetLastError(existed && reportsExisting ? ERROR_ALREADY_EXISTS : ERROR_SUCCESS);
  return handle;
}

}  // namespace

extern "C" HANDLE WINAPI CreateFileA(LPCSTR lpFileName, DWORD dwDesiredAccess,
                                     DWORD dwShareMode,
                                     LPSECURITY_ATTRIBUTES /*lpSecurityAttributes*/,
                                     DWORD dwCreationDisposition, DWORD dwFlagsAndAttributes,
                                     HANDLE /*hTemplateFile*/) {
  try {
    return CreateFileImpl(lpFileName, dwDesiredAccess, dwShareMode, dwCreationDisposition, dwFlagsAndAttributes);
  } catch (const std::bad_alloc&) {
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return INVALID_HANDLE_VALUE;
  }
}

extern "C" BOOL WINAPI WriteFile(HANDLE hFile, LPCVOID lpBuffer, DWORD nNumberOfBytesToWrite,
                                 LPDWORD lpNumberOfBytesWritten, LPOVERLAPPED lpOverlapped) {
  const auto file = win32::Handles().Lookup<OpenFile>(hFile, win32::HandleKind::File);
  if (!file) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  // Without overlapped I/O Windows requires the count pointer; overlapped I/O is not offered.
  if (lpNumberOfBytesWritten == nullptr || lpOverlapped != nullptr ||
      (lpBuffer == nullptr && nNumberOfBytesToWrite != 0)) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return FALSE;
  }
  *lpNumberOfBytesWritten = 0;
  if (!file->writable) {
    SetLastError(ERROR_ACCESS_DENIED);
    return FALSE;
  }
  const char* p = static_cast<const char*>(lpBuffer);
  DWORD left = nNumberOfBytesToWrite;
  while (left > 0) {
    const ssize_t n = write(file->fd, p, left);
    if (n < 0) {
      if (errno == EINTR) continue;
      SetLastError(win32::ErrorFromErrno(errno));
      return FALSE;
    }
    p += n;
    left -= static_cast<DWORD>(n);
    *lpNumberOfBytesWritten += static_cast<DWORD>(n);
  }
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}

// Reads up to the count from the file position; at the end of the file it succeeds with
// fewer bytes, or none.
extern "C" BOOL WINAPI ReadFile(HANDLE hFile, LPVOID lpBuffer, DWORD nNumberOfBytesToRead,
                                LPDWORD lpNumberOfBytesRead, LPOVERLAPPED lpOverlapped) {
  const auto file = win32::Handles().Lookup<OpenFile>(hFile, win32::HandleKind::File);
  if (!file) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  if (lpNumberOfBytesRead == nullptr || lpOverlapped != nullptr ||
      (lpBuffer == nullptr && nNumberOfBytesToRead != 0)) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return FALSE;
  }
  *lpNumberOfBytesRead = 0;
  if (!file->readable) {
    SetLastError(ERROR_ACCESS_DENIED);
    return FALSE;
  }
  char* p = static_cast<char*>(lpBuffer);
  DWORD left = nNumberOfBytesToRead;
  while (left > 0) {
    const ssize_t n = read(file->fd, p, left);
    if (n < 0) {
      if (errno == EINTR) continue;
      SetLastError(errno == EISDIR ? ERROR_ACCESS_DENIED : ERROR_READ_FAULT);
      return FALSE;
    }
    if (n == 0) break;
    p += n;
    left -= static_cast<DWORD>(n);
    *lpNumberOfBytesRead += static_cast<DWORD>(n);
  }
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}

extern "C" BOOL WINAPI GetFileSizeEx(HANDLE hFile, PLARGE_INTEGER lpFileSize) {
  const auto file = win32::Handles().Lookup<OpenFile>(hFile, win32::HandleKind::File);
  if (!file) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  if (lpFileSize == nullptr) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return FALSE;
  }
  struct stat st;
  if (fstat(file->fd, &st) != 0) {
    SetLastError(win32::ErrorFromErrno(errno));
    return FALSE;
  }
  lpFileSize->QuadPart = static_cast<LONGLONG>(st.st_size);
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}

extern "C" BOOL WINAPI CloseHandle(HANDLE hObject) {
  // Only file handles close here; find handles close with FindClose, profiles and
  // transforms with their own calls.
  if (!win32::Handles().Remove<OpenFile>(hObject, win32::HandleKind::File)) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}
