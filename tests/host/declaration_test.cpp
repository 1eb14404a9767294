#include "host/declaration.h"

#include <gtest/gtest.h>

namespace {

using host::ParseDeclaration;
using host::TypeKind;

TEST(Declaration, ParsesNamesParametersByRefAndResult) {
  std::string error;
  auto d = ParseDeclaration(
      "getallsix(byref n1 as integer, byref n2 as integer, byref n3 as integer, byref n4 as integer, "
      "byref n5 as integer, byref n6 as integer)",
      &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->name, "getallsix");
  ASSERT_EQ(d->parameters.size(), 6u);
  for (const auto& p : d->parameters) {
    EXPECT_TRUE(p.byRef);
    EXPECT_EQ(p.type.kind, TypeKind::Integer);
  }
  EXPECT_FALSE(d->result);

  d = ParseDeclaration("TagData(index as Integer) as String", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters[0].name, "index");
  EXPECT_FALSE(d->parameters[0].byRef);
  ASSERT_TRUE(d->result);
  EXPECT_EQ(d->result->kind, TypeKind::String);

  d = ParseDeclaration("GetMFT(tag as String) as Clut", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->result->kind, TypeKind::Object);
  EXPECT_EQ(d->result->className, "Clut");

  d = ParseDeclaration("  GetIndNamedColorPCS(index as Integer, byref Ll as double,byref La as double,"
                       "byref Lb as double)  ",
                       &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters.size(), 4u);
  EXPECT_EQ(d->parameters[3].type.kind, TypeKind::Double);

  d = ParseDeclaration("reset()", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_TRUE(d->parameters.empty());

  d = ParseDeclaration("Matte(v as BOOLEAN, c as color, x as ByValue) AS integer", &error);
  ASSERT_TRUE(d) << error;
  EXPECT_EQ(d->parameters[0].type.kind, TypeKind::Boolean);
  EXPECT_EQ(d->parameters[1].type.kind, TypeKind::Color);
  EXPECT_EQ(d->parameters[2].type.className, "ByValue");  // a class named like a keyword
  EXPECT_EQ(d->result->kind, TypeKind::Integer);
}

TEST(Declaration, RefusesMalformedText) {
  const char* bad[] = {
      "",
      "()",
      "1abc()",
      "name",
      "name(",
      "name(a as Integer",
      "name(a Integer)",
      "name(a as)",
      "name(as Integer)",
      "name(a as Integer,)",
      "name(a as Integer b as Integer)",
      "name() as",
      "name() as Integer extra",
      "name(byref as Integer)",
      "na-me()",
  };
  for (const char* text : bad) {
    std::string error;
    EXPECT_FALSE(ParseDeclaration(text, &error)) << text;
    EXPECT_FALSE(error.empty()) << text;
  }
}

// Every declaration the plugin's classes and global methods register, as they stand.
TEST(Declaration, ParsesEveryDeclarationThePluginRegisters) {
  const char* declarations[] = {
      "halvoDebugger(useErrorEvent as boolean)",
      "halvoDebugger()",
      "DebugError(err as integer, errMessage as string)",
      "DebugInteger(aInteger as integer)",
      "DebugDouble(aDouble as double)",
      "DebugBoolean(aBoolean as boolean)",
      "DebugString(aString as string)",
      "identity()",
      "get(column as integer, row as integer) as Double",
      "set(val as Double, column as integer, row as integer)",
      "copy() as Matrix",
      "vector()",
      "Get(index as Integer) as Double",
      "Set(index as Integer, val as Double)",
      "Append(val as Double)",
      "Insert(index as Integer, val as Double)",
      "Delete(index as Integer)",
      "Clear()",
      "Debug()",
      "vectornc()",
      "Get(index as Integer, ByRef rootname as String, PCS as Vector, Device as Vector)",
      "Set(index as Integer, rootname as String, PCS as Vector, Device as Vector)",
      "Append(rootname as String, PCS as Vector, Device as Vector)",
      "Insert(index as Integer, rootname as String, PCS as Vector, Device as Vector)",
      "Get(index as Integer) as Folderitem",
      "Set(index as Integer, val as Folderitem)",
      "Append(val as Folderitem)",
      "Insert(index as Integer, val as Folderitem)",
      "Count() as integer",
      "Ubound() as integer",
      "CMColor()",
      "CMColor(c as CMColor)",
      "copy(c as CMColor)",
      "getxyz(byref x as double, byref y as double, byref z as double)",
      "setxyz(x as double, y as double, z as double)",
      "reset()",
      "getfive(num as Integer) as Integer",
      "setfive(num as Integer, value as Integer)",
      "getsix(num as Integer) as Integer",
      "setsix(num as Integer, value as Integer)",
      "getseven(num as Integer) as Integer",
      "setseven(num as Integer, value as Integer)",
      "geteight(num as Integer) as Integer",
      "seteight(num as Integer, value as Integer)",
      "getallsix(byref n1 as integer, byref n2 as integer, byref n3 as integer, byref n4 as integer, byref n5 as integer, byref n6 as integer)",
      "setallsix(n1 as integer, n2 as integer, n3 as integer, n4 as integer, n5 as integer, n6 as integer)",
      "Profile(f as Folderitem)",
      "Profile(f as Folderitem, intent as Integer, quality as Integer, CMM as String)",
      "Profile(f as Folderitem, p as Profile)",
      "SaveProfileAs(f as folderitem)",
      "SaveProfile()",
      "ValidProfile() as Boolean",
      "TagExists(tag as String) as Boolean",
      "RemoveTag(tag as String) as Integer",
      "TagName(index as Integer) as String",
      "TagData(index as Integer) as String",
      "TagData(tag as String) as String",
      "SetTagData(tag as String, data as String) as Integer",
      "SetTagRef(tag as String, ref as String) as Integer",
      "GetXYZTag(tag as String, Byref WX as Double, Byref WY as Double, Byref WZ as Double)",
      "SetXYZTag(tag as String, WX as Double, WY as Double, WZ as Double)",
      "GetNamedColorIndex(name as String) as Integer",
      "GetNamedColorName(index as Integer) as String",
      "GetIndNamedColorPCS(index as Integer, byref Ll as double,byref La as double,byref Lb as double)",
      "GetTRC(tag as String, v as Vector)",
      "SetTRC(tag as String, v as Vector)",
      "GetMFT(tag as String) as Clut",
      "SetMFT(tag as String, mft as Clut)",
      "GetNC(tag as String, v as VectorNC)",
      "SetNC(tag as String, v as VectorNC)",
      "GetTextTypeTag(tag as String) as String",
      "SetTextTypeTag(tag as String, data as String)",
      "GetDescTypeTag(tag as String) as String",
      "SetDescTypeTag(tag as String, data as String)",
      "ColorWorld(src as Profile, dest as Profile)",
      "ColorWorld()",
      "LinkColorWorld(linkprofile as Profile)",
      "ConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile)",
      "CheckLAB(L as Double, A as Double, B as Double) as Boolean",
      "MatchPicture(p as Picture, width as Integer, height as Integer, depth as Integer, transparent as Boolean) as Picture",
      "MatchCMcolor(c as CMcolor)",
      "Clut()",
      "halvoRegisterDebugger(debugger as halvoDebugger)",
      "halvoUnregisterDebugger()",
      "GetSystemProfile() as Profile",
      "CMError() as Integer",
      "CMErrorMessage() as string",
      "GetImageSpace(f as Folderitem) as String",
      "TintwellVersion() as Integer",
      "GetProfileByUse(use as String) as Profile",
      "TintwellFolder() as Folderitem",
      "CMMcount() as Integer",
      "getProfileBySpace(theSpace as String) as Profile",
      "GetMonitorProfile() as Profile",
      "CreateProfileIdentifier(p as profile, ident as Integer, size as Integer) as Integer",
      "EmbedImage(fromf as folderitem, tof as folderitem, replace as boolean, p as Profile) as Boolean",
      "ImageProfileCount(f as folderitem) as Integer",
      "GetImageProfile(f as folderitem, index as Integer) as Profile",
      "NewLinkProfile(f as folderitem, keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile) as Profile",
      "NewConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile) as ColorWorld",
      "CopyProfile(f as folderitem, p as Profile) as Profile",
      "BlankProfile(f as folderitem) as Profile",
      "ProfileSearch(cmm as String, aClass as String, dataspace as String, connectspace as String, manufacturer as String, model as Integer, profiles as VectorF)",
  };
  for (const char* text : declarations) {
    std::string error;
    EXPECT_TRUE(ParseDeclaration(text, &error)) << error;
  }
}

}  // namespace
