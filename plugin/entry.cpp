// The one function the plugin exports.
#include "host_bridge.h"
#include "registration.h"
#include "temp_folder.h"

extern "C" __attribute__((visibility("default"))) void REALPluginMain(REALresolver resolver) {
  bridge::SetResolver(resolver);
  bridge::RegisterPluginVersion(REAL_PLUGIN_VERSION);
  RegisterClasses();
  RegisterGlobalMethods();
  SetUpTempFolder();
  TempNameCounter = 0;
}
