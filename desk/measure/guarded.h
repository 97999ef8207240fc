#ifndef QVTESTER_DESK_MEASURE_GUARDED_H_
#define QVTESTER_DESK_MEASURE_GUARDED_H_

#include <exception>
#include <opencv2/core.hpp>

#include "qvtester/indices.h"
#include "qvtester/log.h"

namespace qv {

/// The code of a call to a member of the tester, as the exported functions give it: an exception becomes a code and a
/// log line with its cause.
template <typename Call>
int Guarded(const char* name, Call&& call) {
  try {
    return call();
  } catch (const cv::Exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
    return e.code == cv::Error::StsNoMem ? QV_ERROR_INTERNAL : QV_ERROR_UNUSABLE_INPUT;
  } catch (const std::exception& e) {
    QVDEBUGP("[%s] %s", name, e.what());
    return QV_ERROR_INTERNAL;
  }
}

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_GUARDED_H_
