// The 8-bit image kernels on 4096 x 4096 pixels of noise against Little CMS's
// cmsDoTransform on the same buffer, in the same run: sRGB -> Adobe-compatible RGB
// (matrix-shaper), sRGB -> default_cmyk.icc and default_cmyk.icc -> sRGB (sampled).
// Kernels run on one thread and on every core; a memcpy of the input buffer is the
// limit; BM_BuildFastPath times making the tables. BM_ThreadStartJoin against the
// per-pixel time shows where a second thread pays; small square images on one and two
// threads check it. Report ratios of items per second.
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <cstring>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "icm.h"
#include "icm/bitmap.h"
#include "icm/kernels/fast_path.h"
#include "icm/transform.h"
#include "win32_paths.h"

namespace {

constexpr DWORD kSide = 4096;
const std::string kIccDir = std::string(TINTWELL_ICC_DIR) + "/";

struct Chain {
  const char* from;
  const char* to;
  BMFORMAT in, out;
  cmsUInt32Number lcms_in, lcms_out;
  unsigned in_bytes, out_bytes;
};

const Chain kChains[] = {
    {"sRGB.icc", "compatibleWithAdobeRGB1998.icc", BM_RGBTRIPLETS, BM_RGBTRIPLETS, TYPE_BGR_8, TYPE_BGR_8, 3, 3},
    {"sRGB.icc", "ghostscript/default_cmyk.icc", BM_RGBTRIPLETS, BM_KYMCQUADS, TYPE_BGR_8, TYPE_CMYK_8, 3, 4},
    {"ghostscript/default_cmyk.icc", "sRGB.icc", BM_KYMCQUADS, BM_RGBTRIPLETS, TYPE_CMYK_8, TYPE_BGR_8, 4, 3},
};

const std::vector<BYTE>& Noise() {
  static const std::vector<BYTE> v = [] {
    std::vector<BYTE> n(size_t{kSide} * kSide * 4);
    std::mt19937 rng(42);
    for (BYTE& b : n) b = static_cast<BYTE>(rng());
    return n;
  }();
  return v;
}

HPROFILE Open(const std::string& name) {
  const std::string path = win32::WindowsPathFromPosix(kIccDir + name);
  PROFILE p{PROFILE_FILENAME, const_cast<char*>(path.c_str()), static_cast<DWORD>(path.size())};
  return OpenColorProfileA(&p, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
}

HTRANSFORM Make(const Chain& c) {
  HPROFILE p[2] = {Open(c.from), Open(c.to)};
  DWORD intents[2] = {INTENT_RELATIVE_COLORIMETRIC, INTENT_RELATIVE_COLORIMETRIC};
  HTRANSFORM x = CreateMultiProfileTransform(p, 2, intents, 2, BEST_MODE, INDEX_DONT_CARE);
  CloseColorProfile(p[0]);
  CloseColorProfile(p[1]);
  return x;
}

// range(0): chain; range(1): worker threads; range(2): instruction set (0 scalar,
// 1 SSE2, 2 AVX2), or the best the CPU has when absent.
void BM_Kernel(benchmark::State& state) {
  const Chain& c = kChains[state.range(0)];
  HTRANSFORM x = Make(c);
  win32::icm::SetBitmapThreadLimit(static_cast<unsigned>(state.range(1)));
  const auto isa = static_cast<win32::icm::kernels::Isa>(state.range(2));
  if (!win32::icm::kernels::IsaAvailable(isa)) state.SkipWithError("instruction set not available");
  win32::icm::kernels::ForceIsa(isa);
  std::vector<BYTE> dst(size_t{kSide} * kSide * c.out_bytes);
  BYTE* src = const_cast<BYTE*>(Noise().data());
  TranslateBitmapBits(x, src, c.in, kSide, kSide, 0, dst.data(), c.out, 0, nullptr, 0);  // tables made here
  for (auto _ : state) {
    if (!TranslateBitmapBits(x, src, c.in, kSide, kSide, 0, dst.data(), c.out, 0, nullptr, 0)) {
      state.SkipWithError("TranslateBitmapBits failed");
    }
    benchmark::DoNotOptimize(dst.data());
  }
  win32::icm::SetBitmapThreadLimit(0);
  win32::icm::kernels::ForceIsa(win32::icm::kernels::Isa::Avx2);
  DeleteColorTransform(x);
  state.SetItemsProcessed(state.iterations() * int64_t{kSide} * kSide);
  state.SetLabel(std::string(c.from) + " -> " + c.to);
}

void BM_LittleCms(benchmark::State& state) {
  const Chain& c = kChains[state.range(0)];
  cmsHPROFILE p[2] = {cmsOpenProfileFromFile((kIccDir + c.from).c_str(), "r"),
                      cmsOpenProfileFromFile((kIccDir + c.to).c_str(), "r")};
  cmsHTRANSFORM x = cmsCreateTransform(p[0], c.lcms_in, p[1], c.lcms_out, INTENT_RELATIVE_COLORIMETRIC, 0);
  std::vector<BYTE> dst(size_t{kSide} * kSide * c.out_bytes);
  const BYTE* src = Noise().data();  // made before the timing starts
  for (auto _ : state) {
    cmsDoTransform(x, src, dst.data(), kSide * kSide);
    benchmark::DoNotOptimize(dst.data());
  }
  cmsDeleteTransform(x);
  cmsCloseProfile(p[0]);
  cmsCloseProfile(p[1]);
  state.SetItemsProcessed(state.iterations() * int64_t{kSide} * kSide);
  state.SetLabel(std::string(c.from) + " -> " + c.to);
}

void BM_Memcpy(benchmark::State& state) {
  std::vector<BYTE> dst(size_t{kSide} * kSide * 3);
  for (auto _ : state) {
    std::memcpy(dst.data(), Noise().data(), dst.size());
    benchmark::DoNotOptimize(dst.data());
  }
  state.SetItemsProcessed(state.iterations() * int64_t{kSide} * kSide);
}

void BM_BuildFastPath(benchmark::State& state) {
  const Chain& c = kChains[state.range(0)];
  HTRANSFORM x = Make(c);
  auto t = win32::icm::FindTransform(x);
  for (auto _ : state) benchmark::DoNotOptimize(win32::icm::kernels::Build(t->chain(), t->colors()));
  DeleteColorTransform(x);
  state.SetLabel(std::string(c.from) + " -> " + c.to);
}

// range(0): side of a square sRGB -> Adobe RGB image; range(1): worker threads.
void BM_SmallImage(benchmark::State& state) {
  const DWORD side = static_cast<DWORD>(state.range(0));
  HTRANSFORM x = Make(kChains[0]);
  std::vector<BYTE> dst(size_t{side} * side * 3);
  BYTE* src = const_cast<BYTE*>(Noise().data());
  win32::icm::SetBitmapThreadLimit(static_cast<unsigned>(state.range(1)));
  const DWORD stride = side * 3;  // packed rows, as the buffers are sized
  TranslateBitmapBits(x, src, BM_RGBTRIPLETS, side, side, stride, dst.data(), BM_RGBTRIPLETS, stride, nullptr, 0);
  for (auto _ : state) {
    TranslateBitmapBits(x, src, BM_RGBTRIPLETS, side, side, stride, dst.data(), BM_RGBTRIPLETS, stride, nullptr, 0);
    benchmark::DoNotOptimize(dst.data());
  }
  win32::icm::SetBitmapThreadLimit(0);
  DeleteColorTransform(x);
  state.SetItemsProcessed(state.iterations() * int64_t{side} * side);
}

// What a second worker costs: starting and joining one thread that does nothing.
void BM_ThreadStartJoin(benchmark::State& state) {
  for (auto _ : state) std::thread([] {}).join();
}

}  // namespace

BENCHMARK(BM_ThreadStartJoin)->Unit(benchmark::kMicrosecond)->UseRealTime();
BENCHMARK(BM_LittleCms)->DenseRange(0, 2)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_Kernel)->ArgsProduct({{0, 1, 2}, {1, 2}, {2}})->ArgsProduct({{0, 1, 2}, {1}, {0, 1}})->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_Memcpy)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_BuildFastPath)->DenseRange(0, 2)->Unit(benchmark::kMillisecond)->UseRealTime();
BENCHMARK(BM_SmallImage)->ArgsProduct({{128, 256, 362, 512}, {1, 2}})->Unit(benchmark::kMicrosecond)->UseRealTime();

BENCHMARK_MAIN();
