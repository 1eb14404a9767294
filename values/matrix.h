// Matrix: a script's 3 x 3 matrix of doubles, row-major.
#ifndef TINTWELL_VALUES_MATRIX_H
#define TINTWELL_VALUES_MATRIX_H

#include "instance_data.h"
#include "plugin_records.h"

// Element (row r, column c) is elements[3 * r + c].
struct MatrixData {
  double elements[9];
};

extern REALclassDefinition MatrixClass;

inline MatrixData* GetMatrixData(REALobject matrix) { return GetInstanceData<MatrixData>(matrix, MatrixClass); }

#endif
