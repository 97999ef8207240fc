#include "desk/measure/heading.h"

#include <algorithm>
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
constexpr double kBehindBadge = 20;
constexpr std::size_t kMostFigures = 12;
constexpr std::size_t kMostRemarkLines = 12;

std::string UnitText(const Reading& m) {
  const std::string unit = m.info->figure->unit.suffix;
  return unit == "1" ? "" : " " + unit;
}

// The verdict's word stands before it.
std::string FigureText(const Reading& m) {
  std::string value = "not measured";
  if (m.values.size() > 1) value = Format("%zu values", m.values.size());
  if (m.values.size() == 1 && !std::isfinite(m.value())) value = "none";
  if (m.values.size() == 1 && std::isfinite(m.value())) {
    value = ValueText(m, m.info->figure->number == Number::kWhole ? 0 : 4) + UnitText(m);
  }
  return m.info->name + " " + value + BehindVerdict(m);
}

std::string EntryWords(const Reading& list, std::size_t place) {
  const double value = list.values[place];
  const std::string text = std::isnan(value) ? "none" : Format("%.4g", value) + UnitText(list);
  return list.info->figure->name + (" " + text);
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

Heading::Heading(const Record& record, const std::string& title, double width, const std::vector<std::string>& shown)
    : outcome_(record.outcome()) {
  const double room = width - 2 * kMargin;
  title_ = Wrapped(title, kTitlePx, room - WidthOf(Name(outcome_), kTitlePx) - 24);
  AddFigures(record, shown, room);
  const std::size_t most = lines_.size() + kMostRemarkLines;
  for (const Remark& remark : record.remarks) Add(remark.sentence(), ToneOf(remark), room);
  if (lines_.size() <= most) return;
  lines_.resize(most);
  lines_.push_back({"and more, in the record", kInk});
}

void Heading::Add(const std::string& text, Tone tone, double room) {
  for (const std::string& line : Wrapped(Printable(text), kLinePx, room)) lines_.push_back({line, tone});
}

// What broke its limit comes first: it is there however many there are.
void Heading::AddFigures(const Record& record, const std::vector<std::string>& shown, double room) {
  const auto good = [](const Reading* m) { return m->outcome == Outcome::kPass || m->outcome == Outcome::kMeasured; };
  std::vector<const Reading*> figures;
  for (const std::string& name : shown) {
    const Reading* const m = record.phase.Find(name);
    if (m != nullptr && !m->limit.given() && !m->values.empty()) figures.push_back(m);
  }
  for (const Reading& m : record.phase.readings) {
    if (m.limit.given()) figures.push_back(&m);
  }
  std::stable_partition(figures.begin(), figures.end(), [](const Reading* m) { return m->limit.given(); });
  std::stable_partition(figures.begin(), figures.end(), [&](const Reading* m) { return !good(m); });
  std::size_t count = 0;
  for (const Reading* const m : figures) {
    if (++count > kMostFigures && good(m)) {
      Add(Format("and %zu more figures within their limits, in the record", figures.size() - count + 1), kInk, room);
      break;
    }
    const std::string badge = Name(m->outcome);
    const std::vector<std::string> text =
        Wrapped(FigureText(*m), kLinePx, room - WidthOf(badge, kLinePx) - kBehindBadge);
    const Tone tone = m->limit.given() ? ToneOf(*m) : kInk;
    for (std::size_t i = 0; i < text.size(); ++i) lines_.push_back({text[i], tone, i == 0 ? badge : ""});
  }
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
    const double left = line.badge.empty() ? kMargin : picture.Badge(line.badge, {kMargin, y}, kLinePx, line.tone) + 8;
    picture.Text(line.text, {left, y}, kLinePx, line.tone);
    y += kLineRow;
  }
}

void PlaceWords::Add(const Reading& figure, const std::string& words) {
  lines_.push_back(words);
  lines_.push_back(VerdictText(figure));
  if (figure.limit.given()) tone_ = std::max(tone_, ToneOf(figure));
}

void PlaceWords::AddEntry(const Reading* list, std::size_t place) {
  if (list == nullptr) return;
  for (const EntryVerdict& entry : list->entries) {
    if (entry.place != place) continue;
    judged_.push_back({EntryWords(*list, place), VerdictText(*list, place),
                       !entry.decision.pass ? kPoor
                       : entry.marginal     ? kDoubtful
                                            : kGood});
  }
}

void PlaceWords::AddExtreme(const Reading* extreme, bool most, const Reading& list, std::size_t place) {
  if (extreme == nullptr || !extreme->limit.given() || !extreme->decision || place >= list.values.size()) return;
  const double value = list.values[place];
  const std::string words = EntryWords(list, place);
  if (value == extreme->value() || (std::isnan(value) && std::isnan(extreme->value()))) {
    judged_.push_back({words, VerdictText(*extreme), ToneOf(*extreme)});
    return;
  }
  const std::optional<double>& bound = most ? extreme->limit.max : extreme->limit.min;
  if (!bound) return;
  const double room = (most ? *bound - value : value - *bound) - extreme->decision->guard_band;
  judged_.push_back(
      {words,
       Format("%s, %s %g", Name(room >= 0 ? Outcome::kPass : Outcome::kFail), most ? "at most" : "at least", *bound),
       room >= 0 ? kGood : kPoor});
}

std::string PlaceWords::Verdict() const { return judged_.empty() ? Name(Outcome::kMeasured) : Worst().front().verdict; }

std::vector<PlaceWords::Entry> PlaceWords::Worst() const {
  std::vector<Entry> entries = judged_;
  std::stable_sort(entries.begin(), entries.end(), [](const Entry& a, const Entry& b) { return a.tone > b.tone; });
  return entries;
}

std::vector<std::string> PlaceWords::Lines() const {
  constexpr std::size_t kMost = 2;
  std::vector<std::string> lines = lines_;
  if (lines.size() == 1 && judged_.empty()) lines.emplace_back(Name(Outcome::kMeasured));
  for (const Entry& entry : Worst()) {
    if (lines.size() == lines_.size() + kMost) {
      lines.push_back(Format("and %zu more, in the record", judged_.size() - kMost));
      break;
    }
    lines.push_back(entry.words + ": " + entry.verdict);
  }
  return lines;
}

Tone PlaceWords::tone() const { return judged_.empty() ? tone_ : std::max(tone_, Worst().front().tone); }

}  // namespace qv
