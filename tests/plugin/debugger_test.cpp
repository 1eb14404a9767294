// The debugger and the error state as a script uses them through the host.
#include "plugin_fixture.h"

namespace {

using host::Object;
using host::Value;

TEST_F(PluginTest, ConstructorsSetUseErrorEvent) {
  EXPECT_TRUE(rt->Get(rt->New("halvoDebugger"), "UseErrorEvent").AsBoolean());
  EXPECT_FALSE(rt->Get(rt->New("halvoDebugger", {false}), "UseErrorEvent").AsBoolean());
  EXPECT_TRUE(rt->Get(rt->New("halvoDebugger", {true}), "UseErrorEvent").AsBoolean());
  Object d = rt->New("halvoDebugger");
  rt->Set(d, "UseErrorEvent", false);
  EXPECT_FALSE(rt->Get(d, "UseErrorEvent").AsBoolean());
}

TEST_F(PluginTest, RegistrationSendsTheTemporaryFolderAndHoldsTheDebugger) {
  EventLog log;
  {
    Object debugger = rt->New("halvoDebugger");
    log.Attach(*rt, debugger);
    rt->CallGlobal("halvoRegisterDebugger", {debugger});
  }
  // The script's variable is gone; the plugin's reference keeps the debugger alive.
  EXPECT_EQ(rt->LiveObjects(), 1u);
  ASSERT_EQ(log.entries.size(), 2u);
  EXPECT_EQ(log.entries[0], "DebugString:DIRECTORY:");
  EXPECT_EQ(log.entries[1].rfind("DebugString:Z:\\", 0), 0u);
  rt->CallGlobal("halvoUnregisterDebugger");
  EXPECT_EQ(rt->LiveObjects(), 0u);
}

TEST_F(PluginTest, ASecondRegistrationChangesNothing) {
  Object first = rt->New("halvoDebugger");
  Object second = rt->New("halvoDebugger");
  EventLog firstLog, secondLog;
  firstLog.Attach(*rt, first);
  secondLog.Attach(*rt, second);
  rt->CallGlobal("halvoRegisterDebugger", {first});
  rt->CallGlobal("halvoRegisterDebugger", {second});
  EXPECT_EQ(firstLog.entries.size(), 2u);
  EXPECT_TRUE(secondLog.entries.empty());  // refused silently
  first = Object();
  second = Object();
  EXPECT_EQ(rt->LiveObjects(), 1u);  // only the registered one is held
  rt->CallGlobal("halvoUnregisterDebugger");
  EXPECT_EQ(rt->LiveObjects(), 0u);
}

TEST_F(PluginTest, UnregisteringWithNoneRegisteredDoesNothing) {
  rt->CallGlobal("halvoUnregisterDebugger");
  rt->CallGlobal("halvoUnregisterDebugger");
  Object d = rt->New("halvoDebugger");
  EventLog log;
  log.Attach(*rt, d);
  rt->CallGlobal("halvoRegisterDebugger", {d});  // registration works after all that
  EXPECT_EQ(log.entries.size(), 2u);
}

TEST_F(PluginTest, RegisteringNilLeavesNoDebugger) {
  rt->CallGlobal("halvoRegisterDebugger", {nullptr});
  Object d = rt->New("halvoDebugger");
  EventLog log;
  log.Attach(*rt, d);
  rt->CallGlobal("halvoRegisterDebugger", {d});
  EXPECT_EQ(log.entries.size(), 2u);
}

TEST_F(PluginTest, ErrorStateStartsClearAndItsMessageIsEmpty) {
  EXPECT_EQ(rt->CallGlobal("CMError").AsInteger(), 0);
  EXPECT_EQ(rt->CallGlobal("cmerrormessage").AsString(), "");
  EXPECT_EQ(rt->LiveStrings(), 0u);  // the result string was handed over and released
}

}  // namespace
