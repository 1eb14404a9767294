// Little CMS as the independent reference: the tags it finds in a profile file, and the
// colours its transforms give.
#ifndef TINTWELL_TESTS_LCMS_REFERENCE_H
#define TINTWELL_TESTS_LCMS_REFERENCE_H

#include <lcms2.h>

#include <cstdint>
#include <string>
#include <vector>

inline cmsTagSignature TagSig(const std::string& s) {
  uint32_t v = 0;
  for (std::size_t i = 0; i < 4; ++i) v = v << 8 | (i < s.size() ? static_cast<uint8_t>(s[i]) : 0u);
  return static_cast<cmsTagSignature>(v);
}

inline std::vector<uint8_t> RawTag(cmsHPROFILE h, const std::string& sig) {
  std::vector<uint8_t> b(h ? cmsReadRawTag(h, TagSig(sig), nullptr, 0) : 0);
  if (!b.empty()) cmsReadRawTag(h, TagSig(sig), b.data(), static_cast<cmsUInt32Number>(b.size()));
  return b;
}

// A profile file opened by Little CMS for as long as the object lives.
struct LcmsFile {
  explicit LcmsFile(const std::string& path) : h(cmsOpenProfileFromFile(path.c_str(), "r")) {}
  ~LcmsFile() {
    if (h) cmsCloseProfile(h);
  }
  LcmsFile(const LcmsFile&) = delete;
  LcmsFile& operator=(const LcmsFile&) = delete;
  std::vector<uint8_t> Raw(const std::string& sig) const { return RawTag(h, sig); }
  std::string RawText(const std::string& sig) const {
    const std::vector<uint8_t> b = Raw(sig);
    return std::string(b.begin(), b.end());
  }
  const void* Read(cmsTagSignature sig) const { return cmsReadTag(h, sig); }
  cmsHPROFILE h;
};

// A transform through profiles (absolute paths, or paths in the system's colour folder),
// without a cache, each with its header's intent unless given.
class LcmsChain {
 public:
  LcmsChain(const std::vector<std::string>& files, cmsUInt32Number in, cmsUInt32Number out,
            std::vector<cmsUInt32Number> given = {}) {
    std::vector<cmsHPROFILE> profiles;
    std::vector<cmsUInt32Number> intents;
    for (const std::string& f : files) {
      profiles.push_back(cmsOpenProfileFromFile((f[0] == '/' ? f : TINTWELL_ICC_DIR "/" + f).c_str(), "r"));
      intents.push_back(given.empty() ? cmsGetHeaderRenderingIntent(profiles.back()) : given[intents.size()]);
    }
    std::vector<cmsBool> bpc(files.size(), FALSE);
    std::vector<cmsFloat64Number> adaptation(files.size(), 1.0);
    transform_ = cmsCreateExtendedTransform(nullptr, cmsUInt32Number(profiles.size()), profiles.data(), bpc.data(),
                                            intents.data(), adaptation.data(), nullptr, 0, in, out, cmsFLAGS_NOCACHE);
    for (cmsHPROFILE p : profiles) cmsCloseProfile(p);
  }
  ~LcmsChain() {
    if (transform_) cmsDeleteTransform(transform_);
  }
  LcmsChain(const LcmsChain&) = delete;
  LcmsChain& operator=(const LcmsChain&) = delete;
  bool ok() const { return transform_ != nullptr; }
  void Run(const void* in, void* out) const { cmsDoTransform(transform_, in, out, 1); }

 private:
  cmsHTRANSFORM transform_ = nullptr;
};

#endif
