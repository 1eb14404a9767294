// A program that uses the plugin as another user of it would, for the tests that run
// several at once: it opens a profile, sets its model number, saves, and (with --check)
// reopens it to see its own value, again and again. It prints its working folder first
// and then each value saved, so that a test can tell how far it got.
//   profile_worker PLUGIN FILE COUNT FIRST_VALUE [--check]
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "host/runtime.h"
#include "profile_files.h"
#include "win32_paths.h"

int main(int argc, char** argv) {
  if (argc < 5) {
    std::fprintf(stderr, "usage: profile_worker PLUGIN FILE COUNT FIRST_VALUE [--check]\n");
    return 2;
  }
  const std::string file = argv[2];
  const long count = std::atol(argv[3]);
  const int32_t first = std::atoi(argv[4]);
  const bool check = argc > 5 && std::strcmp(argv[5], "--check") == 0;
  host::Runtime rt(argv[1]);
  std::printf("folder %s\n", ProfileFiles::PluginWorkingFolder().c_str());
  std::fflush(stdout);
  for (long i = 0; i < count; ++i) {
    const int32_t value = first + static_cast<int32_t>(i);
    {
      host::Object p = rt.New("Profile", {rt.MakeFolderItem(file)});
      rt.Set(p, "Model", value);
      rt.Call(p, "SaveProfile");
      const int32_t error = rt.CallGlobal("CMError").AsInteger();
      if (error != 0) {
        std::fprintf(stderr, "save %d: CMError %d\n", value, error);
        return 1;
      }
    }
    std::printf("saved %d\n", value);
    std::fflush(stdout);
    if (check) {
      host::Object again = rt.New("Profile", {rt.MakeFolderItem(file)});
      const int32_t read = rt.Get(again, "Model").AsInteger();
      if (read != value) {
        std::fprintf(stderr, "saved %d, read back %d\n", value, read);
        return 1;
      }
    }
  }
  return 0;
}
