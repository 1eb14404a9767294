// The Win32 API the plugin calls: the SDK on Windows, the project's stand-in on Linux.
#ifndef TINTWELL_PLUGIN_WIN32_API_H
#define TINTWELL_PLUGIN_WIN32_API_H

#include <windows.h>
#include <icm.h>

// Windows leaves a failure's code in place across later successful calls. Where the
// plugin reports the last error after a call that may succeed, it clears it first, so
// that a success reports 0 rather than an older failure.
inline void ClearLastError() { SetLastError(ERROR_SUCCESS); }

#endif
