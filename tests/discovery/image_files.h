// Test images made and read back with libpng, libjpeg and libtiff directly, independent
// of the plugin's own image code.
#ifndef TINTWELL_TESTS_IMAGE_FILES_H
#define TINTWELL_TESTS_IMAGE_FILES_H

#include <cstdint>
#include <string>
#include <vector>

namespace testimage {

using Bytes = std::vector<std::uint8_t>;

enum class Kind { Png, Jpeg, Tiff, BigTiff };

// A small image of channels 1 (gray), 3 (RGB) or 4 (CMYK, JPEG and TIFF only), with a
// pattern of pixels, and the given APP2/iCCP/tag profile when not empty. JPEG markers
// given in rawIcc are written as they are instead (each a whole APP2 payload).
void Make(Kind kind, const std::string& path, int width, int height, int channels, const Bytes& profile,
          const std::vector<Bytes>& rawIcc = {});

struct Decoded {
  bool ok = false;
  Bytes profile;  // as the library reads it
  Bytes pixels;   // decoded, row after row
};
Decoded Read(Kind kind, const std::string& path);

Bytes ReadFile(const std::string& path);
void WriteFile(const std::string& path, const Bytes& bytes);

}  // namespace testimage

#endif
