#include "icm/color_directory.h"

#include "api_result.h"
#include "icm/icc_container.h"

#include <fcntl.h>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"
#include "kernel/atomic_file.h"
#include "kernel/errno_map.h"
#include "win32_paths.h"

namespace win32::icm {

namespace {

std::string WithoutTrailingSlashes(std::string path) {
  while (path.size() > 1 && path.back() == '/') path.pop_back();
  return path;
}

bool IsSet(const char* value) { return value != nullptr && value[0] != '\0'; }

}  // namespace

std::string ColorDirectory() {
  const char* own = std::getenv("TINTWELL_COLOR_DIR");
  if (IsSet(own)) return WithoutTrailingSlashes(own);
  const char* xdg = std::getenv("XDG_DATA_HOME");
  if (IsSet(xdg) && xdg[0] == '/') return WithoutTrailingSlashes(xdg) + "/icc";
  const char* home = std::getenv("HOME");
  std::string base;
  if (IsSet(home)) {
    base = home;
  } else if (const passwd* entry = getpwuid(getuid())) {
    base = entry->pw_dir;
  } else {
    base = "/tmp";
  }
  return WithoutTrailingSlashes(base) + "/.local/share/icc";
}

DWORD EnsureDirectory(const std::string& posixPath) {
  struct stat st;
  if (stat(posixPath.c_str(), &st) == 0) return S_ISDIR(st.st_mode) ? ERROR_SUCCESS : ERROR_PATH_NOT_FOUND;
  const std::size_t slash = posixPath.rfind('/');
  if (slash != std::string::npos && slash > 0) {
    const DWORD parent = EnsureDirectory(posixPath.substr(0, slash));
    if (parent != ERROR_SUCCESS) return parent;
  }
  if (mkdir(posixPath.c_str(), 0777) != 0 && errno != EEXIST)
    return errno == ENOENT ? ERROR_PATH_NOT_FOUND : ErrorFromErrno(errno);
  return ERROR_SUCCESS;
}

DWORD ResolveProfilePath(const std::string& name, std::string& posixPath) {
  if (name.empty()) return ERROR_PATH_NOT_FOUND;
  if (name.size() >= MAX_PATH) return ERROR_FILENAME_EXCED_RANGE;
  if (name.size() >= 2 && name[1] == ':') {
    auto mapped = PosixPathFromWindows(name);
    if (!mapped) return ERROR_PATH_NOT_FOUND;
    posixPath = *mapped;
    return ERROR_SUCCESS;
  }
  if (name[0] == '\\' || name[0] == '/') {
    posixPath = *PosixPathFromWindows("Z:" + name);
    return ERROR_SUCCESS;
  }
  const std::string directory = ColorDirectory();
  const DWORD made = EnsureDirectory(directory);
  if (made != ERROR_SUCCESS) return made;
  posixPath = directory + "/" + name;
  for (char& c : posixPath)
    if (c == '\\') c = '/';
  return ERROR_SUCCESS;
}

DWORD ReadFileBytes(const std::string& posixPath, std::vector<std::uint8_t>& bytes) {
  // Not blocking, so that a named pipe is refused rather than waited on.
  const int fd = open(posixPath.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (fd < 0) {
    const int err = errno;
    if (err != ENOENT) return ErrorFromErrno(err);
    // A missing folder on the way is a path error, as CreateFile reports it.
    const std::size_t slash = posixPath.rfind('/');
    struct stat st;
    const std::string parent = slash == 0 ? "/" : posixPath.substr(0, slash);
    return slash != std::string::npos && stat(parent.c_str(), &st) != 0 ? ERROR_PATH_NOT_FOUND
                                                                         : ERROR_FILE_NOT_FOUND;
  }
  DWORD result = ERROR_SUCCESS;
  struct stat st;
  if (fstat(fd, &st) != 0) {
    result = ErrorFromErrno(errno);
  } else if (!S_ISREG(st.st_mode)) {
    result = ERROR_ACCESS_DENIED;  // a folder, device or pipe is no profile
  } else if (static_cast<std::uint64_t>(st.st_size) > kMaxProfileSize) {
    result = ERROR_INVALID_PROFILE;
  } else {
    try {
      bytes.resize(static_cast<std::size_t>(st.st_size));
    } catch (...) {
      close(fd);
      throw;
    }
    std::size_t done = 0;
    while (done < bytes.size()) {
      const ssize_t n = read(fd, bytes.data() + done, bytes.size() - done);
      if (n < 0 && errno == EINTR) continue;
      if (n < 0) {
        result = ErrorFromErrno(errno);
        break;
      }
      if (n == 0) {  // shrank while reading
        bytes.resize(done);
        break;
      }
      done += static_cast<std::size_t>(n);
    }
  }
  close(fd);
  return result;
}

}  // namespace win32::icm

using win32::Fail;

extern "C" BOOL WINAPI GetColorDirectoryA(PCSTR pMachineName, PSTR pBuffer, PDWORD pdwSize) {
  try {
    if (pMachineName != nullptr || pdwSize == nullptr) return Fail(ERROR_INVALID_PARAMETER);
    const std::string directory = win32::icm::ColorDirectory();
    const DWORD made = win32::icm::EnsureDirectory(directory);
    if (made != ERROR_SUCCESS) return Fail(made);
    const auto mapped = win32::ExactWindowsPathFromPosix(directory);
    if (!mapped) return Fail(ERROR_INVALID_NAME);
    const std::string& windows = *mapped;
    const DWORD needed = static_cast<DWORD>(windows.size() + 1);
    const bool fits = pBuffer != nullptr && *pdwSize >= needed;
    *pdwSize = needed;
    if (!fits) return Fail(ERROR_INSUFFICIENT_BUFFER);
    std::memcpy(pBuffer, windows.c_str(), needed);
    SetLastError(ERROR_SUCCESS);
    return TRUE;
  } catch (...) {  // only allocation throws here
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}

// Copies the file into the colour directory under its own name, replacing a file of
// that name. The content is not checked: installing is a copy.
extern "C" BOOL WINAPI InstallColorProfileA(PCSTR pMachineName, PCSTR pProfileName) {
  try {
    if (pMachineName != nullptr || pProfileName == nullptr) return Fail(ERROR_INVALID_PARAMETER);
    std::string source;
    DWORD code = win32::icm::ResolveProfilePath(pProfileName, source);
    if (code != ERROR_SUCCESS) return Fail(code);
    std::vector<std::uint8_t> bytes;
    code = win32::icm::ReadFileBytes(source, bytes);
    if (code == ERROR_INVALID_PROFILE) code = ERROR_NOT_ENOUGH_MEMORY;  // too big to copy here
    if (code != ERROR_SUCCESS) return Fail(code);
    const std::string directory = win32::icm::ColorDirectory();
    code = win32::icm::EnsureDirectory(directory);
    if (code != ERROR_SUCCESS) return Fail(code);
    const std::string target = directory + "/" + source.substr(source.rfind('/') + 1);
    struct stat a, b;
    const bool same = stat(source.c_str(), &a) == 0 && stat(target.c_str(), &b) == 0 &&
                      a.st_dev == b.st_dev && a.st_ino == b.st_ino;
    if (!same) {
      code = win32::WriteFileAtomically(target, bytes.data(), bytes.size());
      if (code != ERROR_SUCCESS) return Fail(code);
    }
    SetLastError(ERROR_SUCCESS);
    return TRUE;
  } catch (...) {  // only allocation throws here
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}

// Removes a profile of that file name from the colour directory; a path names the file
// by its last component, as installing it did. Without bDelete there is nothing to
// undo here: installing is only the copy.
extern "C" BOOL WINAPI UninstallColorProfileA(PCSTR pMachineName, PCSTR pProfileName, BOOL bDelete) {
  try {
    if (pMachineName != nullptr || pProfileName == nullptr || pProfileName[0] == '\0')
      return Fail(ERROR_INVALID_PARAMETER);
    const std::string name = pProfileName;
    const std::size_t cut = name.find_last_of("\\/");
    const std::string file = cut == std::string::npos ? name : name.substr(cut + 1);
    if (file.empty() || file == "." || file == "..") return Fail(ERROR_INVALID_PARAMETER);
    const std::string target = win32::icm::ColorDirectory() + "/" + file;
    struct stat st;
    if (lstat(target.c_str(), &st) != 0) return Fail(ERROR_FILE_NOT_FOUND);
    if (!S_ISREG(st.st_mode)) return Fail(ERROR_ACCESS_DENIED);
    if (bDelete && unlink(target.c_str()) != 0) return Fail(win32::ErrorFromErrno(errno));
    SetLastError(ERROR_SUCCESS);
    return TRUE;
  } catch (...) {  // only allocation throws here
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}
