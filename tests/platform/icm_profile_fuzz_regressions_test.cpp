// Replays every saved fuzz input through the fuzz target's own entry, and a few
// hand-made hostile inputs with it.
#include <filesystem>

#include "icc_test_support.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

using namespace icctest;

TEST(FuzzRegressions, ReplayWithoutFaults) {
  int replayed = 0;
  for (const auto& entry :
       std::filesystem::directory_iterator(std::string(TINTWELL_SOURCE_DIR) + "/fuzz/regressions/icc_container_fuzz")) {
    SCOPED_TRACE(entry.path().filename().string());
    const Bytes input = ReadBytes(entry.path().string());
    EXPECT_EQ(LLVMFuzzerTestOneInput(input.data(), input.size()), 0);
    ++replayed;
  }
  EXPECT_GT(replayed, 0);
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
