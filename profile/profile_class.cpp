// The Profile class definition: its properties and methods in registration order.
#include <cstddef>

#include "class_tables.h"
#include "header_fields.h"
#include "profile.h"
#include "tag_codecs.h"

namespace {

using namespace header_fields;
using namespace profile_members;
using namespace tag_members;

// A header property: its getter and setter with their no-profile behaviours.
template <class Field, NoProfile GetPolicy, NoProfile SetPolicy>
REALproperty Header(const char* name, const char* type) {
  return {nullptr, name, type, 0, AsProc(&Get<Field, GetPolicy>), AsProc(&Set<Field, SetPolicy>), 0, 0, 0, 0};
}

template <class Field, NoProfile Policy>
REALproperty Header(const char* name, const char* type) {
  return Header<Field, Policy, Policy>(name, type);
}

// Type's get alone clears the last error first.
REALstring GetType(REALobject self, intptr_t param) {
  LastCMError = 0;
  return Get<SignatureField<offsetof(PROFILEHEADER, phClass)>, NoProfile::Event>(self, param);
}

// The file signature is read-only in effect: its setter changes nothing.
void SetSignature(REALobject, intptr_t, REALstring) {}

constexpr std::size_t kFlags = offsetof(PROFILEHEADER, phProfileFlags);
constexpr std::size_t kAttributes2 = offsetof(PROFILEHEADER, phAttributes) + 4;
constexpr std::size_t kDate = offsetof(PROFILEHEADER, phDateTime);
constexpr std::size_t kWhite = offsetof(PROFILEHEADER, phIlluminant);
constexpr NoProfile kEvent = NoProfile::Event;
constexpr NoProfile kSilent = NoProfile::Silent;
constexpr NoProfile kUntested = NoProfile::NotTested;

REALproperty properties[] = {
    {nullptr, "Location", "Folderitem", 0, AsProc(&GetLocation), nullptr, 0, 0, 0, 0},
    {nullptr, "LocationType", "Integer", 0, AsProc(&GetLocationType), nullptr, 0, 0, 0, 0},
    {nullptr, "Type", "String", 0, AsProc(&GetType),
     AsProc(&Set<SignatureField<offsetof(PROFILEHEADER, phClass)>, kEvent>), 0, 0, 0, 0},
    Header<SignatureField<offsetof(PROFILEHEADER, phCMMType)>, kEvent>("CMM", "String"),
    Header<IntegerField<offsetof(PROFILEHEADER, phRenderingIntent)>, kEvent>("RenderIntent", "Integer"),
    Header<QualityField, kUntested>("Quality", "Integer"),
    Header<SignatureField<offsetof(PROFILEHEADER, phDataColorSpace)>, kEvent, kSilent>("ColorSpace", "String"),
    Header<SignatureField<offsetof(PROFILEHEADER, phConnectionSpace)>, kEvent>("ConnectionSpace", "String"),
    Header<WhiteField<kWhite>, kEvent>("WhiteX", "Double"),
    Header<WhiteField<kWhite + 4>, kEvent>("WhiteY", "Double"),
    Header<WhiteField<kWhite + 8>, kEvent>("WhiteZ", "Double"),
    Header<SignatureField<offsetof(PROFILEHEADER, phPlatform)>, kEvent>("Platform", "String"),
    Header<SignatureField<offsetof(PROFILEHEADER, phManufacturer)>, kEvent>("Manufacturer", "String"),
    Header<SignatureField<offsetof(PROFILEHEADER, phCreator)>, kEvent, kUntested>("Creator", "String"),
    {nullptr, "Signature", "String", 0, AsProc(&Get<SignatureField<offsetof(PROFILEHEADER, phSignature)>, kEvent>),
     AsProc(&SetSignature), 0, 0, 0, 0},
    Header<IntegerField<offsetof(PROFILEHEADER, phSize)>, kUntested>("Size", "Integer"),
    Header<IntegerField<offsetof(PROFILEHEADER, phVersion)>, kEvent>("Version", "Integer"),
    Header<IntegerField<kFlags>, kEvent>("Flags", "Integer"),
    Header<IntegerField<offsetof(PROFILEHEADER, phModel)>, kEvent>("Model", "Integer"),
    Header<AttributeField<offsetof(PROFILEHEADER, phAttributes)>, kEvent>("Attribute1", "Integer"),
    Header<AttributeField<kAttributes2>, kSilent, kEvent>("Attribute2", "Integer"),
    Header<BitField<kAttributes2, 0, false>, kUntested>("Transparent", "Boolean"),
    Header<BitField<kAttributes2, 1, false>, kUntested>("Matte", "Boolean"),
    Header<BitField<kFlags, 0, false>, kUntested>("Embedded", "Boolean"),
    Header<BitField<kFlags, 1, false>, kUntested>("EmbeddedUse", "Boolean"),
    Header<BitField<kFlags, 18, true>, kUntested>("Interpolation", "Boolean"),
    Header<BitField<kFlags, 19, true>, kUntested>("GamutCheck", "Boolean"),
    Header<DateField<kDate, true>, kUntested>("Year", "Integer"),
    Header<DateField<kDate, false>, kUntested>("Month", "Integer"),
    Header<DateField<kDate + 4, true>, kUntested>("Day", "Integer"),
    Header<DateField<kDate + 4, false>, kUntested>("Hour", "Integer"),
    Header<DateField<kDate + 8, true>, kUntested>("Minute", "Integer"),
    Header<DateField<kDate + 8, false>, kUntested>("Second", "Integer"),
    {nullptr, "TagCount", "Integer", 0, AsProc(&GetTagCount), nullptr, 0, 0, 0, 0},
    {nullptr, "Modified", "Boolean", 0, AsProc(&GetModified), nullptr, 0, 0, 0, 0},
    {nullptr, "RefCount", "Integer", 0, AsProc(&GetRefCount), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorCount", "Integer", 0, AsProc(&GetNamedColorCount), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorChannels", "Integer", 0, AsProc(&GetNamedColorChannels), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorDevicespace", "String", 0, AsProc(&GetNamedColorDevicespace), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorPCSspace", "String", 0, AsProc(&GetNamedColorPCSspace), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorPrefix", "String", 0, AsProc(&GetNamedColorPrefix), nullptr, 0, 0, 0, 0},
    {nullptr, "NamedColorSuffix", "String", 0, AsProc(&GetNamedColorSuffix), nullptr, 0, 0, 0, 0},
    {nullptr, "Name", "String", 0, AsProc(&GetName), AsProc(&SetName), 0, 0, 0, 0},
    {nullptr, "Copyright", "String", 0, AsProc(&GetCopyright), AsProc(&SetCopyright), 0, 0, 0, 0},
};

REALmethodDefinition methods[] = {
    {AsProc(&ConstructFromFile), nullptr, "Profile(f as Folderitem)"},
    {AsProc(&ConstructWithIntent), nullptr,
     "Profile(f as Folderitem, intent as Integer, quality as Integer, CMM as String)"},
    {AsProc(&ConstructFromProfile), nullptr, "Profile(f as Folderitem, p as Profile)"},
    {AsProc(&SaveProfileAs), nullptr, "SaveProfileAs(f as folderitem)"},
    {AsProc(&SaveProfile), nullptr, "SaveProfile()"},
    {AsProc(&ValidProfile), nullptr, "ValidProfile() as Boolean"},
    {AsProc(&TagExists), nullptr, "TagExists(tag as String) as Boolean"},
    {AsProc(&RemoveTag), nullptr, "RemoveTag(tag as String) as Integer"},
    {AsProc(&TagName), nullptr, "TagName(index as Integer) as String"},
    {AsProc(&TagDataAt), nullptr, "TagData(index as Integer) as String"},
    {AsProc(&TagDataOf), nullptr, "TagData(tag as String) as String"},
    {AsProc(&SetTagData), nullptr, "SetTagData(tag as String, data as String) as Integer"},
    {AsProc(&SetTagRef), nullptr, "SetTagRef(tag as String, ref as String) as Integer"},
    {AsProc(&GetXYZTag), nullptr, "GetXYZTag(tag as String, Byref WX as Double, Byref WY as Double, Byref WZ as Double)"},
    {AsProc(&SetXYZTag), nullptr, "SetXYZTag(tag as String, WX as Double, WY as Double, WZ as Double)"},
    {AsProc(&GetNamedColorIndex), nullptr, "GetNamedColorIndex(name as String) as Integer"},
    {AsProc(&GetNamedColorName), nullptr, "GetNamedColorName(index as Integer) as String"},
    {AsProc(&GetIndNamedColorPCS), nullptr,
     "GetIndNamedColorPCS(index as Integer, byref Ll as double,byref La as double,byref Lb as double)"},
    {AsProc(&GetTRC), nullptr, "GetTRC(tag as String, v as Vector)"},
    {AsProc(&SetTRC), nullptr, "SetTRC(tag as String, v as Vector)"},
    {AsProc(&GetMFT), nullptr, "GetMFT(tag as String) as Clut"},
    {AsProc(&SetMFT), nullptr, "SetMFT(tag as String, mft as Clut)"},
    {AsProc(&GetNC), nullptr, "GetNC(tag as String, v as VectorNC)"},
    {AsProc(&SetNC), nullptr, "SetNC(tag as String, v as VectorNC)"},
    {AsProc(&GetTextTypeTag), nullptr, "GetTextTypeTag(tag as String) as String"},
    {AsProc(&SetTextTypeTag), nullptr, "SetTextTypeTag(tag as String, data as String)"},
    {AsProc(&GetDescTypeTag), nullptr, "GetDescTypeTag(tag as String) as String"},
    {AsProc(&SetDescTypeTag), nullptr, "SetDescTypeTag(tag as String, data as String)"},
};

}  // namespace

REALclassDefinition ProfileClass =
    ClassDefinition("Profile", sizeof(ProfileData), nullptr, AsProc(&Destruct), properties, methods);
