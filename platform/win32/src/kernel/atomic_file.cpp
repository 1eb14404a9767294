#include "kernel/atomic_file.h"

#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <stdio.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string>

#include "kernel/errno_map.h"
#include "kernel/file_paths.h"

namespace win32 {

namespace {

constexpr int kMaxLinkHops = 40;  // as the kernel's own limit for one lookup

std::string FolderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

// Staged files are named ".tw-save-<pid>-<suffix>", so that one left by a program that
// was killed at the wrong instant can be told from one still being written.
const char* StagedPrefix() { return ".tw-save-"; }

// Removes the staged files in folder whose programs have ended. Run after each publish,
// so a folder written to again never keeps such a leftover for long.
void RemoveStaleStagedFiles(const std::string& folder) {
  DIR* dir = opendir(folder.c_str());
  if (!dir) return;
  const std::size_t prefix = std::strlen(StagedPrefix());
  while (const dirent* e = readdir(dir)) {
    if (std::strncmp(e->d_name, StagedPrefix(), prefix) != 0) continue;
    char* end = nullptr;
    const long pid = std::strtol(e->d_name + prefix, &end, 10);
    if (end == e->d_name + prefix || *end != '-' || pid <= 0 || pid == getpid()) continue;
    if (kill(static_cast<pid_t>(pid), 0) == 0 || errno != ESRCH) continue;  // alive, or not ours to judge
    unlinkat(dirfd(dir), e->d_name, 0);
  }
  closedir(dir);
}

// A staged file in the destination's folder, removed unless published. An unnamed
// (O_TMPFILE) file is preferred: killed mid-write, it leaves nothing behind; it is
// given a name only for the instant between linking and renaming.
class StagedFile {
 public:
  explicit StagedFile(const std::string& folder) : folder_(folder) {
    fd_ = open(folder.c_str(), O_TMPFILE | O_WRONLY | O_CLOEXEC, 0600);
    if (fd_ >= 0) return;
    if (errno != EOPNOTSUPP && errno != EISDIR && errno != EINVAL) {
      error_ = errno;
      return;
    }
    name_ = folder + "/" + StagedPrefix() + std::to_string(getpid()) + "-XXXXXX";
    fd_ = mkostemp(name_.data(), O_CLOEXEC);
    if (fd_ < 0) {
      error_ = errno;
      name_.clear();
    }
  }
  StagedFile(const StagedFile&) = delete;
  StagedFile& operator=(const StagedFile&) = delete;
  ~StagedFile() {
    if (fd_ >= 0) close(fd_);
    if (!name_.empty()) unlink(name_.c_str());
  }

  int fd() const { return fd_; }
  int error() const { return error_; }

  // Closes the file and moves it onto target; returns 0 or an errno value.
  int Publish(const std::string& target, bool keepExisting) {
    if (name_.empty() && (error_ = Link()) != 0) return error_;
    const int closed = close(fd_) == 0 ? 0 : errno;
    fd_ = -1;
    if (closed != 0) return closed;
    const int moved = Move(target, keepExisting);
    if (moved == 0) name_.clear();
    return moved;
  }

 private:
  // Names an unnamed file under a fresh hidden name.
  int Link() {
    static std::atomic<unsigned> counter{0};
    const std::string self = "/proc/self/fd/" + std::to_string(fd_);
    for (int attempt = 0; attempt < 100; ++attempt) {
      std::string name = folder_ + "/" + StagedPrefix() + std::to_string(getpid()) + "-" + std::to_string(counter++);
      if (linkat(AT_FDCWD, self.c_str(), AT_FDCWD, name.c_str(), AT_SYMLINK_FOLLOW) == 0) {
        name_ = std::move(name);
        return 0;
      }
      if (errno != EEXIST) return errno;
    }
    return EEXIST;
  }

  int Move(const std::string& target, bool keepExisting) {
    if (!keepExisting) return rename(name_.c_str(), target.c_str()) == 0 ? 0 : errno;
    if (renameat2(AT_FDCWD, name_.c_str(), AT_FDCWD, target.c_str(), RENAME_NOREPLACE) == 0) return 0;
    if (errno != EINVAL && errno != ENOSYS) return errno;
    // File systems without the flag: a hard link fails rather than replace.
    if (link(name_.c_str(), target.c_str()) != 0) return errno;
    unlink(name_.c_str());
    return 0;
  }

  std::string folder_;
  std::string name_;  // empty while the file has no name
  int fd_ = -1;
  int error_ = 0;
};

}  // namespace

int WriteAll(int fd, const void* data, std::size_t size) {
  const char* p = static_cast<const char*>(data);
  while (size > 0) {
    const ssize_t n = write(fd, p, size);
    if (n < 0) {
      if (errno == EINTR) continue;
      return errno;
    }
    p += n;
    size -= static_cast<std::size_t>(n);
  }
  return 0;
}

DWORD ResolveWriteTarget(const std::string& posixPath, std::string* target) {
  std::string path = posixPath;
  for (int hop = 0; hop <= kMaxLinkHops; ++hop) {
    struct stat st;
    if (lstat(path.c_str(), &st) != 0 || !S_ISLNK(st.st_mode)) {
      *target = path;
      return ERROR_SUCCESS;
    }
    std::string link(static_cast<std::size_t>(st.st_size > 0 ? st.st_size : 255) + 1, '\0');
    const ssize_t n = readlink(path.c_str(), link.data(), link.size());
    if (n < 0) return FileErrorFromErrno(errno, path);
    if (static_cast<std::size_t>(n) >= link.size()) continue;  // grew since the lstat: read again
    link.resize(static_cast<std::size_t>(n));
    path = link[0] == '/' ? link : FolderOf(path) + "/" + link;
  }
  return ERROR_CANT_RESOLVE_FILENAME;
}

DWORD ReplaceFileWith(const std::string& posixPath, const std::function<int(int fd)>& fill,
                      const ReplaceOptions& options) {
  std::string target;
  if (const DWORD err = ResolveWriteTarget(posixPath, &target)) return err;
  struct stat existing;
  mode_t mode = options.mode;
  if (stat(target.c_str(), &existing) == 0) {
    if (options.keepExisting) return ERROR_FILE_EXISTS;
    // A device, pipe or folder is never replaced by a file.
    if (!S_ISREG(existing.st_mode)) return ERROR_ACCESS_DENIED;
    if (options.keepTargetMode) mode = existing.st_mode & 07777;
  } else if (errno != ENOENT) {
    return FileErrorFromErrno(errno, target);
  }

  StagedFile staged(FolderOf(target));
  if (staged.fd() < 0) return FileErrorFromErrno(staged.error(), target);
  int err = fill(staged.fd());
  if (err == 0 && fsync(staged.fd()) != 0) err = errno;
  if (err == 0 && fchmod(staged.fd(), mode) != 0) err = errno;
  if (err == 0) err = staged.Publish(target, options.keepExisting);
  if (err == 0) RemoveStaleStagedFiles(FolderOf(target));
  if (err == EEXIST && options.keepExisting) return ERROR_FILE_EXISTS;
  return err == 0 ? ERROR_SUCCESS : FileErrorFromErrno(err, target);
}

DWORD WriteFileAtomically(const std::string& posixPath, const void* data, std::size_t size) {
  return ReplaceFileWith(posixPath, [&](int fd) { return WriteAll(fd, data, size); });
}

}  // namespace win32
