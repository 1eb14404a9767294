// FindFirstFileA, FindNextFileA and FindClose. The folder is read once, when the search
// starts, so later changes to it never disturb an enumeration in progress.
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <string>
#include <vector>

#include "handle_table.h"
#include "kernel/errno_map.h"
#include "kernel/file_paths.h"
#include "kernel/wildcard.h"
#include "windows.h"

namespace {

struct FindState {
  std::mutex mutex;
  std::vector<WIN32_FIND_DATAA> entries;
  std::size_t next = 0;
};

class DirCloser {
 public:
  explicit DirCloser(DIR* dir) : dir_(dir) {}
  DirCloser(const DirCloser&) = delete;
  DirCloser& operator=(const DirCloser&) = delete;
  ~DirCloser() { closedir(dir_); }

 private:
  DIR* dir_;
};

// Seconds between 1601-01-01 (the FILETIME epoch) and 1970-01-01.
constexpr std::int64_t kEpochDelta = 11644473600;

FILETIME FileTimeFrom(const struct timespec& ts) {
  std::uint64_t ticks = 0;  // times before 1601 cannot be told and stay at zero
  const std::int64_t seconds = static_cast<std::int64_t>(ts.tv_sec) + kEpochDelta;
  if (seconds >= 0)
    ticks = static_cast<std::uint64_t>(seconds) * 10000000u +
            static_cast<std::uint64_t>(ts.tv_nsec) / 100;
  FILETIME ft;
  ft.dwLowDateTime = static_cast<DWORD>(ticks & 0xFFFFFFFFu);
  ft.dwHighDateTime = static_cast<DWORD>(ticks >> 32);
  return ft;
}

WIN32_FIND_DATAA FindDataFrom(const char* name, std::size_t length, const struct stat& st) {
  WIN32_FIND_DATAA data;
  std::memset(&data, 0, sizeof data);
  if (S_ISDIR(st.st_mode)) data.dwFileAttributes |= FILE_ATTRIBUTE_DIRECTORY;
  if (win32::IsReadOnlyMode(st.st_mode)) data.dwFileAttributes |= FILE_ATTRIBUTE_READONLY;
  if (data.dwFileAttributes == 0) data.dwFileAttributes = FILE_ATTRIBUTE_NORMAL;
  // Linux keeps no creation time; the status-change time stands in for it.
  data.ftCreationTime = FileTimeFrom(st.st_ctim);
  data.ftLastAccessTime = FileTimeFrom(st.st_atim);
  data.ftLastWriteTime = FileTimeFrom(st.st_mtim);
  if (!S_ISDIR(st.st_mode)) {
    const std::uint64_t size = static_cast<std::uint64_t>(st.st_size);
    data.nFileSizeHigh = static_cast<DWORD>(size >> 32);
    data.nFileSizeLow = static_cast<DWORD>(size & 0xFFFFFFFFu);
  }
  std::memcpy(data.cFileName, name, length);  // length < MAX_PATH, checked by the caller
  return data;
}

// Fills *state with the entries of folder whose names match pattern. Returns
// ERROR_SUCCESS or the code the search fails with.
DWORD ReadFolder(const std::string& folder, const std::string& pattern, FindState* state) {
  DIR* dir = opendir(folder.c_str());
  if (dir == nullptr)
    return errno == ENOENT || errno == ENOTDIR ? ERROR_PATH_NOT_FOUND
                                               : win32::ErrorFromErrno(errno);
  DirCloser closer(dir);
  for (;;) {
    errno = 0;
    const dirent* entry = readdir(dir);
    if (entry == nullptr) {
      if (errno != 0) return win32::ErrorFromErrno(errno);
      break;
    }
    const char* name = entry->d_name;
    if (std::strcmp(name, ".") == 0 || std::strcmp(name, "..") == 0) continue;
    // A name that cannot fit cFileName with its terminator is left out, never cut.
    const std::size_t length = strnlen(name, MAX_PATH);
    if (length >= MAX_PATH) continue;
    if (!win32::MatchesFileWildcard(pattern, std::string_view(name, length))) continue;
    struct stat st;
    if (fstatat(dirfd(dir), name, &st, 0) != 0 &&
        fstatat(dirfd(dir), name, &st, AT_SYMLINK_NOFOLLOW) != 0)
      continue;  // gone since the listing
    state->entries.push_back(FindDataFrom(name, length, st));
  }
  // Windows promises no order; a sorted one keeps results reproducible.
  std::sort(state->entries.begin(), state->entries.end(),
            [](const WIN32_FIND_DATAA& a, const WIN32_FIND_DATAA& b) {
              return std::strcmp(a.cFileName, b.cFileName) < 0;
            });
  return state->entries.empty() ? ERROR_FILE_NOT_FOUND : ERROR_SUCCESS;
}

HANDLE FindFirstImpl(LPCSTR lpFileName, LPWIN32_FIND_DATAA data) {
  std::string posix;
  DWORD err = win32::PosixFileFromWindows(lpFileName, &posix);
  if (err == ERROR_SUCCESS && data == nullptr) err = ERROR_INVALID_PARAMETER;
  if (err != ERROR_SUCCESS) {
    SetLastError(err);
    return INVALID_HANDLE_VALUE;
  }
  // The last component is the pattern; wildcards elsewhere name no folder.
  const std::size_t slash = posix.rfind('/');
  const std::string folder = posix.substr(0, slash + 1);
  const std::string pattern = posix.substr(slash + 1);
  if (folder.find_first_of("*?") != std::string::npos) {
    SetLastError(ERROR_INVALID_NAME);
    return INVALID_HANDLE_VALUE;
  }
  auto state = std::make_shared<FindState>();
  err = pattern.empty() ? ERROR_FILE_NOT_FOUND : ReadFolder(folder, pattern, state.get());
  if (err != ERROR_SUCCESS) {
    SetLastError(err);
    return INVALID_HANDLE_VALUE;
  }
  *data = state->entries[0];
  state->next = 1;
  HANDLE handle = win32::Handles().Insert(win32::HandleKind::Find, state);
  SetLastError(ERROR_SUCCESS);
  return handle;
}

}  // namespace

extern "C" HANDLE WINAPI FindFirstFileA(LPCSTR lpFileName, LPWIN32_FIND_DATAA lpFindFileData) {
  try {
    return FindFirstImpl(lpFileName, lpFindFileData);
  } catch (const std::bad_alloc&) {
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return INVALID_HANDLE_VALUE;
  }
}

extern "C" BOOL WINAPI FindNextFileA(HANDLE hFindFile, LPWIN32_FIND_DATAA lpFindFileData) {
  const auto state = win32::Handles().Lookup<FindState>(hFindFile, win32::HandleKind::Find);
  if (!state) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  if (lpFindFileData == nullptr) {
    SetLastError(ERROR_INVALID_PARAMETER);
    return FALSE;
  }
  std::lock_guard<std::mutex> lock(state->mutex);
  if (state->next >= state->entries.size()) {
    SetLastError(ERROR_NO_MORE_FILES);
    return FALSE;
  }
  *lpFindFileData = state->entries[state->next++];
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}

extern "C" BOOL WINAPI FindClose(HANDLE hFindFile) {
  if (!win32::Handles().Remove<FindState>(hFindFile, win32::HandleKind::Find)) {
    SetLastError(ERROR_INVALID_HANDLE);
    return FALSE;
  }
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}
