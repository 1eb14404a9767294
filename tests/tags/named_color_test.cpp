// VectorNC and the named-colour tag, driven as a script drives them: the list's edits,
// the conversions of its values, tags written by SetNC as Little CMS reads them, real
// named-colour profiles read by GetNC, and tags whose counts lie.
#include <lcms2.h>

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::ByRef;
using host::Object;
using host::Value;

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

struct Color {
  std::string name;
  std::vector<double> pcs, device;
};

// A named-colour list as Little CMS reads it from a profile file.
struct LcmsList {
  std::string prefix, suffix;
  std::vector<std::string> names;
  std::vector<std::vector<uint16_t>> pcs, device;
  uint32_t tagSize = 0;
};

LcmsList ReadWithLcms(const std::string& path) {
  LcmsList out;
  cmsHPROFILE p = cmsOpenProfileFromFile(path.c_str(), "r");
  if (!p) return out;
  out.tagSize = cmsReadRawTag(p, cmsSigNamedColor2Tag, nullptr, 0);
  if (const auto* list = static_cast<const cmsNAMEDCOLORLIST*>(cmsReadTag(p, cmsSigNamedColor2Tag)))
    for (cmsUInt32Number i = 0; i < cmsNamedColorCount(list); ++i) {
      char name[256], prefix[256], suffix[256];
      cmsUInt16Number pcs[3], device[cmsMAXCHANNELS];
      std::fill(std::begin(device), std::end(device), 0xABCD);  // the count shows where it stops
      cmsNamedColorInfo(list, i, name, prefix, suffix, pcs, device);
      out.prefix = prefix, out.suffix = suffix;
      out.names.push_back(name);
      out.pcs.push_back({pcs[0], pcs[1], pcs[2]});
      out.device.emplace_back(device, std::find(device, device + cmsMAXCHANNELS, 0xABCD));
    }
  cmsCloseProfile(p);
  return out;
}

class NamedColorTest : public PluginTest {
 protected:
  Object Open(const std::string& path) { return rt->New("Profile", {rt->MakeFolderItem(path)}); }
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
  Object NewList(const char* pcsspace, int devicecount) {
    Object list = rt->New("VectorNC");
    rt->Set(list, "pcsspace", pcsspace);
    rt->Set(list, "devicecount", devicecount);
    return list;
  }
  void Append(const Object& list, const std::string& name, const std::vector<double>& pcs,
              const std::vector<double>& device) {
    rt->Call(list, "Append", {name, NewVector(pcs), NewVector(device)});
  }
  Color At(const Object& list, int i) {
    Value name("old");
    Object pcs = NewVector({7}), device = NewVector({7});
    rt->Call(list, "Get", {i, ByRef(name), pcs, device});
    return {name.AsString(), Values(pcs), Values(device)};
  }
  std::string Names(const Object& list) {
    std::string names;
    for (int i = 0; i < rt->Get(list, "size").AsInteger(); ++i) names += At(list, i).name + ",";
    return names;
  }
  // Names, prefix and devicecount: what a refused read must leave as it was.
  std::string State(const Object& list) {
    return Names(list) + "|" + rt->Get(list, "prefix").AsString() + "|" +
           std::to_string(rt->Get(list, "devicecount").AsInteger());
  }
  bool Traced(const std::string& text) const {
    return std::find(log.entries.begin(), log.entries.end(), "DebugString:" + text) != log.entries.end();
  }

  ProfileFiles files;
};

TEST_F(NamedColorTest, ListEditsAndArgumentsItRefuses) {
  Object fresh = rt->New("VectorNC");
  EXPECT_EQ(rt->Get(fresh, "size").AsInteger() + rt->Get(fresh, "devicecount").AsInteger(), 0);
  EXPECT_EQ(rt->Get(fresh, "pcsspace").AsString(), "COLOR_Lab");
  EXPECT_EQ(rt->Get(fresh, "prefix").AsString() + rt->Get(fresh, "suffix").AsString(), "");

  const Value nil;
  using Edit = std::function<void(const Object&)>;
  auto call = [&](const char* method, int i) -> Edit {
    return [=](const Object& l) { rt->Call(l, method, {i, "x", NewVector({}), nil}); };
  };
  auto size = [&](int n) -> Edit { return [=](const Object& l) { rt->Set(l, "size", n); }; };
  auto del = [&](int i) -> Edit { return [=](const Object& l) { rt->Call(l, "Delete", {i}); }; };
  const struct {
    const char* what;
    Edit edit;
    const char* names;
  } cases[] = {
      {"Insert(-1)", call("Insert", -1), "x,a,b,c,"}, {"Insert(1)", call("Insert", 1), "a,x,b,c,"},
      {"Insert(9)", call("Insert", 9), "a,b,c,x,"},   {"Set(0)", call("Set", 0), "x,b,c,"},
      {"Set(3)", call("Set", 3), "a,b,c,"},           {"Delete(1)", del(1), "a,c,"},
      {"Delete(-1)", del(-1), "a,b,c,"},              {"Delete(3)", del(3), "a,b,c,"},
      {"size 5", size(5), "a,b,c,,,"},                {"size 1", size(1), "a,"},
      {"size -1", size(-1), "a,b,c,"},                {"size max", size(INT32_MAX), "a,b,c,"},
      {"Clear", [&](const Object& l) { rt->Call(l, "Clear"); }, ""},
      {"nil PCS", [&](const Object& l) { rt->Call(l, "Append", {"x", nil, NewVector({})}); }, "a,b,c,"},
      {"nil device, 2 coordinates",
       [&](const Object& l) {
         rt->Set(l, "devicecount", 2);
         rt->Call(l, "Append", {"x", NewVector({}), nil});
       },
       "a,b,c,"},
  };
  for (const auto& c : cases) {
    Object list = NewList("COLOR_GRAY", 0);
    rt->Set(list, "prefix", "p");
    for (const char* name : {"a", "b", "c"}) rt->Call(list, "Append", {name, NewVector({}), nil});
    c.edit(list);
    EXPECT_EQ(Names(list), c.names) << c.what;
    EXPECT_EQ(rt->Get(list, "prefix").AsString() + rt->Get(list, "pcsspace").AsString(), "pCOLOR_GRAY") << c.what;
  }
  Object grown = NewList("COLOR_Lab", 2);
  rt->Set(grown, "size", 1);  // a zero entry
  Value name("old");
  rt->Call(grown, "Get", {0, ByRef(name), Value(), NewVector({})});
  rt->Call(grown, "Get", {1, ByRef(name), NewVector({}), NewVector({})});
  EXPECT_EQ(name.AsString(), "old");
  EXPECT_EQ(At(grown, 0).pcs, (std::vector<double>{0.0, -128.0, -128.0}));
  EXPECT_EQ(At(grown, 0).device, (std::vector<double>{0.0, 0.0}));

  // devicecount stays within the 8 slots of an entry; a refusal is reported.
  for (int count : {9, -1, INT32_MAX, 8}) {
    rt->Set(grown, "devicecount", count);
    EXPECT_EQ(Error(), count == 8 ? 0 : 87) << count;
    EXPECT_EQ(rt->Get(grown, "devicecount").AsInteger(), count == 8 ? 8 : 2) << count;
  }
  for (const char* space : {"COLOR_GRAY", "COLOR_RGB", "COLOR_XYZ", "COLOR_Yxy", "COLOR_Lab", "COLOR_3_CHANNEL",
                            "COLOR_CMYK", "COLOR_5_CHANNEL", "COLOR_6_CHANNEL", "COLOR_7_CHANNEL", "COLOR_8_CHANNEL",
                            "COLOR_NAMED"}) {
    rt->Set(grown, "pcsspace", space);
    EXPECT_EQ(rt->Get(grown, "pcsspace").AsString(), space);
  }
  for (const std::string& other : std::vector<std::string>{"COLOR_lab", "", std::string("COLOR_Lab\0", 10)}) {
    rt->Set(grown, "pcsspace", other);
    EXPECT_EQ(rt->Get(grown, "pcsspace").AsString(), "COLOR_NAMED") << other;
  }
  rt->Set(grown, "prefix", std::string(40, 'p'));
  EXPECT_EQ(rt->Get(grown, "prefix").AsString(), std::string(31, 'p'));
}

TEST_F(NamedColorTest, ValuesAreStoredAsLittleCmsReadsThemAndReadBack) {
  const std::string longName(40, 'n');
  const struct {
    const char* pcsspace;
    int devicecount;
    std::vector<double> pcs, device;
    std::vector<uint16_t> pcsWords, deviceWords;
    std::vector<double> pcsBack, deviceBack;  // through Get, before and after the tag
  } cases[] = {
      {"COLOR_Lab", 4, {50, 0, 0}, {1.0, 0.5, 0, 0.25}, {0x7F7F, 0x8000, 0x8000}, {0xFFFF, 0x7FFF, 0, 0x3FFF},
       {32639 / 652.8, 0, 0}, {1.0, 32767 / 65535.0, 0, 16383 / 65535.0}},
      {"COLOR_Lab", 0, {0, -128, 127}, {}, {0, 0, 0xFF00}, {}, {0, -128, 127}, {}},
      // Past the 32-bit range, NaN and infinity are 0; within it the low 16 bits are kept.
      {"COLOR_Lab", 3, {kNaN, kInf, 1e308}, {-kInf, kNaN, 1.5}, {0, 0, 0}, {0, 0, 0x7FFE},
       {0, -128, -128}, {0, 0, 0x7FFE / 65535.0}},
      {"COLOR_Lab", 1, {100}, {0.5}, {0xFEFF, 0x8000, 0x8000}, {0x7FFF}, {0xFEFF / 652.8, 0, 0},
       {32767 / 65535.0}},
      // A Device Vector whose size is not devicecount leaves the device values 0.
      {"COLOR_XYZ", 8, {12345.7, 0, 65535}, {0.5, 0.5, 0.5}, {12345, 0, 0xFFFF}, std::vector<uint16_t>(8),
       {12345, 0, 65535}, std::vector<double>(8)},
      {"COLOR_GRAY", 0, {50, 0, 0}, {}, {0, 0, 0}, {}, {}, {}},
  };
  for (const auto& c : cases) {
    const std::string what = std::string(c.pcsspace) + " " + std::to_string(c.devicecount);
    Object list = NewList(c.pcsspace, c.devicecount);
    rt->Set(list, "prefix", "pre ");
    rt->Set(list, "suffix", std::string(40, 's'));
    Append(list, longName, c.pcs, c.device);
    Append(list, "second", c.pcs, c.device);
    const Color kept = At(list, 0);
    EXPECT_EQ(kept.name, std::string(32, 'n')) << what;
    EXPECT_EQ(kept.pcs, c.pcsBack) << what;
    EXPECT_EQ(kept.device, c.deviceBack) << what;

    const std::string path = files.Copy("sRGB.icc", "p.icc");
    Object p = Open(path);
    rt->Call(p, "SetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 0) << what;
    rt->Call(p, "SaveProfile");
    const LcmsList lcms = ReadWithLcms(path);
    EXPECT_EQ(lcms.tagSize, 84u + 2 * (38 + 2 * c.devicecount)) << what;
    EXPECT_EQ(lcms.names, (std::vector<std::string>{std::string(31, 'n'), "second"})) << what;
    EXPECT_EQ(lcms.prefix + lcms.suffix, "pre " + std::string(31, 's')) << what;
    for (size_t i = 0; i < lcms.names.size(); ++i) {
      EXPECT_EQ(lcms.pcs[i], c.pcsWords) << what;
      EXPECT_EQ(lcms.device[i], c.deviceWords) << what;
    }

    Object back = NewList(c.pcsspace, 5);
    rt->Set(back, "size", 3);  // replaced by the tag's colours
    rt->Call(p, "GetNC", {"ncl2", back});
    EXPECT_EQ(Error(), 0) << what;
    EXPECT_EQ(rt->Get(back, "devicecount").AsInteger(), c.devicecount) << what;
    EXPECT_EQ(rt->Get(back, "suffix").AsString(), std::string(31, 's')) << what;
    EXPECT_EQ(Names(back), std::string(31, 'n') + ",second,") << what;
    EXPECT_EQ(At(back, 1).pcs, c.pcsBack) << what;
    EXPECT_EQ(At(back, 1).device, c.deviceBack) << what;
  }
}

TEST_F(NamedColorTest, RealNamedColorProfilesReadAsLittleCmsReadsThem) {
  for (const char* name : {"colord/Crayons.icc", "colord/x11-colors.icc"}) {
    const std::string path = files.Copy(name, "real.icc");
    const LcmsList lcms = ReadWithLcms(path);
    ASSERT_GT(lcms.names.size(), 10u) << name;
    Object p = Open(path);
    Object list = NewList("COLOR_XYZ", 0);  // PCS values as their 16-bit numbers
    rt->Call(p, "GetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 0) << name;
    ASSERT_EQ(rt->Get(list, "size").AsInteger(), int(lcms.names.size())) << name;
    EXPECT_EQ(rt->Get(list, "prefix").AsString() + "|" + rt->Get(list, "suffix").AsString(),
              lcms.prefix + "|" + lcms.suffix);
    for (size_t i = 0; i < lcms.names.size(); ++i) {
      const Color c = At(list, int(i));
      EXPECT_EQ(c.name, lcms.names[i]) << name;
      EXPECT_EQ(c.pcs, std::vector<double>(lcms.pcs[i].begin(), lcms.pcs[i].end())) << name << " " << i;
      std::vector<double> device;
      for (uint16_t w : lcms.device[i]) device.push_back(w / 65535.0);
      EXPECT_EQ(c.device, device) << name << " " << i;
    }
  }
}

// A profile file whose ncl2 tag (2 colours, 3 device coordinates) is then altered.
TEST_F(NamedColorTest, TagsThatLieAreRefusedAndLeaveTheListAsItWas) {
  const std::string path = files.Copy("sRGB.icc", "lie.icc");
  {
    Object p = Open(path);
    Object list = NewList("COLOR_Lab", 3);
    Append(list, "red", {50, 60, 70}, {1, 0, 0});
    Append(list, "blue", {30, -20, -60}, {0, 0, 1});
    rt->Call(p, "SetNC", {"ncl2", list});
    rt->Call(p, "SaveProfile");
  }
  const std::vector<char> good = ProfileFiles::Read(path);
  // "ncl2" names the tag in the table first, then types its data.
  const char sig[] = "ncl2";
  const size_t entry = size_t(std::search(good.begin(), good.end(), sig, sig + 4) - good.begin());
  const size_t at = size_t(std::search(good.begin() + long(entry) + 4, good.end(), sig, sig + 4) - good.begin());
  ASSERT_LT(at, good.size());
  const struct {
    const char* what;
    size_t offset;
    uint32_t value;
    const char* message;
  } cases[] = {
      {"3 colours in the bytes of 2", at + 12, 3, "Named colour count exceeds the tag"},
      {"2^32 - 1 colours", at + 12, 0xFFFFFFFF, "Named colour count exceeds the tag"},
      {"4 device coordinates in the bytes of 3", at + 16, 4, "Named colour count exceeds the tag"},
      {"9 device coordinates", at + 16, 9, "Named colour tag has more than 8 device coordinates"},
      {"an XYZ tag", at, 0x58595A20, "Tag is not a named colour list"},
      {"60 bytes", entry + 8, 60, "Named colour tag is too short"},
  };
  for (const auto& c : cases) {
    std::vector<char> lie = good;
    for (int i = 0; i < 4; ++i) lie[c.offset + i] = char(c.value >> (24 - 8 * i));
    ProfileFiles::Write(path, lie);
    Object p = Open(path);
    Object list = NewList("COLOR_Lab", 2);
    rt->Set(list, "prefix", "kept");
    Append(list, "kept", {1, 2, 3}, {0.5, 0.5});
    Object d = Debugger();
    rt->Call(p, "GetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 2011) << c.what;  // ERROR_INVALID_PROFILE
    EXPECT_TRUE(Traced(c.message)) << c.what;
    EXPECT_EQ(State(list), "kept,|kept|2") << c.what;
    EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), 0) << c.what;
  }

  // An absent tag empties the list and keeps the rest; the last error stays.
  Object p = Open(path);
  Object list = NewList("COLOR_Lab", 2);
  rt->Set(list, "prefix", "kept");
  Append(list, "gone", {1, 2, 3}, {0.5, 0.5});
  rt->Set(list, "devicecount", 9);
  Object d = Debugger();
  rt->Call(p, "GetNC", {"abcd", list});
  EXPECT_EQ(log.entries, std::vector<std::string>{"DebugString:Tag is not present"});
  EXPECT_EQ(Error(), 87);
  EXPECT_EQ(State(list), "|kept|2");
}

TEST_F(NamedColorTest, AWriteThatFailsIsReportedOnceAndEndsTheTag) {
  Object empty = rt->New("Profile", {Value()});  // no profile open
  Object list = NewList("COLOR_Lab", 1);
  Append(list, "a", {1, 2, 3}, {0.5});
  Object d = Debugger();
  rt->Call(empty, "SetNC", {"ncl2", list});
  EXPECT_EQ(Error(), 6);  // ERROR_INVALID_HANDLE
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugString:-------->", "DebugString:-------->",
                                                   "DebugString:-------->", "DebugString:--------> HALVO_ICMWriteTagNC",
                                                   "DebugString:ncl2", "DebugString:-------->",
                                                   "DebugString:SetColorProfileElement1 fail", "DebugError:6,"}));
  Object p = Open(files.Copy("sRGB.icc", "ok.icc"));
  rt->Call(p, "SetNC", {"ncl2", list});
  EXPECT_EQ(Error(), 0);
  log.entries.clear();
  rt->Call(p, "SetNC", {"ncl2", Value()});
  rt->Call(p, "GetNC", {"ncl2", Value()});
  EXPECT_TRUE(log.entries.empty());
}

}  // namespace
