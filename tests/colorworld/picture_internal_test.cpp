// The picture-building routine driven from inside: the per-pixel fallback when the
// padded copy cannot be allocated, and a new picture without a device context.
#include "host_bridge.h"
#include "picture_match.h"
#include "plugin_fixture.h"

namespace {

using host::Color;
using host::Object;

class PictureInternalTest : public PluginTest {
 protected:
  PictureInternalTest() : PluginTest("") {}
  void TearDown() override {
    SetPictureCopyAllocator(nullptr);
    PluginTest::TearDown();
  }
};

// Width 5: rows of 15 bytes, which a DIB pads to 16.
std::vector<BYTE> Image() {
  std::vector<BYTE> image(5 * 2 * 3);
  for (std::size_t i = 0; i < image.size(); ++i) image[i] = static_cast<BYTE>(i * 7 + 1);
  return image;
}

TEST_F(PictureInternalTest, WithoutThePaddedCopyPixelsAreDrawnOneByOne) {
  const std::vector<BYTE> image = Image();
  for (const bool copyFails : {false, true}) {
    SCOPED_TRACE(copyFails);
    static int asked;
    asked = 0;
    SetPictureCopyAllocator(copyFails ? +[](std::size_t) -> void* { return ++asked, nullptr; } : nullptr);
    REALpicture made = BuildPictureFromImageData(5, 2, image.data());
    ASSERT_NE(made, nullptr);
    Object picture = Object::Adopt(made);
    EXPECT_EQ(asked, copyFails ? 1 : 0);
    for (int y = 0; y < 2; ++y)
      for (int x = 0; x < 5; ++x) {
        const BYTE* p = &image[(y * 5 + x) * 3];  // B, G, R
        EXPECT_EQ(rt->GetPixel(picture, x, y).rgb, static_cast<std::uint32_t>(p[2]) << 16 | p[1] << 8 | p[0]);
      }
  }
}

TEST_F(PictureInternalTest, ANewPictureWithoutADeviceContextIsNil) {
  rt->SetWithheld("REALGraphicsDC", true);
  Object probe = rt->NewPicture(1, 1);
  // The entry stays cached once resolved; in a process that resolved it before, this
  // case cannot be staged.
  if (bridge::GraphicsDC(bridge::PictureGraphics(probe.get()))) GTEST_SKIP() << "REALGraphicsDC already resolved";
  const std::size_t before = rt->LiveObjects();
  const std::vector<BYTE> image = Image();
  EXPECT_EQ(BuildPictureFromImageData(5, 2, image.data()), nullptr);
  EXPECT_EQ(rt->LiveObjects(), before);  // the picture made was released
}

TEST(PictureImageBytes, SizesThatFitAndSizesThatDoNot) {
  const struct {
    int32_t w, h;
    std::size_t bytes;
  } cases[] = {{1, 1, 3},         {5, 2, 30},         {4096, 4096, 50331648}, {0, 1, 0},
               {1, 0, 0},         {-1, 5, 0},         {5, -1, 0},             {0x2AAAAAAA, 1, 0},
               {0x7FFFFFFF, 2, 0}, {1, 0x7FFFFFFF, 0}, {0x0AAAAAAA, 1, 0x1FFFFFFE}};
  for (const auto& c : cases) EXPECT_EQ(PictureImageBytes(c.w, c.h), c.bytes) << c.w << " x " << c.h;
}

}  // namespace
