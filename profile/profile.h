// The Profile class: a script's handle on one ICC profile file, worked on through a
// copy of it in the plugin's temporary folder.
#ifndef TINTWELL_PROFILE_PROFILE_H
#define TINTWELL_PROFILE_PROFILE_H

#include "plugin_records.h"
#include "instance_data.h"
#include "win32_api.h"

struct ProfileData {
  HPROFILE profile;         // the working copy's open handle; 0 when none is open
  char path[MAX_PATH];      // the profile's own file, written by SaveProfile
  char tempPath[MAX_PATH];  // the working copy: the temporary folder and tempName
  char tempName[36];        // the working copy's file name, a decimal counter value
  bool installed;           // a copy named tempName was installed in the colour directory
  bool ownsFile;            // path is a temporary file of the plugin's, deleted with the object
};

extern REALclassDefinition ProfileClass;

inline ProfileData* GetProfileData(REALobject profile) {
  return static_cast<ProfileData*>(GetInstanceDataOf(profile, ProfileClass));
}

// The open handle of a Profile argument, or 0 for nil or an Empty profile.
HPROFILE ProfileHandle(REALobject profile);

// Fills the 128-byte header from the profile, zeroed first. On failure traces
// "Error opening profile header" and reports the system error; the header stays zero.
BOOL ReadProfileHeader(HPROFILE profile, PROFILEHEADER* header);

// A named-colour index outside 1 to the number of colours in the profile's list.
constexpr int32_t kErrorNamedColorIndex = -3;

// Members of the class, defined with their concerns and gathered in profile_class.cpp.
namespace profile_members {
void ConstructFromFile(REALobject self, REALfolderItem f);
void ConstructWithIntent(REALobject self, REALfolderItem f, int32_t intent, int32_t quality, REALstring cmm);
void ConstructFromProfile(REALobject self, REALfolderItem f, REALobject p);
void SaveProfileAs(REALobject self, REALfolderItem f);
void SaveProfile(REALobject self);
bool ValidProfile(REALobject self);
void Destruct(REALobject self);
REALfolderItem GetLocation(REALobject self, intptr_t);
int32_t GetLocationType(REALobject self, intptr_t);
int32_t GetRefCount(REALobject self, intptr_t);
bool GetModified(REALobject self, intptr_t);

// Tag access: profile/tag_access.cpp
int32_t GetTagCount(REALobject self, intptr_t);
bool TagExists(REALobject self, REALstring tag);
REALstring TagName(REALobject self, int32_t index);
REALstring TagDataAt(REALobject self, int32_t index);
REALstring TagDataOf(REALobject self, REALstring tag);
int32_t RemoveTag(REALobject self, REALstring tag);
int32_t SetTagData(REALobject self, REALstring tag, REALstring data);
int32_t SetTagRef(REALobject self, REALstring tag, REALstring ref);
void GetXYZTag(REALobject self, REALstring tag, double* wx, double* wy, double* wz);
void SetXYZTag(REALobject self, REALstring tag, double wx, double wy, double wz);
REALstring GetTextTypeTag(REALobject self, REALstring tag);
void SetTextTypeTag(REALobject self, REALstring tag, REALstring data);
REALstring GetDescTypeTag(REALobject self, REALstring tag);
void SetDescTypeTag(REALobject self, REALstring tag, REALstring data);
REALstring GetName(REALobject self, intptr_t);
void SetName(REALobject self, intptr_t, REALstring value);
REALstring GetCopyright(REALobject self, intptr_t);
void SetCopyright(REALobject self, intptr_t, REALstring value);
int32_t GetNamedColorCount(REALobject self, intptr_t);
int32_t GetNamedColorChannels(REALobject self, intptr_t);
REALstring GetNamedColorDevicespace(REALobject self, intptr_t);
REALstring GetNamedColorPCSspace(REALobject self, intptr_t);
REALstring GetNamedColorPrefix(REALobject self, intptr_t);
REALstring GetNamedColorSuffix(REALobject self, intptr_t);
REALstring GetNamedColorName(REALobject self, int32_t index);
void GetIndNamedColorPCS(REALobject self, int32_t index, double* l, double* a, double* b);
int32_t GetNamedColorIndex(REALobject self, REALstring name);
}  // namespace profile_members

#endif
