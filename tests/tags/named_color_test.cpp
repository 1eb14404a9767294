// VectorNC and the named-colour tag, driven as a script drives them: the list's edits and
// conversions, SetNC's tags as Little CMS reads them, real profiles read by GetNC, and
// tags whose counts lie.
#include <algorithm>
#include <cstdint>
#include <functional>
#include <limits>
#include <string>
#include <vector>

#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::ByRef;
using host::Object;
using host::Value;
using Doubles = std::vector<double>;

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();

struct Color {
  std::string name;
  Doubles pcs, device;
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
  const LcmsFile p(path);
  out.tagSize = uint32_t(p.Raw("ncl2").size());
  if (const auto* list = static_cast<const cmsNAMEDCOLORLIST*>(p.Read(cmsSigNamedColor2Tag)))
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
  return out;
}

class NamedColorTest : public PluginTest {
 protected:
  Object NewList(const char* pcsspace, int devicecount, const std::string& prefix = "") {
    Object list = rt->New("VectorNC");
    rt->Set(list, "pcsspace", pcsspace);
    rt->Set(list, "devicecount", devicecount);
    rt->Set(list, "prefix", prefix);
    return list;
  }
  void Append(const Object& list, const std::string& name, const Doubles& pcs, const Doubles& device) {
    rt->Call(list, "Append", {name, NewVector(pcs), NewVector(device)});
  }
  Color At(const Object& list, int i) {
    Value name("old");
    Object pcs = NewVector({7}), device = NewVector({7});
    rt->Call(list, "Get", {i, ByRef(name), pcs, device});
    return {name.AsString(), Values(pcs), Values(device)};
  }
  std::string Str(const Object& o, const char* property) { return rt->Get(o, property).AsString(); }
  std::string Names(const Object& list) {
    std::string names;
    for (int i = 0; i < rt->Get(list, "size").AsInteger(); ++i) names += At(list, i).name + ",";
    return names;
  }
  // Names, prefix and devicecount: what a refused read must leave as it was.
  std::string State(const Object& list) {
    return Names(list) + "|" + Str(list, "prefix") + "|" + std::to_string(rt->Get(list, "devicecount").AsInteger());
  }

  ProfileFiles files;
};

TEST_F(NamedColorTest, ListEditsAndArgumentsItRefuses) {
  Object fresh = rt->New("VectorNC");
  EXPECT_EQ(State(fresh) + Str(fresh, "suffix"), "||0");
  EXPECT_EQ(Str(fresh, "pcsspace"), "COLOR_Lab");

  const Value nil;
  using Edit = std::function<void(const Object&)>;
  auto call = [&](const char* method, int i) -> Edit {
    return [=](const Object& l) { rt->Call(l, method, {i, "x", NewVector({}), nil}); };
  };
  auto size = [&](int n) -> Edit { return [=](const Object& l) { rt->Set(l, "size", n); }; };
  auto del = [&](int i) -> Edit { return [=](const Object& l) { rt->Call(l, "Delete", {i}); }; };
  const std::pair<Edit, const char*> cases[] = {
      {call("Insert", -1), "x,a,b,c,"}, {call("Insert", 1), "a,x,b,c,"}, {call("Insert", 9), "a,b,c,x,"},
      {call("Set", 0), "x,b,c,"},       {call("Set", 3), "a,b,c,"},      {del(1), "a,c,"},
      {del(-1), "a,b,c,"},              {del(3), "a,b,c,"},              {size(5), "a,b,c,,,"},
      {size(1), "a,"},                  {size(-1), "a,b,c,"},            {size(INT32_MAX), "a,b,c,"},
      {[&](const Object& l) { rt->Call(l, "Clear"); }, ""},
      {[&](const Object& l) { rt->Call(l, "Insert", {0, "x", nil, NewVector({})}); }, "a,b,c,"},  // no PCS
      {[&](const Object& l) {  // no device values for its 2 coordinates
         rt->Set(l, "devicecount", 2);
         rt->Call(l, "Append", {"x", NewVector({}), nil});
       },
       "a,b,c,"},
  };
  for (const auto& [edit, names] : cases) {
    Object list = NewList("COLOR_GRAY", 0, "p");
    for (const char* name : {"a", "b", "c"}) rt->Call(list, "Append", {name, NewVector({}), nil});
    edit(list);
    EXPECT_EQ(Names(list) + "|" + Str(list, "prefix") + Str(list, "pcsspace"), std::string(names) + "|pCOLOR_GRAY");
  }
  Object grown = NewList("COLOR_Lab", 2);
  rt->Set(grown, "size", 1);  // a zero entry
  Value name("old");
  rt->Call(grown, "Get", {0, ByRef(name), Value(), NewVector({})});
  rt->Call(grown, "Get", {1, ByRef(name), NewVector({}), NewVector({})});
  EXPECT_EQ(name.AsString(), "old");
  EXPECT_EQ(At(grown, 0).pcs, (Doubles{0.0, -128.0, -128.0}));
  EXPECT_EQ(At(grown, 0).device, (Doubles{0.0, 0.0}));

  // devicecount stays within the 8 slots of an entry; a refusal is reported.
  for (int count : {9, -1, INT32_MAX, 8}) {
    rt->Set(grown, "devicecount", count);
    EXPECT_EQ(Error(), count == 8 ? 0 : 87) << count;
    EXPECT_EQ(rt->Get(grown, "devicecount").AsInteger(), count == 8 ? 8 : 2) << count;
  }
  // Every name of the table sets its space; any other text, last three, leaves COLOR_NAMED as it was.
  const std::vector<std::string> spaces = {
      "COLOR_GRAY",      "COLOR_RGB",       "COLOR_XYZ",   "COLOR_Yxy", "COLOR_Lab",          "COLOR_3_CHANNEL",
      "COLOR_CMYK",      "COLOR_5_CHANNEL", "COLOR_6_CHANNEL", "COLOR_7_CHANNEL", "COLOR_8_CHANNEL", "COLOR_NAMED",
      "COLOR_lab",       "",                std::string("COLOR_Lab\0", 10)};
  for (size_t i = 0; i < spaces.size(); ++i) {
    rt->Set(grown, "pcsspace", spaces[i]);
    EXPECT_EQ(Str(grown, "pcsspace"), spaces[std::min<size_t>(i, 11)]) << spaces[i];
  }
  rt->Set(grown, "prefix", std::string(40, 'p'));
  EXPECT_EQ(Str(grown, "prefix"), std::string(31, 'p'));
}

TEST_F(NamedColorTest, ValuesAreStoredAsLittleCmsReadsThemAndReadBack) {
  const struct {
    const char* pcsspace;
    int devicecount;
    Doubles pcs, device;
    std::vector<uint16_t> pcsWords, deviceWords;
    Doubles pcsBack, deviceBack;  // through Get after the tag
  } cases[] = {
      {"COLOR_Lab", 4, {50, 0, 0}, {1.0, 0.5, 0, 0.25}, {0x7F7F, 0x8000, 0x8000}, {0xFFFF, 0x7FFF, 0, 0x3FFF},
       {32639 / 652.8, 0, 0}, {1.0, 32767 / 65535.0, 0, 16383 / 65535.0}},
      {"COLOR_Lab", 0, {0, -128, 127}, {}, {0, 0, 0xFF00}, {}, {0, -128, 127}, {}},
      // Past the 32-bit range, NaN and infinity are 0; within it the low 16 bits are kept.
      {"COLOR_Lab", 3, {kNaN, kInf, 1e308}, {-kInf, kNaN, 1.5}, {0, 0, 0}, {0, 0, 0x7FFE}, {0, -128, -128},
       {0, 0, 0x7FFE / 65535.0}},
      {"COLOR_Lab", 1, {100}, {0.5}, {0xFEFF, 0x8000, 0x8000}, {0x7FFF}, {0xFEFF / 652.8, 0, 0}, {32767 / 65535.0}},
      // A Device Vector whose size is not devicecount leaves the device values 0.
      {"COLOR_XYZ", 8, {12345.7, 0, 65535}, {0.5, 0.5, 0.5}, {12345, 0, 0xFFFF}, std::vector<uint16_t>(8),
       {12345, 0, 65535}, Doubles(8)},
      {"COLOR_GRAY", 0, {50, 0, 0}, {}, {0, 0, 0}, {}, {}, {}},
  };
  for (const auto& c : cases) {
    const std::string what = std::string(c.pcsspace) + " " + std::to_string(c.devicecount);
    Object list = NewList(c.pcsspace, c.devicecount, "pre ");
    rt->Set(list, "suffix", std::string(40, 's'));
    Append(list, std::string(40, 'n'), c.pcs, c.device);
    Append(list, "second", c.pcs, c.device);
    EXPECT_EQ(At(list, 0).name, std::string(32, 'n')) << what;  // the tag keeps 31

    const std::string path = files.Copy("sRGB.icc", "p.icc");
    Object p = Open(path);
    rt->Call(p, "SetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 0) << what;
    rt->Call(p, "SaveProfile");
    const LcmsList lcms = ReadWithLcms(path);
    EXPECT_EQ(lcms.tagSize, 84u + 2 * (38 + 2 * c.devicecount)) << what;
    EXPECT_EQ(lcms.names, (std::vector<std::string>{std::string(31, 'n'), "second"})) << what;
    EXPECT_EQ(lcms.prefix + lcms.suffix, "pre " + std::string(31, 's')) << what;
    EXPECT_EQ(lcms.pcs, (std::vector<std::vector<uint16_t>>(2, c.pcsWords))) << what;
    EXPECT_EQ(lcms.device, (std::vector<std::vector<uint16_t>>(2, c.deviceWords))) << what;

    Object back = NewList(c.pcsspace, 5);
    rt->Set(back, "size", 3);  // replaced by the tag's colours
    rt->Call(p, "GetNC", {"ncl2", back});
    EXPECT_EQ(Error(), 0) << what;
    EXPECT_EQ(State(back) + Str(back, "suffix"),
              std::string(31, 'n') + ",second,|pre |" + std::to_string(c.devicecount) + std::string(31, 's'));
    EXPECT_EQ(At(back, 1).pcs, c.pcsBack) << what;
    EXPECT_EQ(At(back, 1).device, c.deviceBack) << what;
    // Coordinates beyond the tag's are 0, not the bytes of the colour behind.
    rt->Set(back, "devicecount", 8);
    Doubles widened = c.deviceBack;
    widened.resize(8);
    EXPECT_EQ(At(back, 0).device, widened) << what;
  }
}

TEST_F(NamedColorTest, RealNamedColorProfilesReadAsLittleCmsReadsThem) {
  for (const char* name : {"colord/Crayons.icc", "colord/x11-colors.icc"}) {
    const std::string path = files.Copy(name, "real.icc");
    const LcmsList lcms = ReadWithLcms(path);
    ASSERT_GT(lcms.names.size(), 10u) << name;
    Object list = NewList("COLOR_XYZ", 0);  // PCS values as their 16-bit numbers
    rt->Call(Open(path), "GetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 0) << name;
    ASSERT_EQ(rt->Get(list, "size").AsInteger(), int(lcms.names.size())) << name;
    EXPECT_EQ(Str(list, "prefix") + "|" + Str(list, "suffix"), lcms.prefix + "|" + lcms.suffix);
    for (size_t i = 0; i < lcms.names.size(); ++i) {
      const Color c = At(list, int(i));
      Doubles device;
      for (uint16_t w : lcms.device[i]) device.push_back(w / 65535.0);
      EXPECT_EQ(c.name, lcms.names[i]) << name;
      EXPECT_EQ(c.pcs, Doubles(lcms.pcs[i].begin(), lcms.pcs[i].end())) << name << " " << i;
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
    size_t offset;
    uint32_t value;
    const char* message;
  } cases[] = {
      {at + 12, 3, "Named colour count exceeds the tag"},           // 3 colours in the bytes of 2
      {at + 12, 0xFFFFFFFF, "Named colour count exceeds the tag"},  // 2^32 - 1 colours
      {at + 16, 4, "Named colour count exceeds the tag"},           // 4 coordinates in the bytes of 3
      {at + 16, 9, "Named colour tag has more than 8 device coordinates"},
      {at, 0x58595A20, "Tag is not a named colour list"},  // an XYZ tag
      {entry + 8, 60, "Named colour tag is too short"},   // 60 bytes
  };
  for (const auto& c : cases) {
    std::vector<char> lie = good;
    for (int i = 0; i < 4; ++i) lie[c.offset + i] = char(c.value >> (24 - 8 * i));
    ProfileFiles::Write(path, lie);
    Object p = Open(path);
    Object list = NewList("COLOR_Lab", 2, "kept");
    Append(list, "kept", {1, 2, 3}, {0.5, 0.5});
    Object d = Debugger();
    rt->Call(p, "GetNC", {"ncl2", list});
    EXPECT_EQ(Error(), 2011) << c.message;  // ERROR_INVALID_PROFILE
    EXPECT_TRUE(Traced(c.message));
    EXPECT_EQ(State(list), "kept,|kept|2") << c.message;
    EXPECT_EQ(rt->Get(p, "NamedColorCount").AsInteger(), 0) << c.message;
  }

  // An absent tag empties the list and keeps the rest; the last error stays.
  Object p = Open(path), list = NewList("COLOR_Lab", 2, "kept");
  Append(list, "gone", {1, 2, 3}, {0.5, 0.5});
  rt->Set(list, "devicecount", 9);
  Object d = Debugger();
  rt->Call(p, "GetNC", {"abcd", list});
  EXPECT_EQ(log.entries, std::vector<std::string>{"DebugString:Tag is not present"});
  EXPECT_EQ(Error(), 87);
  EXPECT_EQ(State(list), "|kept|2");
}

TEST_F(NamedColorTest, AWriteThatFailsIsReportedOnceAndEndsTheTag) {
  Object empty = rt->New("Profile", {Value()}), list = NewList("COLOR_Lab", 1);  // no profile open
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
