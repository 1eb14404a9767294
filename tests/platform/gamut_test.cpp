// CheckColors: arguments, then colours known to be inside or outside the gamut of
// matrix-shaper, gray and CMYK printer profiles.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <random>
#include <vector>

#include "icm/color_codec.h"
#include "transform_test_util.h"

namespace {

using namespace transform_test;

COLOR Lab(double l, double a, double b) {
  COLOR c{};
  c.Lab = {win32::icm::LabLToWord(l), win32::icm::LabABToWord(a), win32::icm::LabABToWord(b)};
  return c;
}

std::vector<BYTE> Check(HTRANSFORM x, std::vector<COLOR> colors, COLORTYPE type = COLOR_Lab) {
  std::vector<BYTE> result(colors.size(), 0xEE);
  EXPECT_WIN32(CheckColors(x, colors.data(), static_cast<DWORD>(colors.size()), type, result.data()), TRUE, ERROR_SUCCESS);
  return result;
}

using GamutTest = ChainTest;

TEST_F(GamutTest, RefusesBadArguments) {
  Xform x({adobe_.get(), srgb_.get()}, {kRel, kRel});
  COLOR colors[1] = {Lab(50, 0, 0)};
  BYTE result[1];
  const std::tuple<PCOLOR, DWORD, COLORTYPE, PBYTE, DWORD> cases[] = {
      {nullptr, 0, COLOR_Lab, nullptr, ERROR_SUCCESS},
      {nullptr, 1, COLOR_Lab, result, ERROR_INVALID_PARAMETER},
      {colors, 1, COLOR_Lab, nullptr, ERROR_INVALID_PARAMETER},
      {colors, 1, static_cast<COLORTYPE>(0), result, ERROR_INVALID_PARAMETER},
      {colors, 1, COLOR_CMYK, result, ERROR_COLORSPACE_MISMATCH},
      {colors, 1, COLOR_NAMED, result, ERROR_COLORSPACE_MISMATCH},
      {colors, 1, COLOR_XYZ, result, ERROR_COLORSPACE_MISMATCH},
  };
  for (const auto& [in, count, type, out, error] : cases)
    EXPECT_WIN32(CheckColors(x.get(), in, count, type, out), error == ERROR_SUCCESS, error);
}

TEST_F(GamutTest, LabAgainstTheLastMatrixShaper) {
  // Lab is measured against sRGB, the last profile, whatever the chain reads.
  for (HPROFILE first : {adobe_.get(), cmyk_.get()}) {
    Xform x({first, srgb_.get()}, {kRel, kRel});
    const std::vector<BYTE> r = Check(x.get(), {Lab(50, 0, 0), Lab(60, 60, 60), Lab(30, 20, -60), Lab(0, 0, 0),
                                                Lab(100, 0, 0), Lab(50, 0, -120), Lab(90, -80, 80), Lab(54, 81, 70),
                                                Lab(100.3, 0, 0)});
    const bool out[] = {false, false, false, false, false, true, true, true, true};
    for (size_t i = 0; i < r.size(); ++i) EXPECT_EQ(r[i] != 0, out[i]) << i;
  }
  // Further out gives a larger value.
  Xform x({adobe_.get(), srgb_.get()}, {kRel, kRel});
  std::vector<COLOR> ray;
  for (double b = -40; b >= -125; b -= 5) ray.push_back(Lab(50, 0, b));
  const std::vector<BYTE> r = Check(x.get(), ray);
  EXPECT_EQ(r.front(), 0);
  EXPECT_GT(r.back(), 20);
  EXPECT_TRUE(std::is_sorted(r.begin(), r.end()));
}

TEST_F(GamutTest, DeviceInputEntersTheChain) {
  Xform x({adobe_.get(), srgb_.get()}, {kRel, kRel});
  std::vector<COLOR> colors(2);
  colors[0].rgb = {0, 0xFFFF, 0};            // Adobe RGB green: far outside sRGB
  colors[1].rgb = {0x6000, 0x7000, 0x5000};
  const std::vector<BYTE> r = Check(x.get(), colors, COLOR_RGB);
  EXPECT_GT(r[0], 10);
  EXPECT_EQ(r[1], 0);
  // A named colour is checked as the Lab its entry holds (v2 Lab words, like COLOR_Lab).
  Xform from_names({named_.get(), srgb_.get()}, {kRel, kRel});
  cmsHPROFILE lcms_named = cmsOpenProfileFromFile(IccPath("colord/x11-colors.icc").c_str(), "r");
  auto* list = static_cast<cmsNAMEDCOLORLIST*>(cmsReadTag(lcms_named, cmsSigNamedColor2Tag));
  std::vector<COLOR> names(100), labs(100);
  for (DWORD i = 0; i < names.size(); ++i) {
    names[i].named.dwIndex = i + 1;
    ASSERT_TRUE(cmsNamedColorInfo(list, i, nullptr, nullptr, nullptr, &labs[i].Lab.L, nullptr));
  }
  cmsCloseProfile(lcms_named);
  const std::vector<BYTE> by_name = Check(from_names.get(), names, COLOR_NAMED), by_lab = Check(x.get(), labs);
  for (size_t i = 0; i < names.size(); ++i) EXPECT_NEAR(by_name[i], by_lab[i], 1) << i;
  EXPECT_GT(std::count(by_name.begin(), by_name.end(), 0), 30);
  names[50].named.dwIndex = 0;
  BYTE result[100];
  EXPECT_WIN32(CheckColors(from_names.get(), names.data(), 100, COLOR_NAMED, result), FALSE, ERROR_INVALID_COLORINDEX);
}

TEST_F(GamutTest, GrayGamutIsTheNeutralAxis) {
  Xform x({srgb_.get(), gray_.get()}, {kRel, kRel});
  const std::vector<BYTE> r = Check(x.get(), {Lab(50, 0, 0), Lab(90, 0, 0), Lab(50, 20, 0), Lab(50, 0, -5)});
  EXPECT_EQ(r[0], 0);
  EXPECT_EQ(r[1], 0);
  EXPECT_NEAR(r[2], 20, 1);  // the distance to the gray it comes back as
  EXPECT_NEAR(r[3], 5, 1);
}

TEST_F(GamutTest, ColoursThePrinterMakesAreInside) {
  // Lab values Little CMS makes from printable ink amounts (device -> Lab) are
  // inside; the same hues at chroma 130, beyond any printer, are not.
  Xform x({srgb_.get(), cmyk_.get()}, {kRel, kRel});
  LcmsChain forward({"ghostscript/default_cmyk.icc", "LCMSLABI.ICM"}, {kRel, kRel}, TYPE_CMYK_DBL, TYPE_Lab_DBL);
  std::mt19937 rng(3);
  std::uniform_real_distribution<double> ink(10.0, 90.0);  // percent, away from the edges
  std::vector<COLOR> inside, outside;
  for (int i = 0; i < 200; ++i) {
    const double cmyk[4] = {ink(rng), ink(rng), ink(rng), ink(rng) * 0.5};
    cmsCIELab lab;
    cmsDoTransform(forward.get(), cmyk, &lab, 1);
    inside.push_back(Lab(lab.L, lab.a, lab.b));
    const double k = 130.0 / std::max(std::hypot(lab.a, lab.b), 1e-3);
    outside.push_back(Lab(lab.L, lab.a * k, lab.b * k));
  }
  for (BYTE b : Check(x.get(), inside)) EXPECT_EQ(b, 0);
  for (BYTE b : Check(x.get(), outside)) EXPECT_GT(b, 0);
}

TEST_F(GamutTest, ChainsWithoutADeviceGamut) {
  Xform to_lab({srgb_.get(), lab_.get()}, {kRel, kRel});  // ending in Lab, everything fits
  EXPECT_EQ(Check(to_lab.get(), {Lab(50, 0, -120), Lab(99, 100, 100)}), (std::vector<BYTE>{0, 0}));
  Profile link(CurveLink(cmsSigRgbData, 3, 1.0));
  Xform x({link.get()}, {INTENT_PERCEPTUAL});
  COLOR c = Lab(50, 0, 0);
  BYTE result = 0xEE;  // a lone link has no gamut in the PCS
  EXPECT_WIN32(CheckColors(x.get(), &c, 1, COLOR_Lab, &result), FALSE, ERROR_NOT_SUPPORTED);
}

}  // namespace
