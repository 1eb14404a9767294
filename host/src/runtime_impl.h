// What the runtime's files share: the object header, the class entries, and the
// runtime's state. Each concern has its own file: objects.cpp (objects and strings),
// registration.cpp, calls.cpp (declarations to libffi calls), events.cpp, entries.cpp
// (what the resolver answers), picture.cpp (pictures and their graphics), runtime.cpp
// (loading the plugin and the public API's remaining members).
#ifndef TINTWELL_HOST_RUNTIME_IMPL_H
#define TINTWELL_HOST_RUNTIME_IMPL_H

#include <ffi.h>

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <unordered_set>
#include <vector>

#include "host/runtime.h"
#include "windows.h"

// The host's object header. The instance data block follows at kDataOffset.
struct REALobjectStruct {
  std::int32_t refs;
  struct host_ClassEntry* cls;
  struct host_ObjectExtras* extras;
};

namespace host {

constexpr std::size_t kDataOffset = 32;
static_assert(sizeof(REALobjectStruct) <= kDataOffset, "object header overlaps its data");

inline ffi_type* IntPtrType() { return sizeof(intptr_t) == 8 ? &ffi_type_sint64 : &ffi_type_sint32; }
ffi_type* FfiType(const Type& type);

// A prepared libffi call interface; its type array must not move once prepared.
struct CallInterface {
  ffi_cif cif{};
  std::vector<ffi_type*> argTypes;

  // leading: the words before the declared parameters (object, property parameter).
  bool Prepare(const std::vector<ffi_type*>& leading, const std::vector<Parameter>& params,
               const std::optional<Type>& result);
};

// A handler may replace or remove itself while it runs, so the trampoline holds its
// binding (and with it the closure being executed) until the call returns.
struct EventBinding : std::enable_shared_from_this<EventBinding> {
  Runtime::Impl* runtime = nullptr;
  REALobject object = nullptr;
  intptr_t eventId = 0;
  const EventInfo* event = nullptr;
  EventHandler handler;
  CallInterface call;
  ffi_closure* closure = nullptr;
  void* code = nullptr;

  ~EventBinding() {
    if (closure) ffi_closure_free(closure);
  }
};

// Pixels are words 0x00RRGGBB, rows top-down, no padding: the layout the platform's
// device contexts draw on, and the host's Color value.
struct PictureData {
  std::int32_t width = 0;
  std::int32_t height = 0;
  std::int32_t depth = 0;
  std::vector<std::uint32_t> pixels;
  REALobject graphics = nullptr;  // made on first request; one reference held here
};

struct GraphicsData {
  std::uint32_t* pixels = nullptr;  // the picture's; null once the picture is gone
  std::int32_t width = 0, height = 0;
  HDC dc = nullptr;  // made on first request
};


}  // namespace host

struct host_ClassEntry {
  host::ClassInfo info;
  REALclassDefinition* definition = nullptr;  // null for the host's own classes
  REALproc constructor = nullptr;
  REALproc destructor = nullptr;
  std::vector<std::unique_ptr<host::CallInterface>> methodCalls;  // parallel to info.methods
  std::vector<REALproc> getters, setters;
  std::vector<intptr_t> propertyParams;
  std::vector<std::unique_ptr<host::CallInterface>> getterCalls, setterCalls;
  std::vector<intptr_t> eventIds;  // parallel to info.events
};

// What some host objects carry besides their header: a folder item's path, a picture's
// pixels, a graphics object's device context, and the script's event handlers.
struct host_ObjectExtras {
  std::string folderPath;  // for folder items
  std::unique_ptr<host::PictureData> picture;
  std::unique_ptr<host::GraphicsData> graphics;
  std::vector<std::shared_ptr<host::EventBinding>> events;
};

namespace host {

using ClassEntry = host_ClassEntry;

struct Runtime::Impl {
  void* library = nullptr;
  std::unordered_set<std::string> withheld;
  int pluginVersion = 0;
  std::vector<std::unique_ptr<ClassEntry>> classes;
  std::unique_ptr<ClassEntry> folderItemClass;
  std::unique_ptr<ClassEntry> pictureClass;
  std::unique_ptr<ClassEntry> graphicsClass;
  std::vector<MethodInfo> globals;
  std::vector<std::unique_ptr<CallInterface>> globalCalls;
  std::vector<std::pair<ClassEntry*, std::size_t>> events;  // event id - 1 → (class, index)
  std::vector<std::string> registrationErrors;
  std::vector<std::string> resolved;
  std::unordered_set<REALobject> liveObjects;
  std::unordered_set<REALstring> liveStrings;
  std::vector<std::string> faults;
  std::size_t eventLookups = 0;

  // objects.cpp
  void Fault(std::string text);
  REALstring BuildString(const char* text, std::size_t length);
  void LockString(REALstring s);
  void UnlockString(REALstring s);
  static std::string StringText(REALstring s);
  REALobject NewObject(ClassEntry* cls);
  void LockObject(REALobject o);
  void UnlockObject(REALobject o);
  host_ObjectExtras& Extras(REALobject o);
  ClassEntry* FindClass(const std::string& name);

  REALobject NewFolderItem(const std::string& windowsPath);
  // Whether o is a live object of the class cls.
  bool IsA(REALobject o, const ClassEntry* cls) const;

  // registration.cpp
  void RegisterClass(REALclassDefinition* def);
  void RegisterMethod(REALmethodDefinition* m);


  // calls.cpp
  // How well a value fits a parameter type: 0 not at all, higher is closer.
  int Fit(const Type& type, const Value& v);
  int FitAll(const Declaration& d, const std::vector<Arg>& args);
  // The best-fitting overload among methods named name, or throws.
  template <class Info>
  std::size_t Choose(const std::vector<Info>& methods, const std::string& name, const std::vector<Arg>& args,
                     const std::string& where);
  // One argument's storage for the duration of a call.
  struct Slot {
    union {
      std::int32_t i;
      double d;
      std::uint8_t b;
      std::uint32_t c;
      void* p;
    } v{};
    void* address = nullptr;  // for ByRef: points at v
    REALstring ownedString = nullptr;
  };
  void Store(Slot& s, const Type& type, const Value& value);
  // Turns a value the callee handed over (a result, or a ByRef variable's final
  // content) into a Value, taking over its reference.
  Value TakeOver(const Type& type, const void* storage);
  // Calls fn through call with leading words, then the declared arguments.
  Value Invoke(CallInterface& call, REALproc fn, const std::vector<void*>& leading,
               const std::vector<Parameter>& params, const std::optional<Type>& result,
               const std::vector<Arg>& args);
  ClassEntry& ClassOf(const Object& self);
  std::size_t FindProperty(ClassEntry& cls, const std::string& name);


  // picture.cpp
  REALobject NewPicture(std::int32_t width, std::int32_t height, std::int32_t depth);
  REALobject PictureGraphics(REALobject picture);
  void* GraphicsDC(REALobject graphics);
  // Called as a picture or graphics object dies: the device context goes before the
  // pixels it draws on.
  void ReleasePicture(REALobject object);
};

// The runtime alive now; the resolver's entries reach it here. Aborts if there is none.
extern Runtime::Impl* g_active;
Runtime::Impl& Active();

// The resolver handed to the plugin (entries.cpp).
extern "C" void* ResolveEntry(const char* name);

}  // namespace host

#endif
