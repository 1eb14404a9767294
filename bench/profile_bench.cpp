// The profile container's speed: many small element writes (each must stay O(1)), and
// opening a large profile file against Little CMS opening the same file.
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <cstdint>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "icm.h"
#include "win32_paths.h"

namespace {

const std::string kIccDir = TINTWELL_ICC_DIR;
constexpr DWORD kWrites = 100000;
constexpr TAGTYPE kTag = 0x7A7A7A7A;  // 'zzzz'

std::vector<std::uint8_t> ReadAll(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// 100,000 two-byte writes into one 200,000-byte element of a read-write memory profile.
// Items processed count single writes, so the time per item is the time per write.
void BM_SetColorProfileElement_100k(benchmark::State& state) {
  std::vector<std::uint8_t> bytes = ReadAll(kIccDir + "/sRGB.icc");
  PROFILE p{PROFILE_MEMBUFFER, bytes.data(), static_cast<DWORD>(bytes.size())};
  HPROFILE h = OpenColorProfileA(&p, PROFILE_READWRITE, 0, OPEN_EXISTING);
  if (h == nullptr || !SetColorProfileElementSize(h, kTag, 2 * kWrites)) {
    state.SkipWithError("cannot prepare the profile");
    return;
  }
  std::uint8_t piece[2] = {0x12, 0x34};
  for (auto _ : state) {
    for (DWORD i = 0; i < kWrites; ++i) {
      DWORD n = 2;
      SetColorProfileElement(h, kTag, 2 * i, &n, piece);
    }
    benchmark::ClobberMemory();
  }
  state.SetItemsProcessed(state.iterations() * kWrites);
  CloseColorProfile(h);
}
BENCHMARK(BM_SetColorProfileElement_100k)->Unit(benchmark::kMillisecond);

// Open + header read + close of ITULab.icc (431 KB) through this layer ...
void BM_OpenHeaderClose_Layer(benchmark::State& state) {
  const std::string name = win32::WindowsPathFromPosix(kIccDir + "/ITULab.icc");
  PROFILE p{PROFILE_FILENAME, const_cast<char*>(name.c_str()), 0};
  for (auto _ : state) {
    HPROFILE h = OpenColorProfileA(&p, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
    PROFILEHEADER header;
    if (h == nullptr || !GetColorProfileHeader(h, &header)) {
      state.SkipWithError("open failed");
      return;
    }
    benchmark::DoNotOptimize(header.phSize);
    CloseColorProfile(h);
  }
}
BENCHMARK(BM_OpenHeaderClose_Layer)->Unit(benchmark::kMicrosecond);

// ... against Little CMS opening and closing the same file (the baseline of the ratio).
void BM_OpenClose_LittleCms(benchmark::State& state) {
  const std::string path = kIccDir + "/ITULab.icc";
  for (auto _ : state) {
    cmsHPROFILE h = cmsOpenProfileFromFile(path.c_str(), "r");
    if (h == nullptr) {
      state.SkipWithError("open failed");
      return;
    }
    benchmark::DoNotOptimize(cmsGetHeaderRenderingIntent(h));
    cmsCloseProfile(h);
  }
}
BENCHMARK(BM_OpenClose_LittleCms)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
