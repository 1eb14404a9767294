#include "host/runtime.h"

#include <dlfcn.h>
#include <ffi.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <unordered_map>
#include <unordered_set>

#include "runtime_internal.h"
#include "win32_paths.h"

// The host's object header. The instance data block follows at kDataOffset.
struct REALobjectStruct {
  std::int32_t refs;
  struct host_ClassEntry* cls;
  struct host_ObjectExtras* extras;
};

namespace host {
namespace {

constexpr std::size_t kDataOffset = 32;
static_assert(sizeof(REALobjectStruct) <= kDataOffset, "object header overlaps its data");

ffi_type* IntPtrType() { return sizeof(intptr_t) == 8 ? &ffi_type_sint64 : &ffi_type_sint32; }

ffi_type* FfiType(const Type& type) {
  switch (type.kind) {
    case TypeKind::Integer: return &ffi_type_sint32;
    case TypeKind::Double: return &ffi_type_double;
    case TypeKind::Boolean: return &ffi_type_uint8;
    case TypeKind::Color: return &ffi_type_uint32;
    case TypeKind::String:
    case TypeKind::Object: return &ffi_type_pointer;
  }
  return &ffi_type_void;
}

// A prepared libffi call interface; its type array must not move once prepared.
struct CallInterface {
  ffi_cif cif{};
  std::vector<ffi_type*> argTypes;

  // leading: the words before the declared parameters (object, property parameter).
  bool Prepare(const std::vector<ffi_type*>& leading, const std::vector<Parameter>& params,
               const std::optional<Type>& result) {
    argTypes = leading;
    for (const Parameter& p : params) argTypes.push_back(p.byRef ? &ffi_type_pointer : FfiType(p.type));
    ffi_type* rtype = result ? FfiType(*result) : &ffi_type_void;
    return ffi_prep_cif(&cif, FFI_DEFAULT_ABI, static_cast<unsigned>(argTypes.size()), rtype,
                        argTypes.empty() ? nullptr : argTypes.data()) == FFI_OK;
  }
};

}  // namespace
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

namespace host {
namespace {
struct EventBinding;
}
}  // namespace host

struct host_ObjectExtras {
  std::string folderPath;  // for folder items
  std::vector<std::shared_ptr<host::EventBinding>> events;
};

namespace host {

using ClassEntry = host_ClassEntry;

namespace {

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

Runtime::Impl* g_active = nullptr;

}  // namespace

struct Runtime::Impl {
  void* library = nullptr;
  std::unordered_set<std::string> withheld;
  int pluginVersion = 0;
  std::vector<std::unique_ptr<ClassEntry>> classes;
  std::unique_ptr<ClassEntry> folderItemClass;
  std::vector<MethodInfo> globals;
  std::vector<std::unique_ptr<CallInterface>> globalCalls;
  std::vector<std::pair<ClassEntry*, std::size_t>> events;  // event id - 1 → (class, index)
  std::vector<std::string> registrationErrors;
  std::vector<std::string> resolved;
  std::unordered_set<REALobject> liveObjects;
  std::unordered_set<REALstring> liveStrings;
  std::vector<std::string> faults;
  std::size_t eventLookups = 0;

  void Fault(std::string text) {
    std::fprintf(stderr, "host: %s\n", text.c_str());
    faults.push_back(std::move(text));
  }

  // ---- strings ----
  REALstring BuildString(const char* text, std::size_t length) {
    auto* record = new REALstringRecord{};
    char* buffer = static_cast<char*>(std::malloc(length + 2));
    if (!buffer) throw std::bad_alloc();
    buffer[0] = static_cast<char>(length < 255 ? length : 255);
    if (length) std::memcpy(buffer + 1, text, length);
    buffer[length + 1] = '\0';
    record->hostWord0 = 1;  // reference count
    record->buffer = buffer;
    record->length = static_cast<intptr_t>(length);
    liveStrings.insert(record);
    return record;
  }
  void LockString(REALstring s) {
    if (!s) return;
    if (!liveStrings.count(s)) return Fault("lock of a string that is not alive");
    ++s->hostWord0;
  }
  void UnlockString(REALstring s) {
    if (!s) return;
    if (!liveStrings.count(s)) return Fault("unlock of a string that is not alive");
    if (--s->hostWord0 > 0) return;
    liveStrings.erase(s);
    std::free(const_cast<char*>(s->buffer));
    delete s;
  }
  static std::string StringText(REALstring s) {
    if (!s || !s->buffer) return {};
    return std::string(s->buffer + 1, static_cast<std::size_t>(s->length));
  }

  // ---- objects ----
  REALobject NewObject(ClassEntry* cls) {
    const std::size_t size = kDataOffset + cls->info.dataSize;
    void* memory = std::calloc(1, size);
    if (!memory) throw std::bad_alloc();
    auto* object = static_cast<REALobject>(memory);
    object->refs = 1;
    object->cls = cls;
    object->extras = nullptr;
    liveObjects.insert(object);
    if (cls->constructor) reinterpret_cast<void (*)(REALobject)>(cls->constructor)(object);
    return object;
  }
  void LockObject(REALobject o) {
    if (!o) return;
    if (!liveObjects.count(o)) return Fault("lock of an object that is not alive");
    ++o->refs;
  }
  void UnlockObject(REALobject o) {
    if (!o) return;
    if (!liveObjects.count(o)) return Fault("unlock of an object that is not alive");
    if (--o->refs > 0) return;
    if (o->cls->destructor) reinterpret_cast<void (*)(REALobject)>(o->cls->destructor)(o);
    if (o->refs != 0) return Fault("object of class " + o->cls->info.name + " revived by its destructor");
    liveObjects.erase(o);
    delete o->extras;
    std::free(o);
  }
  host_ObjectExtras& Extras(REALobject o) {
    if (!o->extras) o->extras = new host_ObjectExtras;
    return *o->extras;
  }

  ClassEntry* FindClass(const std::string& name) {
    for (auto& c : classes)
      if (EqualsIgnoreCase(c->info.name, name)) return c.get();
    if (EqualsIgnoreCase(name, folderItemClass->info.name)) return folderItemClass.get();
    return nullptr;
  }

  // ---- registration ----
  void RegisterClass(REALclassDefinition* def) {
    if (!def || !def->name) return Fault("class definition without a name");
    if (def->version != REAL_PLUGIN_VERSION) {
      registrationErrors.push_back(std::string(def->name) + ": unsupported interface version " +
                                   std::to_string(def->version));
      return;
    }
    auto cls = std::make_unique<ClassEntry>();
    cls->definition = def;
    cls->info.name = def->name;
    cls->info.dataSize = static_cast<std::size_t>(def->dataSize > 0 ? def->dataSize : 0);
    cls->constructor = def->constructor;
    cls->destructor = def->destructor;
    for (intptr_t i = 0; i < def->propertyCount; ++i) {
      const REALproperty& p = def->properties[i];
      auto type = p.type ? ParseTypeName(p.type) : std::nullopt;
      if (!p.name || !type || !p.getter) {
        registrationErrors.push_back(cls->info.name + ": malformed property " +
                                     (p.name ? p.name : "(unnamed)"));
        continue;
      }
      cls->info.properties.push_back({p.name, *type, p.setter == nullptr});
      cls->getters.push_back(p.getter);
      cls->setters.push_back(p.setter);
      cls->propertyParams.push_back(p.param);
      auto get = std::make_unique<CallInterface>();
      get->Prepare({&ffi_type_pointer, IntPtrType()}, {}, *type);
      auto set = std::make_unique<CallInterface>();
      set->Prepare({&ffi_type_pointer, IntPtrType()}, {Parameter{"value", *type, false}}, std::nullopt);
      cls->getterCalls.push_back(std::move(get));
      cls->setterCalls.push_back(std::move(set));
    }
    for (intptr_t i = 0; i < def->methodCount; ++i) {
      const REALmethodDefinition& m = def->methods[i];
      std::string error;
      auto parsed = m.declaration ? ParseDeclaration(m.declaration, &error) : std::nullopt;
      if (!parsed || !m.function) {
        registrationErrors.push_back(cls->info.name + ": " +
                                     (m.declaration ? error : std::string("method without a declaration")));
        continue;
      }
      auto call = std::make_unique<CallInterface>();
      if (!call->Prepare({&ffi_type_pointer}, parsed->parameters, parsed->result)) {
        registrationErrors.push_back(cls->info.name + ": cannot call " + m.declaration);
        continue;
      }
      cls->info.methods.push_back({m.declaration, std::move(*parsed), m.function});
      cls->methodCalls.push_back(std::move(call));
    }
    for (intptr_t i = 0; i < def->eventCount; ++i) {
      REALevent& e = def->events[i];
      std::string error;
      auto parsed = e.declaration ? ParseDeclaration(e.declaration, &error) : std::nullopt;
      if (!parsed) {
        registrationErrors.push_back(cls->info.name + ": " + error);
        continue;
      }
      cls->info.events.push_back({e.declaration, std::move(*parsed)});
      events.emplace_back(cls.get(), cls->info.events.size() - 1);
      e.forSystemUse = static_cast<intptr_t>(events.size());
      cls->eventIds.push_back(e.forSystemUse);
    }
    def->forSystemUse = static_cast<intptr_t>(kDataOffset);
    classes.push_back(std::move(cls));
  }

  void RegisterMethod(REALmethodDefinition* m) {
    if (!m || !m->declaration || !m->function) {
      registrationErrors.push_back("global method without a declaration or function");
      return;
    }
    std::string error;
    auto parsed = ParseDeclaration(m->declaration, &error);
    if (!parsed) {
      registrationErrors.push_back(error);
      return;
    }
    auto call = std::make_unique<CallInterface>();
    if (!call->Prepare({}, parsed->parameters, parsed->result)) {
      registrationErrors.push_back(std::string("cannot call ") + m->declaration);
      return;
    }
    globals.push_back({m->declaration, std::move(*parsed), m->function});
    globalCalls.push_back(std::move(call));
  }

  // ---- calls ----
  // How well a value fits a parameter type: 0 not at all, higher is closer.
  int Fit(const Type& type, const Value& v) {
    switch (type.kind) {
      case TypeKind::Integer: return v.IsInteger() ? 3 : 0;
      case TypeKind::Double: return v.IsDouble() ? 3 : v.IsInteger() ? 2 : 0;
      case TypeKind::Boolean: return v.IsBoolean() ? 3 : 0;
      case TypeKind::Color: return v.IsColor() ? 3 : v.IsInteger() ? 1 : 0;
      case TypeKind::String: return v.IsString() ? 3 : 0;
      case TypeKind::Object:
        if (v.IsNil()) return 2;
        if (!v.IsObject()) return 0;
        return EqualsIgnoreCase(v.AsObject().get()->cls->info.name, type.className) ? 3 : 0;
    }
    return 0;
  }

  int FitAll(const Declaration& d, const std::vector<Arg>& args) {
    if (d.parameters.size() != args.size()) return -1;
    int score = 0;
    for (std::size_t i = 0; i < args.size(); ++i) {
      const Parameter& p = d.parameters[i];
      if (p.byRef && !args[i].IsRef()) return -1;
      const int f = Fit(p.type, args[i].value());
      if (f == 0 && !(p.byRef && args[i].value().IsNil())) return -1;
      score += f;
    }
    return score;
  }

  // The best-fitting overload among methods named name, or throws.
  template <class Info>
  std::size_t Choose(const std::vector<Info>& methods, const std::string& name, const std::vector<Arg>& args,
                     const std::string& where) {
    std::size_t best = SIZE_MAX;
    int bestScore = -1;
    bool named = false;
    for (std::size_t i = 0; i < methods.size(); ++i) {
      if (!EqualsIgnoreCase(methods[i].parsed.name, name)) continue;
      named = true;
      const int score = FitAll(methods[i].parsed, args);
      if (score > bestScore) bestScore = score, best = i;
    }
    if (!named) throw HostError("no method " + name + " in " + where);
    if (best == SIZE_MAX) {
      std::string text = "no overload of " + name + " in " + where + " takes (";
      for (std::size_t i = 0; i < args.size(); ++i)
        text += (i ? ", " : "") + std::string(args[i].IsRef() ? "ByRef " : "") + args[i].value().Describe();
      text += "); declared:";
      for (const auto& m : methods)
        if (EqualsIgnoreCase(m.parsed.name, name)) text += " \"" + m.declaration + "\"";
      throw HostError(text);
    }
    return best;
  }

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

  void Store(Slot& s, const Type& type, const Value& value) {
    switch (type.kind) {
      case TypeKind::Integer: s.v.i = value.IsNil() ? 0 : value.AsInteger(); break;
      case TypeKind::Double: s.v.d = value.IsNil() ? 0.0 : value.AsDouble(); break;
      case TypeKind::Boolean: s.v.b = value.IsNil() ? 0 : value.AsBoolean() ? 1 : 0; break;
      case TypeKind::Color:
        s.v.c = value.IsNil() ? 0 : value.IsColor() ? value.AsColor().rgb : static_cast<std::uint32_t>(value.AsInteger());
        break;
      case TypeKind::String:
        if (value.IsString()) {
          const std::string& text = value.AsString();
          s.ownedString = BuildString(text.data(), text.size());
        }
        s.v.p = s.ownedString;
        break;
      case TypeKind::Object: s.v.p = value.IsObject() ? value.AsObject().get() : nullptr; break;
    }
  }

  // Turns a value the callee handed over (a result, or a ByRef variable's final
  // content) into a Value, taking over its reference.
  Value TakeOver(const Type& type, const void* storage) {
    switch (type.kind) {
      case TypeKind::Integer: return Value(*static_cast<const std::int32_t*>(storage));
      case TypeKind::Double: return Value(*static_cast<const double*>(storage));
      case TypeKind::Boolean: return Value(*static_cast<const std::uint8_t*>(storage) != 0);
      case TypeKind::Color: return Value(Color{*static_cast<const std::uint32_t*>(storage)});
      case TypeKind::String: {
        auto s = *static_cast<REALstring const*>(storage);
        if (s && !liveStrings.count(s)) {
          Fault("a string handed to the host is not alive");
          return Value(std::string());
        }
        Value text(StringText(s));
        UnlockString(s);
        return text;
      }
      case TypeKind::Object: {
        auto o = *static_cast<REALobject const*>(storage);
        if (o && !liveObjects.count(o)) {
          Fault("an object handed to the host is not alive");
          return Value();
        }
        return Value(Object::Adopt(o));
      }
    }
    return Value();
  }

  // Calls fn through call with leading words, then the declared arguments.
  Value Invoke(CallInterface& call, REALproc fn, const std::vector<void*>& leading,
               const std::vector<Parameter>& params, const std::optional<Type>& result,
               const std::vector<Arg>& args) {
    std::vector<Slot> slots(params.size());
    std::vector<void*> values;
    std::vector<void*> leadingCopy = leading;
    for (auto& w : leadingCopy) values.push_back(&w);
    for (std::size_t i = 0; i < params.size(); ++i) {
      Slot& s = slots[i];
      Store(s, params[i].type, args[i].value());
      if (params[i].byRef) {
        // The variable owns its string and object references during the call.
        if (params[i].type.kind == TypeKind::Object) LockObject(static_cast<REALobject>(s.v.p));
        s.ownedString = nullptr;
        s.address = &s.v;
        values.push_back(&s.address);
      } else {
        values.push_back(&s.v);
      }
    }
    union {
      ffi_arg integral;
      double d;
      void* p;
    } ret{};
    ffi_call(&call.cif, FFI_FN(fn), &ret, values.empty() ? nullptr : values.data());

    for (std::size_t i = 0; i < params.size(); ++i) {
      if (params[i].byRef) {
        *args[i].ref() = TakeOver(params[i].type, &slots[i].v);
      } else if (slots[i].ownedString) {
        UnlockString(slots[i].ownedString);
      }
    }
    if (!result) return Value();
    switch (result->kind) {
      case TypeKind::Integer: {
        const auto v = static_cast<std::int32_t>(ret.integral);
        return TakeOver(*result, &v);
      }
      case TypeKind::Boolean: {
        const auto v = static_cast<std::uint8_t>(ret.integral);
        return TakeOver(*result, &v);
      }
      case TypeKind::Color: {
        const auto v = static_cast<std::uint32_t>(ret.integral);
        return TakeOver(*result, &v);
      }
      case TypeKind::Double: return TakeOver(*result, &ret.d);
      default: return TakeOver(*result, &ret.p);
    }
  }

  ClassEntry& ClassOf(const Object& self) {
    if (!self) throw HostError("nil object");
    return *self.get()->cls;
  }

  std::size_t FindProperty(ClassEntry& cls, const std::string& name) {
    for (std::size_t i = 0; i < cls.info.properties.size(); ++i)
      if (EqualsIgnoreCase(cls.info.properties[i].name, name)) return i;
    throw HostError("no property " + name + " in class " + cls.info.name);
  }
};

namespace {

Runtime::Impl& Active() {
  if (!g_active) {
    std::fprintf(stderr, "host: entry called with no runtime alive\n");
    std::abort();
  }
  return *g_active;
}

// ---- the entries the resolver answers ----
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
  Runtime::Impl& rt = Active();
  REALobject item = rt.NewObject(rt.folderItemClass.get());
  rt.Extras(item).folderPath = path;
  return item;
}
static REALstring EntryREALpathFromFolderItem(REALfolderItem item) {
  Runtime::Impl& rt = Active();
  if (!item || !rt.liveObjects.count(item) || item->cls != rt.folderItemClass.get()) return nullptr;
  const std::string& path = rt.Extras(item).folderPath;
  return rt.BuildString(path.data(), path.size());
}
// Pictures come later; until then these answer null.
static REALgraphics EntryPictureGraphicsGetter(REALpicture) { return nullptr; }
static void* EntryREALGraphicsDC(REALgraphics) { return nullptr; }
static REALpicture EntryNewPicture(int32_t, int32_t, int32_t) { return nullptr; }
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

extern "C" void* ResolveEntry(const char* name) {
  Runtime::Impl& rt = Active();
  if (!name) return nullptr;
  rt.resolved.emplace_back(name);
  if (rt.withheld.count(name)) return nullptr;
  for (const EntryName& e : kEntries)
    if (std::strcmp(e.name, name) == 0) return e.address;
  return nullptr;
}

// Routes a libffi closure call to the script's handler.
void EventTrampoline(ffi_cif*, void* ret, void** args, void* user) {
  const std::shared_ptr<EventBinding> b = static_cast<EventBinding*>(user)->shared_from_this();
  Runtime::Impl& rt = *b->runtime;
  const Object self = Object::Retain(*static_cast<REALobject*>(args[0]));
  std::vector<Value> values;
  const auto& params = b->event->parsed.parameters;
  for (std::size_t i = 0; i < params.size(); ++i) {
    const void* arg = args[i + 1];
    if (params[i].byRef) arg = *static_cast<void* const*>(arg);
    switch (params[i].type.kind) {
      case TypeKind::Integer: values.emplace_back(*static_cast<const std::int32_t*>(arg)); break;
      case TypeKind::Double: values.emplace_back(*static_cast<const double*>(arg)); break;
      case TypeKind::Boolean: values.emplace_back(*static_cast<const std::uint8_t*>(arg) != 0); break;
      case TypeKind::Color: values.emplace_back(Color{*static_cast<const std::uint32_t*>(arg)}); break;
      case TypeKind::String: {
        auto s = *static_cast<REALstring const*>(arg);
        if (s && !rt.liveStrings.count(s)) rt.Fault("event argument string is not alive");
        values.emplace_back(s && rt.liveStrings.count(s) ? Runtime::Impl::StringText(s) : std::string());
        break;
      }
      case TypeKind::Object: values.emplace_back(Object::Retain(*static_cast<REALobject const*>(arg))); break;
    }
  }
  Value result;
  try {
    result = b->handler(self, values);
  } catch (const std::exception& e) {
    // An exception must not unwind through the plugin's C frames.
    rt.Fault(std::string("event handler threw: ") + e.what());
  }
  const auto& rtype = b->event->parsed.result;
  if (!rtype) return;
  // Results cross with the same ownership as a registered function's results.
  switch (rtype->kind) {
    case TypeKind::Integer: *static_cast<ffi_arg*>(ret) = static_cast<ffi_arg>(result.IsNil() ? 0 : result.AsInteger()); break;
    case TypeKind::Boolean: *static_cast<ffi_arg*>(ret) = result.IsBoolean() && result.AsBoolean(); break;
    case TypeKind::Color: *static_cast<ffi_arg*>(ret) = result.IsColor() ? result.AsColor().rgb : 0; break;
    case TypeKind::Double: *static_cast<double*>(ret) = result.IsNil() ? 0.0 : result.AsDouble(); break;
    case TypeKind::String: {
      const std::string text = result.IsString() ? result.AsString() : std::string();
      *static_cast<void**>(ret) = rt.BuildString(text.data(), text.size());
      break;
    }
    case TypeKind::Object: {
      REALobject o = result.IsObject() ? result.AsObject().get() : nullptr;
      rt.LockObject(o);
      *static_cast<void**>(ret) = o;
      break;
    }
  }
}

}  // namespace

namespace internal {
void LockObject(REALobject object) { Active().LockObject(object); }
void UnlockObject(REALobject object) {
  // Objects may be released after their runtime is gone only by mistake; say so.
  if (!g_active) {
    std::fprintf(stderr, "host: object released after its runtime ended\n");
    return;
  }
  g_active->UnlockObject(object);
}
std::string ClassNameOf(REALobject object) { return object->cls->info.name; }
}  // namespace internal

// ---- Runtime ----

Runtime::Runtime(const std::string& pluginPath, Options options) : impl_(std::make_unique<Impl>()) {
  if (g_active) throw HostError("another runtime is alive");
  impl_->withheld.insert(options.withheld.begin(), options.withheld.end());
  impl_->folderItemClass = std::make_unique<ClassEntry>();
  impl_->folderItemClass->info.name = "FolderItem";

  // An empty path loads the running program itself, for tests that link a plugin in.
  impl_->library = dlopen(pluginPath.empty() ? nullptr : pluginPath.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!impl_->library) {
    const char* why = dlerror();
    throw HostError("cannot load plugin " + pluginPath + ": " + (why ? why : "unknown error"));
  }
  auto main = reinterpret_cast<REALPluginMainProc>(dlsym(impl_->library, "REALPluginMain"));
  if (!main) {
    dlclose(impl_->library);
    throw HostError("plugin " + pluginPath + " exports no REALPluginMain");
  }
  g_active = impl_.get();
  main(&ResolveEntry);
  for (const std::string& e : impl_->registrationErrors) std::fprintf(stderr, "host: registration: %s\n", e.c_str());
}

Runtime::~Runtime() {
  if (!impl_->liveObjects.empty() || !impl_->liveStrings.empty())
    std::fprintf(stderr, "host: unloading with %zu objects and %zu strings alive\n", impl_->liveObjects.size(),
                 impl_->liveStrings.size());
  // Objects still alive would call into the unloaded plugin: keep the library then.
  if (impl_->liveObjects.empty()) dlclose(impl_->library);
  g_active = nullptr;
}

void Runtime::SetWithheld(const std::string& entry, bool withheld) {
  if (withheld)
    impl_->withheld.insert(entry);
  else
    impl_->withheld.erase(entry);
}

Object Runtime::New(const std::string& className, std::initializer_list<Arg> args) {
  ClassEntry* cls = impl_->FindClass(className);
  if (!cls || !cls->definition) throw HostError("no class " + className);
  const std::vector<Arg> list(args);
  bool hasConstructors = false;
  for (const auto& m : cls->info.methods)
    if (EqualsIgnoreCase(m.parsed.name, cls->info.name)) hasConstructors = true;
  std::size_t chosen = SIZE_MAX;
  if (hasConstructors || !list.empty())
    chosen = impl_->Choose(cls->info.methods, cls->info.name, list, "class " + cls->info.name);
  Object self = Object::Adopt(impl_->NewObject(cls));
  if (chosen != SIZE_MAX) {
    const MethodInfo& m = cls->info.methods[chosen];
    impl_->Invoke(*cls->methodCalls[chosen], m.function, {self.get()}, m.parsed.parameters, m.parsed.result, list);
  }
  return self;
}

Value Runtime::Call(const Object& self, const std::string& method, std::initializer_list<Arg> args) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::vector<Arg> list(args);
  const std::size_t i = impl_->Choose(cls.info.methods, method, list, "class " + cls.info.name);
  const MethodInfo& m = cls.info.methods[i];
  return impl_->Invoke(*cls.methodCalls[i], m.function, {self.get()}, m.parsed.parameters, m.parsed.result, list);
}

Value Runtime::CallGlobal(const std::string& method, std::initializer_list<Arg> args) {
  const std::vector<Arg> list(args);
  const std::size_t i = impl_->Choose(impl_->globals, method, list, "the global methods");
  const MethodInfo& m = impl_->globals[i];
  return impl_->Invoke(*impl_->globalCalls[i], m.function, {}, m.parsed.parameters, m.parsed.result, list);
}

Value Runtime::Get(const Object& self, const std::string& property) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::size_t i = impl_->FindProperty(cls, property);
  return impl_->Invoke(*cls.getterCalls[i], cls.getters[i],
                       {self.get(), reinterpret_cast<void*>(cls.propertyParams[i])}, {},
                       cls.info.properties[i].type, {});
}

void Runtime::Set(const Object& self, const std::string& property, const Value& value) {
  ClassEntry& cls = impl_->ClassOf(self);
  const std::size_t i = impl_->FindProperty(cls, property);
  const PropertyInfo& p = cls.info.properties[i];
  if (p.readOnly) throw HostError("property " + p.name + " of class " + cls.info.name + " is read-only");
  if (impl_->Fit(p.type, value) == 0)
    throw HostError("property " + p.name + " is " + TypeName(p.type) + ", not " + value.Describe());
  impl_->Invoke(*cls.setterCalls[i], cls.setters[i], {self.get(), reinterpret_cast<void*>(cls.propertyParams[i])},
                {Parameter{"value", p.type, false}}, std::nullopt, {Arg(value)});
}

void Runtime::SetEventHandler(const Object& self, const std::string& event, EventHandler handler) {
  ClassEntry& cls = impl_->ClassOf(self);
  std::size_t index = SIZE_MAX;
  for (std::size_t i = 0; i < cls.info.events.size(); ++i)
    if (EqualsIgnoreCase(cls.info.events[i].parsed.name, event)) index = i;
  if (index == SIZE_MAX) throw HostError("no event " + event + " in class " + cls.info.name);
  auto& bindings = impl_->Extras(self.get()).events;
  const intptr_t id = cls.eventIds[index];
  for (auto it = bindings.begin(); it != bindings.end(); ++it)
    if ((*it)->eventId == id) {
      bindings.erase(it);
      break;
    }
  if (!handler) return;
  auto b = std::make_shared<EventBinding>();
  b->runtime = impl_.get();
  b->object = self.get();
  b->eventId = id;
  b->event = &cls.info.events[index];
  b->handler = std::move(handler);
  if (!b->call.Prepare({&ffi_type_pointer}, b->event->parsed.parameters, b->event->parsed.result))
    throw HostError("cannot build a handler for " + b->event->declaration);
  b->closure = static_cast<ffi_closure*>(ffi_closure_alloc(sizeof(ffi_closure), &b->code));
  if (!b->closure) throw std::bad_alloc();
  if (ffi_prep_closure_loc(b->closure, &b->call.cif, &EventTrampoline, b.get(), b->code) != FFI_OK)
    throw HostError("cannot build a handler for " + b->event->declaration);
  bindings.push_back(std::move(b));
}

Object Runtime::MakeFolderItem(const std::string& posixPath) {
  const auto windows = win32::ExactWindowsPathFromPosix(posixPath);
  if (!windows) throw HostError("a Windows path cannot name " + posixPath + " (a backslash in a name)");
  return Object::Adopt(EntryFolderItemFromPath(windows->c_str()));
}

std::string Runtime::FolderItemPath(const Object& item) const {
  if (!item || item.get()->cls != impl_->folderItemClass.get()) throw HostError("not a folder item");
  return impl_->Extras(item.get()).folderPath;
}

int Runtime::pluginVersion() const { return impl_->pluginVersion; }

std::vector<const ClassInfo*> Runtime::Classes() const {
  std::vector<const ClassInfo*> list;
  for (const auto& c : impl_->classes) list.push_back(&c->info);
  return list;
}

std::vector<const MethodInfo*> Runtime::Globals() const {
  std::vector<const MethodInfo*> list;
  for (const auto& m : impl_->globals) list.push_back(&m);
  return list;
}

const std::vector<std::string>& Runtime::RegistrationErrors() const { return impl_->registrationErrors; }
const std::vector<std::string>& Runtime::ResolvedEntries() const { return impl_->resolved; }
std::size_t Runtime::LiveObjects() const { return impl_->liveObjects.size(); }
std::size_t Runtime::LiveStrings() const { return impl_->liveStrings.size(); }
const std::vector<std::string>& Runtime::Faults() const { return impl_->faults; }
std::size_t Runtime::EventLookups() const { return impl_->eventLookups; }

}  // namespace host
