// Does the display show the pattern that it was told to show?
//
// By means of the colour channels: of the whole screen, of each of its 3 x 3 tiles where it is to be plain, of each
// bar. Dots are looked for channel by channel, so that a dead red point in white counts like a stuck blue one in black.

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <opencv2/imgproc.hpp>

#include "qvtester/lcd.h"
#include "qvtester/log.h"
#include "qvtester/tester.h"
#include "tests/lcd/lcd_photo.h"

namespace {

constexpr double kFull = 255;

// Mean levels of a part of the screen.
struct Colour {
  std::array<double, 3> rgb = {};

  double total() const { return rgb[0] + rgb[1] + rgb[2]; }
  double share(int i) const { return total() > 0 ? rgb[i] / total() : 0; }
};

Colour MeanOf(const cv::Mat& screen, const cv::Rect& part) {
  const cv::Scalar bgr = cv::mean(screen(part));
  return {{bgr[2], bgr[1], bgr[0]}};
}

// What is left of a part when its rim is taken off; never nothing, and never more than the part, whatever the margin.
cv::Rect Inner(const cv::Rect& part, double margin) {
  const auto rim = [margin](int length) {
    const double most = std::floor((length - 1) / 2.0);
    return margin > 0 ? static_cast<int>(std::min(std::ceil(margin), most)) : 0;
  };
  const int dx = rim(part.width);
  const int dy = rim(part.height);
  return {part.x + dx, part.y + dy, part.width - 2 * dx, part.height - 2 * dy};
}

// Part i of n equal ones of a screen, across or down; never nothing.
cv::Rect Slice(cv::Size screen, int i, int n, bool across) {
  const int length = across ? screen.width : screen.height;
  const int from = std::min(i * length / n, length - 1);
  const int to = std::max((i + 1) * length / n, from + 1);
  return across ? cv::Rect(from, 0, to - from, screen.height) : cv::Rect(0, from, screen.width, to - from);
}

std::string Text(const char* format, double a, double b = 0, double c = 0) {
  std::array<char, 160> text = {};
  std::snprintf(text.data(), text.size(), format, a, b, c);
  return text.data();
}

std::string LevelsText(const Colour& c) {
  return Text("red %.2f, green %.2f, blue %.2f of full range", c.rgb[0] / kFull, c.rgb[1] / kFull, c.rgb[2] / kFull);
}

// 8 bits, blue, green, red.
cv::Mat PlainColour(const cv::Mat& screen) {
  cv::Mat plain;
  screen.convertTo(plain, CV_8U, screen.depth() == CV_16U ? 1.0 / 257 : 1.0);
  if (plain.channels() == 1) cv::cvtColor(plain, plain, cv::COLOR_GRAY2BGR);
  if (plain.channels() == 4) cv::cvtColor(plain, plain, cv::COLOR_BGRA2BGR);
  return plain;
}

// ---- Levels at nine points ------------------------------------------------------------------------------------------

void MeasureLevels(const cv::Mat& screen, QVLcdResult& result) {
  cv::Mat grey;
  cv::cvtColor(screen, grey, cv::COLOR_RGB2GRAY);
  const int side = std::max(std::min(grey.cols, grey.rows) / 12, 1);
  for (int i = 0; i < 9; ++i) {
    const cv::Point middle((2 * (i % 3) + 1) * grey.cols / 6, (2 * (i / 3) + 1) * grey.rows / 6);
    const cv::Rect patch = cv::Rect(middle.x - side / 2, middle.y - side / 2, side, side) & cv::Rect({}, grey.size());
    result.levels_[i] = static_cast<float>(cv::mean(grey(patch))[0]);
  }
  const auto [least, most] = std::minmax_element(std::begin(result.levels_), std::end(result.levels_));
  result.uniformity_ = *most > 0 ? *least / *most : 0;
}

// ---- Dots -----------------------------------------------------------------------------------------------------------

// From differences of pixels two apart, which straightening left nearly independent; most show no dot.
double Noise(const cv::Mat& channel) {
  std::vector<int> off;
  const int step = std::max(1, static_cast<int>(channel.total() / 100000));
  int next = 0;
  for (int row = 0; row < channel.rows; ++row) {
    const auto* const pixels = channel.ptr<std::uint8_t>(row);
    for (int column = 2; column < channel.cols; ++column) {
      if (next++ % step == 0) off.push_back(std::abs(pixels[column] - pixels[column - 2]));
    }
  }
  if (off.empty()) return 0;
  const auto middle = off.begin() + static_cast<std::ptrdiff_t>(off.size() / 2);
  std::nth_element(off.begin(), middle, off.end());
  return 1.4826 * *middle / std::sqrt(2.0);
}

// Flags the dots of one part of the screen in `mask`, which covers the screen.
void FlagDots(const QVTester_LCD& rules, const cv::Mat& screen, const cv::Rect& part, cv::Mat& mask) {
  const int radius = std::min(rules.dot_radius_, (std::min(part.width, part.height) - 1) / 2);
  if (radius < 1) return;
  QVTester tester;
  cv::Mat channel;
  cv::Mat data(part.size(), CV_32FC3);
  for (int i = 0; i < 3; ++i) {
    cv::extractChannel(screen(part), channel, i);
    const double lift = std::max(0.0, rules.dot_floor_ * kFull - cv::mean(channel)[0]);
    const double level = cv::mean(channel)[0] + lift;
    const double threshold = std::max<double>(rules.dot_threshold_, 6 * Noise(channel) / std::max(level, 1.0));
    cv::Mat lifted;
    channel.convertTo(lifted, CV_32F, 1, lift);
    cv::insertChannel(lifted, data, 0);
    cv::Mat flagged = cv::Mat::zeros(part.size(), CV_8U);
    tester.DetectDot(data.ptr<float>(), part.height, part.width, static_cast<float>(threshold), radius, flagged.data);
    mask(part) |= flagged;
  }
}

template <typename T>
T* Array(int count) {
  return static_cast<T*>(std::malloc(sizeof(T) * static_cast<std::size_t>(std::max(count, 1))));
}

// Flagged pixels to 8-connected rectangles, those to areas.
void ClusterDots(const QVTester_LCD& rules, const cv::Mat& mask, QVLcdResult& result) {
  constexpr int kMost = 10000;  // beyond, the screen is no plain one, and merging would take minutes
  cv::Mat labels;
  cv::Mat boxes;
  cv::Mat centres;
  const int found = cv::connectedComponentsWithStats(mask, labels, boxes, centres, 8) - 1;
  if (found > kMost) QVDEBUGP("[%s] %d groups of dots, of which the first %d count", "JudgePattern", found, kMost);
  const int count = std::min(found, kMost);
  auto* counts = Array<int>(count);
  auto* first = Array<cv::Point>(count);
  auto* last = Array<cv::Point>(count);
  std::vector<int> areas(count);
  for (int i = 0; i < count; ++i) {
    const int* const box = boxes.ptr<int>(i + 1);
    areas[i] = i;
    counts[i] = box[cv::CC_STAT_AREA];
    first[i] = {box[cv::CC_STAT_LEFT], box[cv::CC_STAT_TOP]};
    last[i] = {first[i].x + box[cv::CC_STAT_WIDTH] - 1, first[i].y + box[cv::CC_STAT_HEIGHT] - 1};
  }
  QVTester tester;
  const int merged =
      tester.ErrorAreaClustering(rules.dot_distance_, mask.cols, mask.rows, &areas, &counts, &first, &last);
  for (int i = 0; i < merged; ++i) {
    if (counts[i] < rules.min_dot_pixels_) continue;
    result.error_areas_.push_back({first[i].x, first[i].y, last[i].x, last[i].y});
  }
  std::free(counts);
  std::free(first);
  std::free(last);
  result.error_count_ = static_cast<int>(result.error_areas_.size());
}

// ---- Patterns -------------------------------------------------------------------------------------------------------

class PatternJudge {
 public:
  PatternJudge(const QVTester_LCD& rules, const cv::Mat& screen)
      : rules_(rules), screen_(screen), margin_(rules.margin_ * std::min(screen.cols, screen.rows)) {}

  void Pattern(QV_LCD_PATTERN pattern, QVLcdResult& result) {
    const cv::Rect whole = Inner(cv::Rect({}, screen_.size()), margin_);
    const Colour mean = MeanOf(screen_, whole);
    for (int i = 0; i < 3; ++i) {
      result.sums_[i] = static_cast<float>(mean.rgb[i]);
      result.shares_[i] = static_cast<float>(mean.share(i));
    }
    MeasureLevels(screen_, result);
    cv::Mat dots = cv::Mat::zeros(screen_.size(), CV_8U);
    if (pattern == QV_LCD_CONTROL) {
      Control(dots);
    } else if (pattern == QV_LCD_RESULT) {
      Field(whole);
    } else {
      Plain(pattern, mean);
      FlagDots(rules_, screen_, whole, dots);
    }
    ClusterDots(rules_, dots, result);
    Ratio(result.ratio_);
    Extras(pattern, result);
    result.verdict_ = faults_.empty() ? 1 : 0;
    result.reason_ = faults_.empty() ? seen_ : faults_;
  }

 private:
  void Fault(const std::string& text) { faults_ += (faults_.empty() ? "" : "; ") + text; }

  bool IsWhite(const Colour& c) const {
    for (int i = 0; i < 3; ++i) {
      if (c.total() <= 0 || std::abs(c.share(i) - 1.0 / 3) > rules_.white_share_tolerance_) return false;
    }
    return true;
  }
  bool Shows(const Colour& c, int i) const {
    return c.share(i) >= rules_.min_colour_share_ && c.rgb[i] >= rules_.min_colour_level_ * kFull;
  }

  template <typename Test>
  int TilesThat(Test&& test) const {
    int count = 0;
    for (int i = 0; i < 9; ++i) {
      const cv::Rect tile = Slice(screen_.size(), i % 3, 3, true) & Slice(screen_.size(), i / 3, 3, false);
      if (test(MeanOf(screen_, Inner(tile, margin_)))) ++count;
    }
    return count;
  }

  void Plain(QV_LCD_PATTERN pattern, const Colour& mean) {
    const double darkest = *std::min_element(mean.rgb.begin(), mean.rgb.end());
    const double brightest = *std::max_element(mean.rgb.begin(), mean.rgb.end());
    if (pattern == QV_LCD_BLACK) {
      seen_ = "black: " + LevelsText(mean);
      if (brightest > rules_.max_black_level_ * kFull) {
        Fault("not black: " + LevelsText(mean) + Text(", at most %.2f expected", rules_.max_black_level_));
      }
      return;
    }
    const bool white = pattern == QV_LCD_WHITE;
    const char* const name = white ? "white" : "green";
    seen_ = name + (": " + LevelsText(mean));
    const double level = white ? darkest : mean.rgb[1];
    const double least = white ? rules_.min_white_level_ : rules_.min_colour_level_;
    if (level < least * kFull) Fault("too dark for " + seen_ + Text(", at least %.2f expected", least));
    const int tiles = TilesThat(
        [&](const Colour& c) { return white ? IsWhite(c) : c.total() > 0 && c.share(1) >= rules_.min_colour_share_; });
    if (tiles < 9) {
      Fault("not " + (name + Text(" all over: %.0f of 9 tiles are", tiles)) +
            Text("; shares of red, green, blue %.2f, %.2f, %.2f", mean.share(0), mean.share(1), mean.share(2)));
    }
  }

  // Four letters, '?' for a bar that is none of them.
  std::string Bars(bool across) const {
    std::string bars;
    for (int i = 0; i < 4; ++i) {
      const Colour c = MeanOf(screen_, Inner(Slice(screen_.size(), i, 4, across), margin_));
      const bool white = IsWhite(c) && *std::min_element(c.rgb.begin(), c.rgb.end()) >= rules_.min_white_level_ * kFull;
      bars += Shows(c, 0) ? 'R' : Shows(c, 1) ? 'G' : Shows(c, 2) ? 'B' : white ? 'W' : '?';
    }
    return bars;
  }

  void Control(cv::Mat& dots) {
    const auto kinds = [](std::string bars) {
      std::sort(bars.begin(), bars.end());
      return std::unique(bars.begin(), bars.end()) - bars.begin() - (bars.front() == '?' ? 1 : 0);
    };
    const std::string from_left = Bars(true);
    const std::string from_top = Bars(false);
    const bool across = kinds(from_left) >= kinds(from_top);
    const std::string& bars = across ? from_left : from_top;
    seen_ = "bars from the " + ((across ? "left: " : "top: ") + bars);
    if (bars != "RGBW") Fault("bars are " + bars + " from the " + (across ? "left" : "top") + ", not RGBW");
    for (int i = 0; i < 4; ++i) {
      FlagDots(rules_, screen_, Inner(Slice(screen_.size(), i, 4, across), margin_), dots);
    }
  }

  // Edges of a sign on the field: share of a reduced picture's pixels where a channel steps.
  double SignShare(const cv::Rect& whole) const {
    constexpr int kLonger = 160;
    constexpr double kStep = 0.12 * kFull;
    cv::Mat reduced = screen_(whole);
    const double scale = static_cast<double>(kLonger) / std::max(whole.width, whole.height);
    if (scale < 1) cv::resize(reduced, reduced, {}, scale, scale, cv::INTER_AREA);
    cv::Mat edges = cv::Mat::zeros(reduced.size(), CV_8U);
    for (int i = 0; i < 3; ++i) {
      cv::Mat channel;
      cv::Mat dx;
      cv::Mat dy;
      cv::extractChannel(reduced, channel, i);
      cv::Sobel(channel, dx, CV_32F, 1, 0, 3, 0.25);  // of a sharp step, its whole height
      cv::Sobel(channel, dy, CV_32F, 0, 1, 3, 0.25);
      edges |= cv::abs(dx) > kStep;
      edges |= cv::abs(dy) > kStep;
    }
    return static_cast<double>(cv::countNonZero(edges)) / static_cast<double>(edges.total());
  }

  void Field(const cv::Rect& whole) {
    constexpr double kLeastSign = 0.01;
    std::array<cv::Mat, 3> bgr;
    cv::split(screen_(whole), bgr.data());
    const auto excess = [&](int i) {  // a saturated difference: 0 where the channel is not the brightest
      return cv::mean(bgr[i] - cv::max(bgr[(i + 1) % 3], bgr[(i + 2) % 3]))[0] / kFull;
    };
    const double green = excess(1);
    const double red = excess(2);
    const double sign = SignShare(whole);
    const std::string excesses = Text("excess of green %.2f, of red %.2f", green, red);
    const auto wins = [&](double a, double b) { return a >= rules_.min_field_excess_ && a >= rules_.field_ratio_ * b; };
    if (sign < kLeastSign) {
      Fault("no sign on the field: " + excesses);
    } else if (wins(red, green)) {
      Fault("red cross field: " + excesses);
    } else if (!wins(green, red)) {
      Fault("neither a green tick field nor a red cross field: " + excesses);
    }
    seen_ = "green tick field: " + excesses;
  }

  void Ratio(double ratio) {
    const auto upright = [](double r) { return std::max(r, 1 / r); };
    const double expected = upright(rules_.expected_ratio_);
    if (std::abs(upright(ratio) / expected - 1) > rules_.ratio_tolerance_) {
      Fault(Text("sides are %.2f to 1, not %.2f within %.0f %%", upright(ratio), expected,
                 100 * rules_.ratio_tolerance_));
    }
  }

  void Extras(QV_LCD_PATTERN pattern, const QVLcdResult& result) {
    const bool plain = pattern == QV_LCD_WHITE || pattern == QV_LCD_GREEN;
    if (plain && result.uniformity_ < rules_.min_uniformity_) {
      Fault(Text("uniformity %.2f, at least %.2f expected", result.uniformity_, rules_.min_uniformity_));
    }
    if (rules_.max_error_count_ >= 0 && result.error_count_ > rules_.max_error_count_) {
      Fault(Text("%.0f dots, at most %.0f expected", result.error_count_, rules_.max_error_count_));
    }
  }

  const QVTester_LCD& rules_;
  const cv::Mat& screen_;
  double margin_;
  std::string seen_, faults_;
};

}  // namespace

int QVTester_LCD::JudgePattern(cv::Mat photo, QV_LCD_PATTERN pattern, QVLcdResult* result) {
  if (result == nullptr || pattern < QV_LCD_CONTROL || pattern > QV_LCD_RESULT) {
    QVDEBUGP("[%s] %s", "JudgePattern", result == nullptr ? "no place for the result" : "no such pattern");
    return QV_ERROR_INVALID_ARGUMENT;
  }
  return GuardedLcd("JudgePattern", [&]() -> int {
    std::vector<cv::Point2f> corners;
    if (const int code = Locate(photo, false, pattern == QV_LCD_BLACK, corners); code != QV_SUCCESS) return code;
    const cv::Mat screen = PlainColour(CutScreenOut(photo, corners, ScreenSize(corners)));
    QVLcdResult judged;
    judged.ratio_ = SideRatio(corners);
    PatternJudge(*this, screen).Pattern(pattern, judged);
    std::swap(*result, judged);
    aspect_ratio_ = result->ratio_;
    screen_size_ = screen.size();
    corners_.swap(corners);
    return QV_SUCCESS;
  });
}
