// Conformance of CheckColors: arguments, then known colours inside and outside the
// gamut of matrix-shaper, gray and CMYK printer profiles.
#include <gtest/gtest.h>

#include <cmath>
#include <iterator>
#include <random>
#include <vector>

#include "icm/color_codec.h"
#include "transform_test_util.h"

namespace {

using namespace transform_test;
using win32::icm::LabABToWord;
using win32::icm::LabLToWord;

COLOR Lab(double l, double a, double b) {
  COLOR c{};
  c.Lab = {LabLToWord(l), LabABToWord(a), LabABToWord(b)};
  return c;
}

class GamutTest : public ::testing::Test {
 protected:
  std::vector<BYTE> Check(HTRANSFORM x, std::vector<COLOR> colors, COLORTYPE type) {
    std::vector<BYTE> result(colors.size(), 0xEE);
    SetLastError(kSentinel);
    EXPECT_TRUE(CheckColors(x, colors.data(), static_cast<DWORD>(colors.size()), type, result.data()));
    EXPECT_EQ(GetLastError(), ERROR_SUCCESS);
    return result;
  }

  Profile srgb_{"sRGB.icc"};
  Profile adobe_{"compatibleWithAdobeRGB1998.icc"};
  Profile cmyk_{"ghostscript/default_cmyk.icc"};
  Profile gray_{"Gray.icc"};
  Profile lab_{"LCMSLABI.ICM"};
  const std::vector<DWORD> rel_ = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
};

TEST_F(GamutTest, RefusesBadArguments) {
  Xform x({adobe_.get(), srgb_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  HTRANSFORM deleted;
  {
    Xform gone({adobe_.get(), srgb_.get()}, rel_);
    deleted = gone.get();
  }
  COLOR colors[2] = {Lab(50, 0, 0), Lab(50, 0, 0)};
  BYTE result[2];
  for (HTRANSFORM bad : {HTRANSFORM{nullptr}, deleted, HTRANSFORM{srgb_.get()}}) {
    SetLastError(kSentinel);
    EXPECT_FALSE(CheckColors(bad, colors, 2, COLOR_Lab, result));
    EXPECT_EQ(GetLastError(), ERROR_INVALID_HANDLE);
  }
  const struct {
    const char* what;
    PCOLOR colors;
    DWORD count;
    COLORTYPE type;
    PBYTE result;
    BOOL ok;
    DWORD error;
  } cases[] = {
      {"no colours", nullptr, 0, COLOR_Lab, nullptr, TRUE, ERROR_SUCCESS},
      {"null colours", nullptr, 1, COLOR_Lab, result, FALSE, ERROR_INVALID_PARAMETER},
      {"null result", colors, 1, COLOR_Lab, nullptr, FALSE, ERROR_INVALID_PARAMETER},
      {"type 0", colors, 1, static_cast<COLORTYPE>(0), result, FALSE, ERROR_INVALID_PARAMETER},
      {"CMYK into RGB", colors, 1, COLOR_CMYK, result, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"named into RGB", colors, 1, COLOR_NAMED, result, FALSE, ERROR_COLORSPACE_MISMATCH},
      {"XYZ into RGB", colors, 1, COLOR_XYZ, result, FALSE, ERROR_COLORSPACE_MISMATCH},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    SetLastError(kSentinel);
    EXPECT_EQ(CheckColors(x.get(), c.colors, c.count, c.type, c.result), c.ok);
    EXPECT_EQ(GetLastError(), c.error);
  }
}

TEST_F(GamutTest, LabAgainstTheLastMatrixShaper) {
  // Lab is measured against sRGB, the last profile, whatever the chain reads.
  for (HPROFILE first : {adobe_.get(), cmyk_.get()}) {
    Xform x({first, srgb_.get()}, rel_);
    ASSERT_NE(x.get(), nullptr);
    const std::vector<BYTE> r = Check(x.get(),
                                      {Lab(50, 0, 0), Lab(60, 60, 60), Lab(30, 20, -60), Lab(0, 0, 0), Lab(100, 0, 0),
                                       Lab(50, 0, -120), Lab(90, -80, 80), Lab(54, 81, 70), Lab(100.3, 0, 0)},
                                      COLOR_Lab);
    const bool expect_out[] = {false, false, false, false, false, true, true, true, true};
    ASSERT_EQ(r.size(), std::size(expect_out));
    for (size_t i = 0; i < r.size(); ++i) EXPECT_EQ(r[i] != 0, expect_out[i]) << i;
  }
}

TEST_F(GamutTest, FurtherOutMeansALargerValue) {
  Xform x({adobe_.get(), srgb_.get()}, rel_);
  std::vector<COLOR> ray;
  for (double b = -40; b >= -125; b -= 5) ray.push_back(Lab(50, 0, b));
  const std::vector<BYTE> r = Check(x.get(), ray, COLOR_Lab);
  EXPECT_EQ(r.front(), 0);
  EXPECT_GT(r.back(), 20);  // tens of dE beyond the blue edge
  for (size_t i = 1; i < r.size(); ++i) EXPECT_GE(r[i], r[i - 1]) << i;
}

TEST_F(GamutTest, DeviceInputEntersTheChain) {
  Xform x({adobe_.get(), srgb_.get()}, rel_);
  std::vector<COLOR> colors(3);
  colors[0].rgb = {0, 0xFFFF, 0};            // Adobe RGB green: far outside sRGB
  colors[1].rgb = {0x8000, 0x8000, 0x8000};  // mid gray
  colors[2].rgb = {0x6000, 0x7000, 0x5000};
  const std::vector<BYTE> r = Check(x.get(), colors, COLOR_RGB);
  EXPECT_GT(r[0], 10);
  EXPECT_EQ(r[1], 0);
  EXPECT_EQ(r[2], 0);
}

TEST_F(GamutTest, GrayGamutIsTheNeutralAxis) {
  Xform x({srgb_.get(), gray_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  const std::vector<BYTE> r =
      Check(x.get(), {Lab(50, 0, 0), Lab(90, 0, 0), Lab(50, 20, 0), Lab(50, 0, -5)}, COLOR_Lab);
  EXPECT_EQ(r[0], 0);
  EXPECT_EQ(r[1], 0);
  EXPECT_NEAR(r[2], 20, 1);  // the distance to the gray it comes back as
  EXPECT_NEAR(r[3], 5, 1);
}

TEST_F(GamutTest, ColoursThePrinterMakesAreInside) {
  // Lab values made from printable ink amounts by Little CMS (device -> Lab) must be
  // inside; the same hues at chroma 130, beyond any printer, must not be.
  Xform x({srgb_.get(), cmyk_.get()}, rel_);
  ASSERT_NE(x.get(), nullptr);
  LcmsChain forward({"ghostscript/default_cmyk.icc", "LCMSLABI.ICM"}, {1, 1}, TYPE_CMYK_DBL, TYPE_Lab_DBL);
  std::mt19937 rng(3);
  std::uniform_real_distribution<double> ink(10.0, 90.0);  // percent, away from the edges
  std::vector<COLOR> inside, outside;
  for (int i = 0; i < 200; ++i) {
    const double cmyk[4] = {ink(rng), ink(rng), ink(rng), ink(rng) * 0.5};
    cmsCIELab lab;
    cmsDoTransform(forward.get(), cmyk, &lab, 1);
    inside.push_back(Lab(lab.L, lab.a, lab.b));
    const double chroma = std::hypot(lab.a, lab.b);
    if (chroma > 5) {
      const double k = 130.0 / chroma;
      outside.push_back(Lab(lab.L, lab.a * k, lab.b * k));
    }
  }
  for (BYTE b : Check(x.get(), inside, COLOR_Lab)) EXPECT_EQ(b, 0);
  for (BYTE b : Check(x.get(), outside, COLOR_Lab)) EXPECT_GT(b, 0);
}

TEST_F(GamutTest, ChainsWithoutADeviceGamut) {
  // Ending in Lab: every colour is representable.
  Xform to_lab({srgb_.get(), lab_.get()}, rel_);
  ASSERT_NE(to_lab.get(), nullptr);
  EXPECT_EQ(Check(to_lab.get(), {Lab(50, 0, -120), Lab(99, 100, 100)}, COLOR_Lab), (std::vector<BYTE>{0, 0}));

  // A lone device link has no gamut in the PCS.
  cmsToneCurve* linear = cmsBuildGamma(nullptr, 1.0);
  cmsToneCurve* curves[3] = {linear, linear, linear};
  cmsHPROFILE link = cmsCreateLinearizationDeviceLink(cmsSigRgbData, curves);
  cmsFreeToneCurve(linear);
  Profile p(SaveToMemory(link));
  cmsCloseProfile(link);
  Xform x({p.get()}, {INTENT_PERCEPTUAL});
  ASSERT_NE(x.get(), nullptr);
  COLOR c = Lab(50, 0, 0);
  BYTE result = 0xEE;
  SetLastError(kSentinel);
  EXPECT_FALSE(CheckColors(x.get(), &c, 1, COLOR_Lab, &result));
  EXPECT_EQ(GetLastError(), ERROR_NOT_SUPPORTED);
}

}  // namespace
