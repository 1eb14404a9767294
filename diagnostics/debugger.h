// The debugger a script registers to receive the plugin's trace values and error
// events, and the senders every part of the plugin traces through.
#ifndef TINTWELL_DIAGNOSTICS_DEBUGGER_H
#define TINTWELL_DIAGNOSTICS_DEBUGGER_H

#include <cstdint>

#include "plugin_records.h"

// Instance data of halvoDebugger: all zero is a valid record.
struct DebuggerData {
  uint8_t useErrorEvent;  // 0 false, otherwise true; gates DebugError only
};

extern REALclassDefinition halvoDebuggerClass;

// The registered debugger, on which the plugin holds one host reference; null if none.
extern REALobject CurrentDebugger;

// Trace senders: deliver one event to the registered debugger, if it implements it.
// None of them touches the error state.
void SendDebugString(const char* text);
void SendDebugInteger(int32_t value);
void SendDebugDouble(double value);
void SendDebugBoolean(bool value);

// Raises DebugError(code, message) when a debugger is registered with UseErrorEvent on.
void SendDebugError(int32_t code, const char* message);

// Global methods.
void halvoRegisterDebugger(REALobject debugger);
void halvoUnregisterDebugger();

#endif
