// The COLOR word encodings and how each colour type meets a chain end in Little CMS.
//
// Words: ICC v2 16-bit Lab (L 0..0xFF00 is 0..100, a/b 0x8000 is 0, one unit per 256);
// XYZ 0..0xFFFF is 0..1 (white Y = 1, larger values clip); gray, RGB, CMYK, Yxy and
// 3-channel 0..0xFFFF is 0..1; 5 to 8 channels one byte each, 0..255 is 0..1.
// Chain ends are fed in double precision: a Lab end as L*a*b*, an XYZ end as XYZ with
// white Y = 1, any other end as n device values in 0..1.
#ifndef TINTWELL_WIN32_ICM_COLOR_CODEC_H
#define TINTWELL_WIN32_ICM_COLOR_CODEC_H

#include <lcms2.h>

#include "icm.h"

namespace win32::icm {

double LabLFromWord(WORD w);
WORD LabLToWord(double l);
double LabABFromWord(WORD w);
WORD LabABToWord(double ab);
double UnitFromWord(WORD w);
WORD UnitToWord(double v);
double UnitFromByte(BYTE b);
BYTE UnitToByte(double v);

// Yxy with Y = 0 or y = 0 is black. Black (X + Y + Z = 0) gets the D50 white's
// chromaticity, so it reads back as a neutral.
void YxyToXYZ(const double yxy[3], double xyz[3]);
void XYZToYxy(const double xyz[3], double yxy[3]);

bool IsPcsSpace(cmsColorSpaceSignature space);

// Channels a colour type carries (NAMED carries one index).
int ColorTypeChannels(COLORTYPE type);

// Whether values of this type can be read from or written to an end of this space:
// GRAY, RGB and CMYK (also '4CLR') need their own space; XYZ, Yxy and Lab need a Lab
// or XYZ end; 3-channel fits any three-component space; 5 to 8 channels fit a space
// with that many components. NAMED fits no end (it is the input of a named chain).
bool ColorTypeFits(COLORTYPE type, cmsColorSpaceSignature space);

// The Little CMS double format for an end of this space.
cmsUInt32Number DoubleFormatFor(cmsColorSpaceSignature space);
int SpaceChannels(cmsColorSpaceSignature space);

// One colour into the end's double values and back. The type must fit the space.
// A 3-channel colour at a Lab end is L/100, (a+128)/255, (b+128)/255.
void DecodeColor(COLORTYPE type, const COLOR& color, cmsColorSpaceSignature space, double* out);
void EncodeColor(COLORTYPE type, const double* in, cmsColorSpaceSignature space, COLOR& color);

}  // namespace win32::icm

#endif
