// The plugin as the host sees it after loading: what it registers, and how it copes
// with a host that lacks entries.
#include <algorithm>

#include "plugin_fixture.h"

namespace {

using host::Object;
using Names = std::vector<std::string>;

Names Declarations(const host::ClassInfo& c) {
  Names out;
  for (const auto& m : c.methods) out.push_back(m.declaration);
  return out;
}

TEST_F(PluginTest, RegistersItsClassesAndGlobalsWithTheStoredDeclarations) {
  EXPECT_EQ(rt->pluginVersion(), 5);
  EXPECT_TRUE(rt->RegistrationErrors().empty());

  const auto classes = rt->Classes();
  std::vector<std::string> names;
  for (const auto* c : classes) names.push_back(c->name);
  EXPECT_EQ(names, (Names{"halvoDebugger", "Matrix", "Vector", "VectorNC", "VectorF", "CMColor",
                                             "Profile", "ColorWorld", "cLut"}));
  const host::ClassInfo& debugger = *classes[0];
  EXPECT_EQ(debugger.dataSize, 1u);
  ASSERT_EQ(debugger.properties.size(), 1u);
  EXPECT_EQ(debugger.properties[0].name, "UseErrorEvent");
  EXPECT_EQ(debugger.properties[0].type.kind, host::TypeKind::Boolean);
  EXPECT_FALSE(debugger.properties[0].readOnly);
  std::vector<std::string> events, globals;
  for (const auto& e : debugger.events) events.push_back(e.declaration);
  for (const auto* g : rt->Globals()) globals.push_back(g->declaration);
  EXPECT_EQ(Declarations(debugger), (Names{"halvoDebugger(useErrorEvent as boolean)", "halvoDebugger()"}));
  EXPECT_EQ(events, (Names{
                        "DebugError(err as integer, errMessage as string)", "DebugInteger(aInteger as integer)",
                        "DebugDouble(aDouble as double)", "DebugBoolean(aBoolean as boolean)",
                        "DebugString(aString as string)"}));
  EXPECT_EQ(globals,
            (Names{
                "halvoRegisterDebugger(debugger as halvoDebugger)", "halvoUnregisterDebugger()",
                "GetSystemProfile() as Profile", "CMError() as Integer", "CMErrorMessage() as string",
                "GetImageSpace(f as Folderitem) as String", "TintwellVersion() as Integer", "GetProfileByUse(use as String) as Profile",
                "TintwellFolder() as Folderitem", "CMMcount() as Integer",
                "getProfileBySpace(theSpace as String) as Profile", "GetMonitorProfile() as Profile",
                "CreateProfileIdentifier(p as profile, ident as Integer, size as Integer) as Integer",
                "EmbedImage(fromf as folderitem, tof as folderitem, replace as boolean, p as Profile) as Boolean",
                "ImageProfileCount(f as folderitem) as Integer",
                "GetImageProfile(f as folderitem, index as Integer) as Profile",
                "NewLinkProfile(f as folderitem, keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, "
                "p4 as Profile) as Profile",
                "NewConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as "
                "Profile) as ColorWorld",
                "CopyProfile(f as folderitem, p as Profile) as Profile", "BlankProfile(f as folderitem) as Profile",
                "ProfileSearch(cmm as String, aClass as String, dataspace as String, connectspace as String, "
                "manufacturer as String, model as Integer, profiles as VectorF)"}));

  const host::ClassInfo& list = *classes[4];
  EXPECT_EQ(list.properties.size(), 1u);
  EXPECT_EQ(Declarations(list), (Names{
                             "Get(index as Integer) as Folderitem", "Set(index as Integer, val as Folderitem)",
                             "Append(val as Folderitem)", "Insert(index as Integer, val as Folderitem)",
                             "Delete(index as Integer)", "Clear()", "Count() as integer", "Ubound() as integer"}));

  const host::ClassInfo& color = *classes[5];
  EXPECT_EQ(color.properties.size(), 25u);
  EXPECT_EQ(color.methods.size(), 16u);
  // Two declarations share one routine.
  EXPECT_EQ(color.methods[1].declaration, "CMColor(c as CMColor)");
  EXPECT_EQ(color.methods[2].declaration, "copy(c as CMColor)");
  EXPECT_EQ(color.methods[1].function, color.methods[2].function);

  EXPECT_EQ(Declarations(*classes[6]),
            (Names{
                "Profile(f as Folderitem)",
                "Profile(f as Folderitem, intent as Integer, quality as Integer, CMM as String)",
                "Profile(f as Folderitem, p as Profile)", "SaveProfileAs(f as folderitem)", "SaveProfile()",
                "ValidProfile() as Boolean", "TagExists(tag as String) as Boolean",
                "RemoveTag(tag as String) as Integer", "TagName(index as Integer) as String",
                "TagData(index as Integer) as String", "TagData(tag as String) as String",
                "SetTagData(tag as String, data as String) as Integer",
                "SetTagRef(tag as String, ref as String) as Integer",
                "GetXYZTag(tag as String, Byref WX as Double, Byref WY as Double, Byref WZ as Double)",
                "SetXYZTag(tag as String, WX as Double, WY as Double, WZ as Double)",
                "GetNamedColorIndex(name as String) as Integer", "GetNamedColorName(index as Integer) as String",
                "GetIndNamedColorPCS(index as Integer, byref Ll as double,byref La as double,byref Lb as double)",
                "GetTRC(tag as String, v as Vector)", "SetTRC(tag as String, v as Vector)",
                "GetMFT(tag as String) as Clut", "SetMFT(tag as String, mft as Clut)",
                "GetNC(tag as String, v as VectorNC)", "SetNC(tag as String, v as VectorNC)",
                "GetTextTypeTag(tag as String) as String", "SetTextTypeTag(tag as String, data as String)",
                "GetDescTypeTag(tag as String) as String", "SetDescTypeTag(tag as String, data as String)"}));

  EXPECT_EQ(Declarations(*classes[7]),
            (Names{
                "ColorWorld(src as Profile, dest as Profile)", "ColorWorld()",
                "LinkColorWorld(linkprofile as Profile)",
                "ConcatColorWorld(keyindex as Integer, p1 as Profile, p2 as Profile, p3 as Profile, p4 as Profile)",
                "CheckLAB(L as Double, A as Double, B as Double) as Boolean",
                "MatchPicture(p as Picture, width as Integer, height as Integer, depth as Integer, transparent as "
                "Boolean) as Picture",
                "MatchCMcolor(c as CMcolor)"}));
}

TEST_F(PluginTest, StartsByAnnouncingItsVersionThenRegisters) {
  const auto& resolved = rt->ResolvedEntries();
  ASSERT_GE(resolved.size(), 3u);
  EXPECT_EQ(resolved[0], "RegisterPluginVersion");
  EXPECT_EQ(resolved[1], "PluginRegisterClass");
  EXPECT_EQ(resolved[2], "PluginRegisterMethod");
  // Each entry is resolved once and then served from the cache.
  EXPECT_EQ(std::count(resolved.begin(), resolved.end(), "PluginRegisterClass"), 1);
}

class WithheldEntryTest : public PluginTest {
 protected:
  WithheldEntryTest() { options.withheld = {"GetEventInstance", "REALBuildString"}; }
};

TEST_F(WithheldEntryTest, BridgeCallsYieldNothingUntilTheEntryAppears) {
  Object debugger = rt->New("halvoDebugger");
  log.Attach(*rt, debugger);
  rt->CallGlobal("halvoRegisterDebugger", {debugger});
  EXPECT_TRUE(log.entries.empty());  // no event lookup, so no events
  EXPECT_EQ(rt->CallGlobal("CMErrorMessage").AsString(), "");  // a nil string reads as empty
  rt->CallGlobal("halvoUnregisterDebugger");

  rt->SetWithheld("GetEventInstance", false);
  rt->SetWithheld("REALBuildString", false);
  rt->CallGlobal("halvoRegisterDebugger", {debugger});
  ASSERT_EQ(log.entries.size(), 2u);  // resolution was retried
  EXPECT_EQ(log.entries[0], "DebugString:DIRECTORY:");
}

}  // namespace
