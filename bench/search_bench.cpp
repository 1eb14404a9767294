// ProfileSearch through the host over a colour directory of 1,000 profiles (copies of
// the ones the setup installs), with no criterion and with one, against the least any
// search must do in the same run: open each file, read its 128-byte header, close it.
#include <benchmark/benchmark.h>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <cctype>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "host/runtime.h"

namespace {

constexpr int kProfiles = 1000;

bool IsProfileName(const std::string& name) {
  const std::size_t dot = name.rfind('.');
  if (dot == std::string::npos) return false;
  std::string ext = name.substr(dot + 1);
  for (char& c : ext) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
  return ext == "icc" || ext == "icm";
}

void Collect(const std::string& folder, std::vector<std::string>& found) {
  DIR* dir = opendir(folder.c_str());
  if (!dir) return;
  while (const dirent* e = readdir(dir)) {
    const std::string name = e->d_name;
    if (name == "." || name == "..") continue;
    const std::string path = folder + "/" + name;
    if (e->d_type == DT_DIR) Collect(path, found);
    else if (IsProfileName(name)) found.push_back(path);
  }
  closedir(dir);
}

// The folder of copies, made once; the colour directory points at it.
const std::string& Directory() {
  static const std::string folder = [] {
    char pattern[] = "/tmp/tw-search-bench-XXXXXX";
    std::string dir = mkdtemp(pattern) ? pattern : "/tmp";
    std::vector<std::string> installed;
    Collect("/usr/share/color", installed);
    for (int i = 0; i < kProfiles && !installed.empty(); ++i) {
      std::ifstream in(installed[i % installed.size()], std::ios::binary);
      std::ofstream out(dir + "/p" + std::to_string(i) + ".icc", std::ios::binary);
      out << in.rdbuf();
    }
    setenv("TINTWELL_COLOR_DIR", dir.c_str(), 1);
    return dir;
  }();
  return folder;
}

host::Runtime& Host() {
  Directory();
  static host::Runtime* runtime = new host::Runtime(TINTWELL_PLUGIN_PATH);  // lives for the process
  return *runtime;
}

void Search(benchmark::State& state, const char* deviceClass) {
  host::Runtime& rt = Host();
  int64_t found = 0;
  for (auto _ : state) {
    host::Object list = rt.New("VectorF");
    rt.CallGlobal("ProfileSearch", {"", deviceClass, "", "", "", 0, list});
    found = rt.Call(list, "Count").AsInteger();
  }
  state.counters["found"] = static_cast<double>(found);
  state.SetItemsProcessed(state.iterations() * kProfiles);
}

void BM_ProfileSearch_NoCriterion(benchmark::State& state) { Search(state, ""); }
BENCHMARK(BM_ProfileSearch_NoCriterion)->Unit(benchmark::kMillisecond);

void BM_ProfileSearch_ClassMntr(benchmark::State& state) { Search(state, "mntr"); }
BENCHMARK(BM_ProfileSearch_ClassMntr)->Unit(benchmark::kMillisecond);

// The baseline: every file opened, its header read and closed, nothing else.
void BM_RawHeaderReads(benchmark::State& state) {
  const std::string dir = Directory();
  std::vector<std::string> files;
  Collect(dir, files);
  char header[128];
  for (auto _ : state) {
    for (const std::string& f : files) {
      const int fd = open(f.c_str(), O_RDONLY | O_CLOEXEC);
      if (fd < 0 || read(fd, header, sizeof header) != static_cast<ssize_t>(sizeof header)) {
        state.SkipWithError("cannot read a profile");
        if (fd >= 0) close(fd);
        return;
      }
      benchmark::DoNotOptimize(header);
      close(fd);
    }
  }
  state.SetItemsProcessed(state.iterations() * static_cast<int64_t>(files.size()));
}
BENCHMARK(BM_RawHeaderReads)->Unit(benchmark::kMillisecond);

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  std::system(("rm -rf '" + Directory() + "'").c_str());
  return 0;
}
