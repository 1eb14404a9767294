// The plugin's internal senders, error routine and temporary names, driven from inside
// while the host runs this program as the plugin: events still travel through the host.
#include <cstring>
#include <string>

#include "debugger.h"
#include "error_state.h"
#include "plugin_fixture.h"
#include "temp_folder.h"

namespace {

using host::Object;
using host::Value;

class InternalsTest : public PluginTest {
 protected:
  InternalsTest() : PluginTest("") {}

  // A registered debugger whose events land in log; the registration texts are dropped.
  Object Register(bool useErrorEvent = true) {
    Object d = rt->New("halvoDebugger", {useErrorEvent});
    log.Attach(*rt, d);
    rt->CallGlobal("halvoRegisterDebugger", {d});
    log.entries.clear();
    return d;
  }
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
  EXPECT_EQ(rt->CallGlobal("CMError").AsInteger(), -1);  // still reported
}

TEST_F(InternalsTest, EachSenderRaisesItsEventWithTheValue) {
  Register();
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
  Object d = Register(false);
  SetCMError(-21);
  SendDebugInteger(5);
  EXPECT_EQ(log.entries, (std::vector<std::string>{"DebugInteger:5"}));
  rt->Set(d, "UseErrorEvent", true);
  SetCMError(-21);
  EXPECT_EQ(log.entries.back(), "DebugError:-21,");  // the message is empty
}

TEST_F(InternalsTest, SetCMErrorStoresFirstAndRaisesNothingForZero) {
  Object d = Register();
  int32_t seenInHandler = 12345;
  rt->SetEventHandler(d, "DebugError", [&](const Object&, const std::vector<Value>& args) {
    seenInHandler = rt->CallGlobal("CMError").AsInteger();  // a handler may call back in
    EXPECT_EQ(args[0].AsInteger(), seenInHandler);
    EXPECT_EQ(args[1].AsString(), "");
    return Value();
  });
  SetCMError(0);
  EXPECT_EQ(seenInHandler, 12345);
  SetCMError(2011);
  EXPECT_EQ(seenInHandler, 2011);
  SetCMError(-404);
  EXPECT_EQ(seenInHandler, -404);
  EXPECT_EQ(rt->CallGlobal("CMError").AsInteger(), -404);
  EXPECT_EQ(rt->CallGlobal("CMError").AsInteger(), -404);  // reading does not clear it
}

TEST_F(InternalsTest, TemporaryNamesCountFromZeroAfterStartUp) {
  ASSERT_GT(std::strlen(WorkingFolderPath), 0u);
  const std::string folder = WorkingFolderPath;
  char name[MAX_PATH];
  ASSERT_TRUE(MakeTempName(name, sizeof name));
  EXPECT_EQ(std::string(name), folder + "0");
  ASSERT_TRUE(MakeTempName(name, sizeof name));
  EXPECT_EQ(std::string(name), folder + "1");
  // Too small for the name: refused, and the number is not used up.
  char tiny[4];
  EXPECT_FALSE(MakeTempName(tiny, sizeof tiny));
  ASSERT_TRUE(MakeTempName(name, sizeof name));
  EXPECT_EQ(std::string(name), folder + "2");
  EXPECT_FALSE(MakeTempName(nullptr, sizeof name));
  EXPECT_FALSE(MakeTempName(name, 0));
  // Without a working folder of its own the plugin names no copy at all.
  WorkingFolderPath[0] = '\0';
  EXPECT_FALSE(MakeTempName(name, sizeof name));
  std::strcpy(WorkingFolderPath, folder.c_str());
  ASSERT_TRUE(MakeTempName(name, sizeof name));
  EXPECT_EQ(std::string(name), folder + "3");
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
  const std::string dir = "C:\\" + std::string(kTempFolderCapacity - 9, 'd');  // one too many
  struct {
    char out[kTempFolderCapacity];
    char guard[16];
  } buffer;
  std::memset(buffer.guard, 0x5A, sizeof buffer.guard);
  EXPECT_FALSE(TempFolderFromModulePath((dir + "\\host.exe").c_str(), buffer.out, sizeof buffer.out));
  EXPECT_STREQ(buffer.out, "");
  for (char g : buffer.guard) EXPECT_EQ(g, 0x5A);
  // The longest folder that fits, exactly.
  const std::string fits = "C:\\" + std::string(kTempFolderCapacity - 10, 'e');
  ASSERT_TRUE(TempFolderFromModulePath((fits + "\\host.exe").c_str(), buffer.out, sizeof buffer.out));
  EXPECT_EQ(std::strlen(buffer.out), kTempFolderCapacity - 1);
  for (char g : buffer.guard) EXPECT_EQ(g, 0x5A);
}

}  // namespace
