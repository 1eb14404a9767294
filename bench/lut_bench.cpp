// A 33-point 3-in 3-out 16-bit lut written into a profile and read back through the host
// (one element write per table entry, as the plugin writes it), against Little CMS
// serialising the same tag to a profile in memory and reading it back, in the same run.
#include <benchmark/benchmark.h>
#include <lcms2.h>

#include <cstdint>
#include <string>
#include <vector>

#include "host/runtime.h"

namespace {

const std::string kRgb = std::string(TINTWELL_ICC_DIR) + "/sRGB.icc";
constexpr int kGrid = 33, kChannels = 3, kCurveEntries = 256;
constexpr int kClutEntries = kGrid * kGrid * kGrid * kChannels;  // 107,811

host::Runtime& Host() {
  static host::Runtime* runtime = new host::Runtime(TINTWELL_PLUGIN_PATH);  // lives for the process
  return *runtime;
}

// The same table for both sides: a smooth ramp, so no encoder meets only zeros.
std::vector<std::uint16_t> ClutTable() {
  std::vector<std::uint16_t> table(kClutEntries);
  for (int i = 0; i < kClutEntries; ++i) table[static_cast<std::size_t>(i)] = static_cast<std::uint16_t>(i * 37 % 65536);
  return table;
}

// The lut as a script builds it: one Append per entry (setup, not timed).
host::Object MakeHostLut(host::Runtime& rt) {
  host::Object lut = rt.New("cLut");
  rt.Set(lut, "Is16Bit", true);
  rt.Set(lut, "InChannelCount", kChannels);
  rt.Set(lut, "OutChannelCount", kChannels);
  rt.Set(lut, "GridPointCount", kGrid);
  const host::Object in = rt.Get(lut, "InCurve").AsObject(), clut = rt.Get(lut, "Lut").AsObject(),
                     out = rt.Get(lut, "OutCurve").AsObject();
  for (int i = 0; i < kChannels * kCurveEntries; ++i) {
    const double ramp = (i % kCurveEntries) * 65535.0 / (kCurveEntries - 1);
    rt.Call(in, "Append", {ramp});
    rt.Call(out, "Append", {ramp});
  }
  for (std::uint16_t v : ClutTable()) rt.Call(clut, "Append", {static_cast<double>(v)});
  return lut;
}

void BM_SetMFT_Host(benchmark::State& state) {
  host::Runtime& rt = Host();
  host::Object profile = rt.New("Profile", {rt.MakeFolderItem(kRgb)});
  host::Object lut = MakeHostLut(rt);
  for (auto _ : state) rt.Call(profile, "SetMFT", {"A2B0", lut});
  if (rt.CallGlobal("CMError").AsInteger() != 0) state.SkipWithError("SetMFT failed");
  state.SetItemsProcessed(state.iterations() * (kClutEntries + 2 * kChannels * kCurveEntries));
}
BENCHMARK(BM_SetMFT_Host)->Unit(benchmark::kMillisecond);

void BM_GetMFT_Host(benchmark::State& state) {
  host::Runtime& rt = Host();
  host::Object profile = rt.New("Profile", {rt.MakeFolderItem(kRgb)});
  rt.Call(profile, "SetMFT", {"A2B0", MakeHostLut(rt)});
  for (auto _ : state) {
    const host::Value lut = rt.Call(profile, "GetMFT", {"A2B0"});
    benchmark::DoNotOptimize(lut.IsObject());
  }
  const host::Value lut = rt.Call(profile, "GetMFT", {"A2B0"});
  if (!lut.IsObject() || rt.Get(rt.Get(lut.AsObject(), "Lut").AsObject(), "size").AsInteger() != kClutEntries)
    state.SkipWithError("GetMFT did not read the whole lut");
}
BENCHMARK(BM_GetMFT_Host)->Unit(benchmark::kMillisecond);

// The same lut as a Little CMS pipeline: input curves, a 33-point CLUT, output curves.
cmsPipeline* MakePipeline() {
  cmsPipeline* pipe = cmsPipelineAlloc(nullptr, kChannels, kChannels);
  cmsToneCurve* identity = cmsBuildGamma(nullptr, 1.0);
  cmsToneCurve* curves[kChannels] = {identity, identity, identity};
  const std::vector<std::uint16_t> table = ClutTable();
  cmsPipelineInsertStage(pipe, cmsAT_END, cmsStageAllocToneCurves(nullptr, kChannels, curves));
  cmsPipelineInsertStage(pipe, cmsAT_END, cmsStageAllocCLut16bit(nullptr, kGrid, kChannels, kChannels, table.data()));
  cmsPipelineInsertStage(pipe, cmsAT_END, cmsStageAllocToneCurves(nullptr, kChannels, curves));
  cmsFreeToneCurve(identity);
  return pipe;
}

// A version 2 profile, in which Little CMS writes an A2B0 pipeline as a lut16.
cmsHPROFILE MakeV2Profile() {
  cmsHPROFILE h = cmsCreate_sRGBProfile();
  cmsSetProfileVersion(h, 2.1);
  return h;
}

std::vector<std::uint8_t> SaveToMemory(cmsHPROFILE h) {
  cmsUInt32Number size = 0;
  cmsSaveProfileToMem(h, nullptr, &size);
  std::vector<std::uint8_t> bytes(size);
  cmsSaveProfileToMem(h, bytes.data(), &size);
  return bytes;
}

void BM_WriteTag_LittleCms(benchmark::State& state) {
  cmsPipeline* pipe = MakePipeline();
  cmsHPROFILE h = MakeV2Profile();
  for (auto _ : state) {
    cmsWriteTag(h, cmsSigAToB0Tag, pipe);
    benchmark::DoNotOptimize(SaveToMemory(h).data());
  }
  cmsCloseProfile(h);
  cmsPipelineFree(pipe);
}
BENCHMARK(BM_WriteTag_LittleCms)->Unit(benchmark::kMillisecond);

void BM_ReadTag_LittleCms(benchmark::State& state) {
  cmsPipeline* pipe = MakePipeline();
  cmsHPROFILE source = MakeV2Profile();
  cmsWriteTag(source, cmsSigAToB0Tag, pipe);
  const std::vector<std::uint8_t> bytes = SaveToMemory(source);
  cmsCloseProfile(source);
  cmsPipelineFree(pipe);
  // The comparison holds only if Little CMS chose the same tag type.
  cmsHPROFILE check = cmsOpenProfileFromMem(bytes.data(), static_cast<cmsUInt32Number>(bytes.size()));
  char type[4] = {};
  cmsReadRawTag(check, cmsSigAToB0Tag, type, sizeof type);
  cmsCloseProfile(check);
  if (std::string(type, 4) != "mft2") {
    state.SkipWithError("Little CMS did not write a lut16");
    return;
  }
  for (auto _ : state) {
    cmsHPROFILE h = cmsOpenProfileFromMem(bytes.data(), static_cast<cmsUInt32Number>(bytes.size()));
    const void* tag = cmsReadTag(h, cmsSigAToB0Tag);
    if (tag == nullptr) {
      state.SkipWithError("Little CMS cannot read the tag");
      cmsCloseProfile(h);
      return;
    }
    benchmark::DoNotOptimize(tag);
    cmsCloseProfile(h);
  }
}
BENCHMARK(BM_ReadTag_LittleCms)->Unit(benchmark::kMillisecond);

}  // namespace

BENCHMARK_MAIN();
