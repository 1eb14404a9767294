// The host entries the resolver answers, by name.
#include <cstring>

#include "runtime_impl.h"

namespace host {
namespace {

extern "C" {
static void EntryRegisterPluginVersion(int32_t version) { Active().pluginVersion = version; }
static void EntryPluginRegisterClass(REALclassDefinition* def) { Active().RegisterClass(def); }
static void EntryPluginRegisterMethod(REALmethodDefinition* m) { Active().RegisterMethod(m); }
static REALstring EntryREALBuildString(const char* text, int32_t length) {
  if (length < 0 || (!text && length > 0)) return nullptr;
  return Active().BuildString(text, static_cast<std::size_t>(length));
}
static void EntryREALLockObject(REALobject o) { Active().LockObject(o); }
static void EntryREALUnlockObject(REALobject o) { Active().UnlockObject(o); }
static void EntryREALLockString(REALstring s) { Active().LockString(s); }
static void EntryREALUnlockString(REALstring s) { Active().UnlockString(s); }
static REALproc EntryGetEventInstance(REALobject o, intptr_t eventWord) {
  Runtime::Impl& rt = Active();
  ++rt.eventLookups;
  if (!o || !rt.liveObjects.count(o) || !o->extras) return nullptr;
  for (auto& b : o->extras->events)
    if (b->eventId == eventWord) return reinterpret_cast<REALproc>(b->code);
  return nullptr;
}
static REALfolderItem EntryFolderItemFromPath(const char* path) {
  if (!path) return nullptr;
  return Active().NewFolderItem(path);
}
static REALstring EntryREALpathFromFolderItem(REALfolderItem item) {
  Runtime::Impl& rt = Active();
  if (!rt.IsA(item, rt.folderItemClass.get())) return nullptr;
  const std::string& path = rt.Extras(item).folderPath;
  return rt.BuildString(path.data(), path.size());
}
// A picture's graphics object is the picture's (borrowed, as it stays while the picture
// lives); a new picture carries one reference for the caller.
static REALgraphics EntryPictureGraphicsGetter(REALpicture picture) { return Active().PictureGraphics(picture); }
static void* EntryREALGraphicsDC(REALgraphics graphics) { return Active().GraphicsDC(graphics); }
static REALpicture EntryNewPicture(int32_t width, int32_t height, int32_t depth) {
  return Active().NewPicture(width, height, depth);
}
static REALobject EntryPluginNewInstance(const char* className) {
  if (!className) return nullptr;
  Runtime::Impl& rt = Active();
  ClassEntry* cls = rt.FindClass(className);
  if (!cls || !cls->definition) return nullptr;
  return rt.NewObject(cls);
}
}

struct EntryName {
  const char* name;
  void* address;
};

const EntryName kEntries[] = {
    {"RegisterPluginVersion", reinterpret_cast<void*>(&EntryRegisterPluginVersion)},
    {"PluginRegisterClass", reinterpret_cast<void*>(&EntryPluginRegisterClass)},
    {"PluginRegisterMethod", reinterpret_cast<void*>(&EntryPluginRegisterMethod)},
    {"REALBuildString", reinterpret_cast<void*>(&EntryREALBuildString)},
    {"REALLockObject", reinterpret_cast<void*>(&EntryREALLockObject)},
    {"REALUnlockObject", reinterpret_cast<void*>(&EntryREALUnlockObject)},
    {"REALLockString", reinterpret_cast<void*>(&EntryREALLockString)},
    {"REALUnlockString", reinterpret_cast<void*>(&EntryREALUnlockString)},
    {"GetEventInstance", reinterpret_cast<void*>(&EntryGetEventInstance)},
    {"FolderItemFromPath", reinterpret_cast<void*>(&EntryFolderItemFromPath)},
    {"REALpathFromFolderItem", reinterpret_cast<void*>(&EntryREALpathFromFolderItem)},
    {"pluginPictureGraphicsGetter", reinterpret_cast<void*>(&EntryPictureGraphicsGetter)},
    {"REALGraphicsDC", reinterpret_cast<void*>(&EntryREALGraphicsDC)},
    {"newPicture", reinterpret_cast<void*>(&EntryNewPicture)},
    {"PluginNewInstance", reinterpret_cast<void*>(&EntryPluginNewInstance)},
};

}  // namespace

extern "C" void* ResolveEntry(const char* name) {
  Runtime::Impl& rt = Active();
  if (!name) return nullptr;
  rt.resolved.emplace_back(name);
  if (rt.withheld.count(name)) return nullptr;
  for (const EntryName& e : kEntries)
    if (std::strcmp(e.name, name) == 0) return e.address;
  return nullptr;
}

}  // namespace host
