// EmbedImage on a 24-megapixel JPEG (6000 x 4000, made at start-up) through the host,
// against copying the same file, in the same run.
#include <benchmark/benchmark.h>
#include <stdio.h>
#include <jpeglib.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "host/runtime.h"

namespace {

constexpr int kWidth = 6000, kHeight = 4000;

const std::string& Folder() {
  static const std::string folder = [] {
    char pattern[] = "/tmp/tw-image-bench-XXXXXX";
    return std::string(mkdtemp(pattern));
  }();
  return folder;
}

// A photograph-like pattern, so that the file is of a realistic size (quality 90).
const std::string& Image() {
  static const std::string path = [] {
    const std::string p = Folder() + "/big.jpg";
    FILE* f = fopen(p.c_str(), "wb");
    jpeg_compress_struct c;
    jpeg_error_mgr err;
    c.err = jpeg_std_error(&err);
    jpeg_create_compress(&c);
    jpeg_stdio_dest(&c, f);
    c.image_width = kWidth;
    c.image_height = kHeight;
    c.input_components = 3;
    c.in_color_space = JCS_RGB;
    jpeg_set_defaults(&c);
    jpeg_set_quality(&c, 90, TRUE);
    jpeg_start_compress(&c, TRUE);
    std::vector<JSAMPLE> row(kWidth * 3);
    unsigned noise = 1;
    for (int y = 0; y < kHeight; ++y) {
      for (int x = 0; x < kWidth * 3; ++x) {
        noise = noise * 1103515245u + 12345u;
        row[x] = static_cast<JSAMPLE>((x / 3 + y) / 40 + (x % 3) * 60 + ((noise >> 16) & 15));
      }
      JSAMPROW rows[1] = {row.data()};
      jpeg_write_scanlines(&c, rows, 1);
    }
    jpeg_finish_compress(&c);
    jpeg_destroy_compress(&c);
    fclose(f);
    return p;
  }();
  return path;
}

host::Runtime& Host() {
  static host::Runtime* runtime = new host::Runtime(TINTWELL_PLUGIN_PATH);  // lives for the process
  return *runtime;
}

void BM_EmbedImage_24MP_Jpeg(benchmark::State& state) {
  host::Runtime& rt = Host();
  host::Object p = rt.New("Profile", {rt.MakeFolderItem(std::string(TINTWELL_ICC_DIR) + "/sRGB.icc")});
  host::Object from = rt.MakeFolderItem(Image()), to = rt.MakeFolderItem(Folder() + "/embedded.jpg");
  for (auto _ : state)
    if (!rt.CallGlobal("EmbedImage", {from, to, true, p}).AsBoolean()) state.SkipWithError("EmbedImage failed");
  state.counters["MB"] = static_cast<double>(std::filesystem::file_size(Image())) / 1e6;
}
BENCHMARK(BM_EmbedImage_24MP_Jpeg)->Unit(benchmark::kMillisecond);

void BM_CopyFile_24MP_Jpeg(benchmark::State& state) {
  const std::string copy = Folder() + "/copy.jpg";
  for (auto _ : state)
    std::filesystem::copy_file(Image(), copy, std::filesystem::copy_options::overwrite_existing);
}
BENCHMARK(BM_CopyFile_24MP_Jpeg)->Unit(benchmark::kMillisecond);

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  std::filesystem::remove_all(Folder());
  return 0;
}
