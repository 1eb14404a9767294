// Profile construction, saving, validation and destruction: every edit goes to the
// working copy in the temporary folder; the own file changes only on SaveProfile.
#include <cstring>

#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "signatures.h"
#include "temp_folder.h"

namespace {

ProfileData* Data(REALobject self) { return GetProfileData(self); }

// Copies a folder item's path into out. False when it does not fit (a nil item
// yields the empty path, which later file calls refuse).
bool FolderItemPath(REALfolderItem f, char* out, std::size_t size) {
  REALstring s = bridge::PathFromFolderItem(f);
  const int32_t length = bridge::StringLength(s);
  const bool fits = static_cast<std::size_t>(length) < size;
  if (fits) {
    std::memcpy(out, bridge::StringText(s), static_cast<std::size_t>(length));
    out[length] = '\0';
  }
  bridge::UnlockString(s);
  return fits;
}

void CopyFailed() { SendDebugString("Error copying profile to new path"); }

// A path that cannot be stored is refused as a copy of it would be.
void RefusePath(DWORD code) {
  SetCMError(static_cast<int32_t>(code));
  CopyFailed();
}

// Removes the copy that the intent constructor installed in the colour directory.
void UninstallCopy(ProfileData* d) {
  if (!d->installed) return;
  d->installed = false;
  UninstallColorProfileA(nullptr, d->tempName, TRUE);
}

// Removes the own file when it is a temporary file that only this object knows.
void DeleteOwnedFile(ProfileData* d) {
  if (!d->ownsFile) return;
  d->ownsFile = false;
  DeleteFileA(d->path);
}

// Before a constructor runs again on an object: closes its profile and removes its
// working copy, which nothing else can reach any more.
void ReleasePrevious(ProfileData* d) {
  if (d->profile) {
    CloseColorProfile(d->profile);
    d->profile = 0;
  }
  if (d->tempPath[0]) DeleteFileA(d->tempPath);
  UninstallCopy(d);
  DeleteOwnedFile(d);
  d->tempPath[0] = '\0';
  d->tempName[0] = '\0';
}

HPROFILE OpenByFullPath(const char* path) {
  ClearLastError();
  PROFILE spec = {PROFILE_FILENAME, const_cast<char*>(path), static_cast<DWORD>(std::strlen(path) + 1)};
  return OpenColorProfileA(&spec, PROFILE_READWRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, OPEN_EXISTING);
}

// Sets path from f and names a fresh working copy; reports and returns false when
// either does not fit.
bool PreparePaths(ProfileData* d, REALfolderItem f) {
  if (!FolderItemPath(f, d->path, sizeof d->path)) {
    d->path[0] = '\0';
    RefusePath(ERROR_FILENAME_EXCED_RANGE);
    return false;
  }
  if (!MakeTempName(d->tempPath, sizeof d->tempPath)) {
    d->tempPath[0] = '\0';
    RefusePath(ERROR_PATH_NOT_FOUND);
    return false;
  }
  const char* name = std::strrchr(d->tempPath, '\\') + 1;
  std::strncpy(d->tempName, name, sizeof d->tempName - 1);
  d->tempName[sizeof d->tempName - 1] = '\0';
  return true;
}

// Copies the own file to the working copy; reports a failure. The copy is always the
// plugin's own writable file, whatever the attributes of the file it copies.
bool CopyToWorkingCopy(ProfileData* d) {
  ClearLastError();
  if (CopyFileA(d->path, d->tempPath, FALSE) && SetFileAttributesA(d->tempPath, FILE_ATTRIBUTE_NORMAL)) return true;
  ReportSystemError();
  CopyFailed();
  return false;
}

// Closes the working copy, copies it to destination and reopens it.
void SaveTo(ProfileData* d, const char* destination, const char* trace, bool traceFailedReopen) {
  LastCMError = 0;
  if (!d->profile) {
    SetCMError(kErrorInvalidObject);
    return;
  }
  // Closing writes the edits into the working copy; if that fails, copying the stale
  // copy would report a save that did not happen.
  const BOOL written = CloseColorProfile(d->profile);
  d->profile = 0;
  if (!written) {
    const DWORD code = GetLastError();
    SendDebugString("Error writing profile");
    SetCMError(static_cast<int32_t>(code));
    d->profile = OpenByFullPath(d->tempPath);
    return;
  }
  SendDebugString(trace);
  SendDebugString(d->tempPath);
  SendDebugString(destination);
  ClearLastError();
  if (!CopyFileA(d->tempPath, destination, FALSE)) {
    ReportSystemError();
    CopyFailed();
    // The edits are safe in the working copy; keep the object usable.
    d->profile = OpenByFullPath(d->tempPath);
    return;
  }
  ReportSystemError();
  d->profile = OpenByFullPath(d->tempPath);
  if (!d->profile) {
    const DWORD code = GetLastError();
    if (traceFailedReopen) SendDebugString("Could not reopen profile after save");
    SetCMError(static_cast<int32_t>(code));
  }
}

}  // namespace

HPROFILE ProfileHandle(REALobject profile) { return profile ? Data(profile)->profile : 0; }

BOOL ReadProfileHeader(HPROFILE profile, PROFILEHEADER* header) {
  std::memset(header, 0, sizeof *header);
  if (GetColorProfileHeader(profile, header)) return TRUE;
  const DWORD code = GetLastError();
  LastCMError = kErrorInvalidObject;
  SendDebugString("Error opening profile header");
  SetCMError(static_cast<int32_t>(code));
  return FALSE;
}

namespace profile_members {

void ConstructFromFile(REALobject self, REALfolderItem f) {
  ProfileData* d = Data(self);
  SendDebugString(" ");
  SendDebugString("PROFILE - FILE CONSTRUCTOR");
  ReleasePrevious(d);
  SetCMError(0);
  if (!PreparePaths(d, f) || !CopyToWorkingCopy(d)) return;
  ReportSystemError();
  d->profile = OpenByFullPath(d->tempPath);
  LastCMError = static_cast<int32_t>(GetLastError());
  SetCMError(LastCMError);
  if (!d->profile || LastCMError != 0) SendDebugString("Error opening copied profile");
}

// Opens the working copy by its full path (as the file constructor does), installs it
// into the colour directory, then writes the intent and preferred CMM through the
// handle, so that a later SaveProfile keeps them.
void ConstructWithIntent(REALobject self, REALfolderItem f, int32_t intent, int32_t /*quality*/, REALstring cmm) {
  ProfileData* d = Data(self);
  ReleasePrevious(d);
  SetCMError(0);
  if (!PreparePaths(d, f)) return;
  SendDebugString("TEMP PATH:");
  SendDebugString(d->tempPath);
  SendDebugString("TEMP NAME:");
  SendDebugString(d->tempName);
  if (!CopyToWorkingCopy(d)) return;
  d->profile = OpenByFullPath(d->tempPath);
  ReportSystemError();
  if (!d->profile || LastCMError != 0) {
    SendDebugString("Error opening copied profile");
    return;
  }
  SendDebugString("InstallColorProfile");
  if (!InstallColorProfileA(nullptr, d->tempPath)) {
    const DWORD code = GetLastError();
    SendDebugString("InstallColorProfile FAIL");
    SetCMError(static_cast<int32_t>(code));
    return;
  }
  d->installed = true;
  PROFILEHEADER header;
  if (!ReadProfileHeader(d->profile, &header)) return;  // never write a zeroed header back
  header.phRenderingIntent = static_cast<DWORD>(intent);
  header.phCMMType = TagFromString(cmm);
  SetColorProfileHeader(d->profile, &header);
}

void ConstructFromProfile(REALobject self, REALfolderItem f, REALobject p) {
  if (!p) {
    SetCMError(kErrorNilProfile);
    return;
  }
  char destination[MAX_PATH];
  if (!FolderItemPath(f, destination, sizeof destination)) {
    RefusePath(ERROR_FILENAME_EXCED_RANGE);
    return;
  }
  if (!CopyFileA(Data(p)->tempPath, destination, FALSE)) {
    ReportSystemError();
    CopyFailed();
    return;
  }
  ConstructFromFile(self, f);
}

void SaveProfile(REALobject self) {
  ProfileData* d = Data(self);
  SaveTo(d, d->path, "saveprofile", true);
}

void SaveProfileAs(REALobject self, REALfolderItem f) {
  ProfileData* d = Data(self);
  char destination[MAX_PATH];
  if (!FolderItemPath(f, destination, sizeof destination)) {
    LastCMError = 0;
    RefusePath(ERROR_FILENAME_EXCED_RANGE);
    return;
  }
  SaveTo(d, destination, "saveprofile as", false);
}

bool ValidProfile(REALobject self) {
  BOOL valid = FALSE;
  return IsColorProfileValid(Data(self)->profile, &valid) && valid;
}

void Destruct(REALobject self) {
  ProfileData* d = Data(self);
  if (d->profile) {
    ClearLastError();
    CloseColorProfile(d->profile);
    d->profile = 0;
    ReportSystemError();
  } else {
    LastCMError = kErrorInvalidObject;
    SetCMError(kErrorInvalidObject);
  }
  if (!DeleteFileA(d->tempPath)) {
    const DWORD code = GetLastError();
    SendDebugString("Could not delete file");
    SetCMError(static_cast<int32_t>(code));
  }
  UninstallCopy(d);
  DeleteOwnedFile(d);
}

REALfolderItem GetLocation(REALobject self, intptr_t) {
  ProfileData* d = Data(self);
  if (!d->profile) {
    SetCMError(kErrorInvalidObject);
    return nullptr;
  }
  return bridge::FolderItemFromPath(d->path);
}

int32_t GetLocationType(REALobject, intptr_t) { return 0; }
int32_t GetRefCount(REALobject, intptr_t) { return 0; }

bool GetModified(REALobject, intptr_t) {
  LastCMError = 0;
  return false;
}

}  // namespace profile_members
