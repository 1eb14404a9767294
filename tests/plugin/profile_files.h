// Real profiles copied into a private folder for tests that open, edit and save them,
// with the colour directory pointed into that folder too.
#ifndef TINTWELL_TESTS_PROFILE_FILES_H
#define TINTWELL_TESTS_PROFILE_FILES_H

#include <dirent.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <climits>
#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <vector>

class ProfileFiles {
 public:
  ProfileFiles() {
    char pattern[] = "/tmp/tw-profiles-XXXXXX";
    if (!mkdtemp(pattern)) ADD_FAILURE() << "mkdtemp";
    root_ = pattern;
    colorDir_ = root_ + "/colordir";
    setenv("TINTWELL_COLOR_DIR", colorDir_.c_str(), 1);
  }
  ~ProfileFiles() { std::system(("rm -rf '" + root_ + "'").c_str()); }

  // Copies a profile from the system's colour folder to name in the private folder.
  std::string Copy(const std::string& systemRelative, const std::string& name) {
    const std::string to = root_ + "/" + name;
    Write(to, Read(std::string(TINTWELL_ICC_DIR) + "/" + systemRelative));
    return to;
  }
  std::string Path(const std::string& name) const { return root_ + "/" + name; }
  const std::string& colorDir() const { return colorDir_; }

  static std::vector<char> Read(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return std::vector<char>(std::istreambuf_iterator<char>(in), {});
  }
  static void Write(const std::string& path, const std::vector<char>& bytes) {
    std::ofstream out(path, std::ios::binary);
    out.write(bytes.data(), static_cast<std::streamsize>(bytes.size()));
  }
  static bool Exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }
  // The names in a folder but "." and "..".
  static std::set<std::string> Listing(const std::string& folder) {
    std::set<std::string> names;
    if (DIR* dir = opendir(folder.c_str())) {
      while (const dirent* e = readdir(dir))
        if (std::string(e->d_name) != "." && std::string(e->d_name) != "..") names.insert(e->d_name);
      closedir(dir);
    }
    return names;
  }

  // The plugin's temporary folder: "temp" beside the running executable.
  static std::string PluginTempFolder() { return FolderOfExecutable() + "/temp/"; }

  // The numbered folder of the temporary folder where the plugin loaded by this process
  // keeps its working copies: the one whose lock this process holds open.
  static std::string PluginWorkingFolder() {
    const std::string temp = PluginTempFolder();
    std::string found;
    DIR* fds = opendir("/proc/self/fd");
    if (!fds) return found;
    while (const dirent* e = readdir(fds)) {
      char target[PATH_MAX];
      const ssize_t n = readlink(("/proc/self/fd/" + std::string(e->d_name)).c_str(), target, sizeof target - 1);
      if (n <= 0) continue;
      const std::string path(target, static_cast<size_t>(n));
      const std::string suffix = "/lock";
      if (path.compare(0, temp.size(), temp) == 0 && path.size() > suffix.size() &&
          path.compare(path.size() - suffix.size(), suffix.size(), suffix) == 0)
        found = path.substr(0, path.size() - suffix.size() + 1);
    }
    closedir(fds);
    return found;
  }

 private:
  static std::string FolderOfExecutable() {
    char exe[PATH_MAX];
    const ssize_t n = readlink("/proc/self/exe", exe, sizeof exe - 1);
    std::string dir(exe, n > 0 ? static_cast<size_t>(n) : 0);
    return dir.substr(0, dir.rfind('/'));
  }

  std::string root_;
  std::string colorDir_;
};

#endif
