// The one function the plugin exports.
#include "host_bridge.h"
#include "registration.h"
#include "temp_folder.h"

#ifdef _WIN32
#define TINTWELL_EXPORT __declspec(dllexport)
#else
#define TINTWELL_EXPORT __attribute__((visibility("default")))
#endif

extern "C" TINTWELL_EXPORT void REALPluginMain(REALresolver resolver) {
  bridge::SetResolver(resolver);
  bridge::RegisterPluginVersion(REAL_PLUGIN_VERSION);
  RegisterClasses();
  RegisterGlobalMethods();
  SetUpTempFolder();
  TempNameCounter = 0;
}
