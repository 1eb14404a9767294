// Pictures: host objects holding 32-bit pixels, each with one graphics object whose
// device context (a handle of the platform layer) draws on those pixels.
#include <limits>
#include <new>

#include "runtime_impl.h"
#include "win32_surface.h"

namespace host {

namespace {

// A new picture's size in bytes must stay far from the 32-bit limits that device
// contexts and script integers carry.
constexpr std::int64_t kMaxPicturePixels = std::int64_t{1} << 28;

void DropDC(GraphicsData& g) {
  if (g.dc) DeleteSurfaceDC(g.dc);
  g.dc = nullptr;
  g.pixels = nullptr;
}

}  // namespace

REALobject Runtime::Impl::NewPicture(std::int32_t width, std::int32_t height, std::int32_t depth) {
  if (width <= 0 || height <= 0 || std::int64_t{width} * height > kMaxPicturePixels) return nullptr;
  if (depth != 32 && depth != 24 && depth != 16 && depth != 8) return nullptr;
  auto data = std::make_unique<PictureData>();
  try {
    // New pictures are white, as a blank sheet is.
    data->pixels.assign(static_cast<std::size_t>(width) * static_cast<std::size_t>(height), 0x00FFFFFF);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
  data->width = width;
  data->height = height;
  data->depth = depth;
  REALobject picture = NewObject(pictureClass.get());
  Extras(picture).picture = std::move(data);
  return picture;
}

REALobject Runtime::Impl::PictureGraphics(REALobject picture) {
  if (!IsA(picture, pictureClass.get())) return nullptr;
  PictureData& p = *picture->extras->picture;
  if (!p.graphics) {
    REALobject graphics = NewObject(graphicsClass.get());
    auto g = std::make_unique<GraphicsData>();
    g->pixels = p.pixels.data();
    g->width = p.width;
    g->height = p.height;
    Extras(graphics).graphics = std::move(g);
    p.graphics = graphics;
  }
  return p.graphics;
}

void* Runtime::Impl::GraphicsDC(REALobject graphics) {
  if (!IsA(graphics, graphicsClass.get())) return nullptr;
  GraphicsData& g = *graphics->extras->graphics;
  if (!g.pixels) return nullptr;  // its picture is gone
  if (!g.dc) g.dc = CreateSurfaceDC(g.pixels, g.width, g.height, g.width * 4);
  return static_cast<void*>(g.dc);
}

void Runtime::Impl::ReleasePicture(REALobject object) {
  host_ObjectExtras& extras = *object->extras;
  if (extras.graphics) DropDC(*extras.graphics);
  if (extras.picture && extras.picture->graphics) {
    // A graphics object someone still holds must not draw on freed pixels.
    REALobject graphics = extras.picture->graphics;
    extras.picture->graphics = nullptr;
    DropDC(*graphics->extras->graphics);
    UnlockObject(graphics);
  }
}

// ---- the C++ API ----

namespace {

PictureData& PictureOf(Runtime::Impl& rt, const Object& picture) {
  if (!rt.IsA(picture.get(), rt.pictureClass.get())) throw HostError("not a picture");
  return *picture.get()->extras->picture;
}

}  // namespace

Object Runtime::NewPicture(int width, int height, int depth) {
  REALobject picture = impl_->NewPicture(width, height, depth);
  if (!picture)
    throw HostError("cannot make a picture of " + std::to_string(width) + " x " + std::to_string(height) +
                    " at depth " + std::to_string(depth));
  return Object::Adopt(picture);
}

Runtime::PictureSize Runtime::SizeOfPicture(const Object& picture) const {
  const PictureData& p = PictureOf(*impl_, picture);
  return {p.width, p.height, p.depth};
}

Color Runtime::GetPixel(const Object& picture, int x, int y) const {
  const PictureData& p = PictureOf(*impl_, picture);
  if (x < 0 || y < 0 || x >= p.width || y >= p.height) throw HostError("pixel outside the picture");
  return Color{p.pixels[static_cast<std::size_t>(y) * static_cast<std::size_t>(p.width) + static_cast<std::size_t>(x)]};
}

void Runtime::SetPixel(const Object& picture, int x, int y, Color color) {
  PictureData& p = PictureOf(*impl_, picture);
  if (x < 0 || y < 0 || x >= p.width || y >= p.height) throw HostError("pixel outside the picture");
  p.pixels[static_cast<std::size_t>(y) * static_cast<std::size_t>(p.width) + static_cast<std::size_t>(x)] =
      color.rgb & 0x00FFFFFF;
}

std::uint32_t* Runtime::PicturePixels(const Object& picture) { return PictureOf(*impl_, picture).pixels.data(); }

}  // namespace host
