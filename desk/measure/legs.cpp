#include "desk/measure/legs.h"

#include <cmath>

namespace qv {

double Legs::ratio() const { return cv::norm(right) / cv::norm(down); }

double Legs::angle_deg() const { return std::acos(right.dot(down) / cv::norm(right) / cv::norm(down)) * 180 / CV_PI; }

bool Legs::plausible() const { return ratio() >= 0.9 && ratio() <= 1.1 && std::fabs(angle_deg() - 90) <= 5; }

}  // namespace qv
