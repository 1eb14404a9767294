// CreateMultiProfileTransform, DeleteColorTransform and TranslateColors.
//
// Intents: with nIntents == nProfiles each profile gets its own; with one intent the
// first profile gets it and every later profile the "Match" intent,
// INTENT_ABSOLUTE_COLORIMETRIC, as the documentation of the call describes.
// Each intent selects the table read from its profile and the join into it.
#include "icm/transform.h"

#include <algorithm>
#include <iterator>
#include <new>

#include "handle_table.h"
#include "icm/color_codec.h"
#include "icm/gamut.h"
#include "icm/kernels/fast_path.h"
#include "icm/profile_store.h"

namespace win32::icm {

namespace {

constexpr DWORD kMaxProfiles = 10;
constexpr size_t kColorBlock = 256;  // colours converted per Little CMS call

// Spaces one profile may hand to the next: equal, CMYK and '4CLR', or the two PCSs
// (Little CMS converts between those).
bool SpacesChain(cmsColorSpaceSignature from, cmsColorSpaceSignature to) {
  if (from == to) return true;
  if (IsPcsSpace(from) && IsPcsSpace(to)) return true;
  const auto cmyk = [](cmsColorSpaceSignature s) { return s == cmsSigCmykData || s == cmsSigMCH4Data; };
  return cmyk(from) && cmyk(to);
}

// The class, data space and connection space Little CMS will report for these ICC
// bytes must be signatures it names: it hands them back as enumerations, which cannot
// hold arbitrary 32-bit values, and it would take an unknown space for three channels.
bool HeaderSignaturesKnown(const std::vector<std::uint8_t>& icc) {
  static constexpr std::uint32_t kClasses[] = {
      cmsSigInputClass,    cmsSigDisplayClass,    cmsSigOutputClass,     cmsSigLinkClass,
      cmsSigAbstractClass, cmsSigColorSpaceClass, cmsSigNamedColorClass,
  };
  static constexpr std::uint32_t kSpaces[] = {
      cmsSigXYZData,     cmsSigLabData,     cmsSigLuvData,     cmsSigYCbCrData,   cmsSigYxyData,     cmsSigRgbData,
      cmsSigGrayData,    cmsSigHsvData,     cmsSigHlsData,     cmsSigCmykData,    cmsSigCmyData,     cmsSigLuvKData,
      cmsSigMCH1Data,    cmsSigMCH2Data,    cmsSigMCH3Data,    cmsSigMCH4Data,    cmsSigMCH5Data,    cmsSigMCH6Data,
      cmsSigMCH7Data,    cmsSigMCH8Data,    cmsSigMCH9Data,    cmsSigMCHAData,    cmsSigMCHBData,    cmsSigMCHCData,
      cmsSigMCHDData,    cmsSigMCHEData,    cmsSigMCHFData,    cmsSig1colorData,  cmsSig2colorData,  cmsSig3colorData,
      cmsSig4colorData,  cmsSig5colorData,  cmsSig6colorData,  cmsSig7colorData,  cmsSig8colorData,  cmsSig9colorData,
      cmsSig10colorData, cmsSig11colorData, cmsSig12colorData, cmsSig13colorData, cmsSig14colorData, cmsSig15colorData,
  };
  if (icc.size() < 24) return false;
  const auto at = [&icc](size_t i) {
    return std::uint32_t{icc[i]} << 24 | std::uint32_t{icc[i + 1]} << 16 | std::uint32_t{icc[i + 2]} << 8 | icc[i + 3];
  };
  const auto in = [](const auto& list, std::uint32_t v) {
    return std::find(std::begin(list), std::end(list), v) != std::end(list);
  };
  return in(kClasses, at(12)) && in(kSpaces, at(16)) && in(kSpaces, at(20));
}

}  // namespace

Chain::Chain() = default;

Chain::~Chain() {
  for (cmsHPROFILE p : profiles_) cmsCloseProfile(p);
  if (context_) cmsDeleteContext(context_);
}

void Chain::OnLcmsError(cmsContext context, cmsUInt32Number code, const char*) {
  if (auto* self = static_cast<Chain*>(cmsGetContextUserData(context))) self->lcms_error_ = code;
}

DWORD Chain::CreationError() const {
  return lcms_error_ == cmsERROR_COLORSPACE_CHECK ? ERROR_COLORSPACE_MISMATCH : ERROR_INVALID_PROFILE;
}

DWORD Chain::Build(const HPROFILE* handles, DWORD count, const DWORD* intents, DWORD intent_count) {
  if (!handles || !intents || count == 0 || count > kMaxProfiles) return ERROR_INVALID_PARAMETER;
  if (intent_count != 1 && intent_count != count) return ERROR_INVALID_PARAMETER;
  for (DWORD i = 0; i < intent_count; ++i) {
    if (intents[i] > INTENT_ABSOLUTE_COLORIMETRIC) return ERROR_INVALID_PARAMETER;
  }
  context_ = cmsCreateContext(nullptr, this);
  if (!context_) return ERROR_NOT_ENOUGH_MEMORY;
  cmsSetLogErrorHandlerTHR(context_, &Chain::OnLcmsError);

  std::vector<std::uint8_t> bytes;
  for (DWORD i = 0; i < count; ++i) {
    if (!SerializeProfile(handles[i], bytes)) return ERROR_INVALID_HANDLE;
    if (!HeaderSignaturesKnown(bytes)) return ERROR_INVALID_PROFILE;
    cmsHPROFILE p = cmsOpenProfileFromMemTHR(context_, bytes.data(), static_cast<cmsUInt32Number>(bytes.size()));
    if (!p) return ERROR_INVALID_PROFILE;
    profiles_.push_back(p);
    intents_.push_back(intent_count == 1 && i > 0 ? INTENT_ABSOLUTE_COLORIMETRIC : intents[i]);
  }

  // Follow the profiles the way Little CMS will use them: the first is read device to
  // PCS, a later one PCS to device when the space so far is a PCS; links and abstract
  // profiles always run forwards.
  cmsColorSpaceSignature current = cmsGetColorSpace(profiles_[0]);
  for (DWORD i = 0; i < count; ++i) {
    cmsHPROFILE p = profiles_[i];
    ChainStep step{cmsGetDeviceClass(p), cmsGetColorSpace(p), cmsGetPCS(p), true};
    const bool forwards = step.profile_class == cmsSigLinkClass || step.profile_class == cmsSigAbstractClass;
    if (step.profile_class == cmsSigNamedColorClass) {
      // Only as the first of several: index -> its Lab entries -> the next profile.
      if (i != 0 || count == 1) return i != 0 ? ERROR_COLORSPACE_MISMATCH : ERROR_INVALID_PARAMETER;
      auto* list = static_cast<cmsNAMEDCOLORLIST*>(cmsReadTag(p, cmsSigNamedColor2Tag));
      named_count_ = list ? cmsNamedColorCount(list) : 0;
      // Little CMS takes the index as a 16-bit word: a longer list could not be reached.
      if (named_count_ == 0 || named_count_ > 0xFFFF) return ERROR_INVALID_PROFILE;
      step.out = cmsSigLabData;
    } else if (!forwards && i > 0 && IsPcsSpace(current)) {
      std::swap(step.in, step.out);
      step.to_pcs = false;
    }
    if (i > 0 && !SpacesChain(current, step.in)) return ERROR_COLORSPACE_MISMATCH;
    current = step.out;
    steps_.push_back(step);
  }
  // Alone, only a device link maps one device space to another.
  if (count == 1 && steps_[0].profile_class != cmsSigLinkClass) return ERROR_INVALID_PARAMETER;
  return ERROR_SUCCESS;
}

cmsHTRANSFORM Chain::Create(cmsUInt32Number in_format, cmsUInt32Number out_format, cmsUInt32Number flags) const {
  std::vector<cmsHPROFILE> profiles = profiles_;
  std::vector<cmsUInt32Number> intents = intents_;
  return CreateFrom(profiles, intents, in_format, out_format, flags);
}

cmsHTRANSFORM Chain::CreateToLab(size_t count) const {
  // An identity Lab profile at the end turns whatever PCS the prefix ends in (or a
  // named profile's entries) into L*a*b*.
  cmsHPROFILE lab = cmsCreateLab4ProfileTHR(context_, nullptr);
  if (!lab) return nullptr;
  std::vector<cmsHPROFILE> profiles(profiles_.begin(), profiles_.begin() + count);
  std::vector<cmsUInt32Number> intents(intents_.begin(), intents_.begin() + count);
  profiles.push_back(lab);
  intents.push_back(INTENT_RELATIVE_COLORIMETRIC);
  cmsHTRANSFORM x = CreateFrom(profiles, intents, ChainInputFormat(*this), TYPE_Lab_DBL, 0);
  cmsCloseProfile(lab);
  return x;
}

cmsHTRANSFORM Chain::CreateFrom(std::vector<cmsHPROFILE>& profiles, std::vector<cmsUInt32Number>& intents,
                                cmsUInt32Number in_format, cmsUInt32Number out_format, cmsUInt32Number flags) const {
  // Little CMS writes into the black point array, so every call gets fresh arrays.
  const size_t n = profiles.size();
  std::vector<cmsBool> bpc(n, FALSE);
  std::vector<cmsFloat64Number> adaptation(n, 1.0);
  lcms_error_ = 0;
  return cmsCreateExtendedTransform(context_, static_cast<cmsUInt32Number>(n), profiles.data(), bpc.data(),
                                    intents.data(), adaptation.data(), nullptr, 0, in_format, out_format,
                                    flags);
}

DWORD CheckInput(const Chain& chain, COLORTYPE type, const COLOR* colors, DWORD count) {
  if (!chain.named()) return ColorTypeFits(type, chain.input()) ? ERROR_SUCCESS : ERROR_COLORSPACE_MISMATCH;
  if (type != COLOR_NAMED) return ERROR_COLORSPACE_MISMATCH;
  for (DWORD i = 0; i < count; ++i) {
    if (colors[i].named.dwIndex == 0 || colors[i].named.dwIndex > chain.named_count()) {
      return ERROR_INVALID_COLORINDEX;
    }
  }
  return ERROR_SUCCESS;
}

cmsUInt32Number ChainInputFormat(const Chain& chain) {
  return chain.named() ? TYPE_NAMED_COLOR_INDEX : DoubleFormatFor(chain.input());
}

Transform::Transform(std::unique_ptr<Chain> chain) : chain_(std::move(chain)) {}

Transform::~Transform() {
  if (colors_) cmsDeleteTransform(colors_);
  for (auto& entry : bitmaps_) cmsDeleteTransform(entry.second);
  if (to_last_lab_) cmsDeleteTransform(to_last_lab_);
}

DWORD Transform::Init() {
  colors_ = chain_->Create(ChainInputFormat(*chain_), DoubleFormatFor(chain_->output()), 0);
  return colors_ ? ERROR_SUCCESS : chain_->CreationError();
}

cmsHTRANSFORM Transform::Bitmap(cmsUInt32Number in_format, cmsUInt32Number out_format, DWORD& error) {
  std::lock_guard<std::mutex> lock(mutex_);
  const auto key = std::make_pair(in_format, out_format);
  auto it = bitmaps_.find(key);
  if (it != bitmaps_.end()) return it->second;
  cmsHTRANSFORM x = chain_->Create(in_format, out_format, cmsFLAGS_COPY_ALPHA);
  if (!x) {
    error = chain_->CreationError();
    return nullptr;
  }
  bitmaps_.emplace(key, x);
  return x;
}

const kernels::FastPath* Transform::FastPath() {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!fast_made_) {
    fast_ = kernels::Build(*chain_, colors_);
    fast_made_ = true;
  }
  return fast_.get();
}

const GamutCheck* Transform::Gamut(DWORD& error) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!gamut_made_) {
    error = GamutCheck::Create(chain_->context(), chain_->profiles().back(), chain_->steps().back(), gamut_);
    if (error != ERROR_SUCCESS) return nullptr;
    gamut_made_ = true;
  }
  error = ERROR_SUCCESS;
  return gamut_.get();
}

cmsHTRANSFORM Transform::ToLastLab(DWORD& error) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!to_last_lab_) {
    to_last_lab_ = chain_->CreateToLab(chain_->steps().size() - 1);
    if (!to_last_lab_) {
      error = chain_->CreationError();
      return nullptr;
    }
  }
  error = ERROR_SUCCESS;
  return to_last_lab_;
}

std::shared_ptr<Transform> FindTransform(HTRANSFORM handle) {
  auto t = Handles().Lookup<Transform>(handle, HandleKind::Transform);
  if (!t) SetLastError(ERROR_INVALID_HANDLE);
  return t;
}

}  // namespace win32::icm

using namespace win32;
using namespace win32::icm;

extern "C" HTRANSFORM WINAPI CreateMultiProfileTransform(PHPROFILE pahProfiles, DWORD nProfiles, PDWORD padwIntent,
                                                         DWORD nIntents, DWORD /*dwFlags*/,
                                                         DWORD /*indexPreferredCMM*/) {
  // Flags are hints and there is one CMM: both are accepted and change nothing.
  try {
    auto chain = std::make_unique<Chain>();
    DWORD error = chain->Build(pahProfiles, nProfiles, padwIntent, nIntents);
    if (error != ERROR_SUCCESS) {
      SetLastError(error);
      return nullptr;
    }
    auto transform = std::make_shared<Transform>(std::move(chain));
    error = transform->Init();
    if (error != ERROR_SUCCESS) {
      SetLastError(error);
      return nullptr;
    }
    HTRANSFORM handle = win32::Handles().Insert(win32::HandleKind::Transform, std::move(transform));
    SetLastError(ERROR_SUCCESS);
    return handle;
  } catch (const std::bad_alloc&) {
    SetLastError(ERROR_NOT_ENOUGH_MEMORY);
    return nullptr;
  }
}

extern "C" BOOL WINAPI DeleteColorTransform(HTRANSFORM hColorTransform) {
  try {
    // A caller still converting on another thread keeps the object alive until it returns.
    if (!win32::Handles().Remove<Transform>(hColorTransform, win32::HandleKind::Transform)) {
      return Fail(ERROR_INVALID_HANDLE);
    }
    return Succeed();
  } catch (const std::bad_alloc&) {
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}

extern "C" BOOL WINAPI TranslateColors(HTRANSFORM hColorTransform, PCOLOR paInputColors, DWORD nColors,
                                       COLORTYPE ctInput, PCOLOR paOutputColors, COLORTYPE ctOutput) {
  try {
    auto t = FindTransform(hColorTransform);
    if (!t) return FALSE;
    if (ColorTypeChannels(ctInput) == 0 || ColorTypeChannels(ctOutput) == 0) return Fail(ERROR_INVALID_PARAMETER);
    if (nColors == 0) return Succeed();
    if (!paInputColors || !paOutputColors) return Fail(ERROR_INVALID_PARAMETER);
    const Chain& chain = t->chain();
    if (!ColorTypeFits(ctOutput, chain.output())) return Fail(ERROR_COLORSPACE_MISMATCH);
    // Every colour is checked before anything is written.
    const DWORD error = CheckInput(chain, ctInput, paInputColors, nColors);
    if (error != ERROR_SUCCESS) return Fail(error);

    const int in_n = chain.named() ? 1 : SpaceChannels(chain.input());
    const int out_n = SpaceChannels(chain.output());
    std::vector<double> in(kColorBlock * in_n), out(kColorBlock * out_n);
    std::vector<cmsUInt16Number> indexes(chain.named() ? kColorBlock : 0);
    // Each block is read completely before it is written, so the arrays may be the same.
    for (DWORD start = 0; start < nColors; start += kColorBlock) {
      const DWORD n = static_cast<DWORD>(std::min<size_t>(kColorBlock, nColors - start));
      for (DWORD i = 0; i < n; ++i) {
        const COLOR& c = paInputColors[start + i];
        if (chain.named()) {
          indexes[i] = static_cast<cmsUInt16Number>(c.named.dwIndex - 1);
        } else {
          DecodeColor(ctInput, c, chain.input(), &in[i * in_n]);
        }
      }
      const void* src = chain.named() ? static_cast<const void*>(indexes.data()) : in.data();
      cmsDoTransform(t->colors(), src, out.data(), n);
      for (DWORD i = 0; i < n; ++i) EncodeColor(ctOutput, &out[i * out_n], chain.output(), paOutputColors[start + i]);
    }
    return Succeed();
  } catch (const std::bad_alloc&) {
    return Fail(ERROR_NOT_ENOUGH_MEMORY);
  }
}
