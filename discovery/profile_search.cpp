// The colour directory, the search of its profiles by header values, and the entries
// that answer constants.
#include <cstdlib>
#include <cstring>

#include "discovery.h"
#include "error_state.h"
#include "host_bridge.h"
#include "signatures.h"
#include "vector_f.h"
#include "win32_api.h"

namespace {

const char kPattern[] = "\\*.ic*";

// The colour directory as text in a new malloc'd buffer with room beyond the directory's
// size for extra bytes more; the caller frees it. Null, with the failure reported, when
// the directory cannot be had.
char* ColorDirectoryText(std::size_t extra) {
  DWORD size = 0;
  GetColorDirectoryA(nullptr, nullptr, &size);
  char* text = size ? static_cast<char*>(std::malloc(static_cast<std::size_t>(size) + extra)) : nullptr;
  if (!text || !GetColorDirectoryA(nullptr, text, &size)) {
    // A failed query leaves its own code; a failed allocation has none of the system's.
    const DWORD code = size && !text ? static_cast<DWORD>(ERROR_NOT_ENOUGH_MEMORY) : GetLastError();
    std::free(text);
    SetCMError(static_cast<int32_t>(code));
    return nullptr;
  }
  return text;
}

struct Criterion {
  bool inForce;
  uint32_t value;
};

Criterion FromString(REALstring s) { return {bridge::StringLength(s) > 0, TagFromString(s)}; }

// Each criterion in force equals its header field; a header that cannot be read
// matches nothing.
bool HeaderMatches(HPROFILE profile, const Criterion (&c)[6]) {
  PROFILEHEADER header;
  if (!GetColorProfileHeader(profile, &header)) return false;
  const uint32_t fields[6] = {header.phCMMType,      header.phClass,        header.phDataColorSpace,
                              header.phConnectionSpace, header.phManufacturer, header.phModel};
  for (int i = 0; i < 6; ++i)
    if (c[i].inForce && c[i].value != fields[i]) return false;
  return true;
}

// Adds the folder item of path to the list, which takes over the reference the host
// handed out with it: the list holds exactly one.
void AppendFound(VectorFData* list, const char* path) {
  REALfolderItem item = bridge::FolderItemFromPath(path);
  if (item && !VectorFAdopt(list, item)) bridge::UnlockObject(item);
}

}  // namespace

// None of the constant entries touches the error state.
int32_t TintwellVersion() { return 0; }
int32_t CMMcount() { return 0; }
int32_t CreateProfileIdentifier(REALobject, int32_t, int32_t) { return -1; }
REALobject GetMonitorProfile() { return nullptr; }
REALobject GetSystemProfile() { return nullptr; }
REALobject GetProfileByUse(REALstring) { return nullptr; }
REALobject getProfileBySpace(REALstring) { return nullptr; }

REALfolderItem TintwellFolder() {
  char* directory = ColorDirectoryText(0);
  if (!directory) return nullptr;
  REALfolderItem folder = bridge::FolderItemFromPath(directory);
  std::free(directory);
  return folder;
}

void ProfileSearch(REALstring cmm, REALstring aClass, REALstring dataspace, REALstring connectspace,
                   REALstring manufacturer, int32_t model, REALobject profiles) {
  if (!profiles) return;
  VectorFData* list = GetVectorFData(profiles);
  const Criterion criteria[6] = {FromString(cmm),          FromString(aClass),       FromString(dataspace),
                                 FromString(connectspace), FromString(manufacturer), {model > 0, static_cast<uint32_t>(model)}};
  bool anyInForce = false;
  for (const Criterion& c : criteria) anyInForce |= c.inForce;

  char* directory = ColorDirectoryText(sizeof kPattern);
  if (!directory) return;
  const std::size_t directoryLength = std::strlen(directory);
  std::memcpy(directory + directoryLength, kPattern, sizeof kPattern);
  WIN32_FIND_DATAA found;
  HANDLE search = FindFirstFileA(directory, &found);
  directory[directoryLength] = '\0';
  if (search == INVALID_HANDLE_VALUE) {
    std::free(directory);
    return;
  }
  do {
    const std::size_t nameLength = std::strlen(found.cFileName);
    char* path = static_cast<char*>(std::malloc(directoryLength + nameLength + 2));
    if (!path) continue;
    std::memcpy(path, directory, directoryLength);
    path[directoryLength] = '\\';
    std::memcpy(path + directoryLength + 1, found.cFileName, nameLength + 1);
    // By its bare name, which the colour directory resolves; read-only, header only.
    PROFILE spec = {PROFILE_FILENAME, found.cFileName, static_cast<DWORD>(nameLength)};
    HPROFILE profile = OpenColorProfileA(&spec, PROFILE_READ, FILE_SHARE_READ | FILE_SHARE_WRITE, OPEN_EXISTING);
    if (profile) {
      if (!anyInForce || HeaderMatches(profile, criteria)) AppendFound(list, path);
      CloseColorProfile(profile);
    }
    std::free(path);
  } while (FindNextFileA(search, &found));
  FindClose(search);
  std::free(directory);
}
