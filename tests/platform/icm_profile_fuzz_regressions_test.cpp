// Replays every saved fuzz input through the fuzz target's own entry, and a few
// hand-made hostile inputs with it.
#include <dirent.h>

#include "icc_test_support.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

using namespace icctest;

TEST(FuzzRegressions, ReplayWithoutFaults) {
  const std::string dir = std::string(TINTWELL_SOURCE_DIR) + "/fuzz/regressions";
  DIR* d = opendir(dir.c_str());
  ASSERT_NE(d, nullptr);
  while (dirent* e = readdir(d)) {
    if (e->d_name[0] == '.') continue;
    SCOPED_TRACE(e->d_name);
    const Bytes input = ReadBytes(dir + "/" + e->d_name);
    EXPECT_EQ(LLVMFuzzerTestOneInput(input.data(), input.size()), 0);
  }
  closedir(d);
}

TEST(FuzzRegressions, RealProfilesWalkCleanly) {
  for (const char* name : {"sRGB.icc", "colord/sRGB.icc", "Gray.icc", "ITULab.icc", "colord/x11-colors.icc"}) {
    SCOPED_TRACE(name);
    const Bytes input = ReadBytes(IccPath(name));
    ASSERT_FALSE(input.empty());
    EXPECT_EQ(LLVMFuzzerTestOneInput(input.data(), input.size()), 0);
  }
}

}  // namespace
