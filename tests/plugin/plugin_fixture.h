// A runtime with the plugin loaded, for tests that drive it as a script would. At the
// end of every test no object or string may be left alive, and the host must have seen
// no misuse of references.
#ifndef TINTWELL_TESTS_PLUGIN_FIXTURE_H
#define TINTWELL_TESTS_PLUGIN_FIXTURE_H

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "host/runtime.h"

// Records every event a debugger raises, in order, as "Name:value".
class EventLog {
 public:
  void Attach(host::Runtime& rt, const host::Object& debugger) {
    for (const char* name : {"DebugError", "DebugInteger", "DebugDouble", "DebugBoolean", "DebugString"}) {
      const std::string event = name;
      rt.SetEventHandler(debugger, event, [this, event](const host::Object&, const std::vector<host::Value>& args) {
        std::string text = event + ":";
        for (std::size_t i = 0; i < args.size(); ++i) {
          const host::Value& v = args[i];
          if (i) text += ",";
          if (v.IsString()) text += v.AsString();
          else if (v.IsInteger()) text += std::to_string(v.AsInteger());
          else if (v.IsBoolean()) text += v.AsBoolean() ? "true" : "false";
          else if (v.IsDouble()) text += std::to_string(v.AsDouble());
        }
        entries.push_back(text);
        return host::Value();
      });
    }
  }
  std::vector<std::string> entries;
};

class PluginTest : public ::testing::Test {
 protected:
  explicit PluginTest(std::string pluginPath = TINTWELL_PLUGIN_PATH) : pluginPath_(std::move(pluginPath)) {}

  void SetUp() override { rt = std::make_unique<host::Runtime>(pluginPath_, options); }

  void TearDown() override {
    // The plugin's own long-lived reference: a registered debugger.
    rt->CallGlobal("halvoUnregisterDebugger");
    EXPECT_EQ(rt->LiveObjects(), 0u) << "objects left alive";
    EXPECT_EQ(rt->LiveStrings(), 0u) << "strings left alive";
    EXPECT_TRUE(rt->Faults().empty()) << rt->Faults().front();
    rt.reset();
  }

  int32_t Error() { return rt->CallGlobal("CMError").AsInteger(); }

  // Registers a new debugger whose events land in log, past its registration texts.
  host::Object Debugger(bool useErrorEvent = true) {
    host::Object d = rt->New("halvoDebugger", {useErrorEvent});
    log.Attach(*rt, d);
    rt->CallGlobal("halvoRegisterDebugger", {d});
    log.entries.clear();
    return d;
  }

  // A Profile on the file at path.
  host::Object Open(const std::string& path) { return rt->New("Profile", {rt->MakeFolderItem(path)}); }

  host::Object NewVector(const std::vector<double>& values) {
    host::Object v = rt->New("Vector");
    for (double d : values) rt->Call(v, "Append", {d});
    return v;
  }
  std::vector<double> Values(const host::Object& v) {
    std::vector<double> out;
    for (int i = 0; i < rt->Get(v, "size").AsInteger(); ++i) out.push_back(rt->Call(v, "Get", {i}).AsDouble());
    return out;
  }

  // Whether the log holds text as a DebugString.
  bool Traced(const std::string& text) const {
    return std::find(log.entries.begin(), log.entries.end(), "DebugString:" + text) != log.entries.end();
  }

  host::Runtime::Options options;
  std::unique_ptr<host::Runtime> rt;
  EventLog log;

 private:
  std::string pluginPath_;
};

#endif
