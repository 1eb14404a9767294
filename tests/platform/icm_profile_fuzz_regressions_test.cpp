// Replays every saved fuzz input, and a few real profiles, through the fuzz target's own entry.
#include <filesystem>

#include "icc_test_support.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

TEST(FuzzRegressions, ReplayWithoutFaults) {
  std::vector<std::string> inputs;
  for (const auto& entry :
       std::filesystem::directory_iterator(std::string(TINTWELL_SOURCE_DIR) + "/fuzz/regressions/icc_container_fuzz"))
    inputs.push_back(entry.path().string());
  ASSERT_FALSE(inputs.empty());
  for (const char* name : {"sRGB.icc", "colord/sRGB.icc", "Gray.icc", "ITULab.icc", "colord/x11-colors.icc"})
    inputs.push_back(icctest::IccPath(name));
  for (const std::string& path : inputs) {
    SCOPED_TRACE(path);
    const icctest::Bytes input = icctest::ReadBytes(path);
    ASSERT_FALSE(input.empty());
    EXPECT_EQ(LLVMFuzzerTestOneInput(input.data(), input.size()), 0);
  }
}

}  // namespace
