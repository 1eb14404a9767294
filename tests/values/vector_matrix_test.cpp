// Vector and Matrix through the host: every member at and beyond its bounds, the list
// kept intact by requests it cannot honour, Matrix's column-first arguments, and copies
// that share nothing.
#include <climits>
#include <functional>
#include <initializer_list>
#include <string>
#include <utility>
#include <vector>

#include "plugin_fixture.h"

namespace {

using host::Object;
using host::Value;
using List = std::vector<double>;
using Cells = std::initializer_list<std::pair<int, int>>;  // (column, row)

class VectorMatrixTest : public PluginTest {
 protected:
  Object Make(const List& values) {
    Object v = rt->New("Vector");
    for (double x : values) rt->Call(v, "Append", {x});
    return v;
  }
  // The list as a script sees it: size, then Get of every index.
  List Contents(const Object& v) {
    List out;
    const int32_t n = rt->Get(v, "size").AsInteger();
    for (int32_t i = 0; i < n; ++i) out.push_back(rt->Call(v, "Get", {i}).AsDouble());
    return out;
  }
  double At(const Object& m, int column, int row) { return rt->Call(m, "get", {column, row}).AsDouble(); }
};

TEST_F(VectorMatrixTest, EachVectorMemberAtAndBeyondItsBounds) {
  List hundred;
  for (int i = 0; i < 100; ++i) hundred.push_back(i * 0.5);
  List hundredAndOne = hundred;
  hundredAndOne.push_back(-7.0);
  List forty(40, 0.0);
  forty[0] = 1;
  const struct {
    const char* what;
    List start;
    std::function<void(host::Runtime&, const Object&)> op;
    List expected;
  } cases[] = {
      {"insert before the first", {1.5}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {0, 2.5}); }, {2.5, 1.5}},
      {"insert in the middle", {1, 2, 3}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {1, 9.0}); }, {1, 9, 2, 3}},
      {"insert at size appends", {2.5, 1.5}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {2, 3.0}); },
       {2.5, 1.5, 3.0}},
      {"insert far past the end appends", {2.5, 1.5}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {7, 3.0}); },
       {2.5, 1.5, 3.0}},
      {"insert at INT32_MAX appends", {1}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {INT_MAX, 2.0}); },
       {1, 2}},
      {"insert at -1 does nothing", {2.5}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {-1, 9.0}); }, {2.5}},
      {"insert at INT32_MIN does nothing", {2.5}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {INT_MIN, 9.0}); },
       {2.5}},
      {"insert into an empty list", {}, [](host::Runtime& r, const Object& v) { r.Call(v, "Insert", {0, 4.0}); }, {4}},
      {"size grows with zeros", {2.5, 1.5, 3.0}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", 5); },
       {2.5, 1.5, 3.0, 0, 0}},
      {"size far past the storage grows it at once", {1}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", 40); },
       forty},
      {"size shrinks from the end", {2.5, 1.5, 3.0}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", 1); }, {2.5}},
      {"size regrown after a shrink reads zeros, not old values", {1, 2, 3},
       [](host::Runtime& r, const Object& v) {
         r.Set(v, "size", 1);
         r.Set(v, "size", 3);
       },
       {1, 0, 0}},
      {"size 0 empties", {1, 2}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", 0); }, {}},
      {"size -1 changes nothing", {1, 2}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", -1); }, {1, 2}},
      {"size INT32_MIN changes nothing", {1, 2}, [](host::Runtime& r, const Object& v) { r.Set(v, "size", INT_MIN); }, {1, 2}},
      {"size beyond what a list can hold changes nothing", {1, 2},
       [](host::Runtime& r, const Object& v) { r.Set(v, "size", INT_MAX); }, {1, 2}},
      {"delete at size does nothing", {1, 2}, [](host::Runtime& r, const Object& v) { r.Call(v, "Delete", {2}); }, {1, 2}},
      {"delete at -1 does nothing", {1, 2}, [](host::Runtime& r, const Object& v) { r.Call(v, "Delete", {-1}); }, {1, 2}},
      {"delete the only element", {7}, [](host::Runtime& r, const Object& v) { r.Call(v, "Delete", {0}); }, {}},
      {"delete in the middle", {1, 2, 3}, [](host::Runtime& r, const Object& v) { r.Call(v, "Delete", {1}); }, {1, 3}},
      {"delete the last", {1, 2, 3}, [](host::Runtime& r, const Object& v) { r.Call(v, "Delete", {2}); }, {1, 2}},
      {"set inside", {1, 2, 3}, [](host::Runtime& r, const Object& v) { r.Call(v, "Set", {2, 9.0}); }, {1, 2, 9}},
      {"set at size neither writes nor grows", {1, 2}, [](host::Runtime& r, const Object& v) { r.Call(v, "Set", {2, 9.0}); },
       {1, 2}},
      {"set at -1 does nothing", {1, 2}, [](host::Runtime& r, const Object& v) { r.Call(v, "Set", {-1, 9.0}); }, {1, 2}},
      {"clear then append", {1, 2, 3},
       [](host::Runtime& r, const Object& v) {
         r.Call(v, "Clear");
         r.Call(v, "Append", {4.0});
       },
       {4}},
      {"the constructor method empties", {1, 2}, [](host::Runtime& r, const Object& v) { r.Call(v, "vector"); }, {}},
      {"appends past many growths keep every element", hundred,
       [](host::Runtime& r, const Object& v) { r.Call(v, "Append", {-7.0}); }, hundredAndOne},
  };
  for (const auto& c : cases) {
    Object v = Make(c.start);
    c.op(*rt, v);
    EXPECT_EQ(Contents(v), c.expected) << c.what;
  }
}

TEST_F(VectorMatrixTest, GetOutsideTheListReadsZeroEvenWhereOldValuesLie) {
  Object v = Make({5, 6, 7});
  rt->Set(v, "size", 1);  // 6 and 7 stay in the storage past the end
  for (int32_t index : {1, 2, 3, -1, INT_MIN, INT_MAX}) EXPECT_EQ(rt->Call(v, "Get", {index}).AsDouble(), 0.0) << index;
  rt->Call(v, "Clear");
  EXPECT_EQ(rt->Call(v, "Get", {0}).AsDouble(), 0.0);
  EXPECT_EQ(rt->Call(rt->New("Vector"), "Get", {0}).AsDouble(), 0.0);
}

TEST_F(VectorMatrixTest, DebugTracesEveryElementInOrderAndNothingForAnEmptyList) {
  Object d = Debugger();
  Object v = Make({2.5, -1.0, 0.125});
  rt->Call(v, "Debug");
  EXPECT_EQ(log.entries,
            (std::vector<std::string>{"DebugDouble:2.500000", "DebugDouble:-1.000000", "DebugDouble:0.125000"}));
  log.entries.clear();
  rt->Call(rt->New("Vector"), "Debug");
  rt->Call(v, "Clear");
  rt->Call(v, "Debug");
  EXPECT_TRUE(log.entries.empty());
  EXPECT_EQ(Error(), 0);  // the containers never report
}

TEST_F(VectorMatrixTest, ANewMatrixIsTheIdentityAndReadsZeroOutsideIt) {
  Object m = rt->New("Matrix");
  for (int column = 0; column < 3; ++column)
    for (int row = 0; row < 3; ++row) EXPECT_EQ(At(m, column, row), column == row ? 1.0 : 0.0) << column << row;
  for (auto [column, row] : Cells{{3, 0}, {0, 3}, {-1, 0}, {0, -1}, {INT_MIN, 1}, {1, INT_MAX}})
    EXPECT_EQ(At(m, column, row), 0.0) << column << "," << row;
}

TEST_F(VectorMatrixTest, SetTakesTheColumnFirstAndIgnoresCellsOutsideTheMatrix) {
  Object m = rt->New("Matrix");
  rt->Call(m, "set", {7.0, 2, 0});
  EXPECT_EQ(At(m, 2, 0), 7.0);
  EXPECT_EQ(At(m, 0, 2), 0.0);

  // Out of range, nothing is written anywhere; identity() puts back every element.
  for (auto [column, row] : Cells{{3, 0}, {0, 3}, {-1, 2}, {2, -1}, {INT_MAX, INT_MIN}})
    rt->Call(m, "set", {9.0, column, row});
  for (int column = 0; column < 3; ++column)
    for (int row = 0; row < 3; ++row)
      EXPECT_EQ(At(m, column, row), column == 2 && row == 0 ? 7.0 : column == row ? 1.0 : 0.0) << column << row;
  rt->Call(m, "identity");
  for (int column = 0; column < 3; ++column)
    for (int row = 0; row < 3; ++row) EXPECT_EQ(At(m, column, row), column == row ? 1.0 : 0.0) << column << row;
}

TEST_F(VectorMatrixTest, CopyIsADistinctMatrixWithTheSameValues) {
  Object m = rt->New("Matrix");
  for (int i = 0; i < 9; ++i) rt->Call(m, "set", {i + 0.5, i % 3, i / 3});
  Value result = rt->Call(m, "copy");
  ASSERT_TRUE(result.IsObject());
  Object copy = result.AsObject();
  EXPECT_FALSE(copy == m);
  for (int i = 0; i < 9; ++i) EXPECT_EQ(At(copy, i % 3, i / 3), i + 0.5) << i;
  rt->Call(copy, "set", {-1.0, 1, 1});
  rt->Call(m, "set", {-2.0, 2, 2});
  EXPECT_EQ(At(m, 1, 1), 4.5);
  EXPECT_EQ(At(copy, 2, 2), 8.5);
  result = Value();
  EXPECT_EQ(rt->LiveObjects(), 2u);  // the copy came with one reference, the caller's
}

TEST_F(VectorMatrixTest, CopyAnswersNilWhenTheHostCannotCreateAMatrix) {
  Object m = rt->New("Matrix");
  rt->SetWithheld("PluginNewInstance", true);
  EXPECT_TRUE(rt->Call(m, "copy").IsNil());
  rt->SetWithheld("PluginNewInstance", false);
  EXPECT_TRUE(rt->Call(m, "copy").IsObject());
}

}  // namespace
