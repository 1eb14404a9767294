// PNG and JPEG files to and from host pictures. A picture holds 8-bit RGB; what else a
// file carries (alpha, 16-bit depth, gray) is kept beside it so that it can be written
// back: alpha untouched at its own depth, 16-bit channels as 16 bits again.
#ifndef TINTWELL_TOOLS_IMAGE_IO_H
#define TINTWELL_TOOLS_IMAGE_IO_H

#include <cstdint>
#include <string>
#include <vector>

#include "host/runtime.h"

namespace tool {

enum class ImageFormat { Png, Jpeg };

// The format a file name asks for by its extension (.png, .jpg, .jpeg, any case), or
// false when it names none.
bool FormatFromName(const std::string& path, ImageFormat* format);

struct ImageExtras {
  int width = 0, height = 0;
  int depth = 8;                    // bits per channel in the file: 8 or 16
  bool gray = false;                // the file held gray levels
  bool alpha = false;               // the file held an alpha channel ...
  std::vector<std::uint16_t> alphaPlane;  // ... here, width x height, at the file's depth
  std::vector<std::uint8_t> icc;    // the file's embedded ICC profile, if any
};

// Reads a PNG or JPEG file (by its content) into a new picture. Throws JobError for a
// file that cannot be read or decoded.
host::Object ReadImage(host::Runtime& rt, const std::string& path, ImageExtras* extras);

// Writes the picture, with the alpha and depth of extras, to path in format, with icc
// embedded (PNG iCCP, JPEG APP2). The file appears whole or not at all. A JPEG has
// neither alpha nor 16-bit channels: they are dropped. Throws JobError on failure.
void WriteImage(host::Runtime& rt, const host::Object& picture, const ImageExtras& extras, ImageFormat format,
                const std::string& path, const std::vector<std::uint8_t>& icc);

}  // namespace tool

#endif
