// The pieces every tag codec shares, driven from inside while the host runs this program
// as the plugin: bounded big-endian reads, s15Fixed16 at its limits, a piece-by-piece
// write that stops at its first failure, and the fetch of a whole element.
#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "error_state.h"
#include "plugin_fixture.h"
#include "profile_files.h"
#include "tag_io.h"

namespace {

using Bytes = std::vector<uint8_t>;
using Trace = std::vector<std::string>;
constexpr TAGTYPE kTestTag = 0x74657374;     // 'test'
constexpr TAGTYPE kWhitePoint = 0x77747074;  // 'wtpt'

TEST(ByteReaderTest, EveryReadStopsAtTheLastByteAndLeavesItsOutputAlone) {
  const Bytes data{0x12, 0x34, 0x56, 0x78, 0x9A};
  const ByteReader r(data.data(), data.size());
  const std::size_t huge = std::numeric_limits<std::size_t>::max();
  uint8_t u8 = 0xEE;
  uint16_t u16 = 0xEEEE;
  uint32_t u32 = 0xEEEEEEEE;
  double d = -9.0;
  for (std::size_t at : {std::size_t{5}, huge}) EXPECT_FALSE(r.U8(at, &u8)) << at;
  for (std::size_t at : {std::size_t{4}, huge - 1, huge}) EXPECT_FALSE(r.U16(at, &u16)) << at;
  for (std::size_t at : {std::size_t{2}, huge - 3, huge}) EXPECT_FALSE(r.U32(at, &u32) || r.S15Fixed16(at, &d)) << at;
  EXPECT_EQ((std::vector<double>{double(u8), double(u16), double(u32), d}),
            (std::vector<double>{0xEE, 0xEEEE, 0xEEEEEEEE, -9.0}));
  EXPECT_TRUE(r.U8(4, &u8) && r.U16(3, &u16) && r.U32(1, &u32));
  EXPECT_EQ((std::vector<uint32_t>{u8, u16, u32}), (std::vector<uint32_t>{0x9A, 0x789A, 0x3456789A}));
}

TEST(S15Fixed16Test, TruncatesTowardZeroAndSaturatesWhatNoWordHolds) {
  const double nan = std::numeric_limits<double>::quiet_NaN(), inf = std::numeric_limits<double>::infinity();
  const std::pair<double, uint32_t> cases[] = {
      {0.9642, 0x0000F6D5},   {1.0, 0x00010000},     {-0.5, 0xFFFF8000},     {-0.00001, 0},
      {0.00001, 0},           {-1.00001, 0xFFFF0000}, {32767.99999, 0x7FFFFFFF}, {32768.0, 0x7FFFFFFF},
      {1e300, 0x7FFFFFFF},    {inf, 0x7FFFFFFF},     {-32768.0, 0x80000000}, {-40000.0, 0x80000000},
      {-inf, 0x80000000},     {nan, 0},
  };
  for (const auto& [value, word] : cases) {
    uint8_t at[4];
    StoreS15Fixed16(at, value);
    EXPECT_EQ(uint32_t(at[0]) << 24 | at[1] << 16 | at[2] << 8 | at[3], word) << value;
    double back = 0;
    ASSERT_TRUE(ByteReader(at, 4).S15Fixed16(0, &back));
    EXPECT_EQ(back, int32_t(word) / 65536.0) << value;  // read signed
  }
}

class TagIoTest : public PluginTest {
 protected:
  TagIoTest() : PluginTest("") {}
  void TearDown() override {
    for (HPROFILE h : opened_) CloseColorProfile(h);
    PluginTest::TearDown();
  }
  HPROFILE Open(DWORD access) {
    PROFILE p{PROFILE_MEMBUFFER, bytes_.data(), DWORD(bytes_.size())};
    opened_.push_back(OpenColorProfileA(&p, access, FILE_SHARE_READ, OPEN_EXISTING));
    EXPECT_NE(opened_.back(), nullptr);
    return opened_.back();
  }
  void Reset(int32_t error) { SetCMError(error), log.entries.clear(); }

  std::vector<char> bytes_ = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
  std::vector<HPROFILE> opened_;
};

TEST_F(TagIoTest, PiecesLandBehindEachOtherBigEndianAndAWriteReplacesTheWholeElement) {
  const HPROFILE h = Open(PROFILE_READWRITE);
  {
    TagWriter w(h, kTestTag, 14);
    EXPECT_TRUE(w.PutTypeHeader(0x61626364, "m1") && w.PutU16(0x0102, "m2") && w.PutU32(0x03040506, "m3"));
    EXPECT_FALSE(w.failed());
    EXPECT_EQ(w.offset(), 14u);
  }
  Bytes read;
  ASSERT_EQ(ReadWholeTag(h, kTestTag, read), TagRead::Ok);
  EXPECT_EQ(read, (Bytes{'a', 'b', 'c', 'd', 0, 0, 0, 0, 1, 2, 3, 4, 5, 6}));
  TagWriter(h, kTestTag, 8).PutTypeHeader(0x77777777, "m1");  // nothing of the longer one may be left
  ASSERT_EQ(ReadWholeTag(h, kTestTag, read), TagRead::Ok);
  EXPECT_EQ(read, (Bytes{'w', 'w', 'w', 'w', 0, 0, 0, 0}));
}

TEST_F(TagIoTest, TheFirstFailedPieceIsTracedAndReportedAndTheLaterOnesAreSilent) {
  Debugger();
  // On a read-only profile the first piece fails; an element sized too small, the second.
  for (const auto& [access, total, code] : {std::tuple<DWORD, DWORD, int32_t>{PROFILE_READ, 12, ERROR_ACCESS_DENIED},
                                            {PROFILE_READWRITE, 10, ERROR_INVALID_PARAMETER}}) {
    Reset(0);
    TagWriter w(Open(access), kTestTag, total);
    const bool first = w.PutTypeHeader(kTypeCurve, "piece 1 fail");
    EXPECT_EQ(first, access == PROFILE_READWRITE);
    EXPECT_FALSE(w.PutU32(7, "piece 2 fail") || w.PutU32(8, "piece 3 fail"));
    EXPECT_TRUE(w.failed());
    EXPECT_EQ(Error(), code);
    EXPECT_EQ(log.entries, (Trace{std::string("DebugString:piece ") + (first ? "2" : "1") + " fail",
                                  "DebugError:" + std::to_string(code) + ","}));
  }
}

TEST_F(TagIoTest, TheWholeReadFailsWithItsTraceAndCode) {
  Debugger();
  const HPROFILE h = Open(PROFILE_READWRITE), closed = reinterpret_cast<HPROFILE>(0x7777);
  ASSERT_TRUE(SetColorProfileElementSize(h, kTestTag, 7));  // one byte short of a type header
  const struct {
    HPROFILE profile;
    TAGTYPE tag;
    Trace trace;
    int32_t code;  // -2: left as it was
  } cases[] = {
      {h, 0x61626364, {"DebugString:Tag is not present"}, -2},
      {closed, kWhitePoint, {"DebugString:IsColorProfileTagPresent error", "DebugError:6,"}, ERROR_INVALID_HANDLE},
      {h, kTestTag, {"DebugString:Tag is too short to hold its type", "DebugError:2011,"}, ERROR_INVALID_PROFILE},
  };
  for (const auto& c : cases) {
    Reset(-2);
    Bytes read;
    EXPECT_EQ(ReadWholeTag(c.profile, c.tag, read), TagRead::Failed) << c.trace[0];
    EXPECT_EQ(Error(), c.code) << c.trace[0];
    EXPECT_EQ(log.entries, c.trace);
  }
  // A present tag reads although the size query itself answers FALSE.
  Bytes white;
  ASSERT_EQ(ReadWholeTag(h, kWhitePoint, white), TagRead::Ok);
  EXPECT_EQ(white.size(), 20u);
  EXPECT_EQ(TagTypeOf(white), kTypeXYZ);
}

}  // namespace
