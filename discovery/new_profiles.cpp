// New profile files handed back as open Profiles: a device link computed from a chain
// of profiles, a blank profile from the template, and a plain copy of a profile's file.
#include <cstdio>
#include <cstring>

#include "debugger.h"
#include "discovery.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "signatures.h"
#include "temp_folder.h"
#include "win32_api.h"

namespace {

constexpr int32_t kErrorCreateFile = -1;
constexpr int32_t kErrorWriteFile = -2;
// Tries at a free name for the staged device-link file before giving up.
constexpr int kStagedNameTries = 100;

// Copies text of length bytes into out; false (out empty) when it does not fit or holds
// a zero byte, which would name another file.
bool CopyPath(const char* text, std::size_t length, char* out, std::size_t size) {
  const bool fits = length < size && std::memchr(text, '\0', length) == nullptr;
  if (fits) std::memcpy(out, text, length);
  out[fits ? length : 0] = '\0';
  return fits;
}

// The path of a folder item into out, as CopyPath takes it.
bool FolderItemPath(REALfolderItem f, char* out, std::size_t size) {
  REALstring s = bridge::PathFromFolderItem(f);  // one reference, ours
  const bool fits = CopyPath(bridge::StringText(s), static_cast<std::size_t>(bridge::StringLength(s)), out, size);
  bridge::UnlockString(s);
  return fits;
}

// Creates a new file beside path (same folder, so the move into place is a rename) and
// names it in staged. INVALID_HANDLE_VALUE when none can be made.
HANDLE CreateStagedFile(const char* path, char* staged, std::size_t size) {
  static unsigned counter;
  const char* slash = std::strrchr(path, '\\');
  if (!slash) {
    SetLastError(ERROR_PATH_NOT_FOUND);
    return INVALID_HANDLE_VALUE;
  }
  const int folderLength = static_cast<int>(slash - path + 1);
  for (int i = 0; i < kStagedNameTries; ++i) {
    const int n = std::snprintf(staged, size, "%.*s~tw%u.tmp", folderLength, path, counter++);
    if (n <= 0 || static_cast<std::size_t>(n) >= size) {
      SetLastError(ERROR_FILENAME_EXCED_RANGE);
      return INVALID_HANDLE_VALUE;
    }
    HANDLE h = CreateFileA(staged, GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, nullptr);
    if (h != INVALID_HANDLE_VALUE || GetLastError() != ERROR_FILE_EXISTS) return h;
  }
  return INVALID_HANDLE_VALUE;
}

// Writes size bytes to path through a staged file that is moved over path only once it
// is complete, so that a failure leaves path as it was. Answers 0, or the plugin's code
// of the failure: kErrorCreateFile when the file cannot be made or put in place,
// kErrorWriteFile when the bytes cannot be written.
int32_t WriteWhole(const char* path, const BYTE* bytes, DWORD size) {
  char staged[MAX_PATH];
  HANDLE h = path[0] ? CreateStagedFile(path, staged, sizeof staged) : INVALID_HANDLE_VALUE;
  if (h == INVALID_HANDLE_VALUE) return kErrorCreateFile;
  DWORD written = 0;
  const bool whole = WriteFile(h, bytes, size, &written, nullptr) && written == size;
  if (!CloseHandle(h) || !whole) {
    DeleteFileA(staged);
    return kErrorWriteFile;
  }
  if (!MoveFileExA(staged, path, MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH)) {
    DeleteFileA(staged);
    return kErrorCreateFile;
  }
  return 0;
}

// Gives up the new object that a failed call does not hand back, then reports the
// failure: the object's destructor reports on its own, and must not have the last word.
REALobject Fail(REALobject object, const char* trace, int32_t code) {
  bridge::UnlockObject(object);
  SendDebugString(trace);
  SetCMError(code);
  return nullptr;
}

void CopyFailed(DWORD code) {
  SendDebugString("Error copying profile to new path");
  SetCMError(static_cast<int32_t>(code));
}

// Removes a tag from an open profile through the Profile member, as a script would.
void RemoveTagNamed(REALobject profile, const char* tag) {
  REALstring name = bridge::BuildString(tag, 4);
  profile_members::RemoveTag(profile, name);
  bridge::UnlockString(name);
}

}  // namespace

REALobject NewLinkProfile(REALfolderItem f, int32_t keyindex, REALobject p1, REALobject p2, REALobject p3,
                          REALobject p4) {
  REALobject link = bridge::NewInstance("Profile");
  if (!link) return nullptr;
  HPROFILE handles[4];
  DWORD intents[4];
  DWORD count = 0;
  REALobject const chain[4] = {p1, p2, p3, p4};
  for (REALobject p : chain) {
    const HPROFILE handle = ProfileHandle(p);
    if (!handle) continue;
    PROFILEHEADER header;
    ReadProfileHeader(handle, &header);
    handles[count] = handle;
    intents[count] = header.phRenderingIntent;
    ++count;
  }
  PBYTE data = nullptr;
  if (!CreateDeviceLinkProfile(handles, count, intents, count, BEST_MODE, &data, static_cast<DWORD>(keyindex))) {
    return Fail(link, "Error creating device link", static_cast<int32_t>(GetLastError()));
  }
  uint32_t sizeField;
  std::memcpy(&sizeField, data, sizeof sizeField);
  const uint32_t size = SwapBytes32(sizeField);  // big-endian in the profile
  SendDebugString("SIZE:");
  SendDebugInteger(static_cast<int32_t>(size));

  char path[MAX_PATH];
  REALstring pathString = bridge::PathFromFolderItem(f);  // one reference, ours
  SendDebugString("Path");
  SendDebugString(bridge::StringText(pathString));
  const bool fits = CopyPath(bridge::StringText(pathString), static_cast<std::size_t>(bridge::StringLength(pathString)),
                             path, sizeof path);
  bridge::UnlockString(pathString);
  const int32_t failure = fits ? WriteWhole(path, data, size) : kErrorCreateFile;
  GlobalFree(data);
  if (failure != 0)
    return Fail(link, failure == kErrorCreateFile ? "Error creating device file" : "Error writting device file",
                failure);
  profile_members::ConstructFromFile(link, f);
  return link;
}

REALobject BlankProfile(REALfolderItem f) {
  REALobject blank = bridge::NewInstance("Profile");
  if (!blank) return nullptr;
  char destination[MAX_PATH];
  const bool destinationFits = FolderItemPath(f, destination, sizeof destination);
  static const char kTemplate[] = "blank.icc";
  char source[MAX_PATH];
  const std::size_t folderLength = std::strlen(TempFolderPath);
  const bool sourceFits = folderLength > 0 && folderLength + sizeof kTemplate <= sizeof source;
  if (sourceFits) {
    std::memcpy(source, TempFolderPath, folderLength);
    std::memcpy(source + folderLength, kTemplate, sizeof kTemplate);
  }
  if (!sourceFits || !destinationFits) {
    CopyFailed(ERROR_FILENAME_EXCED_RANGE);
    return blank;
  }
  SendDebugString("From:");
  SendDebugString(source);
  SendDebugString("To:");
  SendDebugString(destination);
  // Without the copy, f would still hold whatever it held before: that file is not
  // the caller's blank profile, and its lut tags are not ours to remove.
  if (!CopyFileA(source, destination, FALSE)) {
    CopyFailed(GetLastError());
    return blank;
  }
  profile_members::ConstructFromFile(blank, f);
  if (!ProfileHandle(blank)) return blank;  // the constructor reported why
  RemoveTagNamed(blank, "A2B0");
  RemoveTagNamed(blank, "B2A0");
  profile_members::SaveProfile(blank);
  return blank;
}

REALobject CopyProfile(REALfolderItem f, REALobject p) {
  REALobject copy = bridge::NewInstance("Profile");
  if (!copy) return nullptr;
  if (!p) {
    SetCMError(kErrorNilProfile);
    return copy;
  }
  char destination[MAX_PATH];
  if (!FolderItemPath(f, destination, sizeof destination)) {
    CopyFailed(ERROR_FILENAME_EXCED_RANGE);
    return copy;
  }
  // A failed copy leaves f as it was: opening it would hand back another file as the copy.
  if (!CopyFileA(GetProfileData(p)->path, destination, FALSE)) {
    CopyFailed(GetLastError());
    return copy;
  }
  profile_members::ConstructFromFile(copy, f);
  return copy;
}
