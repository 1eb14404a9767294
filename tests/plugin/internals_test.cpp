// The plugin's internal senders, error routine and temporary names, driven from inside
// while the host runs this program as the plugin: events still travel through the host.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstring>
#include <string>

#include "blank_template.h"
#include "debugger.h"
#include "error_state.h"
#include "plugin_fixture.h"
#include "profile_files.h"
#include "temp_folder.h"

namespace {

using host::Object;
using host::Value;

class InternalsTest : public PluginTest {
 protected:
  InternalsTest() : PluginTest("") {}
};

TEST_F(InternalsTest, SendersWithoutADebuggerNeverAskForHandlers) {
  LastCMError = 0;
  const std::size_t before = rt->EventLookups();
  SendDebugString("x");
  SendDebugInteger(1);
  SendDebugDouble(1.0);
  SendDebugBoolean(true);
  SetCMError(-1);
  EXPECT_EQ(rt->EventLookups(), before);
  EXPECT_EQ(Error(), -1);  // still reported
}

TEST_F(InternalsTest, EachSenderRaisesItsEventWithTheValue) {
  Debugger();
  SendDebugString("Colorworld ERROR:");
  SendDebugInteger(-2147483647 - 1);
  SendDebugDouble(0.25);
  SendDebugBoolean(false);
  SendDebugString("");
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugString:Colorworld ERROR:", "DebugInteger:-2147483648",
                                                   "DebugDouble:0.250000", "DebugBoolean:false", "DebugString:"}));
  EXPECT_EQ(rt->LiveStrings(), 0u);  // each event string was released after delivery
}

TEST_F(InternalsTest, UseErrorEventGatesOnlyDebugError) {
  Object d = Debugger(false);
  SetCMError(-21);
  SendDebugInteger(5);
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugInteger:5"}));
  rt->Set(d, "UseErrorEvent", true);
  SetCMError(-21);
  EXPECT_EQ(log.entries.back(), "DebugError:-21,");  // the message is empty
}

TEST_F(InternalsTest, SetCMErrorStoresFirstAndRaisesNothingForZero) {
  Object d = Debugger();
  int32_t seenInHandler = 12345;
  rt->SetEventHandler(d, "DebugError", [&](const Object&, const std::vector<Value>& args) {
    seenInHandler = Error();  // a handler may call back in
    EXPECT_EQ(args[0].AsInteger(), seenInHandler);
    EXPECT_EQ(args[1].AsString(), "");
    return Value();
  });
  for (int32_t code : {0, 2011, -404}) {
    SetCMError(code);
    EXPECT_EQ(seenInHandler, code ? code : 12345);
  }
  EXPECT_EQ(Error(), -404);
  EXPECT_EQ(Error(), -404);  // reading does not clear it
}

TEST_F(InternalsTest, TemporaryNamesCountFromZeroAfterStartUp) {
  ASSERT_GT(std::strlen(WorkingFolderPath), 0u);
  const std::string folder = WorkingFolderPath;
  char name[MAX_PATH], tiny[4];
  const auto next = [&](const char* number) {
    ASSERT_TRUE(MakeTempName(name, sizeof name));
    EXPECT_EQ(std::string(name), folder + number);
  };
  next("0");
  next("1");
  // Too small for the name, or no buffer: refused, and the number is not used up.
  EXPECT_FALSE(MakeTempName(tiny, sizeof tiny));
  EXPECT_FALSE(MakeTempName(nullptr, sizeof name));
  EXPECT_FALSE(MakeTempName(name, 0));
  next("2");
  // Without a working folder of its own the plugin names no copy at all.
  WorkingFolderPath[0] = '\0';
  EXPECT_FALSE(MakeTempName(name, sizeof name));
  std::strcpy(WorkingFolderPath, folder.c_str());
  next("3");
}

// Without a template to copy (none in the folder, or a folder whose path leaves no room
// for its name), BlankProfile reports it and the file it was given keeps its bytes:
// they are not the blank profile, and their tables are not its to remove.
TEST_F(InternalsTest, BlankProfileWithoutATemplateLeavesTheFileAlone) {
  char saved[sizeof TempFolderPath];
  std::memcpy(saved, TempFolderPath, sizeof saved);
  ProfileFiles files;
  const std::string empty = files.Path("empty"), f = files.Path("blank.icc");
  ASSERT_EQ(mkdir(empty.c_str(), 0755), 0);
  const struct {
    std::string folder;
    int code;
  } cases[] = {
      {"Z:\\" + std::string(sizeof TempFolderPath - 12, 'd') + "\\", 206},  // ERROR_FILENAME_EXCED_RANGE
      {"Z:" + empty + "\\", 2},                                               // ERROR_FILE_NOT_FOUND
  };
  for (const auto& c : cases) {
    std::memcpy(TempFolderPath, c.folder.c_str(), c.folder.size() + 1);
    ProfileFiles::Write(f, {'m', 'i', 'n', 'e'});
    const Value blank = rt->CallGlobal("BlankProfile", {rt->MakeFolderItem(f)});
    EXPECT_TRUE(blank.IsObject());
    EXPECT_EQ(Error(), c.code);
    EXPECT_EQ(ProfileFiles::Read(f), (std::vector<char>{'m', 'i', 'n', 'e'}));
  }
  std::memcpy(TempFolderPath, saved, sizeof saved);
}

// The template is placed only under a name that fits, and never over a file there.
TEST(BlankTemplate, IsPlacedWholeOnlyWhereItFitsAndNoFileIsThere) {
  const std::string dir = ::testing::TempDir() + "tw_tmpl_" + std::to_string(getpid()), placed = dir + "/blank.icc";
  ASSERT_EQ(mkdir(dir.c_str(), 0755), 0);
  const std::string win = "Z:" + dir + "\\";  // TempDir is absolute; slashes pass as separators
  const std::string deep = "Z:\\" + std::string(MAX_PATH - 10, 'd') + "\\";
  EXPECT_FALSE(PlaceBlankTemplate(deep.c_str(), win.c_str()));
  EXPECT_FALSE(PlaceBlankTemplate(win.c_str(), deep.c_str()));
  EXPECT_FALSE(PlaceBlankTemplate("", win.c_str()));
  EXPECT_TRUE(PlaceBlankTemplate(win.c_str(), win.c_str()));
  EXPECT_EQ(ProfileFiles::Read(placed).size(), BlankTemplateBytes().size());
  ProfileFiles::Write(placed, {'m', 'i', 'n', 'e'});
  EXPECT_TRUE(PlaceBlankTemplate(win.c_str(), win.c_str()));
  EXPECT_EQ(ProfileFiles::Read(placed).size(), 4u);
  std::remove(placed.c_str());
  EXPECT_EQ(rmdir(dir.c_str()), 0);  // nothing staged is left behind
}

TEST(TempFolder, IsTheExecutablesFolderPlusTemp) {
  char out[kTempFolderCapacity];
  ASSERT_TRUE(TempFolderFromModulePath("C:\\App\\host.exe", out, sizeof out));
  EXPECT_STREQ(out, "C:\\App\\temp\\");
  ASSERT_TRUE(TempFolderFromModulePath("C:\\host.exe", out, sizeof out));
  EXPECT_STREQ(out, "C:\\temp\\");
  EXPECT_FALSE(TempFolderFromModulePath("host.exe", out, sizeof out));
  EXPECT_STREQ(out, "");
  EXPECT_FALSE(TempFolderFromModulePath(nullptr, out, sizeof out));
}

TEST(TempFolder, LongPathsAreRefusedWithoutOverrun) {
  // The folder is written into a buffer with guard bytes around the allowed size.
  struct {
    char out[kTempFolderCapacity];
    char guard[16];
  } buffer;
  std::memset(buffer.guard, 0x5A, sizeof buffer.guard);
  const std::string tooLong = "C:\\" + std::string(kTempFolderCapacity - 9, 'd') + "\\host.exe";
  EXPECT_FALSE(TempFolderFromModulePath(tooLong.c_str(), buffer.out, sizeof buffer.out));
  EXPECT_STREQ(buffer.out, "");
  // The longest folder that fits, exactly.
  const std::string fits = "C:\\" + std::string(kTempFolderCapacity - 10, 'e') + "\\host.exe";
  ASSERT_TRUE(TempFolderFromModulePath(fits.c_str(), buffer.out, sizeof buffer.out));
  EXPECT_EQ(std::strlen(buffer.out), kTempFolderCapacity - 1);
  for (char g : buffer.guard) EXPECT_EQ(g, 0x5A);
}

}  // namespace
