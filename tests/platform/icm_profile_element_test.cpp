// The element calls: reads at every boundary, writes, size changes, shared data, and the
// tag-table queries.
#include <algorithm>
#include <cstring>
#include <tuple>

#include "icc_test_support.h"
#include "icm/profile_store.h"

namespace {

using namespace icctest;

// Table end is 132 + 3 * 12 = 168. wtpt holds file bytes 168..187; rTRC and gTRC share
// 188..201. MakeProfile fills byte i of the file with i & 0xFF.
const Bytes kSample = MakeProfile({{Sig("wtpt"), 168, 20}, {Sig("rTRC"), 188, 14}, {Sig("gTRC"), 188, 14}}, 36);
const std::vector<TAGTYPE> kSampleTags = {Sig("wtpt"), Sig("rTRC"), Sig("gTRC")};
// count file bytes from the given one, then zeros up to size.
Bytes FileBytes(std::uint32_t from, std::uint32_t count, std::uint32_t size = 0) {
  Bytes b(std::max(count, size), 0);
  for (std::uint32_t i = 0; i < count; ++i) b[i] = static_cast<std::uint8_t>(from + i);
  return b;
}
Bytes Element(HPROFILE h, TAGTYPE tag) {
  DWORD n = 0;
  GetColorProfileElement(h, tag, 0, &n, nullptr, nullptr);
  Bytes b(n);
  EXPECT_TRUE(GetColorProfileElement(h, tag, 0, &n, b.data(), nullptr));
  return b;
}
// Whether a read of the element reports shared data.
BOOL Shared(HPROFILE h, TAGTYPE tag) {
  BOOL reference = 7;
  DWORD n = 1;
  std::uint8_t b;
  EXPECT_TRUE(GetColorProfileElement(h, tag, 0, &n, &b, &reference));
  return reference;
}
BOOL Write(HPROFILE h, TAGTYPE tag, DWORD offset, Bytes data) {
  DWORD n = static_cast<DWORD>(data.size());
  return SetColorProfileElement(h, tag, offset, &n, data.data());
}

TEST(GetColorProfileElement, Boundaries) {
  HPROFILE h = OpenMemory(kSample, PROFILE_READ);
  constexpr DWORD kUntouched = 0xCAFE;
  // what, tag, offset, *pcbElement, with a buffer, result, error, *pcbElement after, the file
  // byte the copied bytes start at, *pbReference after
  const std::tuple<const char*, TAGTYPE, DWORD, DWORD, bool, BOOL, DWORD, DWORD, std::uint32_t, BOOL> cases[] = {
      {"size query", Sig("wtpt"), 0, 0, false, FALSE, ERROR_INSUFFICIENT_BUFFER, 20, 0, kUntouched},
      {"size query ignores offset", Sig("wtpt"), 7, 3, false, FALSE, ERROR_INSUFFICIENT_BUFFER, 20, 0, kUntouched},
      {"exact", Sig("wtpt"), 0, 20, true, TRUE, ERROR_SUCCESS, 20, 168, FALSE},
      {"larger buffer", Sig("wtpt"), 0, 64, true, TRUE, ERROR_SUCCESS, 20, 168, FALSE},
      {"smaller buffer", Sig("wtpt"), 0, 4, true, TRUE, ERROR_SUCCESS, 4, 168, FALSE},
      {"field at an offset", Sig("wtpt"), 8, 4, true, TRUE, ERROR_SUCCESS, 4, 176, FALSE},
      {"remainder shorter than buffer", Sig("wtpt"), 16, 64, true, TRUE, ERROR_SUCCESS, 4, 184, FALSE},
      {"offset = size", Sig("wtpt"), 20, 64, true, TRUE, ERROR_SUCCESS, 0, 0, FALSE},
      {"offset > size", Sig("wtpt"), 21, 64, true, FALSE, ERROR_INVALID_PARAMETER, 64, 0, kUntouched},
      {"absent tag", Sig("cprt"), 0, 64, true, FALSE, ERROR_TAG_NOT_FOUND, 64, 0, kUntouched},
      {"tag 0", 0, 0, 64, true, FALSE, ERROR_TAG_NOT_FOUND, 64, 0, kUntouched},
      {"shared data", Sig("gTRC"), 0, 64, true, TRUE, ERROR_SUCCESS, 14, 188, TRUE},
      {"shared data, other entry", Sig("rTRC"), 2, 5, true, TRUE, ERROR_SUCCESS, 5, 190, TRUE},
  };
  for (auto [what, tag, offset, pcb, withBuffer, result, error, pcbAfter, firstFileByte, referenceAfter] : cases) {
    SCOPED_TRACE(what);
    std::uint8_t buffer[64];
    std::memset(buffer, 0xEE, sizeof buffer);
    BOOL reference = kUntouched;
    EXPECT_WIN32(GetColorProfileElement(h, tag, offset, &pcb, withBuffer ? buffer : nullptr, &reference), result, error);
    EXPECT_EQ(pcb, pcbAfter);
    EXPECT_EQ(reference, referenceAfter);
    const std::size_t copied = result ? pcbAfter : 0;
    EXPECT_EQ(Bytes(buffer, buffer + copied), FileBytes(firstFileByte, static_cast<std::uint32_t>(copied)));
    for (std::size_t i = copied; i < sizeof buffer; ++i) ASSERT_EQ(buffer[i], 0xEE) << "wrote past " << copied;
  }
  DWORD pcb = 8;
  std::uint8_t buffer[8];
  EXPECT_WIN32(GetColorProfileElement(h, Sig("wtpt"), 0, nullptr, buffer, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(GetColorProfileElement(h, Sig("wtpt"), 0, &pcb, buffer, nullptr), TRUE, ERROR_SUCCESS);  // no reference
  EXPECT_TRUE(CloseColorProfile(h));
}

TEST(ColorProfileTags, IndexAndPresence) {
  HPROFILE h = OpenMemory(kSample, PROFILE_READ);
  EXPECT_WIN32(GetCountColorProfileElements(h, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(GetColorProfileElementTag(h, 1, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  for (DWORD bad : {0u, 4u, 0xFFFFFFFFu}) {
    TAGTYPE tag = 0x1234;
    EXPECT_WIN32(GetColorProfileElementTag(h, bad, &tag), FALSE, ERROR_INVALID_PARAMETER);
    EXPECT_EQ(tag, 0x1234u) << "left untouched";
  }
  EXPECT_EQ(TagList(h), kSampleTags);
  for (auto [tag, present] : {std::pair{Sig("wtpt"), TRUE}, {Sig("gTRC"), TRUE}, {Sig("cprt"), FALSE}, {0u, FALSE}}) {
    BOOL answer = 7;
    EXPECT_WIN32(IsColorProfileTagPresent(h, tag, &answer), TRUE, ERROR_SUCCESS);
    EXPECT_EQ(answer, present) << std::hex << tag;
  }
  EXPECT_WIN32(IsColorProfileTagPresent(h, Sig("wtpt"), nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_TRUE(CloseColorProfile(h));
}

TEST(SetColorProfileElement, WritesInsideTheElementOnly) {
  HPROFILE h = OpenMemory(kSample);
  std::uint8_t data[64];
  for (int i = 0; i < 64; ++i) data[i] = static_cast<std::uint8_t>(0x80 + i);
  // what, tag, offset, *pcbElement before and after, result, error
  const std::tuple<const char*, TAGTYPE, DWORD, DWORD, DWORD, BOOL, DWORD> cases[] = {
      {"inside", Sig("wtpt"), 2, 4, 4, TRUE, ERROR_SUCCESS},
      {"clipped at the end", Sig("wtpt"), 12, 64, 8, TRUE, ERROR_SUCCESS},
      {"offset = size", Sig("wtpt"), 20, 64, 0, TRUE, ERROR_SUCCESS},
      {"offset > size", Sig("wtpt"), 21, 4, 4, FALSE, ERROR_INVALID_PARAMETER},
      {"absent tag", Sig("cprt"), 0, 4, 4, FALSE, ERROR_TAG_NOT_FOUND},
  };
  for (auto [what, tag, offset, pcb, pcbAfter, result, error] : cases) {
    SCOPED_TRACE(what);
    EXPECT_WIN32(SetColorProfileElement(h, tag, offset, &pcb, data), result, error);
    EXPECT_EQ(pcb, pcbAfter);
  }
  // wtpt: bytes 0-1 original, 2-5 = data[0..3], 6-11 original, 12-19 = data[0..7].
  Bytes expected = FileBytes(168, 20);
  std::memcpy(&expected[2], data, 4);
  std::memcpy(&expected[12], data, 8);
  EXPECT_EQ(Element(h, Sig("wtpt")), expected);
  DWORD four = 4;
  EXPECT_WIN32(SetColorProfileElement(h, Sig("wtpt"), 0, nullptr, data), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_WIN32(SetColorProfileElement(h, Sig("wtpt"), 0, &four, nullptr), FALSE, ERROR_INVALID_PARAMETER);
  EXPECT_TRUE(CloseColorProfile(h));
}

TEST(ElementWrites, ReadOnlyHandlesRefuseEveryChange) {
  HPROFILE h = OpenMemory(kSample, PROFILE_READ);
  EXPECT_WIN32(Write(h, Sig("wtpt"), 0, {1, 2, 3, 4}), FALSE, ERROR_ACCESS_DENIED);
  for (TAGTYPE tag : {Sig("wtpt"), Sig("cprt")})
    for (DWORD size : {0u, 8u, 40u}) EXPECT_WIN32(SetColorProfileElementSize(h, tag, size), FALSE, ERROR_ACCESS_DENIED);
  EXPECT_WIN32(SetColorProfileElementReference(h, Sig("bTRC"), Sig("rTRC")), FALSE, ERROR_ACCESS_DENIED);
  EXPECT_EQ(Element(h, Sig("wtpt")), FileBytes(168, 20));
  EXPECT_EQ(TagList(h), kSampleTags);
  EXPECT_TRUE(CloseColorProfile(h));
}

TEST(SetColorProfileElementSize, GrowShrinkRemoveCreate) {
  HPROFILE h = OpenMemory(kSample);
  EXPECT_WIN32(SetColorProfileElementSize(h, Sig("wtpt"), 30), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(Element(h, Sig("wtpt")), FileBytes(168, 20, 30));
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("wtpt"), 8));
  EXPECT_EQ(Element(h, Sig("wtpt")), FileBytes(168, 8));
  EXPECT_WIN32(SetColorProfileElementSize(h, Sig("wtpt"), 0), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(TagList(h), (std::vector<TAGTYPE>{Sig("rTRC"), Sig("gTRC")}));
  EXPECT_WIN32(SetColorProfileElementSize(h, Sig("wtpt"), 0), FALSE, ERROR_TAG_NOT_FOUND);
  EXPECT_WIN32(SetColorProfileElementSize(h, 0, 8), FALSE, ERROR_INVALID_PARAMETER);
  // Create, then fill: a new element is zero-filled and goes to the end of the table.
  EXPECT_WIN32(SetColorProfileElementSize(h, Sig("cprt"), 12), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(Element(h, Sig("cprt")), Bytes(12, 0));
  EXPECT_EQ(TagList(h), (std::vector<TAGTYPE>{Sig("rTRC"), Sig("gTRC"), Sig("cprt")}));
  const Bytes text = {'t', 'e', 'x', 't', 0, 0, 0, 0, 'a', 'b', 'c', 0};
  ASSERT_TRUE(Write(h, Sig("cprt"), 0, text));
  EXPECT_EQ(Element(h, Sig("cprt")), text);
  EXPECT_TRUE(CloseColorProfile(h));
}

TEST(SharedElements, ResizeOrRewriteGivesAnOwnCopy) {
  for (bool resize : {true, false}) {
    SCOPED_TRACE(resize ? "resize" : "rewrite");
    HPROFILE h = OpenMemory(kSample);
    ASSERT_TRUE(resize ? SetColorProfileElementSize(h, Sig("gTRC"), 18) : Write(h, Sig("gTRC"), 0, {0, 0}));
    EXPECT_EQ(Element(h, Sig("rTRC")), FileBytes(188, 14)) << "the sibling stays intact";
    Bytes changed = FileBytes(188, 14, resize ? 18 : 14);
    if (!resize) changed[0] = changed[1] = 0;
    EXPECT_EQ(Element(h, Sig("gTRC")), changed);
    EXPECT_EQ(Shared(h, Sig("rTRC")), FALSE);
    EXPECT_EQ(Shared(h, Sig("gTRC")), FALSE);
    EXPECT_TRUE(CloseColorProfile(h));
  }
}

// The saved layout: table in order, data 4-byte aligned, size field = byte count,
// shared data written once, every element's bytes as the calls left them.
TEST(SerializeProfile, LaysOutAlignedSharedData) {
  Bytes source = MakeProfile({{Sig("wtpt"), 181, 19}, {Sig("rTRC"), 200, 13}, {Sig("gTRC"), 200, 13},
                              {Sig("desc"), 213, 5}},
                             40);  // unaligned on purpose
  HPROFILE h = OpenMemory(source);
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("desc"), 7));
  std::vector<std::uint8_t> saved;
  ASSERT_TRUE(win32::icm::SerializeProfile(h, saved));
  EXPECT_TRUE(CloseColorProfile(h));
  ASSERT_GE(saved.size(), 132u);
  EXPECT_EQ(BE32(saved, 0), saved.size());
  EXPECT_EQ(saved.size() % 4, 0u);
  const std::vector<TagEntry> table = TagTable(saved);
  ASSERT_EQ(table.size(), 4u);
  const TAGTYPE order[] = {Sig("wtpt"), Sig("rTRC"), Sig("gTRC"), Sig("desc")};
  for (std::size_t i = 0; i < 4; ++i) {
    EXPECT_EQ(table[i].signature, order[i]);
    EXPECT_EQ(table[i].offset % 4, 0u) << i;
    EXPECT_GE(table[i].offset, 132u + 48u);
    ASSERT_LE(std::uint64_t{table[i].offset} + table[i].size, saved.size());
  }
  EXPECT_EQ(table[1].offset, table[2].offset) << "shared data stays shared";
  EXPECT_EQ(TagBytes(saved, table[0]), FileBytes(181, 19));
  EXPECT_EQ(TagBytes(saved, table[1]), FileBytes(200, 13));
  EXPECT_EQ(TagBytes(saved, table[3]), FileBytes(213, 5, 7));
  EXPECT_EQ(saved[table[0].offset + 19], 0);  // zero padding
}

TEST(SetColorProfileElementReference, ParameterChecksThenSharing) {
  HPROFILE h = OpenMemory(kSample);
  const std::tuple<HPROFILE, TAGTYPE, TAGTYPE, DWORD> refused[] = {
      {nullptr, Sig("bTRC"), Sig("rTRC"), ERROR_INVALID_HANDLE},
      {h, 0, Sig("rTRC"), ERROR_INVALID_PARAMETER},
      {h, Sig("bTRC"), Sig("cprt"), ERROR_TAG_NOT_FOUND},    // absent reference
      {h, Sig("gTRC"), Sig("wtpt"), ERROR_DUPLICATE_TAG},    // the new tag exists
      {h, Sig("wtpt"), Sig("wtpt"), ERROR_DUPLICATE_TAG},  // itself
  };
  for (auto [handle, newTag, refTag, error] : refused)
    EXPECT_WIN32(SetColorProfileElementReference(handle, newTag, refTag), FALSE, error);
  EXPECT_EQ(TagList(h), kSampleTags) << "nothing added";

  EXPECT_WIN32(SetColorProfileElementReference(h, Sig("bXYZ"), Sig("wtpt")), TRUE, ERROR_SUCCESS);
  EXPECT_EQ(TagList(h), (std::vector<TAGTYPE>{Sig("wtpt"), Sig("rTRC"), Sig("gTRC"), Sig("bXYZ")}));
  EXPECT_EQ(Element(h, Sig("bXYZ")), FileBytes(168, 20));
  EXPECT_EQ(Shared(h, Sig("wtpt")), TRUE);
  EXPECT_EQ(Shared(h, Sig("bXYZ")), TRUE);
  // A reference to a reference joins the same data; the saved file holds it once.
  ASSERT_TRUE(SetColorProfileElementReference(h, Sig("bTRC"), Sig("gTRC")));
  std::vector<std::uint8_t> saved;
  ASSERT_TRUE(win32::icm::SerializeProfile(h, saved));
  const std::vector<TagEntry> table = TagTable(saved);
  ASSERT_EQ(table.size(), 5u);
  EXPECT_EQ(BE32(saved, 0), saved.size());
  EXPECT_EQ(saved.size(), 132u + 5 * 12 + 20 + 16) << "two data blocks, each once, aligned";
  EXPECT_EQ(table[3].offset, table[0].offset);
  EXPECT_EQ(table[4].offset, table[1].offset);
  EXPECT_EQ(table[4].size, 14u);

  // Removing the original leaves the reference its data; rewriting the reference
  // leaves its sibling intact.
  ASSERT_TRUE(SetColorProfileElementSize(h, Sig("wtpt"), 0));
  EXPECT_EQ(Element(h, Sig("bXYZ")), FileBytes(168, 20));
  ASSERT_TRUE(Write(h, Sig("bTRC"), 0, {0, 0}));
  EXPECT_EQ(Element(h, Sig("gTRC")), FileBytes(188, 14));
  EXPECT_TRUE(CloseColorProfile(h));
}

}  // namespace
