// The host runtime against a probe plugin that uses every kind of value it supports, and
// the host's pictures: the C++ API and the entries a plugin reaches them by (a new picture,
// its graphics object, the device context drawing on it), with lifetimes that leave nothing
// alive and never let a device context outlive its pixels.
#include "host/runtime.h"

#include <gtest/gtest.h>

#include <stdexcept>

#include "windows.h"

extern "C" void* ResolveEntry(const char* name);  // the resolver handed to plugins

namespace {

using host::ByRef;
using host::Color;
using host::HostError;
using host::Object;
using host::Runtime;
using host::Value;

class RuntimeTest : public ::testing::Test {
 protected:
  void SetUp() override { rt = std::make_unique<Runtime>(PROBE_PLUGIN_PATH); }
  void TearDown() override {
    EXPECT_EQ(rt->LiveObjects(), 0u);
    EXPECT_EQ(rt->LiveStrings(), 0u);
    EXPECT_TRUE(rt->Faults().empty());
    rt.reset();
  }
  template <class Proc>
  Proc Entry(const char* name) {
    return reinterpret_cast<Proc>(ResolveEntry(name));
  }
  std::unique_ptr<Runtime> rt;
};

TEST_F(RuntimeTest, RegistersClassesAndGlobalsAndReportsMalformedDeclarations) {
  EXPECT_EQ(rt->pluginVersion(), 5);
  ASSERT_EQ(rt->Classes().size(), 1u);
  const host::ClassInfo& probe = *rt->Classes()[0];
  EXPECT_EQ(probe.name, "Probe");
  EXPECT_EQ(probe.methods.size(), 16u);  // the broken one is left out
  EXPECT_EQ(probe.events.size(), 2u);
  EXPECT_TRUE(probe.properties[6].readOnly);
  ASSERT_EQ(rt->Globals().size(), 2u);
  ASSERT_EQ(rt->RegistrationErrors().size(), 2u);
  EXPECT_NE(rt->RegistrationErrors()[0].find("Broken"), std::string::npos);
  EXPECT_NE(rt->RegistrationErrors()[1].find("Unclosed"), std::string::npos);
}

TEST_F(RuntimeTest, NewRunsTheClassConstructorThenTheFittingConstructorMethod) {
  Object a = rt->New("probe");
  EXPECT_EQ(rt->Get(a, "runs").AsInteger(), 1);
  EXPECT_EQ(rt->Get(a, "n").AsInteger(), -1);
  Object b = rt->New("PROBE", {42});
  EXPECT_EQ(rt->Get(b, "n").AsInteger(), 42);
  EXPECT_EQ(rt->Get(b, "runs").AsInteger(), 1);
  EXPECT_EQ(rt->LiveObjects(), 2u);
  EXPECT_THROW(rt->New("Probe", {"text"}), HostError);
  EXPECT_THROW(rt->New("NoSuchClass"), HostError);
  EXPECT_EQ(rt->LiveObjects(), 2u);  // a refused New leaves nothing behind
}

TEST_F(RuntimeTest, PropertiesOfEveryTypeRoundTrip) {
  Object p = rt->New("Probe");
  Object q = rt->New("Probe", {7});
  rt->Set(p, "n", -123456);
  rt->Set(p, "D", 2.5);
  rt->Set(p, "flag", true);
  rt->Set(p, "tint", host::Color{0x00FF8000});
  rt->Set(p, "label", std::string("a\0b", 3));
  rt->Set(p, "partner", q);
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), -123456);
  EXPECT_EQ(rt->Get(p, "d").AsDouble(), 2.5);
  EXPECT_TRUE(rt->Get(p, "flag").AsBoolean());
  EXPECT_EQ(rt->Get(p, "tint").AsColor().rgb, 0x00FF8000u);
  EXPECT_EQ(rt->Get(p, "label").AsString(), std::string("a\0b", 3));
  EXPECT_EQ(rt->Get(p, "partner").AsObject(), q);
  EXPECT_EQ(rt->Get(p, "param").AsInteger(), 7);  // the parameter word reaches the getter
  rt->Set(p, "d", 3);                               // an Integer widens to Double
  EXPECT_EQ(rt->Get(p, "d").AsDouble(), 3.0);
  rt->Set(p, "partner", nullptr);
  EXPECT_TRUE(rt->Get(p, "partner").IsNil());

  EXPECT_THROW(rt->Set(p, "param", 1), HostError);    // read-only
  EXPECT_THROW(rt->Set(p, "n", 1.5), HostError);      // a Double is no Integer
  EXPECT_THROW(rt->Set(p, "partner", "x"), HostError);
  EXPECT_THROW(rt->Get(p, "missing"), HostError);
}

TEST_F(RuntimeTest, OverloadsResolveByCountAndType) {
  Object p = rt->New("Probe", {10});
  EXPECT_EQ(rt->Call(p, "add", {2, 3}).AsInteger(), 5);
  EXPECT_EQ(rt->Call(p, "ADD", {2.0, 3}).AsDouble(), 5.5);
  EXPECT_EQ(rt->Call(p, "Add", {5}).AsInteger(), 15);
  EXPECT_THROW(rt->Call(p, "Add", {1, 2, 3}), HostError);
  EXPECT_THROW(rt->Call(p, "Add", {"1", "2"}), HostError);
  EXPECT_THROW(rt->Call(p, "Nope"), HostError);
  EXPECT_EQ(rt->CallGlobal("twice", {1.25}).AsDouble(), 2.5);
  EXPECT_FALSE(rt->CallGlobal("Flip", {true}).AsBoolean());
  EXPECT_TRUE(rt->CallGlobal("Flip", {false}).AsBoolean());
}

TEST_F(RuntimeTest, ByRefArgumentsAreWrittenBack) {
  Object p = rt->New("Probe");
  Value a = 1, b = 2, x = 1.5, s = std::string("abc");
  rt->Call(p, "Swap", {ByRef(a), ByRef(b)});
  EXPECT_EQ(a.AsInteger(), 2);
  EXPECT_EQ(b.AsInteger(), 1);
  rt->Call(p, "Scale", {ByRef(x), 4.0});
  EXPECT_EQ(x.AsDouble(), 6.0);
  rt->Call(p, "Rename", {ByRef(s)});
  EXPECT_EQ(s.AsString(), "ABC!");
  Value nil;
  rt->Call(p, "Rename", {ByRef(nil)});
  EXPECT_EQ(nil.AsString(), "!");
  EXPECT_THROW(rt->Call(p, "Swap", {1, 2}), HostError);  // ByRef needs a variable
}

TEST_F(RuntimeTest, StringsKeepZeroBytesAndObjectsKeepIdentity) {
  Object p = rt->New("Probe");
  const std::string text("x\0y\0", 4);
  EXPECT_EQ(rt->Call(p, "Echo", {text}).AsString(), text);
  EXPECT_EQ(rt->Call(p, "Length", {text}).AsInteger(), 4);
  EXPECT_EQ(rt->Call(p, "Self").AsObject(), p);
  Object other = rt->Call(p, "MakeAnother").AsObject();
  EXPECT_EQ(other.ClassName(), "Probe");
  EXPECT_EQ(rt->Get(other, "runs").AsInteger(), 1);
  EXPECT_TRUE(rt->Call(p, "NoObject").IsNil());
}

TEST_F(RuntimeTest, FolderItemsCarryWindowsPaths) {
  Object p = rt->New("Probe");
  Object f = rt->MakeFolderItem("/tmp/some dir/x.icc");
  EXPECT_EQ(f.ClassName(), "FolderItem");
  EXPECT_EQ(rt->FolderItemPath(f), "Z:\\tmp\\some dir\\x.icc");
  EXPECT_EQ(rt->Call(p, "PathOf", {f}).AsString(), "Z:\\tmp\\some dir\\x.icc");
  Object g = rt->Call(p, "Folder", {"C:\\x.icc"}).AsObject();
  EXPECT_EQ(rt->FolderItemPath(g), "C:\\x.icc");
  EXPECT_THROW(rt->Call(p, "PathOf", {p}), HostError);  // a Probe is no folder item
  EXPECT_THROW(rt->FolderItemPath(p), HostError);
}

TEST_F(RuntimeTest, EventsReachTheScriptsHandlerWithTheirArguments) {
  Object p = rt->New("Probe");
  rt->Call(p, "Fire", {3});
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), -999);  // no handler: the plugin sees null

  std::vector<Value> seen;
  rt->SetEventHandler(p, "ping", [&](const Object& self, const std::vector<Value>& args) {
    EXPECT_EQ(self, p);
    seen = args;
    // A handler may call back into the plugin.
    return Value(rt->Call(self, "Add", {args[0].AsInteger(), 100}).AsInteger());
  });
  rt->Call(p, "Fire", {3});
  ASSERT_EQ(seen.size(), 4u);
  EXPECT_EQ(seen[0].AsInteger(), 3);
  EXPECT_EQ(seen[1].AsString(), "ping 3");
  EXPECT_EQ(seen[2].AsDouble(), 1.5);
  EXPECT_TRUE(seen[3].AsBoolean());
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), 103);

  rt->SetEventHandler(p, "Ping", nullptr);
  rt->Call(p, "Fire", {4});
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), -999);
  EXPECT_THROW(rt->SetEventHandler(p, "Pong", nullptr), HostError);
}

TEST_F(RuntimeTest, AHandlerMayRemoveItselfWhileItRuns) {
  Object p = rt->New("Probe");
  int calls = 0;
  rt->SetEventHandler(p, "Ping", [&](const Object& self, const std::vector<Value>& args) {
    ++calls;
    rt->SetEventHandler(self, "Ping", nullptr);
    return Value(args[0].AsInteger());  // the binding must outlive its own removal
  });
  rt->Call(p, "Fire", {5});
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), 5);
  rt->Call(p, "Fire", {6});
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(rt->Get(p, "n").AsInteger(), -999);
}

TEST_F(RuntimeTest, DestructorRunsWhenTheLastReferenceGoes) {
  {
    Object a = rt->New("Probe");
    Object b = rt->New("Probe");
    rt->Set(a, "partner", b);
    rt->Set(a, "label", "kept");
    b = Object();
    EXPECT_EQ(rt->LiveObjects(), 2u);  // a still holds b
    EXPECT_EQ(rt->LiveStrings(), 1u);
  }
  EXPECT_EQ(rt->LiveObjects(), 0u);  // a's destructor released b and its label
  EXPECT_EQ(rt->LiveStrings(), 0u);
}

using PictureTest = RuntimeTest;

TEST_F(PictureTest, NewPicturesAreWhiteAndKeepTheirPixels) {
  const struct {
    int w, h, depth;
  } refused[] = {{0, 1, 32}, {1, 0, 32}, {-5, 5, 32}, {1, 1, 12}, {1, 1, 0}, {65536, 65536, 32}};
  for (const auto& r : refused) EXPECT_THROW(rt->NewPicture(r.w, r.h, r.depth), HostError);
  EXPECT_EQ(rt->LiveObjects(), 0u);
  Object p = rt->NewPicture(3, 2, 24);
  EXPECT_EQ(p.ClassName(), "Picture");
  EXPECT_EQ(rt->SizeOfPicture(p).depth, 24);
  EXPECT_EQ(rt->GetPixel(p, 2, 1).rgb, 0xFFFFFFu);
  rt->SetPixel(p, 2, 1, Color{0xFF123456});
  EXPECT_EQ(rt->GetPixel(p, 2, 1).rgb, 0x123456u);
  EXPECT_EQ(rt->PicturePixels(p)[1 * 3 + 2], 0x123456u);  // rows top-down, no padding
  for (const auto& xy : {std::pair{-1, 0}, {3, 0}, {0, -1}, {0, 2}})
    EXPECT_THROW(rt->GetPixel(p, xy.first, xy.second), HostError);
  EXPECT_THROW(rt->SizeOfPicture(rt->MakeFolderItem("/tmp")), HostError);
}

TEST_F(PictureTest, EntriesGiveOneGraphicsObjectAndADeviceContextOnThePixels) {
  auto newPicture = Entry<newPictureProc>("newPicture");
  auto graphicsOf = Entry<pluginPictureGraphicsGetterProc>("pluginPictureGraphicsGetter");
  auto dcOf = Entry<REALGraphicsDCProc>("REALGraphicsDC");
  EXPECT_EQ(newPicture(0, 5, 32), nullptr);
  EXPECT_EQ(newPicture(5, 5, 7), nullptr);
  Object picture = Object::Adopt(newPicture(3, 2, 32));
  ASSERT_TRUE(picture);
  REALgraphics g = graphicsOf(picture.get());
  ASSERT_NE(g, nullptr);
  EXPECT_EQ(graphicsOf(picture.get()), g);  // the picture's own, borrowed
  EXPECT_EQ(rt->LiveObjects(), 2u);
  Object folder = rt->MakeFolderItem("/tmp");
  EXPECT_EQ(graphicsOf(nullptr), nullptr);
  EXPECT_EQ(graphicsOf(folder.get()), nullptr);
  EXPECT_EQ(dcOf(picture.get()), nullptr);  // a picture is not a graphics object
  HDC dc = static_cast<HDC>(dcOf(g));
  ASSERT_NE(dc, nullptr);
  EXPECT_EQ(dcOf(g), static_cast<void*>(dc));
  EXPECT_EQ(SetPixel(dc, 1, 1, RGB(1, 2, 3)), RGB(1, 2, 3));
  EXPECT_EQ(rt->GetPixel(picture, 1, 1).rgb, 0x010203u);
  rt->SetPixel(picture, 0, 0, Color{0x0A0B0C});
  EXPECT_EQ(GetPixel(dc, 0, 0), RGB(0x0A, 0x0B, 0x0C));
  EXPECT_EQ(GetPixel(dc, 3, 0), CLR_INVALID);

  // A plugin that keeps the graphics object beyond its picture: the device context dies
  // with the pixels, and the graphics object answers none.
  Entry<REALLockObjectProc>("REALLockObject")(g);
  picture = Object();
  EXPECT_EQ(rt->LiveObjects(), 2u);  // the graphics object and the folder item
  EXPECT_EQ(GetPixel(dc, 0, 0), CLR_INVALID);
  EXPECT_EQ(dcOf(g), nullptr);
  Entry<REALUnlockObjectProc>("REALUnlockObject")(g);
  EXPECT_EQ(rt->LiveObjects(), 1u);
}

// A handler's exception stops at the host's edge: a fault, and a zero result for the plugin.
TEST(RuntimeEvents, AThrowingHandlerBecomesAFault) {
  Runtime rt(PROBE_PLUGIN_PATH);
  Object p = rt.New("Probe");
  rt.SetEventHandler(p, "Ping", [](const Object&, const std::vector<Value>&) -> Value { throw std::runtime_error("boom"); });
  rt.Call(p, "Fire", {3});
  EXPECT_EQ(rt.Get(p, "n").AsInteger(), 0);
  EXPECT_EQ(rt.Faults(), std::vector<std::string>{"event handler threw: boom"});
}

TEST(RuntimeLoading, RefusesMissingLibrariesAndSecondRuntimes) {
  EXPECT_THROW(Runtime("/nonexistent/plugin.so"), HostError);
  Runtime first(PROBE_PLUGIN_PATH);
  EXPECT_THROW(Runtime second(PROBE_PLUGIN_PATH), HostError);
}

TEST(RuntimeLoading, WithheldEntriesResolveToNull) {
  Runtime rt(PROBE_PLUGIN_PATH, Runtime::Options{{"PluginRegisterMethod"}});
  EXPECT_EQ(rt.Classes().size(), 1u);
  EXPECT_TRUE(rt.Globals().empty());
}

}  // namespace
