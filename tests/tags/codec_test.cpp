// The curve, XYZ, text and description codecs: what they write is checked against
// Little CMS reading the saved profile, what they read from real profiles against
// Little CMS reading the same file, and crafted tags that lie about their contents are
// refused. Curves travel through the host as a script's GetTRC and SetTRC; the other
// codecs are driven from inside, as the profile members call them.
#include <lcms2.h>

#include <cmath>
#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "error_state.h"
#include "plugin_fixture.h"
#include "profile.h"
#include "profile_files.h"
#include "tag_codecs.h"
#include "tag_io.h"

namespace {

using host::Object;
using Bytes = std::vector<uint8_t>;
using Lcms = std::unique_ptr<void, decltype(&cmsCloseProfile)>;

constexpr TAGTYPE Sig(const char (&s)[5]) {
  return uint32_t(uint8_t(s[0])) << 24 | uint32_t(uint8_t(s[1])) << 16 | uint32_t(uint8_t(s[2])) << 8 | uint8_t(s[3]);
}

// Tag bytes built field by field, big-endian, behind a type header.
struct TagBytes {
  Bytes b;
  explicit TagBytes(const char (&type)[5]) { U32(Sig(type)).U32(0); }
  TagBytes& U16(uint16_t v) { return b.insert(b.end(), {uint8_t(v >> 8), uint8_t(v)}), *this; }
  TagBytes& U32(uint32_t v) { return U16(uint16_t(v >> 16)).U16(uint16_t(v)); }
  TagBytes& Text(const std::string& s) { return b.insert(b.end(), s.begin(), s.end()), *this; }
};

// A multiLocalizedUnicodeType from (language and country, text) records.
Bytes Mluc(const std::vector<std::pair<std::string, std::u16string>>& records) {
  TagBytes t("mluc");
  t.U32(uint32_t(records.size())).U32(12);
  uint32_t offset = 16 + 12 * uint32_t(records.size());
  for (const auto& r : records) t.Text(r.first).U32(uint32_t(2 * r.second.size())).U32(offset), offset += 2 * r.second.size();
  for (const auto& r : records)
    for (char16_t c : r.second) t.U16(c);
  return t.b;
}

class CodecTest : public PluginTest {
 protected:
  CodecTest() : PluginTest("") {}

  Object Open(const std::string& systemRelative) {
    path_ = files_.Copy(systemRelative, "p.icc");
    return rt->New("Profile", {rt->MakeFolderItem(path_)});
  }
  static HPROFILE Handle(const Object& p) { return ProfileHandle(p.get()); }
  Lcms LcmsOpen() { return Lcms(cmsOpenProfileFromFile(path_.c_str(), "r"), &cmsCloseProfile); }
  Lcms Saved(const Object& p) {
    rt->Call(p, "SaveProfile");
    EXPECT_EQ(Error(), 0);
    return LcmsOpen();
  }
  static Bytes Raw(const Lcms& p, TAGTYPE tag) {
    Bytes b(cmsReadRawTag(p.get(), cmsTagSignature(tag), nullptr, 0));
    cmsReadRawTag(p.get(), cmsTagSignature(tag), b.data(), cmsUInt32Number(b.size()));
    return b;
  }
  static void Put(HPROFILE h, TAGTYPE tag, const Bytes& bytes) {
    DWORD size = DWORD(bytes.size());
    ASSERT_TRUE(SetColorProfileElementSize(h, tag, size));
    ASSERT_TRUE(SetColorProfileElement(h, tag, 0, &size, const_cast<uint8_t*>(bytes.data())));
  }
  Object NewVector(const std::vector<double>& values) {
    Object v = rt->New("Vector");
    for (double d : values) rt->Call(v, "Append", {d});
    return v;
  }
  std::vector<double> Values(const Object& v) {
    std::vector<double> out;
    for (int i = 0; i < rt->Get(v, "size").AsInteger(); ++i) out.push_back(rt->Call(v, "Get", {i}).AsDouble());
    return out;
  }
  // A text read as the profile members read it: allocate what the first call answers,
  // take as many bytes as the second answers.
  static std::string TwoCalls(int32_t (*reader)(HPROFILE, TAGTYPE, char*), HPROFILE h, TAGTYPE tag,
                              int32_t* query = nullptr) {
    const int32_t size = reader(h, tag, nullptr);
    if (query) *query = size;
    if (size < 1) return "<failed>";
    std::vector<char> buffer(size_t(size), '\x55');
    const int32_t length = reader(h, tag, buffer.data());
    EXPECT_LT(length, size);
    EXPECT_EQ(buffer[size_t(length)], '\0');
    return std::string(buffer.data(), size_t(length));
  }

  ProfileFiles files_;
  std::string path_;
};

TEST_F(CodecTest, CurvesAreStoredAsLittleCmsReadsThemAndReadBack) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const struct {
    std::vector<double> values;
    std::vector<uint16_t> entries;
    std::vector<double> back;
  } cases[] = {
      {{}, {}, {}},
      {{2.2}, {0x0233}, {563 / 256.0}},  // a gamma as u8Fixed8Number
      {{0.0, 0.5, 1.0}, {0x0000, 0x7FFF, 0xFFFF}, {0.0, 32767 / 65535.0, 1.0}},
      {{1.5, -0.25, nan}, {0x7FFE, 0xC001, 0x0000}, {0x7FFE / 65535.0, 0xC001 / 65535.0, 0.0}},  // wraps
  };
  for (const auto& c : cases) {
    Object p = Open("sRGB.icc");
    Object v = NewVector(c.values);
    rt->Call(p, "SetTRC", {"rTRC", v});
    EXPECT_EQ(Error(), 0);
    Object back = NewVector({9.0});  // emptied by the read
    rt->Call(p, "GetTRC", {"rTRC", back});
    EXPECT_EQ(Values(back), c.back);

    Lcms saved = Saved(p);
    TagBytes expected("curv");
    expected.U32(uint32_t(c.entries.size()));
    for (uint16_t e : c.entries) expected.U16(e);
    EXPECT_EQ(Raw(saved, Sig("rTRC")), expected.b);
    if (c.entries.empty()) continue;
    const auto* curve = static_cast<const cmsToneCurve*>(cmsReadTag(saved.get(), cmsSigRedTRCTag));
    ASSERT_NE(curve, nullptr);
    if (c.entries.size() == 1) {
      EXPECT_EQ(cmsGetToneCurveParams(curve)[0], c.back[0]);
      continue;
    }
    for (size_t i = 0; i < c.back.size(); ++i)
      EXPECT_NEAR(cmsEvalToneCurveFloat(curve, float(i) / float(c.back.size() - 1)), c.back[i], 2 / 65535.0);
  }
}

TEST_F(CodecTest, RealCurvesReadAsLittleCmsReadsThem) {
  const char* const profiles[] = {
      "compatibleWithAdobeRGB1998.icc",  // curv, a gamma
      "colord/AdobeRGB1998.icc",         // para, a pure power
      "colord/sRGB.icc",                 // para, function type 3
      "ghostscript/esrgb.icc",           // curv, 2048 entries
  };
  for (const char* name : profiles) {
    Object p = Open(name);
    Object v = NewVector({});
    rt->Call(p, "GetTRC", {"gTRC", v});
    EXPECT_EQ(Error(), 0) << name;
    const std::vector<double> values = Values(v);
    Lcms lcms = LcmsOpen();
    const auto* curve = static_cast<const cmsToneCurve*>(cmsReadTag(lcms.get(), cmsSigGreenTRCTag));
    ASSERT_NE(curve, nullptr) << name;
    if (cmsGetToneCurveParametricType(curve) == 1) {  // y = x^g
      ASSERT_EQ(values.size(), 1u) << name;
      EXPECT_EQ(values[0], cmsGetToneCurveParams(curve)[0]) << name;
      continue;
    }
    ASSERT_GT(values.size(), 255u) << name;
    for (size_t i = 0; i < values.size(); ++i)
      EXPECT_NEAR(values[i], cmsEvalToneCurveFloat(curve, float(i) / float(values.size() - 1)), 5e-4)
          << name << " entry " << i;
  }
}

TEST_F(CodecTest, XyzNumbersAreStoredAsLittleCmsReadsThem) {
  Object p = Open("sRGB.icc");
  HALVO_ICMWriteTagXYZ(Handle(p), Sig("bkpt"), 0.9642, 1.0, -0.5);
  EXPECT_EQ(Error(), 0);
  double xyz[3] = {};
  ASSERT_EQ(HALVO_ICMReadTagXYZ(Handle(p), Sig("bkpt"), &xyz[0], &xyz[1], &xyz[2]), 12);
  Lcms saved = Saved(p);
  EXPECT_EQ(Raw(saved, Sig("bkpt")), TagBytes("XYZ ").U32(0xF6D5).U32(0x10000).U32(0xFFFF8000).b);
  const auto* black = static_cast<const cmsCIEXYZ*>(cmsReadTag(saved.get(), cmsSigMediaBlackPointTag));
  ASSERT_NE(black, nullptr);
  EXPECT_EQ(std::vector<double>(xyz, xyz + 3), (std::vector<double>{black->X, black->Y, black->Z}));
  EXPECT_EQ(black->X, 63189 / 65536.0);
}

TEST_F(CodecTest, TextsAndDescriptionsAreStoredWholeAndReadBack) {
  const Bytes tail(78, 0);  // Unicode and ScriptCode parts, empty
  const struct {
    bool desc;
    std::string text;
    int32_t query;
  } cases[] = {{false, "abc", 12}, {false, "", 9}, {true, "abc", 5}, {true, "", 2}};
  for (const auto& c : cases) {
    Object p = Open("sRGB.icc");
    const TAGTYPE tag = c.desc ? Sig("desc") : Sig("cprt");
    const auto reader = c.desc ? &HALVO_ICMReadTagDesc : &HALVO_ICMReadTagText;
    (c.desc ? HALVO_ICMWriteTagDesc : HALVO_ICMWriteTagText)(Handle(p), tag, c.text.c_str());
    EXPECT_EQ(Error(), 0);
    int32_t query = 0;
    // The text reader keeps the stored terminating zero; the description reader drops it.
    EXPECT_EQ(TwoCalls(reader, Handle(p), tag, &query), c.desc ? c.text : c.text + '\0') << c.text;
    EXPECT_EQ(query, c.query) << c.text;

    Lcms saved = Saved(p);
    TagBytes expected(c.desc ? "desc" : "text");
    if (c.desc) expected.U32(uint32_t(c.text.size() + 1));
    expected.Text(c.text).b.push_back(0);
    if (c.desc) expected.b.insert(expected.b.end(), tail.begin(), tail.end());
    EXPECT_EQ(Raw(saved, tag), expected.b) << c.text;
    const auto* mlu = static_cast<const cmsMLU*>(cmsReadTag(saved.get(), cmsTagSignature(tag)));
    ASSERT_NE(mlu, nullptr) << c.text;
    char text[16] = "x";
    cmsMLUgetASCII(mlu, "en", "US", text, sizeof text);
    EXPECT_EQ(text, c.text);
  }
}

TEST_F(CodecTest, LocalizedTextsReadAsAsciiThroughEitherReader) {
  Object p = Open("colord/sRGB.icc");
  {
    Lcms lcms = LcmsOpen();
    for (cmsTagSignature tag : {cmsSigProfileDescriptionTag, cmsSigCopyrightTag}) {
      char text[256] = "";
      cmsMLUgetASCII(static_cast<const cmsMLU*>(cmsReadTag(lcms.get(), tag)), "en", "US", text, sizeof text);
      ASSERT_GT(std::string(text).size(), 3u);
      EXPECT_EQ(TwoCalls(&HALVO_ICMReadTagDesc, Handle(p), tag), text);
      EXPECT_EQ(TwoCalls(&HALVO_ICMReadTagText, Handle(p), tag), text);
    }
  }
  const struct {
    std::vector<std::pair<std::string, std::u16string>> records;
    std::string text;
  } cases[] = {
      {{{"frFR", u"Caf\u00e9"}, {"enUS", u"Caf\u00e9 \U0001F600!"}}, "Caf? ?!"},  // en-US wherever it is
      {{{"deDE", u"Gr\u00fcn"}, {"enGB", u"Green"}}, "Gr?n"},               // else the first
      {{{"enUS", std::u16string(u"ab\0cd", 5)}}, "ab"},                       // a zero unit ends it
      {{{"enUS", u"\xD800"}}, "?"},                                           // a lone half
      {{}, ""},
  };
  for (const auto& c : cases) {
    Put(Handle(p), Sig("desc"), Mluc(c.records));
    int32_t query = 0;
    EXPECT_EQ(TwoCalls(&HALVO_ICMReadTagDesc, Handle(p), Sig("desc"), &query), c.text);
    EXPECT_EQ(query, int32_t(c.text.size() + 1));
    EXPECT_EQ(TwoCalls(&HALVO_ICMReadTagText, Handle(p), Sig("desc")), c.text);
  }
}

TEST_F(CodecTest, TagsThatLieAboutTheirContentsAreRefused) {
  Object p = Open("sRGB.icc");
  Object d = Debugger();
  enum Reader { kCurve, kXYZ, kText, kDesc };
  Bytes mlucOutside = Mluc({{"enUS", u"abc"}});
  mlucOutside[27] = 0x30;  // the string's offset points past the end
  const struct {
    Reader reader;
    Bytes tag;
    const char* trace;
  } cases[] = {
      {kCurve, TagBytes("curv").U32(3).U16(1).U16(2).b, "Curve count exceeds the tag"},
      {kCurve, TagBytes("curv").U32(0xFFFFFFFF).b, "Curve count exceeds the tag"},
      {kCurve, TagBytes("para").U16(3).U16(0).U32(1).U32(1).U32(0).b, "Curve count exceeds the tag"},
      {kCurve, TagBytes("para").U16(5).U16(0).U32(1).b, "Unknown parametric curve"},
      {kCurve, TagBytes("XYZ ").U32(1).U32(2).U32(3).b, "Unexpected tag type"},
      {kXYZ, TagBytes("XYZ ").U32(1).U32(2).b, "XYZ tag too short"},
      {kXYZ, TagBytes("curv").U32(1).U32(2).U32(3).b, "Unexpected tag type"},
      {kText, TagBytes("text").b, "Data size is < 1"},
      {kDesc, TagBytes("desc").U32(100).Text("abc").b, "Description count exceeds the tag"},
      {kDesc, TagBytes("text").Text("abc").b, "Unexpected tag type"},
      {kDesc, TagBytes("mluc").U32(1000).U32(12).b, "Localized text outside the tag"},
      {kDesc, TagBytes("mluc").U32(1).U32(4).U32(0).b, "Localized text outside the tag"},
      {kText, mlucOutside, "Localized text outside the tag"},
  };
  const TAGTYPE tag = Sig("test");
  for (const auto& c : cases) {
    Put(Handle(p), tag, c.tag);
    SetCMError(0);
    log.entries.clear();
    Object v = NewVector({7.0});
    double xyz[3] = {1, 2, 3};
    int32_t result = 0, failure = -1;
    switch (c.reader) {
      case kCurve: result = HALVO_ICMReadTagCurve(Handle(p), tag, v.get()); break;
      case kXYZ: result = HALVO_ICMReadTagXYZ(Handle(p), tag, &xyz[0], &xyz[1], &xyz[2]); break;
      case kText: result = HALVO_ICMReadTagText(Handle(p), tag, nullptr); break;
      case kDesc: result = HALVO_ICMReadTagDesc(Handle(p), tag, nullptr), failure = 0; break;
    }
    EXPECT_EQ(result, failure) << c.trace;
    EXPECT_EQ(Error(), ERROR_INVALID_PROFILE) << c.trace;
    EXPECT_EQ(log.entries, (std::vector<std::string>{std::string("DebugString:") + c.trace, "DebugError:2011,"}));
    EXPECT_EQ(Values(v), std::vector<double>{7.0}) << c.trace;
    EXPECT_EQ(xyz[0] + xyz[1] + xyz[2], 6.0) << c.trace;
  }
}

TEST_F(CodecTest, AFailedWriteIsReportedAndStopsAtItsFirstPiece) {
  Object d = Debugger();
  Object empty = rt->New("Profile", {nullptr});  // no open handle
  log.entries.clear();
  rt->Call(empty, "SetTRC", {"rTRC", NewVector({0.25, 0.75})});
  EXPECT_EQ(Error(), ERROR_INVALID_HANDLE);
  EXPECT_EQ(log.entries, (std::vector<std::string>{
                             "DebugString:-------->", "DebugString:-------->", "DebugString:-------->",
                             "DebugString:--------> HALVO_ICMWriteTagCurve", "DebugString:rTRC", "DebugString:-------->",
                             "DebugString:CURVE SIZE", "DebugInteger:2", "DebugString:SetColorProfileElement1 fail",
                             "DebugError:6,"}));

  // Every writer on a profile opened for reading only: the type header fails first.
  std::vector<char> bytes = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
  PROFILE source{PROFILE_MEMBUFFER, bytes.data(), DWORD(bytes.size())};
  const HPROFILE readOnly = OpenColorProfileA(&source, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
  Object v = NewVector({0.5});
  const std::function<void()> writers[] = {
      [&] { HALVO_ICMWriteTagCurve(readOnly, Sig("rTRC"), v.get()); },
      [&] { HALVO_ICMWriteTagXYZ(readOnly, Sig("wtpt"), 1, 1, 1); },
      [&] { HALVO_ICMWriteTagText(readOnly, Sig("cprt"), "c"); },
      [&] { HALVO_ICMWriteTagDesc(readOnly, Sig("desc"), "d"); },
  };
  for (const auto& write : writers) {
    SetCMError(0);
    log.entries.clear();
    write();
    EXPECT_EQ(Error(), ERROR_ACCESS_DENIED);
    ASSERT_GE(log.entries.size(), 2u);
    EXPECT_EQ(std::vector<std::string>(log.entries.end() - 2, log.entries.end()),
              (std::vector<std::string>{"DebugString:SetColorProfileElement1 fail", "DebugError:5,"}));
  }
  CloseColorProfile(readOnly);
}

}  // namespace
