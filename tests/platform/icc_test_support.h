// Helpers shared by the platform tests: the last-error check, temporary folders, file
// bytes, a small ICC writer for hand-made (and deliberately broken) profiles, and an
// independent reader of tag tables.
#ifndef TINTWELL_TESTS_ICC_TEST_SUPPORT_H
#define TINTWELL_TESTS_ICC_TEST_SUPPORT_H

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>
#include <tuple>
#include <vector>

#include "icm.h"
#include "win32_paths.h"

// Sets the sentinel last error, makes the call, checks its result and the code it left.
#define EXPECT_WIN32(call, result, code)                                   \
  do {                                                                     \
    SetLastError(icctest::kSentinel);                                      \
    EXPECT_EQ((call), (result)) << #call;                                  \
    EXPECT_EQ(GetLastError(), static_cast<DWORD>(code)) << #call;          \
  } while (0)

namespace icctest {

using Bytes = std::vector<std::uint8_t>;
constexpr DWORD kSentinel = 0xDEADBEEF;

inline std::uint32_t BE32(const Bytes& b, std::size_t at) {
  return (std::uint32_t{b[at]} << 24) | (std::uint32_t{b[at + 1]} << 16) | (std::uint32_t{b[at + 2]} << 8) |
         b[at + 3];
}
inline void PutBE32(Bytes& b, std::size_t at, std::uint32_t v) {
  for (int i = 0; i < 4; ++i) b[at + i] = static_cast<std::uint8_t>(v >> (24 - 8 * i));
}
constexpr std::uint32_t Sig(const char (&s)[5]) {
  return (std::uint32_t(std::uint8_t(s[0])) << 24) | (std::uint32_t(std::uint8_t(s[1])) << 16) |
         (std::uint32_t(std::uint8_t(s[2])) << 8) | std::uint32_t(std::uint8_t(s[3]));
}

inline Bytes ReadBytes(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return Bytes(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}
inline void WriteBytes(const std::string& path, const Bytes& bytes) {
  std::ofstream(path, std::ios::binary | std::ios::trunc)
      .write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}
inline std::string IccPath(const std::string& name) { return std::string(TINTWELL_ICC_DIR) + "/" + name; }

struct TagEntry {
  std::uint32_t signature, offset, size;
};

// Reads a tag table straight from file bytes (no bounds checks beyond the table).
inline std::vector<TagEntry> TagTable(const Bytes& b) {
  std::vector<TagEntry> tags;
  for (std::uint32_t i = 0; i < BE32(b, 128); ++i)
    tags.push_back({BE32(b, 132 + 12 * i), BE32(b, 136 + 12 * i), BE32(b, 140 + 12 * i)});
  return tags;
}
inline Bytes TagBytes(const Bytes& b, const TagEntry& t) {
  return Bytes(b.begin() + t.offset, b.begin() + t.offset + t.size);
}

// A v2 RGB display header, then the given table entries; the data region (after the
// table) holds the byte pattern i & 0xFF. Entries may point anywhere.
inline Bytes MakeProfile(const std::vector<TagEntry>& entries, std::size_t dataBytes) {
  const std::size_t tableEnd = 132 + 12 * entries.size();
  Bytes b(tableEnd + dataBytes, 0);
  PutBE32(b, 0, static_cast<std::uint32_t>(b.size()));
  PutBE32(b, 8, 0x02100000);
  PutBE32(b, 12, Sig("mntr"));
  PutBE32(b, 16, Sig("RGB "));
  PutBE32(b, 20, Sig("XYZ "));
  PutBE32(b, 36, Sig("acsp"));
  PutBE32(b, 128, static_cast<std::uint32_t>(entries.size()));
  for (std::size_t i = 0; i < entries.size(); ++i) {
    PutBE32(b, 132 + 12 * i, entries[i].signature);
    PutBE32(b, 136 + 12 * i, entries[i].offset);
    PutBE32(b, 140 + 12 * i, entries[i].size);
  }
  for (std::size_t i = tableEnd; i < b.size(); ++i) b[i] = static_cast<std::uint8_t>(i);
  return b;
}

// A well-formed profile whose tags follow one another, 4-byte aligned, each tagSize
// bytes long and starting with a non-zero type signature.
inline Bytes MakeTagged(std::uint32_t cls, std::uint32_t space, const std::vector<std::uint32_t>& sigs,
                        std::uint32_t tagSize = 16) {
  std::vector<TagEntry> entries;
  std::uint32_t at = static_cast<std::uint32_t>(132 + 12 * sigs.size());
  for (std::uint32_t sig : sigs) {
    entries.push_back({sig, at, tagSize});
    at += (tagSize + 3) & ~3u;
  }
  Bytes b = MakeProfile(entries, at - (132 + 12 * sigs.size()));
  PutBE32(b, 12, cls);
  PutBE32(b, 16, space);
  for (const TagEntry& e : entries) PutBE32(b, e.offset, Sig("curv"));
  return b;
}

inline HPROFILE OpenMemory(const Bytes& bytes, DWORD access = PROFILE_READWRITE) {
  PROFILE p{PROFILE_MEMBUFFER, const_cast<std::uint8_t*>(bytes.data()), static_cast<DWORD>(bytes.size())};
  return OpenColorProfileA(&p, access, 0, OPEN_EXISTING);
}
inline HPROFILE OpenPath(const std::string& windowsPath, DWORD access, DWORD creation) {
  PROFILE p{PROFILE_FILENAME, const_cast<char*>(windowsPath.c_str()), static_cast<DWORD>(windowsPath.size())};
  return OpenColorProfileA(&p, access, FILE_SHARE_READ, creation);
}

// IsColorProfileValid's result, flag and last error all agree with the expectation.
inline void ExpectValid(HPROFILE h, BOOL valid) {
  BOOL flag = 7;
  EXPECT_WIN32(IsColorProfileValid(h, &flag), valid, valid ? ERROR_SUCCESS : ERROR_INVALID_PROFILE);
  EXPECT_EQ(flag, valid);
}

// The tag signatures of an open profile, in table order.
inline std::vector<TAGTYPE> TagList(HPROFILE h) {
  DWORD count = 0;
  EXPECT_TRUE(GetCountColorProfileElements(h, &count));
  std::vector<TAGTYPE> tags(count);
  for (DWORD i = 0; i < count; ++i) EXPECT_TRUE(GetColorProfileElementTag(h, i + 1, &tags[i]));
  return tags;
}

// A fresh folder, removed afterwards; its "color" subfolder is the colour directory.
class TempFolderTest : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/tw-test-XXXXXX";
    ASSERT_NE(mkdtemp(pattern), nullptr);
    root_ = pattern;
    colorDir_ = root_ + "/color";
    setenv("TINTWELL_COLOR_DIR", colorDir_.c_str(), 1);
  }
  void TearDown() override {
    unsetenv("TINTWELL_COLOR_DIR");
    std::system(("rm -rf '" + root_ + "'").c_str());
  }
  std::string Posix(const std::string& name) const { return root_ + "/" + name; }
  std::string Win(const std::string& name) const { return win32::WindowsPathFromPosix(Posix(name)); }
  void Put(const std::string& name, const std::string& s) const { WriteBytes(Posix(name), Bytes(s.begin(), s.end())); }
  std::string Get(const std::string& name) const {
    const Bytes b = ReadBytes(Posix(name));
    return std::string(b.begin(), b.end());
  }
  // Copies a real profile into the folder and returns its Windows path.
  std::string CopyOf(const std::string& iccName, const std::string& as) const {
    WriteBytes(Posix(as), ReadBytes(IccPath(iccName)));
    return Win(as);
  }
  std::string root_;
  std::string colorDir_;
};

}  // namespace icctest

#endif
