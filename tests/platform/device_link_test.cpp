// Conformance of CreateDeviceLinkProfile: arguments, the bytes it returns, and a link
// that converts like the chain it was made from.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "transform_test_util.h"

namespace {

using namespace transform_test;

uint32_t BigEndian(const BYTE* p) {
  return uint32_t{p[0]} << 24 | uint32_t{p[1]} << 16 | uint32_t{p[2]} << 8 | p[3];
}

std::string FourCC(const BYTE* p) { return std::string(reinterpret_cast<const char*>(p), 4); }

// The type signature of a tag, read from the tag table; empty when absent.
std::string TagType(const std::vector<BYTE>& icc, const char* sig) {
  const uint32_t count = BigEndian(&icc[128]);
  for (uint32_t i = 0; i < count && 132 + 12 * (i + 1) <= icc.size(); ++i) {
    const BYTE* entry = &icc[132 + 12 * i];
    if (FourCC(entry) != sig) continue;
    const uint32_t offset = BigEndian(entry + 4);
    if (offset + 4 > icc.size()) return "";
    return FourCC(&icc[offset]);
  }
  return "";
}

class DeviceLinkTest : public ::testing::Test {
 protected:
  Profile srgb_{"sRGB.icc"};
  Profile adobe_{"compatibleWithAdobeRGB1998.icc"};
  Profile cmyk_{"ghostscript/default_cmyk.icc"};
  Profile lab_{"LCMSLABI.ICM"};
  Profile named_{"colord/x11-colors.icc"};
};

TEST_F(DeviceLinkTest, RefusesBadArguments) {
  HPROFILE chain[2] = {srgb_.get(), adobe_.get()};
  HPROFILE bad[2] = {srgb_.get(), reinterpret_cast<HPROFILE>(0x4444)};
  HPROFILE named[2] = {named_.get(), srgb_.get()};
  HPROFILE to_lab[2] = {srgb_.get(), lab_.get()};
  HPROFILE mismatch[3] = {srgb_.get(), cmyk_.get(), adobe_.get()};
  DWORD intents[3] = {0, 0, 0};
  BYTE* data = reinterpret_cast<BYTE*>(0x1);
  const struct {
    const char* what;
    PHPROFILE profiles;
    DWORD count;
    PBYTE* out;
    DWORD error;
  } cases[] = {
      {"null output", chain, 2, nullptr, ERROR_INVALID_PARAMETER},
      {"null profiles", nullptr, 2, &data, ERROR_INVALID_PARAMETER},
      {"no profiles", chain, 0, &data, ERROR_INVALID_PARAMETER},
      {"bad handle", bad, 2, &data, ERROR_INVALID_HANDLE},
      {"named colours first", named, 2, &data, ERROR_INVALID_PROFILE},
      {"ends in the PCS", to_lab, 2, &data, ERROR_INVALID_PROFILE},
      {"spaces do not chain", mismatch, 3, &data, ERROR_COLORSPACE_MISMATCH},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    SetLastError(kSentinel);
    EXPECT_FALSE(CreateDeviceLinkProfile(c.profiles, c.count, intents, 1, 0, c.out, 0));
    EXPECT_EQ(GetLastError(), c.error);
    if (c.out) {
      EXPECT_EQ(*c.out, nullptr);
    }
  }
}

TEST_F(DeviceLinkTest, IsAVersion2LinkThatConvertsLikeTheChain) {
  HPROFILE chain[2] = {srgb_.get(), cmyk_.get()};
  DWORD intents[2] = {INTENT_PERCEPTUAL, INTENT_RELATIVE_COLORIMETRIC};
  BYTE* data = nullptr;
  SetLastError(kSentinel);
  ASSERT_TRUE(CreateDeviceLinkProfile(chain, 2, intents, 2, BEST_MODE, &data, INDEX_DONT_CARE));
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
  ASSERT_NE(data, nullptr);
  const uint32_t size = BigEndian(data);
  ASSERT_GE(size, 132u);
  const std::vector<BYTE> icc(data, data + size);
  SetLastError(kSentinel);
  EXPECT_EQ(GlobalFree(data), nullptr);
  EXPECT_EQ(GetLastError(), ERROR_SUCCESS);

  EXPECT_EQ(icc[8], 0x02);  // major version
  EXPECT_EQ(FourCC(&icc[12]), "link");
  EXPECT_EQ(FourCC(&icc[16]), "RGB ");
  EXPECT_EQ(FourCC(&icc[20]), "CMYK");
  EXPECT_EQ(FourCC(&icc[36]), "acsp");
  EXPECT_EQ(TagType(icc, "A2B0"), "mft2");
  EXPECT_EQ(TagType(icc, "pseq"), "pseq");

  cmsHPROFILE opened = cmsOpenProfileFromMem(icc.data(), size);
  ASSERT_NE(opened, nullptr);
  EXPECT_EQ(cmsGetDeviceClass(opened), cmsSigLinkClass);
  cmsCloseProfile(opened);

  // The link alone against the chain. A 33-point lut16 grid resamples the chain:
  // allow 2 % of the range per ink.
  Profile link(icc);
  ASSERT_NE(link.get(), nullptr);
  Xform through_link({link.get()}, {INTENT_PERCEPTUAL});
  Xform through_chain({srgb_.get(), cmyk_.get()}, {INTENT_PERCEPTUAL, INTENT_RELATIVE_COLORIMETRIC});
  ASSERT_NE(through_link.get(), nullptr);
  ASSERT_NE(through_chain.get(), nullptr);
  std::vector<COLOR> in(64), a(64), b(64);
  for (size_t i = 0; i < in.size(); ++i) {
    in[i].rgb = {static_cast<WORD>((i & 3) * 0x5555), static_cast<WORD>(((i >> 2) & 3) * 0x5555),
                 static_cast<WORD>((i >> 4) * 0x5555)};
  }
  ASSERT_TRUE(TranslateColors(through_link.get(), in.data(), 64, COLOR_RGB, a.data(), COLOR_CMYK));
  ASSERT_TRUE(TranslateColors(through_chain.get(), in.data(), 64, COLOR_RGB, b.data(), COLOR_CMYK));
  for (size_t i = 0; i < in.size(); ++i) {
    EXPECT_NEAR(a[i].cmyk.cyan, b[i].cmyk.cyan, 1311) << i;
    EXPECT_NEAR(a[i].cmyk.magenta, b[i].cmyk.magenta, 1311) << i;
    EXPECT_NEAR(a[i].cmyk.yellow, b[i].cmyk.yellow, 1311) << i;
    EXPECT_NEAR(a[i].cmyk.black, b[i].cmyk.black, 1311) << i;
  }
}

}  // namespace
