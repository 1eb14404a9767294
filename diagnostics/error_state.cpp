#include "error_state.h"

#include <cstring>

#include "debugger.h"
#include "host_bridge.h"
#include "win32_api.h"

int32_t LastCMError;
char LastCMErrorMessage[256];

void SetCMError(int32_t code) {
  LastCMError = code;
  if (code != 0) SendDebugError(LastCMError, LastCMErrorMessage);
}

void ReportSystemError() { SetCMError(static_cast<int32_t>(GetLastError())); }

int32_t CMError() { return LastCMError; }

REALstring CMErrorMessage() {
  return bridge::BuildString(LastCMErrorMessage, static_cast<int32_t>(std::strlen(LastCMErrorMessage)));
}
