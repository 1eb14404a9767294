#include "temp_folder.h"

#include "blank_template.h"

#include <cstdio>
#include <cstring>

char TempFolderPath[kTempFolderCapacity];
char WorkingFolderPath[kTempFolderCapacity];
int32_t TempNameCounter;

namespace {

const char kLockName[] = "lock";
// Numbers tried for a folder of our own; more live programs than this is not plausible.
constexpr int kMaxWorkingFolders = 10000;

// Open, unshared, for the life of the process: it marks the working folder as in use.
HANDLE WorkingFolderLock = INVALID_HANDLE_VALUE;

// folder + name into out; false when it does not fit.
bool JoinPath(char* out, std::size_t size, const char* folder, const char* name) {
  const int n = std::snprintf(out, size, "%s%s", folder, name);
  return n > 0 && static_cast<std::size_t>(n) < size;
}

bool IsNumber(const char* name) {
  if (!*name) return false;
  for (; *name; ++name)
    if (*name < '0' || *name > '9') return false;
  return true;
}

// Deletes every file in folder (a path ending in a backslash) but its lock.
void DeleteFilesIn(const char* folder) {
  char pattern[MAX_PATH];
  if (!JoinPath(pattern, sizeof pattern, folder, "*")) return;
  WIN32_FIND_DATAA found;
  HANDLE find = FindFirstFileA(pattern, &found);
  if (find == INVALID_HANDLE_VALUE) return;
  do {
    if ((found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) || std::strcmp(found.cFileName, kLockName) == 0)
      continue;
    char file[MAX_PATH];
    if (!JoinPath(file, sizeof file, folder, found.cFileName)) continue;
    SetFileAttributesA(file, FILE_ATTRIBUTE_NORMAL);  // a read-only copy is still ours to delete
    DeleteFileA(file);
  } while (FindNextFileA(find, &found));
  FindClose(find);
}

// Removes folder if its owner has ended: its lock then opens without sharing. A folder
// without a lock is one being set up (or abandoned before it got one): it is removed
// only if empty, and an owner that loses it that way claims another.
void RemoveIfAbandoned(const char* folder) {
  char lock[MAX_PATH];
  if (!JoinPath(lock, sizeof lock, folder, kLockName)) return;
  HANDLE h = CreateFileA(lock, GENERIC_READ | GENERIC_WRITE, 0, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (h == INVALID_HANDLE_VALUE) {
    if (GetLastError() == ERROR_FILE_NOT_FOUND) RemoveDirectoryA(folder);
    return;  // in use (a sharing violation), or not ours to judge
  }
  DeleteFilesIn(folder);
  CloseHandle(h);
  DeleteFileA(lock);
  RemoveDirectoryA(folder);
}

// Claims the lowest free number as this plugin's folder.
bool ClaimWorkingFolder() {
  for (int n = 0; n < kMaxWorkingFolders; ++n) {
    char folder[kTempFolderCapacity];
    const int length = std::snprintf(folder, sizeof folder, "%s%d\\", TempFolderPath, n);
    if (length <= 0 || static_cast<std::size_t>(length) >= sizeof folder) return false;
    if (!CreateDirectoryA(folder, nullptr)) {
      if (GetLastError() == ERROR_ALREADY_EXISTS) continue;
      return false;
    }
    char lock[MAX_PATH];
    if (!JoinPath(lock, sizeof lock, folder, kLockName)) return false;
    HANDLE h = CreateFileA(lock, GENERIC_READ | GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_HIDDEN, nullptr);
    if (h == INVALID_HANDLE_VALUE) continue;  // swept away by a program starting meanwhile
    WorkingFolderLock = h;
    std::memcpy(WorkingFolderPath, folder, static_cast<std::size_t>(length) + 1);
    return true;
  }
  return false;
}

}  // namespace

bool TempFolderFromModulePath(const char* modulePath, char* out, std::size_t outSize) {
  static const char kSuffix[] = "\\temp\\";
  if (outSize == 0) return false;
  out[0] = '\0';
  if (!modulePath) return false;
  const char* lastSlash = std::strrchr(modulePath, '\\');
  if (!lastSlash) return false;
  const std::size_t dirLength = static_cast<std::size_t>(lastSlash - modulePath);
  if (dirLength + sizeof kSuffix > outSize) return false;
  std::memcpy(out, modulePath, dirLength);
  std::memcpy(out + dirLength, kSuffix, sizeof kSuffix);
  return true;
}

void SweepAbandonedFolders() {
  char pattern[MAX_PATH];
  if (!TempFolderPath[0] || !JoinPath(pattern, sizeof pattern, TempFolderPath, "*")) return;
  WIN32_FIND_DATAA found;
  HANDLE find = FindFirstFileA(pattern, &found);
  if (find == INVALID_HANDLE_VALUE) return;
  do {
    if (!(found.dwFileAttributes & FILE_ATTRIBUTE_DIRECTORY) || !IsNumber(found.cFileName)) continue;
    char folder[MAX_PATH];
    const int length = std::snprintf(folder, sizeof folder, "%s%s\\", TempFolderPath, found.cFileName);
    if (length <= 0 || static_cast<std::size_t>(length) >= sizeof folder) continue;
    if (std::strcmp(folder, WorkingFolderPath) != 0) RemoveIfAbandoned(folder);
  } while (FindNextFileA(find, &found));
  FindClose(find);
}

void SetUpTempFolder() {
  char module[kTempFolderCapacity];
  const DWORD n = GetModuleFileNameA(nullptr, module, sizeof module);
  // A path that filled the buffer was truncated: better no folder than a wrong one.
  if (n == 0 || n >= sizeof module || !TempFolderFromModulePath(module, TempFolderPath, sizeof TempFolderPath)) {
    TempFolderPath[0] = '\0';
    return;
  }
  CreateDirectoryA(TempFolderPath, nullptr);
  SweepAbandonedFolders();
  // Started again in the same process: the folder claimed before is still ours.
  if (WorkingFolderLock == INVALID_HANDLE_VALUE && !ClaimWorkingFolder()) WorkingFolderPath[0] = '\0';
  PlaceBlankTemplate(TempFolderPath, WorkingFolderPath);
  SetLastError(ERROR_SUCCESS);  // what start-up met is nobody's error
}

bool MakeTempName(char* dest, std::size_t destSize) {
  if (!dest || destSize == 0) return false;
  const std::size_t folderLength = std::strlen(WorkingFolderPath);
  if (folderLength == 0) return false;
  char number[16];
  const int digits = std::snprintf(number, sizeof number, "%d", static_cast<int>(TempNameCounter));
  if (folderLength + static_cast<std::size_t>(digits) + 1 > destSize) return false;
  std::memcpy(dest, WorkingFolderPath, folderLength);
  std::memcpy(dest + folderLength, number, static_cast<std::size_t>(digits) + 1);
  // The counter numbers names for the life of the library; it wraps rather than overflows.
  TempNameCounter = static_cast<int32_t>(static_cast<uint32_t>(TempNameCounter) + 1u);
  return true;
}
