// OpenColorProfileA, CloseColorProfile, the header calls and SerializeProfile: parameter
// checks first, then behaviour, with the exact last error.
#include <sys/stat.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <functional>

#include "handle_table.h"
#include "icc_test_support.h"
#include "icm/profile_store.h"

namespace {

using namespace icctest;

TEST(OpenColorProfileA, RefusesBadArgumentsAndReadsARealProfileInFileOrder) {
  const Bytes srgb = ReadBytes(IccPath("sRGB.icc"));
  const std::string path = win32::WindowsPathFromPosix(IccPath("sRGB.icc"));
  char* name = const_cast<char*>(path.c_str());
  void* mem = const_cast<std::uint8_t*>(srgb.data());
  const DWORD size = static_cast<DWORD>(srgb.size());
  struct {
    const char* what;
    PROFILE profile;
    DWORD access, creation, error;
  } cases[] = {
      {"null data", {PROFILE_FILENAME, nullptr, 0}, PROFILE_READ, OPEN_EXISTING, ERROR_INVALID_PARAMETER},
      {"type 0", {0, name, 0}, PROFILE_READ, OPEN_EXISTING, ERROR_INVALID_PARAMETER},
      {"type 3", {3, mem, size}, PROFILE_READ, OPEN_EXISTING, ERROR_INVALID_PARAMETER},
      {"access 0", {PROFILE_FILENAME, name, 0}, 0, OPEN_EXISTING, ERROR_INVALID_PARAMETER},
      {"access 3", {PROFILE_MEMBUFFER, mem, size}, 3, OPEN_EXISTING, ERROR_INVALID_PARAMETER},
      {"creation 0", {PROFILE_FILENAME, name, 0}, PROFILE_READ, 0, ERROR_INVALID_PARAMETER},
      {"creation 6", {PROFILE_FILENAME, name, 0}, PROFILE_READ, 6, ERROR_INVALID_PARAMETER},
      {"drive C:", {PROFILE_FILENAME, const_cast<char*>("C:\\x.icc"), 0}, PROFILE_READ, OPEN_EXISTING,
       ERROR_PATH_NOT_FOUND},
      {"memory too short", {PROFILE_MEMBUFFER, mem, 131}, PROFILE_READ, OPEN_EXISTING, ERROR_INVALID_PROFILE},
  };
  for (auto& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_WIN32(OpenColorProfileA(&c.profile, c.access, 0, c.creation), nullptr, c.error);
  }
  EXPECT_WIN32(OpenColorProfileA(nullptr, PROFILE_READ, 0, OPEN_EXISTING), nullptr, ERROR_INVALID_PARAMETER);

  SetLastError(kSentinel);
  HPROFILE h = OpenPath(path, PROFILE_READ, OPEN_EXISTING);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  std::vector<TAGTYPE> expected;
  for (const TagEntry& e : TagTable(srgb)) expected.push_back(e.signature);
  EXPECT_EQ(TagList(h), expected);
  EXPECT_WIN32(CloseColorProfile(h), TRUE, ERROR_SUCCESS);
}

// Every call taking a profile refuses a handle that is not an open profile.
TEST(ProfileCalls, RefuseHandlesThatAreNotOpenProfiles) {
  HPROFILE closed = OpenMemory(ReadBytes(IccPath("sRGB.icc")));
  ASSERT_TRUE(CloseColorProfile(closed));
  HANDLE transform = win32::Handles().Insert(win32::HandleKind::Transform, std::make_shared<int>(0));
  PROFILEHEADER header;
  BOOL flag;
  DWORD count = 4;
  TAGTYPE tag;
  std::uint8_t buffer[4] = {};
  std::vector<std::uint8_t> bytes;
  for (HANDLE bad : {HANDLE(nullptr), closed, transform}) {
    const std::pair<const char*, std::function<BOOL()>> calls[] = {
        {"IsColorProfileValid", [&] { return IsColorProfileValid(bad, &flag); }},
        {"GetColorProfileHeader", [&] { return GetColorProfileHeader(bad, &header); }},
        {"SetColorProfileHeader", [&] { return SetColorProfileHeader(bad, &header); }},
        {"GetCountColorProfileElements", [&] { return GetCountColorProfileElements(bad, &count); }},
        {"GetColorProfileElementTag", [&] { return GetColorProfileElementTag(bad, 1, &tag); }},
        {"IsColorProfileTagPresent", [&] { return IsColorProfileTagPresent(bad, Sig("desc"), &flag); }},
        {"GetColorProfileElement", [&] { return GetColorProfileElement(bad, Sig("desc"), 0, &count, buffer, &flag); }},
        {"SetColorProfileElement", [&] { return SetColorProfileElement(bad, Sig("desc"), 0, &count, buffer); }},
        {"SetColorProfileElementSize", [&] { return SetColorProfileElementSize(bad, Sig("desc"), 8); }},
        {"SerializeProfile", [&] { return win32::icm::SerializeProfile(bad, bytes); }},
        {"CloseColorProfile", [&] { return CloseColorProfile(bad); }},
    };
    for (const auto& [what, call] : calls) {
      SCOPED_TRACE(what);
      EXPECT_WIN32(call(), FALSE, ERROR_INVALID_HANDLE);
    }
  }
  // The transform handle survived the attempts.
  EXPECT_NE(win32::Handles().Remove<int>(transform, win32::HandleKind::Transform), nullptr);
}

using OpenModes = TempFolderTest;

TEST_F(OpenModes, CreationModesOnExistingAndMissingFiles) {
  const Bytes srgb = ReadBytes(IccPath("sRGB.icc"));
  // creation, whether the file exists, the last error (0: opens), whether it opens blank
  const std::tuple<DWORD, bool, DWORD, bool> cases[] = {
      {OPEN_EXISTING, true, 0, false},    {OPEN_EXISTING, false, ERROR_FILE_NOT_FOUND, false},
      {OPEN_ALWAYS, true, 0, false},      {OPEN_ALWAYS, false, 0, true},
      {CREATE_NEW, true, ERROR_FILE_EXISTS, false}, {CREATE_NEW, false, 0, true},
      {CREATE_ALWAYS, true, 0, true},     {CREATE_ALWAYS, false, 0, true},
      {TRUNCATE_EXISTING, true, 0, true}, {TRUNCATE_EXISTING, false, ERROR_FILE_NOT_FOUND, false},
  };
  int n = 0;
  for (const auto& [creation, exists, error, blank] : cases) {
    SCOPED_TRACE(testing::Message() << "creation " << creation << (exists ? " existing" : " missing"));
    const std::string name = "p" + std::to_string(n++) + ".icc";
    if (exists) WriteBytes(Posix(name), srgb);
    SetLastError(kSentinel);
    HPROFILE h = OpenPath(Win(name), PROFILE_READWRITE, creation);
    EXPECT_EQ(GetLastError(), error);
    if (error != 0) {
      EXPECT_EQ(h, nullptr);
      continue;
    }
    EXPECT_EQ(TagList(h).size(), blank ? 0u : TagTable(srgb).size());
    ASSERT_TRUE(CloseColorProfile(h));
    const Bytes after = ReadBytes(Posix(name));
    if (!blank) {
      EXPECT_EQ(after, srgb);
      continue;
    }
    // written at close: header with 'acsp', no tags, the size field matching
    ASSERT_EQ(after.size(), 132u);
    EXPECT_EQ(BE32(after, 0), 132u);
    EXPECT_EQ(BE32(after, 36), Sig("acsp"));
    EXPECT_EQ(BE32(after, 128), 0u);
  }
  // A read-only blank profile is never written.
  ASSERT_TRUE(CloseColorProfile(OpenPath(Win("ro.icc"), PROFILE_READ, CREATE_ALWAYS)));
  EXPECT_FALSE(std::filesystem::exists(Posix("ro.icc")));
}

TEST_F(OpenModes, PathErrorsSpecialFilesAndBareNames) {
  ASSERT_EQ(mkdir(colorDir_.c_str(), 0777), 0);
  ASSERT_EQ(mkfifo(Posix("pipe").c_str(), 0666), 0);
  const std::tuple<std::string, DWORD, DWORD, DWORD> cases[] = {
      {Win("no/such/folder.icc"), PROFILE_READ, OPEN_EXISTING, ERROR_PATH_NOT_FOUND},
      {Win("no/such/folder.icc"), PROFILE_READWRITE, CREATE_ALWAYS, ERROR_PATH_NOT_FOUND},
      {Win(""), PROFILE_READ, OPEN_EXISTING, ERROR_ACCESS_DENIED},  // a folder
      {Win(std::string(MAX_PATH, 'n')), PROFILE_READ, OPEN_EXISTING, ERROR_FILENAME_EXCED_RANGE},
      {"missing.icm", PROFILE_READ, OPEN_EXISTING, ERROR_FILE_NOT_FOUND},
      {"Z:\\tw-missing.icm", PROFILE_READ, OPEN_EXISTING, ERROR_FILE_NOT_FOUND},  // in the root folder
      {Win("pipe"), PROFILE_READ, OPEN_EXISTING, ERROR_ACCESS_DENIED},  // special files are not profiles
      {"Z:\\dev\\zero", PROFILE_READ, OPEN_EXISTING, ERROR_ACCESS_DENIED},
  };
  for (const auto& [path, access, creation, error] : cases) EXPECT_WIN32(OpenPath(path, access, creation), nullptr, error);
  // A bare name is looked up in the colour directory; a rooted path without a drive is on Z:.
  WriteBytes(colorDir_ + "/Bare Name.icm", ReadBytes(IccPath("Gray.icc")));
  std::string rooted = colorDir_ + "/Bare Name.icm";
  std::replace(rooted.begin(), rooted.end(), '/', '\\');
  for (const std::string& name : {std::string("Bare Name.icm"), rooted}) {
    SetLastError(kSentinel);
    HPROFILE h = OpenPath(name, PROFILE_READ, OPEN_EXISTING);
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    PROFILEHEADER header;
    ASSERT_TRUE(GetColorProfileHeader(h, &header));
    EXPECT_EQ(header.phDataColorSpace, static_cast<DWORD>(SPACE_GRAY));
    EXPECT_TRUE(CloseColorProfile(h));
  }
}

TEST(ColorProfileHeader, ComesOutInHostOrderAndIsStoredAsGiven) {
  const Bytes raw = ReadBytes(IccPath("sRGB.icc"));
  HPROFILE ro = OpenMemory(raw, PROFILE_READ), h = OpenMemory(raw);
  EXPECT_WIN32(GetColorProfileHeader(ro, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  PROFILEHEADER in;
  EXPECT_WIN32(GetColorProfileHeader(ro, &in), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(in.phSize, raw.size());
  EXPECT_EQ(in.phClass, static_cast<DWORD>(CLASS_MONITOR));
  EXPECT_EQ(in.phDataColorSpace, static_cast<DWORD>(SPACE_RGB));
  EXPECT_EQ(in.phConnectionSpace, static_cast<DWORD>(SPACE_XYZ));
  EXPECT_EQ(in.phSignature, 0x61637370u);
  EXPECT_EQ(in.phIlluminant.ciexyzX, 0x0000F6D6);
  EXPECT_EQ(in.phIlluminant.ciexyzY, 0x00010000);
  EXPECT_EQ(in.phIlluminant.ciexyzZ, 0x0000D32D);
  // The file's date is 2004-08-13 12:18:06, six big-endian 16-bit fields read as words.
  EXPECT_EQ(in.phDateTime[0], (2004u << 16) | 8u);
  EXPECT_EQ(in.phDateTime[1], (13u << 16) | 12u);
  EXPECT_EQ(in.phDateTime[2], (18u << 16) | 6u);
  EXPECT_WIN32(SetColorProfileHeader(ro, &in), FALSE, ERROR_ACCESS_DENIED);
  EXPECT_TRUE(CloseColorProfile(ro));

  EXPECT_WIN32(SetColorProfileHeader(h, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  in.phSize = 12345;
  in.phClass = CLASS_PRINTER;
  in.phDateTime[0] = (2026u << 16) | 12;
  in.phRenderingIntent = INTENT_SATURATION;
  for (int i = 0; i < 44; ++i) in.phReserved[i] = static_cast<BYTE>(i + 1);
  EXPECT_WIN32(SetColorProfileHeader(h, &in), TRUE, ERROR_SUCCESS);
  PROFILEHEADER out;
  ASSERT_TRUE(GetColorProfileHeader(h, &out));
  EXPECT_EQ(std::memcmp(&in, &out, sizeof in), 0);
  // On disk every word is big-endian again; the size field is the real size.
  std::vector<std::uint8_t> bytes;
  EXPECT_WIN32(win32::icm::SerializeProfile(h, bytes), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(BE32(bytes, 0), bytes.size());
  EXPECT_EQ(BE32(bytes, 12), Sig("prtr"));
  EXPECT_EQ(BE32(bytes, 24), (2026u << 16) | 12);
  EXPECT_EQ(BE32(bytes, 64), static_cast<std::uint32_t>(INTENT_SATURATION));
  EXPECT_EQ(BE32(bytes, 84), 0x04030201u);  // reserved bytes swapped as words on the way in
  EXPECT_TRUE(CloseColorProfile(h));
}

}  // namespace
