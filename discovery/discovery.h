// Global methods that find the profiles in the colour directory and make new profile
// files (device links, blank and copied profiles), with the entries that answer
// constants on this platform.
#ifndef TINTWELL_DISCOVERY_DISCOVERY_H
#define TINTWELL_DISCOVERY_DISCOVERY_H

#include <cstdint>

#include "plugin_records.h"

// discovery/profile_search.cpp
int32_t TintwellVersion();
int32_t CMMcount();
int32_t CreateProfileIdentifier(REALobject p, int32_t ident, int32_t size);
REALobject GetMonitorProfile();
REALobject GetSystemProfile();
REALobject GetProfileByUse(REALstring use);
REALobject getProfileBySpace(REALstring theSpace);
REALfolderItem TintwellFolder();
void ProfileSearch(REALstring cmm, REALstring aClass, REALstring dataspace, REALstring connectspace,
                   REALstring manufacturer, int32_t model, REALobject profiles);

// discovery/new_profiles.cpp
REALobject NewLinkProfile(REALfolderItem f, int32_t keyindex, REALobject p1, REALobject p2, REALobject p3,
                          REALobject p4);
REALobject BlankProfile(REALfolderItem f);
REALobject CopyProfile(REALfolderItem f, REALobject p);

#endif
