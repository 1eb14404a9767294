// CreateMultiProfileTransform, DeleteColorTransform, TranslateColors and CreateDeviceLinkProfile,
// against Little CMS called directly in double precision.
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <random>
#include <vector>

#include "transform_test_util.h"

namespace {

using namespace transform_test;

using TransformTest = ChainTest;

TEST_F(TransformTest, CreateRefusesBadArgumentsAndHandles) {
  HPROFILE two[2] = {srgb_.get(), adobe_.get()};
  HPROFILE eleven[11] = {};
  DWORD intents[11] = {}, bad_intent[2] = {0, 4};
  Xform other({srgb_.get(), adobe_.get()}, {kRel});
  HPROFILE closed;
  {
    Profile p("sRGB.icc");
    closed = p.get();
  }
  HPROFILE with_closed[2] = {srgb_.get(), closed}, with_transform[2] = {srgb_.get(), other.get()};
  HPROFILE with_null[2] = {nullptr, srgb_.get()};
  const std::tuple<PHPROFILE, DWORD, PDWORD, DWORD, DWORD> cases[] = {  // profiles, count, intents, count, error
      {nullptr, 2, intents, 1, ERROR_INVALID_PARAMETER},      {two, 0, intents, 1, ERROR_INVALID_PARAMETER},
      {eleven, 11, intents, 11, ERROR_INVALID_PARAMETER},     {two, 0xFFFFFFFF, intents, 1, ERROR_INVALID_PARAMETER},
      {two, 2, nullptr, 1, ERROR_INVALID_PARAMETER},          {two, 2, intents, 0, ERROR_INVALID_PARAMETER},
      {two, 2, intents, 3, ERROR_INVALID_PARAMETER},          {two, 2, bad_intent, 2, ERROR_INVALID_PARAMETER},
      {with_closed, 2, intents, 1, ERROR_INVALID_HANDLE},     {with_transform, 2, intents, 1, ERROR_INVALID_HANDLE},
      {with_null, 2, intents, 1, ERROR_INVALID_HANDLE},
  };
  for (const auto& [profiles, count, ints, int_count, error] : cases)
    EXPECT_WIN32(CreateMultiProfileTransform(profiles, count, ints, int_count, 0, 0), nullptr, error);
}

TEST_F(TransformTest, CreateChecksThatTheChainLinks) {
  const HPROFILE s = srgb_.get(), a = adobe_.get(), c = cmyk_.get();
  const std::tuple<const char*, std::vector<HPROFILE>, DWORD> cases[] = {
      {"RGB input after CMYK output", {s, c, a}, ERROR_COLORSPACE_MISMATCH},
      {"RGB input after gray output", {s, gray_.get(), a}, ERROR_COLORSPACE_MISMATCH},
      {"named colours not first", {s, named_.get()}, ERROR_COLORSPACE_MISMATCH},
      {"single device profile", {s}, ERROR_INVALID_PARAMETER},
      {"single abstract profile", {abstract_.get()}, ERROR_INVALID_PARAMETER},
      {"single named profile", {named_.get()}, ERROR_INVALID_PARAMETER},
      {"proof chain", {s, c, c, a}, ERROR_SUCCESS},
      {"named first", {named_.get(), s}, ERROR_SUCCESS},
      {"ten profiles", {s, a, s, a, s, a, s, a, s, a}, ERROR_SUCCESS},
  };
  for (const auto& [what, profiles, error] : cases) {
    SCOPED_TRACE(what);
    SetLastError(kSentinel);
    Xform x(profiles, std::vector<DWORD>(profiles.size(), kRel));
    EXPECT_EQ(x.get() != nullptr, error == ERROR_SUCCESS);
    EXPECT_EQ(GetLastError(), error);
  }
}

// Class, data space and connection space must be signatures the engine knows before
// the chain uses them; values with the top bit set are outside its enumerations.
TEST_F(TransformTest, CreateRefusesUnknownHeaderSignatures) {
  using icctest::Sig;
  const std::pair<size_t, std::uint32_t> cases[] = {  // where, what; the last two are known and pass
      {12, 0x80000000u | Sig("mntr")}, {16, 0x80000000u | Sig("RGB ")}, {20, 0x80000000u | Sig("XYZ ")},
      {16, 0xFFFFFFFFu}, {12, Sig("ABCD")}, {16, Sig("ABCD")}, {20, Sig("ABCD")}, {12, Sig("scnr")}, {16, Sig("RGB ")},
  };
  for (const auto& [at, value] : cases) {
    const DWORD error = value == Sig("scnr") || value == Sig("RGB ") ? ERROR_SUCCESS : ERROR_INVALID_PROFILE;
    icctest::Bytes bytes = icctest::ReadBytes(IccPath("sRGB.icc"));
    icctest::PutBE32(bytes, at, value);
    Profile odd(bytes);
    ASSERT_NE(odd.get(), nullptr);
    for (bool first : {true, false}) {
      SCOPED_TRACE(testing::Message() << at << " " << std::hex << value << (first ? " first" : " second"));
      HPROFILE pair[2] = {first ? odd.get() : adobe_.get(), first ? adobe_.get() : odd.get()};
      SetLastError(kSentinel);
      Xform x({pair[0], pair[1]}, {kRel, kRel});
      EXPECT_EQ(x.get() != nullptr, error == ERROR_SUCCESS);
      EXPECT_EQ(GetLastError(), error);
      BYTE* link = nullptr;
      DWORD intents[2] = {kRel, kRel};
      EXPECT_WIN32(CreateDeviceLinkProfile(pair, 2, intents, 2, 0, &link, 0), error == ERROR_SUCCESS, error);
      GlobalFree(link);
    }
  }
}

// Every call taking a transform refuses null, deleted and profile handles.
TEST_F(TransformTest, CallsRefuseHandlesThatAreNotLiveTransforms) {
  HTRANSFORM x;
  {
    Profile a("sRGB.icc"), b("LCMSLABI.ICM");
    HPROFILE chain[2] = {a.get(), b.get()};
    DWORD intents[2] = {kRel, kRel};
    x = CreateMultiProfileTransform(chain, 2, intents, 2, 0, 0);
  }
  COLOR c{};
  c.rgb = {0xFFFF, 0xFFFF, 0xFFFF};
  EXPECT_TRUE(TranslateColors(x, &c, 1, COLOR_RGB, &c, COLOR_Lab));  // outlives its profiles
  EXPECT_EQ(c.Lab.L, 0xFF00);
  EXPECT_WIN32(DeleteColorTransform(x), TRUE, ERROR_SUCCESS);
  BYTE bits[64] = {}, result[2];
  for (HTRANSFORM bad : {x, HTRANSFORM{nullptr}, HTRANSFORM{srgb_.get()}}) {
    EXPECT_WIN32(TranslateColors(bad, &c, 1, COLOR_RGB, &c, COLOR_RGB), FALSE, ERROR_INVALID_HANDLE);
    EXPECT_WIN32(CheckColors(bad, &c, 1, COLOR_RGB, result), FALSE, ERROR_INVALID_HANDLE);
    EXPECT_WIN32(TranslateBitmapBits(bad, bits, BM_RGBTRIPLETS, 1, 1, 0, bits, BM_RGBTRIPLETS, 0, nullptr, 0), FALSE,
                 ERROR_INVALID_HANDLE);
    EXPECT_WIN32(DeleteColorTransform(bad), FALSE, ERROR_INVALID_HANDLE);
  }
  Xform again({srgb_.get(), adobe_.get()}, {kRel});  // the profile survived being offered
  EXPECT_NE(again.get(), nullptr);
}

TEST_F(TransformTest, TranslateRefusesBadArguments) {
  Xform x({srgb_.get(), adobe_.get()}, {kRel});
  COLOR in[2] = {}, out[2] = {};
  const std::tuple<PCOLOR, DWORD, COLORTYPE, PCOLOR, COLORTYPE, DWORD> cases[] = {
      {nullptr, 0, COLOR_RGB, nullptr, COLOR_RGB, ERROR_SUCCESS},  // nothing to do
      {nullptr, 1, COLOR_RGB, out, COLOR_RGB, ERROR_INVALID_PARAMETER},
      {in, 1, COLOR_RGB, nullptr, COLOR_RGB, ERROR_INVALID_PARAMETER},
      {in, 1, static_cast<COLORTYPE>(0), out, COLOR_RGB, ERROR_INVALID_PARAMETER},
      {in, 1, COLOR_RGB, out, static_cast<COLORTYPE>(13), ERROR_INVALID_PARAMETER},
      {in, 1, COLOR_CMYK, out, COLOR_RGB, ERROR_COLORSPACE_MISMATCH},
      {in, 1, COLOR_Lab, out, COLOR_RGB, ERROR_COLORSPACE_MISMATCH},
      {in, 1, COLOR_RGB, out, COLOR_GRAY, ERROR_COLORSPACE_MISMATCH},
      {in, 1, COLOR_RGB, out, COLOR_NAMED, ERROR_COLORSPACE_MISMATCH},
      {in, 1, COLOR_NAMED, out, COLOR_RGB, ERROR_COLORSPACE_MISMATCH},
      {in, 1, COLOR_5_CHANNEL, out, COLOR_RGB, ERROR_COLORSPACE_MISMATCH},
      {in, 2, COLOR_3_CHANNEL, out, COLOR_3_CHANNEL, ERROR_SUCCESS},
  };
  for (const auto& [in, count, in_type, out, out_type, error] : cases)
    EXPECT_WIN32(TranslateColors(x.get(), in, count, in_type, out, out_type), error == ERROR_SUCCESS, error);
}

TEST_F(TransformTest, WhiteInEachConnectionSpaceEncoding) {
  Xform to_lab({srgb_.get(), lab_.get()}, {kRel, kRel});
  Xform to_xyz({srgb_.get(), xyz_.get()}, {kRel, kRel});
  COLOR white{}, lab{}, xyz{}, yxy[2]{};
  white.rgb = {0xFFFF, 0xFFFF, 0xFFFF};
  ASSERT_TRUE(TranslateColors(to_lab.get(), &white, 1, COLOR_RGB, &lab, COLOR_Lab));
  EXPECT_EQ(lab.Lab.L, 0xFF00);
  EXPECT_NEAR(lab.Lab.a, 0x8000, 2);
  EXPECT_NEAR(lab.Lab.b, 0x8000, 2);
  // D50 white X 0.9642, Y 1, Z 0.8249 as 0..0xFFFF words, within rounding.
  ASSERT_TRUE(TranslateColors(to_xyz.get(), &white, 1, COLOR_RGB, &xyz, COLOR_XYZ));
  EXPECT_NEAR(xyz.XYZ.X, 63189, 3);
  EXPECT_NEAR(xyz.XYZ.Y, 65535, 2);
  EXPECT_NEAR(xyz.XYZ.Z, 54060, 3);
  // Yxy at either PCS end: Y 1 and the D50 chromaticity 0.3457, 0.3585.
  ASSERT_TRUE(TranslateColors(to_lab.get(), &white, 1, COLOR_RGB, &yxy[0], COLOR_Yxy));
  ASSERT_TRUE(TranslateColors(to_xyz.get(), &white, 1, COLOR_RGB, &yxy[1], COLOR_Yxy));
  for (const COLOR& c : yxy) {
    EXPECT_NEAR(c.Yxy.Y, 65535, 2);
    EXPECT_NEAR(c.Yxy.x, 22655, 10);
    EXPECT_NEAR(c.Yxy.y, 23494, 10);
  }
}

TEST_F(TransformTest, EveryColourTypeMatchesLittleCms) {
  const std::string srgb = "sRGB.icc", adobe = "compatibleWithAdobeRGB1998.icc", cmyk = "ghostscript/default_cmyk.icc";
  // Words in, the same values as Little CMS reads them, and how its output maps to words
  // (its CMYK double format counts ink in percent).
  const struct {
    std::vector<std::string> names;
    COLORTYPE in_type, out_type;
    std::vector<WORD> words;
    std::vector<double> values;
    cmsUInt32Number lcms_in, lcms_out;
    double out_scale;
  } cases[] = {
      {{srgb, adobe}, COLOR_RGB, COLOR_RGB, {0xCCCC, 0x4CCC, 0x1999}, {0.8, 0.3, 0.1}, TYPE_RGB_DBL, TYPE_RGB_DBL, 1},
      {{srgb, adobe}, COLOR_3_CHANNEL, COLOR_3_CHANNEL, {0xCCCC, 0x4CCC, 0x1999}, {0.8, 0.3, 0.1}, TYPE_RGB_DBL,
       TYPE_RGB_DBL, 1},
      {{srgb, cmyk}, COLOR_RGB, COLOR_CMYK, {0xCCCC, 0x4CCC, 0x1999}, {0.8, 0.3, 0.1}, TYPE_RGB_DBL, TYPE_CMYK_DBL, 100},
      {{cmyk, srgb}, COLOR_CMYK, COLOR_RGB, {0x3333, 0x8000, 0xCCCC, 0x1999}, {20, 32768 / 655.35, 80, 10},
       TYPE_CMYK_DBL, TYPE_RGB_DBL, 1},
      {{"Gray.icc", srgb}, COLOR_GRAY, COLOR_RGB, {0x5555}, {1.0 / 3}, TYPE_GRAY_DBL, TYPE_RGB_DBL, 1},
      {{"LCMSLABI.ICM", adobe}, COLOR_Lab, COLOR_RGB, {0x6A00, 0x9A40, 0x6C80}, {0x6A00 / 652.8, 26.25, -19.5},
       TYPE_Lab_DBL, TYPE_RGB_DBL, 1},
      {{"LCMSXYZI.ICM", srgb}, COLOR_XYZ, COLOR_RGB, {0x4000, 0x3000, 0x2000},
       {0x4000 / 65535.0, 0x3000 / 65535.0, 0x2000 / 65535.0}, TYPE_XYZ_DBL, TYPE_RGB_DBL, 1},
      {{srgb, "CineLogCurve.icc", adobe}, COLOR_RGB, COLOR_RGB, {0x2000, 0x9000, 0xF000},  // abstract in the middle
       {0x2000 / 65535.0, 0x9000 / 65535.0, 0xF000 / 65535.0}, TYPE_RGB_DBL, TYPE_RGB_DBL, 1},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.names[0] + " -> " + c.names.back());
    std::vector<std::unique_ptr<Profile>> profiles;
    std::vector<HPROFILE> handles;
    for (const std::string& n : c.names) handles.push_back((profiles.emplace_back(new Profile(n)))->get());
    Xform x(handles, std::vector<DWORD>(handles.size(), kRel));
    LcmsChain l(c.names, std::vector<cmsUInt32Number>(handles.size(), kRel), c.lcms_in, c.lcms_out);
    double expect[4];
    cmsDoTransform(l.get(), c.values.data(), expect, 1);
    COLOR in{}, out{};
    std::copy(c.words.begin(), c.words.end(), &in.cmyk.cyan);
    EXPECT_WIN32(TranslateColors(x.get(), &in, 1, c.in_type, &out, c.out_type), TRUE, ERROR_SUCCESS);
    const int channels = c.out_type == COLOR_CMYK ? 4 : 3;
    for (int i = 0; i < channels; ++i) EXPECT_NEAR((&out.cmyk.cyan)[i], Word(expect[i] / c.out_scale), 1) << i;
  }
}

TEST_F(TransformTest, HiFiChannelsThroughADeviceLink) {
  Profile link(CurveLink(cmsSigMCH5Data, 5, 2.0));  // squares each of five channels
  Xform x({link.get()}, {INTENT_PERCEPTUAL});
  ASSERT_NE(x.get(), nullptr);
  const BYTE bytes[5] = {0, 64, 128, 200, 255};
  COLOR colors[2] = {};
  for (COLOR& c : colors) std::copy(bytes, bytes + 5, c.hifi.channel);
  ASSERT_TRUE(TranslateColors(x.get(), colors, 2, COLOR_5_CHANNEL, colors, COLOR_5_CHANNEL));
  for (const COLOR& c : colors) {
    for (int i = 0; i < 5; ++i) EXPECT_NEAR(c.hifi.channel[i], bytes[i] * bytes[i] / 255.0, 0.51) << i;
  }
  EXPECT_WIN32(TranslateColors(x.get(), colors, 1, COLOR_6_CHANNEL, colors, COLOR_5_CHANNEL), FALSE, ERROR_COLORSPACE_MISMATCH);
}

TEST_F(TransformTest, NamedColoursCountFromOne) {
  Xform x({named_.get(), srgb_.get()}, {kRel, kRel});
  ASSERT_NE(x.get(), nullptr);
  cmsHPROFILE named = cmsOpenProfileFromFile(IccPath("colord/x11-colors.icc").c_str(), "r");
  cmsHPROFILE srgb = cmsOpenProfileFromFile(IccPath("sRGB.icc").c_str(), "r");
  const DWORD count = cmsNamedColorCount(static_cast<cmsNAMEDCOLORLIST*>(cmsReadTag(named, cmsSigNamedColor2Tag)));
  cmsHTRANSFORM l = cmsCreateTransform(named, TYPE_NAMED_COLOR_INDEX, srgb, TYPE_RGB_DBL, kRel, 0);
  ASSERT_GT(count, 2u);
  for (DWORD index : {DWORD{1}, DWORD{2}, count}) {
    const cmsUInt16Number zero_based = static_cast<cmsUInt16Number>(index - 1);
    double expect[3];
    cmsDoTransform(l, &zero_based, expect, 1);
    COLOR c{};
    c.named.dwIndex = index;
    ASSERT_TRUE(TranslateColors(x.get(), &c, 1, COLOR_NAMED, &c, COLOR_RGB));
    for (int i = 0; i < 3; ++i) EXPECT_NEAR((&c.rgb.red)[i], Word(expect[i]), 1) << index;
  }
  cmsDeleteTransform(l);
  cmsCloseProfile(named);
  cmsCloseProfile(srgb);
  // Out of range: refused before anything is written.
  COLOR pair[2] = {};
  pair[0].named.dwIndex = 1;
  for (DWORD bad : {DWORD{0}, count + 1}) {
    pair[1].named.dwIndex = bad;
    COLOR out[2] = {};
    EXPECT_WIN32(TranslateColors(x.get(), pair, 2, COLOR_NAMED, out, COLOR_RGB), FALSE, ERROR_INVALID_COLORINDEX);
    EXPECT_EQ(out[0].rgb.red, 0);
  }
}

TEST_F(TransformTest, IntentsApplyPerProfile) {
  // A 4-profile proof chain and 300 colours (more than one internal block, in place),
  // against Little CMS given the same intents: within one word.
  const std::vector<std::string> names = {"sRGB.icc", "ghostscript/default_cmyk.icc", "ghostscript/default_cmyk.icc",
                                          "compatibleWithAdobeRGB1998.icc"};
  std::mt19937 rng(7);
  std::vector<COLOR> colors(300);
  std::vector<double> values;
  for (COLOR& c : colors) {
    c.rgb = {static_cast<WORD>(rng()), static_cast<WORD>(rng()), static_cast<WORD>(rng())};
    for (WORD w : {c.rgb.red, c.rgb.green, c.rgb.blue}) values.push_back(w / 65535.0);
  }
  std::vector<std::vector<COLOR>> results;
  for (const std::vector<DWORD>& mix : {std::vector<DWORD>{0, 2, 1, 3}, std::vector<DWORD>{0, 0, 0, 0}}) {
    Xform x({srgb_.get(), cmyk_.get(), cmyk_.get(), adobe_.get()}, mix);
    LcmsChain l(names, {mix[0], mix[1], mix[2], mix[3]}, TYPE_RGB_DBL, TYPE_RGB_DBL);
    std::vector<double> expect(values.size());
    cmsDoTransform(l.get(), values.data(), expect.data(), 300);
    results.push_back(colors);
    ASSERT_TRUE(TranslateColors(x.get(), results.back().data(), 300, COLOR_RGB, results.back().data(), COLOR_RGB));
    for (size_t i = 0; i < expect.size(); ++i) ASSERT_NEAR((&results.back()[i / 3].rgb.red)[i % 3], Word(expect[i]), 1);
  }
  int differ = 0;  // the intents matter for this chain, so the comparison has teeth
  for (size_t i = 0; i < colors.size(); ++i) differ += std::abs(results[0][i].rgb.red - results[1][i].rgb.red) > 256;
  EXPECT_GT(differ, 30);
  // One intent: the first profile gets it, every later one absolute colorimetric.
  Xform one({srgb_.get(), cmyk_.get()}, {INTENT_PERCEPTUAL});
  LcmsChain l({names[0], names[1]}, {INTENT_PERCEPTUAL, INTENT_ABSOLUTE_COLORIMETRIC}, TYPE_RGB_DBL, TYPE_CMYK_DBL);
  double ink[4];
  cmsDoTransform(l.get(), values.data(), ink, 1);
  COLOR out{};
  ASSERT_TRUE(TranslateColors(one.get(), colors.data(), 1, COLOR_RGB, &out, COLOR_CMYK));
  for (int i = 0; i < 4; ++i) EXPECT_NEAR((&out.cmyk.cyan)[i], Word(ink[i] / 100), 1) << i;
}

using CreateDeviceLinkProfile = ChainTest;
using icctest::Bytes;
using icctest::Sig;

// Calls CreateDeviceLinkProfile with success expected and returns the link's bytes, after
// checking its header: a link from in to out, whole as Little CMS reads it.
Bytes Link(std::vector<HPROFILE> chain, std::vector<DWORD> intents, const char (&in)[5], const char (&out)[5]) {
  BYTE* data = nullptr;
  EXPECT_WIN32(::CreateDeviceLinkProfile(chain.data(), static_cast<DWORD>(chain.size()), intents.data(),
                                       static_cast<DWORD>(intents.size()), BEST_MODE, &data, INDEX_DONT_CARE),
               TRUE, ERROR_SUCCESS);
  if (!data) return {};
  Bytes icc(data, data + (data[0] << 24 | data[1] << 16 | data[2] << 8 | data[3]));
  EXPECT_WIN32(GlobalFree(data), nullptr, ERROR_SUCCESS);
  EXPECT_EQ(icctest::BE32(icc, 12), Sig("link"));
  EXPECT_EQ(icctest::BE32(icc, 16), Sig(in));
  EXPECT_EQ(icctest::BE32(icc, 20), Sig(out));
  cmsHPROFILE opened = cmsOpenProfileFromMem(icc.data(), static_cast<cmsUInt32Number>(icc.size()));
  EXPECT_NE(opened, nullptr);
  if (opened) cmsCloseProfile(opened);
  return icc;
}

TEST_F(CreateDeviceLinkProfile, RefusesBadArguments) {
  HPROFILE chain[2] = {srgb_.get(), adobe_.get()}, bad[2] = {srgb_.get(), reinterpret_cast<HPROFILE>(0x4444)};
  HPROFILE named_first[2] = {named_.get(), srgb_.get()}, mismatch[3] = {srgb_.get(), cmyk_.get(), adobe_.get()};
  DWORD intents[1] = {0};
  BYTE* data = reinterpret_cast<BYTE*>(0x1);
  const std::tuple<PHPROFILE, DWORD, PBYTE*, DWORD> cases[] = {
      {chain, 2, nullptr, ERROR_INVALID_PARAMETER},       {nullptr, 2, &data, ERROR_INVALID_PARAMETER},
      {chain, 0, &data, ERROR_INVALID_PARAMETER},         {bad, 2, &data, ERROR_INVALID_HANDLE},
      {named_first, 2, &data, ERROR_INVALID_PROFILE},     {mismatch, 3, &data, ERROR_COLORSPACE_MISMATCH},
  };
  for (const auto& [profiles, count, out, error] : cases) {
    EXPECT_WIN32(::CreateDeviceLinkProfile(profiles, count, intents, 1, 0, out, 0), FALSE, error);
    if (out) {
      EXPECT_EQ(data, nullptr);
    }
  }
}

// A chain may begin or end in the PCS: the link then has Lab or XYZ as that end's space.
TEST_F(CreateDeviceLinkProfile, LinksFromAndToTheConnectionSpaces) {
  Link({srgb_.get(), lab_.get()}, {INTENT_PERCEPTUAL}, "RGB ", "Lab ");
  Link({lab_.get(), srgb_.get()}, {INTENT_PERCEPTUAL}, "Lab ", "RGB ");
  Link({xyz_.get(), srgb_.get()}, {INTENT_PERCEPTUAL}, "XYZ ", "RGB ");
  Link({srgb_.get(), xyz_.get()}, {INTENT_PERCEPTUAL}, "RGB ", "XYZ ");
}

TEST_F(CreateDeviceLinkProfile, IsAVersion2LinkThatConvertsLikeTheChain) {
  const Bytes icc = Link({srgb_.get(), cmyk_.get()}, {INTENT_PERCEPTUAL, kRel}, "RGB ", "CMYK");
  ASSERT_GE(icc.size(), 132u);
  EXPECT_EQ(icc[8], 0x02);  // major version
  std::map<std::uint32_t, std::uint32_t> types;  // tag -> its type
  for (const icctest::TagEntry& t : icctest::TagTable(icc)) types[t.signature] = icctest::BE32(icc, t.offset);
  EXPECT_EQ(types[Sig("A2B0")], Sig("mft2"));
  EXPECT_EQ(types[Sig("pseq")], Sig("pseq"));
  // The link alone against the chain. Its 33-point grid resamples the chain: allow 2 % of
  // the range per ink.
  Profile link(icc);
  Xform through_link({link.get()}, {INTENT_PERCEPTUAL});
  Xform through_chain({srgb_.get(), cmyk_.get()}, {INTENT_PERCEPTUAL, kRel});
  std::vector<COLOR> in(64), a(64), b(64);
  for (size_t i = 0; i < in.size(); ++i)
    in[i].rgb = {static_cast<WORD>((i & 3) * 0x5555), static_cast<WORD>((i >> 2 & 3) * 0x5555),
                 static_cast<WORD>((i >> 4) * 0x5555)};
  ASSERT_TRUE(TranslateColors(through_link.get(), in.data(), 64, COLOR_RGB, a.data(), COLOR_CMYK));
  ASSERT_TRUE(TranslateColors(through_chain.get(), in.data(), 64, COLOR_RGB, b.data(), COLOR_CMYK));
  for (size_t i = 0; i < in.size() * 4; ++i) EXPECT_NEAR((&a[i / 4].cmyk.cyan)[i % 4], (&b[i / 4].cmyk.cyan)[i % 4], 1311);
}

}  // namespace
