#include "host_bridge.h"

namespace bridge {
namespace {

REALresolver g_resolver = nullptr;

// The host entry cache: one slot per entry, null until resolved.
struct EntryCache {
  RegisterPluginVersionProc registerPluginVersion;
  PluginRegisterClassProc registerClass;
  PluginRegisterMethodProc registerMethod;
  REALBuildStringProc buildString;
  REALLockObjectProc lockObject;
  REALUnlockObjectProc unlockObject;
  REALLockStringProc lockString;
  REALUnlockStringProc unlockString;
  GetEventInstanceProc getEventInstance;
  FolderItemFromPathProc folderItemFromPath;
  REALpathFromFolderItemProc pathFromFolderItem;
  pluginPictureGraphicsGetterProc pictureGraphics;
  REALGraphicsDCProc graphicsDC;
  newPictureProc newPicture;
  PluginNewInstanceProc newInstance;
} g_cache;

template <class Proc>
Proc Resolve(Proc& slot, const char* name) {
  if (!slot && g_resolver) slot = reinterpret_cast<Proc>(g_resolver(name));
  return slot;
}

}  // namespace

void SetResolver(REALresolver resolver) { g_resolver = resolver; }

void RegisterPluginVersion(int32_t version) {
  if (auto f = Resolve(g_cache.registerPluginVersion, "RegisterPluginVersion")) f(version);
}
void PluginRegisterClass(REALclassDefinition* definition) {
  if (auto f = Resolve(g_cache.registerClass, "PluginRegisterClass")) f(definition);
}
void PluginRegisterMethod(REALmethodDefinition* method) {
  if (auto f = Resolve(g_cache.registerMethod, "PluginRegisterMethod")) f(method);
}
REALstring BuildString(const char* text, int32_t length) {
  auto f = Resolve(g_cache.buildString, "REALBuildString");
  return f ? f(text, length) : nullptr;
}
void LockObject(REALobject object) {
  if (auto f = Resolve(g_cache.lockObject, "REALLockObject")) f(object);
}
void UnlockObject(REALobject object) {
  if (auto f = Resolve(g_cache.unlockObject, "REALUnlockObject")) f(object);
}
void LockString(REALstring string) {
  if (auto f = Resolve(g_cache.lockString, "REALLockString")) f(string);
}
void UnlockString(REALstring string) {
  if (auto f = Resolve(g_cache.unlockString, "REALUnlockString")) f(string);
}
REALproc GetEventInstance(REALobject object, intptr_t eventWord) {
  auto f = Resolve(g_cache.getEventInstance, "GetEventInstance");
  return f ? f(object, eventWord) : nullptr;
}
REALfolderItem FolderItemFromPath(const char* windowsPath) {
  auto f = Resolve(g_cache.folderItemFromPath, "FolderItemFromPath");
  return f ? f(windowsPath) : nullptr;
}
REALstring PathFromFolderItem(REALfolderItem item) {
  auto f = Resolve(g_cache.pathFromFolderItem, "REALpathFromFolderItem");
  return f ? f(item) : nullptr;
}
REALgraphics PictureGraphics(REALpicture picture) {
  auto f = Resolve(g_cache.pictureGraphics, "pluginPictureGraphicsGetter");
  return f ? f(picture) : nullptr;
}
void* GraphicsDC(REALgraphics graphics) {
  auto f = Resolve(g_cache.graphicsDC, "REALGraphicsDC");
  return f ? f(graphics) : nullptr;
}
REALpicture NewPicture(int32_t width, int32_t height, int32_t depth) {
  auto f = Resolve(g_cache.newPicture, "newPicture");
  return f ? f(width, height, depth) : nullptr;
}
REALobject NewInstance(const char* className) {
  auto f = Resolve(g_cache.newInstance, "PluginNewInstance");
  return f ? f(className) : nullptr;
}

}  // namespace bridge
