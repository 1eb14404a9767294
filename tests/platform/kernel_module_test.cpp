// Conformance of the kernel calls used at start-up: the Z: mapping, GetModuleFileNameA,
// CreateDirectoryA and the per-thread last error.
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>

#include "win32_paths.h"
#include "windows.h"

namespace {

constexpr DWORD kSentinel = 0xDEADBEEF;

TEST(Paths, DriveZIsThePosixRoot) {
  EXPECT_EQ(win32::PosixPathFromWindows("Z:\\tmp\\a.icc"), "/tmp/a.icc");
  EXPECT_EQ(win32::PosixPathFromWindows("z:/tmp/a.icc"), "/tmp/a.icc");
  EXPECT_EQ(win32::PosixPathFromWindows("Z:\\"), "/");
  EXPECT_FALSE(win32::PosixPathFromWindows("C:\\tmp\\a.icc"));
  EXPECT_FALSE(win32::PosixPathFromWindows("tmp\\a.icc"));
  EXPECT_FALSE(win32::PosixPathFromWindows("Z:"));
  EXPECT_FALSE(win32::PosixPathFromWindows(""));
  EXPECT_EQ(win32::WindowsPathFromPosix("/tmp/a b/c.icc"), "Z:\\tmp\\a b\\c.icc");
}

TEST(Paths, RelativePosixPathsAreMadeAbsolute) {
  const std::string windows = win32::WindowsPathFromPosix("x.icc");
  ASSERT_EQ(windows.rfind("Z:\\", 0), 0u);
  EXPECT_EQ(windows.substr(windows.size() - 6), "\\x.icc");
}

TEST(GetModuleFileNameA, NamesTheRunningExecutable) {
  char buffer[MAX_PATH * 4];
  SetLastError(kSentinel);
  const DWORD n = GetModuleFileNameA(nullptr, buffer, sizeof buffer);
  ASSERT_GT(n, 3u);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  EXPECT_EQ(std::strlen(buffer), n);
  EXPECT_EQ(std::string(buffer, 3), "Z:\\");
  const std::string name(buffer);
  EXPECT_EQ(name.substr(name.rfind('\\') + 1), "platform_tests");
}

TEST(GetModuleFileNameA, TruncatesToTheBufferAndTerminates) {
  char full[MAX_PATH * 4];
  const DWORD n = GetModuleFileNameA(nullptr, full, sizeof full);
  char small[8];
  std::memset(small, 'x', sizeof small);
  SetLastError(kSentinel);
  EXPECT_EQ(GetModuleFileNameA(nullptr, small, sizeof small), sizeof small);
  EXPECT_EQ(GetLastError(), ERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(small[7], '\0');
  EXPECT_EQ(std::string(small), std::string(full, 7));
  // Exactly the length: no room for the terminator, so it is truncated too.
  std::string exact(n, 'x');
  SetLastError(kSentinel);
  EXPECT_EQ(GetModuleFileNameA(nullptr, exact.data(), n), n);
  EXPECT_EQ(GetLastError(), ERROR_INSUFFICIENT_BUFFER);
}

TEST(GetModuleFileNameA, RefusesZeroSizeAndUnknownModules) {
  char buffer[16] = "untouched";
  SetLastError(kSentinel);
  EXPECT_EQ(GetModuleFileNameA(nullptr, buffer, 0), 0u);
  EXPECT_EQ(GetLastError(), ERROR_INSUFFICIENT_BUFFER);
  EXPECT_STREQ(buffer, "untouched");
  SetLastError(kSentinel);
  EXPECT_EQ(GetModuleFileNameA(reinterpret_cast<HMODULE>(0x1234), buffer, sizeof buffer), 0u);
  EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  EXPECT_STREQ(buffer, "untouched");
}

class CreateDirectoryATest : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/tw-kernel-XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    root_ = pattern;
  }
  void TearDown() override { std::system(("rm -rf '" + root_ + "'").c_str()); }
  std::string Win(const std::string& rel) { return win32::WindowsPathFromPosix(root_ + rel); }
  std::string root_;
};

TEST_F(CreateDirectoryATest, CreatesTheLastComponentOnly) {
  SetLastError(kSentinel);
  EXPECT_TRUE(CreateDirectoryA(Win("/a").c_str(), nullptr));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  struct stat st;
  ASSERT_EQ(stat((root_ + "/a").c_str(), &st), 0);
  EXPECT_TRUE(S_ISDIR(st.st_mode));

  SetLastError(kSentinel);
  EXPECT_FALSE(CreateDirectoryA(Win("/a").c_str(), nullptr));
  EXPECT_EQ(GetLastError(), ERROR_ALREADY_EXISTS);

  SetLastError(kSentinel);
  EXPECT_FALSE(CreateDirectoryA(Win("/missing/b").c_str(), nullptr));
  EXPECT_EQ(GetLastError(), ERROR_PATH_NOT_FOUND);

  SetLastError(kSentinel);
  EXPECT_TRUE(CreateDirectoryA((Win("/a") + "\\b\\").c_str(), nullptr));  // trailing backslash
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
}

TEST_F(CreateDirectoryATest, RefusesOtherDrivesNullAndOverlongPaths) {
  SetLastError(kSentinel);
  EXPECT_FALSE(CreateDirectoryA("C:\\temp", nullptr));
  EXPECT_EQ(GetLastError(), ERROR_PATH_NOT_FOUND);
  SetLastError(kSentinel);
  EXPECT_FALSE(CreateDirectoryA(nullptr, nullptr));
  EXPECT_EQ(GetLastError(), ERROR_PATH_NOT_FOUND);
  SetLastError(kSentinel);
  EXPECT_FALSE(CreateDirectoryA(Win("/" + std::string(300, 'd')).c_str(), nullptr));
  EXPECT_EQ(GetLastError(), ERROR_FILENAME_EXCED_RANGE);
}

TEST(LastError, IsPerThread) {
  SetLastError(42);
  DWORD seen = kSentinel;
  std::thread([&] {
    seen = GetLastError();
    SetLastError(7);
  }).join();
  EXPECT_EQ(seen, ERROR_SUCCESS);
  EXPECT_EQ(GetLastError(), 42u);
}

}  // namespace
