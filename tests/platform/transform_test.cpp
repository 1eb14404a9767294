// Conformance of CreateMultiProfileTransform, DeleteColorTransform and TranslateColors.
// Colours are compared with Little CMS called directly in double precision; each
// tolerance is stated where it is used.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <vector>

#include "transform_test_util.h"

namespace {

using namespace transform_test;

constexpr cmsUInt32Number kDevice3 = FLOAT_SH(1) | CHANNELS_SH(3) | BYTES_SH(0);
constexpr cmsUInt32Number kDevice4 = FLOAT_SH(1) | CHANNELS_SH(4) | BYTES_SH(0);

WORD Word(double v) { return static_cast<WORD>(std::lround(std::fmin(std::fmax(v, 0.0), 1.0) * 65535.0)); }

class TransformTest : public ::testing::Test {
 protected:
  Profile srgb_{"sRGB.icc"};
  Profile adobe_{"compatibleWithAdobeRGB1998.icc"};
  Profile cmyk_{"ghostscript/default_cmyk.icc"};
  Profile lab_{"LCMSLABI.ICM"};
  Profile xyz_{"LCMSXYZI.ICM"};
  Profile gray_{"Gray.icc"};
  Profile abstract_{"CineLogCurve.icc"};
  Profile named_{"colord/x11-colors.icc"};

  void SetUp() override {
    for (HPROFILE p : {srgb_.get(), adobe_.get(), cmyk_.get(), lab_.get(), xyz_.get(), gray_.get(),
                       abstract_.get(), named_.get()}) {
      ASSERT_NE(p, nullptr);
    }
  }
};

TEST_F(TransformTest, CreateRefusesBadArguments) {
  HPROFILE two[2] = {srgb_.get(), adobe_.get()};
  HPROFILE eleven[11];
  for (HPROFILE& p : eleven) p = srgb_.get();
  DWORD intents[11] = {};
  DWORD bad_intent[2] = {INTENT_PERCEPTUAL, 4};
  const struct {
    const char* what;
    PHPROFILE profiles;
    DWORD count;
    PDWORD intents;
    DWORD intent_count;
  } cases[] = {
      {"null profiles", nullptr, 2, intents, 1},
      {"no profiles", two, 0, intents, 1},
      {"eleven profiles", eleven, 11, intents, 11},
      {"null intents", two, 2, nullptr, 1},
      {"no intents", two, 2, intents, 0},
      {"three intents for two", two, 2, intents, 3},
      {"intent 4", two, 2, bad_intent, 2},
      {"huge count", two, 0xFFFFFFFF, intents, 1},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    SetLastError(kSentinel);
    EXPECT_EQ(CreateMultiProfileTransform(c.profiles, c.count, c.intents, c.intent_count, 0, 0), nullptr);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_PARAMETER);
  }
}

TEST_F(TransformTest, CreateRefusesHandlesThatAreNotOpenProfiles) {
  Xform other({srgb_.get(), adobe_.get()}, {INTENT_PERCEPTUAL});
  ASSERT_NE(other.get(), nullptr);
  HPROFILE closed;
  {
    Profile p("sRGB.icc");
    closed = p.get();
  }
  for (HPROFILE bad : {HPROFILE{nullptr}, reinterpret_cast<HPROFILE>(0x7777), closed, other.get()}) {
    HPROFILE chain[2] = {srgb_.get(), bad};
    DWORD intent = INTENT_PERCEPTUAL;
    SetLastError(kSentinel);
    EXPECT_EQ(CreateMultiProfileTransform(chain, 2, &intent, 1, 0, 0), nullptr);
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
}

TEST_F(TransformTest, CreateChecksThatTheChainLinks) {
  const struct {
    const char* what;
    std::vector<HPROFILE> profiles;
    DWORD error;
  } cases[] = {
      {"RGB output then RGB input after CMYK", {srgb_.get(), cmyk_.get(), adobe_.get()}, ERROR_COLORSPACE_MISMATCH},
      {"named colours not first", {srgb_.get(), named_.get()}, ERROR_COLORSPACE_MISMATCH},
      {"single device profile", {srgb_.get()}, ERROR_INVALID_PARAMETER},
      {"single abstract profile", {abstract_.get()}, ERROR_INVALID_PARAMETER},
      {"single named profile", {named_.get()}, ERROR_INVALID_PARAMETER},
      {"gray output then RGB input", {srgb_.get(), gray_.get(), adobe_.get()}, ERROR_COLORSPACE_MISMATCH},
      {"proof chain", {srgb_.get(), cmyk_.get(), cmyk_.get(), adobe_.get()}, ERROR_SUCCESS},
      {"abstract in the middle", {srgb_.get(), abstract_.get(), adobe_.get()}, ERROR_SUCCESS},
      {"named first", {named_.get(), srgb_.get()}, ERROR_SUCCESS},
      {"ten profiles", {srgb_.get(), adobe_.get(), srgb_.get(), adobe_.get(), srgb_.get(), adobe_.get(),
                        srgb_.get(), adobe_.get(), srgb_.get(), adobe_.get()}, ERROR_SUCCESS},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    std::vector<DWORD> intents(c.profiles.size(), INTENT_RELATIVE_COLORIMETRIC);
    SetLastError(kSentinel);
    Xform x(c.profiles, intents);
    EXPECT_EQ(x.get() != nullptr, c.error == ERROR_SUCCESS);
    EXPECT_EQ(GetLastError(), c.error);
  }
}

TEST_F(TransformTest, DeleteRefusesEverythingButALiveTransform) {
  DWORD intent = INTENT_PERCEPTUAL;
  HPROFILE chain[2] = {srgb_.get(), adobe_.get()};
  HTRANSFORM x = CreateMultiProfileTransform(chain, 2, &intent, 1, 0, 0);
  ASSERT_NE(x, nullptr);
  SetLastError(kSentinel);
  EXPECT_TRUE(DeleteColorTransform(x));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  for (HTRANSFORM bad : {x, HTRANSFORM{nullptr}, HTRANSFORM{srgb_.get()}}) {
    SetLastError(kSentinel);
    EXPECT_FALSE(DeleteColorTransform(bad));
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  // The profile survived the attempt and the transform no longer needs the profiles.
  Xform again({srgb_.get(), adobe_.get()}, {INTENT_PERCEPTUAL});
  EXPECT_NE(again.get(), nullptr);
}

TEST_F(TransformTest, TransformOutlivesItsProfiles) {
  Profile a("sRGB.icc"), b("LCMSLABI.ICM");
  DWORD intents[2] = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  HPROFILE chain[2] = {a.get(), b.get()};
  HTRANSFORM kept = CreateMultiProfileTransform(chain, 2, intents, 2, 0, 0);
  ASSERT_NE(kept, nullptr);
  CloseColorProfile(a.get());
  CloseColorProfile(b.get());
  COLOR c{};
  c.rgb = {0xFFFF, 0xFFFF, 0xFFFF};
  EXPECT_TRUE(TranslateColors(kept, &c, 1, COLOR_RGB, &c, COLOR_Lab));
  EXPECT_EQ(c.Lab.L, 0xFF00);
  EXPECT_TRUE(DeleteColorTransform(kept));
}

TEST_F(TransformTest, TranslateRefusesBadArguments) {
  Xform x({srgb_.get(), adobe_.get()}, {INTENT_PERCEPTUAL});
  ASSERT_NE(x.get(), nullptr);
  HTRANSFORM deleted;
  {
    Xform gone({srgb_.get(), adobe_.get()}, {INTENT_PERCEPTUAL});
    deleted = gone.get();
  }
  COLOR in[2] = {}, out[2] = {};
  for (HTRANSFORM bad : {HTRANSFORM{nullptr}, deleted, HTRANSFORM{srgb_.get()}}) {
    SetLastError(kSentinel);
    EXPECT_FALSE(TranslateColors(bad, in, 1, COLOR_RGB, out, COLOR_RGB));
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  const struct {
    const char* what;
    PCOLOR in;
    DWORD count;
    COLORTYPE in_type;
    PCOLOR out;
    COLORTYPE out_type;
    BOOL result;
    DWORD error;
  } cases[] = {
      {"no colours, no arrays", nullptr, 0, COLOR_RGB, nullptr, COLOR_RGB, TRUE, ERROR_SUCCESS},
      {"null input", nullptr, 1, COLOR_RGB, out, COLOR_RGB, FALSE, ERROR_INVALID_PARAMETER},
      {"null output", in, 1, COLOR_RGB, nullptr, COLOR_RGB, FALSE, ERROR_INVALID_PARAMETER},
      {"type 0", in, 1, static_cast<COLORTYPE>(0), out, COLOR_RGB, FALSE, ERROR_INVALID_PARAMETER},
      {"type 13", in, 1, COLOR_RGB, out, static_cast<COLORTYPE>(13), FALSE, ERROR_INVALID_PARAMETER},
      {"CMYK into RGB", in, 1, COLOR_CMYK, out, COLOR_RGB, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"Lab into RGB", in, 1, COLOR_Lab, out, COLOR_RGB, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"gray out of RGB", in, 1, COLOR_RGB, out, COLOR_GRAY, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"named out", in, 1, COLOR_RGB, out, COLOR_NAMED, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"named in", in, 1, COLOR_NAMED, out, COLOR_RGB, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"5 channels in", in, 1, COLOR_5_CHANNEL, out, COLOR_RGB, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"3 channels both ways", in, 2, COLOR_3_CHANNEL, out, COLOR_3_CHANNEL, TRUE, ERROR_SUCCESS},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    SetLastError(kSentinel);
    EXPECT_EQ(TranslateColors(x.get(), c.in, c.count, c.in_type, c.out, c.out_type), c.result);
    EXPECT_EQ(GetLastError(), c.error);
  }
}

TEST_F(TransformTest, IdentityKeepsRgbWords) {
  Xform x({srgb_.get(), srgb_.get()}, {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC});
  ASSERT_NE(x.get(), nullptr);
  const WORD words[] = {0x0000, 0x0101, 0x8000, 0xC0DE, 0xFFFF};
  for (WORD w : words) {
    COLOR c{};
    c.rgb = {w, 0xFFFF, 0x8000};
    // In place. Double precision round trip: at most one word off.
    SetLastError(kSentinel);
    ASSERT_TRUE(TranslateColors(x.get(), &c, 1, COLOR_RGB, &c, COLOR_RGB));
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    EXPECT_NEAR(c.rgb.red, w, 1);
    EXPECT_NEAR(c.rgb.green, 0xFFFF, 1);
    EXPECT_NEAR(c.rgb.blue, 0x8000, 1);
  }
}

TEST_F(TransformTest, WhiteReachesThePcsEncodings) {
  const std::vector<DWORD> rel = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  Xform to_lab({srgb_.get(), lab_.get()}, rel);
  Xform to_xyz({srgb_.get(), xyz_.get()}, rel);
  ASSERT_NE(to_lab.get(), nullptr);
  ASSERT_NE(to_xyz.get(), nullptr);
  COLOR white{};
  white.rgb = {0xFFFF, 0xFFFF, 0xFFFF};
  COLOR out[4] = {};
  ASSERT_TRUE(TranslateColors(to_lab.get(), &white, 1, COLOR_RGB, &out[0], COLOR_Lab));
  EXPECT_EQ(out[0].Lab.L, 0xFF00);
  EXPECT_NEAR(out[0].Lab.a, 0x8000, 2);
  EXPECT_NEAR(out[0].Lab.b, 0x8000, 2);
  // The D50 white: X 0.9642, Y 1, Z 0.8249, within 2 words of rounding.
  ASSERT_TRUE(TranslateColors(to_xyz.get(), &white, 1, COLOR_RGB, &out[1], COLOR_XYZ));
  EXPECT_NEAR(out[1].XYZ.X, 63189, 3);
  EXPECT_NEAR(out[1].XYZ.Y, 65535, 2);
  EXPECT_NEAR(out[1].XYZ.Z, 54060, 3);
  // The same white read as Yxy at either PCS end: Y 1 and the D50 chromaticity.
  ASSERT_TRUE(TranslateColors(to_lab.get(), &white, 1, COLOR_RGB, &out[2], COLOR_Yxy));
  ASSERT_TRUE(TranslateColors(to_xyz.get(), &white, 1, COLOR_RGB, &out[3], COLOR_Yxy));
  for (const COLOR& c : {out[2], out[3]}) {
    EXPECT_NEAR(c.Yxy.Y, 65535, 2);
    EXPECT_NEAR(c.Yxy.x, 22655, 10);  // 0.3457
    EXPECT_NEAR(c.Yxy.y, 23494, 10);  // 0.3585
  }
}

TEST_F(TransformTest, EveryColourTypeMatchesLittleCms) {
  const std::vector<DWORD> rel = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  const std::vector<cmsUInt32Number> lrel = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  const double rgb[3] = {0.8, 0.3, 0.1};
  COLOR in{};
  in.rgb = {Word(rgb[0]), Word(rgb[1]), Word(rgb[2])};
  const double exact_rgb[3] = {in.rgb.red / 65535.0, in.rgb.green / 65535.0, in.rgb.blue / 65535.0};

  // RGB -> Lab and -> XYZ; Lab and XYZ -> RGB; Lab -> CMYK; CMYK -> RGB; gray -> RGB.
  {
    Xform x({srgb_.get(), lab_.get()}, rel);
    LcmsChain l({"sRGB.icc", "LCMSLABI.ICM"}, lrel, TYPE_RGB_DBL, TYPE_Lab_DBL);
    cmsCIELab lab;
    cmsDoTransform(l.get(), exact_rgb, &lab, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(x.get(), &in, 1, COLOR_RGB, &out, COLOR_Lab));
    // One word is 1/652.8 of L* and 1/256 of a*, b*.
    EXPECT_NEAR(out.Lab.L / 652.8, lab.L, 1.0 / 652.8);
    EXPECT_NEAR(out.Lab.a / 256.0 - 128.0, lab.a, 1.0 / 256);
    EXPECT_NEAR(out.Lab.b / 256.0 - 128.0, lab.b, 1.0 / 256);
  }
  {
    Xform x({lab_.get(), adobe_.get()}, rel);
    LcmsChain l({"LCMSLABI.ICM", "compatibleWithAdobeRGB1998.icc"}, lrel, TYPE_Lab_DBL, TYPE_RGB_DBL);
    COLOR lab_words{};
    lab_words.Lab = {0x6A00, 0x9A40, 0x6C80};  // L 41.6, a 26.25, b -19.5
    const cmsCIELab lab{0x6A00 * 100.0 / 65280.0, 0x9A40 / 256.0 - 128.0, 0x6C80 / 256.0 - 128.0};
    double expect[3];
    cmsDoTransform(l.get(), &lab, expect, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(x.get(), &lab_words, 1, COLOR_Lab, &out, COLOR_RGB));
    EXPECT_NEAR(out.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(out.rgb.green, Word(expect[1]), 1);
    EXPECT_NEAR(out.rgb.blue, Word(expect[2]), 1);
  }
  {
    Xform x({xyz_.get(), srgb_.get()}, rel);
    LcmsChain l({"LCMSXYZI.ICM", "sRGB.icc"}, lrel, TYPE_XYZ_DBL, TYPE_RGB_DBL);
    COLOR xyz_words{};
    xyz_words.XYZ = {0x4000, 0x3000, 0x2000};
    const cmsCIEXYZ xyz{0x4000 / 65535.0, 0x3000 / 65535.0, 0x2000 / 65535.0};
    double expect[3];
    cmsDoTransform(l.get(), &xyz, expect, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(x.get(), &xyz_words, 1, COLOR_XYZ, &out, COLOR_RGB));
    EXPECT_NEAR(out.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(out.rgb.green, Word(expect[1]), 1);
    EXPECT_NEAR(out.rgb.blue, Word(expect[2]), 1);
  }
  {
    // CMYK both ways. Little CMS's own CMYK double format counts ink in percent.
    Xform to_cmyk({srgb_.get(), cmyk_.get()}, rel);
    Xform from_cmyk({cmyk_.get(), srgb_.get()}, rel);
    LcmsChain l_to({"sRGB.icc", "ghostscript/default_cmyk.icc"}, lrel, TYPE_RGB_DBL, TYPE_CMYK_DBL);
    LcmsChain l_from({"ghostscript/default_cmyk.icc", "sRGB.icc"}, lrel, TYPE_CMYK_DBL, TYPE_RGB_DBL);
    double ink[4];
    cmsDoTransform(l_to.get(), exact_rgb, ink, 1);
    COLOR cmyk{};
    ASSERT_TRUE(TranslateColors(to_cmyk.get(), &in, 1, COLOR_RGB, &cmyk, COLOR_CMYK));
    EXPECT_NEAR(cmyk.cmyk.cyan, Word(ink[0] / 100), 1);
    EXPECT_NEAR(cmyk.cmyk.magenta, Word(ink[1] / 100), 1);
    EXPECT_NEAR(cmyk.cmyk.yellow, Word(ink[2] / 100), 1);
    EXPECT_NEAR(cmyk.cmyk.black, Word(ink[3] / 100), 1);

    COLOR given{};
    given.cmyk = {0x2000, 0x8000, 0xC000, 0x1000};
    const double percent[4] = {0x2000 / 655.35, 0x8000 / 655.35, 0xC000 / 655.35, 0x1000 / 655.35};
    double expect[3];
    cmsDoTransform(l_from.get(), percent, expect, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(from_cmyk.get(), &given, 1, COLOR_CMYK, &out, COLOR_RGB));
    EXPECT_NEAR(out.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(out.rgb.green, Word(expect[1]), 1);
    EXPECT_NEAR(out.rgb.blue, Word(expect[2]), 1);
  }
  {
    Xform x({gray_.get(), srgb_.get()}, rel);
    LcmsChain l({"Gray.icc", "sRGB.icc"}, lrel, TYPE_GRAY_DBL, TYPE_RGB_DBL);
    COLOR g{};
    g.gray.gray = 0x5555;
    const double v = 0x5555 / 65535.0;
    double expect[3];
    cmsDoTransform(l.get(), &v, expect, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(x.get(), &g, 1, COLOR_GRAY, &out, COLOR_RGB));
    EXPECT_NEAR(out.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(out.rgb.blue, Word(expect[2]), 1);
    // And back to one gray word.
    Xform back({srgb_.get(), gray_.get()}, rel);
    COLOR back_gray{};
    ASSERT_TRUE(TranslateColors(back.get(), &out, 1, COLOR_RGB, &back_gray, COLOR_GRAY));
    EXPECT_NEAR(back_gray.gray.gray, 0x5555, 8);
  }
  {
    // Three generic channels through an RGB chain give what RGB gives.
    Xform x({srgb_.get(), adobe_.get()}, rel);
    COLOR as_rgb{}, as_gen{}, gen_in{};
    gen_in.gen3ch = {in.rgb.red, in.rgb.green, in.rgb.blue};
    ASSERT_TRUE(TranslateColors(x.get(), &in, 1, COLOR_RGB, &as_rgb, COLOR_RGB));
    ASSERT_TRUE(TranslateColors(x.get(), &gen_in, 1, COLOR_3_CHANNEL, &as_gen, COLOR_3_CHANNEL));
    EXPECT_EQ(as_gen.gen3ch.ch1, as_rgb.rgb.red);
    EXPECT_EQ(as_gen.gen3ch.ch2, as_rgb.rgb.green);
    EXPECT_EQ(as_gen.gen3ch.ch3, as_rgb.rgb.blue);
  }
}

TEST_F(TransformTest, HiFiChannelsThroughADeviceLink) {
  // A five-channel link squaring each channel, made by Little CMS.
  cmsToneCurve* square = cmsBuildGamma(nullptr, 2.0);
  cmsToneCurve* curves[5] = {square, square, square, square, square};
  cmsHPROFILE link = cmsCreateLinearizationDeviceLink(cmsSigMCH5Data, curves);
  cmsFreeToneCurve(square);
  ASSERT_NE(link, nullptr);
  Profile p(SaveToMemory(link));
  cmsCloseProfile(link);
  ASSERT_NE(p.get(), nullptr);
  Xform x({p.get()}, {INTENT_PERCEPTUAL});
  ASSERT_NE(x.get(), nullptr);
  COLOR colors[2] = {};
  const BYTE bytes[5] = {0, 64, 128, 200, 255};
  for (int i = 0; i < 5; ++i) colors[0].hifi.channel[i] = colors[1].hifi.channel[i] = bytes[i];
  SetLastError(kSentinel);
  ASSERT_TRUE(TranslateColors(x.get(), colors, 2, COLOR_5_CHANNEL, colors, COLOR_5_CHANNEL));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  for (const COLOR& c : colors) {
    for (int i = 0; i < 5; ++i) {
      const double v = bytes[i] / 255.0;
      EXPECT_NEAR(c.hifi.channel[i], v * v * 255.0, 0.51) << i;
    }
  }
  COLOR out{};
  SetLastError(kSentinel);
  EXPECT_FALSE(TranslateColors(x.get(), colors, 1, COLOR_6_CHANNEL, &out, COLOR_5_CHANNEL));
  EXPECT_EQ(GetLastError(), ERROR_COLORSPACE_MISMATCH);
}

TEST_F(TransformTest, NamedColoursCountFromOne) {
  Xform x({named_.get(), srgb_.get()}, {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC});
  ASSERT_NE(x.get(), nullptr);
  cmsHPROFILE named = cmsOpenProfileFromFile(IccPath("colord/x11-colors.icc").c_str(), "r");
  cmsHPROFILE srgb = cmsOpenProfileFromFile(IccPath("sRGB.icc").c_str(), "r");
  const cmsUInt32Number count =
      cmsNamedColorCount(static_cast<cmsNAMEDCOLORLIST*>(cmsReadTag(named, cmsSigNamedColor2Tag)));
  ASSERT_GT(count, 2u);
  cmsHTRANSFORM l = cmsCreateTransform(named, TYPE_NAMED_COLOR_INDEX, srgb, TYPE_RGB_DBL,
                                       INTENT_RELATIVE_COLORIMETRIC, 0);
  ASSERT_NE(l, nullptr);
  for (DWORD index : {DWORD{1}, DWORD{2}, count}) {
    SCOPED_TRACE(index);
    const cmsUInt16Number zero_based = static_cast<cmsUInt16Number>(index - 1);
    double expect[3];
    cmsDoTransform(l, &zero_based, expect, 1);
    COLOR c{};
    c.named.dwIndex = index;
    SetLastError(kSentinel);
    ASSERT_TRUE(TranslateColors(x.get(), &c, 1, COLOR_NAMED, &c, COLOR_RGB));
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    EXPECT_NEAR(c.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(c.rgb.green, Word(expect[1]), 1);
    EXPECT_NEAR(c.rgb.blue, Word(expect[2]), 1);
  }
  cmsDeleteTransform(l);
  cmsCloseProfile(named);
  cmsCloseProfile(srgb);

  // Out of range: nothing is written, not even the valid colour before it.
  COLOR pair[2] = {};
  pair[0].named.dwIndex = 1;
  for (DWORD bad : {DWORD{0}, count + 1}) {
    pair[1].named.dwIndex = bad;
    COLOR out[2] = {};
    out[0].rgb = {1, 2, 3};
    SetLastError(kSentinel);
    EXPECT_FALSE(TranslateColors(x.get(), pair, 2, COLOR_NAMED, out, COLOR_RGB));
    EXPECT_EQ(GetLastError(), ERROR_INVALID_COLORINDEX);
    EXPECT_EQ(out[0].rgb.red, 1);
  }
  // Other types do not enter a named chain.
  COLOR rgb{};
  SetLastError(kSentinel);
  EXPECT_FALSE(TranslateColors(x.get(), &rgb, 1, COLOR_RGB, &rgb, COLOR_RGB));
  EXPECT_EQ(GetLastError(), ERROR_COLORSPACE_MISMATCH);
}

TEST_F(TransformTest, IntentsApplyPerProfile) {
  // A proof chain, one intent per step, against Little CMS given the same intents.
  const std::vector<std::string> names = {"sRGB.icc", "ghostscript/default_cmyk.icc",
                                          "ghostscript/default_cmyk.icc", "compatibleWithAdobeRGB1998.icc"};
  const std::vector<HPROFILE> chain = {srgb_.get(), cmyk_.get(), cmyk_.get(), adobe_.get()};
  const double rgb[3] = {0.2, 0.6, 0.9};
  COLOR in{};
  in.rgb = {Word(rgb[0]), Word(rgb[1]), Word(rgb[2])};
  const double exact[3] = {in.rgb.red / 65535.0, in.rgb.green / 65535.0, in.rgb.blue / 65535.0};
  const std::vector<DWORD> mixes[] = {{0, 2, 1, 3}, {0, 0, 0, 0}, {1, 1, 1, 1}};
  std::vector<COLOR> results;
  for (const auto& mix : mixes) {
    Xform x(chain, mix);
    ASSERT_NE(x.get(), nullptr);
    LcmsChain l(names, {mix[0], mix[1], mix[2], mix[3]}, TYPE_RGB_DBL, TYPE_RGB_DBL);
    double expect[3];
    cmsDoTransform(l.get(), exact, expect, 1);
    COLOR out{};
    ASSERT_TRUE(TranslateColors(x.get(), &in, 1, COLOR_RGB, &out, COLOR_RGB));
    EXPECT_NEAR(out.rgb.red, Word(expect[0]), 1);
    EXPECT_NEAR(out.rgb.green, Word(expect[1]), 1);
    EXPECT_NEAR(out.rgb.blue, Word(expect[2]), 1);
    results.push_back(out);
  }
  // The intents matter for this chain, so the comparison above has teeth.
  EXPECT_GT(std::abs(results[0].rgb.red - results[1].rgb.red) + std::abs(results[0].rgb.blue - results[1].rgb.blue),
            64);

  // One intent: the first profile gets it, every later one absolute colorimetric.
  Xform one({srgb_.get(), cmyk_.get()}, {INTENT_PERCEPTUAL});
  LcmsChain l({"sRGB.icc", "ghostscript/default_cmyk.icc"},
              {INTENT_PERCEPTUAL, INTENT_ABSOLUTE_COLORIMETRIC}, TYPE_RGB_DBL, kDevice4);
  double ink[4];
  cmsDoTransform(l.get(), exact, ink, 1);
  COLOR out{};
  ASSERT_TRUE(TranslateColors(one.get(), &in, 1, COLOR_RGB, &out, COLOR_CMYK));
  EXPECT_NEAR(out.cmyk.cyan, Word(ink[0]), 1);
  EXPECT_NEAR(out.cmyk.magenta, Word(ink[1]), 1);
  EXPECT_NEAR(out.cmyk.yellow, Word(ink[2]), 1);
  EXPECT_NEAR(out.cmyk.black, Word(ink[3]), 1);
}

TEST_F(TransformTest, AbstractProfileInTheMiddle) {
  Xform x({srgb_.get(), abstract_.get(), adobe_.get()}, {1, 1, 1});
  ASSERT_NE(x.get(), nullptr);
  LcmsChain l({"sRGB.icc", "CineLogCurve.icc", "compatibleWithAdobeRGB1998.icc"}, {1, 1, 1}, kDevice3, kDevice3);
  std::vector<COLOR> colors(300);
  std::vector<double> exact(colors.size() * 3), expect(colors.size() * 3);
  std::srand(7);
  for (size_t i = 0; i < colors.size(); ++i) {
    colors[i].rgb = {static_cast<WORD>(std::rand()), static_cast<WORD>(std::rand()), static_cast<WORD>(std::rand())};
    exact[i * 3] = colors[i].rgb.red / 65535.0;
    exact[i * 3 + 1] = colors[i].rgb.green / 65535.0;
    exact[i * 3 + 2] = colors[i].rgb.blue / 65535.0;
  }
  cmsDoTransform(l.get(), exact.data(), expect.data(), static_cast<cmsUInt32Number>(colors.size()));
  // More colours than one internal block, in place.
  ASSERT_TRUE(TranslateColors(x.get(), colors.data(), static_cast<DWORD>(colors.size()), COLOR_RGB, colors.data(),
                              COLOR_RGB));
  for (size_t i = 0; i < colors.size(); ++i) {
    ASSERT_NEAR(colors[i].rgb.red, Word(expect[i * 3]), 1) << i;
    ASSERT_NEAR(colors[i].rgb.green, Word(expect[i * 3 + 1]), 1) << i;
    ASSERT_NEAR(colors[i].rgb.blue, Word(expect[i * 3 + 2]), 1) << i;
  }
}

}  // namespace
