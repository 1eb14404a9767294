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
}  // namespace profile_members

#endif
