// A small plugin that exercises every kind of declaration, argument, result and event
// the host supports, so the host can be tested apart from the real plugin.
#include <cctype>
#include <cstdint>
#include <cstring>
#include <string>

#include "plugin_records.h"

namespace {

REALresolver resolve;

template <class Proc>
Proc Entry(const char* name) {
  return reinterpret_cast<Proc>(resolve(name));
}

struct ProbeData {
  int32_t n;
  double d;
  uint8_t flag;
  uint32_t tint;
  REALstring label;
  REALobject partner;
  int32_t constructorRuns;
};

REALclassDefinition probeClass;

ProbeData* Data(REALobject o) { return reinterpret_cast<ProbeData*>(reinterpret_cast<char*>(o) + probeClass.forSystemUse); }

REALstring Build(const std::string& text) {
  return Entry<REALBuildStringProc>("REALBuildString")(text.data(), static_cast<int32_t>(text.size()));
}
std::string Text(REALstring s) { return s ? std::string(s->buffer + 1, static_cast<size_t>(s->length)) : std::string(); }

void Construct(REALobject self) { Data(self)->constructorRuns++; }
void Destruct(REALobject self) {
  Entry<REALUnlockStringProc>("REALUnlockString")(Data(self)->label);
  Entry<REALUnlockObjectProc>("REALUnlockObject")(Data(self)->partner);
}

int32_t GetN(REALobject self, intptr_t) { return Data(self)->n; }
void SetN(REALobject self, intptr_t, int32_t v) { Data(self)->n = v; }
double GetD(REALobject self, intptr_t) { return Data(self)->d; }
void SetD(REALobject self, intptr_t, double v) { Data(self)->d = v; }
bool GetFlag(REALobject self, intptr_t) { return Data(self)->flag != 0; }
void SetFlag(REALobject self, intptr_t, bool v) { Data(self)->flag = v; }
uint32_t GetTint(REALobject self, intptr_t) { return Data(self)->tint; }
void SetTint(REALobject self, intptr_t, uint32_t v) { Data(self)->tint = v; }
REALstring GetLabel(REALobject self, intptr_t) {
  Entry<REALLockStringProc>("REALLockString")(Data(self)->label);  // one more for the caller
  return Data(self)->label;
}
void SetLabel(REALobject self, intptr_t, REALstring v) {
  Entry<REALLockStringProc>("REALLockString")(v);
  Entry<REALUnlockStringProc>("REALUnlockString")(Data(self)->label);
  Data(self)->label = v;
}
REALobject GetPartner(REALobject self, intptr_t) {
  Entry<REALLockObjectProc>("REALLockObject")(Data(self)->partner);
  return Data(self)->partner;
}
void SetPartner(REALobject self, intptr_t, REALobject v) {
  Entry<REALLockObjectProc>("REALLockObject")(v);
  Entry<REALUnlockObjectProc>("REALUnlockObject")(Data(self)->partner);
  Data(self)->partner = v;
}
int32_t GetParam(REALobject, intptr_t param) { return static_cast<int32_t>(param); }
int32_t GetRuns(REALobject self, intptr_t) { return Data(self)->constructorRuns; }

void ProbeDefault(REALobject self) { Data(self)->n = -1; }
void ProbeWithN(REALobject self, int32_t n) { Data(self)->n = n; }
int32_t AddInts(REALobject, int32_t a, int32_t b) { return a + b; }
double AddDoubles(REALobject, double a, double b) { return a + b + 0.5; }
int32_t AddOne(REALobject self, int32_t a) { return a + Data(self)->n; }
void Swap(REALobject, int32_t* a, int32_t* b) {
  const int32_t t = *a;
  *a = *b;
  *b = t;
}
void Scale(REALobject, double* x, double f) { *x *= f; }
void Rename(REALobject, REALstring* s) {
  std::string text = Text(*s);
  for (char& c : text) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  Entry<REALUnlockStringProc>("REALUnlockString")(*s);
  *s = Build(text + "!");
}
REALstring Echo(REALobject, REALstring s) { return Build(Text(s)); }
int32_t Length(REALobject, REALstring s) { return s ? static_cast<int32_t>(s->length) : -1; }
REALobject Self(REALobject self) {
  Entry<REALLockObjectProc>("REALLockObject")(self);
  return self;
}
REALobject MakeAnother(REALobject) { return Entry<PluginNewInstanceProc>("PluginNewInstance")("pRoBe"); }
REALobject NoObject(REALobject) { return nullptr; }
REALstring PathOf(REALobject, REALobject item) { return Entry<REALpathFromFolderItemProc>("REALpathFromFolderItem")(item); }
REALobject Folder(REALobject, REALstring path) {
  return Entry<FolderItemFromPathProc>("FolderItemFromPath")(path ? path->buffer + 1 : "");
}

REALevent probeEvents[] = {
    {"Ping(n as integer, s as string, d as double, b as boolean) as integer", 0},
    {"Done()", 0},
};

// Raises Ping with a string the plugin builds, owns and releases afterwards.
void Fire(REALobject self, int32_t n) {
  auto handler = reinterpret_cast<int32_t (*)(REALobject, int32_t, REALstring, double, bool)>(
      Entry<GetEventInstanceProc>("GetEventInstance")(self, probeEvents[0].forSystemUse));
  if (!handler) {
    Data(self)->n = -999;
    return;
  }
  REALstring s = Build("ping " + std::to_string(n));
  Data(self)->n = handler(self, n, s, n / 2.0, n % 2 == 1);
  Entry<REALUnlockStringProc>("REALUnlockString")(s);
}

REALproperty probeProperties[] = {
    {nullptr, "n", "Integer", 0, (REALproc)&GetN, (REALproc)&SetN, 0, 0, 0, 0},
    {nullptr, "d", "double", 0, (REALproc)&GetD, (REALproc)&SetD, 0, 0, 0, 0},
    {nullptr, "flag", "Boolean", 0, (REALproc)&GetFlag, (REALproc)&SetFlag, 0, 0, 0, 0},
    {nullptr, "tint", "Color", 0, (REALproc)&GetTint, (REALproc)&SetTint, 0, 0, 0, 0},
    {nullptr, "label", "String", 0, (REALproc)&GetLabel, (REALproc)&SetLabel, 0, 0, 0, 0},
    {nullptr, "partner", "Probe", 0, (REALproc)&GetPartner, (REALproc)&SetPartner, 0, 0, 0, 0},
    {nullptr, "param", "Integer", 0, (REALproc)&GetParam, nullptr, 7, 0, 0, 0},
    {nullptr, "runs", "Integer", 0, (REALproc)&GetRuns, nullptr, 0, 0, 0, 0},
};

REALmethodDefinition probeMethods[] = {
    {(REALproc)&ProbeDefault, nullptr, "Probe()"},
    {(REALproc)&ProbeWithN, nullptr, "Probe(n as Integer)"},
    {(REALproc)&AddInts, nullptr, "Add(a as Integer, b as Integer) as Integer"},
    {(REALproc)&AddDoubles, nullptr, "Add(a as Double, b as Double) as Double"},
    {(REALproc)&AddOne, nullptr, "add(a as integer) as integer"},
    {(REALproc)&Swap, nullptr, "Swap(ByRef a as Integer, byref b as integer)"},
    {(REALproc)&Scale, nullptr, "Scale(byref x as double, f as double)"},
    {(REALproc)&Rename, nullptr, "Rename(byref s as String)"},
    {(REALproc)&Echo, nullptr, "Echo(s as String) as String"},
    {(REALproc)&Length, nullptr, "Length(s as String) as Integer"},
    {(REALproc)&Self, nullptr, "Self() as Probe"},
    {(REALproc)&MakeAnother, nullptr, "MakeAnother() as probe"},
    {(REALproc)&NoObject, nullptr, "NoObject() as Probe"},
    {(REALproc)&PathOf, nullptr, "PathOf(f as Folderitem) as String"},
    {(REALproc)&Folder, nullptr, "Folder(path as String) as FolderItem"},
    {(REALproc)&Fire, nullptr, "Fire(n as Integer)"},
    {(REALproc)&AddInts, nullptr, "Broken(a as Integer b as Integer)"},
};

double Twice(double x) { return 2 * x; }
bool Flip(bool b) { return !b; }

REALmethodDefinition globals[] = {
    {(REALproc)&Twice, nullptr, "Twice(x as Double) as Double"},
    {(REALproc)&Flip, nullptr, "Flip(b as Boolean) as Boolean"},
    {(REALproc)&Flip, nullptr, "Unclosed(b as Boolean"},
};

}  // namespace

extern "C" __attribute__((visibility("default"))) void REALPluginMain(REALresolver resolver) {
  resolve = resolver;
  Entry<RegisterPluginVersionProc>("RegisterPluginVersion")(REAL_PLUGIN_VERSION);
  probeClass = REALclassDefinition{REAL_PLUGIN_VERSION,
                                   "Probe",
                                   nullptr,
                                   sizeof(ProbeData),
                                   0,
                                   (REALproc)&Construct,
                                   (REALproc)&Destruct,
                                   probeProperties,
                                   sizeof probeProperties / sizeof probeProperties[0],
                                   probeMethods,
                                   sizeof probeMethods / sizeof probeMethods[0],
                                   probeEvents,
                                   sizeof probeEvents / sizeof probeEvents[0],
                                   0, 0, 0, 0, 0};
  Entry<PluginRegisterClassProc>("PluginRegisterClass")(&probeClass);
  if (auto registerMethod = Entry<PluginRegisterMethodProc>("PluginRegisterMethod"))
    for (auto& m : globals) registerMethod(&m);
}
