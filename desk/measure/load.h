#ifndef QVTESTER_DESK_MEASURE_LOAD_H_
#define QVTESTER_DESK_MEASURE_LOAD_H_

#include <string>
#include <vector>

#include "desk/base/log_lines.h"
#include "desk/measure/measurement.h"
#include "desk/measure/record.h"
#include "qvtester/tester.h"

namespace qv {

/// Loads a resolved request's inputs into their slots: each file is read once, and what is hashed is what is decoded.
/// False with the first that can't be used: then the record has its code and says why.
bool LoadInputs(QVTester& tester, const Spec& spec, const Request& request, Record& record, LogCollector& log);

/// A doubt for what a decoder wrote while it read a file: it fills up what it can't read. What it calls a warning
/// itself is about other things than pixels, and stays one.
void SayComplaint(Record& record, const std::string& name, const std::vector<std::string>& lines);

/// The image of a slot; empty where there is none.
cv::Mat SlotPhoto(const QVTester& tester, QV_RESOURCE_INDEX slot);
/// The floats of a slot, CV_32FC3, in the tester's memory.
cv::Mat SlotFloats(const QVTester& tester, QV_RESOURCE_INDEX slot);

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_LOAD_H_
