// Conformance of CreateDeviceLinkProfile: arguments, the bytes it returns, and a link
// that converts like the chain it was made from.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "transform_test_util.h"

namespace {

using namespace transform_test;

uint32_t BigEndian(const BYTE* p) { return uint32_t{p[0]} << 24 | uint32_t{p[1]} << 16 | uint32_t{p[2]} << 8 | p[3]; }
std::string FourCC(const BYTE* p) { return std::string(reinterpret_cast<const char*>(p), 4); }

// The type signature of a tag, read from the tag table; empty when absent.
std::string TagType(const std::vector<BYTE>& icc, const char* sig) {
  for (uint32_t i = 0; i < BigEndian(&icc[128]) && 132 + 12 * (i + 1) <= icc.size(); ++i) {
    const BYTE* entry = &icc[132 + 12 * i];
    const uint32_t offset = BigEndian(entry + 4);
    if (FourCC(entry) == sig && offset + 4 <= icc.size()) return FourCC(&icc[offset]);
  }
  return "";
}

TEST(CreateDeviceLinkProfile, RefusesBadArguments) {
  Profile srgb("sRGB.icc"), adobe("compatibleWithAdobeRGB1998.icc"), cmyk("ghostscript/default_cmyk.icc"),
      lab("LCMSLABI.ICM"), named("colord/x11-colors.icc");
  HPROFILE chain[2] = {srgb.get(), adobe.get()}, bad[2] = {srgb.get(), reinterpret_cast<HPROFILE>(0x4444)};
  HPROFILE named_first[2] = {named.get(), srgb.get()};
  HPROFILE mismatch[3] = {srgb.get(), cmyk.get(), adobe.get()};
  DWORD intents[1] = {0};
  BYTE* data = reinterpret_cast<BYTE*>(0x1);
  const struct {
    PHPROFILE profiles;
    DWORD count;
    PBYTE* out;
    DWORD error;
  } cases[] = {
      {chain, 2, nullptr, ERROR_INVALID_PARAMETER},       {nullptr, 2, &data, ERROR_INVALID_PARAMETER},
      {chain, 0, &data, ERROR_INVALID_PARAMETER},         {bad, 2, &data, ERROR_INVALID_HANDLE},
      {named_first, 2, &data, ERROR_INVALID_PROFILE},
      {mismatch, 3, &data, ERROR_COLORSPACE_MISMATCH},
  };
  for (size_t i = 0; i < std::size(cases); ++i) {
    SCOPED_TRACE(i);
    EXPECT_WIN32(CreateDeviceLinkProfile(cases[i].profiles, cases[i].count, intents, 1, 0, cases[i].out, 0), FALSE, cases[i].error);
    if (cases[i].out) {
      EXPECT_EQ(data, nullptr);
    }
  }
}

// A chain may begin or end in the PCS: the link then has Lab or XYZ as that end's space.
TEST(CreateDeviceLinkProfile, LinksFromAndToTheConnectionSpaces) {
  Profile srgb("sRGB.icc"), lab("LCMSLABI.ICM"), xyz("LCMSXYZI.ICM");
  const struct {
    HPROFILE first, second;
    const char *in, *out;
  } cases[] = {
      {srgb.get(), lab.get(), "RGB ", "Lab "}, {lab.get(), srgb.get(), "Lab ", "RGB "},
      {xyz.get(), srgb.get(), "XYZ ", "RGB "}, {srgb.get(), xyz.get(), "RGB ", "XYZ "},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.in) + "->" + c.out);
    HPROFILE chain[2] = {c.first, c.second};
    DWORD intents[1] = {INTENT_PERCEPTUAL};
    BYTE* data = nullptr;
    EXPECT_WIN32(CreateDeviceLinkProfile(chain, 2, intents, 1, BEST_MODE, &data, INDEX_DONT_CARE), TRUE,
                 ERROR_SUCCESS);
    ASSERT_NE(data, nullptr);
    EXPECT_EQ(FourCC(&data[12]), "link");
    EXPECT_EQ(FourCC(&data[16]), c.in);
    EXPECT_EQ(FourCC(&data[20]), c.out);
    cmsHPROFILE opened = cmsOpenProfileFromMem(data, BigEndian(data));
    EXPECT_NE(opened, nullptr);
    if (opened) cmsCloseProfile(opened);
    GlobalFree(data);
  }
}

TEST(CreateDeviceLinkProfile, IsAVersion2LinkThatConvertsLikeTheChain) {
  Profile srgb("sRGB.icc"), cmyk("ghostscript/default_cmyk.icc");
  HPROFILE chain[2] = {srgb.get(), cmyk.get()};
  DWORD intents[2] = {INTENT_PERCEPTUAL, INTENT_RELATIVE_COLORIMETRIC};
  BYTE* data = nullptr;
  EXPECT_WIN32(CreateDeviceLinkProfile(chain, 2, intents, 2, BEST_MODE, &data, INDEX_DONT_CARE), TRUE, ERROR_SUCCESS);
  const uint32_t size = BigEndian(data);
  ASSERT_GE(size, 132u);
  const std::vector<BYTE> icc(data, data + size);
  EXPECT_WIN32(GlobalFree(data), nullptr, ERROR_SUCCESS);
  EXPECT_EQ(icc[8], 0x02);  // major version
  EXPECT_EQ(FourCC(&icc[12]), "link");
  EXPECT_EQ(FourCC(&icc[16]), "RGB ");
  EXPECT_EQ(FourCC(&icc[20]), "CMYK");
  EXPECT_EQ(TagType(icc, "A2B0"), "mft2");
  EXPECT_EQ(TagType(icc, "pseq"), "pseq");
  cmsHPROFILE opened = cmsOpenProfileFromMem(icc.data(), size);
  ASSERT_NE(opened, nullptr);
  EXPECT_EQ(cmsGetDeviceClass(opened), cmsSigLinkClass);
  cmsCloseProfile(opened);
  // The link alone against the chain. Its 33-point grid resamples the chain: allow
  // 2 % of the range per ink.
  Profile link(icc);
  Xform through_link({link.get()}, {INTENT_PERCEPTUAL});
  Xform through_chain({srgb.get(), cmyk.get()}, {INTENT_PERCEPTUAL, INTENT_RELATIVE_COLORIMETRIC});
  std::vector<COLOR> in(64), a(64), b(64);
  for (size_t i = 0; i < in.size(); ++i) {
    in[i].rgb = {static_cast<WORD>((i & 3) * 0x5555), static_cast<WORD>((i >> 2 & 3) * 0x5555),
                 static_cast<WORD>((i >> 4) * 0x5555)};
  }
  ASSERT_TRUE(TranslateColors(through_link.get(), in.data(), 64, COLOR_RGB, a.data(), COLOR_CMYK));
  ASSERT_TRUE(TranslateColors(through_chain.get(), in.data(), 64, COLOR_RGB, b.data(), COLOR_CMYK));
  for (size_t i = 0; i < in.size() * 4; ++i) EXPECT_NEAR((&a[i / 4].cmyk.cyan)[i % 4], (&b[i / 4].cmyk.cyan)[i % 4], 1311);
}

}  // namespace
