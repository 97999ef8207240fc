#ifndef QVTESTER_DESK_MEASURE_CODES_H_
#define QVTESTER_DESK_MEASURE_CODES_H_

#include "qvtester/indices.h"

namespace qv {

// The library's result codes as a person wants them: name, meaning, what to look at.

struct ResultCode {
  int code;
  const char* name;
  const char* meaning;
  const char* look_at;
};

inline constexpr ResultCode kResultCodes[] = {
    {QV_SUCCESS, "QV_SUCCESS", "the test ran and stored its figures", ""},
    {QV_DONE, "QV_DONE", "SetStep and FinalizeTestModule are done", ""},
    {QV_ERROR_NO_PATCHES, "QV_ERROR_NO_PATCHES", "too few colour patches could be measured",
     "is the whole ring of patches in view?"},
    {QV_ERROR_NO_REGISTRATION, "QV_ERROR_NO_REGISTRATION", "too few features match between image and reference",
     "do both show the same scene, sharp and well lit?"},
    {QV_ERROR_PATTERN_NOT_FOUND, "QV_ERROR_PATTERN_NOT_FOUND", "the chart does not show exactly three finder marks",
     "is the whole chart in view, sharp, and does the threshold lie between its dark and its light?"},
    {QV_ERROR_UNUSABLE_INPUT, "QV_ERROR_UNUSABLE_INPUT", "the input can't be processed",
     "is it an 8-bit colour picture that shows the whole chart?"},
    {QV_ERROR_NO_TESTER, "QV_ERROR_NO_TESTER", "InitTestModule was not called", "call InitTestModule first"},
    {QV_ERROR_INVALID_ARGUMENT, "QV_ERROR_INVALID_ARGUMENT",
     "an argument is not valid: an index, path, file, size or pointer, or a test without a routine",
     "does the file exist, and is it a whole JPEG, PNG, BMP or TIFF picture?"},
    {QV_ERROR_SLOT_EMPTY, "QV_ERROR_SLOT_EMPTY", "an input slot that the test needs is empty",
     "load every slot that `qvtester list tests` names"},
    {QV_ERROR_INTERNAL, "QV_ERROR_INTERNAL", "an internal failure, exhausted memory among them",
     "--verbose shows its text; is there memory for a picture of this size?"},
};

/// The row of a code; the row of QV_ERROR_INTERNAL for one that is not in the table.
inline const ResultCode& FindCode(int code) {
  const ResultCode* found = &kResultCodes[0];
  for (const ResultCode& row : kResultCodes) {
    found = &row;
    if (row.code == code) break;
  }
  return *found;
}

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_CODES_H_
