#include "windows.h"

namespace {
// In the static TLS block, not a dynamic one: the plugin that carries this code is
// loaded and unloaded many times in one process, and a dynamic TLS block of an unloaded
// library is what the leak checker then trips over.
__attribute__((tls_model("initial-exec"))) thread_local DWORD last_error = ERROR_SUCCESS;
}

extern "C" DWORD WINAPI GetLastError(void) { return last_error; }

extern "C" void WINAPI SetLastError(DWORD dwErrCode) { last_error = dwErrCode; }
