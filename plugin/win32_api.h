// The Win32 API the plugin calls: the SDK on Windows, the project's stand-in on Linux.
#ifndef TINTWELL_PLUGIN_WIN32_API_H
#define TINTWELL_PLUGIN_WIN32_API_H

#include <windows.h>
#include <icm.h>

#endif
