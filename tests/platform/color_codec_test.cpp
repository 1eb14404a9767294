// The COLOR word encodings: boundary values, exact round trips over every word, and
// which colour types meet which chain ends.
#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "icm/color_codec.h"

namespace {

using namespace win32::icm;

TEST(ColorCodec, BoundaryValues) {
  struct Case {
    const char* what;
    double (*decode)(WORD);
    WORD word;
    double value;
  };
  const Case cases[] = {
      {"L black", LabLFromWord, 0x0000, 0.0},
      {"L white", LabLFromWord, 0xFF00, 100.0},
      {"L top word", LabLFromWord, 0xFFFF, 100.0 + 25500.0 / 65280.0},
      {"a neutral", LabABFromWord, 0x8000, 0.0},
      {"a lowest", LabABFromWord, 0x0000, -128.0},
      {"a 127", LabABFromWord, 0xFF00, 127.0},
      {"a 0xFEFF", LabABFromWord, 0xFEFF, 127.0 - 1.0 / 256.0},
      {"a highest", LabABFromWord, 0xFFFF, 127.0 + 255.0 / 256.0},
      {"device zero", UnitFromWord, 0x0000, 0.0},
      {"device half", UnitFromWord, 0x8000, 32768.0 / 65535.0},
      {"device full", UnitFromWord, 0xFFFF, 1.0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_NEAR(c.decode(c.word), c.value, 1e-12);
  }
  EXPECT_EQ(UnitFromByte(0), 0.0);
  EXPECT_EQ(UnitFromByte(255), 1.0);
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

TEST(ColorCodec, EncodersRoundAndClip) {
  const double nan = std::numeric_limits<double>::quiet_NaN();
  EXPECT_EQ(LabLToWord(-3.0), 0);
  EXPECT_EQ(LabLToWord(101.0), 0xFFFF);  // beyond the top word
  EXPECT_EQ(LabLToWord(50.0), 0x7F80);
  EXPECT_EQ(LabABToWord(-200.0), 0);
  EXPECT_EQ(LabABToWord(128.5), 0xFFFF);
  EXPECT_EQ(LabABToWord(-0.001), 0x8000);  // nearest word
  EXPECT_EQ(UnitToWord(-0.25), 0);
  EXPECT_EQ(UnitToWord(1.3), 0xFFFF);
  EXPECT_EQ(UnitToWord(nan), 0);
  EXPECT_EQ(UnitToByte(0.5), 128);
  EXPECT_EQ(UnitToByte(2.0), 255);
  EXPECT_EQ(UnitToByte(nan), 0);
}

TEST(ColorCodec, YxyAndXYZ) {
  const double d50[3] = {0.9642, 1.0, 0.8249};
  double yxy[3], xyz[3];
  XYZToYxy(d50, yxy);
  EXPECT_NEAR(yxy[0], 1.0, 1e-12);
  EXPECT_NEAR(yxy[1], 0.3457, 1e-4);
  EXPECT_NEAR(yxy[2], 0.3585, 1e-4);
  YxyToXYZ(yxy, xyz);
  for (int i = 0; i < 3; ++i) EXPECT_NEAR(xyz[i], d50[i], 1e-12);

  // Black has no chromaticity: it reads as the white's, and comes back as black.
  const double black[3] = {0, 0, 0};
  XYZToYxy(black, yxy);
  EXPECT_EQ(yxy[0], 0.0);
  EXPECT_NEAR(yxy[1], 0.3457, 1e-4);
  YxyToXYZ(yxy, xyz);
  EXPECT_EQ(xyz[0] + xyz[1] + xyz[2], 0.0);
  const double no_y[3] = {0.5, 0.3, 0.0};  // y = 0 would divide by zero
  YxyToXYZ(no_y, xyz);
  EXPECT_EQ(xyz[0] + xyz[1] + xyz[2], 0.0);
}

TEST(ColorCodec, TypesMeetTheirSpaces) {
  const struct {
    COLORTYPE type;
    cmsColorSpaceSignature space;
    bool fits;
  } cases[] = {
      {COLOR_GRAY, cmsSigGrayData, true},    {COLOR_GRAY, cmsSigRgbData, false},
      {COLOR_RGB, cmsSigRgbData, true},      {COLOR_RGB, cmsSigLabData, false},
      {COLOR_CMYK, cmsSigCmykData, true},    {COLOR_CMYK, cmsSigMCH4Data, true},
      {COLOR_CMYK, cmsSigRgbData, false},    {COLOR_Lab, cmsSigLabData, true},
      {COLOR_Lab, cmsSigXYZData, true},      {COLOR_Lab, cmsSigRgbData, false},
      {COLOR_XYZ, cmsSigLabData, true},      {COLOR_Yxy, cmsSigXYZData, true},
      {COLOR_Yxy, cmsSigCmykData, false},    {COLOR_3_CHANNEL, cmsSigRgbData, true},
      {COLOR_3_CHANNEL, cmsSigHsvData, true}, {COLOR_3_CHANNEL, cmsSigLabData, true},
      {COLOR_3_CHANNEL, cmsSigCmykData, false}, {COLOR_3_CHANNEL, cmsSigGrayData, false},
      {COLOR_5_CHANNEL, cmsSigMCH5Data, true}, {COLOR_5_CHANNEL, cmsSigMCH6Data, false},
      {COLOR_8_CHANNEL, cmsSigMCH8Data, true}, {COLOR_NAMED, cmsSigLabData, false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(testing::Message() << c.type << " " << std::hex << c.space);
    EXPECT_EQ(ColorTypeFits(c.type, c.space), c.fits);
  }
}

TEST(ColorCodec, ConvertsBetweenThePcsEncodings) {
  // The D50 white given as Lab words reaches an XYZ end as the white, and back.
  COLOR white{};
  white.Lab = {0xFF00, 0x8000, 0x8000};
  double xyz[3];
  DecodeColor(COLOR_Lab, white, cmsSigXYZData, xyz);
  EXPECT_NEAR(xyz[0], 0.9642, 1e-4);
  EXPECT_NEAR(xyz[1], 1.0, 1e-9);
  EXPECT_NEAR(xyz[2], 0.8249, 1e-4);
  COLOR back{};
  EncodeColor(COLOR_Lab, xyz, cmsSigXYZData, back);
  EXPECT_EQ(back.Lab.L, 0xFF00);
  EXPECT_EQ(back.Lab.a, 0x8000);
  EXPECT_EQ(back.Lab.b, 0x8000);

  // Yxy words at a Lab end: the white's chromaticity at Y = 1 is L* 100, neutral.
  COLOR yxy{};
  yxy.Yxy = {0xFFFF, UnitToWord(0.3457), UnitToWord(0.3585)};
  double lab[3];
  DecodeColor(COLOR_Yxy, yxy, cmsSigLabData, lab);
  EXPECT_NEAR(lab[0], 100.0, 1e-6);
  EXPECT_NEAR(lab[1], 0.0, 0.05);
  EXPECT_NEAR(lab[2], 0.0, 0.05);

  // XYZ output clips at 1.0.
  const double bright[3] = {1.2, 0.5, -0.1};
  COLOR out{};
  EncodeColor(COLOR_XYZ, bright, cmsSigXYZData, out);
  EXPECT_EQ(out.XYZ.X, 0xFFFF);
  EXPECT_EQ(out.XYZ.Y, 0x8000);
  EXPECT_EQ(out.XYZ.Z, 0);

  // Three channels at a Lab end span L 0..100 and a, b -128..127.
  COLOR gen{};
  gen.gen3ch = {0xFFFF, 0, 0xFFFF};
  DecodeColor(COLOR_3_CHANNEL, gen, cmsSigLabData, lab);
  EXPECT_NEAR(lab[0], 100.0, 1e-9);
  EXPECT_NEAR(lab[1], -128.0, 1e-9);
  EXPECT_NEAR(lab[2], 127.0, 1e-9);
}

TEST(ColorCodec, HiFiChannelsAreBytes) {
  COLOR c{};
  for (int i = 0; i < 8; ++i) c.hifi.channel[i] = static_cast<BYTE>(i * 36);
  double v[8];
  DecodeColor(COLOR_7_CHANNEL, c, cmsSigMCH7Data, v);
  for (int i = 0; i < 7; ++i) EXPECT_DOUBLE_EQ(v[i], i * 36 / 255.0);
  COLOR out{};
  out.hifi.channel[7] = 0x77;
  EncodeColor(COLOR_7_CHANNEL, v, cmsSigMCH7Data, out);
  for (int i = 0; i < 7; ++i) EXPECT_EQ(out.hifi.channel[i], i * 36);
  EXPECT_EQ(out.hifi.channel[7], 0x77);  // beyond the type's channels: untouched
}

}  // namespace
