// The curve, XYZ, text and description codecs: what they write is compared with Little
// CMS reading the saved profile, what they read from real profiles with Little CMS
// reading the same file, and crafted tags that lie about their contents are refused.
#include <cstdint>
#include <cstring>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "error_state.h"
#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile.h"
#include "profile_files.h"
#include "tag_codecs.h"
#include "tag_io.h"

namespace {

using host::Object;
using Bytes = std::vector<uint8_t>;
using Trace = std::vector<std::string>;

constexpr TAGTYPE Sig(const char* s) {
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
  for (const auto& r : records) {
    t.Text(r.first).U32(uint32_t(2 * r.second.size())).U32(offset);
    offset += uint32_t(2 * r.second.size());
  }
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
  static void Put(HPROFILE h, TAGTYPE tag, const Bytes& bytes) {
    DWORD size = DWORD(bytes.size());
    ASSERT_TRUE(SetColorProfileElementSize(h, tag, size));
    ASSERT_TRUE(SetColorProfileElement(h, tag, 0, &size, const_cast<uint8_t*>(bytes.data())));
  }
  // A text read as the profile members read it, as "size|text": allocate the size the
  // first call answers, take as many bytes as the second answers.
  static std::string TwoCalls(int32_t (*reader)(HPROFILE, TAGTYPE, char*), HPROFILE h, TAGTYPE tag) {
    const int32_t size = reader(h, tag, nullptr);
    if (size < 1) return "failed";
    std::vector<char> buffer(size_t(size), '\x55');
    const int32_t length = reader(h, tag, buffer.data());
    EXPECT_LT(length, size);
    EXPECT_EQ(buffer[size_t(length)], '\0');
    return std::to_string(size) + "|" + std::string(buffer.data(), size_t(length));
  }

  ProfileFiles files_;
  std::string path_;
};

// Every writer on one profile, saved once: the bytes compared with Little CMS reading
// the file, and what the readers answer.
TEST_F(CodecTest, WrittenTagsAreStoredAsLittleCmsReadsThemAndReadBack) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const struct {
    const char* tag;
    std::vector<double> values;
    std::vector<uint16_t> entries;
    std::vector<double> back;
  } curves[] = {
      {"rTRC", {}, {}, {}},
      {"gTRC", {2.2}, {0x0233}, {563 / 256.0}},  // a gamma as u8Fixed8Number
      {"bTRC", {0.0, 0.5, 1.0}, {0x0000, 0x7FFF, 0xFFFF}, {0.0, 32767 / 65535.0, 1.0}},
      {"kTRC", {1.5, -0.25, nan}, {0x7FFE, 0xC001, 0x0000}, {0x7FFE / 65535.0, 0xC001 / 65535.0, 0.0}},  // wraps
  };
  // The text reader keeps the stored terminating zero; the description reader drops it.
  const struct {
    const char* tag;
    bool desc;
    std::string text, back;
  } texts[] = {{"cprt", false, "abc", std::string("12|abc", 7)},
               {"targ", false, "", std::string("9|", 3)},
               {"desc", true, "abc", "5|abc"},
               {"dmnd", true, "", "2|"}};
  Object p = Open("sRGB.icc");
  for (const auto& c : curves) rt->Call(p, "SetTRC", {c.tag, NewVector(c.values)});
  for (const auto& c : texts)
    (c.desc ? HALVO_ICMWriteTagDesc : HALVO_ICMWriteTagText)(Handle(p), Sig(c.tag), c.text.c_str());
  HALVO_ICMWriteTagXYZ(Handle(p), Sig("bkpt"), 0.9642, 1.0, -0.5);
  rt->Call(p, "SaveProfile");
  const LcmsFile saved(path_);
  const HPROFILE h = Handle(p);  // the profile as saved

  for (const auto& c : curves) {
    Object back = NewVector({9.0});  // emptied by the read
    rt->Call(p, "GetTRC", {c.tag, back});
    EXPECT_EQ(Values(back), c.back) << c.tag;
    TagBytes expected("curv");
    expected.U32(uint32_t(c.entries.size()));
    for (uint16_t e : c.entries) expected.U16(e);
    EXPECT_EQ(saved.Raw(c.tag), expected.b) << c.tag;
  }
  const auto* gamma = static_cast<const cmsToneCurve*>(cmsReadTag(saved.h, cmsSigGreenTRCTag));
  ASSERT_NE(gamma, nullptr);
  EXPECT_EQ(cmsGetToneCurveParams(gamma)[0], 563 / 256.0);
  for (const auto& c : texts) {
    EXPECT_EQ(TwoCalls(c.desc ? &HALVO_ICMReadTagDesc : &HALVO_ICMReadTagText, h, Sig(c.tag)), c.back);
    TagBytes expected(c.desc ? "desc" : "text");
    if (c.desc) expected.U32(uint32_t(c.text.size() + 1));
    expected.Text(c.text).b.resize(expected.b.size() + (c.desc ? 79 : 1));  // the zero; desc's empty tail
    EXPECT_EQ(saved.Raw(c.tag), expected.b) << c.tag;
    const auto* mlu = static_cast<const cmsMLU*>(cmsReadTag(saved.h, cmsTagSignature(Sig(c.tag))));
    ASSERT_NE(mlu, nullptr) << c.tag;
    char text[16] = "x";
    cmsMLUgetASCII(mlu, "en", "US", text, sizeof text);
    EXPECT_EQ(text, c.text);
  }
  double xyz[3] = {};
  ASSERT_EQ(HALVO_ICMReadTagXYZ(h, Sig("bkpt"), &xyz[0], &xyz[1], &xyz[2]), 12);
  EXPECT_EQ(saved.Raw("bkpt"), TagBytes("XYZ ").U32(0xF6D5).U32(0x10000).U32(0xFFFF8000).b);
  const auto* black = static_cast<const cmsCIEXYZ*>(cmsReadTag(saved.h, cmsSigMediaBlackPointTag));
  ASSERT_NE(black, nullptr);
  EXPECT_EQ(std::vector<double>(xyz, xyz + 3), (std::vector<double>{black->X, black->Y, black->Z}));
}

TEST_F(CodecTest, RealCurvesReadAsLittleCmsReadsThem) {
  // curv with a gamma; para, a pure power; para, function type 3; curv, 2048 entries.
  for (const char* name : {"compatibleWithAdobeRGB1998.icc", "colord/AdobeRGB1998.icc", "colord/sRGB.icc",
                           "ghostscript/esrgb.icc"}) {
    Object p = Open(name);
    Object v = NewVector({});
    rt->Call(p, "GetTRC", {"gTRC", v});
    EXPECT_EQ(Error(), 0) << name;
    const std::vector<double> values = Values(v);
    const LcmsFile lcms(path_);
    const auto* curve = static_cast<const cmsToneCurve*>(cmsReadTag(lcms.h, cmsSigGreenTRCTag));
    ASSERT_NE(curve, nullptr) << name;
    if (cmsGetToneCurveParametricType(curve) == 1) {  // y = x^g
      EXPECT_EQ(values, std::vector<double>{cmsGetToneCurveParams(curve)[0]}) << name;
      continue;
    }
    ASSERT_GT(values.size(), 255u) << name;
    for (size_t i = 0; i < values.size(); ++i)
      EXPECT_NEAR(values[i], cmsEvalToneCurveFloat(curve, float(i) / float(values.size() - 1)), 5e-4)
          << name << " entry " << i;
  }
}

TEST_F(CodecTest, LocalizedTextsReadAsAsciiThroughEitherReader) {
  Object p = Open("colord/sRGB.icc");
  const auto readers = {&HALVO_ICMReadTagDesc, &HALVO_ICMReadTagText};
  const LcmsFile lcms(path_);
  for (cmsTagSignature tag : {cmsSigProfileDescriptionTag, cmsSigCopyrightTag}) {
    char text[256] = "";
    cmsMLUgetASCII(static_cast<const cmsMLU*>(cmsReadTag(lcms.h, tag)), "en", "US", text, sizeof text);
    ASSERT_GT(std::string(text).size(), 3u);
    for (auto reader : readers)
      EXPECT_EQ(TwoCalls(reader, Handle(p), tag), std::to_string(strlen(text) + 1) + "|" + text);
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
    for (auto reader : readers)
      EXPECT_EQ(TwoCalls(reader, Handle(p), Sig("desc")), std::to_string(c.text.size() + 1) + "|" + c.text);
  }
}

TEST_F(CodecTest, TagsThatLieAboutTheirContentsAreRefused) {
  Object p = Open("sRGB.icc");
  Object d = Debugger();
  const HPROFILE h = Handle(p);
  const TAGTYPE test = Sig("test");
  // A refused read answers its failure value and leaves its outputs as they were.
  Object v = NewVector({7.0});
  double x = 1, y = 2, z = 3;
  const std::function<bool()> curve = [&] { return HALVO_ICMReadTagCurve(h, test, v.get()) == -1; },
                              xyz = [&] { return HALVO_ICMReadTagXYZ(h, test, &x, &y, &z) == -1; },
                              text = [&] { return HALVO_ICMReadTagText(h, test, nullptr) == -1; },
                              desc = [&] { return HALVO_ICMReadTagDesc(h, test, nullptr) == 0; };
  Bytes mlucOutside = Mluc({{"enUS", u"abc"}});
  mlucOutside[27] = 0x30;  // the string's offset points past the end
  const struct {
    std::function<bool()> read;
    Bytes tag;
    const char* trace;
  } cases[] = {
      {curve, TagBytes("curv").U32(3).U16(1).U16(2).b, "Curve count exceeds the tag"},
      {curve, TagBytes("curv").U32(0xFFFFFFFF).b, "Curve count exceeds the tag"},
      {curve, TagBytes("para").U16(3).U16(0).U32(1).U32(1).U32(0).b, "Curve count exceeds the tag"},
      {curve, TagBytes("para").U16(5).U16(0).U32(1).b, "Unknown parametric curve"},
      {curve, TagBytes("XYZ ").U32(1).U32(2).U32(3).b, "Unexpected tag type"},
      {xyz, TagBytes("XYZ ").U32(1).U32(2).b, "XYZ tag too short"},
      {xyz, TagBytes("curv").U32(1).U32(2).U32(3).b, "Unexpected tag type"},
      {text, TagBytes("text").b, "Data size is < 1"},
      {desc, TagBytes("desc").U32(100).Text("abc").b, "Description count exceeds the tag"},
      {desc, TagBytes("text").Text("abc").b, "Unexpected tag type"},
      {desc, TagBytes("mluc").U32(1000).U32(12).b, "Localized text outside the tag"},
      {desc, TagBytes("mluc").U32(1).U32(4).U32(0).b, "Localized text outside the tag"},
      {text, mlucOutside, "Localized text outside the tag"},
  };
  for (const auto& c : cases) {
    Put(h, test, c.tag);
    SetCMError(0);
    log.entries.clear();
    EXPECT_TRUE(c.read()) << c.trace;
    EXPECT_EQ(Error(), ERROR_INVALID_PROFILE) << c.trace;
    EXPECT_EQ(log.entries, (Trace{std::string("DebugString:") + c.trace, "DebugError:2011,"}));
    EXPECT_EQ(Values(v), std::vector<double>{7.0}) << c.trace;
    EXPECT_EQ(std::vector<double>({x, y, z}), std::vector<double>({1, 2, 3})) << c.trace;
  }
}

// The trace of each writer: its banner and sizes, then either the data's trace or, on a
// profile opened for reading only, the failure of the type header that stops it.
TEST_F(CodecTest, WritersTraceTheirPiecesAndStopAtTheFirstFailure) {
  Object empty = rt->New("Profile", {nullptr}), d = Debugger();
  rt->Call(empty, "SetTRC", {"rTRC", NewVector({0.25})});  // no open handle
  EXPECT_EQ(Error(), ERROR_INVALID_HANDLE);
  for (const char* method : {"GetTRC", "SetTRC"}) {  // a nil Vector is refused before anything
    rt->Get(empty, "Modified");  // clears the last error
    rt->Call(empty, method, {"rTRC", Object()});
    EXPECT_EQ(Error(), -1) << method;
  }

  std::vector<char> bytes = ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc");
  PROFILE source{PROFILE_MEMBUFFER, bytes.data(), DWORD(bytes.size())};
  Object v = NewVector({0.25, 0.75});
  const struct {
    std::function<void(HPROFILE)> write;
    std::string writer, tag;
    Trace sizes, data;
  } cases[] = {
      {[&](HPROFILE h) { HALVO_ICMWriteTagCurve(h, Sig("rTRC"), v.get()); }, "Curve", "rTRC",
       {"DebugString:CURVE SIZE", "DebugInteger:2"}, {"DebugDouble:0.250000", "DebugDouble:0.750000"}},
      {[](HPROFILE h) { HALVO_ICMWriteTagXYZ(h, Sig("wtpt"), 1, 1, 1); }, "XYZ", "wtpt", {"DebugDouble:20.000000"},
       {"DebugDouble:12.000000"}},
      {[](HPROFILE h) { HALVO_ICMWriteTagText(h, Sig("cprt"), "c"); }, "Text", "cprt", {"DebugDouble:10.000000"},
       {"DebugDouble:2.000000"}},
      {[](HPROFILE h) { HALVO_ICMWriteTagDesc(h, Sig("desc"), "d"); }, "Desc", "desc",
       {"DebugInteger:2", "DebugDouble:92.000000"}, {"DebugDouble:2.000000"}},
  };
  const Trace failed = {"DebugString:SetColorProfileElement1 fail", "DebugError:5,"};
  for (DWORD access : {PROFILE_READ, PROFILE_READWRITE}) {
    const HPROFILE h = OpenColorProfileA(&source, access, FILE_SHARE_READ, OPEN_EXISTING);
    for (const auto& c : cases) {
      Trace trace = {"DebugString:-------->", "DebugString:-------->", "DebugString:-------->",
                     "DebugString:--------> HALVO_ICMWriteTag" + c.writer, "DebugString:" + c.tag,
                     "DebugString:-------->"};
      for (const Trace& more : {c.sizes, access == PROFILE_READ ? failed : c.data})
        trace.insert(trace.end(), more.begin(), more.end());
      SetCMError(0);
      log.entries.clear();
      c.write(h);
      EXPECT_EQ(Error(), access == PROFILE_READ ? ERROR_ACCESS_DENIED : 0) << c.writer;
      EXPECT_EQ(log.entries, trace);
    }
    CloseColorProfile(h);
  }
}

}  // namespace
