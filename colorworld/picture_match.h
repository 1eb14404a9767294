// Picture matching: a host picture converted through a colour world's transform into a
// new 32-bit picture. Pixels are read one by one from the picture's device context,
// translated in one bitmap call, and drawn into the new picture in one DIB call.
#ifndef TINTWELL_COLORWORLD_PICTURE_MATCH_H
#define TINTWELL_COLORWORLD_PICTURE_MATCH_H

#include <cstddef>
#include <cstdint>

#include "plugin_records.h"
#include "win32_api.h"

// ColorWorld method "MatchPicture(...) as Picture": the converted top-left width x
// height area of picture as a new picture, or nil. depth and transparent are accepted
// and not used.
REALpicture MatchPicture(REALobject self, REALpicture picture, int32_t width, int32_t height, int32_t depth,
                         bool transparent);

// The bytes of a width x height image of 3-byte pixels (B, G, R, rows unpadded), or 0
// when the size is not positive or the buffer, or its copy with rows padded to 4 bytes,
// would not fit the address space.
std::size_t PictureImageBytes(int32_t width, int32_t height);

// Fills image (PictureImageBytes long) with the picture's pixels; false, with the error
// set, when the picture has no graphics object or device context.
bool BuildImageDataFromPicture(REALpicture picture, int32_t width, int32_t height, BYTE* image);

// A new 32-bit picture holding the image's pixels, or nil when the host cannot make one
// with a graphics object and device context.
REALpicture BuildPictureFromImageData(int32_t width, int32_t height, const BYTE* image);

// The allocator of the padded copy, replaceable so that its failure can be exercised.
using PictureAllocator = void* (*)(std::size_t bytes);
void SetPictureCopyAllocator(PictureAllocator allocator);  // null restores malloc

#endif
