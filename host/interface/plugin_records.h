/* The records that pass between a plugin and its host (plugin interface version 5),
 * in native word size: every word is pointer-sized.
 *
 * This is the only host header a plugin includes.
 *
 * Ownership rules (the host follows them, and so must every plugin):
 *  - Host entry results: an object or string that a host entry returns
 *    (PluginNewInstance, FolderItemFromPath, newPicture, REALBuildString,
 *    REALpathFromFolderItem) carries one reference owned by the caller, who keeps it,
 *    hands it on as a result, or unlocks it. A new instance has had its class
 *    constructor run.
 *  - Object result: an object a registered function returns carries one reference that
 *    passes to the host. A function returning an object it also keeps locks it once more
 *    for the caller first.
 *  - String result: REALBuildString returns a string carrying one reference owned by
 *    the caller; a registered function that returns a string hands that reference to
 *    the host.
 *  - Arguments: objects and strings passed to a registered function are borrowed for
 *    the call. A function that keeps one beyond the call locks it (REALLockObject,
 *    REALLockString) and later unlocks it.
 *  - ByRef String arguments: the variable owns one reference to its string (or holds
 *    nil). A function that stores a new string there unlocks the old one and stores a
 *    string whose reference it hands over. ByRef objects follow the same rule.
 *  - Event arguments: borrowed by the handler for the duration of the call. A plugin
 *    that builds a string to pass to an event still owns it and unlocks it after the
 *    handler returns.
 *  - Property setters receive borrowed values; getters return values as results do.
 *  - Strings are immutable once built; the text a string record addresses stays valid
 *    while the plugin holds a reference to the string. */
#ifndef TINTWELL_HOST_PLUGIN_RECORDS_H
#define TINTWELL_HOST_PLUGIN_RECORDS_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#define REAL_PLUGIN_VERSION 5

typedef struct REALobjectStruct* REALobject;
typedef struct REALstringRecord* REALstring;
typedef REALobject REALfolderItem;
typedef REALobject REALpicture;
typedef REALobject REALgraphics;

typedef void (*REALproc)(void);
typedef void* (*REALresolver)(const char* entryName);

/* The host string record. A plugin reads only the second and fourth words: the buffer
 * whose zero-terminated text begins one byte after its address, and the byte length. */
struct REALstringRecord {
  intptr_t hostWord0;
  const char* buffer;
  intptr_t hostWord2;
  intptr_t length;
};

/* Property record: 10 words. */
typedef struct {
  const char* group;
  const char* name;
  const char* type;
  intptr_t flags;
  REALproc getter;
  REALproc setter;
  intptr_t param;
  intptr_t reserved1;
  intptr_t reserved2;
  intptr_t reserved3;
} REALproperty;

/* Method record: 3 words. */
typedef struct {
  REALproc function;
  REALproc setterFunction;
  const char* declaration;
} REALmethodDefinition;

/* Event record: 2 words; the host fills the second at registration. */
typedef struct {
  const char* declaration;
  intptr_t forSystemUse;
} REALevent;

/* Class definition: 18 words. The host fills forSystemUse at registration with the
 * offset from an object's address to its instance data block. */
typedef struct {
  intptr_t version;
  const char* name;
  const char* superName;
  intptr_t dataSize;
  intptr_t forSystemUse;
  REALproc constructor;
  REALproc destructor;
  REALproperty* properties;
  intptr_t propertyCount;
  REALmethodDefinition* methods;
  intptr_t methodCount;
  REALevent* events;
  intptr_t eventCount;
  intptr_t reserved1;
  intptr_t reserved2;
  intptr_t reserved3;
  intptr_t reserved4;
  intptr_t reserved5;
} REALclassDefinition;

/* The host entries a plugin resolves by name, with their C signatures. */
typedef void (*RegisterPluginVersionProc)(int32_t version);
typedef void (*PluginRegisterClassProc)(REALclassDefinition* definition);
typedef void (*PluginRegisterMethodProc)(REALmethodDefinition* method);
typedef REALstring (*REALBuildStringProc)(const char* text, int32_t length);
typedef void (*REALLockObjectProc)(REALobject object);
typedef void (*REALUnlockObjectProc)(REALobject object);
typedef void (*REALLockStringProc)(REALstring string);
typedef void (*REALUnlockStringProc)(REALstring string);
/* Returns the script's handler for the event whose host word is given, or null. The
 * handler is called as handler(object, event arguments...). */
typedef REALproc (*GetEventInstanceProc)(REALobject object, intptr_t eventWord);
typedef REALfolderItem (*FolderItemFromPathProc)(const char* windowsPath);
typedef REALstring (*REALpathFromFolderItemProc)(REALfolderItem item);
typedef REALgraphics (*pluginPictureGraphicsGetterProc)(REALpicture picture);
typedef void* (*REALGraphicsDCProc)(REALgraphics graphics);
typedef REALpicture (*newPictureProc)(int32_t width, int32_t height, int32_t depth);
typedef REALobject (*PluginNewInstanceProc)(const char* className);

/* The one function a plugin exports. */
typedef void (*REALPluginMainProc)(REALresolver resolver);

#ifdef __cplusplus
}
#endif

#endif
