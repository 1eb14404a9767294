// The plugin's tag codecs, by type, and the Profile methods built on them.
#ifndef TINTWELL_TAGS_TAG_CODECS_H
#define TINTWELL_TAGS_TAG_CODECS_H

#include <cstdint>

#include "plugin_records.h"
#include "win32_api.h"

// curveType (and, when reading, parametricCurveType): tags/curve_codec.cpp
void HALVO_ICMWriteTagCurve(HPROFILE profile, TAGTYPE tag, REALobject vector);
int32_t HALVO_ICMReadTagCurve(HPROFILE profile, TAGTYPE tag, REALobject vector);

// XYZType: tags/xyz_codec.cpp
void HALVO_ICMWriteTagXYZ(HPROFILE profile, TAGTYPE tag, double x, double y, double z);
int32_t HALVO_ICMReadTagXYZ(HPROFILE profile, TAGTYPE tag, double* x, double* y, double* z);

// textType and textDescriptionType (and, when reading, multiLocalizedUnicodeType):
// tags/text_codec.cpp. The readers are called twice: without a buffer for the size to
// allocate, then with a buffer of that size.
void HALVO_ICMWriteTagText(HPROFILE profile, TAGTYPE tag, const char* text);
int32_t HALVO_ICMReadTagText(HPROFILE profile, TAGTYPE tag, char* buffer);
void HALVO_ICMWriteTagDesc(HPROFILE profile, TAGTYPE tag, const char* text);
int32_t HALVO_ICMReadTagDesc(HPROFILE profile, TAGTYPE tag, char* buffer);

// namedColor2Type: tags/named_color_codec.cpp
void HALVO_ICMWriteTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC);
int32_t HALVO_ICMReadTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC);

// Profile methods that exchange a tag with a container, registered with Profile's
// other members in profile/profile_class.cpp.
namespace tag_members {
void GetTRC(REALobject self, REALstring tag, REALobject vector);
void SetTRC(REALobject self, REALstring tag, REALobject vector);
void GetNC(REALobject self, REALstring tag, REALobject vectorNC);
void SetNC(REALobject self, REALstring tag, REALobject vectorNC);
}  // namespace tag_members

#endif
