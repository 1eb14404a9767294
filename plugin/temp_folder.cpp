#include "temp_folder.h"

#include <cstdio>
#include <cstring>

char TempFolderPath[kTempFolderCapacity];
int32_t TempNameCounter;

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

void SetUpTempFolder() {
  char module[kTempFolderCapacity];
  const DWORD n = GetModuleFileNameA(nullptr, module, sizeof module);
  // A path that filled the buffer was truncated: better no folder than a wrong one.
  if (n == 0 || n >= sizeof module) {
    TempFolderPath[0] = '\0';
    return;
  }
  if (TempFolderFromModulePath(module, TempFolderPath, sizeof TempFolderPath))
    CreateDirectoryA(TempFolderPath, nullptr);
}

bool MakeTempName(char* dest, std::size_t destSize) {
  if (!dest || destSize == 0) return false;
  const std::size_t folderLength = std::strlen(TempFolderPath);
  if (folderLength == 0) return false;
  char number[16];
  const int digits = std::snprintf(number, sizeof number, "%d", static_cast<int>(TempNameCounter));
  if (folderLength + static_cast<std::size_t>(digits) + 1 > destSize) return false;
  std::memcpy(dest, TempFolderPath, folderLength);
  std::memcpy(dest + folderLength, number, static_cast<std::size_t>(digits) + 1);
  // The counter numbers names for the life of the library; it wraps rather than overflows.
  TempNameCounter = static_cast<int32_t>(static_cast<uint32_t>(TempNameCounter) + 1u);
  return true;
}
