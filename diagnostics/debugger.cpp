#include "debugger.h"

#include <cstring>

#include "class_tables.h"
#include "host_bridge.h"
#include "instance_data.h"
#include "temp_folder.h"

REALobject CurrentDebugger;

namespace {

enum DebuggerEvent { kDebugError, kDebugInteger, kDebugDouble, kDebugBoolean, kDebugString };

REALevent debuggerEvents[] = {
    {"DebugError(err as integer, errMessage as string)", 0},
    {"DebugInteger(aInteger as integer)", 0},
    {"DebugDouble(aDouble as double)", 0},
    {"DebugBoolean(aBoolean as boolean)", 0},
    {"DebugString(aString as string)", 0},
};

DebuggerData* Data(REALobject debugger) { return GetInstanceData<DebuggerData>(debugger, halvoDebuggerClass); }

void ConstructDefault(REALobject self) { Data(self)->useErrorEvent = 1; }
void ConstructWithFlag(REALobject self, bool useErrorEvent) { Data(self)->useErrorEvent = useErrorEvent ? 1 : 0; }
void Destruct(REALobject self) { Data(self)->useErrorEvent = 0; }

bool GetUseErrorEvent(REALobject self, intptr_t) { return Data(self)->useErrorEvent != 0; }
void SetUseErrorEvent(REALobject self, intptr_t, bool value) { Data(self)->useErrorEvent = value ? 1 : 0; }

REALproperty debuggerProperties[] = {
    {nullptr, "UseErrorEvent", "Boolean", 0, AsProc(&GetUseErrorEvent), AsProc(&SetUseErrorEvent), 0, 0, 0, 0},
};

REALmethodDefinition debuggerMethods[] = {
    {AsProc(&ConstructWithFlag), nullptr, "halvoDebugger(useErrorEvent as boolean)"},
    {AsProc(&ConstructDefault), nullptr, "halvoDebugger()"},
};

// The handler for one event of the registered debugger, or null.
template <class Handler>
Handler HandlerFor(DebuggerEvent event) {
  if (!CurrentDebugger) return nullptr;
  return reinterpret_cast<Handler>(bridge::GetEventInstance(CurrentDebugger, debuggerEvents[event].forSystemUse));
}

// Builds a host string for an event; the sender keeps the reference and releases it
// once the handler has returned.
void DeliverString(void (*handler)(REALobject, REALstring), const char* text) {
  REALstring s = bridge::BuildString(text, static_cast<int32_t>(std::strlen(text)));
  handler(CurrentDebugger, s);
  bridge::UnlockString(s);
}

}  // namespace

REALclassDefinition halvoDebuggerClass =
    ClassDefinition("halvoDebugger", sizeof(DebuggerData), nullptr, AsProc(&Destruct), debuggerProperties,
                    debuggerMethods, debuggerEvents, sizeof debuggerEvents / sizeof debuggerEvents[0]);

void SendDebugString(const char* text) {
  if (auto handler = HandlerFor<void (*)(REALobject, REALstring)>(kDebugString)) DeliverString(handler, text);
}

void SendDebugInteger(int32_t value) {
  if (auto handler = HandlerFor<void (*)(REALobject, int32_t)>(kDebugInteger)) handler(CurrentDebugger, value);
}

void SendDebugDouble(double value) {
  if (auto handler = HandlerFor<void (*)(REALobject, double)>(kDebugDouble)) handler(CurrentDebugger, value);
}

void SendDebugBoolean(bool value) {
  if (auto handler = HandlerFor<void (*)(REALobject, bool)>(kDebugBoolean)) handler(CurrentDebugger, value);
}

void SendDebugError(int32_t code, const char* message) {
  if (!CurrentDebugger || !Data(CurrentDebugger)->useErrorEvent) return;
  auto handler = HandlerFor<void (*)(REALobject, int32_t, REALstring)>(kDebugError);
  if (!handler) return;
  REALstring s = bridge::BuildString(message, static_cast<int32_t>(std::strlen(message)));
  handler(CurrentDebugger, code, s);
  bridge::UnlockString(s);
}

void halvoRegisterDebugger(REALobject debugger) {
  // A second registration is refused silently: the registered debugger stays.
  if (CurrentDebugger) return;
  CurrentDebugger = debugger;
  bridge::LockObject(debugger);
  SendDebugString("DIRECTORY:");
  SendDebugString(TempFolderPath);
}

void halvoUnregisterDebugger() {
  if (!CurrentDebugger) return;
  REALobject debugger = CurrentDebugger;
  CurrentDebugger = nullptr;
  bridge::UnlockObject(debugger);
}
