// The plugin's way to the host: one small function per host entry. Each resolves its
// entry by name on first use and caches it; while the host cannot supply the entry,
// the call does nothing and yields 0, null or false, and resolution is tried again on
// the next call.
#ifndef TINTWELL_PLUGIN_HOST_BRIDGE_H
#define TINTWELL_PLUGIN_HOST_BRIDGE_H

#include <cstdint>

#include "plugin_records.h"

namespace bridge {

void SetResolver(REALresolver resolver);

void RegisterPluginVersion(int32_t version);
void PluginRegisterClass(REALclassDefinition* definition);
void PluginRegisterMethod(REALmethodDefinition* method);
REALstring BuildString(const char* text, int32_t length);
void LockObject(REALobject object);
void UnlockObject(REALobject object);
void LockString(REALstring string);
void UnlockString(REALstring string);
REALproc GetEventInstance(REALobject object, intptr_t eventWord);
REALfolderItem FolderItemFromPath(const char* windowsPath);
REALstring PathFromFolderItem(REALfolderItem item);
REALgraphics PictureGraphics(REALpicture picture);
void* GraphicsDC(REALgraphics graphics);
REALpicture NewPicture(int32_t width, int32_t height, int32_t depth);
REALobject NewInstance(const char* className);

// A host string's text and byte length; a nil string reads as empty text.
inline const char* StringText(REALstring s) { return s && s->buffer ? s->buffer + 1 : ""; }
inline int32_t StringLength(REALstring s) { return s && s->buffer ? static_cast<int32_t>(s->length) : 0; }

}  // namespace bridge

#endif
