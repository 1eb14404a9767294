// Fuzz target for the image readers: PNG, JPEG and TIFF bytes are read for their
// profile and space, and each readable image gets a profile embedded, which must then
// read back byte for byte.
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "image_formats.h"

namespace {

void Check(bool condition) {
  if (!condition) std::abort();
}

// A minimal RGB display profile header with an empty tag table.
image::Bytes SmallProfile() {
  image::Bytes p(132, 0);
  auto put = [&](std::size_t at, const char* four) { std::memcpy(&p[at], four, 4); };
  p[3] = 132;
  p[8] = 2;
  p[9] = 0x10;
  put(12, "mntr");
  put(16, "RGB ");
  put(20, "XYZ ");
  put(36, "acsp");
  p[68 + 2] = 0xF6;
  p[68 + 3] = 0xD6;
  p[72 + 1] = 1;
  p[76 + 2] = 0xD3;
  p[76 + 3] = 0x2D;
  return p;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const image::Bytes profile = SmallProfile();
  image::ImageInfo info;
  if (!image::ReadImage(data, size, info)) return 0;
  Check(std::strlen(info.space) == 4);
  Check(info.hasProfile || info.profile.empty());
  Check(info.profile.size() <= image::kMaxProfileBytes);
  image::Bytes out;
  if (image::EmbedProfile(data, size, profile, out)) {
    image::ImageInfo again;
    Check(image::ReadImage(out.data(), out.size(), again) && again.hasProfile && again.profile == profile);
    Check(std::memcmp(again.space, info.space, 5) == 0);
  }
  return 0;
}
