#include "icm/color_codec.h"

#include <cmath>

namespace win32::icm {

namespace {

constexpr double kD50x = 0.3457;  // chromaticity of the D50 white (ICC PCS)
constexpr double kD50y = 0.3585;

WORD RoundToWord(double v) {
  if (!(v > 0.0)) return 0;  // also NaN
  if (v >= 65535.0) return 0xFFFF;
  return static_cast<WORD>(std::lround(v));
}

void LabToXYZ(const double lab[3], double xyz[3]) {
  const cmsCIELab in{lab[0], lab[1], lab[2]};
  cmsCIEXYZ out;
  cmsLab2XYZ(nullptr, &out, &in);  // null white point = D50
  xyz[0] = out.X;
  xyz[1] = out.Y;
  xyz[2] = out.Z;
}

void XYZToLab(const double xyz[3], double lab[3]) {
  const cmsCIEXYZ in{xyz[0], xyz[1], xyz[2]};
  cmsCIELab out;
  cmsXYZ2Lab(nullptr, &out, &in);
  lab[0] = out.L;
  lab[1] = out.a;
  lab[2] = out.b;
}

// The three words of the 3-component members, which share one layout.
const WORD* Words(const COLOR& c) { return &c.gen3ch.ch1; }
WORD* Words(COLOR& c) { return &c.gen3ch.ch1; }

}  // namespace

bool IsPcsSpace(cmsColorSpaceSignature space) { return space == cmsSigLabData || space == cmsSigXYZData; }

double LabLFromWord(WORD w) { return w * 100.0 / 65280.0; }
WORD LabLToWord(double l) { return RoundToWord(l * 652.8); }
double LabABFromWord(WORD w) { return w / 256.0 - 128.0; }
WORD LabABToWord(double ab) { return RoundToWord((ab + 128.0) * 256.0); }
double UnitFromWord(WORD w) { return w / 65535.0; }
WORD UnitToWord(double v) { return RoundToWord(v * 65535.0); }
double UnitFromByte(BYTE b) { return b / 255.0; }
BYTE UnitToByte(double v) {
  if (!(v > 0.0)) return 0;
  if (v >= 1.0) return 255;
  return static_cast<BYTE>(std::lround(v * 255.0));
}

void YxyToXYZ(const double yxy[3], double xyz[3]) {
  const double Y = yxy[0], x = yxy[1], y = yxy[2];
  if (Y <= 0.0 || y <= 0.0) {
    xyz[0] = xyz[1] = xyz[2] = 0.0;
    return;
  }
  xyz[0] = x * Y / y;
  xyz[1] = Y;
  xyz[2] = (1.0 - x - y) * Y / y;
}

void XYZToYxy(const double xyz[3], double yxy[3]) {
  const double sum = xyz[0] + xyz[1] + xyz[2];
  yxy[0] = xyz[1];
  if (sum <= 0.0) {
    yxy[1] = kD50x;
    yxy[2] = kD50y;
    return;
  }
  yxy[1] = xyz[0] / sum;
  yxy[2] = xyz[1] / sum;
}

int ColorTypeChannels(COLORTYPE type) {
  switch (type) {
    case COLOR_GRAY:
    case COLOR_NAMED:
      return 1;
    case COLOR_RGB:
    case COLOR_XYZ:
    case COLOR_Yxy:
    case COLOR_Lab:
    case COLOR_3_CHANNEL:
      return 3;
    case COLOR_CMYK:
      return 4;
    case COLOR_5_CHANNEL:
    case COLOR_6_CHANNEL:
    case COLOR_7_CHANNEL:
    case COLOR_8_CHANNEL:
      return 5 + (type - COLOR_5_CHANNEL);
  }
  return 0;
}

int SpaceChannels(cmsColorSpaceSignature space) { return static_cast<int>(cmsChannelsOf(space)); }

bool ColorTypeFits(COLORTYPE type, cmsColorSpaceSignature space) {
  switch (type) {
    case COLOR_GRAY:
      return space == cmsSigGrayData;
    case COLOR_RGB:
      return space == cmsSigRgbData;
    case COLOR_CMYK:
      return space == cmsSigCmykData || space == cmsSigMCH4Data;
    case COLOR_XYZ:
    case COLOR_Yxy:
    case COLOR_Lab:
      return IsPcsSpace(space);
    case COLOR_3_CHANNEL:
    case COLOR_5_CHANNEL:
    case COLOR_6_CHANNEL:
    case COLOR_7_CHANNEL:
    case COLOR_8_CHANNEL:
      return space != cmsSigGrayData && SpaceChannels(space) == ColorTypeChannels(type);
    case COLOR_NAMED:
      return false;
  }
  return false;
}

cmsUInt32Number DoubleFormatFor(cmsColorSpaceSignature space) {
  if (space == cmsSigLabData) return TYPE_Lab_DBL;
  if (space == cmsSigXYZData) return TYPE_XYZ_DBL;
  // No colour-space field: Little CMS then reads every device space as 0..1 (a typed
  // CMYK double format would mean 0..100).
  return FLOAT_SH(1) | CHANNELS_SH(SpaceChannels(space)) | BYTES_SH(0);
}

void DecodeColor(COLORTYPE type, const COLOR& color, cmsColorSpaceSignature space, double* out) {
  const WORD* w = Words(color);
  double v[3];
  switch (type) {
    case COLOR_GRAY:
      out[0] = UnitFromWord(color.gray.gray);
      return;
    case COLOR_CMYK:
      out[0] = UnitFromWord(color.cmyk.cyan);
      out[1] = UnitFromWord(color.cmyk.magenta);
      out[2] = UnitFromWord(color.cmyk.yellow);
      out[3] = UnitFromWord(color.cmyk.black);
      return;
    case COLOR_5_CHANNEL:
    case COLOR_6_CHANNEL:
    case COLOR_7_CHANNEL:
    case COLOR_8_CHANNEL:
      for (int i = 0; i < ColorTypeChannels(type); ++i) out[i] = UnitFromByte(color.hifi.channel[i]);
      return;
    case COLOR_Lab:
      v[0] = LabLFromWord(w[0]);
      v[1] = LabABFromWord(w[1]);
      v[2] = LabABFromWord(w[2]);
      if (space == cmsSigXYZData) {
        LabToXYZ(v, out);
      } else {
        out[0] = v[0], out[1] = v[1], out[2] = v[2];
      }
      return;
    case COLOR_XYZ:
    case COLOR_Yxy:
      for (int i = 0; i < 3; ++i) v[i] = UnitFromWord(w[i]);
      if (type == COLOR_Yxy) {
        const double yxy[3] = {v[0], v[1], v[2]};
        YxyToXYZ(yxy, v);
      }
      if (space == cmsSigLabData) {
        XYZToLab(v, out);
      } else {
        out[0] = v[0], out[1] = v[1], out[2] = v[2];
      }
      return;
    default:  // RGB and 3-channel
      for (int i = 0; i < 3; ++i) out[i] = UnitFromWord(w[i]);
      if (type == COLOR_3_CHANNEL && space == cmsSigLabData) {
        out[0] *= 100.0;
        out[1] = out[1] * 255.0 - 128.0;
        out[2] = out[2] * 255.0 - 128.0;
      }
      return;
  }
}

void EncodeColor(COLORTYPE type, const double* in, cmsColorSpaceSignature space, COLOR& color) {
  WORD* w = Words(color);
  double v[3];
  switch (type) {
    case COLOR_GRAY:
      color.gray.gray = UnitToWord(in[0]);
      return;
    case COLOR_CMYK:
      color.cmyk.cyan = UnitToWord(in[0]);
      color.cmyk.magenta = UnitToWord(in[1]);
      color.cmyk.yellow = UnitToWord(in[2]);
      color.cmyk.black = UnitToWord(in[3]);
      return;
    case COLOR_5_CHANNEL:
    case COLOR_6_CHANNEL:
    case COLOR_7_CHANNEL:
    case COLOR_8_CHANNEL:
      for (int i = 0; i < ColorTypeChannels(type); ++i) color.hifi.channel[i] = UnitToByte(in[i]);
      return;
    case COLOR_Lab:
      if (space == cmsSigXYZData) {
        XYZToLab(in, v);
      } else {
        v[0] = in[0], v[1] = in[1], v[2] = in[2];
      }
      w[0] = LabLToWord(v[0]);
      w[1] = LabABToWord(v[1]);
      w[2] = LabABToWord(v[2]);
      return;
    case COLOR_XYZ:
    case COLOR_Yxy:
      if (space == cmsSigLabData) {
        LabToXYZ(in, v);
      } else {
        v[0] = in[0], v[1] = in[1], v[2] = in[2];
      }
      if (type == COLOR_Yxy) {
        const double xyz[3] = {v[0], v[1], v[2]};
        XYZToYxy(xyz, v);
      }
      for (int i = 0; i < 3; ++i) w[i] = UnitToWord(v[i]);
      return;
    default:  // RGB and 3-channel
      v[0] = in[0], v[1] = in[1], v[2] = in[2];
      if (type == COLOR_3_CHANNEL && space == cmsSigLabData) {
        v[0] /= 100.0;
        v[1] = (v[1] + 128.0) / 255.0;
        v[2] = (v[2] + 128.0) / 255.0;
      }
      for (int i = 0; i < 3; ++i) w[i] = UnitToWord(v[i]);
      return;
  }
}

}  // namespace win32::icm
