// Profiles on disk: write-back at close, malformed input, validity, the colour directory
// and installing into it.
#include <lcms2.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <filesystem>

#include "icc_test_support.h"
#include "icm/profile_store.h"

namespace {

using namespace icctest;

bool FileExists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }
ino_t Inode(const std::string& path) {
  struct stat st{};
  EXPECT_EQ(stat(path.c_str(), &st), 0);
  return st.st_ino;
}

using ProfileFiles = TempFolderTest;

TEST_F(ProfileFiles, ChangesReachTheFileAtCloseOnly) {
  // colord's sRGB stores rTRC, gTRC and bTRC once, shared by three entries.
  const Bytes original = ReadBytes(IccPath("colord/sRGB.icc"));
  HPROFILE h = OpenPath(CopyOf("colord/sRGB.icc", "edit.icc"), PROFILE_READWRITE, OPEN_EXISTING);
  std::uint8_t mark[4] = {'M', 'A', 'R', 'K'};
  DWORD n = 4;
  ASSERT_TRUE(SetColorProfileElement(h, Sig("cprt"), 12, &n, mark));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("bkpt"), 20));  // a new tag
  EXPECT_EQ(ReadBytes(Posix("edit.icc")), original) << "unchanged before close";
  EXPECT_WIN32(CloseColorProfile(h), TRUE, ERROR_SUCCESS);
  // Re-parse independently: size field, alignment, order, untouched tags byte-exact.
  const Bytes saved = ReadBytes(Posix("edit.icc"));
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
    for (std::size_t j = 0; j < i; ++j)
      EXPECT_TRUE(before[j].offset != before[i].offset || after[j].offset == after[i].offset) << "kept shared";
  }
  // The header is kept apart from the size field, and no temporary file is left beside it.
  EXPECT_TRUE(std::equal(saved.begin() + 4, saved.begin() + 128, original.begin() + 4));
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(root_), {}), 1);
}

TEST_F(ProfileFiles, ReadOnlyAndUnchangedHandlesNeverWrite) {
  const std::string path = CopyOf("Gray.icc", "g.icc");
  // A read-only file refuses a read-write open, even to root.
  ASSERT_EQ(chmod(Posix("g.icc").c_str(), 0444), 0);
  EXPECT_WIN32(OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING), nullptr, ERROR_ACCESS_DENIED);
  ASSERT_EQ(chmod(Posix("g.icc").c_str(), 0640), 0);
  const ino_t before = Inode(Posix("g.icc"));
  for (DWORD access : {PROFILE_READ, PROFILE_READWRITE}) {
    HPROFILE h = OpenPath(path, access, OPEN_EXISTING);
    TagList(h);
    ASSERT_TRUE(CloseColorProfile(h));
  }
  EXPECT_EQ(Inode(Posix("g.icc")), before) << "an unchanged profile is not rewritten";
  // A changed one is rewritten with the permissions it had.
  HPROFILE h = OpenPath(path, PROFILE_READWRITE, OPEN_EXISTING);
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  header.phModel = 7;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  ASSERT_TRUE(CloseColorProfile(h));
  EXPECT_NE(Inode(Posix("g.icc")), before);
  struct stat st{};
  ASSERT_EQ(stat(Posix("g.icc").c_str(), &st), 0);
  EXPECT_EQ(st.st_mode & 07777, 0640u);
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
  HPROFILE h = OpenPath(CopyOf("compatibleWithAdobeRGB1998.icc", "a98.icc"), PROFILE_READWRITE, OPEN_EXISTING);
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
  EXPECT_EQ(system(("iccdump -v 3 '" + Posix("a98.icc") + "' >/dev/null 2>&1").c_str()), 0);
}

TEST(MalformedProfiles, AreRefusedWithInvalidProfile) {
  const Bytes srgb = ReadBytes(IccPath("sRGB.icc"));
  // Table end for one entry is 144; 20 data bytes make the file 164 bytes long.
  auto with = [](std::size_t at, std::uint32_t value, Bytes b = MakeProfile({{Sig("wtpt"), 144, 20}}, 20)) {
    PutBE32(b, at, value);
    return b;
  };
  const std::pair<const char*, Bytes> cases[] = {
      {"131 bytes", Bytes(srgb.begin(), srgb.begin() + 131)},
      {"no acsp", with(36, Sig("acsq"))},
      {"tag count huge", with(128, 0xFFFFFFFF)},
      {"table one entry past the data", with(128, 4)},
      {"offset past the end", MakeProfile({{Sig("wtpt"), 165, 0}}, 20)},
      {"data one byte past the end", MakeProfile({{Sig("wtpt"), 144, 21}}, 20)},
      {"size wraps", MakeProfile({{Sig("wtpt"), 144, 0xFFFFFFF0}}, 20)},
      {"offset wraps", MakeProfile({{Sig("wtpt"), 0xFFFFFFF0, 0x20}}, 20)},
      {"duplicate tags", MakeProfile({{Sig("wtpt"), 156, 4}, {Sig("wtpt"), 160, 4}}, 20)},
      {"real profile cut in half", Bytes(srgb.begin(), srgb.begin() + srgb.size() / 2)},
      {"past a smaller size field", with(0, 160)},  // the profile ends before its tag does
  };
  for (const auto& [what, bytes] : cases) {
    SCOPED_TRACE(what);
    EXPECT_WIN32(OpenMemory(bytes), nullptr, ERROR_INVALID_PROFILE);
  }
  // The same limits accept a profile that just fits.
  for (const Bytes& fits : {MakeProfile({{Sig("wtpt"), 144, 20}}, 20), MakeProfile({{Sig("wtpt"), 164, 0}}, 20)}) {
    HPROFILE h = OpenMemory(fits);
    EXPECT_NE(h, nullptr);
    CloseColorProfile(h);
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
  ExpectValid(h, FALSE);
  CloseColorProfile(h);
}

TEST(IsColorProfileValid, EveryRealProfileIsValid) {
  int checked = 0;
  for (const char* root : {TINTWELL_ICC_DIR, "/usr/share/color/argyll/ref"}) {
    if (!std::filesystem::is_directory(root)) continue;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root)) {
      std::string ext = entry.path().extension().string();
      for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
      if (!entry.is_regular_file() || (ext != ".icc" && ext != ".icm")) continue;
      SCOPED_TRACE(entry.path().string());
      HPROFILE h = OpenPath(win32::WindowsPathFromPosix(entry.path().string()), PROFILE_READ, OPEN_EXISTING);
      ASSERT_NE(h, nullptr);
      ExpectValid(h, TRUE);
      CloseColorProfile(h);
      ++checked;
    }
  }
  EXPECT_GE(checked, 40);
}

TEST(IsColorProfileValid, NeedsTheTagsOfItsClass) {
  const std::vector<std::uint32_t> shaper = {Sig("rXYZ"), Sig("gXYZ"), Sig("bXYZ"),
                                             Sig("rTRC"), Sig("gTRC"), Sig("bTRC")};
  const Bytes link = MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")});
  auto with = [&](std::size_t at, std::uint32_t value) {
    Bytes b = link;
    PutBE32(b, at, value);
    return b;
  };
  const std::tuple<const char*, Bytes, BOOL> cases[] = {
      {"RGB matrix-shaper", MakeTagged(CLASS_MONITOR, SPACE_RGB, shaper), TRUE},
      {"RGB without bTRC", MakeTagged(CLASS_MONITOR, SPACE_RGB, {shaper.begin(), shaper.end() - 1}), FALSE},
      {"RGB with A2B0 only", MakeTagged(CLASS_SCANNER, SPACE_RGB, {Sig("A2B0")}), TRUE},
      {"CMYK printer with B2A0", MakeTagged(CLASS_PRINTER, SPACE_CMYK, {Sig("B2A0")}), TRUE},
      {"CMYK printer without tables", MakeTagged(CLASS_PRINTER, SPACE_CMYK, {Sig("kTRC")}), FALSE},
      {"gray", MakeTagged(CLASS_MONITOR, SPACE_GRAY, {Sig("kTRC")}), TRUE},
      {"gray without kTRC", MakeTagged(CLASS_MONITOR, SPACE_GRAY, {Sig("wtpt")}), FALSE},
      {"link", link, TRUE},
      {"link with B2A0 only", MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("B2A0")}), FALSE},
      {"abstract", MakeTagged(CLASS_ABSTRACT, SPACE_Lab, {Sig("A2B0")}), TRUE},
      {"named", MakeTagged(CLASS_NAMED, SPACE_RGB, {Sig("ncl2")}), TRUE},
      {"named without ncl2", MakeTagged(CLASS_NAMED, SPACE_RGB, {Sig("A2B0")}), FALSE},
      {"unknown class", with(12, Sig("xxxx")), FALSE},
      {"required tag too short", MakeTagged(CLASS_LINK, SPACE_RGB, {Sig("A2B0")}, 8), FALSE},
      {"required tag of type 0", with(144, 0), FALSE},
      {"header only", MakeTagged(CLASS_MONITOR, SPACE_RGB, {}), FALSE},
      {"version 5", with(8, 0x05000000), FALSE},
      {"size field beyond the data", with(0, static_cast<std::uint32_t>(link.size() + 4)), FALSE},
  };
  for (const auto& [what, bytes, valid] : cases) {
    SCOPED_TRACE(what);
    HPROFILE h = OpenMemory(bytes);
    ASSERT_NE(h, nullptr);
    ExpectValid(h, valid);
    CloseColorProfile(h);
  }
}

TEST(IsColorProfileValid, FollowsEditsAndChecksItsArgument) {
  HPROFILE h = OpenMemory(ReadBytes(IccPath("sRGB.icc")));
  EXPECT_WIN32(IsColorProfileValid(h, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  // A size change re-lays the profile out and keeps the size field right.
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("desc"), 3));
  ExpectValid(h, TRUE);
  PROFILEHEADER header;
  ASSERT_TRUE(GetColorProfileHeader(h, &header));
  std::vector<std::uint8_t> bytes;
  ASSERT_TRUE(win32::icm::SerializeProfile(h, bytes));
  EXPECT_EQ(header.phSize, bytes.size());
  // A size field written over no longer matches; removing a needed tag makes it unusable.
  header.phSize += 4;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  ExpectValid(h, FALSE);
  header.phSize -= 4;
  ASSERT_TRUE(SetColorProfileHeader(h, &header));
  ExpectValid(h, TRUE);
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("gXYZ"), 0));
  ExpectValid(h, FALSE);
  CloseColorProfile(h);
}

using ColorDirectory = TempFolderTest;

TEST_F(ColorDirectory, ReportsBytesIncludingTheTerminator) {
  const std::string expected = win32::WindowsPathFromPosix(colorDir_);
  const DWORD needed = static_cast<DWORD>(expected.size() + 1);
  std::string buffer(needed + 8, '#');
  DWORD size = 0;
  EXPECT_WIN32(GetColorDirectoryA(nullptr, nullptr, &size), FALSE, ERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(size, needed);
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
  EXPECT_TRUE(FileExists(colorDir_)) << "created when first needed";
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
  const std::string path = CopyOf("sRGB.icc", "Work 1.icc"), installed = colorDir_ + "/Work 1.icc";
  EXPECT_WIN32(InstallColorProfileA(nullptr, path.c_str()), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(ReadBytes(installed), ReadBytes(IccPath("sRGB.icc")));
  // A file of the same name from an earlier run is replaced; installing the installed
  // copy itself leaves it as it is.
  CopyOf("Gray.icc", "Work 1.icc");
  for (const std::string& from : {path, win32::WindowsPathFromPosix(installed)}) {
    EXPECT_WIN32(InstallColorProfileA(nullptr, from.c_str()), TRUE, ERROR_SUCCESS);
    EXPECT_EQ(ReadBytes(installed), ReadBytes(IccPath("Gray.icc")));
  }
}

TEST_F(ColorDirectory, UninstallDeletesOnlyWhenAskedAndOnlyInTheDirectory) {
  const std::string path = CopyOf("sRGB.icc", "w.icc");
  ASSERT_TRUE(InstallColorProfileA(nullptr, path.c_str()));
  EXPECT_WIN32(UninstallColorProfileA("machine", "w.icc", TRUE), FALSE, ERROR_INVALID_PARAMETER);
  for (const char* bad : {"", ".", "..", "Z:\\tmp\\"})
    EXPECT_WIN32(UninstallColorProfileA(nullptr, bad, TRUE), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(UninstallColorProfileA(nullptr, "missing.icc", TRUE), FALSE, ERROR_FILE_NOT_FOUND);
  EXPECT_WIN32(UninstallColorProfileA(nullptr, "w.icc", FALSE), TRUE, ERROR_SUCCESS);
  EXPECT_TRUE(FileExists(colorDir_ + "/w.icc"));
  // A full path names the installed copy by its file name; the original stays.
  EXPECT_WIN32(UninstallColorProfileA(nullptr, path.c_str(), TRUE), TRUE, ERROR_SUCCESS);
  EXPECT_FALSE(FileExists(colorDir_ + "/w.icc"));
  EXPECT_TRUE(FileExists(Posix("w.icc")));
}

// A profile larger than what is read whole at open keeps its file and reads each element
// when first used: through a rename it still reads the bytes it was opened on; cut short
// in place, the lost elements read as unreadable, the profile is not valid, and a change
// is not written back over the file.
TEST_F(ProfileFiles, LargeProfilesReadElementsFromTheFileTheyOpened) {
  const Bytes original = ReadBytes(IccPath("ITULab.icc"));
  ASSERT_GT(original.size(), 64u * 1024);
  const std::vector<TagEntry> table = TagTable(original);
  HPROFILE h = OpenPath(CopyOf("ITULab.icc", "big.icc"), PROFILE_READWRITE, OPEN_EXISTING);
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

  h = OpenPath(CopyOf("ITULab.icc", "cut.icc"), PROFILE_READWRITE, OPEN_EXISTING);
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
