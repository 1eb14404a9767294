// Colour transforms: a chain of profiles opened in Little CMS, validated the way
// CreateMultiProfileTransform documents it, and the transforms made from it.
#ifndef TINTWELL_WIN32_ICM_TRANSFORM_H
#define TINTWELL_WIN32_ICM_TRANSFORM_H

#include <lcms2.h>

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "api_result.h"
#include "icm.h"

namespace win32::icm {

class GamutCheck;
namespace kernels {
struct FastPath;
}

// How one profile of a chain is used: the space it reads and the space it writes.
struct ChainStep {
  cmsProfileClassSignature profile_class;
  cmsColorSpaceSignature in;
  cmsColorSpaceSignature out;
  bool to_pcs;  // used device -> PCS (or as a link / abstract profile)
};

// Profiles copied into Little CMS, with their own context, so a chain outlives the
// profile handles it was made from.
class Chain {
 public:
  Chain();
  ~Chain();
  Chain(const Chain&) = delete;
  Chain& operator=(const Chain&) = delete;

  // Opens and validates the profiles. Returns ERROR_SUCCESS or the Windows code:
  // 87 for bad counts, arrays or intents, 6 for a handle that is not an open profile,
  // 2011 for bytes Little CMS refuses, 2021 for spaces that do not chain.
  DWORD Build(const HPROFILE* handles, DWORD count, const DWORD* intents, DWORD intent_count);

  // A Little CMS transform over the chain with the given formats; null on failure
  // (CreationError() says why).
  cmsHTRANSFORM Create(cmsUInt32Number in_format, cmsUInt32Number out_format, cmsUInt32Number flags) const;
  // The first `count` profiles, which must end at the PCS, then on to Lab (double).
  cmsHTRANSFORM CreateToLab(size_t count) const;

  // The Windows code for the last transform Little CMS refused to build.
  DWORD CreationError() const;

  cmsContext context() const { return context_; }
  const std::vector<cmsHPROFILE>& profiles() const { return profiles_; }
  const std::vector<ChainStep>& steps() const { return steps_; }
  // One intent per profile, as handed to Little CMS.
  const std::vector<cmsUInt32Number>& intents() const { return intents_; }
  cmsColorSpaceSignature input() const { return steps_.front().in; }
  cmsColorSpaceSignature output() const { return steps_.back().out; }
  // A named-colour profile first: the input is a 1-based index below named_count() + 1.
  bool named() const { return named_count_ > 0; }
  cmsUInt32Number named_count() const { return named_count_; }

 private:
  cmsHTRANSFORM CreateFrom(std::vector<cmsHPROFILE>& profiles, std::vector<cmsUInt32Number>& intents,
                           cmsUInt32Number in_format, cmsUInt32Number out_format, cmsUInt32Number flags) const;
  static void OnLcmsError(cmsContext context, cmsUInt32Number code, const char* text);

  cmsContext context_ = nullptr;
  std::vector<cmsHPROFILE> profiles_;
  std::vector<cmsUInt32Number> intents_;
  std::vector<ChainStep> steps_;
  cmsUInt32Number named_count_ = 0;
  mutable std::atomic<cmsUInt32Number> lcms_error_{0};
};

// What a transform handle stands for.
class Transform {
 public:
  explicit Transform(std::unique_ptr<Chain> chain);
  ~Transform();
  Transform(const Transform&) = delete;
  Transform& operator=(const Transform&) = delete;

  // Builds the double-precision transform used for single colours.
  DWORD Init();

  const Chain& chain() const { return *chain_; }
  cmsHTRANSFORM colors() const { return colors_; }
  // An 8-bit image transform for these formats, made once and shared by threads.
  cmsHTRANSFORM Bitmap(cmsUInt32Number in_format, cmsUInt32Number out_format, DWORD& error);
  // The 8-bit image kernels' tables for this chain, made on first use; null when none
  // fit (the Little CMS image transforms then do the work).
  const kernels::FastPath* FastPath();
  // The gamut checker of the last profile, made on first use.
  const GamutCheck* Gamut(DWORD& error);
  // The chain without its last profile, on to Lab (double), made on first use.
  cmsHTRANSFORM ToLastLab(DWORD& error);

 private:
  std::unique_ptr<Chain> chain_;
  cmsHTRANSFORM colors_ = nullptr;
  std::mutex mutex_;  // guards what is made on first use
  std::map<std::pair<cmsUInt32Number, cmsUInt32Number>, cmsHTRANSFORM> bitmaps_;
  std::unique_ptr<GamutCheck> gamut_;
  std::unique_ptr<kernels::FastPath> fast_;
  bool fast_made_ = false;
  bool gamut_made_ = false;
  cmsHTRANSFORM to_last_lab_ = nullptr;
};

// The transform behind a live handle; sets ERROR_INVALID_HANDLE and returns null otherwise.
std::shared_ptr<Transform> FindTransform(HTRANSFORM handle);

// Whether colours of this type can enter the chain: ERROR_COLORSPACE_MISMATCH when the
// type does not fit, ERROR_INVALID_COLORINDEX for a named index out of range.
DWORD CheckInput(const Chain& chain, COLORTYPE type, const COLOR* colors, DWORD count);

// The double format for the chain's input as the colour codecs and named indexes fill it.
cmsUInt32Number ChainInputFormat(const Chain& chain);

}  // namespace win32::icm

#endif
