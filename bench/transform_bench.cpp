// TranslateBitmapBits on a 4096 x 4096 B,G,R image against cmsDoTransform on the same
// pixels with the same profiles and intents, in the same run. The image is smooth
// gradients plus noise, like a photograph. Report ratios of the items-per-second
// figures (real time).
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <cmath>
#include <random>
#include <string>
#include <vector>

#include "icm.h"
#include "icm/bitmap.h"
#include "win32_paths.h"

namespace {

constexpr DWORD kSide = 4096;
const std::string kIccDir = std::string(TINTWELL_ICC_DIR) + "/";

const std::vector<BYTE>& Image() {
  static const std::vector<BYTE> image = [] {
    std::vector<BYTE> v(size_t{kSide} * kSide * 3);
    std::mt19937 rng(42);
    std::normal_distribution<double> noise(0.0, 6.0);
    for (DWORD y = 0; y < kSide; ++y) {
      for (DWORD x = 0; x < kSide; ++x) {
        const double u = double(x) / kSide, w = double(y) / kSide;
        const double base[3] = {255 * u, 255 * (0.5 + 0.5 * std::sin(6.283 * (u + w))), 255 * w};
        for (int c = 0; c < 3; ++c) {
          const double value = base[c] + noise(rng);
          v[(size_t{y} * kSide + x) * 3 + c] = static_cast<BYTE>(value < 0 ? 0 : value > 255 ? 255 : value);
        }
      }
    }
    return v;
  }();
  return image;
}

struct Target {
  const char* file;
  BMFORMAT format;
  cmsUInt32Number lcms_format;
  unsigned bytes;
};

const Target kTargets[] = {
    {"compatibleWithAdobeRGB1998.icc", BM_RGBTRIPLETS, TYPE_BGR_8, 3},
    {"ghostscript/default_cmyk.icc", BM_KYMCQUADS, TYPE_CMYK_8, 4},
};

HPROFILE Open(const std::string& name) {
  const std::string path = win32::WindowsPathFromPosix(kIccDir + name);
  PROFILE p{PROFILE_FILENAME, const_cast<char*>(path.c_str()), static_cast<DWORD>(path.size())};
  return OpenColorProfileA(&p, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
}

// range(0): target; range(1): worker threads (0 = one per core).
void BM_TranslateBitmapBits(benchmark::State& state) {
  const Target& t = kTargets[state.range(0)];
  win32::icm::SetBitmapThreadLimit(static_cast<unsigned>(state.range(1)));
  HPROFILE chain[2] = {Open("sRGB.icc"), Open(t.file)};
  DWORD intents[2] = {INTENT_PERCEPTUAL, INTENT_PERCEPTUAL};
  HTRANSFORM x = CreateMultiProfileTransform(chain, 2, intents, 2, BEST_MODE, INDEX_DONT_CARE);
  const std::vector<BYTE>& src = Image();
  std::vector<BYTE> dst(size_t{kSide} * kSide * t.bytes);
  for (auto _ : state) {
    if (!TranslateBitmapBits(x, const_cast<BYTE*>(src.data()), BM_RGBTRIPLETS, kSide, kSide, 0, dst.data(),
                             t.format, 0, nullptr, 0)) {
      state.SkipWithError("TranslateBitmapBits failed");
      break;
    }
    benchmark::DoNotOptimize(dst.data());
  }
  state.SetItemsProcessed(int64_t(state.iterations()) * kSide * kSide);
  DeleteColorTransform(x);
  CloseColorProfile(chain[0]);
  CloseColorProfile(chain[1]);
  win32::icm::SetBitmapThreadLimit(0);
}

void BM_LcmsDoTransform(benchmark::State& state) {
  const Target& t = kTargets[state.range(0)];
  cmsHPROFILE in = cmsOpenProfileFromFile((kIccDir + "sRGB.icc").c_str(), "r");
  cmsHPROFILE out = cmsOpenProfileFromFile((kIccDir + t.file).c_str(), "r");
  cmsHTRANSFORM x = cmsCreateTransform(in, TYPE_BGR_8, out, t.lcms_format, INTENT_PERCEPTUAL, 0);
  const std::vector<BYTE>& src = Image();
  std::vector<BYTE> dst(size_t{kSide} * kSide * t.bytes);
  for (auto _ : state) {
    cmsDoTransform(x, src.data(), dst.data(), kSide * kSide);
    benchmark::DoNotOptimize(dst.data());
  }
  state.SetItemsProcessed(int64_t(state.iterations()) * kSide * kSide);
  cmsDeleteTransform(x);
  cmsCloseProfile(in);
  cmsCloseProfile(out);
}

// Args: {target, threads}. Target 0 = Adobe RGB, 1 = CMYK printer.
BENCHMARK(BM_LcmsDoTransform)->Arg(0)->Arg(1)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_TranslateBitmapBits)
    ->Args({0, 1})
    ->Args({0, 0})
    ->Args({1, 1})
    ->Args({1, 0})
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

}  // namespace

BENCHMARK_MAIN();
