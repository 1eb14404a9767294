// The kernel calls used at start-up: the Z: mapping, GetModuleFileNameA,
// CreateDirectoryA, the per-thread last error, GlobalAlloc and GlobalFree.
#include <sys/stat.h>

#include <cstring>
#include <thread>

#include "icc_test_support.h"

namespace {

using icctest::kSentinel;

TEST(Paths, DriveZIsThePosixRoot) {
  EXPECT_EQ(win32::PosixPathFromWindows("Z:\\tmp\\a.icc"), "/tmp/a.icc");
  EXPECT_EQ(win32::PosixPathFromWindows("z:/tmp/a.icc"), "/tmp/a.icc");
  EXPECT_EQ(win32::PosixPathFromWindows("Z:\\"), "/");
  for (const char* bad : {"C:\\tmp\\a.icc", "tmp\\a.icc", "Z:", ""}) EXPECT_FALSE(win32::PosixPathFromWindows(bad));
  EXPECT_EQ(win32::WindowsPathFromPosix("/tmp/a b/c.icc"), "Z:\\tmp\\a b\\c.icc");
  // A backslash in a POSIX name would come back as a separator, naming another file.
  EXPECT_EQ(win32::ExactWindowsPathFromPosix("/tmp/a:b.icc"), "Z:\\tmp\\a:b.icc");
  EXPECT_FALSE(win32::ExactWindowsPathFromPosix("/tmp/a\\b.icc"));
  const std::string relative = win32::WindowsPathFromPosix("x.icc");  // made absolute
  EXPECT_EQ(relative.rfind("Z:\\", 0), 0u);
  EXPECT_EQ(relative.substr(relative.size() - 6), "\\x.icc");
}

TEST(GetModuleFileNameA, NamesTheExecutableAndTruncatesToTheBuffer) {
  char full[MAX_PATH * 4];
  SetLastError(kSentinel);
  const DWORD n = GetModuleFileNameA(nullptr, full, sizeof full);
  ASSERT_GT(n, 3u);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  EXPECT_EQ(std::strlen(full), n);
  const std::string name(full);
  EXPECT_EQ(name.substr(0, 3), "Z:\\");
  EXPECT_EQ(name.substr(name.rfind('\\') + 1), "platform_tests");
  char small[8];
  std::memset(small, 'x', sizeof small);
  EXPECT_WIN32(GetModuleFileNameA(nullptr, small, sizeof small), sizeof small, ERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(std::string(small), name.substr(0, 7));  // terminated within the buffer
  std::string exact(n, 'x');  // no room for the terminator
  EXPECT_WIN32(GetModuleFileNameA(nullptr, exact.data(), n), n, ERROR_INSUFFICIENT_BUFFER);
  char untouched[16] = "untouched";
  EXPECT_WIN32(GetModuleFileNameA(nullptr, untouched, 0), 0u, ERROR_INSUFFICIENT_BUFFER);
  EXPECT_WIN32(GetModuleFileNameA(reinterpret_cast<HMODULE>(0x1234), untouched, 16), 0u, ERROR_INVALID_HANDLE);
  EXPECT_STREQ(untouched, "untouched");
}

using CreateDirectoryATest = icctest::TempFolderTest;

TEST_F(CreateDirectoryATest, CreatesTheLastComponentOnly) {
  EXPECT_WIN32(CreateDirectoryA(Win("a").c_str(), nullptr), TRUE, ERROR_SUCCESS);
  struct stat st;
  ASSERT_EQ(stat(Posix("a").c_str(), &st), 0);
  EXPECT_TRUE(S_ISDIR(st.st_mode));
  EXPECT_WIN32(CreateDirectoryA(Win("a").c_str(), nullptr), FALSE, ERROR_ALREADY_EXISTS);
  EXPECT_WIN32(CreateDirectoryA(Win("missing/b").c_str(), nullptr), FALSE, ERROR_PATH_NOT_FOUND);
  EXPECT_WIN32(CreateDirectoryA((Win("a") + "\\b\\").c_str(), nullptr), TRUE, ERROR_SUCCESS);
  EXPECT_WIN32(CreateDirectoryA("C:\\temp", nullptr), FALSE, ERROR_PATH_NOT_FOUND);
  EXPECT_WIN32(CreateDirectoryA(nullptr, nullptr), FALSE, ERROR_PATH_NOT_FOUND);
  EXPECT_WIN32(CreateDirectoryA(Win(std::string(300, 'd')).c_str(), nullptr), FALSE, ERROR_FILENAME_EXCED_RANGE);
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

TEST(GlobalAlloc, RefusesMoveableUnknownFlagsAndAbsurdSizes) {
  const std::tuple<UINT, SIZE_T, DWORD> cases[] = {
      {GMEM_MOVEABLE, 16, ERROR_NOT_SUPPORTED},    {GMEM_MOVEABLE | GMEM_ZEROINIT, 16, ERROR_NOT_SUPPORTED},
      {0x8000, 16, ERROR_INVALID_PARAMETER},       {GMEM_MODIFY, 16, ERROR_INVALID_PARAMETER},
      {GPTR, ~SIZE_T{0}, ERROR_NOT_ENOUGH_MEMORY}, {GMEM_FIXED, ~SIZE_T{0} / 2, ERROR_NOT_ENOUGH_MEMORY},
  };
  for (const auto& [flags, bytes, error] : cases) EXPECT_WIN32(GlobalAlloc(flags, bytes), nullptr, error);
}

TEST(GlobalAlloc, GivesAlignedWritableBlocksZeroedOnRequestAndFreesOnlyLiveOnes) {
  for (UINT flags : {UINT{GMEM_FIXED}, UINT{GPTR}, UINT{GMEM_FIXED | GMEM_NODISCARD | GMEM_SHARE}}) {
    for (SIZE_T bytes : {SIZE_T{0}, SIZE_T{13}, SIZE_T{4096}}) {
      SetLastError(kSentinel);
      auto* p = static_cast<unsigned char*>(GlobalAlloc(flags, bytes));
      ASSERT_NE(p, nullptr);
      EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
      EXPECT_EQ(reinterpret_cast<std::uintptr_t>(p) % 8, 0u);
      for (SIZE_T i = 0; (flags & GMEM_ZEROINIT) && i < bytes; ++i) ASSERT_EQ(p[i], 0) << i;
      std::memset(p, 0xA5, bytes);
      EXPECT_WIN32(GlobalFree(p), nullptr, ERROR_SUCCESS);
      EXPECT_WIN32(GlobalFree(p), p, ERROR_INVALID_HANDLE);  // freed: no longer a live block
    }
  }
  int on_stack = 0;
  EXPECT_WIN32(GlobalFree(&on_stack), &on_stack, ERROR_INVALID_HANDLE);
  EXPECT_WIN32(GlobalFree(nullptr), nullptr, ERROR_SUCCESS);
}

}  // namespace
