// The mscms profile calls over IccContainer: open, close (write-back), header and
// element access. Every call leaves the last error at 0 on success.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <memory>
#include <mutex>
#include <string>

#include "api_result.h"
#include "handle_table.h"
#include "icm.h"
#include "icm/color_directory.h"
#include "icm/icc_container.h"
#include "icm/profile_store.h"
#include "icm/profile_validity.h"
#include "kernel/file_paths.h"
#include "kernel/atomic_file.h"
#include "kernel/errno_map.h"

namespace win32::icm {

namespace {

static_assert(sizeof(PROFILEHEADER) == kHeaderSize, "PROFILEHEADER must mirror the ICC header");

struct OpenProfile {
  std::mutex mutex;  // one call at a time on a profile, from any thread
  IccContainer icc;
  bool writable = false;
  std::string path;  // empty for a memory profile
  bool changed = false;
};

// An open profile held and locked for the length of one call; empty for a bad handle.
class LockedProfile {
 public:
  explicit LockedProfile(std::shared_ptr<OpenProfile> profile) : profile_(std::move(profile)) {
    if (profile_) lock_ = std::unique_lock<std::mutex>(profile_->mutex);
  }
  explicit operator bool() const { return profile_ != nullptr; }
  OpenProfile* operator->() const { return profile_.get(); }

 private:
  std::shared_ptr<OpenProfile> profile_;
  std::unique_lock<std::mutex> lock_;
};

// Runs an API body; allocation failure becomes ERROR_NOT_ENOUGH_MEMORY.
template <class Body>
auto Guarded(Body&& body) -> decltype(body()) {
  try {
    return body();
  } catch (...) {  // only allocation throws in these calls
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return {};
  }
}

LockedProfile Lookup(HPROFILE handle) {
  return LockedProfile(Handles().Lookup<OpenProfile>(handle, HandleKind::Profile));
}

// Opens a file profile per the creation mode; a missing file (or a mode that replaces
// the file) gives a blank profile that is written at close.
DWORD OpenFile(const char* name, DWORD creation, OpenProfile& profile) {
  if (creation < CREATE_NEW || creation > TRUNCATE_EXISTING) return ERROR_INVALID_PARAMETER;
  DWORD code = ResolveProfilePath(name, profile.path);
  if (code != ERROR_SUCCESS) return code;

  struct stat st;
  const bool exists = stat(profile.path.c_str(), &st) == 0;
  if (!exists && errno != ENOENT) return errno == ENOTDIR ? ERROR_PATH_NOT_FOUND : ErrorFromErrno(errno);
  if (exists && S_ISDIR(st.st_mode)) return ERROR_ACCESS_DENIED;
  if (exists && creation == CREATE_NEW) return ERROR_FILE_EXISTS;
  if (!exists) {
    const std::size_t slash = profile.path.rfind('/');
    const std::string folder = slash == 0 ? "/" : profile.path.substr(0, slash);
    if (stat(folder.c_str(), &st) != 0 || !S_ISDIR(st.st_mode)) return ERROR_PATH_NOT_FOUND;
    if (creation == OPEN_EXISTING || creation == TRUNCATE_EXISTING) return ERROR_FILE_NOT_FOUND;
    if (profile.writable && access(folder.c_str(), W_OK) != 0) return ErrorFromErrno(errno);
  } else if (profile.writable && (IsReadOnlyMode(st.st_mode) || access(profile.path.c_str(), W_OK) != 0)) {
    return ERROR_ACCESS_DENIED;
  }

  if (exists && (creation == OPEN_EXISTING || creation == OPEN_ALWAYS)) {
    auto bytes = std::make_shared<Bytes>();
    code = ReadFileBytes(profile.path, *bytes);
    if (code != ERROR_SUCCESS) return code;
    return IccContainer::Parse(std::move(bytes), profile.icc);
  }
  profile.icc = IccContainer::Blank();
  profile.changed = true;
  return ERROR_SUCCESS;
}

}  // namespace

BOOL SerializeProfile(HPROFILE handle, std::vector<std::uint8_t>& bytes) {
  return Guarded([&]() -> BOOL {
    auto profile = Lookup(handle);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    bytes = profile->icc.Serialize();
    return Succeed();
  });
}

}  // namespace win32::icm

using namespace win32;
using namespace win32::icm;

extern "C" HPROFILE WINAPI OpenColorProfileA(PPROFILE pProfile, DWORD dwDesiredAccess, DWORD dwShareMode,
                                             DWORD dwCreationMode) {
  (void)dwShareMode;  // share modes are accepted, not enforced
  return Guarded([&]() -> HPROFILE {
    if (pProfile == nullptr || pProfile->pProfileData == nullptr ||
        (dwDesiredAccess != PROFILE_READ && dwDesiredAccess != PROFILE_READWRITE)) {
      SetLastError(ERROR_INVALID_PARAMETER);
      return nullptr;
    }
    auto profile = std::make_shared<OpenProfile>();
    profile->writable = dwDesiredAccess == PROFILE_READWRITE;
    DWORD code;
    if (pProfile->dwType == PROFILE_FILENAME) {
      code = OpenFile(static_cast<const char*>(pProfile->pProfileData), dwCreationMode, *profile);
    } else if (pProfile->dwType == PROFILE_MEMBUFFER) {
      const auto* data = static_cast<const std::uint8_t*>(pProfile->pProfileData);
      code = IccContainer::Parse(std::make_shared<Bytes>(data, data + pProfile->cbDataSize), profile->icc);
    } else {
      code = ERROR_INVALID_PARAMETER;
    }
    if (code != ERROR_SUCCESS) {
      SetLastError(code);
      return nullptr;
    }
    HPROFILE handle = win32::Handles().Insert(win32::HandleKind::Profile, std::move(profile));
    SetLastError(ERROR_SUCCESS);
    return handle;
  });
}

// Writes a changed read-write file profile back atomically. The handle is closed even
// when the write fails; the failure is then reported with the file's error code.
extern "C" BOOL WINAPI CloseColorProfile(HPROFILE hProfile) {
  return Guarded([&]() -> BOOL {
    const LockedProfile profile(win32::Handles().Remove<OpenProfile>(hProfile, win32::HandleKind::Profile));
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    if (profile->writable && profile->changed && !profile->path.empty()) {
      const std::vector<std::uint8_t> bytes = profile->icc.Serialize();
      const DWORD code = win32::WriteFileAtomically(profile->path, bytes.data(), bytes.size());
      if (code != ERROR_SUCCESS) return Fail(code);
    }
    return Succeed();
  });
}

extern "C" BOOL WINAPI GetColorProfileHeader(HPROFILE hProfile, PPROFILEHEADER pHeader) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pHeader == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  // Every 32-bit word, the reserved bytes included, comes out in host order.
  const std::uint8_t* raw = profile->icc.Header().data();
  auto* out = reinterpret_cast<std::uint8_t*>(pHeader);
  for (std::size_t i = 0; i < kHeaderSize; i += 4) {
    const std::uint32_t word = ReadBE32(raw + i);
    std::memcpy(out + i, &word, 4);
  }
  return Succeed();
}

extern "C" BOOL WINAPI SetColorProfileHeader(HPROFILE hProfile, PPROFILEHEADER pHeader) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pHeader == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  if (!profile->writable) return Fail(ERROR_ACCESS_DENIED);
  const auto* in = reinterpret_cast<const std::uint8_t*>(pHeader);
  std::uint8_t raw[kHeaderSize];
  for (std::size_t i = 0; i < kHeaderSize; i += 4) {
    std::uint32_t word;
    std::memcpy(&word, in + i, 4);
    WriteBE32(raw + i, word);
  }
  profile->icc.SetHeader(raw);
  profile->changed = true;
  return Succeed();
}

extern "C" BOOL WINAPI IsColorProfileValid(HPROFILE hProfile, PBOOL pbValid) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pbValid == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  *pbValid = IsUsableProfile(profile->icc) ? TRUE : FALSE;
  return *pbValid ? Succeed() : Fail(ERROR_INVALID_PROFILE);
}

extern "C" BOOL WINAPI GetCountColorProfileElements(HPROFILE hProfile, PDWORD pnCount) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pnCount == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  *pnCount = static_cast<DWORD>(profile->icc.TagCount());
  return Succeed();
}

extern "C" BOOL WINAPI GetColorProfileElementTag(HPROFILE hProfile, DWORD dwIndex, PTAGTYPE pTag) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pTag == nullptr || dwIndex == 0 || dwIndex > profile->icc.TagCount())
    return Fail(ERROR_INVALID_PARAMETER);
  *pTag = profile->icc.TagAt(dwIndex - 1);
  return Succeed();
}

extern "C" BOOL WINAPI IsColorProfileTagPresent(HPROFILE hProfile, TAGTYPE tag, PBOOL pbPresent) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pbPresent == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  *pbPresent = profile->icc.HasTag(tag) ? TRUE : FALSE;
  return Succeed();
}

// A null buffer asks for the whole element's size (FALSE, ERROR_INSUFFICIENT_BUFFER).
// Otherwise min(*pcbElement, size - offset) bytes are copied; pbReference is optional.
extern "C" BOOL WINAPI GetColorProfileElement(HPROFILE hProfile, TAGTYPE tag, DWORD dwOffset,
                                              PDWORD pcbElement, PVOID pElement, PBOOL pbReference) {
  auto profile = Lookup(hProfile);
  if (!profile) return Fail(ERROR_INVALID_HANDLE);
  if (pcbElement == nullptr) return Fail(ERROR_INVALID_PARAMETER);
  const Block* element = profile->icc.Element(tag);
  if (element == nullptr) return Fail(ERROR_TAG_NOT_FOUND);
  if (pElement == nullptr) {
    *pcbElement = static_cast<DWORD>(element->size());
    return Fail(ERROR_INSUFFICIENT_BUFFER);
  }
  if (dwOffset > element->size()) return Fail(ERROR_INVALID_PARAMETER);
  const std::size_t left = element->size() - dwOffset;
  const std::size_t n = *pcbElement < left ? *pcbElement : left;
  if (n > 0) std::memcpy(pElement, element->data() + dwOffset, n);
  *pcbElement = static_cast<DWORD>(n);
  if (pbReference != nullptr) *pbReference = profile->icc.IsShared(tag) ? TRUE : FALSE;
  return Succeed();
}

// Writes inside the element only: it never grows, and *pcbElement returns the count.
extern "C" BOOL WINAPI SetColorProfileElement(HPROFILE hProfile, TAGTYPE tag, DWORD dwOffset,
                                              PDWORD pcbElement, PVOID pElement) {
  return Guarded([&]() -> BOOL {
    auto profile = Lookup(hProfile);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    if (pcbElement == nullptr || pElement == nullptr) return Fail(ERROR_INVALID_PARAMETER);
    if (!profile->writable) return Fail(ERROR_ACCESS_DENIED);
    const Block* element = profile->icc.Element(tag);
    if (element == nullptr) return Fail(ERROR_TAG_NOT_FOUND);
    if (dwOffset > element->size()) return Fail(ERROR_INVALID_PARAMETER);
    *pcbElement = static_cast<DWORD>(profile->icc.WriteElement(tag, dwOffset, pElement, *pcbElement));
    profile->changed = true;
    return Succeed();
  });
}

extern "C" BOOL WINAPI SetColorProfileElementSize(HPROFILE hProfile, TAGTYPE tagType, DWORD pcbElement) {
  return Guarded([&]() -> BOOL {
    auto profile = Lookup(hProfile);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    if (tagType == 0) return Fail(ERROR_INVALID_PARAMETER);
    if (!profile->writable) return Fail(ERROR_ACCESS_DENIED);
    const DWORD code = profile->icc.ResizeElement(tagType, pcbElement);
    if (code != ERROR_SUCCESS) return Fail(code);
    profile->changed = true;
    return Succeed();
  });
}

// Makes newTag a second table entry for refTag's data. Writing either later gives the
// written one its own copy, as SetColorProfileElementSize and SetColorProfileElement do.
extern "C" BOOL WINAPI SetColorProfileElementReference(HPROFILE hProfile, TAGTYPE newTag, TAGTYPE refTag) {
  return Guarded([&]() -> BOOL {
    auto profile = Lookup(hProfile);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    if (newTag == 0) return Fail(ERROR_INVALID_PARAMETER);
    if (!profile->writable) return Fail(ERROR_ACCESS_DENIED);
    const DWORD code = profile->icc.AddReference(newTag, refTag);
    if (code != ERROR_SUCCESS) return Fail(code);
    profile->changed = true;
    return Succeed();
  });
}
