// What the transform code needs from the profile container: an open profile's current
// bytes as a complete ICC file, to hand to Little CMS.
#ifndef TINTWELL_WIN32_ICM_PROFILE_STORE_H
#define TINTWELL_WIN32_ICM_PROFILE_STORE_H

#include <cstdint>
#include <vector>

#include "icm.h"

namespace win32::icm {

// Serialises the open profile behind the handle (size field and tag table consistent,
// tag data 4-byte aligned) into bytes. Returns FALSE with the last error set
// (ERROR_INVALID_HANDLE) when the handle is not an open profile.
BOOL SerializeProfile(HPROFILE profile, std::vector<std::uint8_t>& bytes);

}  // namespace win32::icm

#endif
