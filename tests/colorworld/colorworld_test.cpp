// Colour worlds through the host: building them from profiles, matching CMColor values
// and checking Lab colours, with the traces and codes a script sees.
#include <lcms2.h>

#include <cmath>

#include "icm.h"
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
  Object Rgb(double r, double g, double b) {
    Object c = rt->New("CMColor");
    rt->Set(c, "rr", r);
    rt->Set(c, "rg", g);
    rt->Set(c, "rb", b);
    return c;
  }
  double D(const Object& c, const char* p) { return rt->Get(c, p).AsDouble(); }
  ProfileFiles files;  // keeps the colour directory private
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
  EXPECT_EQ(Error(), -21);

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

// Without a transform there is no answer: false must come with an error and a trace,
// and the next check that can be made clears it.
TEST_F(ColorWorldTest, CheckLabWithoutATransformReportsIt) {
  Object lab = Open("LCMSLABI.ICM");
  Object srgb = Open("sRGB.icc");
  Object d = Debugger();
  Object empty = rt->New("ColorWorld");
  EXPECT_FALSE(rt->Call(empty, "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_EQ(Error(), -21);
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugString:Error: Colorworld has no transform", "DebugError:-21,"}));
  Object w = rt->New("ColorWorld", {lab, srgb});
  EXPECT_TRUE(rt->Call(w, "CheckLAB", {50.0, 0.0, 0.0}).AsBoolean());
  EXPECT_EQ(Error(), 0);
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

namespace {

using host::Object;

// Little CMS called directly in double precision: the independent expectation.
class LcmsChain {
 public:
  // Each profile's intent is its header's unless given.
  LcmsChain(const std::vector<std::string>& files, cmsUInt32Number in, cmsUInt32Number out,
            std::vector<cmsUInt32Number> given = {}) {
    std::vector<cmsHPROFILE> profiles;
    std::vector<cmsUInt32Number> intents;
    std::vector<cmsBool> bpc;
    std::vector<cmsFloat64Number> adaptation;
    for (const std::string& f : files) {
      profiles.push_back(cmsOpenProfileFromFile((std::string(TINTWELL_ICC_DIR) + "/" + f).c_str(), "r"));
      intents.push_back(given.empty() ? cmsGetHeaderRenderingIntent(profiles.back()) : given[intents.size()]);
      bpc.push_back(FALSE);
      adaptation.push_back(1.0);
    }
    transform_ = cmsCreateExtendedTransform(nullptr, static_cast<cmsUInt32Number>(profiles.size()), profiles.data(),
                                            bpc.data(), intents.data(), adaptation.data(), nullptr, 0, in, out,
                                            cmsFLAGS_NOCACHE);
    for (cmsHPROFILE p : profiles) cmsCloseProfile(p);
  }
  ~LcmsChain() {
    if (transform_) cmsDeleteTransform(transform_);
  }
  std::vector<double> Run(std::vector<double> in, std::size_t outChannels) const {
    std::vector<double> out(outChannels);
    cmsDoTransform(transform_, in.data(), out.data(), 1);
    return out;
  }
  void RunRaw(const void* in, void* out) const { cmsDoTransform(transform_, in, out, 1); }
  bool ok() const { return transform_ != nullptr; }

 private:
  cmsHTRANSFORM transform_ = nullptr;
};

TEST_F(ColorWorldTest, MatchesLittleCmsInDoublePrecision) {
  Object srgb = Open("sRGB.icc");
  Object lab = Open("LCMSLABI.ICM");
  Object cmyk = Open("ghostscript/default_cmyk.icc");
  Object toLab = rt->New("ColorWorld", {srgb, lab});
  Object viaCmyk = rt->New("ColorWorld");
  // A proof: into the printer's CMYK and back out of it, so the printer appears twice.
  rt->Call(viaCmyk, "ConcatColorWorld", {0, srgb, cmyk, cmyk, lab});
  ASSERT_EQ(Error(), 0);
  const LcmsChain direct({"sRGB.icc", "LCMSLABI.ICM"}, TYPE_RGB_DBL, TYPE_Lab_DBL);
  const LcmsChain printed(
      {"sRGB.icc", "ghostscript/default_cmyk.icc", "ghostscript/default_cmyk.icc", "LCMSLABI.ICM"}, TYPE_RGB_DBL,
      TYPE_Lab_DBL);
  ASSERT_TRUE(direct.ok() && printed.ok());

  const double colors[][3] = {{255, 255, 255}, {255, 0, 0}, {0, 255, 0}, {0, 0, 255},
                              {0, 0, 0},       {12, 200, 99}, {180, 30, 250}};
  for (const auto& c : colors) {
    for (const auto* chain : {&direct, &printed}) {
      Object color = Rgb(c[0], c[1], c[2]);
      rt->Call(chain == &direct ? toLab : viaCmyk, "MatchCMcolor", {color});
      const auto expected = chain->Run({c[0] / 255, c[1] / 255, c[2] / 255}, 3);
      // The Lab words hold L to 1/652.8 and a, b to 1/256, truncated on the way in and
      // rounded on the way out; 0.01 covers both with room to spare.
      EXPECT_NEAR(D(color, "ll"), expected[0], 0.01) << c[0] << " " << c[1] << " " << c[2];
      EXPECT_NEAR(D(color, "la"), expected[1], 0.01) << c[0] << " " << c[1] << " " << c[2];
      EXPECT_NEAR(D(color, "lb"), expected[2], 0.01) << c[0] << " " << c[1] << " " << c[2];
    }
  }
}

TEST_F(ColorWorldTest, ANamedColourProfileTakesColourIndexes) {
  Object names = Open("colord/x11-colors.icc");
  Object srgb = Open("sRGB.icc");
  Object w = rt->New("ColorWorld", {names, srgb});
  ASSERT_EQ(Error(), 0);
  const LcmsChain expected({"colord/x11-colors.icc", "sRGB.icc"}, TYPE_NAMED_COLOR_INDEX, TYPE_RGB_DBL);
  ASSERT_TRUE(expected.ok());
  for (int index : {1, 2, 50}) {
    Object color = rt->New("CMColor");
    rt->Set(color, "namedindex", index);
    rt->Call(w, "MatchCMcolor", {color});
    EXPECT_EQ(Error(), 0) << index;
    cmsUInt16Number zeroBased = static_cast<cmsUInt16Number>(index - 1);
    std::vector<double> want(3);
    expected.RunRaw(&zeroBased, want.data());
    EXPECT_NEAR(D(color, "rr"), want[0] * 255, 0.01) << index;
    EXPECT_NEAR(D(color, "rg"), want[1] * 255, 0.01) << index;
    EXPECT_NEAR(D(color, "rb"), want[2] * 255, 0.01) << index;
  }
}

TEST_F(ColorWorldTest, RoundTripThroughLabKeepsEightBitLevels) {
  Object srgb = Open("sRGB.icc");
  Object lab = Open("LCMSLABI.ICM");
  Object there = rt->New("ColorWorld", {srgb, lab});
  Object back = rt->New("ColorWorld", {lab, srgb});
  for (int r = 0; r <= 255; r += 51)
    for (int g = 0; g <= 255; g += 51)
      for (int b = 0; b <= 255; b += 51) {
        Object color = Rgb(r, g, b);
        rt->Call(there, "MatchCMcolor", {color});
        rt->Call(back, "MatchCMcolor", {color});
        EXPECT_NEAR(D(color, "rr"), r, 1.0) << r << " " << g << " " << b;
        EXPECT_NEAR(D(color, "rg"), g, 1.0) << r << " " << g << " " << b;
        EXPECT_NEAR(D(color, "rb"), b, 1.0) << r << " " << g << " " << b;
      }
}

TEST_F(ColorWorldTest, EachProfilesIntentReachesTheEngine) {
  Object srgb = Open("sRGB.icc");
  Object cmyk = Open("ghostscript/default_cmyk.icc");
  auto ink = [&](int srcIntent, int dstIntent) {
    rt->Set(srgb, "RenderIntent", srcIntent);
    rt->Set(cmyk, "RenderIntent", dstIntent);
    Object w = rt->New("ColorWorld", {srgb, cmyk});
    Object c = Rgb(20, 220, 60);
    rt->Call(w, "MatchCMcolor", {c});
    return std::vector<double>{D(c, "cc"), D(c, "cm"), D(c, "cy"), D(c, "ck")};
  };
  const int cases[][2] = {{INTENT_PERCEPTUAL, INTENT_SATURATION},
                          {INTENT_PERCEPTUAL, INTENT_ABSOLUTE_COLORIMETRIC},
                          {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC}};
  std::vector<std::vector<double>> results;
  for (const auto& c : cases) {
    const LcmsChain expected({"sRGB.icc", "ghostscript/default_cmyk.icc"}, TYPE_RGB_DBL, TYPE_CMYK_DBL,
                             {static_cast<cmsUInt32Number>(c[0]), static_cast<cmsUInt32Number>(c[1])});
    const auto want = expected.Run({20 / 255.0, 220 / 255.0, 60 / 255.0}, 4);
    const auto got = ink(c[0], c[1]);
    for (int k = 0; k < 4; ++k) EXPECT_NEAR(got[k], want[k] / 100.0, 1.0 / 65535 + 1e-9) << c[0] << "," << c[1];
    results.push_back(got);
  }
  EXPECT_NE(results[0], results[1]);  // the printer's intent alone changes the result
}

}  // namespace
