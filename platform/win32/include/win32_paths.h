// Linux-only part of the Win32 stand-in: the one place where Windows paths meet POSIX
// paths. Drive Z: is the POSIX root, as under Wine: "Z:\tmp\a.icc" is "/tmp/a.icc".
#ifndef TINTWELL_WIN32_PATHS_H
#define TINTWELL_WIN32_PATHS_H

#include <optional>
#include <string>

namespace win32 {

// The POSIX path of a Windows path on drive Z: (either slash accepted, drive letter in
// either case), or nothing for any other drive, a relative path or an empty text.
std::optional<std::string> PosixPathFromWindows(const std::string& windowsPath);

// The Windows path of an absolute POSIX path ("/tmp/a.icc" -> "Z:\tmp\a.icc").
// A relative path is made absolute against the working directory first.
std::string WindowsPathFromPosix(const std::string& posixPath);

// As WindowsPathFromPosix, or nothing for a path that drive Z: cannot spell: a backslash
// in a POSIX name would map back to a folder separator, naming another file.
std::optional<std::string> ExactWindowsPathFromPosix(const std::string& posixPath);

}  // namespace win32

#endif
