// MatchPicture on a 4096 x 4096 picture, sRGB to a wide-gamut RGB profile: the whole
// call through the host, and each of its steps (per-pixel reads, the bitmap translation,
// the DIB draw into a new picture), against Little CMS transforming the same pixels on
// one thread, in the same run. The program is its own plugin (the plugin's code is
// linked in), so that the steps can be called one by one.
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <cstdlib>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "host/runtime.h"
#include "colorworld.h"
#include "instance_data.h"
#include "picture_match.h"

namespace {

constexpr int kSide = 4096;
const std::string kSrgb = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc";
const std::string kWide = std::string(TINTWELL_ICC_DIR) + "/colord/ProPhotoRGB.icc";

struct Fixture {
  host::Runtime rt{""};
  host::Object world, picture;
  std::vector<BYTE> image;
  HTRANSFORM transform = nullptr;

  Fixture() {
    host::Object src = rt.New("Profile", {rt.MakeFolderItem(kSrgb)});
    host::Object dst = rt.New("Profile", {rt.MakeFolderItem(kWide)});
    world = rt.New("ColorWorld", {src, dst});
    picture = rt.NewPicture(kSide, kSide);
    std::uint32_t* pixels = rt.PicturePixels(picture);
    std::mt19937 rng(1);
    for (std::size_t i = 0; i < std::size_t{kSide} * kSide; ++i) pixels[i] = rng() & 0xFFFFFF;
    image.resize(PictureImageBytes(kSide, kSide));
    transform = GetInstanceData<ColorWorldData>(world.get(), ColorWorldClass)->transform;
  }
};

Fixture& Shared() {
  static Fixture* f = new Fixture;  // lives for the process
  return *f;
}

void BM_MatchPictureWhole(benchmark::State& state) {
  Fixture& f = Shared();
  for (auto _ : state) {
    host::Value result = f.rt.Call(f.world, "MatchPicture", {f.picture, kSide, kSide, 32, false});
    if (!result.IsObject()) state.SkipWithError("MatchPicture failed");
  }
  state.SetItemsProcessed(state.iterations() * kSide * kSide);
}
BENCHMARK(BM_MatchPictureWhole)->Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()->Iterations(5);

void BM_Step1ReadPixels(benchmark::State& state) {
  Fixture& f = Shared();
  for (auto _ : state) BuildImageDataFromPicture(f.picture.get(), kSide, kSide, f.image.data());
  state.SetItemsProcessed(state.iterations() * kSide * kSide);
}
BENCHMARK(BM_Step1ReadPixels)->Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()->Iterations(5);

void BM_Step2Translate(benchmark::State& state) {
  Fixture& f = Shared();
  BuildImageDataFromPicture(f.picture.get(), kSide, kSide, f.image.data());
  std::vector<BYTE> fresh = f.image;
  for (auto _ : state) {
    state.PauseTiming();
    f.image = fresh;  // each round translates the picture's own pixels
    state.ResumeTiming();
    TranslateBitmapBits(f.transform, f.image.data(), BM_RGBTRIPLETS, kSide, kSide, kSide * 3, f.image.data(),
                        BM_RGBTRIPLETS, kSide * 3, nullptr, 0);
  }
  state.SetItemsProcessed(state.iterations() * kSide * kSide);
}
BENCHMARK(BM_Step2Translate)->Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()->Iterations(5);

void BM_Step3Draw(benchmark::State& state) {
  Fixture& f = Shared();
  for (auto _ : state) {
    REALpicture made = BuildPictureFromImageData(kSide, kSide, f.image.data());
    state.PauseTiming();
    host::Object::Adopt(made);  // released outside the timing
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * kSide * kSide);
}
BENCHMARK(BM_Step3Draw)->Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()->Iterations(5);

// The baseline: Little CMS alone, one thread, the same pixels and intents.
void BM_LittleCmsOneThread(benchmark::State& state) {
  Fixture& f = Shared();
  BuildImageDataFromPicture(f.picture.get(), kSide, kSide, f.image.data());
  std::vector<BYTE> out(f.image.size());
  cmsHPROFILE p[2] = {cmsOpenProfileFromFile(kSrgb.c_str(), "r"), cmsOpenProfileFromFile(kWide.c_str(), "r")};
  cmsUInt32Number intents[2] = {cmsGetHeaderRenderingIntent(p[0]), cmsGetHeaderRenderingIntent(p[1])};
  cmsBool bpc[2] = {FALSE, FALSE};
  cmsFloat64Number adaptation[2] = {1, 1};
  cmsHTRANSFORM x =
      cmsCreateExtendedTransform(nullptr, 2, p, bpc, intents, adaptation, nullptr, 0, TYPE_BGR_8, TYPE_BGR_8, 0);
  for (auto _ : state) cmsDoTransform(x, f.image.data(), out.data(), kSide * kSide);
  cmsDeleteTransform(x);
  cmsCloseProfile(p[0]);
  cmsCloseProfile(p[1]);
  state.SetItemsProcessed(state.iterations() * kSide * kSide);
}
BENCHMARK(BM_LittleCmsOneThread)->Unit(benchmark::kMillisecond)->UseRealTime()->MeasureProcessCPUTime()->Iterations(5);

}  // namespace

BENCHMARK_MAIN();
