// Reference counting shared by the runtime and the Object handle.
#ifndef TINTWELL_HOST_RUNTIME_INTERNAL_H
#define TINTWELL_HOST_RUNTIME_INTERNAL_H

#include <string>

#include "plugin_records.h"

namespace host::internal {

void LockObject(REALobject object);
void UnlockObject(REALobject object);
std::string ClassNameOf(REALobject object);

}  // namespace host::internal

#endif
