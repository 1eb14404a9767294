// Accuracy of the 8-bit image kernels behind TranslateBitmapBits, against Little CMS
// evaluating the same chain in double precision: every RGB input (a strided sample in
// the sanitizer build), 2^21 random CMYK inputs, all 256 gray levels, through every
// 8-bit layout. Matrix-shaper chains must stay within one level everywhere; sampled
// chains within one level for 99.9 % of inputs and never beyond two; and no chain may
// do worse than Little CMS's own 8-bit transform on the same inputs.
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdio>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "icm/bitmap.h"
#include "icm/kernels/fast_path.h"
#include "icm/transform.h"
#include "transform_test_util.h"

namespace {

using namespace transform_test;
using win32::icm::kernels::Isa;
using win32::icm::kernels::Kind;

#ifdef TINTWELL_SANITIZED_BUILD
constexpr size_t kRgbStride = 997;  // about 17 000 RGB inputs
constexpr size_t kCmykPoints = 20000;
#else
constexpr size_t kRgbStride = 1;
constexpr size_t kCmykPoints = size_t{1} << 21;
#endif

struct Space {
  unsigned channels;
  std::vector<BMFORMAT> formats;
  std::vector<std::array<int, 4>> order;  // memory offset of each channel, per format
  std::vector<unsigned> bytes;
};

const Space kRgb{3,
                 {BM_RGBTRIPLETS, BM_BGRTRIPLETS, BM_xRGBQUADS, BM_xBGRQUADS},
                 {{2, 1, 0, 0}, {0, 1, 2, 0}, {2, 1, 0, 0}, {0, 1, 2, 0}},
                 {3, 3, 4, 4}};
const Space kCmyk{4, {BM_KYMCQUADS, BM_CMYKQUADS}, {{0, 1, 2, 3}, {3, 2, 1, 0}}, {4, 4}};
const Space kGray{1, {BM_GRAY}, {{0, 0, 0, 0}}, {1}};

const Space& SpaceOf(const std::string& name) {
  if (name.find("cmyk") != std::string::npos) return kCmyk;
  if (name.find("Gray") != std::string::npos) return kGray;
  return kRgb;
}

cmsUInt32Number Lcms8(const Space& s) {
  return s.channels == 1 ? TYPE_GRAY_8 : s.channels == 3 ? TYPE_RGB_8 : TYPE_CMYK_8;
}
cmsUInt32Number LcmsDouble(const Space& s) { return FLOAT_SH(1) | CHANNELS_SH(s.channels) | BYTES_SH(0); }

// The inputs of a sweep, channel by channel in chain order.
std::vector<BYTE> Inputs(const Space& s) {
  std::vector<BYTE> v;
  if (s.channels == 1) {
    for (int i = 0; i < 256; ++i) v.push_back(static_cast<BYTE>(i));
  } else if (s.channels == 3) {
    for (size_t i = 0; i < (size_t{1} << 24); i += kRgbStride) {
      v.insert(v.end(), {static_cast<BYTE>(i >> 16), static_cast<BYTE>(i >> 8), static_cast<BYTE>(i)});
    }
  } else {
    std::mt19937 rng(13);
    v.resize(kCmykPoints * 4);
    for (BYTE& b : v) b = static_cast<BYTE>(rng());
  }
  return v;
}

// Runs `n` inputs through a Little CMS transform on both cores.
template <typename In, typename Out>
void LcmsRun(cmsHTRANSFORM x, const In* in, std::vector<Out>& out, size_t n, unsigned in_n, unsigned out_n) {
  out.resize(n * out_n);
  const size_t half = n / 2;
  std::thread other([&] { cmsDoTransform(x, in + half * in_n, out.data() + half * out_n, n - half); });
  cmsDoTransform(x, in, out.data(), half);
  other.join();
}

struct Errors {
  size_t exact = 0, within1 = 0, total = 0;
  int max = 0;
  void Add(int got, double truth) {
    const int e = std::abs(got - static_cast<int>(std::lround(std::clamp(truth, 0.0, 1.0) * 255)));
    exact += e == 0;
    within1 += e <= 1;
    max = std::max(max, e);
    ++total;
  }
};

// A chain, the kernel expected to take it, and its bounds: the largest error in levels
// and the share of outputs within one level.
struct Case {
  std::vector<std::string> names;
  Kind kind;
  int max = 1;
  double within1 = 1.0;
};

class KernelAccuracy : public ::testing::TestWithParam<Case> {
 protected:
  void TearDown() override { win32::icm::SetBitmapThreadLimit(0); }
};

TEST_P(KernelAccuracy, AgainstDoublePrecision) {
  const Case& c = GetParam();
  const Space& from = SpaceOf(c.names.front());
  const Space& to = SpaceOf(c.names.back());
  std::vector<std::unique_ptr<Profile>> profiles;
  std::vector<HPROFILE> handles;
  for (const std::string& n : c.names) {
    profiles.push_back(std::make_unique<Profile>(n));
    ASSERT_NE(profiles.back()->get(), nullptr) << n;
    handles.push_back(profiles.back()->get());
  }
  const std::vector<DWORD> intents(c.names.size(), kRel);
  Xform x(handles, intents);
  ASSERT_NE(x.get(), nullptr);
  const auto* fast = win32::icm::FindTransform(x.get())->FastPath();
  ASSERT_NE(fast, nullptr);
  EXPECT_EQ(fast->kind, c.kind);

  const std::vector<BYTE> all = Inputs(from);
  const std::vector<cmsUInt32Number> lcms_intents(c.names.size(), kRel);
  LcmsChain exact(c.names, lcms_intents, LcmsDouble(from), LcmsDouble(to));
  LcmsChain fast8(c.names, lcms_intents, Lcms8(from), Lcms8(to));
  // Each input layout once, each output layout at least once.
  const size_t runs = std::max(from.formats.size(), to.formats.size());
  Errors lcms;
  std::vector<Errors> ours(runs);
  constexpr size_t kChunk = size_t{1} << 20;
  std::vector<double> unit, truth;
  std::vector<BYTE> lcms8, src, dst;
  for (size_t at = 0; at < all.size(); at += kChunk * from.channels) {
    const BYTE* in = &all[at];
    const size_t n = std::min(kChunk, (all.size() - at) / from.channels);
    unit.assign(in, in + n * from.channels);
    for (double& u : unit) u /= 255;
    LcmsRun(exact.get(), unit.data(), truth, n, from.channels, to.channels);
    LcmsRun(fast8.get(), in, lcms8, n, from.channels, to.channels);
    for (size_t i = 0; i < lcms8.size(); ++i) lcms.Add(lcms8[i], truth[i]);

    for (size_t r = 0; r < runs; ++r) {
      const size_t fi = r % from.formats.size(), fo = r % to.formats.size();
      const unsigned ib = from.bytes[fi], ob = to.bytes[fo];
      src.assign(n * ib, 0x77);
      dst.assign(n * ob, 0xEE);
      for (size_t i = 0; i < n; ++i) {
        for (unsigned k = 0; k < from.channels; ++k) src[i * ib + from.order[fi][k]] = in[i * from.channels + k];
      }
      // Rows of up to 4096 pixels, so the image is split over both cores.
      const DWORD width = static_cast<DWORD>(std::min<size_t>(n, 4096));
      const DWORD height = static_cast<DWORD>(n / width);
      ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), from.formats[fi], width, height, width * ib, dst.data(),
                                      to.formats[fo], width * ob, nullptr, 0));
      const size_t rest = n - size_t{width} * height;  // the inputs past the last whole row
      if (rest) {
        ASSERT_TRUE(TranslateBitmapBits(x.get(), &src[size_t{width} * height * ib], from.formats[fi],
                                        static_cast<DWORD>(rest), 1, 0, &dst[size_t{width} * height * ob],
                                        to.formats[fo], 0, nullptr, 0));
      }
      for (size_t i = 0; i < n; ++i) {
        for (unsigned k = 0; k < to.channels; ++k) {
          ours[r].Add(dst[i * ob + to.order[fo][k]], truth[i * to.channels + k]);
        }
      }
    }
  }
  for (size_t r = 0; r < runs; ++r) {
    const Errors& e = ours[r];
    SCOPED_TRACE(testing::Message() << "layouts " << from.formats[r % from.formats.size()] << " -> "
                                    << to.formats[r % to.formats.size()]);
    std::printf("[ kernel   ] %s -> %s%s: exact %.3f %% (Little CMS 8-bit %.3f %%), within 1: %.4f %% (%.4f %%), "
                "max %d (%d); built in %.1f ms\n",
                c.names.front().c_str(), c.names.back().c_str(), c.names.size() > 2 ? " via Lab" : "",
                100.0 * e.exact / e.total, 100.0 * lcms.exact / lcms.total, 100.0 * e.within1 / e.total,
                100.0 * lcms.within1 / lcms.total, e.max, lcms.max, fast->build_ms);
    EXPECT_LE(e.max, c.max);
    EXPECT_GE(static_cast<double>(e.within1) / e.total, c.within1);
    EXPECT_GE(e.exact, lcms.exact);  // never fewer exact outputs than Little CMS's 8-bit path
    EXPECT_LE(e.max, std::max(lcms.max, 1));  // and no further off than it
    EXPECT_GE(e.within1, lcms.within1);
  }
}

std::string CaseName(const testing::TestParamInfo<Case>& info) {
  std::string s;
  for (const std::string& n : info.param.names) {
    std::string base = n.substr(n.find_last_of('/') + 1);
    base = base.substr(0, base.find('.'));
    for (char& ch : base) {
      if (!std::isalnum(static_cast<unsigned char>(ch))) ch = '_';
    }
    s += (s.empty() ? "" : "_to_") + base;
  }
  return s;
}

const char* const kSrgb = "sRGB.icc";
const char* const kAdobe = "compatibleWithAdobeRGB1998.icc";
const char* const kWide = "colord/ProPhotoRGB.icc";
const char* const kCmykName = "ghostscript/default_cmyk.icc";
const char* const kGrayName = "Gray.icc";
const char* const kLab = "LCMSLABI.ICM";
const char* const kPrinter = "ghostscript/ps_cmyk.icc";

std::vector<Case> Cases() {
  const char* all[] = {kSrgb, kAdobe, kWide, kCmykName, kGrayName};
  std::vector<Case> cases;
  for (const char* a : all) {
    for (const char* b : all) {
      if (a == b) continue;
      const Space& sa = SpaceOf(a);
      const Space& sb = SpaceOf(b);
      const Kind k = sa.channels == 1   ? Kind::Table1
                     : sa.channels == 4 ? Kind::ShapedClut4
                     : sb.channels == 4 ? Kind::Staged
                                        : Kind::Matrix;
      cases.push_back({{a, b}, k});
    }
  }
  // Through the Lab identity: no longer a matrix-shaper pair.
  cases.push_back({{kSrgb, kLab, kAdobe}, Kind::ShapedClut3});
  cases.push_back({{kSrgb, kLab, kCmykName}, Kind::Staged});
  cases.push_back({{kCmykName, kLab, kSrgb}, Kind::ShapedClut4});
  cases.push_back({{kCmykName, kPrinter}, Kind::Clut4});
  // Every sampled chain meets two levels and 99.9 % within one, except CMYK into an
  // XYZ-indexed printer table whose coarse grid bends faster than ours follows (a bound
  // a little below the full sweep's figures, which the sanitizer build's sample must
  // also meet; Little CMS's own 8-bit path is as far off).
  const struct {
    const char* from;
    const char* to;
    int max;
    double within1;
  } measured[] = {
      {kCmykName, kPrinter, 9, 0.994},
  };
  for (Case& c : cases) {
    if (c.kind != Kind::Table1 && c.kind != Kind::Matrix) c.max = 2, c.within1 = 0.999;
    for (const auto& m : measured) {
      if (c.names.front() == m.from && c.names.back() == m.to) c.max = m.max, c.within1 = m.within1;
    }
  }
  return cases;
}

INSTANTIATE_TEST_SUITE_P(Chains, KernelAccuracy, testing::ValuesIn(Cases()), CaseName);

std::vector<BYTE> Noise(size_t n, unsigned seed) {
  std::mt19937 rng(seed);
  std::vector<BYTE> v(n);
  for (BYTE& b : v) b = static_cast<BYTE>(rng());
  return v;
}

// Every instruction set gives the scalar kernel's bytes, for every kernel and layout
// pair, at widths that leave every possible tail after the eight-pixel blocks and
// cross the staged kernel's 64-pixel blocks, with x bytes copied or zeroed the same way.
TEST(KernelIsas, AgreeByteForByte) {
  const std::vector<std::vector<std::string>> chains = {
      {kSrgb, kAdobe},    {kSrgb, kGrayName}, {kSrgb, kCmykName}, {kCmykName, kSrgb},
      {kGrayName, kSrgb}, {kSrgb, kLab, kAdobe}, {kCmykName, kPrinter}};
  for (const auto& names : chains) {
    std::vector<std::unique_ptr<Profile>> profiles;
    std::vector<HPROFILE> handles;
    for (const std::string& n : names) {
      profiles.push_back(std::make_unique<Profile>(n));
      handles.push_back(profiles.back()->get());
    }
    Xform x(handles, std::vector<DWORD>(names.size(), kRel));
    const Space& from = SpaceOf(names.front());
    const Space& to = SpaceOf(names.back());
    for (size_t fi = 0; fi < from.formats.size(); ++fi) {
      for (size_t fo = 0; fo < to.formats.size(); ++fo) {
        for (DWORD w : {1, 4, 7, 10, 13, 16, 19, 63, 64, 65, 70, 130}) {
          SCOPED_TRACE(testing::Message() << names[0] << " " << from.formats[fi] << " -> " << to.formats[fo]
                                          << " width " << w);
          const DWORD h = 3;
          std::vector<BYTE> src = Noise(w * 4 * h + 8, w);
          std::vector<BYTE> want;
          for (Isa isa : {Isa::Scalar, Isa::Sse2, Isa::Avx2}) {
            if (!win32::icm::kernels::IsaAvailable(isa)) continue;
            win32::icm::kernels::ForceIsa(isa);
            std::vector<BYTE> dst(w * 4 * h + 8, 0xEE);
            const bool ok = TranslateBitmapBits(x.get(), src.data(), from.formats[fi], w, h, 0, dst.data(),
                                                to.formats[fo], 0, nullptr, 0);
            win32::icm::kernels::ForceIsa(Isa::Avx2);
            ASSERT_TRUE(ok);
            if (want.empty()) {
              want = dst;
            } else {
              EXPECT_EQ(dst, want) << "instruction set " << static_cast<int>(isa);
            }
          }
        }
      }
    }
  }
}

// A v2 printer profile holding default_cmyk.icc's tables rewritten as 16-bit (mft2)
// tables, which Little CMS reads with the v2 Lab encoding in front.
std::vector<BYTE> Lut16Printer() {
  cmsHPROFILE from = cmsOpenProfileFromFile(IccPath(kCmykName).c_str(), "r");
  cmsHPROFILE p = cmsCreateProfilePlaceholder(nullptr);
  cmsSetProfileVersion(p, 2.1);
  cmsSetDeviceClass(p, cmsSigOutputClass);
  cmsSetColorSpace(p, cmsSigCmykData);
  cmsSetPCS(p, cmsSigLabData);
  for (cmsTagSignature t : {cmsSigAToB0Tag, cmsSigAToB1Tag, cmsSigBToA0Tag, cmsSigBToA1Tag, cmsSigMediaWhitePointTag}) {
    if (cmsIsTag(from, t)) cmsWriteTag(p, t, cmsReadTag(from, t));
  }
  cmsUInt32Number size = 0;
  cmsSaveProfileToMem(p, nullptr, &size);
  std::vector<BYTE> bytes(size);
  cmsSaveProfileToMem(p, bytes.data(), &size);
  cmsCloseProfile(p);
  cmsCloseProfile(from);
  return bytes;
}

// The staged path is taken only where its composition reproduces the chain, and is then
// as close as on the full sweep: 2^16 random RGB inputs against Little CMS in double
// precision, per intent and output table form.
TEST(StagedPath, TakenWhereTheTableComposes) {
  const std::vector<BYTE> lut16 = Lut16Printer();
  const struct {
    const char* what;
    const char* to;  // null: the 16-bit table profile
    DWORD intent;
    Kind kind;
  } cases[] = {
      {"relative", kCmykName, kRel, Kind::Staged},
      {"perceptual", kCmykName, INTENT_PERCEPTUAL, Kind::Staged},
      {"saturation", kCmykName, INTENT_SATURATION, Kind::Staged},
      // The white point scaling at the join is not in the composition: refused.
      {"absolute", kCmykName, INTENT_ABSOLUTE_COLORIMETRIC, Kind::Clut3},
      {"16-bit table", nullptr, kRel, Kind::Staged},
      {"XYZ connection", "ghostscript/ps_cmyk.icc", kRel, Kind::Clut3},  // not a Lab-indexed table
  };
  const std::vector<BYTE> in = Noise(size_t{3} << 16, 5);
  const size_t n = in.size() / 3;
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    Profile a(kSrgb);
    std::unique_ptr<Profile> b = c.to ? std::make_unique<Profile>(c.to) : std::make_unique<Profile>(lut16);
    Xform x({a.get(), b->get()}, {c.intent, c.intent});
    ASSERT_NE(x.get(), nullptr);
    const auto* fast = win32::icm::FindTransform(x.get())->FastPath();
    ASSERT_NE(fast, nullptr);
    EXPECT_EQ(fast->kind, c.kind);

    cmsHPROFILE lp[2] = {cmsOpenProfileFromFile(IccPath(kSrgb).c_str(), "r"),
                         c.to ? cmsOpenProfileFromFile(IccPath(c.to).c_str(), "r")
                              : cmsOpenProfileFromMem(lut16.data(), static_cast<cmsUInt32Number>(lut16.size()))};
    cmsBool bpc[2] = {FALSE, FALSE};
    cmsUInt32Number intents[2] = {c.intent, c.intent};
    cmsFloat64Number adaptation[2] = {1.0, 1.0};
    cmsHTRANSFORM exact = cmsCreateExtendedTransform(nullptr, 2, lp, bpc, intents, adaptation, nullptr, 0,
                                                     LcmsDouble(kRgb), LcmsDouble(kCmyk), 0);
    ASSERT_NE(exact, nullptr);
    std::vector<double> unit(n * 3), truth(n * 4);  // BM_RGBTRIPLETS is B, G, R in memory
    for (size_t i = 0; i < n * 3; ++i) unit[i] = in[i / 3 * 3 + 2 - i % 3] / 255.0;
    cmsDoTransform(exact, unit.data(), truth.data(), static_cast<cmsUInt32Number>(n));
    cmsDeleteTransform(exact);
    for (cmsHPROFILE h : lp) cmsCloseProfile(h);

    std::vector<BYTE> dst(n * 4);
    ASSERT_TRUE(TranslateBitmapBits(x.get(), const_cast<BYTE*>(in.data()), BM_RGBTRIPLETS, static_cast<DWORD>(n), 1, 0,
                                    dst.data(), BM_CMYKQUADS, 0, nullptr, 0));
    Errors e;
    for (size_t i = 0; i < n; ++i) {
      for (unsigned k = 0; k < 4; ++k) e.Add(dst[i * 4 + 3 - k], truth[i * 4 + k]);  // K, Y, M, C in memory
    }
    std::printf("[ staged   ] %s: kind %d, exact %.3f %%, within 1: %.4f %%, max %d; built in %.1f ms\n", c.what,
                static_cast<int>(fast->kind), 100.0 * e.exact / e.total, 100.0 * e.within1 / e.total, e.max,
                fast->build_ms);
    if (fast->kind == Kind::Staged) {
      EXPECT_LE(e.max, 2);
      EXPECT_GE(static_cast<double>(e.within1) / e.total, 0.999);
    }
  }
}

// The cube's corners, edges and gray axis through the staged kernel on every
// instruction set: the table's far planes (white, full primaries) and its clipped
// encodings sit on these, and each must round as the chain does, give or take one.
TEST(StagedPath, CubeEdgesFollowTheChain) {
  Profile a(kSrgb), b(kCmykName);
  Xform x({a.get(), b.get()}, {kRel, kRel});
  ASSERT_EQ(win32::icm::FindTransform(x.get())->FastPath()->kind, Kind::Staged);
  std::vector<BYTE> rgb;  // R, G, B
  for (int corner = 0; corner < 8; ++corner) {
    for (int axis = 0; axis < 3; ++axis) {
      for (int step = 0; step <= 16; ++step) {
        int c[3] = {corner >> 2 & 1, corner >> 1 & 1, corner & 1};
        for (int& v : c) v *= 255;
        c[axis] = std::min(step * 16, 255);
        rgb.insert(rgb.end(), {static_cast<BYTE>(c[0]), static_cast<BYTE>(c[1]), static_cast<BYTE>(c[2])});
      }
    }
  }
  for (int v = 0; v < 256; ++v) rgb.insert(rgb.end(), 3, static_cast<BYTE>(v));
  const size_t n = rgb.size() / 3;
  std::vector<double> unit(rgb.begin(), rgb.end()), truth;
  for (double& u : unit) u /= 255;
  LcmsChain exact({kSrgb, kCmykName}, {kRel, kRel}, LcmsDouble(kRgb), LcmsDouble(kCmyk));
  truth.resize(n * 4);
  cmsDoTransform(exact.get(), unit.data(), truth.data(), static_cast<cmsUInt32Number>(n));
  std::vector<BYTE> src(n * 3);  // B, G, R in memory
  for (size_t i = 0; i < n * 3; ++i) src[i] = rgb[i / 3 * 3 + 2 - i % 3];
  for (Isa isa : {Isa::Scalar, Isa::Sse2, Isa::Avx2}) {
    if (!win32::icm::kernels::IsaAvailable(isa)) continue;
    SCOPED_TRACE(testing::Message() << "instruction set " << static_cast<int>(isa));
    win32::icm::kernels::ForceIsa(isa);
    std::vector<BYTE> dst(n * 4);
    const bool ok = TranslateBitmapBits(x.get(), src.data(), BM_RGBTRIPLETS, static_cast<DWORD>(n), 1, 0, dst.data(),
                                        BM_CMYKQUADS, 0, nullptr, 0);
    win32::icm::kernels::ForceIsa(Isa::Avx2);
    ASSERT_TRUE(ok);
    Errors e;
    for (size_t i = 0; i < n; ++i) {
      for (unsigned k = 0; k < 4; ++k) e.Add(dst[i * 4 + 3 - k], truth[i * 4 + k]);
    }
    EXPECT_LE(e.max, 1);
  }
}

// In place, a block of pixels is read before any of it is written: xRGB quads turned
// into CMYK quads over themselves give the bytes of a separate output, at widths around
// the kernels' block sizes.
TEST(StagedPath, InPlaceMatchesSeparateOutput) {
  Profile a(kSrgb), b(kCmykName);
  Xform x({a.get(), b.get()}, {kRel, kRel});
  for (Isa isa : {Isa::Scalar, Isa::Sse2, Isa::Avx2}) {
    if (!win32::icm::kernels::IsaAvailable(isa)) continue;
    win32::icm::kernels::ForceIsa(isa);
    for (DWORD w : {1, 7, 8, 9, 63, 64, 65, 200}) {
      SCOPED_TRACE(testing::Message() << "instruction set " << static_cast<int>(isa) << " width " << w);
      std::vector<BYTE> src = Noise(size_t{w} * 4, w + 100), apart(src.size()), in_place = src;
      ASSERT_TRUE(TranslateBitmapBits(x.get(), src.data(), BM_xRGBQUADS, w, 1, 0, apart.data(), BM_KYMCQUADS, 0,
                                      nullptr, 0));
      ASSERT_TRUE(TranslateBitmapBits(x.get(), in_place.data(), BM_xRGBQUADS, w, 1, 0, in_place.data(), BM_KYMCQUADS,
                                      0, nullptr, 0));
      EXPECT_EQ(in_place, apart);
    }
  }
  win32::icm::kernels::ForceIsa(Isa::Avx2);
}

// Shares cut inside rows: a single row wider than a band (a million pixels) on two
// threads, out of place and in place, gives the bytes of one thread.
TEST(KernelThreads, OneWideRowSplitsAndAgrees) {
  Profile a(kSrgb), b(kAdobe);
  Xform x({a.get(), b.get()}, {kRel, kRel});
  const DWORD w = (DWORD{1} << 20) + 7;
  const std::vector<BYTE> src = Noise(size_t{w} * 4, 21);
  std::vector<BYTE> one(src.size()), two(src.size()), in_place = src;
  win32::icm::SetBitmapThreadLimit(1);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), const_cast<BYTE*>(src.data()), BM_xRGBQUADS, w, 1, 0, one.data(),
                                  BM_xBGRQUADS, 0, nullptr, 0));
  win32::icm::SetBitmapThreadLimit(2);
  ASSERT_TRUE(TranslateBitmapBits(x.get(), const_cast<BYTE*>(src.data()), BM_xRGBQUADS, w, 1, 0, two.data(),
                                  BM_xBGRQUADS, 0, nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(x.get(), in_place.data(), BM_xRGBQUADS, w, 1, 0, in_place.data(), BM_xBGRQUADS, 0,
                                  nullptr, 0));
  // In place onto smaller pixels the row may not be cut: it is one share, wider than a
  // chunk.
  std::vector<BYTE> triplets = src, apart(src.size());
  ASSERT_TRUE(TranslateBitmapBits(x.get(), triplets.data(), BM_xRGBQUADS, w, 1, w * 4, apart.data(), BM_RGBTRIPLETS,
                                  w * 4, nullptr, 0));
  ASSERT_TRUE(TranslateBitmapBits(x.get(), triplets.data(), BM_xRGBQUADS, w, 1, w * 4, triplets.data(),
                                  BM_RGBTRIPLETS, w * 4, nullptr, 0));
  win32::icm::SetBitmapThreadLimit(0);
  EXPECT_TRUE(one == two);
  EXPECT_TRUE(one == in_place);
  EXPECT_TRUE(std::equal(apart.begin(), apart.begin() + size_t{w} * 3, triplets.begin()));
}

}  // namespace
