#include "matrix.h"

#include <cstring>

#include "class_tables.h"
#include "host_bridge.h"

namespace {

MatrixData* Data(REALobject self) { return GetMatrixData(self); }

void SetIdentity(MatrixData* m) {
  for (int i = 0; i < 9; ++i) m->elements[i] = i % 4 == 0 ? 1.0 : 0.0;
}

bool InRange(int32_t column, int32_t row) { return column >= 0 && column <= 2 && row >= 0 && row <= 2; }

void Construct(REALobject self) { SetIdentity(Data(self)); }

void Identity(REALobject self) { SetIdentity(Data(self)); }

// Scripts name the column first; the storage is row-major.
double Get(REALobject self, int32_t column, int32_t row) {
  return InRange(column, row) ? Data(self)->elements[3 * row + column] : 0.0;
}

void Set(REALobject self, double value, int32_t column, int32_t row) {
  if (InRange(column, row)) Data(self)->elements[3 * row + column] = value;
}

// The new Matrix goes to the caller as the host created it; nil when it could not.
REALobject Copy(REALobject self) {
  REALobject copy = bridge::NewInstance("Matrix");
  if (!copy) return nullptr;
  std::memcpy(Data(copy)->elements, Data(self)->elements, sizeof(MatrixData::elements));
  return copy;
}

REALmethodDefinition methods[] = {
    {AsProc(&Identity), nullptr, "identity()"},
    {AsProc(&Get), nullptr, "get(column as integer, row as integer) as Double"},
    {AsProc(&Set), nullptr, "set(val as Double, column as integer, row as integer)"},
    {AsProc(&Copy), nullptr, "copy() as Matrix"},
};

}  // namespace

// No properties, so the record is written out rather than made by ClassDefinition.
REALclassDefinition MatrixClass = {REAL_PLUGIN_VERSION,
                                   "Matrix",
                                   nullptr,
                                   static_cast<intptr_t>(sizeof(MatrixData)),
                                   0,
                                   AsProc(&Construct),
                                   nullptr,
                                   nullptr,
                                   0,
                                   methods,
                                   static_cast<intptr_t>(sizeof methods / sizeof methods[0]),
                                   nullptr,
                                   0,
                                   0,
                                   0,
                                   0,
                                   0,
                                   0};
