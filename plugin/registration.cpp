#include "registration.h"

#include "class_tables.h"
#include "clut.h"
#include "cmcolor.h"
#include "colorworld.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "image_profiles.h"
#include "matrix.h"
#include "profile.h"
#include "vector.h"
#include "vector_nc.h"

namespace {

// Classes in registration order: halvoDebugger, Matrix, Vector, VectorNC, VectorF,
// CMColor, Profile, ColorWorld, cLut. A class joins this list once it is built.
REALclassDefinition* const kClasses[] = {
    &halvoDebuggerClass,
    &MatrixClass,
    &VectorClass,
    &VectorNCClass,
    &CMColorClass,
    &ProfileClass,
    &ColorWorldClass,
    &ClutClass,
};

// Global methods in registration order; a method joins this table once it is built.
REALmethodDefinition globalMethods[] = {
    {AsProc(&halvoRegisterDebugger), nullptr, "halvoRegisterDebugger(debugger as halvoDebugger)"},
    {AsProc(&halvoUnregisterDebugger), nullptr, "halvoUnregisterDebugger()"},
    {AsProc(&CMError), nullptr, "CMError() as Integer"},
    {AsProc(&CMErrorMessage), nullptr, "CMErrorMessage() as string"},
    {AsProc(&GetImageSpace), nullptr, "GetImageSpace(f as Folderitem) as String"},
    {AsProc(&EmbedImage), nullptr,
     "EmbedImage(fromf as folderitem, tof as folderitem, replace as boolean, p as Profile) as Boolean"},
    {AsProc(&ImageProfileCount), nullptr, "ImageProfileCount(f as folderitem) as Integer"},
    {AsProc(&GetImageProfile), nullptr, "GetImageProfile(f as folderitem, index as Integer) as Profile"},
    {AsProc(&NewConcatColorWorld), nullptr,
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
