// cLut and the lut8/lut16 tags, driven as a script drives them: the object's values and
// references, SetMFT's bytes as Little CMS reads them, tags that lie about their tables,
// a real profile's table against its bytes, and a written table at work in a Little CMS
// transform.

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using host::Value;
using Doubles = std::vector<double>;

std::vector<uint8_t> RawA2B0(const std::string& path) { return LcmsFile(path).Raw("A2B0"); }

uint32_t U32At(const std::vector<uint8_t>& b, size_t at) {
  return at + 4 <= b.size() ? uint32_t(b[at]) << 24 | uint32_t(b[at + 1]) << 16 | uint32_t(b[at + 2]) << 8 | b[at + 3]
                            : 0xDEADBEEF;
}

class LutTest : public PluginTest {
 protected:
  Object Member(const Object& lut, const char* name) { return rt->Get(lut, name).AsObject(); }
  Doubles Table(const Object& lut, const char* name) { return Values(Member(lut, name)); }
  void Fill(const Object& lut, const char* name, const Doubles& values) {
    Object v = Member(lut, name);
    rt->Call(v, "Clear");
    for (double d : values) rt->Call(v, "Append", {d});
  }
  Doubles MatrixOf(const Object& lut) {
    Object m = Member(lut, "Matrix3D");
    Doubles out;
    for (int r = 0; r < 3; ++r)
      for (int c = 0; c < 3; ++c) out.push_back(rt->Call(m, "get", {c, r}).AsDouble());
    return out;
  }
  // Is16Bit, GridPointCount, InChannelCount, OutChannelCount, InputEntries, OutputEntries.
  std::vector<int> Counts(const Object& lut) {
    std::vector<int> out = {rt->Get(lut, "Is16Bit").AsBoolean()};
    for (const char* p : {"GridPointCount", "InChannelCount", "OutChannelCount", "InputEntries", "OutputEntries"})
      out.push_back(rt->Get(lut, p).AsInteger());
    return out;
  }
  Object NewLut(bool is16, int i, int o, int g) {
    Object lut = rt->New("cLut");
    rt->Set(lut, "Is16Bit", is16);
    rt->Set(lut, "InChannelCount", i);
    rt->Set(lut, "OutChannelCount", o);
    rt->Set(lut, "GridPointCount", g);
    return lut;
  }
  ProfileFiles files;
};

const Doubles kIdentity = {1, 0, 0, 0, 1, 0, 0, 0, 1};
const std::vector<int> kNewCounts = {1, 0, 1, 1, 0, 0};

Doubles Ramp(size_t n, double scale) {
  Doubles v(n);
  for (size_t k = 0; k < n; ++k) v[k] = std::fmod(k * 37.0, scale);
  return v;
}

TEST_F(LutTest, NewValuesDerivedCountsAndReferences) {
  const size_t before = rt->LiveObjects();
  {
    // New runs the class constructor and then Clut(); a further Clut() starts afresh.
    Object lut = rt->New("cLut");
    EXPECT_EQ(rt->LiveObjects(), before + 5);
    EXPECT_EQ(Counts(lut), kNewCounts);
    EXPECT_EQ(MatrixOf(lut), kIdentity);
    for (const char* t : {"InCurve", "Lut", "OutCurve"}) EXPECT_TRUE(Table(lut, t).empty()) << t;

    Fill(lut, "InCurve", Doubles(512));
    Fill(lut, "OutCurve", Doubles(7));
    const struct {
      int in, out;
      int inputEntries, outputEntries;
    } quotients[] = {{2, 3, 256, 2}, {3, 7, 170, 1}, {0, 0, 0, 0}, {-2, 8, -256, 0}};
    for (const auto& q : quotients) {
      rt->Set(lut, "InChannelCount", q.in);
      rt->Set(lut, "OutChannelCount", q.out);
      rt->Set(lut, "InputEntries", 99);  // ignored
      rt->Set(lut, "OutputEntries", 99);
      EXPECT_EQ(rt->Get(lut, "InputEntries").AsInteger(), q.inputEntries) << q.in;
      EXPECT_EQ(rt->Get(lut, "OutputEntries").AsInteger(), q.outputEntries) << q.out;
    }
    rt->Call(lut, "Clut");
    EXPECT_EQ(Counts(lut), kNewCounts);
    EXPECT_TRUE(Table(lut, "InCurve").empty());
    EXPECT_EQ(rt->LiveObjects(), before + 5);

    // A member shared with the script outlives the cLut; one set to itself stays alive.
    Object shared = rt->New("Vector");
    rt->Call(shared, "Append", {4.0});
    rt->Set(lut, "Lut", shared);
    rt->Set(lut, "Lut", Member(lut, "Lut"));
    EXPECT_EQ(Table(lut, "Lut"), Doubles{4.0});
    EXPECT_EQ(rt->LiveObjects(), before + 5);
  }
  EXPECT_EQ(rt->LiveObjects(), before);
}

// Nil members count as empty tables and the identity matrix, and a zero channel count
// as no entries, in Debug() and in the writer alike.
TEST_F(LutTest, NilMembersAndZeroCountsNeverTrap) {
  const std::string path = files.Copy("sRGB.icc", "nil.icc");
  Object p = Open(path);
  Object lut = NewLut(true, 0, 0, 2);
  Fill(lut, "InCurve", {5, 6});
  rt->Set(lut, "Matrix3D", Value());
  rt->Set(lut, "OutCurve", Value());
  EXPECT_TRUE(rt->Get(lut, "OutCurve").IsNil());
  Object d = Debugger();
  rt->Call(lut, "Debug");
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugString:---Debug Clut---", "DebugString:Is16", "DebugBoolean:true",
                                      "DebugString:clutPts", "DebugInteger:2", "DebugString:inChan", "DebugInteger:0",
                                      "DebugString:outChan", "DebugInteger:0", "DebugString:InputEntries",
                                      "DebugInteger:0", "DebugString:OutputEntries", "DebugInteger:0",
                                      "DebugString:InCurve", "DebugDouble:5.000000", "DebugDouble:6.000000",
                                      "DebugString:lut", "DebugString:OutCurve"}));
  rt->Call(p, "SetMFT", {"A2B0", lut});
  EXPECT_EQ(Error(), 0);
  rt->Call(p, "SaveProfile");
  const std::vector<uint8_t> tag = RawA2B0(path);
  ASSERT_EQ(tag.size(), 56u);
  EXPECT_EQ(U32At(tag, 12), 0x00010000u);  // e00 of the identity
  EXPECT_EQ(U32At(tag, 16), 0u);
  EXPECT_EQ(U32At(tag, 44), 0x00010000u);  // e22
  EXPECT_EQ(U32At(tag, 48), 0u);           // n and m: no channels, no entries
  EXPECT_EQ(U32At(tag, 52), 0x00050006u);

  rt->Call(p, "SetMFT", {"A2B0", Value()});
  EXPECT_EQ(Error(), -1);
}

TEST_F(LutTest, TablesAreStoredAsLittleCmsReadsThemAndReadBack) {
  const struct {
    bool is16;
    int i, o, g;
    Doubles in, grid, out, matrix;
    size_t size;
    uint32_t entries;                   // lut16: the word at 48 (n, m)
    Doubles inBack;                     // the input tables read back
    std::vector<uint32_t> matrixWords;  // e00, e01, e02
  } cases[] = {
      {false, 3, 3, 2, Ramp(768, 256), Ramp(24, 256), Ramp(768, 256), {1.0, -1.5, 0.3, 0, 1, 0, 0, 0, 1}, 1608, 0,
       Ramp(768, 256), {0x00010000, 0xFFFE8000, 19660}},
      {false, 1, 1, 0, {300.7, -1, 255.9}, {}, {}, kIdentity, 51, 0, {44, 255, 255}, {0x00010000, 0, 0}},
      {true, 2, 3, 2, Ramp(512, 65536), Ramp(12, 65536), Ramp(30, 65536), kIdentity, 52 + 2 * 554, 0x0100000A,
       Ramp(512, 65536), {0x00010000, 0, 0}},
      // No tables at all: no channels, or a grid of no points.
      {true, 0, 0, 0, {}, {}, {}, kIdentity, 52, 0, {}, {0x00010000, 0, 0}},
      {true, 2, 1, 0, {}, {}, {}, kIdentity, 52, 0, {}, {0x00010000, 0, 0}},
      {true, 1, 1, 2, {70000.2, -1}, {1, 2}, {}, kIdentity, 60, 0x00020000, {4464, 65535}, {0x00010000, 0, 0}},
  };
  for (const auto& c : cases) {
    const std::string what = std::to_string(c.is16) + " " + std::to_string(c.in.size());
    const std::string path = files.Copy("sRGB.icc", "w.icc");
    Object p = Open(path);
    Object lut = NewLut(c.is16, c.i, c.o, c.g);
    Fill(lut, "InCurve", c.in);
    Fill(lut, "Lut", c.grid);
    Fill(lut, "OutCurve", c.out);
    Object m = Member(lut, "Matrix3D");
    for (int k = 0; k < 9; ++k) rt->Call(m, "set", {c.matrix[k], k % 3, k / 3});
    rt->Call(p, "SetMFT", {"A2B0", lut});
    EXPECT_EQ(Error(), 0) << what;
    rt->Call(p, "SaveProfile");

    const std::vector<uint8_t> tag = RawA2B0(path);
    ASSERT_EQ(tag.size(), c.size) << what;
    EXPECT_EQ(U32At(tag, 0), c.is16 ? 0x6D667432u : 0x6D667431u) << what;
    EXPECT_EQ(U32At(tag, 8), uint32_t(c.i) << 24 | uint32_t(c.o) << 16 | uint32_t(c.g) << 8) << what;
    EXPECT_EQ((std::vector<uint32_t>{U32At(tag, 12), U32At(tag, 16), U32At(tag, 20)}), c.matrixWords) << what;
    if (c.is16) {
      EXPECT_EQ(U32At(tag, 48), c.entries) << what;
    } else {
      EXPECT_EQ(Doubles(tag.begin() + 48, tag.begin() + 48 + long(c.in.size())), c.inBack) << what;
      if (c.size == 51) continue;  // tables shorter than 256 entries are not read back
    }

    Object back = rt->Call(p, "GetMFT", {"A2B0"}).AsObject();
    EXPECT_EQ(Error(), 0) << what;
    std::vector<int> counts = Counts(back);
    counts.resize(4);
    EXPECT_EQ(counts, (std::vector<int>{c.is16, c.g, c.i, c.o})) << what;
    EXPECT_EQ(Table(back, "InCurve"), c.inBack) << what;
    EXPECT_EQ(Table(back, "Lut"), c.grid) << what;
    EXPECT_EQ(Table(back, "OutCurve"), c.out) << what;
    Doubles matrix = c.matrix;
    for (double& e : matrix) e = std::trunc(e * 65536.0) / 65536.0;
    EXPECT_EQ(MatrixOf(back), matrix) << what;
  }
}

// A lut16 tag (i 3, o 3, g 2, n 2, m 2) written, saved, then altered in the file.
TEST_F(LutTest, TagsThatLieAreRefusedAndLeaveTheNewValues) {
  const std::string path = files.Copy("sRGB.icc", "lie.icc");
  {
    Object p = Open(path);
    Object lut = NewLut(true, 3, 3, 2);
    Fill(lut, "InCurve", Ramp(6, 65536));
    Fill(lut, "Lut", Ramp(24, 65536));
    Fill(lut, "OutCurve", Ramp(6, 65536));
    rt->Call(p, "SetMFT", {"A2B0", lut});
    rt->Call(p, "SaveProfile");
  }
  const std::vector<char> good = ProfileFiles::Read(path);
  const char sig[] = "mft2";
  const size_t at = size_t(std::search(good.begin(), good.end(), sig, sig + 4) - good.begin());
  ASSERT_LT(at, good.size());
  const char* const beyond = "Lut tables exceed the tag";
  const struct {
    size_t offset;
    uint32_t value;
    const char* message;
  } cases[] = {
      {at + 8, 0x0F03FF00, beyond},                          // 255^15 grid cells
      {at + 8, 0x03030300, beyond},                          // 27 cells where 8 are stored
      {at + 8, 0xFFFF0200, beyond},                          // 255 channels each way
      {at + 48, 0xFFFF0002, beyond},                         // 65535 input entries
      {at + 48, 0x00020003, beyond},                         // one output entry too many
      {at, 0x6D414220, "Tag is not a lut8 or lut16 table"},  // 'mAB '
      {at, 0x6D667431, beyond},                              // the same bytes as a lut8: 768 input entries
  };
  for (const auto& c : cases) {
    std::vector<char> lie = good;
    for (int k = 0; k < 4; ++k) lie[c.offset + k] = char(c.value >> (24 - 8 * k));
    ProfileFiles::Write(path, lie);
    Object p = Open(path);
    Object d = Debugger();
    Object lut = rt->Call(p, "GetMFT", {"A2B0"}).AsObject();
    EXPECT_EQ(Error(), 2011) << c.message;  // ERROR_INVALID_PROFILE
    EXPECT_TRUE(Traced(c.message)) << c.message;
    EXPECT_EQ(Counts(lut), kNewCounts) << c.message;
    for (const char* t : {"InCurve", "Lut", "OutCurve"}) EXPECT_TRUE(Table(lut, t).empty()) << c.message;
  }

  ProfileFiles::Write(path, good);
  Object p = Open(path);
  // Shorter than the header of a lut16.
  EXPECT_EQ(rt->Call(p, "SetTagData", {"pre0", std::string("mft2") + std::string(40, '\0')}).AsInteger(), 1);
  Object d = Debugger();
  rt->Call(p, "GetMFT", {"pre0"});
  EXPECT_EQ(Error(), 2011);
  EXPECT_TRUE(Traced("Lut tag is too short"));
  log.entries.clear();
  Object lut = rt->Call(p, "GetMFT", {"gamt"}).AsObject();
  EXPECT_EQ(log.entries, std::vector<std::string>{"DebugString:Tag is not present"});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(Counts(lut), kNewCounts);
}

// The write stops at the first piece that fails and reports the system's code.
TEST_F(LutTest, AWriteThatFailsIsReportedOnce) {
  Object empty = rt->New("Profile", {Value()});  // no profile open
  Object lut = NewLut(false, 1, 1, 2);
  Fill(lut, "InCurve", {1, 2, 3});
  Object d = Debugger();
  rt->Call(empty, "SetMFT", {"A2B0", lut});
  EXPECT_EQ(Error(), 6);  // ERROR_INVALID_HANDLE
  EXPECT_EQ(std::count(log.entries.begin(), log.entries.end(), "DebugString:SetColorProfileElement1 fail"), 1);
  EXPECT_FALSE(Traced("SetColorProfileElement1 fai3"));
  const std::vector<std::string> banner = {"DebugString:-------->", "DebugString:-------->", "DebugString:-------->",
                                           "DebugString:--------> HALVO_ICMWriteTagClut", "DebugString:A2B0",
                                           "DebugString:-------->"};
  EXPECT_NE(std::search(log.entries.begin(), log.entries.end(), banner.begin(), banner.end()), log.entries.end());
}

// A real lut16 read by GetMFT against its bytes: the header's counts, then the input
// tables, the grid and the output tables, 16-bit words one after another.
TEST_F(LutTest, ARealTableReadsAsItsBytesHoldIt) {
  const std::string path = files.Copy("ghostscript/default_cmyk.icc", "cmyk.icc");
  const std::vector<uint8_t> tag = RawA2B0(path);
  ASSERT_EQ(U32At(tag, 0), 0x6D667432u);
  const int i = tag[8], o = tag[9], g = tag[10], n = tag[48] << 8 | tag[49], m = tag[50] << 8 | tag[51];
  const size_t cells = size_t(std::pow(g, i)) * size_t(o);
  Doubles words;
  for (size_t at = 52; at + 1 < tag.size(); at += 2) words.push_back(tag[at] << 8 | tag[at + 1]);
  ASSERT_EQ(words.size(), size_t(i * n) + cells + size_t(o * m));
  Object p = Open(path), d = Debugger();
  Object lut = rt->Call(p, "GetMFT", {"A2B0"}).AsObject();
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(Counts(lut), (std::vector<int>{1, g, i, o, n, m}));
  const std::vector<std::string> counts = {"DebugString:inChan",  "DebugInteger:" + std::to_string(i),
                                           "DebugString:outChan", "DebugInteger:" + std::to_string(o),
                                           "DebugString:clutPts", "DebugInteger:" + std::to_string(g)};
  EXPECT_NE(std::search(log.entries.begin(), log.entries.end(), counts.begin(), counts.end()), log.entries.end());
  const auto from = [&](size_t begin, size_t count) {
    return Doubles(words.begin() + long(begin), words.begin() + long(begin + count));
  };
  EXPECT_EQ(Table(lut, "InCurve"), from(0, size_t(i * n)));
  EXPECT_EQ(Table(lut, "Lut"), from(size_t(i * n), cells));
  EXPECT_EQ(Table(lut, "OutCurve"), from(size_t(i * n) + cells, size_t(o * m)));
  EXPECT_EQ(MatrixOf(lut), kIdentity);
}

// A CMYK-to-Lab table whose L* follows cyan alone (0 to 100 along the cyan axis, a* and
// b* neutral), written into the CMYK profile, then run by Little CMS.
TEST_F(LutTest, AWrittenTableDrivesALittleCmsTransform) {
  const std::string path = files.Copy("ghostscript/default_cmyk.icc", "mine.icc");
  {
    Object p = Open(path);
    Object lut = NewLut(true, 4, 3, 2);
    Fill(lut, "InCurve", {0, 65535, 0, 65535, 0, 65535, 0, 65535});
    Doubles grid;
    for (int node = 0; node < 16; ++node) {
      const bool cyan = node & 8;  // the first input varies slowest
      for (double v : {cyan ? 0xFF00 : 0.0, 32768.0, 32768.0}) grid.push_back(v);
    }
    Fill(lut, "Lut", grid);
    Fill(lut, "OutCurve", {0, 65535, 0, 65535, 0, 65535});
    rt->Call(p, "SetMFT", {"A2B0", lut});
    EXPECT_EQ(Error(), 0);
    rt->Call(p, "SaveProfile");
  }
  cmsHPROFILE cmyk = cmsOpenProfileFromFile(path.c_str(), "r");
  ASSERT_NE(cmyk, nullptr);
  cmsHPROFILE lab = cmsCreateLab2Profile(nullptr);
  cmsHTRANSFORM t = cmsCreateTransform(cmyk, TYPE_CMYK_DBL, lab, TYPE_Lab_DBL, INTENT_PERCEPTUAL, cmsFLAGS_NOCACHE);
  ASSERT_NE(t, nullptr);
  const struct {
    double cmyk[4];
    double L;
  } cases[] = {{{0, 0, 0, 0}, 0}, {{100, 0, 0, 0}, 100}, {{50, 80, 20, 100}, 50}, {{25, 100, 100, 0}, 25}};
  for (const auto& c : cases) {
    cmsCIELab out;
    cmsDoTransform(t, c.cmyk, &out, 1);
    EXPECT_NEAR(out.L, c.L, 0.5) << c.cmyk[0];
    EXPECT_NEAR(out.a, 0, 0.5) << c.cmyk[0];
    EXPECT_NEAR(out.b, 0, 0.5) << c.cmyk[0];
  }
  cmsDeleteTransform(t), cmsCloseProfile(lab), cmsCloseProfile(cmyk);
}

// A table may be written whose sizes do not fit its counts; the layers below must refuse
// it when it is used rather than read past it.
TEST_F(LutTest, ATableThatDoesNotFitItsCountsIsRefusedWhereItIsUsed) {
  const std::string path = files.Copy("ghostscript/default_cmyk.icc", "short.icc");
  const std::string labPath = files.Copy("LCMSLABI.ICM", "lab.icc");
  {
    Object p = Open(path);
    Object lut = NewLut(true, 4, 3, 33);  // 33^4 grid points claimed
    Fill(lut, "InCurve", Doubles(8, 1000));
    Fill(lut, "Lut", Doubles(10, 1000));
    Fill(lut, "OutCurve", Doubles(6, 1000));
    rt->Call(p, "SetMFT", {"A2B0", lut});
    EXPECT_EQ(Error(), 0);
    rt->Call(p, "SaveProfile");
  }
  Object p = Open(path), lab = Open(labPath);
  EXPECT_FALSE(rt->Call(p, "ValidProfile").AsBoolean());
  Object world = rt->New("ColorWorld", {p, lab});
  EXPECT_NE(Error(), 0);
}

}  // namespace
