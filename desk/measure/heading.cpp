#include "desk/measure/heading.h"

#include <cmath>

#include "desk/base/text.h"
#include "desk/measure/telling.h"

namespace qv {

namespace {

constexpr double kMargin = 12;
constexpr double kTitlePx = 18;
constexpr double kLinePx = 14;
constexpr double kTitleRow = 26;
constexpr double kLineRow = 20;
constexpr std::size_t kMostLines = 14;

std::string FigureText(const Reading& m) {
  std::string value = "not measured";
  if (m.values.size() > 1) value = Format("%zu values", m.values.size());
  if (m.values.size() == 1 && !std::isfinite(m.value())) value = "none";
  if (m.values.size() == 1 && std::isfinite(m.value())) {
    value = ValueText(m, m.info->figure->number == Number::kWhole ? 0 : 4);
  }
  const std::string unit = m.info->figure->unit.suffix;
  return m.info->name + " " + value + (unit == "1" ? "" : " " + unit) + LimitText(m);
}

Tone ToneOf(const Remark& remark) {
  if (remark.Is(Remark::kMiss)) return kPoor;
  return remark.doubts() || remark.Is(Remark::kNoJudgement) ? kDoubtful : kInk;
}

}  // namespace

Tone ToneOf(const Reading& reading) {
  if (reading.outcome == Outcome::kPass && reading.marginal) return kDoubtful;
  return reading.limit.given() ? ToneOf(reading.outcome) : kGood;
}

Tone ToneOf(Outcome outcome) {
  switch (outcome) {
    case Outcome::kPass: return kGood;
    case Outcome::kFail: return kPoor;
    case Outcome::kMeasured: return kInk;
    default: return kDoubtful;
  }
}

Heading::Heading(const Record& record, const std::string& title, double width) : outcome_(record.outcome()) {
  const double room = width - 2 * kMargin;
  title_ = Wrapped(title, kTitlePx, room - WidthOf(Name(outcome_), kTitlePx) - 24);
  const auto add = [&](const std::string& text, Tone tone) {
    for (const std::string& line : Wrapped(Printable(text), kLinePx, room)) lines_.push_back({line, tone});
  };
  for (const Reading& m : record.phase.readings) {
    if (m.limit.given()) add(FigureText(m), ToneOf(m));
  }
  for (const Remark& remark : record.remarks) add(remark.sentence(), ToneOf(remark));
  if (lines_.size() <= kMostLines) return;
  lines_.resize(kMostLines);
  lines_.push_back({"and more, in the record", kInk});
}

double Heading::height() const {
  return kMargin + kTitleRow * static_cast<double>(title_.size()) + kLineRow * static_cast<double>(lines_.size()) + 6;
}

void Heading::Draw(Picture& picture) const {
  double y = kMargin + kTitlePx - 2;
  const double from = picture.Badge(Name(outcome_), {kMargin, y}, kTitlePx, ToneOf(outcome_)) + 12;
  for (const std::string& line : title_) {
    picture.Text(line, {from, y}, kTitlePx, kInk);
    y += kTitleRow;
  }
  for (const Line& line : lines_) {
    picture.Text(line.text, {kMargin, y}, kLinePx, line.tone);
    y += kLineRow;
  }
}

}  // namespace qv
