// Vector and Matrix through the host: every member at and beyond its bounds, the list
// kept intact by requests it cannot honour, Matrix's column-first arguments, and copies
// that share nothing.
#include <climits>
#include <string>
#include <vector>

#include "plugin_fixture.h"

namespace {

using host::Object;
using host::Value;
using List = std::vector<double>;

// One script call on a Vector: a method with its index and value, or "size" set to index.
struct Op {
  std::string method;
  int index = 0;
  double value = 0;
};

class VectorMatrixTest : public PluginTest {
 protected:
  Object Make(const List& values) {
    Object v = rt->New("Vector");
    for (double x : values) rt->Call(v, "Append", {x});
    return v;
  }
  void Apply(const Object& v, const Op& op) {
    if (op.method == "size") rt->Set(v, "size", op.index);
    else if (op.method == "Insert" || op.method == "Set") rt->Call(v, op.method, {op.index, op.value});
    else if (op.method == "Delete") rt->Call(v, op.method, {op.index});
    else if (op.method == "Append") rt->Call(v, op.method, {op.value});
    else rt->Call(v, op.method);
  }
  // The list as a script sees it: size, then Get of every index. Get reads zero outside
  // the list, even where the storage still holds old values.
  List Contents(const Object& v) {
    List out;
    const int32_t n = rt->Get(v, "size").AsInteger();
    for (int32_t i = 0; i < n; ++i) out.push_back(rt->Call(v, "Get", {i}).AsDouble());
    for (int32_t i : {n, n + 1, -1, INT_MIN, INT_MAX}) EXPECT_EQ(rt->Call(v, "Get", {i}).AsDouble(), 0.0) << i;
    return out;
  }
  double At(const Object& m, int column, int row) { return rt->Call(m, "get", {column, row}).AsDouble(); }
  // The nine cells row by row, each read as get(column, row).
  List Cells(const Object& m) {
    List out;
    for (int row = 0; row < 3; ++row)
      for (int column = 0; column < 3; ++column) out.push_back(At(m, column, row));
    return out;
  }
  const List identity = {1, 0, 0, 0, 1, 0, 0, 0, 1};
};

TEST_F(VectorMatrixTest, EachVectorMemberAtAndBeyondItsBounds) {
  List hundred, forty(40, 0.0);
  for (int i = 0; i < 100; ++i) hundred.push_back(i * 0.5);  // past many growths
  forty[0] = 1;
  const struct {
    const char* what;
    List start;
    std::vector<Op> ops;
    List expected;
  } cases[] = {
      {"insert into an empty list, before the first, in the middle", {},
       {{"Insert", 0, 4}, {"Insert", 0, 2.5}, {"Insert", 1, 9}}, {2.5, 9, 4}},
      {"insert at size, far past it or at INT32_MAX appends", {1},
       {{"Insert", 1, 2}, {"Insert", 7, 3}, {"Insert", INT_MAX, 4}}, {1, 2, 3, 4}},
      {"insert at a negative index does nothing", {2.5}, {{"Insert", -1, 9}, {"Insert", INT_MIN, 9}}, {2.5}},
      {"size grows with zeros", {2.5, 1.5, 3}, {{"size", 5}}, {2.5, 1.5, 3, 0, 0}},
      {"size far past the storage grows it at once", {1}, {{"size", 40}}, forty},
      {"size shrinks from the end; regrown, reads zeros", {1, 2, 3}, {{"size", 1}, {"size", 3}}, {1, 0, 0}},
      {"size shrinks, leaving old values past the end", {5, 6, 7}, {{"size", 1}}, {5}},
      {"size 0 empties", {1, 2}, {{"size", 0}}, {}},
      {"size negative or beyond what a list can hold changes nothing", {1, 2},
       {{"size", -1}, {"size", INT_MIN}, {"size", INT_MAX}}, {1, 2}},
      {"delete in the middle, then the last", {1, 2, 3, 4}, {{"Delete", 1}, {"Delete", 2}}, {1, 3}},
      {"delete the only element", {7}, {{"Delete", 0}}, {}},
      {"delete at size or -1 does nothing", {1, 2}, {{"Delete", 2}, {"Delete", -1}}, {1, 2}},
      {"set inside; at size or -1 neither writes nor grows", {1, 2, 3},
       {{"Set", 2, 9}, {"Set", 3, 8}, {"Set", -1, 8}}, {1, 2, 9}},
      {"clear then append", {1, 2, 3}, {{"Clear"}, {"Append", 0, 4}}, {4}},
      {"the constructor method empties", {1, 2}, {{"vector"}}, {}},
      {"appends keep every element", hundred, {}, hundred},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.what);
    Object v = Make(c.start);
    for (const Op& op : c.ops) Apply(v, op);
    EXPECT_EQ(Contents(v), c.expected);
  }
}

TEST_F(VectorMatrixTest, DebugTracesEveryElementInOrderAndNothingForAnEmptyList) {
  Object d = Debugger();
  Object v = Make({2.5, -1.0, 0.125});
  rt->Call(v, "Debug");
  rt->Call(v, "Clear");
  rt->Call(v, "Debug");
  rt->Call(rt->New("Vector"), "Debug");
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugDouble:2.500000", "DebugDouble:-1.000000", "DebugDouble:0.125000"}));
  EXPECT_EQ(Error(), 0);  // the containers never report
}

TEST_F(VectorMatrixTest, AMatrixStartsAsTheIdentityTakesTheColumnFirstAndIgnoresCellsOutsideIt) {
  Object m = rt->New("Matrix");
  EXPECT_EQ(Cells(m), identity);
  rt->Call(m, "set", {7.0, 2, 0});
  for (auto [column, row] : {std::pair{3, 0}, {0, 3}, {-1, 2}, {2, -1}, {INT_MIN, 1}, {1, INT_MAX}}) {
    rt->Call(m, "set", {9.0, column, row});
    EXPECT_EQ(At(m, column, row), 0.0) << column << "," << row;
  }
  EXPECT_EQ(Cells(m), (List{1, 0, 7, 0, 1, 0, 0, 0, 1}));
  rt->Call(m, "identity");
  EXPECT_EQ(Cells(m), identity);
}

TEST_F(VectorMatrixTest, CopyIsADistinctMatrixWithTheSameValuesOrNil) {
  Object m = rt->New("Matrix");
  rt->SetWithheld("PluginNewInstance", true);  // the host cannot create a Matrix
  EXPECT_TRUE(rt->Call(m, "copy").IsNil());
  rt->SetWithheld("PluginNewInstance", false);
  for (int i = 0; i < 9; ++i) rt->Call(m, "set", {i + 0.5, i % 3, i / 3});
  Value result = rt->Call(m, "copy");
  ASSERT_TRUE(result.IsObject());
  Object copy = result.AsObject();
  EXPECT_FALSE(copy == m);
  EXPECT_EQ(Cells(copy), (List{0.5, 1.5, 2.5, 3.5, 4.5, 5.5, 6.5, 7.5, 8.5}));
  rt->Call(copy, "set", {-1.0, 1, 1});
  rt->Call(m, "set", {-2.0, 2, 2});
  EXPECT_EQ(At(m, 1, 1), 4.5);
  EXPECT_EQ(At(copy, 2, 2), 8.5);
  result = Value();
  EXPECT_EQ(rt->LiveObjects(), 2u);  // the copy came with one reference, the caller's
}

}  // namespace
