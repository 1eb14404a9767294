// EmbedImage, ImageProfileCount, GetImageProfile and GetImageSpace. Files are read and
// written through the kernel calls, since the plugin sees Windows paths; the formats
// are worked on in memory (image_formats.h). A build without the image libraries
// answers as an image-less platform would: no profile can be read or embedded.
#include "image_profiles.h"

#include <cstdio>
#include <cstring>
#include <vector>

#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"
#include "temp_folder.h"
#include "win32_api.h"

#if TINTWELL_IMAGE_FILES
#include "image_formats.h"
#endif

namespace {

#if TINTWELL_IMAGE_FILES

using image::Bytes;

// Copies a folder item's path into out; false when it does not fit or is empty.
bool PathOf(REALfolderItem f, char* out, std::size_t size) {
  REALstring s = bridge::PathFromFolderItem(f);
  const int32_t length = bridge::StringLength(s);
  const bool fits = length > 0 && static_cast<std::size_t>(length) < size;
  if (fits) {
    std::memcpy(out, bridge::StringText(s), static_cast<std::size_t>(length));
    out[length] = '\0';
  }
  bridge::UnlockString(s);
  return fits;
}

// Reads a whole file of at most limit bytes. Returns ERROR_SUCCESS or the failure's code.
DWORD ReadWholeFile(const char* path, std::size_t limit, Bytes& out) {
  HANDLE h = CreateFileA(path, GENERIC_READ, FILE_SHARE_READ, nullptr, OPEN_EXISTING, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (h == INVALID_HANDLE_VALUE) return GetLastError();
  DWORD code = ERROR_SUCCESS;
  LARGE_INTEGER size;
  if (!GetFileSizeEx(h, &size)) {
    code = GetLastError();
  } else if (size.QuadPart < 0 || static_cast<unsigned long long>(size.QuadPart) > limit) {
    code = ERROR_FILE_TOO_LARGE;
  } else {
    out.resize(static_cast<std::size_t>(size.QuadPart));
    DWORD n = 0;
    if (!ReadFile(h, out.data(), static_cast<DWORD>(out.size()), &n, nullptr)) code = GetLastError();
    else if (n != out.size()) code = ERROR_READ_FAULT;  // shrank while read
  }
  CloseHandle(h);
  return code;
}

// Writes bytes as a new file; a failure removes what was made.
DWORD WriteNewFile(const char* path, const Bytes& bytes) {
  HANDLE h = CreateFileA(path, GENERIC_WRITE, 0, nullptr, CREATE_NEW, FILE_ATTRIBUTE_NORMAL, nullptr);
  if (h == INVALID_HANDLE_VALUE) return GetLastError();
  DWORD written = 0;
  DWORD code = WriteFile(h, bytes.data(), static_cast<DWORD>(bytes.size()), &written, nullptr) ? ERROR_SUCCESS
                                                                                               : GetLastError();
  if (code == ERROR_SUCCESS && written != bytes.size()) code = ERROR_WRITE_FAULT;
  if (!CloseHandle(h) && code == ERROR_SUCCESS) code = GetLastError();
  if (code != ERROR_SUCCESS) DeleteFileA(path);
  return code;
}

// Replaces path with bytes: they go to a new file beside it, which is then moved over
// it, so that the file is either as it was or complete.
DWORD ReplaceWholeFile(const char* path, const Bytes& bytes) {
  static unsigned counter = 0;
  char temp[MAX_PATH];
  DWORD code = ERROR_FILE_EXISTS;
  for (int attempt = 0; attempt < 100 && code == ERROR_FILE_EXISTS; ++attempt) {
    const int n = std::snprintf(temp, sizeof temp, "%s.%u.tmp", path, counter++);
    if (n < 0 || static_cast<std::size_t>(n) >= sizeof temp) return ERROR_FILENAME_EXCED_RANGE;
    code = WriteNewFile(temp, bytes);
  }
  if (code != ERROR_SUCCESS) return code;
  if (!MoveFileExA(temp, path, MOVEFILE_REPLACE_EXISTING)) {
    code = GetLastError();
    DeleteFileA(temp);
  }
  return code;
}

// Reads the image behind f; reports kErrorNotAnImage and returns false when it is not
// a readable image.
bool ReadImageOf(REALfolderItem f, image::ImageInfo& info) {
  char path[MAX_PATH];
  Bytes bytes;
  if (!PathOf(f, path, sizeof path) || ReadWholeFile(path, image::kMaxImageBytes, bytes) != ERROR_SUCCESS ||
      !image::ReadImage(bytes.data(), bytes.size(), info)) {
    SetCMError(kErrorNotAnImage);
    return false;
  }
  return true;
}

bool Embed(REALfolderItem fromf, REALfolderItem tof, bool replace, REALobject p) {
  if (!p || !ProfileHandle(p)) {
    SetCMError(p ? kErrorInvalidObject : kErrorNilProfile);
    return false;
  }
  char from[MAX_PATH], to[MAX_PATH];
  Bytes source, profile, result;
  image::ImageInfo info;
  if (!PathOf(fromf, from, sizeof from) || ReadWholeFile(from, image::kMaxImageBytes, source) != ERROR_SUCCESS ||
      !image::ReadImage(source.data(), source.size(), info)) {
    SetCMError(kErrorNotAnImage);
    return false;
  }
  if (info.hasProfile && !replace) {
    SetCMError(kErrorImageHasProfile);
    return false;
  }
  // p's own file, as last saved.
  const DWORD read = ReadWholeFile(GetProfileData(p)->path, image::kMaxProfileBytes, profile);
  if (read != ERROR_SUCCESS) {
    SetCMError(static_cast<int32_t>(read));
    return false;
  }
  if (!image::EmbedProfile(source.data(), source.size(), profile, result)) {
    SetCMError(kErrorProfileNotEmbedded);
    return false;
  }
  if (!PathOf(tof, to, sizeof to)) {
    SetCMError(ERROR_FILENAME_EXCED_RANGE);
    return false;
  }
  const DWORD written = ReplaceWholeFile(to, result);
  SetCMError(static_cast<int32_t>(written));
  return written == ERROR_SUCCESS;
}

int32_t Count(REALfolderItem f) {
  image::ImageInfo info;
  if (!ReadImageOf(f, info)) return -1;
  SetCMError(0);
  return info.hasProfile ? 1 : 0;
}

REALstring Space(REALfolderItem f) {
  image::ImageInfo info;
  if (!ReadImageOf(f, info)) return nullptr;
  SetCMError(0);
  // The profile's data colour space, header bytes 16 to 19, as ColorSpace gives it.
  if (info.hasProfile && info.profile.size() >= 20)
    return bridge::BuildString(reinterpret_cast<const char*>(info.profile.data()) + 16, 4);
  return bridge::BuildString(info.space, 4);
}

// Writes the embedded profile to a temporary file of the plugin's and opens a Profile
// on it; the file goes with the object.
REALobject Extract(REALfolderItem f, int32_t index) {
  if (index != 1) return nullptr;
  image::ImageInfo info;
  if (!ReadImageOf(f, info)) return nullptr;
  if (!info.hasProfile) {
    SetCMError(0);
    return nullptr;
  }
  char temp[MAX_PATH];
  if (!MakeTempName(temp, sizeof temp)) {
    SetCMError(ERROR_PATH_NOT_FOUND);
    return nullptr;
  }
  const DWORD code = WriteNewFile(temp, info.profile);
  if (code != ERROR_SUCCESS) {
    SetCMError(static_cast<int32_t>(code));
    return nullptr;
  }
  REALobject profile = bridge::NewInstance("Profile");
  REALfolderItem item = profile ? bridge::FolderItemFromPath(temp) : nullptr;
  if (!item) {
    if (profile) bridge::UnlockObject(profile);
    DeleteFileA(temp);
    return nullptr;
  }
  profile_members::ConstructFromFile(profile, item);
  bridge::UnlockObject(item);
  ProfileData* d = GetProfileData(profile);
  if (std::strcmp(d->path, temp) != 0) {  // the constructor refused the path: the file is still ours
    DeleteFileA(temp);
  } else {
    d->ownsFile = true;
  }
  if (!d->profile) {  // the constructor reported why
    bridge::UnlockObject(profile);
    return nullptr;
  }
  return profile;
}

#endif

}  // namespace

bool EmbedImage(REALfolderItem fromf, REALfolderItem tof, bool replace, REALobject p) {
#if TINTWELL_IMAGE_FILES
  try {
    return Embed(fromf, tof, replace, p);
  } catch (...) {  // allocation
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return false;
  }
#else
  (void)fromf, (void)tof, (void)replace, (void)p;
  return false;
#endif
}

int32_t ImageProfileCount(REALfolderItem f) {
#if TINTWELL_IMAGE_FILES
  try {
    return Count(f);
  } catch (...) {
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return -1;
  }
#else
  (void)f;
  SetCMError(kErrorNoImageSupport);
  return -1;
#endif
}

REALobject GetImageProfile(REALfolderItem f, int32_t index) {
#if TINTWELL_IMAGE_FILES
  try {
    return Extract(f, index);
  } catch (...) {
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
#else
  (void)f, (void)index;
  return nullptr;
#endif
}

REALstring GetImageSpace(REALfolderItem f) {
#if TINTWELL_IMAGE_FILES
  try {
    return Space(f);
  } catch (...) {
    SetCMError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
#else
  (void)f;
  return nullptr;
#endif
}
