#include "registration.h"

#include "cmcolor.h"
#include "colorworld.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "profile.h"

namespace {

// Classes in registration order: halvoDebugger, Matrix, Vector, VectorNC, VectorF,
// CMColor, Profile, ColorWorld, cLut. A class joins this list once it is built.
REALclassDefinition* const kClasses[] = {
    &halvoDebuggerClass,
    &CMColorClass,
    &ProfileClass,
    &ColorWorldClass,
};

// Global methods in registration order; a method joins this table once it is built.
REALmethodDefinition globalMethods[] = {
    {reinterpret_cast<REALproc>(&halvoRegisterDebugger), nullptr, "halvoRegisterDebugger(debugger as halvoDebugger)"},
    {reinterpret_cast<REALproc>(&halvoUnregisterDebugger), nullptr, "halvoUnregisterDebugger()"},
    {reinterpret_cast<REALproc>(&CMError), nullptr, "CMError() as Integer"},
    {reinterpret_cast<REALproc>(&CMErrorMessage), nullptr, "CMErrorMessage() as string"},
    {reinterpret_cast<REALproc>(&NewConcatColorWorld), nullptr,
     "NewConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile) as "
     "ColorWorld"},
};

}  // namespace

void RegisterClasses() {
  for (REALclassDefinition* definition : kClasses) bridge::PluginRegisterClass(definition);
}

void RegisterGlobalMethods() {
  for (REALmethodDefinition& method : globalMethods) bridge::PluginRegisterMethod(&method);
}
