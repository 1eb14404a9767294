// The pieces every tag codec shares, driven from inside while the host runs this
// program as the plugin: bounded big-endian reads, the s15Fixed16 encoding at its
// limits, a piece-by-piece write that stops at its first failure, and the fetch of a
// whole element.
#include <cmath>
#include <cstdint>
#include <initializer_list>
#include <limits>
#include <string>
#include <vector>

#include "error_state.h"
#include "plugin_fixture.h"
#include "profile_files.h"
#include "tag_io.h"

namespace {

constexpr TAGTYPE kTestTag = 0x74657374;  // 'test'
constexpr TAGTYPE kWhitePoint = 0x77747074;  // 'wtpt'

std::vector<uint8_t> Bytes(std::initializer_list<int> values) { return {values.begin(), values.end()}; }

TEST(ByteReaderTest, EveryReadStopsAtTheLastByteAndLeavesItsOutputAlone) {
  const std::vector<uint8_t> data = Bytes({0x12, 0x34, 0x56, 0x78, 0x9A});
  const ByteReader r(data.data(), data.size());
  const std::size_t huge = std::numeric_limits<std::size_t>::max();
  uint8_t u8 = 0xEE;
  uint16_t u16 = 0xEEEE;
  uint32_t u32 = 0xEEEEEEEE;
  double d = -9.0;
  EXPECT_TRUE(r.U8(4, &u8));
  EXPECT_EQ(u8, 0x9A);
  EXPECT_TRUE(r.U16(3, &u16));
  EXPECT_EQ(u16, 0x789A);
  EXPECT_TRUE(r.U32(1, &u32));
  EXPECT_EQ(u32, 0x3456789Au);
  u8 = 0xEE, u16 = 0xEEEE, u32 = 0xEEEEEEEE;
  for (std::size_t offset : {std::size_t{5}, std::size_t{6}, huge}) EXPECT_FALSE(r.U8(offset, &u8)) << offset;
  for (std::size_t offset : {std::size_t{4}, huge - 1, huge}) EXPECT_FALSE(r.U16(offset, &u16)) << offset;
  for (std::size_t offset : {std::size_t{2}, huge - 3, huge}) EXPECT_FALSE(r.U32(offset, &u32)) << offset;
  EXPECT_FALSE(r.S15Fixed16(2, &d));
  EXPECT_EQ(u8, 0xEE);
  EXPECT_EQ(u16, 0xEEEE);
  EXPECT_EQ(u32, 0xEEEEEEEEu);
  EXPECT_EQ(d, -9.0);
  EXPECT_FALSE(r.Has(huge, 1));
  EXPECT_TRUE(r.Has(5, 0));
}

TEST(S15Fixed16Test, TruncatesTowardZeroAndSaturatesWhatNoWordHolds) {
  const double nan = std::numeric_limits<double>::quiet_NaN(), inf = std::numeric_limits<double>::infinity();
  const struct {
    double value;
    uint32_t word;
  } cases[] = {
      {0.9642, 0x0000F6D5},  {1.0, 0x00010000},      {0.8249, 0x0000D32C},   {-0.5, 0xFFFF8000},
      {-0.00001, 0},         {0.00001, 0},           {-1.00001, 0xFFFF0000}, {32767.99999, 0x7FFFFFFF},
      {32768.0, 0x7FFFFFFF}, {1e300, 0x7FFFFFFF},    {inf, 0x7FFFFFFF},      {-32768.0, 0x80000000},
      {-40000.0, 0x80000000}, {-inf, 0x80000000},    {nan, 0},
  };
  for (const auto& c : cases) {
    uint8_t at[4];
    StoreS15Fixed16(at, c.value);
    const uint32_t word = static_cast<uint32_t>(at[0]) << 24 | at[1] << 16 | at[2] << 8 | at[3];
    EXPECT_EQ(word, c.word) << c.value;
    double back = 0;
    ASSERT_TRUE(ByteReader(at, 4).S15Fixed16(0, &back));
    EXPECT_EQ(back, static_cast<int32_t>(c.word) / 65536.0) << c.value;  // read signed
  }
}

class TagIoTest : public PluginTest {
 protected:
  TagIoTest() : PluginTest("") {}

  void SetUp() override {
    PluginTest::SetUp();
    bytes_ = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
    ASSERT_FALSE(bytes_.empty());
  }
  void TearDown() override {
    for (HPROFILE h : opened_) CloseColorProfile(h);
    PluginTest::TearDown();
  }
  HPROFILE Open(DWORD access) {
    PROFILE p{PROFILE_MEMBUFFER, bytes_.data(), static_cast<DWORD>(bytes_.size())};
    HPROFILE h = OpenColorProfileA(&p, access, FILE_SHARE_READ, OPEN_EXISTING);
    EXPECT_NE(h, nullptr);
    opened_.push_back(h);
    return h;
  }

  std::vector<char> bytes_;
  std::vector<HPROFILE> opened_;
};

TEST_F(TagIoTest, PiecesLandBehindEachOtherBigEndianAndReadBackWhole) {
  const HPROFILE h = Open(PROFILE_READWRITE);
  {
    TagWriter w(h, kTestTag, 14);
    EXPECT_TRUE(w.PutTypeHeader(0x61626364, "m1"));
    EXPECT_TRUE(w.PutU16(0x0102, "m2"));
    EXPECT_TRUE(w.PutU32(0x03040506, "m3"));
    EXPECT_FALSE(w.failed());
    EXPECT_EQ(w.offset(), 14u);
  }
  std::vector<uint8_t> read;
  ASSERT_EQ(ReadWholeTag(h, kTestTag, read), TagRead::Ok);
  EXPECT_EQ(read, Bytes({'a', 'b', 'c', 'd', 0, 0, 0, 0, 1, 2, 3, 4, 5, 6}));
  EXPECT_EQ(TagTypeOf(read), 0x61626364u);

  // A second write replaces the element whole: nothing of the longer one is left.
  { TagWriter(h, kTestTag, 8).PutTypeHeader(0x77777777, "m1"); }
  ASSERT_EQ(ReadWholeTag(h, kTestTag, read), TagRead::Ok);
  EXPECT_EQ(read, Bytes({'w', 'w', 'w', 'w', 0, 0, 0, 0}));
}

TEST_F(TagIoTest, TheFirstFailedPieceIsTracedAndReportedAndNothingFollowsIt) {
  Debugger();
  const struct {
    const char* what;
    DWORD access;
    DWORD total;  // too small a total makes the second piece run past the element
    int32_t code;
  } cases[] = {
      {"read-only profile", PROFILE_READ, 12, ERROR_ACCESS_DENIED},
      {"element shorter than its pieces", PROFILE_READWRITE, 10, ERROR_INVALID_PARAMETER},
  };
  for (const auto& c : cases) {
    log.entries.clear();
    SetCMError(0);
    TagWriter w(Open(c.access), kTestTag, c.total);
    const bool first = w.PutTypeHeader(kTypeCurve, "piece 1 fail");
    EXPECT_EQ(first, c.access == PROFILE_READWRITE) << c.what;
    EXPECT_FALSE(w.PutU32(7, "piece 2 fail")) << c.what;
    EXPECT_FALSE(w.PutU32(8, "piece 3 fail")) << c.what;
    EXPECT_TRUE(w.failed()) << c.what;
    EXPECT_EQ(Error(), c.code) << c.what;
    const std::string failed = first ? "piece 2 fail" : "piece 1 fail";
    const std::vector<std::string> trace = {"DebugString:" + failed, "DebugError:" + std::to_string(c.code) + ","};
    EXPECT_EQ(log.entries, trace) << c.what;  // traced, then reported; the later pieces are silent
  }
}

TEST_F(TagIoTest, TheWholeReadFailsWithItsTraceAndCode) {
  Debugger();
  const HPROFILE h = Open(PROFILE_READWRITE);
  ASSERT_TRUE(SetColorProfileElementSize(h, kTestTag, 7));  // one byte short of a type header
  const struct {
    const char* what;
    HPROFILE profile;
    TAGTYPE tag;
    std::vector<std::string> trace;
    int32_t code;  // -2: left as it was
  } cases[] = {
      {"absent tag", h, 0x61626364, {"DebugString:Tag is not present"}, -2},
      {"closed handle", reinterpret_cast<HPROFILE>(0x7777), kWhitePoint,
       {"DebugString:IsColorProfileTagPresent error", "DebugError:6,"}, ERROR_INVALID_HANDLE},
      {"element too short for a type", h, kTestTag,
       {"DebugString:Tag is too short to hold its type", "DebugError:2011,"}, ERROR_INVALID_PROFILE},
  };
  for (const auto& c : cases) {
    SetCMError(-2);
    log.entries.clear();
    std::vector<uint8_t> read;
    EXPECT_EQ(ReadWholeTag(c.profile, c.tag, read), TagRead::Failed) << c.what;
    EXPECT_EQ(Error(), c.code) << c.what;
    EXPECT_EQ(log.entries, c.trace) << c.what;
  }
  // A present tag reads although the size query itself answers FALSE.
  std::vector<uint8_t> white;
  ASSERT_EQ(ReadWholeTag(h, kWhitePoint, white), TagRead::Ok);
  EXPECT_EQ(white.size(), 20u);
  EXPECT_EQ(TagTypeOf(white), kTypeXYZ);
}

}  // namespace
