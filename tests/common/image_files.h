// Test images written and read back with libpng, libjpeg and libtiff directly,
// independent of the plugin's and the tool's own image code.
#ifndef TINTWELL_TESTS_IMAGE_FILES_H
#define TINTWELL_TESTS_IMAGE_FILES_H

#include <cstdint>
#include <string>
#include <vector>

namespace testimage {

using Bytes = std::vector<std::uint8_t>;

// Samples row after row: channels per pixel (1 gray, 2 gray and alpha, 3 RGB, 4 RGBA in
// a PNG or CMYK in a JPEG or TIFF), each 0-255 or, at depth 16, 0-65535.
struct Image {
  int width = 0, height = 0, depth = 8, channels = 3;
  std::vector<std::uint32_t> samples;
  Bytes icc;        // the embedded profile
  bool ok = false;  // set by the readers
  std::uint32_t at(int x, int y, int c) const {
    return samples[(static_cast<std::size_t>(y) * width + x) * channels + c];
  }
};

// An 8-bit image with a fixed pattern of samples.
Image Patterned(int width, int height, int channels, const Bytes& icc = {});

// Each writer also stores a comment, which a profile's embedding must step over. JPEG
// markers in rawIcc are written as they are (each a whole APP2 payload).
void WritePng(const std::string& path, const Image& im);
void WriteJpeg(const std::string& path, const Image& im, const std::vector<Bytes>& rawIcc = {});
Image ReadPng(const std::string& path);
Image ReadJpeg(const std::string& path);  // in the file's own colour space
#if TINTWELL_IMAGE_FILES
void WriteTiff(const std::string& path, const Image& im, bool big);
Image ReadTiff(const std::string& path);
#endif

enum class Kind { Png, Jpeg, Tiff, BigTiff };
// A patterned image of the kind, with the profile when not empty.
void Make(Kind kind, const std::string& path, int width, int height, int channels, const Bytes& profile,
          const std::vector<Bytes>& rawIcc = {});
Image Read(Kind kind, const std::string& path);

Bytes ReadFile(const std::string& path);
void WriteFile(const std::string& path, const Bytes& bytes);

}  // namespace testimage

#endif
