// The plugin-wide outcome of the last operation, read by scripts with CMError().
#ifndef TINTWELL_DIAGNOSTICS_ERROR_STATE_H
#define TINTWELL_DIAGNOSTICS_ERROR_STATE_H

#include <cstdint>

#include "plugin_records.h"

// 0 success; negative: the plugin's own codes; positive: an operating-system code.
extern int32_t LastCMError;
// Storage for a description of the last error; nothing writes it, so it stays empty.
extern char LastCMErrorMessage[256];

// Plugin's own codes.
constexpr int32_t kErrorInvalidObject = -1;
constexpr int32_t kErrorSecondStage = -2;
constexpr int32_t kErrorPictureSize = -3;  // a picture size that is not positive or too large
constexpr int32_t kErrorFirstProfile = -20;
constexpr int32_t kErrorSecondProfile = -21;
constexpr int32_t kErrorNilProfile = -404;

// Stores the code, then raises DebugError for a non-zero code when a registered
// debugger wants error events.
void SetCMError(int32_t code);

// Reports the calling thread's Windows last-error value through SetCMError (0 clears
// the error and raises nothing).
void ReportSystemError();

// Global methods.
int32_t CMError();
REALstring CMErrorMessage();

#endif
