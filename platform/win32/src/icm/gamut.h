// Whether a Lab colour lies inside a profile's device gamut.
//
// RGB matrix-shaper profiles are tested exactly: Lab -> XYZ (D50) -> linear RGB by the
// inverse of the colorant matrix; inside when every channel is within [0, 1] give or
// take kMatrixEpsilon (which absorbs the s15.16 rounding of the colorants and the Lab
// word steps, so the white point itself counts as inside).
// Every other device profile is tested by a round trip in double precision with
// relative colorimetric tables: Lab -> device (output tables) -> Lab (input tables).
// The output tables only approximate the inverse of the input tables (several dE for
// some printer profiles), so the device value, kept within [0, 1], is then polished by
// up to kPolishSteps damped Gauss-Newton steps on device -> Lab. Inside when the colour
// comes back within kRoundTripDeltaE.
// The result is 0 inside, otherwise the CIE76 distance to the colour that comes back
// (the clipped colour for matrix-shapers), rounded, at least 1 and at most 255.
#ifndef TINTWELL_WIN32_ICM_GAMUT_H
#define TINTWELL_WIN32_ICM_GAMUT_H

#include <lcms2.h>

#include <memory>

#include "icm.h"

namespace win32::icm {

struct ChainStep;

class GamutCheck {
 public:
  static constexpr double kMatrixEpsilon = 2e-4;
  static constexpr double kRoundTripDeltaE = 0.25;
  static constexpr int kPolishSteps = 60;

  // Makes the check for a profile of the given context, the last of a chain; its class
  // and data space come from the chain's step, whose header values were checked. A
  // profile without a device gamut (abstract, named, or with a Lab or XYZ data space)
  // gives null: everything is inside. A device link has no gamut in the PCS:
  // ERROR_NOT_SUPPORTED.
  static DWORD Create(cmsContext context, cmsHPROFILE profile, const ChainStep& step,
                      std::unique_ptr<GamutCheck>& check);

  ~GamutCheck();
  GamutCheck(const GamutCheck&) = delete;
  GamutCheck& operator=(const GamutCheck&) = delete;

  BYTE Check(const cmsCIELab& lab) const;

 private:
  GamutCheck() = default;
  BYTE CheckMatrix(const cmsCIELab& lab) const;
  BYTE CheckRoundTrip(const cmsCIELab& lab) const;

  bool matrix_ = false;
  double to_rgb_[3][3] = {};    // XYZ -> linear RGB
  double from_rgb_[3][3] = {};  // linear RGB -> XYZ
  cmsHTRANSFORM to_device_ = nullptr;
  cmsHTRANSFORM to_lab_ = nullptr;
  int channels_ = 0;
};

}  // namespace win32::icm

#endif
