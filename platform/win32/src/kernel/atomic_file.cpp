#include "kernel/atomic_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <vector>

#include "kernel/errno_map.h"

namespace win32 {

DWORD WriteFileAtomically(const std::string& posixPath, const void* data, std::size_t size) {
  std::string temp = posixPath + ".XXXXXX";
  std::vector<char> name(temp.begin(), temp.end());
  name.push_back('\0');
  const int fd = mkstemp(name.data());
  if (fd < 0) return errno == ENOENT ? ERROR_PATH_NOT_FOUND : ErrorFromErrno(errno);

  const char* p = static_cast<const char*>(data);
  std::size_t left = size;
  int err = 0;
  while (left > 0) {
    const ssize_t n = write(fd, p, left);
    if (n < 0) {
      if (errno == EINTR) continue;
      err = errno;
      break;
    }
    p += n;
    left -= static_cast<std::size_t>(n);
  }
  if (err == 0 && fsync(fd) != 0) err = errno;
  // A replaced file keeps its permissions; a new one is readable by all.
  struct stat existing;
  mode_t mode = 0644;
  if (stat(posixPath.c_str(), &existing) == 0) mode = existing.st_mode & 07777;
  if (err == 0 && fchmod(fd, mode) != 0) err = errno;
  if (close(fd) != 0 && err == 0) err = errno;
  if (err == 0 && rename(name.data(), posixPath.c_str()) != 0) err = errno;
  if (err != 0) {
    unlink(name.data());
    return ErrorFromErrno(err);
  }
  return ERROR_SUCCESS;
}

}  // namespace win32
