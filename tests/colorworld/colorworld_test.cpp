// Colour worlds through the host: building them from profiles, matching CMColor values
// and checking Lab colours, with the traces and codes a script sees.
#include <cmath>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using host::Value;

class ColorWorldTest : public PluginTest {
 protected:
  Object Open(const std::string& systemRelative) {
    return rt->New("Profile", {rt->MakeFolderItem(std::string(TINTWELL_ICC_DIR) + "/" + systemRelative)});
  }
  int32_t Error() { return rt->CallGlobal("CMError").AsInteger(); }
  Object Debugger() {
    Object d = rt->New("halvoDebugger");
    log.Attach(*rt, d);
    rt->CallGlobal("halvoRegisterDebugger", {d});
    log.entries.clear();
    return d;
  }
  Object Rgb(double r, double g, double b) {
    Object c = rt->New("CMColor");
    rt->Set(c, "rr", r);
    rt->Set(c, "rg", g);
    rt->Set(c, "rb", b);
    return c;
  }
  double D(const Object& c, const char* p) { return rt->Get(c, p).AsDouble(); }
  ProfileFiles files;  // keeps the colour directory private
  EventLog log;
};

TEST_F(ColorWorldTest, ConvertsSrgbToLabAndCmyk) {
  Object srgb = Open("sRGB.icc");
  Object lab = Open("LCMSLABI.ICM");
  Object cmyk = Open("ghostscript/default_cmyk.icc");
  Object d = Debugger();
  Object toLab = rt->New("ColorWorld", {srgb, lab});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugString: ", "DebugString:--->COLORWORLD CONSTRUCTOR",
                                                   "DebugString:Colorworld ERROR:", "DebugInteger:0"}));
  const struct {
    double r, g, b, L, a, bb;
  } cases[] = {
      {255, 255, 255, 100.0, 0.0, 0.0},
      {0, 0, 0, 0.0, 0.0, 0.0},
      {255, 0, 0, 54.29, 80.80, 69.89},  // sRGB red under D50 (relative colorimetric)
      {128, 128, 128, 53.59, 0.0, 0.0},
  };
  for (const auto& c : cases) {
    Object color = Rgb(c.r, c.g, c.b);
    rt->Call(toLab, "MatchCMcolor", {color});
    EXPECT_EQ(Error(), 0);
    // Word encoding limits L to 1/652.8 and a, b to 1/256; the engine adds a little.
    EXPECT_NEAR(D(color, "ll"), c.L, 0.6) << c.r << "," << c.g << "," << c.b;
    EXPECT_NEAR(D(color, "la"), c.a, 0.6);
    EXPECT_NEAR(D(color, "lb"), c.bb, 0.6);
  }

  Object toCmyk = rt->New("ColorWorld", {srgb, cmyk});
  EXPECT_EQ(Error(), 0);
  Object white = Rgb(255, 255, 255);
  rt->Call(toCmyk, "MatchCMcolor", {white});
  for (const char* ch : {"cc", "cm", "cy", "ck"}) EXPECT_LT(D(white, ch), 0.02) << ch;
  Object black = Rgb(0, 0, 0);
  rt->Call(toCmyk, "MatchCMcolor", {black});
  EXPECT_GT(D(black, "ck"), 0.7);
  Object red = Rgb(255, 0, 0);
  rt->Call(toCmyk, "MatchCMcolor", {red});
  EXPECT_LT(D(red, "cc"), 0.1);
  EXPECT_GT(D(red, "cm"), 0.8);
  EXPECT_GT(D(red, "cy"), 0.8);
}

TEST_F(ColorWorldTest, UnusableProfilesLeaveTheColourWorldEmpty) {
  Object srgb = Open("sRGB.icc");
  Object empty = rt->New("Profile", {nullptr});
  Object d = Debugger();
  Object w = rt->New("ColorWorld", {empty, srgb});
  EXPECT_EQ(Error(), -20);
  ASSERT_GE(log.entries.size(), 2u);
  EXPECT_EQ(log.entries[log.entries.size() - 2], "DebugString:Error: Could not open ICM profile 1");
  EXPECT_EQ(log.entries.back(), "DebugError:-20,");
  Object w2 = rt->New("ColorWorld", {srgb, nullptr});
  EXPECT_EQ(Error(), -21);
  EXPECT_EQ(log.entries[log.entries.size() - 2], "DebugString:Error: Could not open ICM profile 2");
  EXPECT_EQ(log.entries.back(), "DebugError:-21,");
  Object c = Rgb(1, 2, 3);
  rt->Call(w2, "MatchCMcolor", {c});
  EXPECT_EQ(Error(), -21);
  EXPECT_EQ(D(c, "rr"), 1.0);
  rt->Call(w2, "MatchCMcolor", {nullptr});
  EXPECT_EQ(Error(), -1);
  EXPECT_FALSE(rt->Call(w2, "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_EQ(Error(), 0);

  // Rebuilding a built colour world says so before it starts.
  Object built = rt->New("ColorWorld", {srgb, srgb});
  rt->Call(built, "ColorWorld", {empty, srgb});
  EXPECT_NE(std::find(log.entries.begin(), log.entries.end(), "DebugString:Deleteing colorworld"), log.entries.end());
  rt->Call(built, "MatchCMcolor", {c});
  EXPECT_EQ(Error(), -21);  // the old transform is gone
}

TEST_F(ColorWorldTest, ConcatenationSkipsNilProfilesAndTakesTypesFromTheEnds) {
  Object srgb = Open("sRGB.icc");
  Object lab = Open("LCMSLABI.ICM");
  Object cmyk = Open("ghostscript/default_cmyk.icc");
  Object w = rt->New("ColorWorld");
  rt->Call(w, "ConcatColorWorld", {0, nullptr, srgb, lab, nullptr});
  EXPECT_EQ(Error(), 0);
  Object white = Rgb(255, 255, 255);
  rt->Call(w, "MatchCMcolor", {white});
  EXPECT_NEAR(D(white, "ll"), 100.0, 0.6);

  rt->Call(w, "ConcatColorWorld", {0, srgb, lab, cmyk, nullptr});  // RGB → Lab → CMYK
  EXPECT_EQ(Error(), 0);
  Object paper = Rgb(255, 255, 255);
  rt->Call(w, "MatchCMcolor", {paper});
  EXPECT_EQ(Error(), 0);
  EXPECT_LT(D(paper, "ck"), 0.02);

  rt->Call(w, "ConcatColorWorld", {0, nullptr, nullptr, nullptr, nullptr});
  EXPECT_EQ(Error(), 87);  // no profiles: the platform refuses with ERROR_INVALID_PARAMETER
  rt->Call(w, "MatchCMcolor", {paper});
  EXPECT_EQ(Error(), -21);

  Object made = rt->CallGlobal("NewConcatColorWorld", {0, srgb, nullptr, lab, nullptr}).AsObject();
  EXPECT_EQ(made.ClassName(), "ColorWorld");
  Object grey = Rgb(128, 128, 128);
  rt->Call(made, "MatchCMcolor", {grey});
  EXPECT_EQ(Error(), 0);
  EXPECT_NEAR(D(grey, "la"), 0.0, 0.6);
}

TEST_F(ColorWorldTest, CheckLabTellsInFromOutOfGamut) {
  Object lab = Open("LCMSLABI.ICM");
  Object srgb = Open("sRGB.icc");
  Object w = rt->New("ColorWorld", {lab, srgb});
  EXPECT_TRUE(rt->Call(w, "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_TRUE(rt->Call(w, "CheckLAB", {100.0, 0.0, 0.0}).AsBoolean());
  EXPECT_FALSE(rt->Call(w, "CheckLAB", {50.0, 100.0, -100.0}).AsBoolean());
  EXPECT_FALSE(rt->Call(w, "CheckLAB", {90.0, -80.0, 80.0}).AsBoolean());
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->Get(w, "CMMcount").AsInteger(), 1);
}

TEST_F(ColorWorldTest, LinkColorWorldNeedsADeviceLink) {
  Object srgb = Open("sRGB.icc");
  Object d = Debugger();
  Object w = rt->New("ColorWorld");
  rt->Call(w, "LinkColorWorld", {srgb});
  EXPECT_EQ(Error(), -20);
  ASSERT_GE(log.entries.size(), 2u);
  EXPECT_EQ(log.entries[log.entries.size() - 2], "DebugString:Error: Not a device link profile");
  rt->Call(w, "LinkColorWorld", {nullptr});
  EXPECT_EQ(Error(), -20);
}

}  // namespace
