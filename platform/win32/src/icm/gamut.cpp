// CheckColors and the gamut test behind it.
#include "icm/gamut.h"

#include <algorithm>
#include <cmath>
#include <new>
#include <vector>

#include "icm/color_codec.h"
#include "icm/transform.h"

namespace win32::icm {

namespace {

bool Invert(const double m[3][3], double out[3][3]) {
  const double det = m[0][0] * (m[1][1] * m[2][2] - m[1][2] * m[2][1]) -
                     m[0][1] * (m[1][0] * m[2][2] - m[1][2] * m[2][0]) +
                     m[0][2] * (m[1][0] * m[2][1] - m[1][1] * m[2][0]);
  if (std::fabs(det) < 1e-12) return false;
  for (int r = 0; r < 3; ++r) {
    for (int c = 0; c < 3; ++c) {
      // Cofactor of (c, r) over the determinant: the adjugate's transpose.
      const int r1 = (c + 1) % 3, r2 = (c + 2) % 3, c1 = (r + 1) % 3, c2 = (r + 2) % 3;
      out[r][c] = (m[r1][c1] * m[r2][c2] - m[r1][c2] * m[r2][c1]) / det;
    }
  }
  return true;
}

BYTE Distance(double delta_e) {
  return static_cast<BYTE>(std::clamp(std::lround(delta_e), 1L, 255L));
}

}  // namespace

GamutCheck::~GamutCheck() {
  if (to_device_) cmsDeleteTransform(to_device_);
  if (to_lab_) cmsDeleteTransform(to_lab_);
}

DWORD GamutCheck::Create(cmsContext context, cmsHPROFILE profile, const ChainStep& step,
                         std::unique_ptr<GamutCheck>& check) {
  check.reset();
  const cmsProfileClassSignature cls = step.profile_class;
  const cmsColorSpaceSignature space = step.to_pcs ? step.in : step.out;
  if (cls == cmsSigLinkClass) return ERROR_NOT_SUPPORTED;
  if (cls == cmsSigAbstractClass || cls == cmsSigNamedColorClass || space == cmsSigLabData ||
      space == cmsSigXYZData) {
    return ERROR_SUCCESS;
  }
  std::unique_ptr<GamutCheck> made(new GamutCheck);
  if (space == cmsSigRgbData && cmsIsMatrixShaper(profile)) {
    const cmsTagSignature tags[3] = {cmsSigRedColorantTag, cmsSigGreenColorantTag, cmsSigBlueColorantTag};
    made->matrix_ = true;
    for (int c = 0; c < 3 && made->matrix_; ++c) {
      const auto* xyz = static_cast<const cmsCIEXYZ*>(cmsReadTag(profile, tags[c]));
      if (!xyz) {
        made->matrix_ = false;
        break;
      }
      made->from_rgb_[0][c] = xyz->X;
      made->from_rgb_[1][c] = xyz->Y;
      made->from_rgb_[2][c] = xyz->Z;
    }
    if (made->matrix_) made->matrix_ = Invert(made->from_rgb_, made->to_rgb_);
  }
  if (!made->matrix_) {
    cmsHPROFILE lab = cmsCreateLab4ProfileTHR(context, nullptr);
    if (!lab) return ERROR_NOT_ENOUGH_MEMORY;
    made->channels_ = SpaceChannels(space);
    const cmsUInt32Number device = DoubleFormatFor(space);
    cmsHPROFILE forth[2] = {lab, profile};
    cmsHPROFILE back[2] = {profile, lab};
    cmsUInt32Number intents[2] = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
    cmsBool bpc[2] = {FALSE, FALSE};
    cmsFloat64Number adaptation[2] = {1.0, 1.0};
    made->to_device_ = cmsCreateExtendedTransform(context, 2, forth, bpc, intents, adaptation, nullptr, 0,
                                                  TYPE_Lab_DBL, device, 0);
    bpc[0] = bpc[1] = FALSE;
    made->to_lab_ = cmsCreateExtendedTransform(context, 2, back, bpc, intents, adaptation, nullptr, 0, device,
                                               TYPE_Lab_DBL, 0);
    cmsCloseProfile(lab);
    if (!made->to_device_ || !made->to_lab_) return ERROR_INVALID_PROFILE;
  }
  check = std::move(made);
  return ERROR_SUCCESS;
}

BYTE GamutCheck::Check(const cmsCIELab& lab) const { return matrix_ ? CheckMatrix(lab) : CheckRoundTrip(lab); }

BYTE GamutCheck::CheckMatrix(const cmsCIELab& lab) const {
  cmsCIEXYZ xyz;
  cmsLab2XYZ(nullptr, &xyz, &lab);
  const double v[3] = {xyz.X, xyz.Y, xyz.Z};
  double rgb[3];
  bool inside = true;
  for (int r = 0; r < 3; ++r) {
    rgb[r] = to_rgb_[r][0] * v[0] + to_rgb_[r][1] * v[1] + to_rgb_[r][2] * v[2];
    if (rgb[r] < -kMatrixEpsilon || rgb[r] > 1.0 + kMatrixEpsilon) inside = false;
    rgb[r] = std::clamp(rgb[r], 0.0, 1.0);
  }
  if (inside) return 0;
  cmsCIEXYZ clipped;
  clipped.X = from_rgb_[0][0] * rgb[0] + from_rgb_[0][1] * rgb[1] + from_rgb_[0][2] * rgb[2];
  clipped.Y = from_rgb_[1][0] * rgb[0] + from_rgb_[1][1] * rgb[1] + from_rgb_[1][2] * rgb[2];
  clipped.Z = from_rgb_[2][0] * rgb[0] + from_rgb_[2][1] * rgb[1] + from_rgb_[2][2] * rgb[2];
  cmsCIELab back;
  cmsXYZ2Lab(nullptr, &back, &clipped);
  return Distance(cmsDeltaE(&lab, &back));
}

BYTE GamutCheck::CheckRoundTrip(const cmsCIELab& target) const {
  double device[cmsMAXCHANNELS];
  cmsDoTransform(to_device_, &target, device, 1);
  for (int c = 0; c < channels_; ++c) device[c] = std::isfinite(device[c]) ? std::clamp(device[c], 0.0, 1.0) : 0.0;
  cmsCIELab at;
  cmsDoTransform(to_lab_, device, &at, 1);
  double err = cmsDeltaE(&target, &at);
  // Polish the device value with damped Gauss-Newton steps on device -> Lab, kept in
  // [0, 1]: the output tables only approximate the inverse of the input tables.
  double damping = 1e-3;
  for (int iter = 0; iter < kPolishSteps && err > kRoundTripDeltaE; ++iter) {
    double jac[3][cmsMAXCHANNELS];
    double trial[cmsMAXCHANNELS];
    for (int c = 0; c < channels_; ++c) {
      std::copy(device, device + channels_, trial);
      // Tables hold 16-bit values: a step much smaller than this may not move the output.
      const double h = device[c] > 0.5 ? -4e-3 : 4e-3;
      trial[c] += h;
      cmsCIELab moved;
      cmsDoTransform(to_lab_, trial, &moved, 1);
      jac[0][c] = (moved.L - at.L) / h;
      jac[1][c] = (moved.a - at.a) / h;
      jac[2][c] = (moved.b - at.b) / h;
    }
    const double r[3] = {target.L - at.L, target.a - at.a, target.b - at.b};
    // (J^T J + damping * diag) step = J^T r, by Gauss-Jordan elimination.
    double m[cmsMAXCHANNELS][cmsMAXCHANNELS + 1] = {};
    const int n = channels_;
    for (int i = 0; i < n; ++i) {
      for (int j = 0; j < n; ++j) {
        for (int k = 0; k < 3; ++k) m[i][j] += jac[k][i] * jac[k][j];
      }
      m[i][i] += damping * (1.0 + m[i][i]);
      for (int k = 0; k < 3; ++k) m[i][n] += jac[k][i] * r[k];
    }
    for (int i = 0; i < n; ++i) {
      int pivot = i;
      for (int k = i + 1; k < n; ++k) {
        if (std::fabs(m[k][i]) > std::fabs(m[pivot][i])) pivot = k;
      }
      for (int j = 0; j <= n; ++j) std::swap(m[i][j], m[pivot][j]);
      if (std::fabs(m[i][i]) < 1e-15) continue;
      for (int k = 0; k < n; ++k) {
        if (k == i) continue;
        const double f = m[k][i] / m[i][i];
        for (int j = i; j <= n; ++j) m[k][j] -= f * m[i][j];
      }
    }
    for (int c = 0; c < n; ++c) {
      const double step = std::fabs(m[c][c]) < 1e-15 ? 0.0 : m[c][n] / m[c][c];
      trial[c] = std::clamp(device[c] + step, 0.0, 1.0);
    }
    cmsCIELab moved;
    cmsDoTransform(to_lab_, trial, &moved, 1);
    const double moved_err = cmsDeltaE(&target, &moved);
    if (moved_err < err) {
      std::copy(trial, trial + n, device);
      at = moved;
      err = moved_err;
      damping = std::max(damping * 0.3, 1e-6);
    } else if ((damping *= 10.0) > 1e6) {
      break;  // no step helps: a local minimum, which for a colour outside is the boundary
    }
  }
  return err <= kRoundTripDeltaE ? 0 : Distance(err);
}

}  // namespace win32::icm

using namespace win32;
using namespace win32::icm;

extern "C" BOOL WINAPI CheckColors(HTRANSFORM hColorTransform, PCOLOR paInputColors, DWORD nColors,
                                   COLORTYPE ctInput, PBYTE paResult) {
  try {
    auto t = FindTransform(hColorTransform);
    if (!t) return FALSE;
    if (ColorTypeChannels(ctInput) == 0) return Fail(ERROR_INVALID_PARAMETER);
    if (nColors == 0) return Succeed();
    if (!paInputColors || !paResult) return Fail(ERROR_INVALID_PARAMETER);
    const Chain& chain = t->chain();
    // Lab is always measured against the last profile; anything else enters the chain.
    const bool lab_input = ctInput == COLOR_Lab;
    if (!lab_input) {
      const DWORD error = CheckInput(chain, ctInput, paInputColors, nColors);
      if (error != ERROR_SUCCESS) return Fail(error);
    }
    DWORD error = ERROR_SUCCESS;
    const GamutCheck* gamut = t->Gamut(error);
    if (error != ERROR_SUCCESS) return Fail(error);
    // A chain whose last profile is read device -> PCS only ever hands it device values,
    // which are inside its gamut by definition; so does a profile without a gamut.
    if (!gamut || (!lab_input && chain.steps().back().to_pcs)) {
      std::fill(paResult, paResult + nColors, BYTE{0});
      return Succeed();
    }
    if (lab_input) {
      for (DWORD i = 0; i < nColors; ++i) {
        const LabCOLOR& w = paInputColors[i].Lab;
        const cmsCIELab lab{LabLFromWord(w.L), LabABFromWord(w.a), LabABFromWord(w.b)};
        paResult[i] = gamut->Check(lab);
      }
      return Succeed();
    }
    cmsHTRANSFORM to_pcs = t->ToLastLab(error);
    if (!to_pcs) return Fail(error);
    const int in_n = chain.named() ? 1 : SpaceChannels(chain.input());
    std::vector<double> in(in_n);
    for (DWORD i = 0; i < nColors; ++i) {
      cmsCIELab lab;
      if (chain.named()) {
        const cmsUInt16Number index = static_cast<cmsUInt16Number>(paInputColors[i].named.dwIndex - 1);
        cmsDoTransform(to_pcs, &index, &lab, 1);
      } else {
        DecodeColor(ctInput, paInputColors[i], chain.input(), in.data());
        cmsDoTransform(to_pcs, in.data(), &lab, 1);
      }
      paResult[i] = gamut->Check(lab);
    }
    return Succeed();
  } catch (const std::bad_alloc&) {
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}
