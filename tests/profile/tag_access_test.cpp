// Profile tag access through the host: raw reads, writes, removal and shared tags on
// real profiles (checked by Little CMS reading the saved file), every member without an
// open profile, Name's length, and the named-colour members.
#include <lcms2.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <string>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::ByRef;
using host::Object;
using host::Value;

uint32_t BE32(const std::string& b, std::size_t at) {
  uint32_t v = 0;
  for (std::size_t i = 0; i < 4; ++i) v = v << 8 | static_cast<uint8_t>(b[at + i]);
  return v;
}
void PutBE(std::string& b, uint32_t v, int bytes) {
  for (int i = bytes - 1; i >= 0; --i) b += static_cast<char>(v >> (8 * i));
}

// The tag table of a profile file: signature -> (offset, size).
struct Entry {
  std::string sig;
  uint32_t offset, size;
};
std::vector<Entry> Table(const std::vector<char>& file) {
  const std::string b(file.begin(), file.end());
  std::vector<Entry> table;
  for (uint32_t i = 0; i < BE32(b, 128); ++i)
    table.push_back({b.substr(132 + 12 * i, 4), BE32(b, 136 + 12 * i), BE32(b, 140 + 12 * i)});
  return table;
}
Entry Find(const std::vector<Entry>& table, const std::string& sig) {
  for (const Entry& e : table)
    if (e.sig == sig) return e;
  return {"", 0, 0};
}

class TagAccessTest : public PluginTest {
 protected:
  Object Open(const std::string& path) { return rt->New("Profile", {rt->MakeFolderItem(path)}); }
  Value Call(const Object& p, const std::string& m, std::initializer_list<host::Arg> args = {}) {
    return rt->Call(p, m, args);
  }
  ProfileFiles files;
};

TEST_F(TagAccessTest, RawReadsRemovalAndWritesOnARealProfile) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const std::vector<char> original = ProfileFiles::Read(f);
  const Entry cprt = Find(Table(original), "cprt");
  Object p = Open(f);
  const int32_t count = rt->Get(p, "TagCount").AsInteger();
  ASSERT_EQ(count, static_cast<int32_t>(Table(original).size()));
  EXPECT_EQ(Call(p, "TagName", {1}).AsString(), Table(original).front().sig);
  EXPECT_EQ(Call(p, "TagName", {count}).AsString(), "cprt");
  // A nil string reaches a script as the empty string.
  for (int bad : {0, -1, count + 1}) EXPECT_EQ(Call(p, "TagName", {bad}).AsString(), "") << bad;

  const std::string bytes = std::string(original.begin(), original.end()).substr(cprt.offset, cprt.size);
  ASSERT_EQ(bytes.substr(0, 8), std::string("text\0\0\0\0", 8));
  EXPECT_EQ(Call(p, "TagData", {"cprt"}).AsString(), bytes);
  EXPECT_EQ(Call(p, "TagData", {count}).AsString(), bytes);
  EXPECT_EQ(rt->Get(p, "Copyright").AsString(), bytes.substr(8));
  const struct {
    Value which;
    int32_t error;
  } absent[] = {{"zzzz", 2012}, {count + 1, 87}, {0, 87}};
  for (const auto& a : absent) {
    EXPECT_EQ(rt->Call(p, "TagData", {a.which}).AsString(), "") << a.which.Describe();
    EXPECT_EQ(Error(), a.error) << a.which.Describe();
  }

  EXPECT_NE(Call(p, "RemoveTag", {"cprt"}).AsInteger(), 0);
  EXPECT_EQ(Error(), 0);
  EXPECT_FALSE(Call(p, "TagExists", {"cprt"}).AsBoolean());
  EXPECT_EQ(rt->Get(p, "TagCount").AsInteger(), count - 1);
  EXPECT_EQ(Call(p, "RemoveTag", {"cprt"}).AsInteger(), 0);
  EXPECT_EQ(Error(), 2012);

  // Raw writes: the bytes come back whole, zero bytes included; fewer than a type
  // header's 8 bytes are refused and change nothing.
  EXPECT_EQ(Call(p, "SetTagData", {"cprt", bytes}).AsInteger(), 1);
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(Call(p, "TagData", {"cprt"}).AsString(), bytes);
  const std::string wtpt = Call(p, "TagData", {"wtpt"}).AsString();
  EXPECT_EQ(Call(p, "SetTagData", {"wtpt", std::string("XYZ \0\0\0", 7)}).AsInteger(), 0);
  EXPECT_EQ(Error(), 87);
  EXPECT_EQ(Call(p, "TagData", {"wtpt"}).AsString(), wtpt);

  // References: a new tag, and one that replaces a tag of its own.
  EXPECT_EQ(Call(p, "SetTagRef", {"lumi", "wtpt"}).AsInteger(), 1);
  EXPECT_EQ(Call(p, "SetTagRef", {"bTRC", "rTRC"}).AsInteger(), 1);
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(Call(p, "TagData", {"lumi"}).AsString(), wtpt);
  // A refused reference removes nothing, not even the tag it would have replaced.
  const int32_t before = rt->Get(p, "TagCount").AsInteger();
  EXPECT_EQ(Call(p, "SetTagRef", {"gTRC", "zzzz"}).AsInteger(), 0);
  EXPECT_EQ(Error(), 2012);
  EXPECT_EQ(Call(p, "SetTagRef", {"lumi", "lumi"}).AsInteger(), 0);
  EXPECT_EQ(Error(), 2014);
  EXPECT_EQ(rt->Get(p, "TagCount").AsInteger(), before);

  Call(p, "SaveProfile");
  ASSERT_EQ(Error(), 0);
  const std::vector<char> saved = ProfileFiles::Read(f);
  const std::vector<Entry> table = Table(saved);
  EXPECT_EQ(Find(table, "lumi").offset, Find(table, "wtpt").offset);
  EXPECT_EQ(Find(table, "bTRC").offset, Find(table, "rTRC").offset);
  EXPECT_NE(Find(table, "gTRC").offset, Find(table, "rTRC").offset);
  cmsHPROFILE lcms = cmsOpenProfileFromMem(saved.data(), static_cast<cmsUInt32Number>(saved.size()));
  ASSERT_NE(lcms, nullptr);
  const auto* white = static_cast<const cmsCIEXYZ*>(cmsReadTag(lcms, cmsSigMediaWhitePointTag));
  const auto* lumi = static_cast<const cmsCIEXYZ*>(cmsReadTag(lcms, cmsSigLuminanceTag));
  ASSERT_TRUE(white && lumi);
  EXPECT_EQ(lumi->Y, white->Y);
  char text[256] = {};
  cmsGetProfileInfoASCII(lcms, cmsInfoCopyright, "en", "US", text, sizeof text);
  EXPECT_EQ(std::string(text), bytes.substr(8, bytes.find('\0', 8) - 8));
  Value x = 7.5, y = 7.5, z = 7.5;
  Call(p, "GetXYZTag", {"lumi", ByRef(x), ByRef(y), ByRef(z)});
  EXPECT_EQ(x.AsDouble(), white->X);
  EXPECT_EQ(z.AsDouble(), white->Z);
  cmsCloseProfile(lcms);
}

// Without an open profile: each member's result (a nil string reaches the script as the
// empty string), the code left behind and whether the error event was raised. Before
// each row TagExists clears the last error.
TEST_F(TagAccessTest, EveryMemberWithoutAnOpenProfile) {
  Object d = rt->New("halvoDebugger", {true});
  log.Attach(*rt, d);
  rt->CallGlobal("halvoRegisterDebugger", {d});
  Object p = Open(files.Path("missing.icc"));
  const Value untouched = 7.5;
  Value l = untouched, a = untouched, b = untouched;
  auto ref = [&](const std::string& method, Value first) {
    l = a = b = untouched;
    Call(p, method, {first, ByRef(l), ByRef(a), ByRef(b)});
    return Value(l.AsDouble() + a.AsDouble() + b.AsDouble());
  };
  const Value unchanged = 3 * 7.5;
  const std::string header(12, 'x');
  const struct {
    const char* what;
    std::function<Value()> call;
    Value result;
    int32_t error;
  } rows[] = {
      {"TagCount", [&] { return rt->Get(p, "TagCount"); }, 0, -1},
      {"TagExists", [&] { return Call(p, "TagExists", {"desc"}); }, false, 0},
      {"TagName", [&] { return Call(p, "TagName", {1}); }, "", 0},
      {"TagData(index)", [&] { return Call(p, "TagData", {1}); }, "", 6},
      {"TagData(tag)", [&] { return Call(p, "TagData", {"desc"}); }, "", 6},
      {"RemoveTag", [&] { return Call(p, "RemoveTag", {"desc"}); }, 0, 6},
      {"SetTagData", [&] { return Call(p, "SetTagData", {"desc", header}); }, 0, -1},
      {"SetTagRef", [&] { return Call(p, "SetTagRef", {"lumi", "wtpt"}); }, 0, -1},
      {"GetXYZTag", [&] { return ref("GetXYZTag", "wtpt"); }, unchanged, 6},
      {"SetXYZTag", [&] { return Call(p, "SetXYZTag", {"wtpt", 1.0, 1.0, 1.0}); }, nullptr, 6},
      {"GetTextTypeTag", [&] { return Call(p, "GetTextTypeTag", {"cprt"}); }, "", 6},
      {"SetTextTypeTag", [&] { return Call(p, "SetTextTypeTag", {"cprt", "c"}); }, nullptr, 6},
      {"GetDescTypeTag", [&] { return Call(p, "GetDescTypeTag", {"desc"}); }, "", -1},
      {"SetDescTypeTag", [&] { return Call(p, "SetDescTypeTag", {"desc", "d"}); }, nullptr, -1},
      {"Name", [&] { return rt->Get(p, "Name"); }, "", -1},
      {"Name set", [&] { rt->Set(p, "Name", "n"); return Value(); }, nullptr, -1},
      {"Copyright", [&] { return rt->Get(p, "Copyright"); }, "", -1},
      {"Copyright set", [&] { rt->Set(p, "Copyright", "c"); return Value(); }, nullptr, -1},
      {"NamedColorCount", [&] { return rt->Get(p, "NamedColorCount"); }, 0, 6},
      {"NamedColorChannels", [&] { return rt->Get(p, "NamedColorChannels"); }, 0, 6},
      {"NamedColorPrefix", [&] { return rt->Get(p, "NamedColorPrefix"); }, "", 6},
      {"NamedColorSuffix", [&] { return rt->Get(p, "NamedColorSuffix"); }, "", 6},
      {"NamedColorDevicespace", [&] { return rt->Get(p, "NamedColorDevicespace"); }, "", 0},
      {"NamedColorPCSspace", [&] { return rt->Get(p, "NamedColorPCSspace"); }, "", 0},
      {"GetNamedColorName", [&] { return Call(p, "GetNamedColorName", {1}); }, "", -3},
      {"GetIndNamedColorPCS", [&] { return ref("GetIndNamedColorPCS", 1); }, unchanged, -3},
      {"GetNamedColorIndex", [&] { return Call(p, "GetNamedColorIndex", {"x"}); }, 0, 6},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.what);
    Call(p, "TagExists", {"desc"});
    ASSERT_EQ(Error(), 0);
    log.entries.clear();
    EXPECT_EQ(row.call().Describe(), row.result.Describe());
    EXPECT_EQ(Error(), row.error);
    const bool event = std::any_of(log.entries.begin(), log.entries.end(),
                                   [](const std::string& e) { return e.rfind("DebugError:", 0) == 0; });
    // Name's getter alone reports its -1 without the event.
    EXPECT_EQ(event, row.error != 0 && std::string(row.what) != "Name");
  }
}

TEST_F(TagAccessTest, NameIsCutAt127Characters) {
  Object p = Open(files.Copy("sRGB.icc", "a.icc"));
  ASSERT_NE(Call(p, "RemoveTag", {"desc"}).AsInteger(), 0);
  EXPECT_EQ(rt->Get(p, "Name").AsString(), "");
  for (std::size_t length : {0u, 1u, 127u, 128u, 300u}) {
    std::string name;
    for (std::size_t i = 0; i < length; ++i) name += static_cast<char>('a' + i % 26);
    rt->Set(p, "Name", name);
    EXPECT_EQ(Error(), 0) << length;
    EXPECT_EQ(rt->Get(p, "Name").AsString(), name.substr(0, 127)) << length;
  }
}

// A named-colour tag written raw: prefix "Pre ", suffix " Suf", three device
// coordinates; the second colour's root name is the first one's full name.
std::string NamedColorTag() {
  std::string tag = "ncl2";
  PutBE(tag, 0, 4);
  PutBE(tag, 0, 4);
  PutBE(tag, 3, 4);  // colours
  PutBE(tag, 3, 4);  // device coordinates
  auto field = [&](const std::string& text) { tag += text + std::string(32 - text.size(), '\0'); };
  field("Pre ");
  field(" Suf");
  const struct {
    std::string name;
    uint16_t pcs[3];
  } colors[] = {{"White", {65280, 32768, 32768}}, {"Pre White Suf", {0, 0, 65535}},
                {std::string(32, 'N'), {32640, 0x8000, 0}}};
  for (const auto& c : colors) {
    field(c.name.substr(0, 32));
    for (uint16_t v : c.pcs) PutBE(tag, v, 2);
    for (int i = 0; i < 3; ++i) PutBE(tag, 0x1111u * static_cast<uint32_t>(i), 2);
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

  const struct {
    int index;
    double l, a, b;
  } pcs[] = {{1, 100, 0, 0}, {2, 0, -128, 65535 / 256.0 - 128}, {3, 50, 0, -128}};
  for (const auto& c : pcs) {
    Value l = 0.0, a = 0.0, b = 0.0;
    Call(p, "GetIndNamedColorPCS", {c.index, ByRef(l), ByRef(a), ByRef(b)});
    EXPECT_EQ(Error(), 0);
    EXPECT_NEAR(l.AsDouble(), c.l, 1e-12) << c.index;
    EXPECT_NEAR(a.AsDouble(), c.a, 1e-12) << c.index;
    EXPECT_NEAR(b.AsDouble(), c.b, 1e-12) << c.index;
  }
  const struct {
    const char* name;
    int32_t index;
  } lookups[] = {{"White", 1}, {"Pre White Suf", 1}, {"Pre White", 0}, {"white", 0},
                 {"Pre Pre White Suf Suf", 2}, {"", 0}};
  for (const auto& k : lookups) EXPECT_EQ(Call(p, "GetNamedColorIndex", {k.name}).AsInteger(), k.index) << k.name;

  for (int bad : {0, -1, 4, 1 << 30}) {
    EXPECT_EQ(Call(p, "GetNamedColorName", {bad}).AsString(), "") << bad;
    EXPECT_EQ(Error(), -3) << bad;
    Value l = 9.0, a = 9.0, b = 9.0;
    Call(p, "GetIndNamedColorPCS", {bad, ByRef(l), ByRef(a), ByRef(b)});
    EXPECT_EQ(Error(), -3) << bad;
    EXPECT_EQ(l.AsDouble() + a.AsDouble() + b.AsDouble(), 27.0) << bad;
  }
}

// Without a VectorNC to read into, the count and channels are -1 and nothing is read.
TEST_F(TagAccessTest, NamedColorMembersWithoutAList) {
  Object p = Open(files.Copy("colord/Crayons.icc", "c.icc"));
  rt->SetWithheld("PluginNewInstance", true);
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), -1);
  EXPECT_EQ(rt->Get(p, "NamedColorChannels").AsInteger(), -1);
  EXPECT_EQ(Call(p, "GetNamedColorName", {1}).AsString(), "");
  Value l = 9.0, a = 9.0, b = 9.0;
  Call(p, "GetIndNamedColorPCS", {1, ByRef(l), ByRef(a), ByRef(b)});
  EXPECT_EQ(l.AsDouble() + a.AsDouble() + b.AsDouble(), 27.0);
  rt->SetWithheld("PluginNewInstance", false);
  EXPECT_GT(rt->Get(p, "NamedColorCount").AsInteger(), 0);
}

// A real named-colour profile, read as Little CMS reads it.
TEST_F(TagAccessTest, NamedColorMembersAgreeWithLittleCms) {
  const std::string f = files.Copy("colord/x11-colors.icc", "x.icc");
  Object p = Open(f);
  const std::vector<char> file = ProfileFiles::Read(f);
  cmsHPROFILE lcms = cmsOpenProfileFromMem(file.data(), static_cast<cmsUInt32Number>(file.size()));
  ASSERT_NE(lcms, nullptr);
  const auto* list = static_cast<const cmsNAMEDCOLORLIST*>(cmsReadTag(lcms, cmsSigNamedColor2Tag));
  ASSERT_NE(list, nullptr);
  const int32_t count = static_cast<int32_t>(cmsNamedColorCount(list));
  ASSERT_GT(count, 2);
  EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), count);
  const std::string raw(file.begin(), file.end());
  EXPECT_EQ(static_cast<uint32_t>(rt->Get(p, "NamedColorChannels").AsInteger()),
            BE32(raw, Find(Table(file), "ncl2").offset + 16));
  for (int32_t i : {0, count / 2, count - 1}) {
    char name[256], prefix[33], suffix[33];
    cmsUInt16Number pcs[3], device[cmsMAXCHANNELS];
    ASSERT_TRUE(cmsNamedColorInfo(list, static_cast<cmsUInt32Number>(i), name, prefix, suffix, pcs, device));
    EXPECT_EQ(Call(p, "GetNamedColorName", {i + 1}).AsString(), name);
    EXPECT_EQ(rt->Get(p, "NamedColorPrefix").AsString(), prefix);
    EXPECT_EQ(Call(p, "GetNamedColorIndex", {name}).AsInteger(), cmsNamedColorIndex(list, name) + 1);
    Value l = 0.0, a = 0.0, b = 0.0;
    Call(p, "GetIndNamedColorPCS", {i + 1, ByRef(l), ByRef(a), ByRef(b)});
    EXPECT_EQ(l.AsDouble(), pcs[0] / 652.8);
    EXPECT_EQ(a.AsDouble(), pcs[1] / 256.0 - 128);
    EXPECT_EQ(b.AsDouble(), pcs[2] / 256.0 - 128);
  }
  cmsCloseProfile(lcms);
}

}  // namespace
