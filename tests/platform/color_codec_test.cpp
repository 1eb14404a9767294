// The COLOR word encodings: boundary values, exact round trips over every word, and
// which colour types meet which chain ends.
#include <gtest/gtest.h>

#include <limits>
#include <tuple>

#include "icm/color_codec.h"

namespace {

using namespace win32::icm;

TEST(ColorCodec, BoundaryValuesAndClipping) {
  const std::tuple<double (*)(WORD), WORD, double> decoded[] = {
      {LabLFromWord, 0x0000, 0.0},     {LabLFromWord, 0xFF00, 100.0},  {LabLFromWord, 0xFFFF, 100.0 + 255 / 652.8},
      {LabABFromWord, 0x8000, 0.0},    {LabABFromWord, 0x0000, -128},  {LabABFromWord, 0xFF00, 127.0},
      {LabABFromWord, 0xFEFF, 127.0 - 1 / 256.0}, {LabABFromWord, 0xFFFF, 127.0 + 255 / 256.0},
      {UnitFromWord, 0x0000, 0.0},     {UnitFromWord, 0xFFFF, 1.0},
  };
  for (const auto& [decode, word, value] : decoded) EXPECT_NEAR(decode(word), value, 1e-12) << std::hex << word;
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const std::tuple<WORD (*)(double), double, WORD> encoded[] = {
      {LabLToWord, -3.0, 0},         {LabLToWord, 101.0, 0xFFFF},    {LabLToWord, 50.0, 0x7F80},
      {LabABToWord, -200.0, 0},      {LabABToWord, 128.5, 0xFFFF},   {LabABToWord, -0.001, 0x8000},
      {UnitToWord, -0.25, 0},        {UnitToWord, 1.3, 0xFFFF},      {UnitToWord, nan, 0},
  };
  for (const auto& [encode, value, word] : encoded) EXPECT_EQ(encode(value), word) << value;
  EXPECT_EQ(UnitToByte(0.5), 128);
  EXPECT_EQ(UnitToByte(2.0), 255);
  EXPECT_EQ(UnitToByte(nan), 0);
}

TEST(ColorCodec, EveryWordSurvivesARoundTrip) {
  for (unsigned w = 0; w <= 0xFFFF; ++w) {
    const WORD word = static_cast<WORD>(w);
    ASSERT_EQ(LabLToWord(LabLFromWord(word)), word);
    ASSERT_EQ(LabABToWord(LabABFromWord(word)), word);
    ASSERT_EQ(UnitToWord(UnitFromWord(word)), word);
  }
  for (unsigned b = 0; b <= 255; ++b) ASSERT_EQ(UnitToByte(UnitFromByte(static_cast<BYTE>(b))), b);
}

TEST(ColorCodec, YxyAtTheWhiteAndAtBlack) {
  const double d50[3] = {0.9642, 1.0, 0.8249}, black[3] = {0, 0, 0}, no_y[3] = {0.5, 0.3, 0.0};
  double yxy[3], xyz[3];
  XYZToYxy(d50, yxy);
  EXPECT_NEAR(yxy[1], 0.3457, 1e-4);
  EXPECT_NEAR(yxy[2], 0.3585, 1e-4);
  YxyToXYZ(yxy, xyz);
  for (int i = 0; i < 3; ++i) EXPECT_NEAR(xyz[i], d50[i], 1e-12);
  XYZToYxy(black, yxy);  // no chromaticity: the white's, so it reads back as black
  EXPECT_NEAR(yxy[1], 0.3457, 1e-4);
  YxyToXYZ(yxy, xyz);
  EXPECT_EQ(xyz[0] + xyz[1] + xyz[2], 0.0);
  YxyToXYZ(no_y, xyz);  // y = 0 would divide by zero
  EXPECT_EQ(xyz[0] + xyz[1] + xyz[2], 0.0);
}

TEST(ColorCodec, TypesMeetTheirSpaces) {
  const struct {
    COLORTYPE type;
    cmsColorSpaceSignature space;
    bool fits;
  } cases[] = {
      {COLOR_GRAY, cmsSigGrayData, true},       {COLOR_GRAY, cmsSigRgbData, false},
      {COLOR_RGB, cmsSigRgbData, true},         {COLOR_RGB, cmsSigLabData, false},
      {COLOR_CMYK, cmsSigCmykData, true},       {COLOR_CMYK, cmsSigMCH4Data, true},
      {COLOR_Lab, cmsSigXYZData, true},         {COLOR_Lab, cmsSigRgbData, false},
      {COLOR_XYZ, cmsSigLabData, true},         {COLOR_Yxy, cmsSigCmykData, false},
      {COLOR_3_CHANNEL, cmsSigHsvData, true},   {COLOR_3_CHANNEL, cmsSigLabData, true},
      {COLOR_3_CHANNEL, cmsSigCmykData, false}, {COLOR_3_CHANNEL, cmsSigGrayData, false},
      {COLOR_5_CHANNEL, cmsSigMCH5Data, true},  {COLOR_5_CHANNEL, cmsSigMCH6Data, false},
      {COLOR_8_CHANNEL, cmsSigMCH8Data, true},  {COLOR_NAMED, cmsSigLabData, false},
  };
  for (const auto& c : cases) EXPECT_EQ(ColorTypeFits(c.type, c.space), c.fits) << c.type << " " << std::hex << c.space;
}

TEST(ColorCodec, ConvertsBetweenThePcsEncodings) {
  COLOR white{}, back{};
  white.Lab = {0xFF00, 0x8000, 0x8000};
  double xyz[3], lab[3];
  DecodeColor(COLOR_Lab, white, cmsSigXYZData, xyz);  // the D50 white
  EXPECT_NEAR(xyz[0], 0.9642, 1e-4);
  EXPECT_NEAR(xyz[1], 1.0, 1e-9);
  EXPECT_NEAR(xyz[2], 0.8249, 1e-4);
  EncodeColor(COLOR_Lab, xyz, cmsSigXYZData, back);
  EXPECT_EQ(back.Lab.L, 0xFF00);
  EXPECT_EQ(back.Lab.a, 0x8000);
  EXPECT_EQ(back.Lab.b, 0x8000);
  COLOR yxy{};
  yxy.Yxy = {0xFFFF, UnitToWord(0.3457), UnitToWord(0.3585)};
  DecodeColor(COLOR_Yxy, yxy, cmsSigLabData, lab);
  EXPECT_NEAR(lab[0], 100.0, 1e-6);
  EXPECT_NEAR(lab[1], 0.0, 0.05);
  const double bright[3] = {1.2, 0.5, -0.1};  // XYZ words clip at 1.0
  EncodeColor(COLOR_XYZ, bright, cmsSigXYZData, back);
  EXPECT_EQ(back.XYZ.X, 0xFFFF);
  EXPECT_EQ(back.XYZ.Y, 0x8000);
  EXPECT_EQ(back.XYZ.Z, 0);
  COLOR gen{};  // three channels at a Lab end span L 0..100, a and b -128..127
  gen.gen3ch = {0xFFFF, 0, 0xFFFF};
  DecodeColor(COLOR_3_CHANNEL, gen, cmsSigLabData, lab);
  EXPECT_NEAR(lab[0], 100.0, 1e-9);
  EXPECT_NEAR(lab[1], -128.0, 1e-9);
  EXPECT_NEAR(lab[2], 127.0, 1e-9);
  COLOR hifi{};
  hifi.hifi.channel[7] = 0x77;
  const double seven[7] = {0, 0.2, 0.4, 0.6, 0.8, 1.0, 0.5};
  EncodeColor(COLOR_7_CHANNEL, seven, cmsSigMCH7Data, hifi);
  EXPECT_EQ(hifi.hifi.channel[6], 128);
  EXPECT_EQ(hifi.hifi.channel[7], 0x77);  // beyond the type's channels: untouched
}

}  // namespace
