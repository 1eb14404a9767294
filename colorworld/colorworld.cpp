#include "colorworld.h"

#include <cmath>

#include "class_tables.h"
#include "cmcolor.h"
#include "debugger.h"
#include "error_state.h"
#include "host_bridge.h"
#include "instance_data.h"
#include "picture_match.h"
#include "profile.h"

namespace {

ColorWorldData* Data(REALobject self) { return GetInstanceData<ColorWorldData>(self, ColorWorldClass); }

void DeleteTransform(ColorWorldData* d) {
  if (!d->transform) return;
  DeleteColorTransform(d->transform);
  d->transform = nullptr;
}

// A profile is usable when it is open and reported valid.
bool Usable(REALobject profile) {
  const HPROFILE handle = ProfileHandle(profile);
  BOOL valid = FALSE;
  return handle && IsColorProfileValid(handle, &valid) && valid;
}

// The colour type a chain takes in from its first profile: a named-colour profile takes
// colour indexes, whatever data colour space it names.
COLORTYPE InputTypeFor(const PROFILEHEADER& first) {
  return first.phClass == CLASS_NAMED ? COLOR_NAMED : ColorTypeForSpace(first.phDataColorSpace);
}

// How a concatenation reads each header: through ReadProfileHeader (with its trace and
// error report) or quietly, where a failed read counts as a zeroed header.
enum class HeaderRead { Reported, Quiet };

void Concatenate(ColorWorldData* d, int32_t keyindex, REALobject const profiles[4], HeaderRead read) {
  DeleteTransform(d);
  HPROFILE handles[4];
  DWORD intents[4];
  DWORD count = 0;
  for (int i = 0; i < 4; ++i) {
    const HPROFILE handle = ProfileHandle(profiles[i]);
    if (!handle) continue;
    PROFILEHEADER header;
    if (read == HeaderRead::Reported) {
      ReadProfileHeader(handle, &header);
    } else if (!GetColorProfileHeader(handle, &header)) {
      header = PROFILEHEADER{};
    }
    handles[count] = handle;
    intents[count] = header.phRenderingIntent;
    if (count == 0) d->inType = static_cast<uint8_t>(InputTypeFor(header));
    d->outType = static_cast<uint8_t>(ColorTypeForSpace(header.phDataColorSpace));
    ++count;
  }
  ClearLastError();
  d->transform = CreateMultiProfileTransform(handles, count, intents, count, BEST_MODE, static_cast<DWORD>(keyindex));
  LastCMError = static_cast<int32_t>(GetLastError());
  SetCMError(LastCMError);
}

void ConstructEmpty(REALobject) {}

void ConstructFromPair(REALobject self, REALobject src, REALobject dest) {
  ColorWorldData* d = Data(self);
  SendDebugString(" ");
  SendDebugString("--->COLORWORLD CONSTRUCTOR");
  LastCMError = 0;
  SetCMError(0);
  if (d->transform) {
    DeleteTransform(d);
    SendDebugString("Deleteing colorworld");
  }
  if (!Usable(src)) {
    SendDebugString("Error: Could not open ICM profile 1");
    SetCMError(kErrorFirstProfile);
    return;
  }
  if (!Usable(dest)) {
    SendDebugString("Error: Could not open ICM profile 2");
    SetCMError(kErrorSecondProfile);
    return;
  }
  PROFILEHEADER source, destination;
  ReadProfileHeader(ProfileHandle(src), &source);
  ReadProfileHeader(ProfileHandle(dest), &destination);
  d->inType = static_cast<uint8_t>(InputTypeFor(source));
  d->outType = static_cast<uint8_t>(ColorTypeForSpace(destination.phDataColorSpace));
  HPROFILE handles[2] = {ProfileHandle(src), ProfileHandle(dest)};
  DWORD intents[2] = {source.phRenderingIntent, destination.phRenderingIntent};
  ClearLastError();
  d->transform = CreateMultiProfileTransform(handles, 2, intents, 2, BEST_MODE, INDEX_DONT_CARE);
  const DWORD code = GetLastError();
  if (!d->transform) SendDebugString("Colorworld is BAD");
  LastCMError = static_cast<int32_t>(code);
  SendDebugString("Colorworld ERROR:");
  SendDebugInteger(LastCMError);
  SetCMError(LastCMError);
}

// Builds the colour world from one device-link profile: colours go in as its data
// colour space and come out as its connection-space field, which holds a link's
// output space. Anything else leaves the colour world empty with -20.
void LinkColorWorld(REALobject self, REALobject link) {
  ColorWorldData* d = Data(self);
  LastCMError = 0;
  SetCMError(0);
  DeleteTransform(d);
  if (!Usable(link)) {
    SendDebugString("Error: Could not open ICM profile 1");
    SetCMError(kErrorFirstProfile);
    return;
  }
  HPROFILE handle = ProfileHandle(link);
  PROFILEHEADER header;
  if (!ReadProfileHeader(handle, &header)) return;
  if (header.phClass != CLASS_LINK) {
    SendDebugString("Error: Not a device link profile");
    SetCMError(kErrorFirstProfile);
    return;
  }
  d->inType = static_cast<uint8_t>(ColorTypeForSpace(header.phDataColorSpace));
  d->outType = static_cast<uint8_t>(ColorTypeForSpace(header.phConnectionSpace));
  DWORD intent = header.phRenderingIntent;
  ClearLastError();
  d->transform = CreateMultiProfileTransform(&handle, 1, &intent, 1, BEST_MODE, INDEX_DONT_CARE);
  const DWORD code = GetLastError();
  if (!d->transform) SendDebugString("Colorworld is BAD");
  SetCMError(static_cast<int32_t>(code));
}

void ConcatColorWorld(REALobject self, int32_t keyindex, REALobject p1, REALobject p2, REALobject p3, REALobject p4) {
  REALobject const profiles[4] = {p1, p2, p3, p4};
  Concatenate(Data(self), keyindex, profiles, HeaderRead::Reported);
}

void MatchCMcolor(REALobject self, REALobject color) {
  ColorWorldData* d = Data(self);
  LastCMError = 0;
  SetCMError(0);
  if (!color) {
    SetCMError(kErrorInvalidObject);
    return;
  }
  if (!d->transform) {
    SetCMError(kErrorSecondProfile);
    return;
  }
  COLOR* value = &GetInstanceData<CMColorData>(color, CMColorClass)->value;
  if (!TranslateColors(d->transform, value, 1, static_cast<COLORTYPE>(d->inType), value,
                       static_cast<COLORTYPE>(d->outType)))
    LastCMError = static_cast<int32_t>(GetLastError());
  SetCMError(LastCMError);
}

// False for "out of gamut" and for a check that could not be made; CMError tells the
// two apart, so a script never takes a missing transform for an answer.
bool CheckLAB(REALobject self, double l, double a, double b) {
  LastCMError = 0;
  const HTRANSFORM transform = Data(self)->transform;
  if (!transform) {
    SendDebugString("Error: Colorworld has no transform");
    SetCMError(kErrorSecondProfile);
    return false;
  }
  COLOR color;
  color.Lab.L = StoreRuleWord(l * 652.8);
  color.Lab.a = StoreRuleWord((a + 128.0) * 256.0);
  color.Lab.b = StoreRuleWord((b + 128.0) * 256.0);
  BYTE result = 1;
  if (!CheckColors(transform, &color, 1, COLOR_Lab, &result)) {
    const DWORD code = GetLastError();
    SendDebugString("CheckColors FAIL");
    SetCMError(static_cast<int32_t>(code));
    return false;
  }
  return result == 0;
}

void Destruct(REALobject self) { DeleteTransform(Data(self)); }

int32_t GetCMMcount(REALobject, intptr_t) {
  SetCMError(0);
  return 1;  // one colour-management module: the platform's
}

REALproperty properties[] = {
    {nullptr, "CMMcount", "Integer", 0, AsProc(&GetCMMcount), nullptr, 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&ConstructFromPair), nullptr, "ColorWorld(src as Profile, dest as Profile)"},
    {AsProc(&ConstructEmpty), nullptr, "ColorWorld()"},
    {AsProc(&LinkColorWorld), nullptr, "LinkColorWorld(linkprofile as Profile)"},
    {AsProc(&ConcatColorWorld), nullptr,
     "ConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile)"},
    {AsProc(&CheckLAB), nullptr, "CheckLAB(L as Double, A as Double, B as Double) as Boolean"},
    {AsProc(&MatchPicture), nullptr,
     "MatchPicture(p as Picture, width as Integer, height as Integer, depth as Integer, transparent as Boolean) "
     "as Picture"},
    {AsProc(&MatchCMcolor), nullptr, "MatchCMcolor(c as CMcolor)"},
};

}  // namespace

COLORTYPE ColorTypeForSpace(uint32_t space) {
  switch (space) {
    case SPACE_GRAY: return COLOR_GRAY;
    case SPACE_RGB: return COLOR_RGB;
    case SPACE_XYZ: return COLOR_XYZ;
    case SPACE_Yxy: return COLOR_Yxy;
    case SPACE_Lab: return COLOR_Lab;
    case SPACE_Luv:
    case SPACE_YCbCr:
    case SPACE_HSV:
    case SPACE_HLS:
    case SPACE_CMY:
    case SPACE_3_CHANNEL: return COLOR_3_CHANNEL;
    case SPACE_CMYK:
    case SPACE_4_CHANNEL: return COLOR_CMYK;
    case SPACE_5_CHANNEL: return COLOR_5_CHANNEL;
    case SPACE_6_CHANNEL: return COLOR_6_CHANNEL;
    case SPACE_7_CHANNEL: return COLOR_7_CHANNEL;
    case SPACE_8_CHANNEL: return COLOR_8_CHANNEL;
    default: return COLOR_RGB;
  }
}

REALobject NewConcatColorWorld(int32_t keyindex, REALobject p1, REALobject p2, REALobject p3, REALobject p4) {
  LastCMError = 0;
  REALobject world = bridge::NewInstance("Colorworld");
  if (!world) return nullptr;
  REALobject const profiles[4] = {p1, p2, p3, p4};
  Concatenate(Data(world), keyindex, profiles, HeaderRead::Quiet);
  return world;
}

REALclassDefinition ColorWorldClass =
    ClassDefinition("ColorWorld", sizeof(ColorWorldData), nullptr, AsProc(&Destruct), properties, methods);
