// The Vector and Matrix records as the tag codecs reach them: a zero-filled Vector is an empty
// list, a full count never wraps, and a script's (column, row) lands at its row-major place.
#include <climits>
#include <cstdlib>
#include <tuple>

#include "growable.h"
#include "matrix.h"
#include "plugin_fixture.h"
#include "vector.h"

namespace {

class VectorMatrixRecordsTest : public PluginTest {
 protected:
  VectorMatrixRecordsTest() : PluginTest("") {}
};

// The lists' storage doubles from 8, is capped at the limit, reaches the limit exactly,
// and refuses anything beyond it without touching what it holds.
TEST(GrowStorage, DoublesFromEightUpToTheLimitAndNoFurther) {
  int* elements = nullptr;
  uint32_t capacity = 0;
  const struct {
    uint64_t needed;
    bool grows;
    uint32_t capacity;
  } steps[] = {{0, true, 0}, {1, true, 8}, {8, true, 8}, {9, true, 16}, {20, true, 20}, {21, false, 20}};
  for (const auto& step : steps) {
    EXPECT_EQ(GrowStorage(elements, capacity, step.needed, 20), step.grows) << step.needed;
    EXPECT_EQ(capacity, step.capacity) << step.needed;
  }
  std::free(elements);
}

TEST_F(VectorMatrixRecordsTest, AppendGrowsAZeroedRecordAndRefusesToWrapAFullCount) {
  VectorData zeroed{};  // as the host hands it out
  for (int i = 0; i < 20; ++i) ASSERT_TRUE(VectorAppend(&zeroed, i * 1.5));
  for (int i = 0; i < 20; ++i) EXPECT_EQ(zeroed.elements[i], i * 1.5) << i;  // kept through every growth
  std::free(zeroed.elements);

  double one = 1.0;
  VectorData full{UINT32_MAX, UINT32_MAX, &one};
  EXPECT_FALSE(VectorAppend(&full, 2.0));
  EXPECT_EQ(std::tie(full.count, full.capacity, full.elements, one),
            std::make_tuple(UINT32_MAX, UINT32_MAX, &one, 1.0));
}

TEST_F(VectorMatrixRecordsTest, ColumnFirstArgumentsAddressRowMajorStorage) {
  host::Object m = rt->New("Matrix");
  MatrixData* data = GetMatrixData(m.get());
  rt->Call(m, "set", {7.0, 2, 0});
  rt->Call(m, "set", {5.0, 0, 1});
  // Row 0, column 2 is the third element; row 1, column 0 the fourth.
  EXPECT_EQ(std::make_tuple(data->elements[2], data->elements[3]), std::make_tuple(7.0, 5.0));
  data->elements[7] = -3.0;  // row 2, column 1, as the lut reader writes it
  EXPECT_EQ(rt->Call(m, "get", {1, 2}).AsDouble(), -3.0);
}

}  // namespace
