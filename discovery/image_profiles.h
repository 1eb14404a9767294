// Global methods for ICC profiles in image files (PNG, JPEG, TIFF).
#ifndef TINTWELL_DISCOVERY_IMAGE_PROFILES_H
#define TINTWELL_DISCOVERY_IMAGE_PROFILES_H

#include <cstdint>

#include "plugin_records.h"

// The plugin's own codes for image files.
constexpr int32_t kErrorNotAnImage = -30;          // not a readable PNG, JPEG or TIFF file
constexpr int32_t kErrorNoImageSupport = -31;      // built without the image libraries
constexpr int32_t kErrorImageHasProfile = -32;     // EmbedImage without replace: the image has one
constexpr int32_t kErrorProfileNotEmbedded = -33;  // image data incomplete, or the profile unfit for it

bool EmbedImage(REALfolderItem fromf, REALfolderItem tof, bool replace, REALobject p);
int32_t ImageProfileCount(REALfolderItem f);
REALobject GetImageProfile(REALfolderItem f, int32_t index);
REALstring GetImageSpace(REALfolderItem f);

#endif
