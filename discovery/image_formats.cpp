#include "image_formats.h"

#include <cstring>

namespace image {

Format Detect(const std::uint8_t* data, std::size_t size) {
  static const std::uint8_t kPng[8] = {0x89, 'P', 'N', 'G', '\r', '\n', 0x1A, '\n'};
  if (size >= 8 && std::memcmp(data, kPng, 8) == 0) return Format::Png;
  if (size >= 3 && data[0] == 0xFF && data[1] == 0xD8 && data[2] == 0xFF) return Format::Jpeg;
  if (size >= 4 && ((data[0] == 'I' && data[1] == 'I' && (data[2] == 42 || data[2] == 43) && data[3] == 0) ||
                    (data[0] == 'M' && data[1] == 'M' && data[2] == 0 && (data[3] == 42 || data[3] == 43))))
    return Format::Tiff;
  return Format::Unknown;
}

bool ReadImage(const std::uint8_t* data, std::size_t size, ImageInfo& info) {
  info = ImageInfo();
  bool ok = false;
  switch (Detect(data, size)) {
    case Format::Png: ok = ReadPng(data, size, info); break;
    case Format::Jpeg: ok = ReadJpeg(data, size, info); break;
    case Format::Tiff: ok = ReadTiff(data, size, info); break;
    case Format::Unknown: return false;
  }
  info.format = ok ? Detect(data, size) : Format::Unknown;
  if (!ok) info.profile.clear();
  return ok;
}

bool EmbedProfile(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out) {
  if (profile.empty() || profile.size() > kMaxProfileBytes) return false;
  bool ok = false;
  switch (Detect(data, size)) {
    case Format::Png: ok = EmbedPng(data, size, profile, out); break;
    case Format::Jpeg: ok = EmbedJpeg(data, size, profile, out); break;
    case Format::Tiff: ok = EmbedTiff(data, size, profile, out); break;
    case Format::Unknown: return false;
  }
  if (!ok || out.size() > kMaxImageBytes) return false;
  // What was written must read back with exactly this profile: a reader that would
  // drop it (a profile of the wrong colour space for a PNG, say) makes the embedding fail.
  ImageInfo check;
  return ReadImage(out.data(), out.size(), check) && check.hasProfile && check.profile == profile;
}

}  // namespace image
