// Profiles on disk: write-back at close, malformed input, validity of every real
// profile, the colour directory and installing into it.
#include <lcms2.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <functional>

#include "icc_test_support.h"
#include "icm/profile_store.h"

namespace {

bool FileExists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

using namespace icctest;

class ProfileFiles : public TempFolderTest {};

TEST_F(ProfileFiles, ChangesReachTheFileAtCloseOnly) {
  // colord's sRGB stores rTRC, gTRC and bTRC once, shared by three entries.
  const Bytes original = ReadBytes(IccPath("colord/sRGB.icc"));
  const std::string path = CopyOf("colord/sRGB.icc", "edit.icc");
  HPROFILE h = OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING);
  const std::uint8_t mark[4] = {'M', 'A', 'R', 'K'};
  DWORD n = 4;
  ASSERT_TRUE(SetColorProfileElement(h, Sig("cprt"), 12, &n, const_cast<std::uint8_t*>(mark)));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("bkpt"), 20));  // a new tag
  EXPECT_EQ(ReadBytes(Posix("edit.icc")), original) << "unchanged before close";
  EXPECT_WIN32(CloseColorProfile(h), TRUE, ERROR_SUCCESS);
  // Re-parse independently: size field, alignment, order, untouched tags byte-exact.
  const Bytes saved = ReadBytes(Posix("edit.icc"));
  ASSERT_NE(saved, original);
  EXPECT_EQ(BE32(saved, 0), saved.size());
  const std::vector<TagEntry> before = TagTable(original), after = TagTable(saved);
  ASSERT_EQ(after.size(), before.size() + 1);
  EXPECT_EQ(after.back().signature, Sig("bkpt"));
  EXPECT_EQ(TagBytes(saved, after.back()), Bytes(20, 0));
  for (std::size_t i = 0; i < before.size(); ++i) {
    SCOPED_TRACE(i);
    EXPECT_EQ(after[i].signature, before[i].signature);
    EXPECT_EQ(after[i].offset % 4, 0u);
    Bytes expected = TagBytes(original, before[i]);
    if (before[i].signature == Sig("cprt")) std::memcpy(&expected[12], mark, 4);
    EXPECT_EQ(TagBytes(saved, after[i]), expected);
    for (std::size_t j = 0; j < i; ++j) {
      if (before[j].offset == before[i].offset) {
        EXPECT_EQ(after[j].offset, after[i].offset) << "kept shared";
      }
    }
  }
  // The header is kept apart from the size field.
  EXPECT_TRUE(std::equal(saved.begin() + 4, saved.begin() + 128, original.begin() + 4));
  // No temporary file is left beside it.
  const auto entries = std::distance(std::filesystem::directory_iterator(root_), {});
  EXPECT_EQ(entries, 1);
}

TEST_F(ProfileFiles, ReadOnlyAndUnchangedHandlesNeverWrite) {
  const std::string path = CopyOf("Gray.icc", "g.icc");
  // A read-only file refuses a read-write open, even to root.
  ASSERT_EQ(chmod(Posix("g.icc").c_str(), 0444), 0);
  EXPECT_WIN32(OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING), nullptr, ERROR_ACCESS_DENIED);
  ASSERT_EQ(chmod(Posix("g.icc").c_str(), 0640), 0);
  struct stat before, after;
  ASSERT_EQ(stat(Posix("g.icc").c_str(), &before), 0);
  for (DWORD access : {PROFILE_READ, PROFILE_READWRITE}) {
    HPROFILE h = OpenPath(path, access, OPEN_EXISTING);
    ASSERT_NE(h, nullptr);
    DWORD count = 0;
    ASSERT_TRUE(GetCountColorProfileElements(h, &count));
    ASSERT_TRUE(CloseColorProfile(h));
  }
  ASSERT_EQ(stat(Posix("g.icc").c_str(), &after), 0);
  EXPECT_EQ(after.st_ino, before.st_ino) << "an unchanged profile is not rewritten";

  // A changed one is rewritten with the permissions it had.
  HPROFILE h = OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING);
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  header.phModel = 7;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  ASSERT_TRUE(CloseColorProfile(h));
  ASSERT_EQ(stat(Posix("g.icc").c_str(), &after), 0);
  EXPECT_NE(after.st_ino, before.st_ino);
  EXPECT_EQ(after.st_mode & 07777, 0640u);
}

TEST(MemoryProfiles, NeverTouchTheCallersBuffer) {
  Bytes buffer = ReadBytes(IccPath("sRGB.icc"));
  const Bytes copy = buffer;
  HPROFILE h = OpenMemory(buffer);
  std::uint8_t zeros[8] = {};
  DWORD n = 8;
  ASSERT_TRUE(SetColorProfileElement(h, Sig("wtpt"), 0, &n, zeros));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("desc"), 0));
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  ASSERT_TRUE(CloseColorProfile(h));
  EXPECT_EQ(buffer, copy);
}

// What this layer saves is read by Little CMS and by Argyll's iccdump.
TEST_F(ProfileFiles, SavedProfilesOpenInOtherReaders) {
  const std::string path = CopyOf("compatibleWithAdobeRGB1998.icc", "a98.icc");
  HPROFILE h = OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING);
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("bkpt"), 0));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("cprt"), 27));  // odd size: padding follows
  ASSERT_TRUE(CloseColorProfile(h));
  const Bytes saved = ReadBytes(Posix("a98.icc"));
  cmsHPROFILE lcms = cmsOpenProfileFromMem(saved.data(), static_cast<cmsUInt32Number>(saved.size()));
  ASSERT_NE(lcms, nullptr);
  EXPECT_FALSE(cmsIsTag(lcms, cmsSigMediaBlackPointTag));
  EXPECT_NE(cmsReadTag(lcms, cmsSigRedColorantTag), nullptr);
  EXPECT_NE(cmsReadTag(lcms, cmsSigBlueTRCTag), nullptr);
  cmsCloseProfile(lcms);
  if (system("command -v iccdump >/dev/null 2>&1") != 0) GTEST_SKIP() << "iccdump is not installed";
  const std::string command = "iccdump -v 3 '" + Posix("a98.icc") + "' >/dev/null 2>&1";
  EXPECT_EQ(system(command.c_str()), 0);
}

TEST(MalformedProfiles, AreRefusedWithInvalidProfile) {
  const Bytes srgb = ReadBytes(IccPath("sRGB.icc"));
  auto withCount = [](std::uint32_t count) {
    Bytes b = MakeProfile({{Sig("wtpt"), 144, 20}}, 20);
    PutBE32(b, 128, count);
    return b;
  };
  // Table end for one entry is 144; 20 data bytes make the file 164 bytes long.
  struct Case {
    const char* what;
    Bytes bytes;
  } cases[] = {
      {"131 bytes", Bytes(srgb.begin(), srgb.begin() + 131)},
      {"no acsp", [] { Bytes b = MakeProfile({}, 0); PutBE32(b, 36, Sig("acsq")); return b; }()},
      {"tag count huge", withCount(0xFFFFFFFF)},
      {"table one entry past the data", withCount(4)},
      {"offset past the end", MakeProfile({{Sig("wtpt"), 165, 0}}, 20)},
      {"data one byte past the end", MakeProfile({{Sig("wtpt"), 144, 21}}, 20)},
      {"size wraps", MakeProfile({{Sig("wtpt"), 144, 0xFFFFFFF0}}, 20)},
      {"offset wraps", MakeProfile({{Sig("wtpt"), 0xFFFFFFF0, 0x20}}, 20)},
      {"duplicate tags", MakeProfile({{Sig("wtpt"), 156, 4}, {Sig("wtpt"), 160, 4}}, 20)},
      {"real profile cut in half", Bytes(srgb.begin(), srgb.begin() + srgb.size() / 2)},
      {"past a smaller size field", [] {
         Bytes b = MakeProfile({{Sig("wtpt"), 144, 20}}, 20);
         PutBE32(b, 0, 160);  // the profile ends before its tag does
         return b;
       }()},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_WIN32(OpenMemory(c.bytes), nullptr, ERROR_INVALID_PROFILE);
  }
  // The same limits accept a profile that just fits.
  for (const Bytes& fits : {MakeProfile({{Sig("wtpt"), 144, 20}}, 20), MakeProfile({{Sig("wtpt"), 164, 0}}, 20),
                            withCount(1)}) {
    HPROFILE h = OpenMemory(fits);
    EXPECT_NE(h, nullptr);
    if (h) CloseColorProfile(h);
  }
}

// Cutting into tag data makes the file unreadable; cutting only the final pad byte
// (sRGB.icc's last tag ends one byte before the file does) leaves a readable profile
// whose size field no longer matches, so it is not valid.
TEST_F(ProfileFiles, TruncatedFiles) {
  const Bytes srgb = ReadBytes(IccPath("sRGB.icc"));
  WriteBytes(Posix("cut.icc"), Bytes(srgb.begin(), srgb.end() - 8));
  EXPECT_WIN32(OpenPath(Win("cut.icc"), PROFILE_READ, OPEN_EXISTING), nullptr, ERROR_INVALID_PROFILE);
  WriteBytes(Posix("pad.icc"), Bytes(srgb.begin(), srgb.end() - 1));
  HPROFILE h = OpenPath(Win("pad.icc"), PROFILE_READ, OPEN_EXISTING);
  BOOL valid = TRUE;
  SetLastError(kSentinel);
  EXPECT_FALSE(IsColorProfileValid(h, &valid));
  EXPECT_FALSE(valid);
  EXPECT_EQ(GetLastError(), static_cast<DWORD>(ERROR_INVALID_PROFILE));
  CloseColorProfile(h);
}

TEST(IsColorProfileValid, EveryRealProfileIsValid) {
  std::vector<std::string> paths;
  for (const char* root : {TINTWELL_ICC_DIR, "/usr/share/color/argyll/ref"}) {
    if (!std::filesystem::is_directory(root)) continue;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
      std::string ext = entry.path().extension().string();
      for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
      if (entry.is_regular_file() && (ext == ".icc" || ext == ".icm")) paths.push_back(entry.path().string());
    }
  }
  ASSERT_GE(paths.size(), 40u);
  for (const std::string& path : paths) {
    SCOPED_TRACE(path);
    HPROFILE h = OpenPath(win32::WindowsPathFromPosix(path), PROFILE_READ, OPEN_EXISTING);
    ASSERT_NE(h, nullptr);
    BOOL valid = FALSE;
    SetLastError(kSentinel);
    EXPECT_TRUE(IsColorProfileValid(h, &valid));
    EXPECT_TRUE(valid);
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    CloseColorProfile(h);
  }
}

TEST(IsColorProfileValid, NeedsTheTagsOfItsClass) {
  const std::uint32_t matrix[] = {Sig("rXYZ"), Sig("gXYZ"), Sig("bXYZ"), Sig("rTRC"), Sig("gTRC"), Sig("bTRC")};
  const std::vector<std::uint32_t> shaper(std::begin(matrix), std::end(matrix));
  const std::vector<std::uint32_t> missingOne(std::begin(matrix), std::end(matrix) - 1);
  struct Case {
    const char* what;
    Bytes bytes;
    BOOL valid;
  } cases[] = {
      {"RGB matrix-shaper", MakeTagged(CLASS_MONITOR, SPACE_RGB, shaper), TRUE},
      {"RGB without bTRC", MakeTagged(CLASS_MONITOR, SPACE_RGB, missingOne), FALSE},
      {"RGB with A2B0 only", MakeTagged(CLASS_SCANNER, SPACE_RGB, {Sig("A2B0")}), TRUE},
      {"CMYK printer with B2A0", MakeTagged(CLASS_PRINTER, SPACE_CMYK, {Sig("B2A0")}), TRUE},
      {"CMYK printer without tables", MakeTagged(CLASS_PRINTER, SPACE_CMYK, {Sig("kTRC")}), FALSE},
      {"gray", MakeTagged(CLASS_MONITOR, SPACE_GRAY, {Sig("kTRC")}), TRUE},
      {"gray without kTRC", MakeTagged(CLASS_MONITOR, SPACE_GRAY, {Sig("wtpt")}), FALSE},
      {"link", MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")}), TRUE},
      {"link with B2A0 only", MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("B2A0")}), FALSE},
      {"abstract", MakeTagged(CLASS_ABSTRACT, SPACE_Lab, {Sig("A2B0")}), TRUE},
      {"named", MakeTagged(CLASS_NAMED, SPACE_RGB, {Sig("ncl2")}), TRUE},
      {"named without ncl2", MakeTagged(CLASS_NAMED, SPACE_RGB, {Sig("A2B0")}), FALSE},
      {"unknown class", MakeTagged(Sig("xxxx"), SPACE_RGB, {Sig("A2B0")}), FALSE},
      {"required tag too short", MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")}, 8), FALSE},
      {"header only", MakeTagged(CLASS_MONITOR, SPACE_RGB, {}), FALSE},
      {"version 5", [] { Bytes b = MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")}); b[8] = 5; return b; }(), FALSE},
      {"size field beyond the data", [] {
         Bytes b = MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")});
         PutBE32(b, 0, static_cast<std::uint32_t>(b.size() + 4));
         return b;
       }(), FALSE},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    HPROFILE h = OpenMemory(c.bytes);
    ASSERT_NE(h, nullptr);
    BOOL valid = 7;
    SetLastError(kSentinel);
    EXPECT_EQ(IsColorProfileValid(h, &valid), c.valid);
    EXPECT_EQ(valid, c.valid);
    EXPECT_EQ(GetLastError(), c.valid ? ERROR_SUCCESS : static_cast<DWORD>(ERROR_INVALID_PROFILE));
    CloseColorProfile(h);
  }
}

TEST(IsColorProfileValid, FollowsEditsAndChecksItsArgument) {
  HPROFILE h = OpenMemory(ReadBytes(IccPath("sRGB.icc")));
  EXPECT_WIN32(IsColorProfileValid(h, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  BOOL valid = FALSE;
  // A size change re-lays the profile out and keeps the size field right.
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("desc"), 3));
  EXPECT_TRUE(IsColorProfileValid(h, &valid));
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  std::vector<std::uint8_t> bytes;
  ASSERT_TRUE(win32::icm::SerializeProfile(h, bytes));
  EXPECT_EQ(header.phSize, bytes.size());
  // A size field written over no longer matches.
  header.phSize += 4;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  EXPECT_FALSE(IsColorProfileValid(h, &valid));
  EXPECT_FALSE(valid);
  // Removing a needed tag makes it unusable.
  header.phSize -= 4;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  EXPECT_TRUE(IsColorProfileValid(h, &valid));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("gXYZ"), 0));
  EXPECT_FALSE(IsColorProfileValid(h, &valid));
  CloseColorProfile(h);
}

class ColorDirectory : public TempFolderTest {};

TEST_F(ColorDirectory, ReportsBytesIncludingTheTerminator) {
  const std::string expected = win32::WindowsPathFromPosix(colorDir_);
  const DWORD needed = static_cast<DWORD>(expected.size() + 1);
  DWORD size = 0;
  EXPECT_WIN32(GetColorDirectoryA(nullptr, nullptr, &size), FALSE, ERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(size, needed);
  std::string buffer(needed + 8, '#');
  size = needed - 1;
  EXPECT_WIN32(GetColorDirectoryA(nullptr, buffer.data(), &size), FALSE, ERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(size, needed);
  EXPECT_EQ(buffer, std::string(needed + 8, '#'));
  size = needed;
  EXPECT_WIN32(GetColorDirectoryA(nullptr, buffer.data(), &size), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(size, needed);
  EXPECT_EQ(std::string(buffer.c_str()), expected);
  EXPECT_NE(expected.back(), '\\');
  EXPECT_EQ(buffer[needed], '#');
  struct stat st;
  EXPECT_EQ(stat(colorDir_.c_str(), &st), 0) << "created when first needed";
  EXPECT_WIN32(GetColorDirectoryA("machine", buffer.data(), &size), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(GetColorDirectoryA(nullptr, buffer.data(), nullptr), FALSE, ERROR_INVALID_PARAMETER);
}

TEST_F(ColorDirectory, FallsBackToTheFreedesktopLocation) {
  const char* savedHome = getenv("HOME");
  const std::string home = savedHome ? savedHome : "";
  const char* savedXdg = getenv("XDG_DATA_HOME");
  const std::string xdg = savedXdg ? savedXdg : "";
  unsetenv("TINTWELL_COLOR_DIR");
  auto query = [] {
    char buffer[MAX_PATH];
    DWORD size = sizeof buffer;
    return GetColorDirectoryA(nullptr, buffer, &size) ? std::string(buffer) : std::string("failed");
  };
  setenv("XDG_DATA_HOME", (root_ + "/xdg/").c_str(), 1);
  EXPECT_EQ(query(), win32::WindowsPathFromPosix(root_ + "/xdg/icc"));
  unsetenv("XDG_DATA_HOME");
  setenv("HOME", root_.c_str(), 1);
  EXPECT_EQ(query(), win32::WindowsPathFromPosix(root_ + "/.local/share/icc"));
  if (savedHome) setenv("HOME", home.c_str(), 1); else unsetenv("HOME");
  if (savedXdg) setenv("XDG_DATA_HOME", xdg.c_str(), 1);
}

TEST_F(ColorDirectory, InstallCopiesAndReplaces) {
  EXPECT_WIN32(InstallColorProfileA("machine", Win("x.icc").c_str()), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(InstallColorProfileA(nullptr, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(InstallColorProfileA(nullptr, Win("missing.icc").c_str()), FALSE, ERROR_FILE_NOT_FOUND);
  EXPECT_WIN32(InstallColorProfileA(nullptr, "D:\\x.icc"), FALSE, ERROR_PATH_NOT_FOUND);
  const std::string path = CopyOf("sRGB.icc", "Work 1.icc");
  EXPECT_WIN32(InstallColorProfileA(nullptr, path.c_str()), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(ReadBytes(colorDir_ + "/Work 1.icc"), ReadBytes(IccPath("sRGB.icc")));
  // A file of the same name from an earlier run is replaced.
  CopyOf("Gray.icc", "Work 1.icc");
  EXPECT_WIN32(InstallColorProfileA(nullptr, path.c_str()), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(ReadBytes(colorDir_ + "/Work 1.icc"), ReadBytes(IccPath("Gray.icc")));
  // Installing the installed copy itself leaves it as it is.
  EXPECT_WIN32(InstallColorProfileA(nullptr, win32::WindowsPathFromPosix(colorDir_ + "/Work 1.icc").c_str()), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(ReadBytes(colorDir_ + "/Work 1.icc"), ReadBytes(IccPath("Gray.icc")));
}

TEST_F(ColorDirectory, UninstallDeletesOnlyWhenAskedAndOnlyInTheDirectory) {
  const std::string path = CopyOf("sRGB.icc", "w.icc");
  ASSERT_TRUE(InstallColorProfileA(nullptr, path.c_str()));
  EXPECT_WIN32(UninstallColorProfileA("machine", "w.icc", TRUE), FALSE, ERROR_INVALID_PARAMETER);
  for (const char* bad : {"", ".", "..", "Z:\\tmp\\"}) EXPECT_WIN32(UninstallColorProfileA(nullptr, bad, TRUE), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(UninstallColorProfileA(nullptr, "missing.icc", TRUE), FALSE, ERROR_FILE_NOT_FOUND);
  EXPECT_WIN32(UninstallColorProfileA(nullptr, "w.icc", FALSE), TRUE, ERROR_SUCCESS);
  EXPECT_TRUE(FileExists(colorDir_ + "/w.icc"));
  // A full path names the installed copy by its file name; the original stays.
  EXPECT_WIN32(UninstallColorProfileA(nullptr, path.c_str(), TRUE), TRUE, ERROR_SUCCESS);
  EXPECT_FALSE(FileExists(colorDir_ + "/w.icc"));
  EXPECT_TRUE(FileExists(Posix("w.icc")));
}

TEST_F(ProfileFiles, ARootedPathWithoutADriveIsOnDriveZ) {
  CopyOf("sRGB.icc", "rooted.icc");
  std::string rooted = Posix("rooted.icc");
  for (char& c : rooted)
    if (c == '/') c = '\\';
  HPROFILE h = OpenPath(rooted, PROFILE_READ, OPEN_EXISTING);
  EXPECT_NE(h, nullptr);
  CloseColorProfile(h);
}

TEST_F(ProfileFiles, SpecialFilesAreNotProfiles) {
  ASSERT_EQ(mkfifo(Posix("pipe").c_str(), 0666), 0);
  for (const std::string& path : {Win("pipe"), std::string("Z:\\dev\\zero")})
    EXPECT_WIN32(OpenPath(path, PROFILE_READ, OPEN_EXISTING), nullptr, ERROR_ACCESS_DENIED);
}

}  // namespace

namespace {

// A profile larger than what is read whole at open keeps its file and reads each element
// when first used: through a rename it still reads the bytes it was opened on; cut short
// in place, the lost elements read as unreadable, the profile is not valid, and a change
// is not written back over the file.
TEST_F(ProfileFiles, LargeProfilesReadElementsFromTheFileTheyOpened) {
  const Bytes original = ReadBytes(IccPath("ITULab.icc"));
  ASSERT_GT(original.size(), 64u * 1024);
  const std::vector<TagEntry> table = TagTable(original);
  ASSERT_FALSE(table.empty());
  const std::string path = CopyOf("ITULab.icc", "big.icc");

  HPROFILE h = OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING);
  ASSERT_NE(h, nullptr);
  WriteBytes(Posix("other.icc"), ReadBytes(IccPath("Gray.icc")));
  ASSERT_EQ(std::rename(Posix("other.icc").c_str(), Posix("big.icc").c_str()), 0);
  for (const TagEntry& t : table) {
    Bytes got(t.size);
    DWORD n = t.size;
    ASSERT_TRUE(GetColorProfileElement(h, t.signature, 0, &n, got.data(), nullptr));
    EXPECT_EQ(got, TagBytes(original, t));
  }
  Bytes whole;
  ASSERT_TRUE(win32::icm::SerializeProfile(h, whole));
  EXPECT_EQ(whole, original) << "byte-faithful from the file it opened";
  ASSERT_TRUE(CloseColorProfile(h));

  const std::string cut = CopyOf("ITULab.icc", "cut.icc");
  h = OpenPath(cut, PROFILE_READWRITE, OPEN_EXISTING);
  ASSERT_NE(h, nullptr);
  ASSERT_EQ(truncate(Posix("cut.icc").c_str(), 200), 0);
  const TagEntry& last = table.back();
  Bytes got(last.size);
  DWORD n = last.size;
  EXPECT_WIN32(GetColorProfileElement(h, last.signature, 0, &n, got.data(), nullptr), FALSE, ERROR_INVALID_PROFILE);
  n = 4;
  EXPECT_WIN32(SetColorProfileElement(h, last.signature, 0, &n, got.data()), FALSE, ERROR_INVALID_PROFILE);
  EXPECT_WIN32(SetColorProfileElementSize(h, last.signature, 8), FALSE, ERROR_INVALID_PROFILE);
  BOOL valid = TRUE;
  EXPECT_WIN32(IsColorProfileValid(h, &valid), FALSE, ERROR_INVALID_PROFILE);
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  EXPECT_WIN32(CloseColorProfile(h), FALSE, ERROR_INVALID_PROFILE);
  EXPECT_EQ(ReadBytes(Posix("cut.icc")), Bytes(original.begin(), original.begin() + 200)) << "left as it was";
}

}  // namespace
