// Colour matching through the whole road (host dispatch, plugin, platform layer, Little
// CMS) against the platform call alone and Little CMS alone, in the same run.
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <memory>
#include <string>

#include "host/runtime.h"
#include "icm.h"
#include "win32_paths.h"

namespace {

const std::string kRgb = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc";
const std::string kCmyk = std::string(TINTWELL_ICC_DIR) + "/ghostscript/default_cmyk.icc";

host::Runtime& Host() {
  static host::Runtime* runtime = new host::Runtime(TINTWELL_PLUGIN_PATH);  // lives for the process
  return *runtime;
}

void BM_MatchCMcolorThroughHost(benchmark::State& state) {
  host::Runtime& rt = Host();
  host::Object src = rt.New("Profile", {rt.MakeFolderItem(kRgb)});
  host::Object dst = rt.New("Profile", {rt.MakeFolderItem(kCmyk)});
  host::Object world = rt.New("ColorWorld", {src, dst});
  host::Object color = rt.New("CMColor");
  rt.Set(color, "rr", 200.0);
  for (auto _ : state) rt.Call(world, "MatchCMcolor", {color});
}
BENCHMARK(BM_MatchCMcolorThroughHost);

HPROFILE OpenPlatformProfile(const std::string& path) {
  std::string windows = win32::WindowsPathFromPosix(path);
  PROFILE spec = {PROFILE_FILENAME, windows.data(), static_cast<DWORD>(windows.size() + 1)};
  return OpenColorProfileA(&spec, PROFILE_READ, FILE_SHARE_READ, OPEN_EXISTING);
}

void BM_TranslateColorsDirect(benchmark::State& state) {
  HPROFILE profiles[2] = {OpenPlatformProfile(kRgb), OpenPlatformProfile(kCmyk)};
  DWORD intents[2] = {INTENT_PERCEPTUAL, INTENT_PERCEPTUAL};
  HTRANSFORM t = CreateMultiProfileTransform(profiles, 2, intents, 2, BEST_MODE, INDEX_DONT_CARE);
  COLOR c{};
  c.rgb = {51400, 0, 0};
  for (auto _ : state) {
    TranslateColors(t, &c, 1, COLOR_RGB, &c, COLOR_CMYK);
    benchmark::DoNotOptimize(c);
  }
  DeleteColorTransform(t);
  CloseColorProfile(profiles[0]);
  CloseColorProfile(profiles[1]);
}
BENCHMARK(BM_TranslateColorsDirect);

void BM_CmsDoTransformDouble(benchmark::State& state) {
  cmsHPROFILE in = cmsOpenProfileFromFile(kRgb.c_str(), "r");
  cmsHPROFILE out = cmsOpenProfileFromFile(kCmyk.c_str(), "r");
  cmsHTRANSFORM t = cmsCreateTransform(in, TYPE_RGB_DBL, out, TYPE_CMYK_DBL, INTENT_PERCEPTUAL, 0);
  double rgb[3] = {0.78, 0, 0}, cmyk[4];
  for (auto _ : state) {
    cmsDoTransform(t, rgb, cmyk, 1);
    benchmark::DoNotOptimize(cmyk);
  }
  cmsDeleteTransform(t);
  cmsCloseProfile(in);
  cmsCloseProfile(out);
}
BENCHMARK(BM_CmsDoTransformDouble);

void BM_BuildColorWorld(benchmark::State& state) {
  host::Runtime& rt = Host();
  host::Object src = rt.New("Profile", {rt.MakeFolderItem(kRgb)});
  host::Object dst = rt.New("Profile", {rt.MakeFolderItem(kCmyk)});
  for (auto _ : state) benchmark::DoNotOptimize(rt.New("ColorWorld", {src, dst}));
}
BENCHMARK(BM_BuildColorWorld)->Unit(benchmark::kMillisecond);

void BM_LcmsTransformFromFiles(benchmark::State& state) {
  for (auto _ : state) {
    cmsHPROFILE in = cmsOpenProfileFromFile(kRgb.c_str(), "r");
    cmsHPROFILE out = cmsOpenProfileFromFile(kCmyk.c_str(), "r");
    cmsHTRANSFORM t = cmsCreateTransform(in, TYPE_RGB_DBL, out, TYPE_CMYK_DBL, INTENT_PERCEPTUAL, 0);
    benchmark::DoNotOptimize(t);
    cmsDeleteTransform(t);
    cmsCloseProfile(in);
    cmsCloseProfile(out);
  }
}
BENCHMARK(BM_LcmsTransformFromFiles)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
