// The host's pictures: the C++ API, and the entries a plugin reaches them by (a new
// picture, its graphics object, the device context drawing on it), with lifetimes that
// leave nothing alive and never let a device context outlive its pixels.
#include <gtest/gtest.h>

#include "host/runtime.h"
#include "windows.h"

extern "C" void* ResolveEntry(const char* name);  // the resolver handed to plugins

namespace {

using host::Color;
using host::HostError;
using host::Object;
using host::Runtime;

class PictureTest : public ::testing::Test {
 protected:
  void SetUp() override { rt = std::make_unique<Runtime>(PROBE_PLUGIN_PATH); }
  void TearDown() override {
    EXPECT_EQ(rt->LiveObjects(), 0u);
    EXPECT_TRUE(rt->Faults().empty());
    rt.reset();
  }
  template <class Proc>
  Proc Entry(const char* name) {
    return reinterpret_cast<Proc>(ResolveEntry(name));
  }
  std::unique_ptr<Runtime> rt;
};

TEST_F(PictureTest, NewPicturesAreWhiteAndKeepTheirPixels) {
  const struct {
    int w, h, depth;
  } refused[] = {{0, 1, 32}, {1, 0, 32}, {-5, 5, 32}, {1, 1, 12}, {1, 1, 0}, {65536, 65536, 32}};
  for (const auto& r : refused) EXPECT_THROW(rt->NewPicture(r.w, r.h, r.depth), HostError);
  EXPECT_EQ(rt->LiveObjects(), 0u);
  Object p = rt->NewPicture(3, 2, 24);
  EXPECT_EQ(p.ClassName(), "Picture");
  EXPECT_EQ(rt->SizeOfPicture(p).depth, 24);
  EXPECT_EQ(rt->GetPixel(p, 2, 1).rgb, 0xFFFFFFu);
  rt->SetPixel(p, 2, 1, Color{0xFF123456});
  EXPECT_EQ(rt->GetPixel(p, 2, 1).rgb, 0x123456u);
  EXPECT_EQ(rt->PicturePixels(p)[1 * 3 + 2], 0x123456u);  // rows top-down, no padding
  for (const auto& xy : {std::pair{-1, 0}, {3, 0}, {0, -1}, {0, 2}})
    EXPECT_THROW(rt->GetPixel(p, xy.first, xy.second), HostError);
  EXPECT_THROW(rt->SizeOfPicture(rt->MakeFolderItem("/tmp")), HostError);
}

TEST_F(PictureTest, EntriesGiveOneGraphicsObjectAndADeviceContextOnThePixels) {
  auto newPicture = Entry<newPictureProc>("newPicture");
  auto graphicsOf = Entry<pluginPictureGraphicsGetterProc>("pluginPictureGraphicsGetter");
  auto dcOf = Entry<REALGraphicsDCProc>("REALGraphicsDC");
  EXPECT_EQ(newPicture(0, 5, 32), nullptr);
  EXPECT_EQ(newPicture(5, 5, 7), nullptr);
  Object picture = Object::Adopt(newPicture(3, 2, 32));
  ASSERT_TRUE(picture);
  REALgraphics g = graphicsOf(picture.get());
  ASSERT_NE(g, nullptr);
  EXPECT_EQ(graphicsOf(picture.get()), g);  // the picture's own, borrowed
  EXPECT_EQ(rt->LiveObjects(), 2u);
  Object folder = rt->MakeFolderItem("/tmp");
  EXPECT_EQ(graphicsOf(nullptr), nullptr);
  EXPECT_EQ(graphicsOf(folder.get()), nullptr);
  EXPECT_EQ(dcOf(picture.get()), nullptr);  // a picture is not a graphics object
  HDC dc = static_cast<HDC>(dcOf(g));
  ASSERT_NE(dc, nullptr);
  EXPECT_EQ(dcOf(g), static_cast<void*>(dc));
  EXPECT_EQ(SetPixel(dc, 1, 1, RGB(1, 2, 3)), RGB(1, 2, 3));
  EXPECT_EQ(rt->GetPixel(picture, 1, 1).rgb, 0x010203u);
  rt->SetPixel(picture, 0, 0, Color{0x0A0B0C});
  EXPECT_EQ(GetPixel(dc, 0, 0), RGB(0x0A, 0x0B, 0x0C));
  EXPECT_EQ(GetPixel(dc, 3, 0), CLR_INVALID);

  // A plugin that keeps the graphics object beyond its picture: the device context dies
  // with the pixels, and the graphics object answers none.
  Entry<REALLockObjectProc>("REALLockObject")(g);
  picture = Object();
  EXPECT_EQ(rt->LiveObjects(), 2u);  // the graphics object and the folder item
  EXPECT_EQ(GetPixel(dc, 0, 0), CLR_INVALID);
  EXPECT_EQ(dcOf(g), nullptr);
  Entry<REALUnlockObjectProc>("REALUnlockObject")(g);
  EXPECT_EQ(rt->LiveObjects(), 1u);
}

}  // namespace
