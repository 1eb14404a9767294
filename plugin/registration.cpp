#include "registration.h"

#include "class_tables.h"
#include "clut.h"
#include "cmcolor.h"
#include "colorworld.h"
#include "debugger.h"
#include "discovery.h"
#include "error_state.h"
#include "host_bridge.h"
#include "image_profiles.h"
#include "matrix.h"
#include "profile.h"
#include "vector.h"
#include "vector_f.h"
#include "vector_nc.h"

namespace {

// Classes in registration order: halvoDebugger, Matrix, Vector, VectorNC, VectorF,
// CMColor, Profile, ColorWorld, cLut.
REALclassDefinition* const kClasses[] = {
    &halvoDebuggerClass,
    &MatrixClass,
    &VectorClass,
    &VectorNCClass,
    &VectorFClass,
    &CMColorClass,
    &ProfileClass,
    &ColorWorldClass,
    &ClutClass,
};

// Global methods in registration order.
REALmethodDefinition globalMethods[] = {
    {AsProc(&halvoRegisterDebugger), nullptr, "halvoRegisterDebugger(debugger as halvoDebugger)"},
    {AsProc(&halvoUnregisterDebugger), nullptr, "halvoUnregisterDebugger()"},
    {AsProc(&GetSystemProfile), nullptr, "GetSystemProfile() as Profile"},
    {AsProc(&CMError), nullptr, "CMError() as Integer"},
    {AsProc(&CMErrorMessage), nullptr, "CMErrorMessage() as string"},
    {AsProc(&GetImageSpace), nullptr, "GetImageSpace(f as Folderitem) as String"},
    {AsProc(&TintwellVersion), nullptr, "TintwellVersion() as Integer"},
    {AsProc(&GetProfileByUse), nullptr, "GetProfileByUse(use as String) as Profile"},
    {AsProc(&TintwellFolder), nullptr, "TintwellFolder() as Folderitem"},
    {AsProc(&CMMcount), nullptr, "CMMcount() as Integer"},
    {AsProc(&getProfileBySpace), nullptr, "getProfileBySpace(theSpace as String) as Profile"},
    {AsProc(&GetMonitorProfile), nullptr, "GetMonitorProfile() as Profile"},
    {AsProc(&CreateProfileIdentifier), nullptr,
     "CreateProfileIdentifier(p as profile, ident as Integer, size as Integer) as Integer"},
    {AsProc(&EmbedImage), nullptr,
     "EmbedImage(fromf as folderitem, tof as folderitem, replace as boolean, p as Profile) as Boolean"},
    {AsProc(&ImageProfileCount), nullptr, "ImageProfileCount(f as folderitem) as Integer"},
    {AsProc(&GetImageProfile), nullptr, "GetImageProfile(f as folderitem, index as Integer) as Profile"},
    {AsProc(&NewLinkProfile), nullptr,
     "NewLinkProfile(f as folderitem, keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as "
     "Profile) as Profile"},
    {AsProc(&NewConcatColorWorld), nullptr,
     "NewConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile) as "
     "ColorWorld"},
    {AsProc(&CopyProfile), nullptr, "CopyProfile(f as folderitem, p as Profile) as Profile"},
    {AsProc(&BlankProfile), nullptr, "BlankProfile(f as folderitem) as Profile"},
    {AsProc(&ProfileSearch), nullptr,
     "ProfileSearch(cmm as String, aClass as String, dataspace as String, connectspace as String, manufacturer as "
     "String, model as Integer, profiles as VectorF)"},
};

}  // namespace

void RegisterClasses() {
  for (REALclassDefinition* definition : kClasses) bridge::PluginRegisterClass(definition);
}

void RegisterGlobalMethods() {
  for (REALmethodDefinition& method : globalMethods) bridge::PluginRegisterMethod(&method);
}
