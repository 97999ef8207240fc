#include "desk/measure/transfer.h"

#include <cmath>
#include <cstdlib>
#include <sstream>

namespace qv {

double Transfer::Light(double level) const {
  switch (kind) {
    case Kind::kSrgb:  // IEC 61966-2-1
      return level <= 0.04045 ? level / 12.92 : std::pow((level + 0.055) / 1.055, 2.4);
    case Kind::kGamma: return level <= 0 ? level : std::pow(level, gamma);
    case Kind::kLinear: break;
  }
  return level;
}

std::string Transfer::Text() const {
  if (kind == Kind::kSrgb) return "srgb";
  if (kind == Kind::kLinear) return "linear";
  std::ostringstream text;
  text << "gamma:" << gamma;
  return text.str();
}

std::optional<Transfer> ParseTransfer(std::string_view text) {
  constexpr std::string_view kGamma = "gamma:";
  if (text == "srgb") return Transfer{};
  if (text == "linear") return Transfer{Transfer::Kind::kLinear, 1};
  if (text.substr(0, kGamma.size()) != kGamma) return std::nullopt;
  const std::string number(text.substr(kGamma.size()));
  char* end = nullptr;
  const double gamma = std::strtod(number.c_str(), &end);
  if (number.empty() || *end != '\0' || !(gamma >= 0.1 && gamma <= 10)) return std::nullopt;
  return Transfer{Transfer::Kind::kGamma, gamma};
}

cv::Mat LinearLight(const cv::Mat& levels, const Transfer& transfer) {
  CV_Assert(levels.type() == CV_8UC1 || levels.type() == CV_16UC1 || levels.type() == CV_32FC1);
  const double full = levels.depth() == CV_8U ? 255 : levels.depth() == CV_16U ? 65535 : 1;
  cv::Mat light;
  if (levels.depth() == CV_8U) {
    cv::Mat table(1, 256, CV_64F);
    for (int level = 0; level < 256; ++level) table.at<double>(level) = transfer.Light(level / full);
    cv::LUT(levels, table, light);
    return light;
  }
  levels.convertTo(light, CV_64F, 1 / full);
  if (transfer.kind != Transfer::Kind::kLinear) {
    light.forEach<double>([&](double& pixel, const int* /*place*/) { pixel = transfer.Light(pixel); });
  }
  return light;
}

}  // namespace qv
