#include "desk/measure/transfer.h"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <sstream>
#include <vector>

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

double Transfer::Level(double light) const {
  switch (kind) {
    case Kind::kSrgb: return light <= 0.0031308 ? 12.92 * light : 1.055 * std::pow(light, 1 / 2.4) - 0.055;
    case Kind::kGamma: return light <= 0 ? light : std::pow(light, 1 / gamma);
    case Kind::kLinear: break;
  }
  return light;
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

cv::Mat Encoded(const cv::Mat& light, const Transfer& transfer) {
  constexpr int kSteps = 4096;  // of light, between which levels are taken along a line
  std::vector<float> table;
  for (int step = 0; step <= kSteps; ++step) {
    table.push_back(static_cast<float>(255 * transfer.Level(static_cast<double>(step) / kSteps)));
  }
  cv::Mat levels(light.size(), CV_32F);
  levels.forEach<float>([&](float& level, const int* place) {
    const double step = kSteps * std::clamp(light.at<double>(place), 0.0, 1.0);
    const int below = std::min(static_cast<int>(step), kSteps - 1);
    level = table[below] + static_cast<float>(step - below) * (table[below + 1] - table[below]);
  });
  return levels;
}

}  // namespace qv
