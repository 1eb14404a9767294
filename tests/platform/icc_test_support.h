// Helpers shared by the profile tests: temporary folders, file bytes, a small ICC
// writer for hand-made (and deliberately broken) profiles, and an independent reader
// of tag tables.
#ifndef TINTWELL_TESTS_ICC_TEST_SUPPORT_H
#define TINTWELL_TESTS_ICC_TEST_SUPPORT_H

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "icm.h"
#include "win32_paths.h"

namespace icctest {

using Bytes = std::vector<std::uint8_t>;
constexpr DWORD kSentinel = 0xDEADBEEF;

inline std::uint32_t BE32(const Bytes& b, std::size_t at) {
  return (std::uint32_t{b[at]} << 24) | (std::uint32_t{b[at + 1]} << 16) |
         (std::uint32_t{b[at + 2]} << 8) | b[at + 3];
}
inline void PutBE32(Bytes& b, std::size_t at, std::uint32_t v) {
  b[at] = static_cast<std::uint8_t>(v >> 24);
  b[at + 1] = static_cast<std::uint8_t>(v >> 16);
  b[at + 2] = static_cast<std::uint8_t>(v >> 8);
  b[at + 3] = static_cast<std::uint8_t>(v);
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
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out.write(reinterpret_cast<const char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
}
inline std::string IccPath(const std::string& name) { return std::string(TINTWELL_ICC_DIR) + "/" + name; }

struct TagEntry {
  std::uint32_t signature, offset, size;
};

// Reads a tag table straight from file bytes (no bounds checks beyond the table).
inline std::vector<TagEntry> TagTable(const Bytes& b) {
  std::vector<TagEntry> tags;
  const std::uint32_t n = BE32(b, 128);
  for (std::uint32_t i = 0; i < n; ++i)
    tags.push_back({BE32(b, 132 + 12 * i), BE32(b, 136 + 12 * i), BE32(b, 140 + 12 * i)});
  return tags;
}
inline Bytes TagBytes(const Bytes& b, const TagEntry& t) {
  return Bytes(b.begin() + t.offset, b.begin() + t.offset + t.size);
}

// A hand-made profile: a v2 RGB display header, then the given table entries; the data
// region (after the table) is filled with the byte pattern i & 0xFF. Entries may point
// anywhere, which is how the malformed cases are made.
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

// A well-formed profile of the given class and data space whose tags are laid out one
// after another, 4-byte aligned, each tagSize bytes long and starting with a non-zero
// type signature.
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

// A fresh folder that is also the colour directory for the test's duration.
class TempFolderTest : public ::testing::Test {
 protected:
  void SetUp() override {
    char pattern[] = "/tmp/tw-icm-XXXXXX";
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
