// Profile objects on real files: working copies, saving, and the header properties.
#include <fcntl.h>
#include <stdio.h>

#include <algorithm>
#include <cstdio>
#include <cstring>

#include "plugin_fixture.h"
#include "profile_files.h"

namespace {

using host::Object;
using host::Value;

class ProfileTest : public PluginTest {
 protected:
  Object Open(const std::string& path) { return rt->New("Profile", {rt->MakeFolderItem(path)}); }
  ProfileFiles files;
};

TEST_F(ProfileTest, EachObjectWorksOnItsOwnCopyAndTheLaterSaveWins) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const auto original = ProfileFiles::Read(f);
  Object a = Open(f);
  Object b = Open(f);
  ASSERT_EQ(Error(), 0);
  const std::string temp = ProfileFiles::PluginWorkingFolder();
  ASSERT_FALSE(temp.empty());
  EXPECT_TRUE(ProfileFiles::Exists(temp + "0"));
  EXPECT_TRUE(ProfileFiles::Exists(temp + "1"));
  rt->Set(a, "Model", 111);
  rt->Set(b, "Model", 222);
  EXPECT_EQ(ProfileFiles::Read(f), original);  // edits stay in the working copies
  rt->Call(a, "SaveProfile");
  rt->Call(b, "SaveProfile");
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->Get(Open(f), "Model").AsInteger(), 222);
  EXPECT_EQ(rt->Get(a, "Model").AsInteger(), 111);  // a reopened its own copy
}

TEST_F(ProfileTest, DestroyingWithoutSavingKeepsTheFileAndDeletesTheCopy) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const auto original = ProfileFiles::Read(f);
  {
    Object p = Open(f);
    rt->Set(p, "Manufacturer", "XXXX");
    rt->Set(p, "RenderIntent", 3);
    EXPECT_TRUE(ProfileFiles::Exists(ProfileFiles::PluginWorkingFolder() + "0"));
  }
  EXPECT_EQ(ProfileFiles::Read(f), original);
  EXPECT_FALSE(ProfileFiles::Exists(ProfileFiles::PluginWorkingFolder() + "0"));
}

TEST_F(ProfileTest, ASaveWhoseWriteFailsIsReportedAndLeavesTheFileAlone) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const auto original = ProfileFiles::Read(f);
  const std::string temp = ProfileFiles::PluginWorkingFolder();
  const std::string folder = temp.substr(0, temp.size() - 1), blocker = folder + ".blocker";
  Object p = Open(f);
  rt->Set(p, "Model", 42);
  // With a plain file in its folder's place the working copy cannot be written back. The
  // two are exchanged in one step, so no program starting meanwhile finds the number free.
  ProfileFiles::Write(blocker, {});
  const auto exchange = [&] {
    return renameat2(AT_FDCWD, folder.c_str(), AT_FDCWD, blocker.c_str(), RENAME_EXCHANGE);
  };
  ASSERT_EQ(exchange(), 0);
  Object d = Debugger();
  rt->Call(p, "SaveProfile");
  const int32_t code = Error();
  ASSERT_EQ(exchange(), 0);
  std::remove(blocker.c_str());
  EXPECT_EQ(code, 3);  // ERROR_PATH_NOT_FOUND
  EXPECT_NE(std::find(log.entries.begin(), log.entries.end(), "DebugString:Error writing profile"), log.entries.end());
  EXPECT_EQ(std::find(log.entries.begin(), log.entries.end(), "DebugString:saveprofile"), log.entries.end());
  EXPECT_EQ(ProfileFiles::Read(f), original);
}

TEST_F(ProfileTest, SaveProfileAsLeavesTheObjectOnItsOwnFile) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const std::string g = files.Path("g.icc");
  Object p = Open(f);
  rt->Set(p, "Model", 7);
  rt->Call(p, "SaveProfileAs", {rt->MakeFolderItem(g)});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->Get(Open(g), "Model").AsInteger(), 7);
  Object location = rt->Get(p, "Location").AsObject();
  EXPECT_EQ(rt->FolderItemPath(location), rt->FolderItemPath(rt->MakeFolderItem(f)));
  rt->Set(p, "Model", 8);
  rt->Call(p, "SaveProfile");
  EXPECT_EQ(rt->Get(Open(f), "Model").AsInteger(), 8);
  EXPECT_EQ(rt->Get(Open(g), "Model").AsInteger(), 7);
}

TEST_F(ProfileTest, CopyingConstructorTakesTheOthersWorkingCopyAsItIsOnDisk) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  const std::string g = files.Copy("colord/AdobeRGB1998.icc", "g.icc");
  Object p = Open(f);
  rt->Set(p, "Model", 5);  // not yet on disk: the copy still has the old model
  Object q = rt->New("Profile", {rt->MakeFolderItem(g), p});
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(ProfileFiles::Read(g), ProfileFiles::Read(f));
  EXPECT_EQ(rt->Get(q, "Model").AsInteger(), 0);
  rt->Set(q, "Model", 9);  // q works on its own copy of g
  EXPECT_EQ(rt->Get(p, "Model").AsInteger(), 5);

  Object r = rt->New("Profile", {rt->MakeFolderItem(g), nullptr});
  EXPECT_EQ(Error(), -404);
  EXPECT_FALSE(rt->Call(r, "ValidProfile").AsBoolean());
}

TEST_F(ProfileTest, AMissingOrNilFileLeavesTheObjectEmpty) {
  Object d = Debugger();
  Object p = rt->New("Profile", {nullptr});
  EXPECT_NE(Error(), 0);
  EXPECT_NE(std::find(log.entries.begin(), log.entries.end(), "DebugString:Error copying profile to new path"),
            log.entries.end());
  EXPECT_FALSE(rt->Call(p, "ValidProfile").AsBoolean());
  EXPECT_TRUE(rt->Get(p, "Location").IsNil());
  EXPECT_EQ(Error(), -1);
  Object q = Open(files.Path("missing.icc"));
  EXPECT_EQ(Error(), 2);  // ERROR_FILE_NOT_FOUND
  rt->Call(q, "SaveProfile");
  EXPECT_EQ(Error(), -1);
  // A path too long for the object's storage is refused as a failed copy.
  Object r = Open("/tmp/" + std::string(300, 'x'));
  EXPECT_EQ(Error(), 206);
}

TEST_F(ProfileTest, IntentAndCmmFromTheConstructorSurviveASave) {
  const std::string f = files.Copy("sRGB.icc", "a.icc");
  Object d = Debugger();
  {
    Object p = rt->New("Profile", {rt->MakeFolderItem(f), 2, 0, "abcd"});
    ASSERT_EQ(Error(), 0);
    EXPECT_EQ(rt->Get(p, "RenderIntent").AsInteger(), 2);
    EXPECT_EQ(rt->Get(p, "CMM").AsString(), "abcd");
    rt->Call(p, "SaveProfile");
    EXPECT_EQ(Error(), 0);
    EXPECT_TRUE(ProfileFiles::Exists(files.colorDir() + "/0"));  // installed under its own name
  }
  ASSERT_GE(log.entries.size(), 5u);
  EXPECT_EQ(log.entries[0], "DebugString:TEMP PATH:");
  EXPECT_EQ(log.entries[2], "DebugString:TEMP NAME:");
  EXPECT_EQ(log.entries[3], "DebugString:0");
  EXPECT_EQ(log.entries[4], "DebugString:InstallColorProfile");
  EXPECT_FALSE(ProfileFiles::Exists(files.colorDir() + "/0"));  // the installed copy goes with its object
  Object reopened = Open(f);
  EXPECT_EQ(rt->Get(reopened, "RenderIntent").AsInteger(), 2);
  EXPECT_EQ(rt->Get(reopened, "CMM").AsString(), "abcd");
}

TEST_F(ProfileTest, HeaderPropertiesReadAndWriteTheirFields) {
  Object p = Open(files.Copy("sRGB.icc", "a.icc"));
  EXPECT_EQ(rt->Get(p, "Type").AsString(), "mntr");
  EXPECT_EQ(rt->Get(p, "ColorSpace").AsString(), "RGB ");
  EXPECT_EQ(rt->Get(p, "ConnectionSpace").AsString(), "XYZ ");
  EXPECT_EQ(rt->Get(p, "Signature").AsString(), "acsp");
  EXPECT_EQ(rt->Get(p, "WhiteX").AsDouble(), 63190 / 65536.0);
  EXPECT_EQ(rt->Get(p, "WhiteY").AsDouble(), 1.0);
  EXPECT_EQ(rt->Get(p, "Size").AsInteger(), static_cast<int32_t>(ProfileFiles::Read(TINTWELL_ICC_DIR "/sRGB.icc").size()));
  EXPECT_EQ(static_cast<uint32_t>(rt->Get(p, "Version").AsInteger()) >> 24, 2u);
  EXPECT_TRUE(rt->Call(p, "ValidProfile").AsBoolean());

  const int32_t flags = rt->Get(p, "Flags").AsInteger();
  rt->Set(p, "Quality", 2);
  rt->Set(p, "Quality", 1);
  EXPECT_EQ(rt->Get(p, "Quality").AsInteger(), 1);
  EXPECT_EQ(rt->Get(p, "Flags").AsInteger(), (flags & ~0x30000) | 0x10000);
  rt->Set(p, "Interpolation", false);
  EXPECT_FALSE(rt->Get(p, "Interpolation").AsBoolean());
  EXPECT_EQ(rt->Get(p, "Flags").AsInteger() & (1 << 18), 1 << 18);
  rt->Set(p, "Interpolation", true);
  EXPECT_EQ(rt->Get(p, "Flags").AsInteger() & (1 << 18), 0);
  rt->Set(p, "GamutCheck", false);
  EXPECT_EQ(rt->Get(p, "Flags").AsInteger() & (1 << 19), 1 << 19);
  rt->Set(p, "Embedded", true);
  rt->Set(p, "EmbeddedUse", true);
  EXPECT_EQ(rt->Get(p, "Flags").AsInteger() & 3, 3);

  rt->Set(p, "Attribute1", 0x12345);
  EXPECT_EQ(rt->Get(p, "Attribute1").AsInteger(), 0x2345);
  rt->Set(p, "Transparent", true);
  rt->Set(p, "Matte", true);
  EXPECT_EQ(rt->Get(p, "Attribute2").AsInteger(), 3);
  rt->Set(p, "Matte", false);
  EXPECT_TRUE(rt->Get(p, "Transparent").AsBoolean());
  EXPECT_EQ(rt->Get(p, "Attribute2").AsInteger(), 1);

  rt->Set(p, "WhiteX", 0.9642);
  EXPECT_EQ(rt->Get(p, "WhiteX").AsDouble(), 63189 / 65536.0);
  rt->Set(p, "WhiteZ", -1.5);
  EXPECT_EQ(rt->Get(p, "WhiteZ").AsDouble(), -1.5);

  rt->Set(p, "Year", 2026);
  rt->Set(p, "Month", 12);
  rt->Set(p, "Year", 1999);
  rt->Set(p, "Day", 6);
  rt->Set(p, "Hour", 23);
  rt->Set(p, "Minute", 59);
  rt->Set(p, "Second", 58);
  EXPECT_EQ(rt->Get(p, "Year").AsInteger(), 1999);
  EXPECT_EQ(rt->Get(p, "Month").AsInteger(), 12);
  EXPECT_EQ(rt->Get(p, "Day").AsInteger(), 6);
  EXPECT_EQ(rt->Get(p, "Hour").AsInteger(), 23);
  EXPECT_EQ(rt->Get(p, "Minute").AsInteger(), 59);
  EXPECT_EQ(rt->Get(p, "Second").AsInteger(), 58);

  rt->Set(p, "Type", "prtr");
  rt->Set(p, "Platform", "AB");  // short texts are padded with zero bytes
  EXPECT_EQ(rt->Get(p, "Type").AsString(), "prtr");
  EXPECT_EQ(rt->Get(p, "Platform").AsString(), std::string("AB\0\0", 4));
  rt->Set(p, "Signature", "xxxx");  // changes nothing
  EXPECT_EQ(rt->Get(p, "Signature").AsString(), "acsp");
  EXPECT_FALSE(rt->Get(p, "Modified").AsBoolean());
  EXPECT_EQ(rt->Get(p, "LocationType").AsInteger(), 0);
  EXPECT_EQ(rt->Get(p, "RefCount").AsInteger(), 0);
}

TEST_F(ProfileTest, HeaderEditsSurviveASaveAndAReopen) {
  const std::string f = files.Copy("colord/AdobeRGB1998.icc", "a.icc");
  const struct {
    const char* property;
    Value value;
  } edits[] = {
      {"Type", "scnr"},       {"CMM", "ABCD"},         {"Platform", "MSFT"}, {"Manufacturer", "TINT"},
      {"Creator", "twel"},    {"ConnectionSpace", "Lab "}, {"Model", 0x7FFFFFFF}, {"Version", 0x04200000},
      {"RenderIntent", 2},    {"Quality", 3},          {"Interpolation", false}, {"Matte", true},
      {"Attribute1", 0xBEEF}, {"WhiteX", 0.5},         {"WhiteY", 0.75},       {"WhiteZ", 1.25},
      {"Year", 2031},         {"Month", 2},            {"Day", 29},            {"Hour", 1},
      {"Minute", 2},          {"Second", 3},
  };
  {
    Object p = Open(f);
    for (const auto& e : edits) rt->Set(p, e.property, e.value);
    rt->Call(p, "SaveProfile");
    ASSERT_EQ(Error(), 0);
  }
  Object reopened = Open(f);
  ASSERT_EQ(Error(), 0);
  for (const auto& e : edits) {
    const Value v = rt->Get(reopened, e.property);
    EXPECT_EQ(v.Describe(), e.value.Describe()) << e.property;
  }
}

TEST_F(ProfileTest, AnEmptyProfileReportsAsEachPropertySays) {
  Object p = rt->New("Profile", {nullptr});
  Object d = Debugger();
  int errorEvents = 0;
  rt->SetEventHandler(d, "DebugError", [&](const Object&, const std::vector<Value>&) {
    ++errorEvents;
    return Value();
  });
  EXPECT_EQ(rt->Get(p, "CMM").AsString(), "");  // nil, which reads as empty text
  EXPECT_EQ(Error(), -1);
  EXPECT_EQ(errorEvents, 1);
  EXPECT_FALSE(rt->Get(p, "Embedded").AsBoolean());  // not tested: the read fails
  EXPECT_EQ(Error(), 6);                              // ERROR_INVALID_HANDLE from the platform
  EXPECT_EQ(rt->Get(p, "Attribute2").AsInteger(), 0);
  EXPECT_EQ(Error(), -1);
  rt->Set(p, "ColorSpace", "CMYK");
  EXPECT_EQ(Error(), -1);
  EXPECT_EQ(errorEvents, 2);  // Embedded raised one; Attribute2 and ColorSpace raise none
  EXPECT_EQ(rt->Get(p, "Modified").AsBoolean(), false);
  EXPECT_EQ(Error(), 0);
}

}  // namespace
