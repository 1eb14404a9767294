// Profile tag access through the host: raw reads, writes, removal and shared tags on
// real profiles (checked by Little CMS reading the saved file), every member without an
// open profile, Name's and Copyright's lengths, and the named-colour members.
#include <algorithm>
#include <cstdint>
#include <functional>
#include <string>
#include <tuple>
#include <vector>

#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::ByRef;
using host::Object;
using host::Value;
using Triple = std::vector<double>;
using namespace std::string_literals;

uint32_t BE32(const std::string& b, std::size_t at) {
  uint32_t v = 0;
  for (std::size_t i = 0; i < 4; ++i) v = v << 8 | static_cast<uint8_t>(b[at + i]);
  return v;
}
// Where a profile file's tag table puts a tag's data; 0 for a tag it does not list.
uint32_t OffsetOf(const std::string& path, const std::string& sig) {
  const std::vector<char> file = ProfileFiles::Read(path);
  const std::string b(file.begin(), file.end());
  for (uint32_t i = 0; i < BE32(b, 128); ++i)
    if (b.substr(132 + 12 * i, 4) == sig) return BE32(b, 136 + 12 * i);
  return 0;
}

class TagAccessTest : public PluginTest {
 protected:
  Value Call(const Object& p, const std::string& m, std::initializer_list<host::Arg> args = {}) {
    return rt->Call(p, m, args);
  }
  // A member's answer with the code it left behind.
  std::string Answer(const Value& v) { return Is(v, Error()); }
  static std::string Is(const Value& v, int32_t code) { return v.Describe() + " / " + std::to_string(code); }
  // A member answering three Doubles ByRef, each starting at 9.
  Triple Three(const Object& p, const std::string& m, Value first) {
    Value a = 9.0, b = 9.0, c = 9.0;
    Call(p, m, {first, ByRef(a), ByRef(b), ByRef(c)});
    return {a.AsDouble(), b.AsDouble(), c.AsDouble()};
  }
  ProfileFiles files;
};

TEST_F(TagAccessTest, RawReadsRemovalWritesAndReferencesOnARealProfile) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const LcmsFile original(f);
  ASSERT_NE(original.h, nullptr);
  Object p = Open(f);
  const int32_t count = rt->Get(p, "TagCount").AsInteger();
  ASSERT_EQ(count, cmsGetTagCount(original.h));
  for (int i : {1, count}) EXPECT_EQ(TagSig(Call(p, "TagName", {i}).AsString()), cmsGetTagSignature(original.h, i - 1));
  // A nil string reaches a script as the empty string.
  for (int bad : {0, -1, count + 1}) EXPECT_EQ(Call(p, "TagName", {bad}).AsString(), "") << bad;

  const std::string bytes = original.RawText("cprt");
  ASSERT_EQ(bytes.substr(0, 8), std::string("text\0\0\0\0", 8));
  EXPECT_EQ(Call(p, "TagData", {"cprt"}).AsString(), bytes);
  EXPECT_EQ(Call(p, "TagData", {count}).AsString(), bytes);
  EXPECT_EQ(rt->Get(p, "Copyright").AsString(), bytes.substr(8));
  const std::pair<Value, int32_t> absent[] = {{"zzzz", 2012}, {count + 1, 87}, {0, 87}};
  for (const auto& [which, error] : absent) EXPECT_EQ(Answer(Call(p, "TagData", {which})), Is("", error));

  EXPECT_EQ(Answer(Call(p, "RemoveTag", {"cprt"})), Is(1, 0));
  EXPECT_FALSE(Call(p, "TagExists", {"cprt"}).AsBoolean());
  EXPECT_EQ(rt->Get(p, "TagCount").AsInteger(), count - 1);
  EXPECT_EQ(Answer(Call(p, "RemoveTag", {"cprt"})), Is(0, 2012));

  // Raw writes come back whole, zero bytes included; fewer than a type header's 8 bytes
  // are refused and change nothing.
  EXPECT_EQ(Answer(Call(p, "SetTagData", {"cprt", bytes})), Is(1, 0));
  EXPECT_EQ(Call(p, "TagData", {"cprt"}).AsString(), bytes);
  const std::string wtpt = Call(p, "TagData", {"wtpt"}).AsString();
  EXPECT_EQ(Answer(Call(p, "SetTagData", {"wtpt", std::string("XYZ \0\0\0", 7)})), Is(0, 87));

  // References: a new tag, and one that replaces a tag of its own. A refused reference
  // removes nothing, not even the tag it would have replaced.
  EXPECT_EQ(Answer(Call(p, "SetTagRef", {"lumi", "wtpt"})), Is(1, 0));
  EXPECT_EQ(Answer(Call(p, "SetTagRef", {"bTRC", "rTRC"})), Is(1, 0));
  EXPECT_EQ(Call(p, "TagData", {"lumi"}).AsString(), wtpt);
  EXPECT_EQ(Answer(Call(p, "SetTagRef", {"gTRC", "zzzz"})), Is(0, 2012));
  EXPECT_EQ(Answer(Call(p, "SetTagRef", {"lumi", "lumi"})), Is(0, 2014));
  EXPECT_EQ(rt->Get(p, "TagCount").AsInteger(), count + 1);

  Call(p, "SaveProfile");
  ASSERT_EQ(Error(), 0);
  const LcmsFile saved(f);
  ASSERT_NE(saved.h, nullptr);
  EXPECT_EQ(OffsetOf(f, "lumi"), OffsetOf(f, "wtpt"));
  EXPECT_EQ(OffsetOf(f, "bTRC"), OffsetOf(f, "rTRC"));
  EXPECT_NE(OffsetOf(f, "gTRC"), OffsetOf(f, "rTRC"));
  EXPECT_EQ(saved.RawText("cprt"), bytes);
  EXPECT_EQ(saved.RawText("wtpt"), wtpt);
  const auto* white = static_cast<const cmsCIEXYZ*>(cmsReadTag(saved.h, cmsSigMediaWhitePointTag));
  ASSERT_NE(white, nullptr);
  EXPECT_EQ(Three(p, "GetXYZTag", "lumi"), (Triple{white->X, white->Y, white->Z}));
  EXPECT_EQ(Error(), 0);
}

// Without an open profile: each member's result (a nil string reaches the script as the
// empty string), the code left behind and whether the error event was raised.
TEST_F(TagAccessTest, EveryMemberWithoutAnOpenProfile) {
  const Object d = Debugger();
  Object p = Open(files.Path("missing.icc"));
  auto expect = [&](const std::string& what, const std::function<Value()>& call, const Value& result, int32_t error) {
    SCOPED_TRACE(what);
    Call(p, "TagExists", {"desc"});  // clears the last error
    ASSERT_EQ(Error(), 0);
    log.entries.clear();
    EXPECT_EQ(Answer(call()), Is(result, error));
    const bool event = std::any_of(log.entries.begin(), log.entries.end(),
                                   [](const std::string& e) { return e.rfind("DebugError:", 0) == 0; });
    EXPECT_EQ(event, error != 0 && what != "Name");  // Name's getter alone reports -1 without the event
  };
  const std::tuple<const char*, Value, int32_t> properties[] = {
      {"TagCount", 0, -1}, {"Name", "", -1}, {"Copyright", "", -1}, {"NamedColorCount", 0, 6},
      {"NamedColorChannels", 0, 6}, {"NamedColorPrefix", "", 6}, {"NamedColorSuffix", "", 6},
      {"NamedColorDevicespace", "", 0}, {"NamedColorPCSspace", "", 0}};
  for (const auto& [name, result, error] : properties)
    expect(name, [&, m = name] { return rt->Get(p, m); }, result, error);
  for (const char* name : {"Name", "Copyright"})
    expect(name + " set"s, [&] { rt->Set(p, name, "n"); return Value(); }, nullptr, -1);
  auto untouched = [&](const char* m, Value first) { return Value(Three(p, m, first) == Triple(3, 9.0)); };
  const std::string header(12, 'x');
  const std::tuple<const char*, std::function<Value()>, Value, int32_t> calls[] = {
      {"TagExists", [&] { return Call(p, "TagExists", {"desc"}); }, false, 0},
      {"TagName", [&] { return Call(p, "TagName", {1}); }, "", 0},
      {"TagData(index)", [&] { return Call(p, "TagData", {1}); }, "", 6},
      {"TagData(tag)", [&] { return Call(p, "TagData", {"desc"}); }, "", 6},
      {"RemoveTag", [&] { return Call(p, "RemoveTag", {"desc"}); }, 0, 6},
      {"SetTagData", [&] { return Call(p, "SetTagData", {"desc", header}); }, 0, -1},
      {"SetTagRef", [&] { return Call(p, "SetTagRef", {"lumi", "wtpt"}); }, 0, -1},
      {"GetXYZTag", [&] { return untouched("GetXYZTag", "wtpt"); }, true, 6},
      {"SetXYZTag", [&] { return Call(p, "SetXYZTag", {"wtpt", 1.0, 1.0, 1.0}); }, nullptr, 6},
      {"GetTextTypeTag", [&] { return Call(p, "GetTextTypeTag", {"cprt"}); }, "", 6},
      {"SetTextTypeTag", [&] { return Call(p, "SetTextTypeTag", {"cprt", "c"}); }, nullptr, 6},
      {"GetDescTypeTag", [&] { return Call(p, "GetDescTypeTag", {"desc"}); }, "", -1},
      {"SetDescTypeTag", [&] { return Call(p, "SetDescTypeTag", {"desc", "d"}); }, nullptr, -1},
      {"GetNamedColorName", [&] { return Call(p, "GetNamedColorName", {1}); }, "", -3},
      {"GetIndNamedColorPCS", [&] { return untouched("GetIndNamedColorPCS", 1); }, true, -3},
      {"GetNamedColorIndex", [&] { return Call(p, "GetNamedColorIndex", {"x"}); }, 0, 6},
  };
  for (const auto& [what, call, result, error] : calls) expect(what, call, result, error);
}

TEST_F(TagAccessTest, NameIsCutAt127CharactersCopyrightIsNot) {
  Object p = Open(files.Copy("sRGB.icc", "a.icc"));
  const std::string copyright(200, 'c');
  rt->Set(p, "Copyright", copyright);
  EXPECT_EQ(Answer(rt->Get(p, "Copyright")), Is(copyright + '\0', 0));  // the text type keeps its zero
  ASSERT_EQ(Call(p, "RemoveTag", {"desc"}).AsInteger(), 1);
  EXPECT_EQ(rt->Get(p, "Name").AsString(), "");
  for (std::size_t length : {0u, 1u, 127u, 128u, 300u}) {
    std::string name;
    for (std::size_t i = 0; i < length; ++i) name += static_cast<char>('a' + i % 26);
    rt->Set(p, "Name", name);
    EXPECT_EQ(Answer(rt->Get(p, "Name")), Is(name.substr(0, 127), 0)) << length;
  }
}

// A named-colour tag written raw: prefix "Pre ", suffix " Suf", three device
// coordinates; the second colour's root name is the first one's full name.
std::string NamedColorTag() {
  std::string tag = "ncl2"s + std::string(11, '\0') + "\3\0\0\0\3"s;  // 3 colours, 3 coordinates
  auto field = [&](const std::string& text) { tag += text + std::string(32 - text.size(), '\0'); };
  field("Pre ");
  field(" Suf");
  const std::pair<std::string, std::string> colors[] = {  // root name, big-endian PCS
      {"White", "\xFF\x00\x80\x00\x80\x00"s},
      {"Pre White Suf", "\0\0\0\0\xFF\xFF"s},
      {std::string(32, 'N'), "\x7F\x80\x80\0\0\0"s}};
  for (const auto& [name, pcs] : colors) {
    field(name);
    tag += pcs + "\0\0\x11\x11\x22\x22"s;  // device coordinates 0, 0x1111, 0x2222
  }
  return tag;
}

TEST_F(TagAccessTest, NamedColorMembersReadTheTagAndCheckTheirIndex) {
  Object p = Open(files.Copy("sRGB.icc", "a.icc"));
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), 0);
  EXPECT_EQ(rt->Get(p, "NamedColorChannels").AsInteger(), 0);
  EXPECT_EQ(Call(p, "GetNamedColorIndex", {"White"}).AsInteger(), 0);
  ASSERT_EQ(Call(p, "SetTagData", {"ncl2", NamedColorTag()}).AsInteger(), 1);
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), 3);
  EXPECT_EQ(rt->Get(p, "NamedColorChannels").AsInteger(), 3);
  EXPECT_EQ(rt->Get(p, "NamedColorPrefix").AsString(), "Pre ");
  EXPECT_EQ(rt->Get(p, "NamedColorSuffix").AsString(), " Suf");
  EXPECT_EQ(Call(p, "GetNamedColorName", {3}).AsString(), std::string(31, 'N')) << "the reader keeps 31";
  const Triple lab[] = {{100, 0, 0}, {0, -128, 65535 / 256.0 - 128}, {50, 0, -128}};
  for (int i = 1; i <= 3; ++i) {
    EXPECT_EQ(Three(p, "GetIndNamedColorPCS", i), lab[i - 1]) << i;
    EXPECT_EQ(Error(), 0) << i;
  }
  const std::pair<const char*, int32_t> lookups[] = {
      {"White", 1}, {"Pre White Suf", 1}, {"Pre White", 0}, {"white", 0}, {"Pre Pre White Suf Suf", 2}, {"", 0}};
  for (const auto& [name, index] : lookups) EXPECT_EQ(Call(p, "GetNamedColorIndex", {name}).AsInteger(), index) << name;
  for (int bad : {0, -1, 4, 1 << 30}) {
    EXPECT_EQ(Answer(Call(p, "GetNamedColorName", {bad})), Is("", -3)) << bad;
    EXPECT_EQ(Three(p, "GetIndNamedColorPCS", bad), Triple(3, 9.0)) << bad;
    EXPECT_EQ(Error(), -3) << bad;
  }
}

// A real named-colour profile, read as Little CMS reads it; but without a VectorNC to
// read into, the count and channels are -1 and nothing is read.
TEST_F(TagAccessTest, NamedColorMembersAgreeWithLittleCms) {
  const std::string f = files.Copy("colord/x11-colors.icc", "x.icc");
  Object p = Open(f);
  rt->SetWithheld("PluginNewInstance", true);
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), -1);
  EXPECT_EQ(rt->Get(p, "NamedColorChannels").AsInteger(), -1);
  EXPECT_EQ(Call(p, "GetNamedColorName", {1}).AsString(), "");
  EXPECT_EQ(Three(p, "GetIndNamedColorPCS", 1), Triple(3, 9.0));
  rt->SetWithheld("PluginNewInstance", false);
  const LcmsFile lcms(f);
  ASSERT_NE(lcms.h, nullptr);
  const std::string raw = lcms.RawText("ncl2");
  const auto* list = static_cast<const cmsNAMEDCOLORLIST*>(cmsReadTag(lcms.h, cmsSigNamedColor2Tag));
  ASSERT_NE(list, nullptr);
  const int32_t count = static_cast<int32_t>(cmsNamedColorCount(list));
  ASSERT_GT(count, 2);
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), count);
  EXPECT_EQ(rt->Get(p, "NamedColorChannels").AsInteger(), static_cast<int32_t>(BE32(raw, 16)));
  for (int32_t i : {0, count / 2, count - 1}) {
    char name[256], prefix[33], suffix[33];
    cmsUInt16Number pcs[3], device[cmsMAXCHANNELS];
    ASSERT_TRUE(cmsNamedColorInfo(list, static_cast<cmsUInt32Number>(i), name, prefix, suffix, pcs, device));
    EXPECT_EQ(Call(p, "GetNamedColorName", {i + 1}).AsString(), name);
    EXPECT_EQ(rt->Get(p, "NamedColorPrefix").AsString(), prefix);
    EXPECT_EQ(Call(p, "GetNamedColorIndex", {name}).AsInteger(), cmsNamedColorIndex(list, name) + 1);
    EXPECT_EQ(Three(p, "GetIndNamedColorPCS", i + 1),
              (Triple{pcs[0] / 652.8, pcs[1] / 256.0 - 128, pcs[2] / 256.0 - 128}));
  }
}

}  // namespace
