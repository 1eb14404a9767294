// VectorF through the host: order of items, and exactly one reference held per item in
// the list, seen as items that stay alive while listed and go as they leave.
#include <climits>

#include "plugin_fixture.h"

namespace {

using host::Object;
using host::Value;

class VectorFTest : public PluginTest {
 protected:
  // The last letter of each item's path, "-" for nil.
  std::string Names(const Object& list) {
    std::string names;
    const int32_t n = rt->Call(list, "Count").AsInteger();
    for (int32_t i = 0; i < n; ++i) {
      const Value v = rt->Call(list, "Get", {i});
      names += v.IsNil() ? '-' : rt->FolderItemPath(v.AsObject()).back();
    }
    return names;
  }
  // A new item that only the list will hold once the call is over.
  Object Item(const std::string& name) { return rt->MakeFolderItem("/tmp/vf/" + name); }
};

TEST_F(VectorFTest, KeepsOrderAndOneReferencePerListedItem) {
  const std::size_t base = rt->LiveObjects();
  Object list = rt->New("VectorF");
  EXPECT_EQ(rt->Get(list, "size").AsInteger(), 0);
  EXPECT_EQ(rt->Call(list, "Ubound").AsInteger(), -1);
  EXPECT_TRUE(rt->Call(list, "Get", {0}).IsNil());
  const std::size_t empty = rt->LiveObjects();

  // Each step, then the list's contents and how many items it keeps alive; the test
  // drops its own reference to every item at once.
  const struct {
    const char* method;
    int index;
    const char* item;  // nullptr: no item argument
    const char* after;
    int alive;
  } steps[] = {
      {"Append", 0, "a", "a", 1},    {"Insert", 0, "b", "ba", 2},  {"Insert", 2, "c", "bac", 3},
      {"Insert", 4, "d", "bac", 3},  {"Insert", -1, "d", "bac", 3}, {"Set", 0, "x", "xac", 3},
      {"Set", 3, "y", "xac", 3},     {"Delete", 1, nullptr, "xc", 2}, {"Delete", 2, nullptr, "xc", 2},
      {"Delete", -1, nullptr, "xc", 2},
  };
  for (const auto& s : steps) {
    SCOPED_TRACE(std::string(s.method) + " " + std::to_string(s.index) + " " + (s.item ? s.item : ""));
    if (std::string(s.method) == "Append") rt->Call(list, "Append", {Item(s.item)});
    else if (s.item) rt->Call(list, s.method, {s.index, Item(s.item)});
    else rt->Call(list, s.method, {s.index});
    EXPECT_EQ(Names(list), s.after);
    EXPECT_EQ(rt->LiveObjects() - empty, static_cast<std::size_t>(s.alive));
  }
  // Setting an element to the item it holds keeps it, with the list's one reference.
  Value x = rt->Call(list, "Get", {0});
  rt->Call(list, "Set", {0, x});
  x = Value();
  EXPECT_EQ(rt->LiveObjects() - empty, 2u);
  {
    Value again = rt->Call(list, "Get", {0}), twice = rt->Call(list, "Get", {0});  // each Get: the caller's own
    EXPECT_EQ(rt->LiveObjects() - empty, 2u);
  }
  rt->Set(list, "size", 4);
  EXPECT_EQ(Names(list), "xc--");
  EXPECT_EQ(rt->Call(list, "Ubound").AsInteger(), 3);
  // Sizes that cannot be held leave the list as it is.
  for (int bad : {-1, INT_MIN, INT_MAX}) {
    rt->Set(list, "size", bad);
    EXPECT_EQ(Names(list), "xc--") << bad;
  }
  rt->Set(list, "size", 1);
  EXPECT_EQ(Names(list), "x");
  EXPECT_EQ(rt->LiveObjects() - empty, 1u);
  rt->Call(list, "Clear");
  EXPECT_EQ(rt->LiveObjects(), empty);
  rt->Call(list, "Append", {Item("z")});  // filled again after Clear
  EXPECT_EQ(Names(list), "z");
  list = Object();  // the destructor lets go of what is left
  EXPECT_EQ(rt->LiveObjects(), base);
}

}  // namespace
