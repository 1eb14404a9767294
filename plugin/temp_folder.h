// The plugin's own folder, "\temp\" beside the host executable, and the numbered names
// of the working copies kept there.
#ifndef TINTWELL_PLUGIN_TEMP_FOLDER_H
#define TINTWELL_PLUGIN_TEMP_FOLDER_H

#include <cstddef>
#include <cstdint>

#include "win32_api.h"

// Room for any ANSI Windows path; empty when the folder could not be named.
constexpr std::size_t kTempFolderCapacity = MAX_PATH;
extern char TempFolderPath[kTempFolderCapacity];
extern int32_t TempNameCounter;

// The folder for an executable path: its directory followed by "\temp\"
// ("C:\App\host.exe" gives "C:\App\temp\", "C:\host.exe" gives "C:\temp\"). Returns
// false, leaving out empty, for a path without a folder or a result that does not fit.
bool TempFolderFromModulePath(const char* modulePath, char* out, std::size_t outSize);

// Names the folder after the running executable and creates it; an existing folder or
// a failure to create it changes nothing here.
void SetUpTempFolder();

// Writes the next working-copy name, TempFolderPath followed by the decimal counter,
// and advances the counter. Returns false, and leaves the counter alone, when there is
// no temporary folder or the name does not fit in destSize bytes.
bool MakeTempName(char* dest, std::size_t destSize);

#endif
