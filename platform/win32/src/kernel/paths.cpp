#include "win32_paths.h"

#include <unistd.h>

#include <cctype>
#include <climits>

namespace win32 {

namespace {

std::string Absolute(const std::string& posixPath) {
  if (!posixPath.empty() && posixPath[0] == '/') return posixPath;
  char cwd[PATH_MAX];
  std::string base = getcwd(cwd, sizeof cwd) ? cwd : "/";
  if (base.back() != '/') base += '/';
  return base + posixPath;
}

std::string OnDriveZ(const std::string& absolute) {
  std::string windows = "Z:" + absolute;
  for (char& c : windows)
    if (c == '/') c = '\\';
  return windows;
}

}  // namespace

std::optional<std::string> PosixPathFromWindows(const std::string& windowsPath) {
  if (windowsPath.size() < 3) return std::nullopt;
  if (std::toupper(static_cast<unsigned char>(windowsPath[0])) != 'Z' || windowsPath[1] != ':')
    return std::nullopt;
  if (windowsPath[2] != '\\' && windowsPath[2] != '/') return std::nullopt;
  std::string posix = windowsPath.substr(2);
  for (char& c : posix)
    if (c == '\\') c = '/';
  return posix;
}

std::string WindowsPathFromPosix(const std::string& posixPath) { return OnDriveZ(Absolute(posixPath)); }

std::optional<std::string> ExactWindowsPathFromPosix(const std::string& posixPath) {
  const std::string absolute = Absolute(posixPath);
  if (absolute.find('\\') != std::string::npos) return std::nullopt;
  return OnDriveZ(absolute);
}

}  // namespace win32
