// Helpers of the transform tests: profiles opened through the stand-in and directly
// in Little CMS, and handles that close themselves.
#ifndef TINTWELL_TESTS_TRANSFORM_TEST_UTIL_H
#define TINTWELL_TESTS_TRANSFORM_TEST_UTIL_H

#include <lcms2.h>

#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "icc_test_support.h"

namespace transform_test {

using icctest::IccPath;
using icctest::kSentinel;
constexpr DWORD kRel = INTENT_RELATIVE_COLORIMETRIC;

inline WORD Word(double v) { return static_cast<WORD>(std::lround(std::fmin(std::fmax(v, 0.0), 1.0) * 65535.0)); }

class Profile {
 public:
  explicit Profile(const std::string& name)
      : handle_(icctest::OpenPath(win32::WindowsPathFromPosix(IccPath(name)), PROFILE_READ, OPEN_EXISTING)) {}
  explicit Profile(const std::vector<std::uint8_t>& bytes) : handle_(icctest::OpenMemory(bytes, PROFILE_READ)) {}
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

// The profiles most chains are made of, open through the stand-in.
class ChainTest : public ::testing::Test {
 protected:
  Profile srgb_{"sRGB.icc"}, adobe_{"compatibleWithAdobeRGB1998.icc"}, cmyk_{"ghostscript/default_cmyk.icc"},
      lab_{"LCMSLABI.ICM"}, xyz_{"LCMSXYZI.ICM"}, gray_{"Gray.icc"}, abstract_{"CineLogCurve.icc"},
      named_{"colord/x11-colors.icc"};
};

// Little CMS on its own, for independent expectations.
class LcmsChain {
 public:
  LcmsChain(const std::vector<std::string>& names, std::vector<cmsUInt32Number> intents, cmsUInt32Number in,
            cmsUInt32Number out) {
    std::vector<cmsHPROFILE> profiles;
    for (const std::string& n : names) profiles.push_back(cmsOpenProfileFromFile(IccPath(n).c_str(), "r"));
    std::vector<cmsBool> bpc(names.size(), FALSE);
    std::vector<cmsFloat64Number> adaptation(names.size(), 1.0);
    x_ = cmsCreateExtendedTransform(nullptr, static_cast<cmsUInt32Number>(names.size()), profiles.data(),
                                    bpc.data(), intents.data(), adaptation.data(), nullptr, 0, in, out, 0);
    for (cmsHPROFILE p : profiles) cmsCloseProfile(p);
  }
  ~LcmsChain() { cmsDeleteTransform(x_); }
  LcmsChain(const LcmsChain&) = delete;
  LcmsChain& operator=(const LcmsChain&) = delete;
  cmsHTRANSFORM get() const { return x_; }

 private:
  cmsHTRANSFORM x_ = nullptr;
};

// A device link made by Little CMS applying one curve per channel.
inline std::vector<std::uint8_t> CurveLink(cmsColorSpaceSignature space, int channels, double gamma) {
  cmsToneCurve* curve = cmsBuildGamma(nullptr, gamma);
  std::vector<cmsToneCurve*> curves(channels, curve);
  cmsHPROFILE link = cmsCreateLinearizationDeviceLink(space, curves.data());
  cmsFreeToneCurve(curve);
  cmsUInt32Number size = 0;
  cmsSaveProfileToMem(link, nullptr, &size);
  std::vector<std::uint8_t> bytes(size);
  cmsSaveProfileToMem(link, bytes.data(), &size);
  cmsCloseProfile(link);
  return bytes;
}

}  // namespace transform_test

#endif
