// The Vector and Matrix records as the tag codecs and containers reach them directly:
// a zero-filled Vector record is a valid empty list, a full count never wraps, and a
// Matrix's script-side (column, row) lands at its row-major place.
#include <climits>
#include <cstdlib>

#include "matrix.h"
#include "plugin_fixture.h"
#include "vector.h"

namespace {

class VectorMatrixRecordsTest : public PluginTest {
 protected:
  VectorMatrixRecordsTest() : PluginTest("") {}
};

TEST_F(VectorMatrixRecordsTest, AppendGrowsAZeroedRecordAndRefusesToWrapAFullCount) {
  VectorData zeroed{};  // as the host hands it out
  for (int i = 0; i < 20; ++i) ASSERT_TRUE(VectorAppend(&zeroed, i * 1.5));
  EXPECT_EQ(zeroed.count, 20u);
  for (int i = 0; i < 20; ++i) EXPECT_EQ(zeroed.elements[i], i * 1.5) << i;
  const uint32_t capacity = zeroed.capacity;
  VectorClear(&zeroed);
  EXPECT_EQ(zeroed.count, 0u);
  EXPECT_EQ(zeroed.capacity, capacity);  // the storage stays
  std::free(zeroed.elements);

  double one = 1.0;
  VectorData full{UINT32_MAX, UINT32_MAX, &one};
  EXPECT_FALSE(VectorAppend(&full, 2.0));
  EXPECT_EQ(full.count, UINT32_MAX);
  EXPECT_EQ(full.capacity, UINT32_MAX);
  EXPECT_EQ(full.elements, &one);
  EXPECT_EQ(one, 1.0);
}

TEST_F(VectorMatrixRecordsTest, ColumnFirstArgumentsAddressRowMajorStorage) {
  host::Object m = rt->New("Matrix");
  const MatrixData* data = GetMatrixData(m.get());
  for (int i = 0; i < 9; ++i) EXPECT_EQ(data->elements[i], i % 4 == 0 ? 1.0 : 0.0) << i;
  rt->Call(m, "set", {7.0, 2, 0});
  EXPECT_EQ(data->elements[2], 7.0);  // row 0, column 2: the third element
  rt->Call(m, "set", {5.0, 0, 1});
  EXPECT_EQ(data->elements[3], 5.0);  // row 1, column 0: the fourth
  GetMatrixData(m.get())->elements[7] = -3.0;  // row 2, column 1, as the lut reader writes it
  EXPECT_EQ(rt->Call(m, "get", {1, 2}).AsDouble(), -3.0);
}

}  // namespace
