// When an open profile counts as valid: usable as an ICC profile in a transform.
#ifndef TINTWELL_WIN32_ICM_PROFILE_VALIDITY_H
#define TINTWELL_WIN32_ICM_PROFILE_VALIDITY_H

#include "icm/icc_container.h"

namespace win32::icm {

// A profile is valid when
//  - its header carries 'acsp' and a major version from 2 to 4,
//  - its size field equals the bytes it occupies (a truncated file or a size written
//    over with SetColorProfileHeader fails),
//  - its tag table is consistent (guaranteed once parsed: every entry lies inside the
//    data, no tag appears twice), and
//  - it holds the tags its class needs to take part in a transform, each at least 12
//    bytes (type signature, reserved word, some data) with a non-zero type signature:
//      link, abstract:               A2B0
//      named colour:                 ncl2
//      input, display, output,
//      colour space:                 A2B0 or B2A0 (a table in either direction), else
//                                    GRAY data: kTRC;
//                                    RGB data:  rXYZ gXYZ bXYZ rTRC gTRC bTRC
//    Any other class is not valid.
bool IsUsableProfile(const IccContainer& profile);

}  // namespace win32::icm

#endif
