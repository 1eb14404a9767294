// The mscms profile calls over IccContainer: open, close (write-back), header and
// element access. Every call leaves the last error at 0 on success.
#include <fcntl.h>
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

// A profile file kept open for reading the tag data that is used later. Reading after
// the open sees the file as it was opened even when it has been replaced by a rename (an
// atomic save); one that was cut short in place reads short, and the elements it held
// are then unreadable.
class FileSource : public ByteSource {
 public:
  explicit FileSource(int fd) : fd_(fd) {}
  FileSource(const FileSource&) = delete;
  FileSource& operator=(const FileSource&) = delete;
  ~FileSource() override { close(fd_); }
  const std::uint8_t* Memory() const override { return nullptr; }
  bool ReadAt(std::uint64_t offset, std::size_t size, std::uint8_t* out) const override {
    std::size_t done = 0;
    while (done < size) {
      const ssize_t n = pread(fd_, out + done, size - done, static_cast<off_t>(offset + done));
      if (n < 0 && errno == EINTR) continue;
      if (n <= 0) return false;
      done += static_cast<std::size_t>(n);
    }
    return true;
  }

 private:
  int fd_;
};

// Files up to this size are read whole at open and closed again: that costs about as
// much as reading the tag table alone and holds no descriptor. Larger ones keep their
// descriptor and read each element when it is first used, so that opening one to read
// its header or a single tag does not read all of it.
constexpr std::uint64_t kReadWholeLimit = 64 * 1024;

// Parses the profile file at path (known to exist) into icc.
DWORD ParseProfileFile(const std::string& path, IccContainer& icc) {
  // Not blocking, so that a named pipe is refused rather than waited on.
  const int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (fd < 0) return ErrorFromErrno(errno);
  std::shared_ptr<const FileSource> source;
  try {
    source = std::make_shared<const FileSource>(fd);
  } catch (...) {
    close(fd);
    throw;
  }
  struct stat st;
  if (fstat(fd, &st) != 0) return ErrorFromErrno(errno);
  if (!S_ISREG(st.st_mode)) return ERROR_ACCESS_DENIED;  // a device or pipe is no profile
  const std::uint64_t size = static_cast<std::uint64_t>(st.st_size);
  if (size > kMaxProfileSize) return ERROR_INVALID_PROFILE;
  if (size > kReadWholeLimit) return IccContainer::Parse(source, size, icc);
  auto bytes = std::make_shared<Bytes>(static_cast<std::size_t>(size));
  if (!source->ReadAt(0, bytes->size(), bytes->data())) return ERROR_INVALID_PROFILE;  // shrank meanwhile
  return IccContainer::Parse(std::move(bytes), icc);
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

  if (exists && (creation == OPEN_EXISTING || creation == OPEN_ALWAYS)) return ParseProfileFile(profile.path, profile.icc);
  profile.icc = IccContainer::Blank();
  profile.changed = true;
  return ERROR_SUCCESS;
}

}  // namespace

BOOL SerializeProfile(HPROFILE handle, std::vector<std::uint8_t>& bytes) {
  return Guarded([&]() -> BOOL {
    auto profile = Lookup(handle);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    const DWORD code = profile->icc.Serialize(bytes);
    return code == ERROR_SUCCESS ? Succeed() : Fail(code);
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
      // A profile whose file lost tag data since the open is not written: the file keeps
      // what it holds rather than a profile with bytes made up.
      std::vector<std::uint8_t> bytes;
      DWORD code = profile->icc.Serialize(bytes);
      if (code == ERROR_SUCCESS) code = win32::WriteFileAtomically(profile->path, bytes.data(), bytes.size());
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
  return Guarded([&]() -> BOOL {  // reading a table of a file profile may allocate
    auto profile = Lookup(hProfile);
    if (!profile) return Fail(ERROR_INVALID_HANDLE);
    if (pbValid == nullptr) return Fail(ERROR_INVALID_PARAMETER);
    *pbValid = IsUsableProfile(profile->icc) ? TRUE : FALSE;
    return *pbValid ? Succeed() : Fail(ERROR_INVALID_PROFILE);
  });
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
  return Guarded([&]() -> BOOL {  // the first read of a file profile's element allocates
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
    if (!element->Load()) return Fail(ERROR_INVALID_PROFILE);
    const std::size_t left = element->size() - dwOffset;
    const std::size_t n = *pcbElement < left ? *pcbElement : left;
    if (n > 0) std::memcpy(pElement, element->data() + dwOffset, n);
    *pcbElement = static_cast<DWORD>(n);
    if (pbReference != nullptr) *pbReference = profile->icc.IsShared(tag) ? TRUE : FALSE;
    return Succeed();
  });
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
    if (!element->Load()) return Fail(ERROR_INVALID_PROFILE);
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
