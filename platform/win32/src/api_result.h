// How every call of the stand-in ends: a failure sets the thread's last error to its
// Windows code; a success sets it to 0, so no stale failure is ever read after it.
#ifndef TINTWELL_WIN32_API_RESULT_H
#define TINTWELL_WIN32_API_RESULT_H

#include "windows.h"

namespace win32 {

inline BOOL Fail(DWORD code) {
  SetLastError(code);
  return FALSE;
}

inline BOOL Succeed() {
  SetLastError(ERROR_SUCCESS);
  return TRUE;
}

}  // namespace win32

#endif
