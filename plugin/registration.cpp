#include "registration.h"

#include "cmcolor.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"

namespace {

// Classes in registration order: halvoDebugger, Matrix, Vector, VectorNC, VectorF,
// CMColor, Profile, ColorWorld, cLut. A class joins this list once it is built.
REALclassDefinition* const kClasses[] = {
    &halvoDebuggerClass,
    &CMColorClass,
};

// Global methods in registration order; a method joins this table once it is built.
REALmethodDefinition globalMethods[] = {
    {reinterpret_cast<REALproc>(&halvoRegisterDebugger), nullptr, "halvoRegisterDebugger(debugger as halvoDebugger)"},
    {reinterpret_cast<REALproc>(&halvoUnregisterDebugger), nullptr, "halvoUnregisterDebugger()"},
    {reinterpret_cast<REALproc>(&CMError), nullptr, "CMError() as Integer"},
    {reinterpret_cast<REALproc>(&CMErrorMessage), nullptr, "CMErrorMessage() as string"},
};

}  // namespace

void RegisterClasses() {
  for (REALclassDefinition* definition : kClasses) bridge::PluginRegisterClass(definition);
}

void RegisterGlobalMethods() {
  for (REALmethodDefinition& method : globalMethods) bridge::PluginRegisterMethod(&method);
}
