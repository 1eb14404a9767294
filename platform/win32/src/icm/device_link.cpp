// CreateDeviceLinkProfile: the chain is linked by Little CMS into a version 2 device
// link ('link' class, lut16 AToB0, profile sequence kept) returned in a GlobalAlloc
// block that the caller frees with GlobalFree. The chain follows the rules of
// CreateMultiProfileTransform. Either end may be the PCS (Lab or XYZ), as in a link
// whose last profile is an abstract or colour-space profile; a named-colour profile
// first is refused with ERROR_INVALID_PROFILE, since a link has no named colours.
#include <cstring>
#include <new>

#include "icm/color_codec.h"
#include "icm/transform.h"

namespace win32::icm {
namespace {

struct LinkParts {
  cmsHTRANSFORM transform = nullptr;
  cmsHPROFILE link = nullptr;
  ~LinkParts() {
    if (link) cmsCloseProfile(link);
    if (transform) cmsDeleteTransform(transform);
  }
};

}  // namespace
}  // namespace win32::icm

using namespace win32;
using namespace win32::icm;

extern "C" BOOL WINAPI CreateDeviceLinkProfile(PHPROFILE hProfile, DWORD nProfiles, PDWORD padwIntent,
                                               DWORD nIntents, DWORD /*dwFlags*/, PBYTE* pProfileData,
                                               DWORD /*indexPreferredCMM*/) {
  try {
    if (!pProfileData) return Fail(ERROR_INVALID_PARAMETER);
    *pProfileData = nullptr;
    Chain chain;
    DWORD error = chain.Build(hProfile, nProfiles, padwIntent, nIntents);
    if (error != ERROR_SUCCESS) return Fail(error);
    if (chain.named()) return Fail(ERROR_INVALID_PROFILE);

    LinkParts parts;
    // Formats are left open and nothing is optimised: the link is sampled afresh.
    parts.transform = chain.Create(0, 0, cmsFLAGS_NOOPTIMIZE | cmsFLAGS_KEEP_SEQUENCE);
    if (!parts.transform) return Fail(chain.CreationError());
    parts.link = cmsTransform2DeviceLink(parts.transform, 2.1, 0);
    cmsUInt32Number size = 0;
    if (!parts.link || !cmsSaveProfileToMem(parts.link, nullptr, &size) || size < 128) {
      return Fail(ERROR_INVALID_PROFILE);
    }
    auto* block = static_cast<BYTE*>(GlobalAlloc(GMEM_FIXED, size));
    if (!block) return FALSE;  // GlobalAlloc set the code
    if (!cmsSaveProfileToMem(parts.link, block, &size)) {
      GlobalFree(block);
      return Fail(ERROR_INVALID_PROFILE);
    }
    *pProfileData = block;
    return Succeed();
  } catch (const std::bad_alloc&) {
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}
