// Helpers of the transform tests: profiles opened through the stand-in and directly
// in Little CMS, and handles that close themselves.
#ifndef TINTWELL_TESTS_TRANSFORM_TEST_UTIL_H
#define TINTWELL_TESTS_TRANSFORM_TEST_UTIL_H

#include <lcms2.h>

#include <cstdint>
#include <string>
#include <vector>

#include "icm.h"
#include "win32_paths.h"

namespace transform_test {

constexpr DWORD kSentinel = 0xDEADBEEF;
constexpr DWORD kRel = INTENT_RELATIVE_COLORIMETRIC;

inline std::string IccPath(const std::string& name) { return std::string(TINTWELL_ICC_DIR) + "/" + name; }

class Profile {
 public:
  explicit Profile(const std::string& name) {
    const std::string path = win32::WindowsPathFromPosix(IccPath(name));
    PROFILE p{PROFILE_FILENAME, const_cast<char*>(path.c_str()), static_cast<DWORD>(path.size())};
    handle_ = OpenColorProfileA(&p, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
  }
  explicit Profile(std::vector<std::uint8_t> bytes) {
    PROFILE p{PROFILE_MEMBUFFER, bytes.data(), static_cast<DWORD>(bytes.size())};
    handle_ = OpenColorProfileA(&p, PROFILE_READ, 0, OPEN_EXISTING);
  }
  ~Profile() { CloseColorProfile(handle_); }
  Profile(const Profile&) = delete;
  Profile& operator=(const Profile&) = delete;
  HPROFILE get() const { return handle_; }

 private:
  HPROFILE handle_ = nullptr;
};

class Xform {
 public:
  Xform(std::vector<HPROFILE> profiles, std::vector<DWORD> intents)
      : handle_(CreateMultiProfileTransform(profiles.data(), static_cast<DWORD>(profiles.size()), intents.data(),
                                            static_cast<DWORD>(intents.size()), BEST_MODE, INDEX_DONT_CARE)) {}
  ~Xform() { DeleteColorTransform(handle_); }
  Xform(const Xform&) = delete;
  Xform& operator=(const Xform&) = delete;
  HTRANSFORM get() const { return handle_; }

 private:
  HTRANSFORM handle_;
};

// Little CMS on its own, for independent expectations.
class LcmsChain {
 public:
  LcmsChain(const std::vector<std::string>& names, std::vector<cmsUInt32Number> intents, cmsUInt32Number in,
            cmsUInt32Number out, cmsUInt32Number flags = 0) {
    std::vector<cmsHPROFILE> profiles;
    for (const std::string& n : names) profiles.push_back(cmsOpenProfileFromFile(IccPath(n).c_str(), "r"));
    std::vector<cmsBool> bpc(names.size(), FALSE);
    std::vector<cmsFloat64Number> adaptation(names.size(), 1.0);
    x_ = cmsCreateExtendedTransform(nullptr, static_cast<cmsUInt32Number>(names.size()), profiles.data(),
                                    bpc.data(), intents.data(), adaptation.data(), nullptr, 0, in, out, flags);
    for (cmsHPROFILE p : profiles) cmsCloseProfile(p);
  }
  ~LcmsChain() { cmsDeleteTransform(x_); }
  LcmsChain(const LcmsChain&) = delete;
  LcmsChain& operator=(const LcmsChain&) = delete;
  cmsHTRANSFORM get() const { return x_; }

 private:
  cmsHTRANSFORM x_ = nullptr;
};

inline std::vector<std::uint8_t> SaveToMemory(cmsHPROFILE profile) {
  cmsUInt32Number size = 0;
  cmsSaveProfileToMem(profile, nullptr, &size);
  std::vector<std::uint8_t> bytes(size);
  cmsSaveProfileToMem(profile, bytes.data(), &size);
  cmsCloseProfile(profile);
  return bytes;
}

// A device link made by Little CMS applying one curve per channel.
inline std::vector<std::uint8_t> CurveLink(cmsColorSpaceSignature space, int channels, double gamma) {
  cmsToneCurve* curve = cmsBuildGamma(nullptr, gamma);
  std::vector<cmsToneCurve*> curves(channels, curve);
  cmsHPROFILE link = cmsCreateLinearizationDeviceLink(space, curves.data());
  cmsFreeToneCurve(curve);
  return SaveToMemory(link);
}

}  // namespace transform_test

#endif
