// The plugin's own folder, "\temp\" beside the host executable, and the numbered names
// of the working copies kept there.
//
// Every loaded copy of the plugin claims a numbered folder of its own inside "\temp\"
// ("\temp\0\", "\temp\1\", ...) and names its working copies there by its counter, so
// no two programs ever share a working copy. A claimed folder holds a file "lock" that
// its owner keeps open without sharing for as long as it runs; at start-up every other
// folder whose lock can be opened belongs to a program that has ended, and is removed.
#ifndef TINTWELL_PLUGIN_TEMP_FOLDER_H
#define TINTWELL_PLUGIN_TEMP_FOLDER_H

#include <cstddef>
#include <cstdint>

#include "win32_api.h"

// Room for any ANSI Windows path; empty when the folder could not be named.
constexpr std::size_t kTempFolderCapacity = MAX_PATH;
// "\temp\": announced to the debugger, and where the blank-profile template lies.
extern char TempFolderPath[kTempFolderCapacity];
// This plugin's own folder inside it, where its working copies are made.
extern char WorkingFolderPath[kTempFolderCapacity];
extern int32_t TempNameCounter;

// The folder for an executable path: its directory followed by "\temp\"
// ("C:\App\host.exe" gives "C:\App\temp\", "C:\host.exe" gives "C:\temp\"). Returns
// false, leaving out empty, for a path without a folder or a result that does not fit.
bool TempFolderFromModulePath(const char* modulePath, char* out, std::size_t outSize);

// Names the folder after the running executable and creates it, removes the folders of
// programs that have ended, and claims a folder of this plugin's own. A failure leaves
// WorkingFolderPath empty, so that no working copy can be named.
void SetUpTempFolder();

// Removes the numbered folders inside TempFolderPath whose owners have ended.
void SweepAbandonedFolders();

// Writes the next working-copy name, WorkingFolderPath followed by the decimal counter,
// and advances the counter. Returns false, and leaves the counter alone, when there is
// no working folder or the name does not fit in destSize bytes.
bool MakeTempName(char* dest, std::size_t destSize);

#endif
