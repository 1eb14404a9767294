// Colour worlds through the host: building them from profiles, matching CMColor values
// against Little CMS and checking Lab colours, with the traces and codes a script sees.
#include "lcms_reference.h"
#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using Doubles = std::vector<double>;

const char* const kCmyk = "ghostscript/default_cmyk.icc";

class ColorWorldTest : public PluginTest {
 protected:
  Object Open(const std::string& systemRelative) { return PluginTest::Open(TINTWELL_ICC_DIR "/" + systemRelative); }
  Object Rgb(double r, double g, double b) {
    Object c = rt->New("CMColor");
    rt->Set(c, "rr", r), rt->Set(c, "rg", g), rt->Set(c, "rb", b);
    return c;
  }
  // A colour matched by w, read back through the views named.
  Doubles Match(const Object& w, const Object& color, std::initializer_list<const char*> views) {
    rt->Call(w, "MatchCMcolor", {color});
    Doubles out;
    for (const char* v : views) out.push_back(rt->Get(color, v).AsDouble());
    return out;
  }
  ProfileFiles files;  // keeps the colour directory private
};

// The reference's answer in doubles, scaled.
Doubles Reference(const LcmsChain& chain, const void* in, std::size_t outChannels, double scale = 1) {
  Doubles out(outChannels);
  chain.Run(in, out.data());
  for (double& v : out) v *= scale;
  return out;
}

void ExpectNear(const Doubles& got, const Doubles& want, double tolerance) {
  ASSERT_EQ(got.size(), want.size());
  for (std::size_t k = 0; k < got.size(); ++k) EXPECT_NEAR(got[k], want[k], tolerance) << "channel " << k;
}

TEST_F(ColorWorldTest, BuildingTracesAndUnusableProfilesLeaveItEmpty) {
  Object srgb = Open("sRGB.icc"), empty = rt->New("Profile", {nullptr}), d = Debugger();
  Object ok = rt->New("ColorWorld", {srgb, srgb});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugString: ", "DebugString:--->COLORWORLD CONSTRUCTOR",
                                                   "DebugString:Colorworld ERROR:", "DebugInteger:0"}));
  for (const auto& [first, second, code, trace] :
       {std::tuple{empty, srgb, -20, "Error: Could not open ICM profile 1"},
        std::tuple{srgb, Object(), -21, "Error: Could not open ICM profile 2"}}) {
    log.entries.clear();
    Object w = rt->New("ColorWorld", {first, second});
    EXPECT_EQ(Error(), code);
    EXPECT_EQ(std::vector<std::string>(log.entries.end() - 2, log.entries.end()),
              (std::vector<std::string>{std::string("DebugString:") + trace, "DebugError:" + std::to_string(code) + ","}));
  }
  Object w = rt->New("ColorWorld", {srgb, nullptr}), c = Rgb(1, 2, 3);
  EXPECT_EQ(Match(w, c, {"rr"}), Doubles{1.0});
  EXPECT_EQ(Error(), -21);
  rt->Call(w, "MatchCMcolor", {nullptr});
  EXPECT_EQ(Error(), -1);
  EXPECT_FALSE(rt->Call(w, "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_EQ(Error(), -21);

  // Rebuilding a built colour world says so before it starts.
  rt->Call(ok, "ColorWorld", {empty, srgb});
  EXPECT_TRUE(Traced("Deleteing colorworld"));
  rt->Call(ok, "MatchCMcolor", {c});
  EXPECT_EQ(Error(), -21);  // the old transform is gone
}

TEST_F(ColorWorldTest, ConcatenationSkipsNilProfilesAndTakesTypesFromTheEnds) {
  Object srgb = Open("sRGB.icc"), lab = Open("LCMSLABI.ICM"), cmyk = Open(kCmyk);
  Object w = rt->New("ColorWorld");
  rt->Call(w, "ConcatColorWorld", {0, nullptr, srgb, lab, nullptr});
  EXPECT_EQ(Error(), 0);
  EXPECT_NEAR(Match(w, Rgb(255, 255, 255), {"ll"})[0], 100.0, 0.6);
  rt->Call(w, "ConcatColorWorld", {0, srgb, lab, cmyk, nullptr});  // RGB → Lab → CMYK
  EXPECT_EQ(Error(), 0);
  EXPECT_LT(Match(w, Rgb(255, 255, 255), {"ck"})[0], 0.02);
  EXPECT_EQ(Error(), 0);
  rt->Call(w, "ConcatColorWorld", {0, nullptr, nullptr, nullptr, nullptr});
  EXPECT_EQ(Error(), 87);  // no profiles: the platform refuses with ERROR_INVALID_PARAMETER
  Match(w, Rgb(0, 0, 0), {});
  EXPECT_EQ(Error(), -21);

  Object made = rt->CallGlobal("NewConcatColorWorld", {0, srgb, nullptr, lab, nullptr}).AsObject();
  EXPECT_EQ(made.ClassName(), "ColorWorld");
  EXPECT_NEAR(Match(made, Rgb(128, 128, 128), {"la"})[0], 0.0, 0.6);
  EXPECT_EQ(Error(), 0);
}

// Without a transform there is no answer: false must come with an error and a trace,
// and the next check that can be made clears it.
TEST_F(ColorWorldTest, CheckLabTellsInFromOutOfGamut) {
  Object lab = Open("LCMSLABI.ICM"), srgb = Open("sRGB.icc"), d = Debugger();
  EXPECT_FALSE(rt->Call(rt->New("ColorWorld"), "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_EQ(Error(), -21);
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugString:Error: Colorworld has no transform", "DebugError:-21,"}));
  Object w = rt->New("ColorWorld", {lab, srgb});
  const struct {
    double L, a, b;
    bool in;
  } cases[] = {{50, 0, 0, true}, {100, 0, 0, true}, {50, 100, -100, false}, {90, -80, 80, false}};
  for (const auto& c : cases) EXPECT_EQ(rt->Call(w, "CheckLAB", {c.L, c.a, c.b}).AsBoolean(), c.in) << c.L << c.a;
  EXPECT_EQ(Error(), 0);
  rt->Call(w, "MatchCMcolor", {nullptr});  // leaves -1, which CMMcount clears
  EXPECT_EQ(rt->Get(w, "CMMcount").AsInteger(), 1);
  EXPECT_EQ(Error(), 0);
}

// A device link's data space goes in and its connection-space field, the link's output
// space, comes out; anything else leaves the colour world empty with -20.
TEST_F(ColorWorldTest, LinkColorWorldTakesOnlyADeviceLink) {
  Object srgb = Open("sRGB.icc"), lab = Open("LCMSLABI.ICM"), d = Debugger(), w = rt->New("ColorWorld");
  rt->Call(w, "LinkColorWorld", {srgb});
  EXPECT_EQ(Error(), -20);
  EXPECT_TRUE(Traced("Error: Not a device link profile"));
  log.entries.clear();
  rt->Call(w, "LinkColorWorld", {nullptr});
  EXPECT_EQ(Error(), -20);
  EXPECT_TRUE(Traced("Error: Could not open ICM profile 1"));
  const std::string path = files.Path("link.icc");
  Object link = rt->CallGlobal("NewLinkProfile", {rt->MakeFolderItem(path), 0, srgb, lab, nullptr, nullptr}).AsObject();
  rt->Call(w, "LinkColorWorld", {link});
  EXPECT_EQ(Error(), 0);
  ExpectNear(Match(w, Rgb(255, 255, 255), {"ll", "la", "lb"}), {100, 0, 0}, 0.6);
}

// The Lab words hold L to 1/652.8 and a, b to 1/256, truncated on the way in and rounded
// on the way out; 0.01 covers both with room to spare.
TEST_F(ColorWorldTest, MatchesLittleCmsInDoublePrecision) {
  Object srgb = Open("sRGB.icc"), lab = Open("LCMSLABI.ICM"), cmyk = Open(kCmyk);
  Object toLab = rt->New("ColorWorld", {srgb, lab}), viaCmyk = rt->New("ColorWorld");
  // A proof: into the printer's CMYK and back out of it, so the printer appears twice.
  rt->Call(viaCmyk, "ConcatColorWorld", {0, srgb, cmyk, cmyk, lab});
  ASSERT_EQ(Error(), 0);
  const LcmsChain direct({"sRGB.icc", "LCMSLABI.ICM"}, TYPE_RGB_DBL, TYPE_Lab_DBL);
  const LcmsChain printed({"sRGB.icc", kCmyk, kCmyk, "LCMSLABI.ICM"}, TYPE_RGB_DBL, TYPE_Lab_DBL);
  const double colors[][3] = {{255, 255, 255}, {255, 0, 0}, {0, 255, 0}, {0, 0, 255},
                              {0, 0, 0},       {12, 200, 99}, {180, 30, 250}};
  for (const auto& c : colors) {
    SCOPED_TRACE(std::to_string(c[0]) + " " + std::to_string(c[1]) + " " + std::to_string(c[2]));
    const double in[3] = {c[0] / 255, c[1] / 255, c[2] / 255};
    ExpectNear(Match(toLab, Rgb(c[0], c[1], c[2]), {"ll", "la", "lb"}), Reference(direct, in, 3), 0.01);
    ExpectNear(Match(viaCmyk, Rgb(c[0], c[1], c[2]), {"ll", "la", "lb"}), Reference(printed, in, 3), 0.01);
  }
}

TEST_F(ColorWorldTest, ANamedColourProfileTakesColourIndexes) {
  Object w = rt->New("ColorWorld", {Open("colord/x11-colors.icc"), Open("sRGB.icc")});
  ASSERT_EQ(Error(), 0);
  const LcmsChain expected({"colord/x11-colors.icc", "sRGB.icc"}, TYPE_NAMED_COLOR_INDEX, TYPE_RGB_DBL);
  for (int index : {1, 2, 50}) {
    Object color = rt->New("CMColor");
    rt->Set(color, "namedindex", index);
    const cmsUInt16Number zeroBased = cmsUInt16Number(index - 1);
    ExpectNear(Match(w, color, {"rr", "rg", "rb"}), Reference(expected, &zeroBased, 3, 255), 0.01);
    EXPECT_EQ(Error(), 0) << index;
  }
}

TEST_F(ColorWorldTest, RoundTripThroughLabKeepsEightBitLevels) {
  Object srgb = Open("sRGB.icc"), lab = Open("LCMSLABI.ICM");
  Object there = rt->New("ColorWorld", {srgb, lab}), back = rt->New("ColorWorld", {lab, srgb});
  for (int r = 0; r <= 255; r += 51)
    for (int g = 0; g <= 255; g += 51)
      for (int b = 0; b <= 255; b += 51) {
        Object color = Rgb(r, g, b);
        rt->Call(there, "MatchCMcolor", {color});
        ExpectNear(Match(back, color, {"rr", "rg", "rb"}), {double(r), double(g), double(b)}, 1.0);
      }
}

TEST_F(ColorWorldTest, EachProfilesIntentReachesTheEngine) {
  Object srgb = Open("sRGB.icc"), cmyk = Open(kCmyk);
  const int cases[][2] = {{INTENT_PERCEPTUAL, INTENT_SATURATION},
                          {INTENT_PERCEPTUAL, INTENT_ABSOLUTE_COLORIMETRIC},
                          {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC}};
  std::vector<Doubles> results;
  const double in[3] = {20 / 255.0, 220 / 255.0, 60 / 255.0};
  for (const auto& c : cases) {
    rt->Set(srgb, "RenderIntent", c[0]);
    rt->Set(cmyk, "RenderIntent", c[1]);
    const LcmsChain expected({"sRGB.icc", kCmyk}, TYPE_RGB_DBL, TYPE_CMYK_DBL,
                             {cmsUInt32Number(c[0]), cmsUInt32Number(c[1])});
    results.push_back(Match(rt->New("ColorWorld", {srgb, cmyk}), Rgb(20, 220, 60), {"cc", "cm", "cy", "ck"}));
    ExpectNear(results.back(), Reference(expected, in, 4, 0.01), 1.0 / 65535 + 1e-9);
  }
  EXPECT_NE(results[0], results[1]);  // the printer's intent alone changes the result
}

}  // namespace
