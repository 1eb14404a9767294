// ICC profiles in PNG, JPEG and TIFF files, worked on in memory: reading the profile an
// image carries and writing the same image with another profile, its pixel data copied
// as it is (PNG and TIFF: the compressed data; JPEG: the DCT coefficients).
//
// Every reader here takes untrusted bytes: a file that is cut short, a chunk or marker
// whose length claims more than the file holds, a profile split across JPEG markers
// whose pieces are missing, repeated or numbered beyond their count, or a compressed
// PNG profile that would inflate past kMaxProfileBytes is refused as a whole.
//
// Reading looks at the image's metadata only (PNG: every chunk, each checked against
// its CRC; JPEG and TIFF: the headers and markers before the image data). Embedding
// reads all of the image data, and refuses an image whose data is incomplete.
#ifndef TINTWELL_DISCOVERY_IMAGE_FORMATS_H
#define TINTWELL_DISCOVERY_IMAGE_FORMATS_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace image {

using Bytes = std::vector<std::uint8_t>;

// The largest image file read, and the largest profile read from or written into one.
constexpr std::size_t kMaxImageBytes = std::size_t{256} << 20;
constexpr std::size_t kMaxProfileBytes = std::size_t{16} << 20;

enum class Format { Unknown, Png, Jpeg, Tiff };

struct ImageInfo {
  Format format = Format::Unknown;
  bool hasProfile = false;
  Bytes profile;
  char space[5] = {0};  // the image's own colour space: "RGB ", "GRAY" or "CMYK"
};

// The format by the file's first bytes.
Format Detect(const std::uint8_t* data, std::size_t size);

// Reads the image's space and embedded profile. False when the bytes are not a
// readable image of these formats. May throw std::bad_alloc.
bool ReadImage(const std::uint8_t* data, std::size_t size, ImageInfo& info);

// Writes into out the image with profile as its only embedded profile. False when the
// image cannot be read whole or the result cannot be made. May throw std::bad_alloc.
bool EmbedProfile(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out);

// One per format; the image is known to be of that format by its first bytes.
bool ReadPng(const std::uint8_t* data, std::size_t size, ImageInfo& info);
bool EmbedPng(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out);
bool ReadJpeg(const std::uint8_t* data, std::size_t size, ImageInfo& info);
bool EmbedJpeg(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out);
bool ReadTiff(const std::uint8_t* data, std::size_t size, ImageInfo& info);
bool EmbedTiff(const std::uint8_t* data, std::size_t size, const Bytes& profile, Bytes& out);

}  // namespace image

#endif
