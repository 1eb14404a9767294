// Shared by the transform, bitmap and device-link fuzz targets: a reader that draws
// choices from the fuzz input, and small profiles of every class made by Little CMS
// once at start-up, so no run reads a file.
#ifndef TINTWELL_FUZZ_FUZZ_PROFILES_H
#define TINTWELL_FUZZ_FUZZ_PROFILES_H

#include <lcms2.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "icm.h"

namespace fuzz {

using Bytes = std::vector<std::uint8_t>;

constexpr DWORD kSentinel = 0xDEADBEEF;

inline void Check(bool condition) {
  if (!condition) std::abort();
}

// Every call ends with the last error at 0 on success and a real code on failure.
inline void CheckEnding(bool ok) {
  const DWORD code = GetLastError();
  Check(ok ? code == ERROR_SUCCESS : code != ERROR_SUCCESS && code != kSentinel);
}

// Bytes from the front of the input; zeros once it runs out, so every input is a
// complete recipe.
class Input {
 public:
  Input(const std::uint8_t* data, std::size_t size) : data_(data), size_(size) {}
  std::uint8_t Byte() { return pos_ < size_ ? data_[pos_++] : 0; }
  std::uint16_t Word() { return static_cast<std::uint16_t>(Byte() | Byte() << 8); }
  std::uint32_t Dword() { return Word() | std::uint32_t{Word()} << 16; }
  // Up to n bytes (fewer when the input ends).
  Bytes Take(std::size_t n) {
    n = std::min(n, size_ - pos_);
    Bytes b(data_ + pos_, data_ + pos_ + n);
    pos_ += n;
    return b;
  }

 private:
  const std::uint8_t* data_;
  std::size_t size_;
  std::size_t pos_ = 0;
};

namespace detail {

inline Bytes Save(cmsHPROFILE p) {
  cmsUInt32Number size = 0;
  Bytes b;
  if (p && cmsSaveProfileToMem(p, nullptr, &size)) {
    b.resize(size);
    cmsSaveProfileToMem(p, b.data(), &size);
  }
  if (p) cmsCloseProfile(p);
  Check(b.size() >= 128);
  return b;
}

// A made-up printer: ink darkens and tints; the reverse table is a rough inverse.
inline cmsInt32Number InkToLab(const cmsUInt16Number in[], cmsUInt16Number out[], void*) {
  const double c = in[0] / 65535.0, m = in[1] / 65535.0, y = in[2] / 65535.0, k = in[3] / 65535.0;
  out[0] = static_cast<cmsUInt16Number>(65535 * (1 - k) * (1 - 0.6 * (c + m + y) / 3));
  out[1] = static_cast<cmsUInt16Number>(32768 + 12000 * (m - c));
  out[2] = static_cast<cmsUInt16Number>(32768 + 12000 * (y - m / 2 - c / 2));
  return TRUE;
}
inline cmsInt32Number LabToInk(const cmsUInt16Number in[], cmsUInt16Number out[], void*) {
  const double dark = 1 - in[0] / 65535.0;
  out[0] = static_cast<cmsUInt16Number>(65535 * std::clamp(dark + (32768 - in[1]) / 40000.0, 0.0, 1.0));
  out[1] = static_cast<cmsUInt16Number>(65535 * std::clamp(dark + (in[1] - 32768) / 40000.0, 0.0, 1.0));
  out[2] = static_cast<cmsUInt16Number>(65535 * std::clamp(dark + (in[2] - 32768) / 40000.0, 0.0, 1.0));
  out[3] = static_cast<cmsUInt16Number>(65535 * std::clamp(dark - 0.5, 0.0, 1.0));
  return TRUE;
}

inline cmsPipeline* Table(int in, int out, int grid, cmsSAMPLER16 sampler) {
  cmsPipeline* pipe = cmsPipelineAlloc(nullptr, in, out);
  cmsStage* clut = cmsStageAllocCLut16bit(nullptr, grid, in, out, nullptr);
  cmsStageSampleCLut16bit(clut, sampler, nullptr, 0);
  cmsPipelineInsertStage(pipe, cmsAT_END, clut);
  return pipe;
}

inline Bytes Printer() {
  cmsHPROFILE p = cmsCreateProfilePlaceholder(nullptr);
  cmsSetProfileVersion(p, 2.1);
  cmsSetDeviceClass(p, cmsSigOutputClass);
  cmsSetColorSpace(p, cmsSigCmykData);
  cmsSetPCS(p, cmsSigLabData);
  cmsWriteTag(p, cmsSigMediaWhitePointTag, cmsD50_XYZ());
  cmsPipeline* a2b = Table(4, 3, 3, InkToLab);
  cmsPipeline* b2a = Table(3, 4, 5, LabToInk);
  cmsWriteTag(p, cmsSigAToB0Tag, a2b);
  cmsWriteTag(p, cmsSigBToA0Tag, b2a);
  cmsPipelineFree(a2b);
  cmsPipelineFree(b2a);
  return Save(p);
}

inline Bytes Named() {
  cmsHPROFILE p = cmsCreateProfilePlaceholder(nullptr);
  cmsSetProfileVersion(p, 2.1);
  cmsSetDeviceClass(p, cmsSigNamedColorClass);
  cmsSetColorSpace(p, cmsSigRgbData);
  cmsSetPCS(p, cmsSigLabData);
  cmsNAMEDCOLORLIST* list = cmsAllocNamedColorList(nullptr, 4, 3, "tw ", "");
  const cmsUInt16Number entries[4][3] = {
      {0xFF00, 0x8000, 0x8000}, {0x8000, 0xC000, 0x9000}, {0x4000, 0x6000, 0x3000}, {0, 0x8000, 0x8000}};
  const char* names[4] = {"white", "red", "blue", "black"};
  for (int i = 0; i < 4; ++i) {
    cmsUInt16Number pcs[3] = {entries[i][0], entries[i][1], entries[i][2]};
    cmsUInt16Number device[cmsMAXCHANNELS] = {};
    cmsAppendNamedColor(list, names[i], pcs, device);
  }
  cmsWriteTag(p, cmsSigNamedColor2Tag, list);
  cmsFreeNamedColorList(list);
  return Save(p);
}

inline Bytes CurveLink(cmsColorSpaceSignature space, int channels, double gamma) {
  cmsToneCurve* curve = cmsBuildGamma(nullptr, gamma);
  std::vector<cmsToneCurve*> curves(channels, curve);
  cmsHPROFILE p = cmsCreateLinearizationDeviceLink(space, curves.data());
  cmsFreeToneCurve(curve);
  return Save(p);
}

inline std::vector<Bytes> MakeProfiles() {
  std::vector<Bytes> out;
  out.push_back(Save(cmsCreate_sRGBProfile()));
  {
    const cmsCIExyYTRIPLE wide = {{0.7347, 0.2653, 1}, {0.1152, 0.8264, 1}, {0.1566, 0.0177, 1}};
    cmsToneCurve* gamma = cmsBuildGamma(nullptr, 1.8);
    cmsToneCurve* curves[3] = {gamma, gamma, gamma};
    cmsHPROFILE p = cmsCreateRGBProfile(cmsD50_xyY(), &wide, curves);
    cmsSetProfileVersion(p, 2.1);
    cmsFreeToneCurve(gamma);
    out.push_back(Save(p));
  }
  out.push_back(Save(cmsCreateLab4Profile(nullptr)));
  out.push_back(Save(cmsCreateLab2Profile(nullptr)));
  out.push_back(Save(cmsCreateXYZProfile()));
  {
    cmsToneCurve* gamma = cmsBuildGamma(nullptr, 2.2);
    out.push_back(Save(cmsCreateGrayProfile(cmsD50_xyY(), gamma)));
    cmsFreeToneCurve(gamma);
  }
  out.push_back(Printer());
  out.push_back(Save(cmsCreateInkLimitingDeviceLink(cmsSigCmykData, 250)));
  out.push_back(Save(cmsCreateBCHSWabstractProfile(5, 10, 1.2, 30, 0.8, 5000, 6500)));
  out.push_back(Named());
  out.push_back(CurveLink(cmsSigMCH5Data, 5, 2.0));
  out.push_back(CurveLink(cmsSigRgbData, 3, 0.7));
  return out;
}

}  // namespace detail

// sRGB, a wide-gamut v2 RGB, Lab v4 and v2, XYZ, gray, a CMYK printer with tables,
// CMYK and RGB and 5-channel device links, an abstract Lab profile, a named list.
inline const std::vector<Bytes>& BuiltinProfiles() {
  static const std::vector<Bytes> profiles = detail::MakeProfiles();
  return profiles;
}

// One profile from the input. A choice byte: bits 0-3 pick a built-in profile, bits
// 4-5 how many 4-byte patches (offset word, big-endian value) land on it; with bits 6
// and 7 both set, raw bytes of the length that a word gives instead.
inline Bytes ReadProfile(Input& in) {
  const std::uint8_t choice = in.Byte();
  if ((choice & 0xC0) == 0xC0) return in.Take(in.Word() % 8192);
  const std::vector<Bytes>& builtin = BuiltinProfiles();
  Bytes b = builtin[(choice & 0x0F) % builtin.size()];
  for (int n = (choice >> 4) & 3; n > 0; --n) {
    const std::size_t at = in.Word() % (b.size() - 3);
    const std::uint32_t v = in.Dword();
    for (int i = 0; i < 4; ++i) b[at + i] = static_cast<std::uint8_t>(v >> (24 - 8 * i));
  }
  return b;
}

// Opens bytes read-only; null when the container refuses them.
inline HPROFILE OpenBytes(Bytes& bytes) {
  PROFILE p{PROFILE_MEMBUFFER, bytes.data(), static_cast<DWORD>(bytes.size())};
  return OpenColorProfileA(&p, PROFILE_READ, 0, OPEN_EXISTING);
}

// Up to four profiles from the input, opened; those the container refuses are left out.
class Profiles {
 public:
  explicit Profiles(Input& in) {
    const int count = 1 + in.Byte() % 4;
    for (int i = 0; i < count; ++i) {
      bytes_.push_back(ReadProfile(in));
      if (HPROFILE h = OpenBytes(bytes_.back())) handles_.push_back(h);
    }
  }
  ~Profiles() {
    for (HPROFILE h : handles_) CloseColorProfile(h);
  }
  Profiles(const Profiles&) = delete;
  Profiles& operator=(const Profiles&) = delete;
  std::vector<HPROFILE>& handles() { return handles_; }

 private:
  std::vector<Bytes> bytes_;
  std::vector<HPROFILE> handles_;
};

// One intent per profile or one for all, from 0 to 3; a byte from 0xF0 up is passed
// as it is (and refused).
inline std::vector<DWORD> ReadIntents(Input& in, std::size_t profiles) {
  const std::uint8_t head = in.Byte();
  std::vector<DWORD> intents((head & 1) ? 1 : profiles);
  for (DWORD& i : intents) {
    const std::uint8_t b = in.Byte();
    i = b >= 0xF0 ? b : b & 3;
  }
  return intents;
}

}  // namespace fuzz

#endif
