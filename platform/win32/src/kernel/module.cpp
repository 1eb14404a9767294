// GetModuleFileNameA and CreateDirectoryA.
#include <sys/stat.h>
#include <unistd.h>

#include <climits>
#include <cstring>
#include <string>

#include "windows.h"
#include "win32_paths.h"
#include "kernel/errno_map.h"

extern "C" DWORD WINAPI GetModuleFileNameA(HMODULE hModule, LPSTR lpFilename, DWORD nSize) {
  // Only the running executable (a null module) is known here.
  if (hModule != nullptr) {
    SetLastError(ERROR_INVALID_HANDLE);
    return 0;
  }
  char exe[PATH_MAX];
  const ssize_t n = readlink("/proc/self/exe", exe, sizeof exe - 1);
  if (n <= 0) {
    SetLastError(ERROR_FILE_NOT_FOUND);
    return 0;
  }
  exe[n] = '\0';
  const auto mapped = win32::ExactWindowsPathFromPosix(exe);
  if (!mapped) {
    SetLastError(ERROR_INVALID_NAME);  // drive Z: cannot name it
    return 0;
  }
  const std::string& path = *mapped;
  if (nSize == 0 || lpFilename == nullptr) {
    SetLastError(ERROR_INSUFFICIENT_BUFFER);
    return 0;
  }
  if (path.size() >= nSize) {
    // As on Vista and later: truncated, terminated within nSize, and nSize returned.
    std::memcpy(lpFilename, path.data(), nSize - 1);
    lpFilename[nSize - 1] = '\0';
    SetLastError(ERROR_INSUFFICIENT_BUFFER);
    return nSize;
  }
  std::memcpy(lpFilename, path.c_str(), path.size() + 1);
  SetLastError(ERROR_SUCCESS);
  return static_cast<DWORD>(path.size());
}

extern "C" BOOL WINAPI CreateDirectoryA(LPCSTR lpPathName, LPSECURITY_ATTRIBUTES) {
  if (lpPathName == nullptr) {
    SetLastError(ERROR_PATH_NOT_FOUND);
    return FALSE;
  }
  // Windows limits an ANSI directory path to 248 characters.
  if (std::strlen(lpPathName) > 248) {
    SetLastError(ERROR_FILENAME_EXCED_RANGE);
    return FALSE;
  }
  const auto posix = win32::PosixPathFromWindows(lpPathName);
  if (!posix) {
    SetLastError(ERROR_PATH_NOT_FOUND);
    return FALSE;
  }
  if (mkdir(posix->c_str(), 0777) != 0) {
    // A missing parent is a missing path here, not a missing file.
    SetLastError(errno == ENOENT ? ERROR_PATH_NOT_FOUND : win32::ErrorFromErrno(errno));
    return FALSE;
  }
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}
