// Helpers for the static tables that describe the plugin's classes to the host.
#ifndef TINTWELL_PLUGIN_CLASS_TABLES_H
#define TINTWELL_PLUGIN_CLASS_TABLES_H

#include <cstddef>

#include "plugin_records.h"

// Any function, as the untyped word the host's records hold.
template <class F>
REALproc AsProc(F function) {
  return reinterpret_cast<REALproc>(function);
}

// A class definition over its tables; the host fills its word at registration.
template <std::size_t Properties, std::size_t Methods>
REALclassDefinition ClassDefinition(const char* name, std::size_t dataSize, REALproc constructor, REALproc destructor,
                                    REALproperty (&properties)[Properties], REALmethodDefinition (&methods)[Methods],
                                    REALevent* events = nullptr, std::size_t eventCount = 0) {
  return {REAL_PLUGIN_VERSION,
          name,
          nullptr,
          static_cast<intptr_t>(dataSize),
          0,
          constructor,
          destructor,
          properties,
          static_cast<intptr_t>(Properties),
          methods,
          static_cast<intptr_t>(Methods),
          events,
          static_cast<intptr_t>(eventCount),
          0,
          0,
          0,
          0,
          0};
}

#endif
