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
// allocate, then with a buffer of that size; the caller takes as many bytes from the
// buffer as the second call answers. Whatever the type, the buffer then also holds a
// zero byte behind those bytes.
//   text tag:  first the element's whole size; then the bytes behind the type header,
//              the stored terminating zero included (L + 1 for a text of L bytes).
//   desc tag:  first the ASCII count + 1; then the ASCII count - 1 (the text's length).
//   mluc tag:  (either reader) first the decoded text's length + 1; then its length.
// Failure: -1 from the text reader, 0 from the description reader; either way the
// caller sizes nothing from it.
void HALVO_ICMWriteTagText(HPROFILE profile, TAGTYPE tag, const char* text);
int32_t HALVO_ICMReadTagText(HPROFILE profile, TAGTYPE tag, char* buffer);
void HALVO_ICMWriteTagDesc(HPROFILE profile, TAGTYPE tag, const char* text);
int32_t HALVO_ICMReadTagDesc(HPROFILE profile, TAGTYPE tag, char* buffer);

// lut8Type and lut16Type, between a tag and a cLut: tags/lut_codec.cpp. The reader
// refuses any other type and any tag whose tables do not fit inside it, leaving the cLut
// as it was; it returns -1 on failure.
void HALVO_ICMWriteTagClut(HPROFILE profile, TAGTYPE tag, REALobject clut);
int32_t HALVO_ICMReadTagClut(HPROFILE profile, TAGTYPE tag, REALobject clut);

// namedColor2Type: tags/named_color_codec.cpp
void HALVO_ICMWriteTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC);
int32_t HALVO_ICMReadTagNC(HPROFILE profile, TAGTYPE tag, REALobject vectorNC);

// Profile methods that exchange a tag with a container, registered with Profile's
// other members in profile/profile_class.cpp.
namespace tag_members {
void GetTRC(REALobject self, REALstring tag, REALobject vector);
void SetTRC(REALobject self, REALstring tag, REALobject vector);
REALobject GetMFT(REALobject self, REALstring tag);
void SetMFT(REALobject self, REALstring tag, REALobject clut);
void GetNC(REALobject self, REALstring tag, REALobject vectorNC);
void SetNC(REALobject self, REALstring tag, REALobject vectorNC);
}  // namespace tag_members

#endif
