// A small Windows host for tintwell.dll: loads it with LoadLibrary, answers its resolver,
// keeps reference-counted objects and strings laid out as plugin_records.h says, and
// runs the cross-check session, calling the few registered functions it needs through
// their known C signatures.
//   wine_host.exe PLUGIN.dll SRGB.icc LAB.icc   (Windows paths) writes the report to stdout
#include <windows.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <set>
#include <string>
#include <vector>

#include "cross_check.h"
#include "plugin_records.h"

namespace {

// An object: this header, then the class's instance data at the offset the host writes
// into each class definition.
struct ObjectHeader {
  long refs;
  REALclassDefinition* cls;  // null for the host's folder items
  std::string* path;         // a folder item's Windows path
};
constexpr intptr_t kDataOffset = (sizeof(ObjectHeader) + 15) / 16 * 16;

// A string: the record, its count, then the text one byte after the buffer's address.
struct StringBlock {
  REALstringRecord record;
  long refs;
  char bytes[1];
};

std::map<std::string, REALclassDefinition*> classes;
std::map<std::string, REALproc> globals;
std::vector<std::string> traces;
std::vector<std::string> faults;
REALobject debugger;
// The live objects and strings: a lock or unlock of anything else is a fault.
std::set<void*> liveObjects, liveStrings;

ObjectHeader* Header(REALobject o) { return reinterpret_cast<ObjectHeader*>(o); }

REALobject Allocate(REALclassDefinition* cls) {
  const std::size_t size = kDataOffset + (cls ? static_cast<std::size_t>(cls->dataSize) : 0);
  auto* h = static_cast<ObjectHeader*>(std::calloc(1, size));
  if (!h) std::abort();
  h->refs = 1;
  h->cls = cls;
  liveObjects.insert(h);
  if (cls && cls->constructor) reinterpret_cast<void (*)(REALobject)>(cls->constructor)(reinterpret_cast<REALobject>(h));
  return reinterpret_cast<REALobject>(h);
}

void LockObject(REALobject o) {
  if (!o) return;
  if (liveObjects.count(o)) ++Header(o)->refs;
  else faults.push_back("lock of a dead object");
}

void UnlockObject(REALobject o) {
  if (!o) return;
  if (!liveObjects.count(o)) {
    faults.push_back("unlock of a dead object");
    return;
  }
  ObjectHeader* h = Header(o);
  if (--h->refs > 0) return;
  if (h->cls && h->cls->destructor) reinterpret_cast<void (*)(REALobject)>(h->cls->destructor)(o);
  delete h->path;
  liveObjects.erase(o);
  std::free(h);
}

REALstring BuildString(const char* text, int32_t length) {
  if (length < 0) return nullptr;
  auto* s = static_cast<StringBlock*>(std::calloc(1, sizeof(StringBlock) + length + 1));
  if (!s) std::abort();
  s->record.buffer = s->bytes;
  s->record.length = length;
  std::memcpy(s->bytes + 1, text, length);
  s->refs = 1;
  liveStrings.insert(s);
  return &s->record;
}

void LockString(REALstring s) {
  if (!s) return;
  if (liveStrings.count(s)) ++reinterpret_cast<StringBlock*>(s)->refs;
  else faults.push_back("lock of a dead string");
}

void UnlockString(REALstring s) {
  if (!s) return;
  if (!liveStrings.count(s)) {
    faults.push_back("unlock of a dead string");
    return;
  }
  auto* b = reinterpret_cast<StringBlock*>(s);
  if (--b->refs > 0) return;
  liveStrings.erase(s);
  std::free(b);
}

std::string Text(REALstring s) { return s ? std::string(s->buffer + 1, s->length) : std::string(); }

void RegisterPluginVersion(int32_t) {}

void RegisterClass(REALclassDefinition* d) {
  d->forSystemUse = kDataOffset;
  // An event's word is its record's address: GetEventInstance finds the record from it.
  for (intptr_t i = 0; i < d->eventCount; ++i) d->events[i].forSystemUse = reinterpret_cast<intptr_t>(&d->events[i]);
  classes[d->name] = d;
}

void RegisterMethod(REALmethodDefinition* m) { globals[m->declaration] = m->function; }

// The debugger's events, one C function per declaration.
void OnDebugError(REALobject, int32_t code, REALstring text) {
  traces.push_back("DebugError:" + std::to_string(code) + "," + Text(text));
}
void OnDebugInteger(REALobject, int32_t v) { traces.push_back("DebugInteger:" + std::to_string(v)); }
void OnDebugDouble(REALobject, double v) { traces.push_back("DebugDouble:" + std::to_string(v)); }
void OnDebugBoolean(REALobject, bool v) { traces.push_back(std::string("DebugBoolean:") + (v ? "true" : "false")); }
void OnDebugString(REALobject, REALstring s) { traces.push_back("DebugString:" + Text(s)); }

REALproc GetEventInstance(REALobject o, intptr_t word) {
  if (o != debugger || !word) return nullptr;
  const std::string declaration = reinterpret_cast<REALevent*>(word)->declaration;
  const std::pair<const char*, REALproc> handlers[] = {
      {"DebugError(", reinterpret_cast<REALproc>(&OnDebugError)},
      {"DebugInteger(", reinterpret_cast<REALproc>(&OnDebugInteger)},
      {"DebugDouble(", reinterpret_cast<REALproc>(&OnDebugDouble)},
      {"DebugBoolean(", reinterpret_cast<REALproc>(&OnDebugBoolean)},
      {"DebugString(", reinterpret_cast<REALproc>(&OnDebugString)},
  };
  for (const auto& h : handlers)
    if (declaration.rfind(h.first, 0) == 0) return h.second;
  return nullptr;
}

REALfolderItem FolderItemFromPath(const char* path) {
  REALobject item = Allocate(nullptr);
  Header(item)->path = new std::string(path ? path : "");
  return item;
}

REALstring PathFromFolderItem(REALfolderItem item) {
  if (!item || !Header(item)->path) return nullptr;
  const std::string& p = *Header(item)->path;
  return BuildString(p.c_str(), static_cast<int32_t>(p.size()));
}

REALobject NewInstance(const char* name) {
  auto it = classes.find(name ? name : "");
  return it == classes.end() ? nullptr : Allocate(it->second);
}

void* Resolve(const char* entry) {
  const std::pair<const char*, void*> entries[] = {
      {"RegisterPluginVersion", reinterpret_cast<void*>(&RegisterPluginVersion)},
      {"PluginRegisterClass", reinterpret_cast<void*>(&RegisterClass)},
      {"PluginRegisterMethod", reinterpret_cast<void*>(&RegisterMethod)},
      {"REALBuildString", reinterpret_cast<void*>(&BuildString)},
      {"REALLockObject", reinterpret_cast<void*>(&LockObject)},
      {"REALUnlockObject", reinterpret_cast<void*>(&UnlockObject)},
      {"REALLockString", reinterpret_cast<void*>(&LockString)},
      {"REALUnlockString", reinterpret_cast<void*>(&UnlockString)},
      {"GetEventInstance", reinterpret_cast<void*>(&GetEventInstance)},
      {"FolderItemFromPath", reinterpret_cast<void*>(&FolderItemFromPath)},
      {"REALpathFromFolderItem", reinterpret_cast<void*>(&PathFromFolderItem)},
      {"PluginNewInstance", reinterpret_cast<void*>(&NewInstance)},
  };
  for (const auto& e : entries)
    if (std::strcmp(entry, e.first) == 0) return e.second;
  return nullptr;  // pictures: not offered
}

struct Failure {
  std::string what;
};

REALclassDefinition* ClassOf(REALobject o) { return Header(o)->cls; }

REALproc Method(REALclassDefinition* cls, const std::string& declaration) {
  for (intptr_t i = 0; i < cls->methodCount; ++i)
    if (declaration == cls->methods[i].declaration) return cls->methods[i].function;
  throw Failure{"no method " + declaration + " in " + cls->name};
}

const REALproperty& Property(REALobject o, const char* name) {
  REALclassDefinition* cls = ClassOf(o);
  for (intptr_t i = 0; i < cls->propertyCount; ++i)
    if (_stricmp(cls->properties[i].name, name) == 0) return cls->properties[i];
  throw Failure{std::string("no property ") + name + " in " + cls->name};
}

REALproc Global(const std::string& declaration) {
  auto it = globals.find(declaration);
  if (it == globals.end()) throw Failure{"no global method " + declaration};
  return it->second;
}

REALclassDefinition* Class(const char* name) {
  auto it = classes.find(name);
  if (it == classes.end()) throw Failure{std::string("no class ") + name};
  return it->second;
}

class WineHost {
 public:
  REALobject NewDebugger() {
    REALobject d = Allocate(Class("halvoDebugger"));
    reinterpret_cast<void (*)(REALobject)>(Method(ClassOf(d), "halvoDebugger()"))(d);
    debugger = d;
    reinterpret_cast<void (*)(REALobject)>(Global("halvoRegisterDebugger(debugger as halvoDebugger)"))(d);
    return d;
  }
  REALobject OpenProfile(const std::string& path) {
    REALobject p = Allocate(Class("Profile"));
    REALfolderItem f = FolderItemFromPath(path.c_str());
    reinterpret_cast<void (*)(REALobject, REALobject)>(Method(ClassOf(p), "Profile(f as Folderitem)"))(p, f);
    UnlockObject(f);
    return p;
  }
  REALobject NewColorWorld(REALobject a, REALobject b) {
    REALobject w = Allocate(Class("ColorWorld"));
    reinterpret_cast<void (*)(REALobject, REALobject, REALobject)>(
        Method(ClassOf(w), "ColorWorld(src as Profile, dest as Profile)"))(w, a, b);
    return w;
  }
  REALobject NewColor() { return Allocate(Class("CMColor")); }
  void SetDouble(REALobject o, const char* name, double v) {
    const REALproperty& p = Property(o, name);
    reinterpret_cast<void (*)(REALobject, intptr_t, double)>(p.setter)(o, p.param, v);
  }
  double GetDouble(REALobject o, const char* name) {
    const REALproperty& p = Property(o, name);
    return reinterpret_cast<double (*)(REALobject, intptr_t)>(p.getter)(o, p.param);
  }
  int GetInteger(REALobject o, const char* name) {
    const REALproperty& p = Property(o, name);
    return reinterpret_cast<int32_t (*)(REALobject, intptr_t)>(p.getter)(o, p.param);
  }
  std::string GetString(REALobject o, const char* name) {
    const REALproperty& p = Property(o, name);
    REALstring s = reinterpret_cast<REALstring (*)(REALobject, intptr_t)>(p.getter)(o, p.param);
    std::string text = Text(s);
    UnlockString(s);  // a string result's reference passes to the host
    return text;
  }
  void Match(REALobject world, REALobject color) {
    reinterpret_cast<void (*)(REALobject, REALobject)>(Method(ClassOf(world), "MatchCMcolor(c as CMcolor)"))(world,
                                                                                                           color);
  }
  int Error() { return reinterpret_cast<int32_t (*)()>(Global("CMError() as Integer"))(); }
  void Release(REALobject& o) {
    UnlockObject(o);
    o = nullptr;
  }
  void Unregister() {
    reinterpret_cast<void (*)()>(Global("halvoUnregisterDebugger()"))();
    debugger = nullptr;
  }
  std::string GetLocationName(REALobject o, const char* name) {
    const REALproperty& p = Property(o, name);
    REALobject item = reinterpret_cast<REALobject (*)(REALobject, intptr_t)>(p.getter)(o, p.param);
    REALstring s = PathFromFolderItem(item);
    const std::string path = Text(s);
    UnlockString(s);
    UnlockObject(item);  // an object result's reference passes to the host
    return path.substr(path.find_last_of('\\') + 1);
  }
  std::size_t LiveObjects() const { return liveObjects.size(); }
  std::size_t LiveStrings() const { return liveStrings.size(); }
  const std::vector<std::string>& Traces() const { return traces; }
};

}  // namespace

int main(int argc, char** argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: %s PLUGIN.dll SRGB_PROFILE LAB_PROFILE\n", argv[0]);
    return 2;
  }
  HMODULE plugin = LoadLibraryA(argv[1]);
  if (!plugin) {
    std::fprintf(stderr, "wine_host: cannot load %s (error %lu)\n", argv[1], GetLastError());
    return 1;
  }
  auto main = reinterpret_cast<REALPluginMainProc>(reinterpret_cast<void*>(GetProcAddress(plugin, "REALPluginMain")));
  if (!main) {
    std::fprintf(stderr, "wine_host: %s exports no REALPluginMain\n", argv[1]);
    return 1;
  }
  main(&Resolve);
  int status;
  try {
    WineHost host;
    status = cross_check::Run(host, argv[2], argv[3], stdout);
  } catch (const Failure& f) {
    std::fprintf(stderr, "wine_host: %s\n", f.what.c_str());
    status = 1;
  }
  // In the report too, where the comparison with Linux sees them.
  for (const std::string& f : faults) std::printf("fault %s\n", f.c_str());
  std::fflush(stdout);
  return faults.empty() ? status : 1;
}
