// The debugger and the error state as a script uses them through the host.
#include <sys/stat.h>

#include "plugin_fixture.h"
#include "win32_paths.h"

namespace {

using host::Object;

TEST_F(PluginTest, ConstructorsSetUseErrorEvent) {
  EXPECT_TRUE(rt->Get(rt->New("halvoDebugger"), "UseErrorEvent").AsBoolean());
  for (bool use : {false, true}) EXPECT_EQ(rt->Get(rt->New("halvoDebugger", {use}), "UseErrorEvent").AsBoolean(), use);
  Object d = rt->New("halvoDebugger");
  rt->Set(d, "UseErrorEvent", false);
  EXPECT_FALSE(rt->Get(d, "UseErrorEvent").AsBoolean());
}

// Registration sends the temporary folder, beside the executable and made, and the
// plugin's reference keeps the debugger alive after the script's variable is gone.
TEST_F(PluginTest, RegistrationSendsTheTemporaryFolderAndHoldsTheDebugger) {
  {
    Object debugger = rt->New("halvoDebugger");
    log.Attach(*rt, debugger);
    rt->CallGlobal("halvoRegisterDebugger", {debugger});
  }
  EXPECT_EQ(rt->LiveObjects(), 1u);
  ASSERT_EQ(log.entries.size(), 2u);
  EXPECT_EQ(log.entries[0], "DebugString:DIRECTORY:");
  const std::string folder = log.entries[1].substr(std::string("DebugString:").size());
  EXPECT_EQ(folder.substr(0, 3), "Z:\\");
  ASSERT_GE(folder.size(), 6u);
  EXPECT_EQ(folder.substr(folder.size() - 6), "\\temp\\");
  const auto posix = win32::PosixPathFromWindows(folder);
  ASSERT_TRUE(posix);
  struct stat st;
  ASSERT_EQ(stat(posix->c_str(), &st), 0) << *posix;
  EXPECT_TRUE(S_ISDIR(st.st_mode));
  rt->CallGlobal("halvoUnregisterDebugger");
  EXPECT_EQ(rt->LiveObjects(), 0u);
}

TEST_F(PluginTest, ASecondRegistrationChangesNothing) {
  Object first = rt->New("halvoDebugger");
  Object second = rt->New("halvoDebugger");
  EventLog secondLog;
  log.Attach(*rt, first);
  secondLog.Attach(*rt, second);
  rt->CallGlobal("halvoRegisterDebugger", {first});
  rt->CallGlobal("halvoRegisterDebugger", {second});
  EXPECT_EQ(log.entries.size(), 2u);
  EXPECT_TRUE(secondLog.entries.empty());  // refused silently
  first = second = Object();
  EXPECT_EQ(rt->LiveObjects(), 1u);  // only the registered one is held
}

// Unregistering with none registered and registering nil leave the way open.
TEST_F(PluginTest, NilAndSpareCallsLeaveRegistrationWorking) {
  rt->CallGlobal("halvoUnregisterDebugger");
  rt->CallGlobal("halvoUnregisterDebugger");
  rt->CallGlobal("halvoRegisterDebugger", {nullptr});
  Object d = rt->New("halvoDebugger");
  log.Attach(*rt, d);
  rt->CallGlobal("halvoRegisterDebugger", {d});
  EXPECT_EQ(log.entries.size(), 2u);
}

TEST_F(PluginTest, ErrorStateStartsClearAndItsMessageIsEmpty) {
  EXPECT_EQ(Error(), 0);
  EXPECT_EQ(rt->CallGlobal("cmerrormessage").AsString(), "");
  EXPECT_EQ(rt->LiveStrings(), 0u);  // the result string was handed over and released
}

}  // namespace
