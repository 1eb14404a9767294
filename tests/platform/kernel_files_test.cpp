// The kernel file calls: the FindFirstFileA name matcher, CopyFileA, DeleteFileA, MoveFileExA,
// the FindFile family and CreateFileA/ReadFile/WriteFile/CloseHandle, each in a fresh folder.
#include <dirent.h>
#include <fcntl.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <map>
#include <set>

#include "icc_test_support.h"
#include "kernel/wildcard.h"

namespace {

using icctest::kSentinel;
using Names = std::set<std::string>;
constexpr time_t kY2k = 946684800;  // 2000-01-01 00:00 UTC, FILETIME 0x01BF53EB256D4000

const char* const kNames[] = {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic",  ".icc",
                              "x.y.icm", "d.ic.bak", "icc", "f.txt", "g",  "x.pf"};
const Names kIcc = {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic", ".icc", "x.y.icm"};

TEST(FileWildcard, MatchesExactlyTheExpectedNames) {
  const Names all(std::begin(kNames), std::end(kNames));
  const std::pair<const char*, Names> cases[] = {
      {"*.ic*", kIcc}, {"*.IC*", kIcc}, {"*.*", all}, {"*", all},
      // "?" may match nothing at a dot or at the end.
      {"?.ic?", {"a.icc", "B.ICM", "h.iCc", "e.icx", "c.ic", ".icc"}}, {"??", {"g"}},
      {"*.", {"icc", "g"}},  // names without a dot
      {"a*.*", {"a.icc"}}, {"A*.*", {"a.icc"}},
      // The "*" before a dot stops at the last dot only; a plain "*" runs over dots.
      {"*.ic", {"c.ic"}}, {"*.bak", {"d.ic.bak"}}, {"*.icm", {"B.ICM", "x.y.icm"}},
      {"*.icc", {"a.icc", "h.iCc", ".icc"}}, {"*c", {"a.icc", "h.iCc", "c.ic", ".icc", "icc"}},
      // ".*" also matches the end of a name without a dot.
      {"g.*", {"g"}}, {"x.*", {"x.y.icm", "x.pf"}}, {"g.", {"g"}}, {"D.IC.BAK", {"d.ic.bak"}}, {"", {}},
  };
  for (const auto& [pattern, matches] : cases)
    for (const std::string name : kNames)
      EXPECT_EQ(win32::MatchesFileWildcard(pattern, name), matches.count(name) == 1) << pattern << " " << name;
}

class FileTest : public icctest::TempFolderTest {
 protected:
  void SetUp() override {
    TempFolderTest::SetUp();
    Put("ro", "read-only");
    chmod(Posix("ro").c_str(), 0444);
    mkdir(Posix("dir").c_str(), 0777);
  }
  void SetTimes(const std::string& name) const {
    const struct timespec times[2] = {{kY2k, 0}, {kY2k, 0}};
    utimensat(AT_FDCWD, Posix(name).c_str(), times, 0);
  }
  Names Listing() const {
    Names names;
    DIR* dir = opendir(root_.c_str());
    while (const dirent* e = readdir(dir))
      if (std::strcmp(e->d_name, ".") != 0 && std::strcmp(e->d_name, "..") != 0) names.insert(e->d_name);
    closedir(dir);
    return names;
  }
  struct stat Lstat(const std::string& name) const {
    struct stat st{};
    EXPECT_EQ(lstat(Posix(name).c_str(), &st), 0) << name;
    return st;
  }
  HANDLE Open(const std::string& name, DWORD access, DWORD share = FILE_SHARE_READ | FILE_SHARE_WRITE,
              DWORD disposition = OPEN_EXISTING) const {
    return CreateFileA(Win(name).c_str(), access, share, nullptr, disposition, 0, nullptr);
  }
  // A Windows path of more than MAX_PATH characters inside the folder.
  std::string TooLong() const { return Win(std::string(120, 'x') + "/" + std::string(200, 'y')); }
};

using CopyFileATest = FileTest;
using CreateFileATest = FileTest;
using MoveFileExATest = FileTest;

TEST_F(CopyFileATest, RefusesEachFailureWithItsCode) {
  Put("src", "source");
  Put("dst", "old");
  ASSERT_EQ(mkfifo(Posix("fifo").c_str(), 0666), 0);
  ASSERT_EQ(symlink("loop", Posix("loop").c_str()), 0);
  const std::tuple<std::string, std::string, BOOL, DWORD> cases[] = {
      {Win("missing"), Win("new"), FALSE, ERROR_FILE_NOT_FOUND},
      {Win("nofolder/src"), Win("new"), FALSE, ERROR_PATH_NOT_FOUND},
      {Win("src"), Win("nofolder/new"), FALSE, ERROR_PATH_NOT_FOUND},
      {Win("src"), Win("dst"), TRUE, ERROR_FILE_EXISTS},
      {Win("src"), Win("src"), FALSE, ERROR_SHARING_VIOLATION},
      {Win("dir"), Win("new"), FALSE, ERROR_ACCESS_DENIED},
      {Win("src"), Win("ro"), FALSE, ERROR_ACCESS_DENIED},
      {Win("src"), Win("dir"), FALSE, ERROR_ACCESS_DENIED},
      {"C:\\src", Win("new"), FALSE, ERROR_PATH_NOT_FOUND},
      {Win("src"), TooLong(), FALSE, ERROR_FILENAME_EXCED_RANGE},
      // Only files are copied, and only onto files: a pipe would block, a device never ends.
      {Win("fifo"), Win("new"), FALSE, ERROR_ACCESS_DENIED},
      {"Z:\\dev\\zero", Win("new"), FALSE, ERROR_ACCESS_DENIED},
      {Win("src"), Win("fifo"), FALSE, ERROR_ACCESS_DENIED},
      {Win("src"), Win("loop"), FALSE, ERROR_CANT_RESOLVE_FILENAME},
  };
  for (const auto& [from, to, failIfExists, code] : cases) {
    SCOPED_TRACE(from + " -> " + to);
    EXPECT_WIN32(CopyFileA(from.c_str(), to.c_str(), failIfExists), FALSE, code);
  }
  EXPECT_WIN32(CopyFileA(nullptr, Win("new").c_str(), FALSE), FALSE, ERROR_PATH_NOT_FOUND);
  EXPECT_EQ(Get("dst"), "old");
  EXPECT_EQ(Get("ro"), "read-only");
  EXPECT_EQ(Listing(), (Names{"src", "dst", "ro", "dir", "fifo", "loop"}));
}

// A copy onto a symbolic link replaces the link's target and keeps the link; a hard link
// is replaced by a file of its own, since only a rename keeps the copy atomic.
TEST_F(CopyFileATest, WritesThroughSymbolicLinksAndReplacesHardLinks) {
  Put("src", "new");
  mkdir(Posix("dir/sub").c_str(), 0777);
  Put("dir/sub/real", "old");
  Put("shared", "old");
  ASSERT_EQ(symlink("dir/sub/real", Posix("relative").c_str()), 0);
  ASSERT_EQ(symlink(Posix("relative").c_str(), Posix("chain").c_str()), 0);
  ASSERT_EQ(symlink("made", Posix("dangling").c_str()), 0);
  ASSERT_EQ(link(Posix("shared").c_str(), Posix("hard").c_str()), 0);
  for (const char* target : {"chain", "dangling", "hard"})
    EXPECT_WIN32(CopyFileA(Win("src").c_str(), Win(target).c_str(), FALSE), TRUE, ERROR_SUCCESS);
  for (const char* link : {"relative", "chain", "dangling"}) EXPECT_TRUE(S_ISLNK(Lstat(link).st_mode)) << link;
  for (const char* name : {"dir/sub/real", "made", "hard"}) EXPECT_EQ(Get(name), "new") << name;
  EXPECT_EQ(Get("shared"), "old");
}

// A staged file is named after its program; one left by a program that has ended is
// removed by the next copy into its folder, and a live program's is kept.
TEST_F(CopyFileATest, NeverLeavesAStagedFileBesideAndRemovesThoseOfEndedPrograms) {
  const pid_t child = fork();
  if (child == 0) _exit(0);
  waitpid(child, nullptr, 0);
  const std::string ended = ".tw-save-" + std::to_string(child) + "-a";
  const std::string mine = ".tw-save-" + std::to_string(getpid()) + "-b";
  for (const std::string& name : {ended, mine, std::string(".tw-save-1-c"), std::string(".tw-other")}) Put(name, "x");
  Put("src", std::string(100000, 's'));
  for (int i = 0; i < 3; ++i) EXPECT_TRUE(CopyFileA(Win("src").c_str(), Win("dst").c_str(), FALSE));
  EXPECT_EQ(Listing(), (Names{"src", "dst", "ro", "dir", mine, ".tw-save-1-c", ".tw-other"}));
}

TEST_F(CopyFileATest, CopiesContentTimeAndReadOnlyBitAndReplacesWhole) {
  std::string big(3 * 65536 + 17, '\0');
  for (std::size_t i = 0; i < big.size(); ++i) big[i] = static_cast<char>(i * 7 + i / 251);
  Put("big", big);
  SetTimes("big");
  chmod(Posix("big").c_str(), 0444);
  Put("dst", "an older and longer content");
  EXPECT_WIN32(CopyFileA(Win("big").c_str(), Win("copy").c_str(), TRUE), TRUE, ERROR_SUCCESS);
  EXPECT_WIN32(CopyFileA(Win("big").c_str(), Win("dst").c_str(), FALSE), TRUE, ERROR_SUCCESS);
  for (const char* name : {"copy", "dst"}) {
    EXPECT_EQ(Get(name), big) << name;
    EXPECT_EQ(Lstat(name).st_mtime, kY2k);
    EXPECT_EQ(Lstat(name).st_mode & S_IWUSR, 0u);
  }
  EXPECT_EQ(Listing(), (Names{"big", "copy", "dst", "ro", "dir"}));
}

TEST_F(CopyFileATest, AFailedCopyLeavesTheDestinationAndNoTemporaryFile) {
  Put("src", std::string(200000, 's'));
  Put("dst", "intact");
  auto copyOnAFullDisk = [&] {  // in a child process: writes beyond 64 KiB fail
    signal(SIGXFSZ, SIG_IGN);
    struct rlimit limit{65536, 65536};
    setrlimit(RLIMIT_FSIZE, &limit);
    SetLastError(kSentinel);
    const BOOL ok = CopyFileA(Win("src").c_str(), Win("dst").c_str(), FALSE);
    _exit(!ok && GetLastError() != ERROR_SUCCESS && GetLastError() != kSentinel ? 0 : 1);
  };
  EXPECT_EXIT(copyOnAFullDisk(), ::testing::ExitedWithCode(0), "");
  EXPECT_EQ(Get("dst"), "intact");
  EXPECT_EQ(Listing(), (Names{"src", "dst", "ro", "dir"}));
}

TEST_F(FileTest, DeleteFileADeletesFilesOnly) {
  const std::pair<std::string, DWORD> cases[] = {
      {Win("missing"), ERROR_FILE_NOT_FOUND}, {Win("nofolder/a"), ERROR_PATH_NOT_FOUND},
      {Win("dir"), ERROR_ACCESS_DENIED},      {Win("ro"), ERROR_ACCESS_DENIED},
      {"C:\\a.icc", ERROR_PATH_NOT_FOUND},     {"", ERROR_PATH_NOT_FOUND},
      {TooLong(), ERROR_FILENAME_EXCED_RANGE},
  };
  for (const auto& [path, code] : cases) EXPECT_WIN32(DeleteFileA(path.c_str()), FALSE, code);
  Put("a.icc", "x");
  EXPECT_WIN32(DeleteFileA(Win("a.icc").c_str()), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(Listing(), (Names{"ro", "dir"}));
}

TEST_F(FileTest, RemoveDirectoryAndSetFileAttributes) {
  Put("dir/f", "x");
  mkdir(Posix("empty").c_str(), 0777);
  const std::pair<std::string, DWORD> removals[] = {
      {Win("dir"), ERROR_DIR_NOT_EMPTY}, {Win("ro"), ERROR_DIRECTORY},   {Win("missing"), ERROR_FILE_NOT_FOUND},
      {"C:\\dir", ERROR_PATH_NOT_FOUND}, {Win("empty"), ERROR_SUCCESS},
  };
  for (const auto& [path, code] : removals) EXPECT_WIN32(RemoveDirectoryA(path.c_str()), code == ERROR_SUCCESS, code);
  EXPECT_EQ(Listing(), (Names{"ro", "dir"}));
  for (auto [attributes, mode] : {std::pair{FILE_ATTRIBUTE_NORMAL, 0644u}, {FILE_ATTRIBUTE_READONLY, 0444u}}) {
    EXPECT_WIN32(SetFileAttributesA(Win("ro").c_str(), attributes), TRUE, ERROR_SUCCESS);
    EXPECT_EQ(Lstat("ro").st_mode & 0777, mode);
  }
  EXPECT_WIN32(SetFileAttributesA(Win("missing").c_str(), FILE_ATTRIBUTE_NORMAL), FALSE, ERROR_FILE_NOT_FOUND);
}

class FindFileTest : public FileTest {
 protected:
  void SetUp() override {
    FileTest::SetUp();
    for (const char* name : kNames) Put(name, name);  // each file's size is its name's length
  }
  // Every entry a search returns, by name; each must come once, then ERROR_NO_MORE_FILES.
  std::map<std::string, WIN32_FIND_DATAA> Search(const std::string& pattern) {
    std::map<std::string, WIN32_FIND_DATAA> found;
    WIN32_FIND_DATAA data;
    SetLastError(kSentinel);
    HANDLE find = FindFirstFileA(Win(pattern).c_str(), &data);
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS) << pattern;
    if (find == INVALID_HANDLE_VALUE) return found;
    do {
      EXPECT_TRUE(found.emplace(data.cFileName, data).second) << "twice: " << data.cFileName;
      SetLastError(kSentinel);
    } while (FindNextFileA(find, &data));
    EXPECT_EQ(GetLastError(), ERROR_NO_MORE_FILES);
    EXPECT_TRUE(FindClose(find));
    return found;
  }
  static Names NamesOf(const std::map<std::string, WIN32_FIND_DATAA>& found) {
    Names names;
    for (const auto& entry : found) names.insert(entry.first);
    return names;
  }
};

TEST_F(FindFileTest, ReturnsEachMatchWithItsAttributesSizesAndTimes) {
  SetTimes("B.ICM");
  // A sparse file of 5 GiB + 3 bytes needs both size words.
  ASSERT_EQ(truncate((Put("huge", ""), Posix("huge")).c_str(), (5ll << 30) + 3), 0);
  EXPECT_EQ(NamesOf(Search("*.ic*")), kIcc);
  auto found = Search("*");
  EXPECT_EQ(NamesOf(found), Listing());  // never "." or ".."
  EXPECT_EQ(found["ro"].dwFileAttributes, DWORD{FILE_ATTRIBUTE_READONLY});
  EXPECT_EQ(found["dir"].dwFileAttributes, DWORD{FILE_ATTRIBUTE_DIRECTORY});
  EXPECT_EQ(found["B.ICM"].dwFileAttributes, DWORD{FILE_ATTRIBUTE_NORMAL});
  EXPECT_EQ(found["x.y.icm"].nFileSizeLow, 7u);
  EXPECT_EQ(found["x.y.icm"].nFileSizeHigh, 0u);
  EXPECT_EQ(found["huge"].nFileSizeHigh, 1u);
  EXPECT_EQ(found["huge"].nFileSizeLow, (1u << 30) + 3);
  EXPECT_EQ(found["B.ICM"].ftLastWriteTime.dwHighDateTime, 0x01BF53EBu);
  EXPECT_EQ(found["B.ICM"].ftLastWriteTime.dwLowDateTime, 0x256D4000u);
}

TEST_F(FindFileTest, RefusesBadPatternsWithoutTouchingTheData) {
  const std::pair<std::string, DWORD> cases[] = {
      {Win("*.xyz"), ERROR_FILE_NOT_FOUND},        {Win("missing/*.icc"), ERROR_PATH_NOT_FOUND},
      {Win("g/*"), ERROR_PATH_NOT_FOUND},          {Win("dir") + "\\", ERROR_FILE_NOT_FOUND},
      {"C:\\windows\\*.icc", ERROR_PATH_NOT_FOUND}, {"*.icc", ERROR_PATH_NOT_FOUND},
      {TooLong(), ERROR_FILENAME_EXCED_RANGE},
  };
  for (const auto& [pattern, code] : cases) {
    WIN32_FIND_DATAA data;
    std::memset(&data, 0xCC, sizeof data);
    EXPECT_WIN32(FindFirstFileA(pattern.c_str(), &data), INVALID_HANDLE_VALUE, code);
    EXPECT_EQ(static_cast<unsigned char>(data.cFileName[0]), 0xCCu) << pattern;
  }
}

// A search lists the folder as it was at its start, and closes once, only by FindClose.
TEST_F(FindFileTest, ListsTheFolderAsItWasAndClosesOnlyByFindClose) {
  WIN32_FIND_DATAA data;
  HANDLE find = FindFirstFileA(Win("*.icm").c_str(), &data);
  ASSERT_NE(find, INVALID_HANDLE_VALUE);
  Put("late.icm", "x");
  Names names = {data.cFileName};
  EXPECT_WIN32(CloseHandle(find), FALSE, ERROR_INVALID_HANDLE);
  EXPECT_WIN32(FindNextFileA(find, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  while (FindNextFileA(find, &data)) names.insert(data.cFileName);  // still open
  EXPECT_EQ(names, (Names{"B.ICM", "x.y.icm"}));
  EXPECT_WIN32(FindClose(find), TRUE, ERROR_SUCCESS);
  for (HANDLE bad : {find, INVALID_HANDLE_VALUE}) {
    EXPECT_WIN32(FindClose(bad), FALSE, ERROR_INVALID_HANDLE);
    EXPECT_WIN32(FindNextFileA(bad, &data), FALSE, ERROR_INVALID_HANDLE);
  }
}

TEST_F(CreateFileATest, EachDispositionOnAMissingAndAnExistingFile) {
  // disposition, the last error on a missing and on an existing file (the call fails
  // unless it is 0 or 183), the existing file's content afterwards
  const std::tuple<DWORD, DWORD, DWORD, const char*> cases[] = {
      {CREATE_NEW, ERROR_SUCCESS, ERROR_FILE_EXISTS, "hello"},
      {CREATE_ALWAYS, ERROR_SUCCESS, ERROR_ALREADY_EXISTS, ""},
      {OPEN_EXISTING, ERROR_FILE_NOT_FOUND, ERROR_SUCCESS, "hello"},
      {OPEN_ALWAYS, ERROR_SUCCESS, ERROR_ALREADY_EXISTS, "hello"},
      {TRUNCATE_EXISTING, ERROR_FILE_NOT_FOUND, ERROR_SUCCESS, ""},
  };
  for (const auto& [disposition, onMissing, onExisting, contentAfter] : cases) {
    SCOPED_TRACE(disposition);
    for (bool exists : {false, true}) {
      if (exists) Put("f", "hello");
      const DWORD code = exists ? onExisting : onMissing;
      const bool opens = code == ERROR_SUCCESS || code == ERROR_ALREADY_EXISTS;
      SetLastError(kSentinel);
      HANDLE h = Open("f", GENERIC_READ | GENERIC_WRITE, 0, disposition);
      EXPECT_EQ(GetLastError(), code);
      EXPECT_EQ(h != INVALID_HANDLE_VALUE, opens);
      EXPECT_EQ(access(Posix("f").c_str(), F_OK) == 0, exists || opens);
      if (h != INVALID_HANDLE_VALUE) CloseHandle(h);
    }
    EXPECT_EQ(Get("f"), contentAfter);
    unlink(Posix("f").c_str());
  }
}

TEST_F(CreateFileATest, RefusesBadArgumentsFoldersAndReadOnlyFiles) {
  const std::tuple<std::string, DWORD, DWORD, DWORD> cases[] = {
      {Win("f"), GENERIC_WRITE, 0, ERROR_INVALID_PARAMETER},
      {Win("f"), GENERIC_WRITE, TRUNCATE_EXISTING + 1, ERROR_INVALID_PARAMETER},
      {Win("ro"), GENERIC_READ, TRUNCATE_EXISTING, ERROR_INVALID_PARAMETER},
      {Win("ro"), GENERIC_WRITE, OPEN_EXISTING, ERROR_ACCESS_DENIED},
      {Win("ro"), GENERIC_WRITE, CREATE_ALWAYS, ERROR_ACCESS_DENIED},
      {Win("dir"), GENERIC_WRITE, OPEN_ALWAYS, ERROR_ACCESS_DENIED},
      {Win("nofolder/f"), GENERIC_WRITE, CREATE_ALWAYS, ERROR_PATH_NOT_FOUND},
      {"C:\\f", GENERIC_WRITE, CREATE_ALWAYS, ERROR_PATH_NOT_FOUND},
      {TooLong(), GENERIC_WRITE, CREATE_ALWAYS, ERROR_FILENAME_EXCED_RANGE},
  };
  for (const auto& [path, access, disposition, code] : cases) {
    SCOPED_TRACE(path + " " + std::to_string(disposition));
    EXPECT_WIN32(CreateFileA(path.c_str(), access, 0, nullptr, disposition, 0, nullptr), INVALID_HANDLE_VALUE, code);
  }
  EXPECT_EQ(Get("ro"), "read-only");
  EXPECT_EQ(Listing(), (Names{"ro", "dir"}));
}

// Writes go from the start of the file; reads go on from the position, and a short count
// at the end is success. Each call checks its handle's access and its arguments.
TEST_F(CreateFileATest, WriteFileThenReadFileAndGetFileSizeEx) {
  Put("f", "hello, longer than what is written");
  HANDLE w = Open("f", GENERIC_WRITE), r = Open("f", GENERIC_READ);
  ASSERT_NE(r, INVALID_HANDLE_VALUE);
  const std::string content = "J" + std::string(3 << 20, 'b');
  DWORD n = kSentinel;
  OVERLAPPED overlapped = {};
  EXPECT_WIN32(WriteFile(w, "J", 1, &n, nullptr), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(n, 1u);
  EXPECT_WIN32(WriteFile(w, content.data() + 1, static_cast<DWORD>(content.size() - 1), &n, nullptr), TRUE,
               ERROR_SUCCESS);
  EXPECT_EQ(n, content.size() - 1);
  EXPECT_WIN32(WriteFile(w, "abc", 3, nullptr, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(WriteFile(w, "abc", 3, &n, &overlapped), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(WriteFile(r, "abc", 3, &n, nullptr), FALSE, ERROR_ACCESS_DENIED);

  LARGE_INTEGER size;
  size.QuadPart = -1;
  EXPECT_WIN32(GetFileSizeEx(w, &size), TRUE, ERROR_SUCCESS);  // needs no read access
  EXPECT_EQ(size.QuadPart, static_cast<LONGLONG>(content.size()));
  EXPECT_WIN32(GetFileSizeEx(r, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  std::string got(content.size() + 10, '\0');
  EXPECT_WIN32(ReadFile(r, &got[0], 1, &n, nullptr), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(n, 1u);
  EXPECT_WIN32(ReadFile(r, &got[1], static_cast<DWORD>(got.size() - 1), &n, nullptr), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(n, content.size() - 1);
  EXPECT_EQ(got.substr(0, content.size()), content);
  EXPECT_WIN32(ReadFile(r, &got[0], 4, &n, nullptr), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(n, 0u) << "at the end";
  EXPECT_WIN32(ReadFile(r, &got[0], 3, nullptr, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(ReadFile(r, &got[0], 3, &n, &overlapped), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(ReadFile(r, nullptr, 3, &n, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  n = kSentinel;
  EXPECT_WIN32(ReadFile(w, &got[0], 3, &n, nullptr), FALSE, ERROR_ACCESS_DENIED);
  EXPECT_EQ(n, 0u);
  EXPECT_WIN32(CloseHandle(r), TRUE, ERROR_SUCCESS);
  EXPECT_WIN32(CloseHandle(w), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(Get("f"), content);
  WIN32_FIND_DATAA data;
  HANDLE find = FindFirstFileA(Win("*").c_str(), &data);
  for (HANDLE bad : {w, INVALID_HANDLE_VALUE, HANDLE{nullptr}, find}) {
    EXPECT_WIN32(WriteFile(bad, "abc", 3, &n, nullptr), FALSE, ERROR_INVALID_HANDLE);
    EXPECT_WIN32(ReadFile(bad, &got[0], 3, &n, nullptr), FALSE, ERROR_INVALID_HANDLE);
    EXPECT_WIN32(GetFileSizeEx(bad, &size), FALSE, ERROR_INVALID_HANDLE);
    if (bad != find) EXPECT_WIN32(CloseHandle(bad), FALSE, ERROR_INVALID_HANDLE);
  }
  FindClose(find);
}

TEST_F(CreateFileATest, AHandleThatSharesNothingExcludesEveryOther) {
  Put("f", "x");
  const DWORD both = FILE_SHARE_READ | FILE_SHARE_WRITE;
  HANDLE shared = Open("f", GENERIC_READ);
  ASSERT_NE(shared, INVALID_HANDLE_VALUE);
  EXPECT_WIN32(Open("f", GENERIC_READ, 0), INVALID_HANDLE_VALUE, ERROR_SHARING_VIOLATION);
  EXPECT_TRUE(CloseHandle(shared));
  HANDLE exclusive = Open("f", GENERIC_READ | GENERIC_WRITE, 0);
  ASSERT_NE(exclusive, INVALID_HANDLE_VALUE);
  for (DWORD share : {DWORD{0}, both}) EXPECT_WIN32(Open("f", GENERIC_READ, share), INVALID_HANDLE_VALUE, ERROR_SHARING_VIOLATION);
  // Another process meets the same refusal, and is let in once the owner has ended.
  EXPECT_EXIT(_exit(Open("f", GENERIC_READ) == INVALID_HANDLE_VALUE && GetLastError() == ERROR_SHARING_VIOLATION ? 0 : 1),
              ::testing::ExitedWithCode(0), "");
  EXPECT_TRUE(CloseHandle(exclusive));
  HANDLE again = Open("f", GENERIC_READ, 0);
  EXPECT_NE(again, INVALID_HANDLE_VALUE);
  EXPECT_TRUE(CloseHandle(again));
}

TEST_F(MoveFileExATest, RefusesEachFailureWithItsCodeAndMovesNothing) {
  Put("src", "source");
  Put("dst", "old");
  ASSERT_EQ(mkfifo(Posix("fifo").c_str(), 0666), 0);
  const DWORD replace = MOVEFILE_REPLACE_EXISTING;
  const std::tuple<std::string, std::string, DWORD, DWORD> cases[] = {
      {Win("missing"), Win("new"), 0, ERROR_FILE_NOT_FOUND},
      {Win("missing"), Win("new"), replace, ERROR_FILE_NOT_FOUND},
      {Win("nofolder/src"), Win("new"), 0, ERROR_PATH_NOT_FOUND},
      {Win("src"), Win("nofolder/new"), replace, ERROR_PATH_NOT_FOUND},
      {Win("src"), Win("dst"), 0, ERROR_ALREADY_EXISTS},
      {Win("src"), Win("ro"), replace, ERROR_ACCESS_DENIED},
      {Win("src"), Win("dir"), replace, ERROR_ACCESS_DENIED},
      {Win("src"), Win("fifo"), replace, ERROR_ACCESS_DENIED},
      {Win("dir"), Win("dst"), replace, ERROR_ACCESS_DENIED},
      {Win("src"), Win("new"), MOVEFILE_DELAY_UNTIL_REBOOT, ERROR_INVALID_PARAMETER},
      {Win("src"), Win("new"), 0x100, ERROR_INVALID_PARAMETER},
      {"C:\\src", Win("new"), 0, ERROR_PATH_NOT_FOUND},
      {Win("src"), "C:\\new", replace, ERROR_PATH_NOT_FOUND},
      {Win("src"), TooLong(), replace, ERROR_FILENAME_EXCED_RANGE},
      {"", Win("new"), 0, ERROR_PATH_NOT_FOUND},
  };
  for (const auto& [from, to, flags, code] : cases) {
    SCOPED_TRACE(from + " -> " + to + " " + std::to_string(flags));
    EXPECT_WIN32(MoveFileExA(from.c_str(), to.c_str(), flags), FALSE, code);
  }
  EXPECT_WIN32(MoveFileExA(Win("src").c_str(), nullptr, 0), FALSE, ERROR_PATH_NOT_FOUND);
  EXPECT_EQ(Get("src"), "source");
  EXPECT_EQ(Get("dst"), "old");
  EXPECT_EQ(Get("ro"), "read-only");
  EXPECT_EQ(Listing(), (Names{"src", "dst", "ro", "dir", "fifo"}));
}

TEST_F(MoveFileExATest, RenamesReplacesWhenAskedAndMovesLinksNotTheirTargets) {
  Put("a", "first");
  Put("b", "second");
  EXPECT_WIN32(MoveFileExA(Win("a").c_str(), Win("c").c_str(), 0), TRUE, ERROR_SUCCESS);
  EXPECT_WIN32(MoveFileExA(Win("c").c_str(), Win("b").c_str(), MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH),
               TRUE, ERROR_SUCCESS);
  EXPECT_EQ(Get("b"), "first");
  // A folder moves to a free name; a file onto itself is no change.
  EXPECT_WIN32(MoveFileExA(Win("dir").c_str(), Win("moved").c_str(), 0), TRUE, ERROR_SUCCESS);
  EXPECT_WIN32(MoveFileExA(Win("b").c_str(), Win("b").c_str(), 0), TRUE, ERROR_SUCCESS);
  // A link in the way is replaced itself; its target keeps its bytes.
  Put("target", "kept");
  ASSERT_EQ(symlink(Posix("target").c_str(), Posix("link").c_str()), 0);
  EXPECT_WIN32(MoveFileExA(Win("b").c_str(), Win("link").c_str(), MOVEFILE_REPLACE_EXISTING), TRUE, ERROR_SUCCESS);
  EXPECT_TRUE(S_ISREG(Lstat("link").st_mode));
  EXPECT_EQ(Get("link"), "first");
  EXPECT_EQ(Get("target"), "kept");
  EXPECT_EQ(Listing(), (Names{"ro", "moved", "target", "link"}));
}

}  // namespace
