// An object's instance data block lies at the object's address plus the offset the
// host wrote into its class definition at registration.
#ifndef TINTWELL_PLUGIN_INSTANCE_DATA_H
#define TINTWELL_PLUGIN_INSTANCE_DATA_H

#include "plugin_records.h"

inline void* GetInstanceDataOf(REALobject object, const REALclassDefinition& definition) {
  return reinterpret_cast<char*>(object) + definition.forSystemUse;
}

template <class Record>
Record* GetInstanceData(REALobject object, const REALclassDefinition& definition) {
  return static_cast<Record*>(GetInstanceDataOf(object, definition));
}

#endif
