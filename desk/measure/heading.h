#ifndef QVTESTER_DESK_MEASURE_HEADING_H_
#define QVTESTER_DESK_MEASURE_HEADING_H_

#include <string>
#include <vector>

#include "desk/drawing/picture.h"
#include "desk/measure/record.h"

namespace qv {

/// Good, marginal or without a limit, and bad.
Tone ToneOf(const Reading& reading);
Tone ToneOf(Outcome outcome);

/// What stands above a picture: the verdict as a word on its colour and what was measured; then each figure that has a
/// limit, or is among the shown, with its own verdict and limit; then each doubt or reason. Wrapped to the width.
class Heading {
 public:
  /// @param shown  figures without the measurement's name; those that were not measured are left out.
  Heading(const Record& record, const std::string& title, double width, const std::vector<std::string>& shown = {});

  double height() const;
  void Draw(Picture& picture) const;

 private:
  struct Line {
    std::string text;
    Tone tone;
    std::string badge = {};  // a verdict before the text
  };
  void AddFigures(const Record& record, const std::vector<std::string>& shown, double room);
  void Add(const std::string& text, Tone tone, double room);

  Outcome outcome_;
  std::vector<std::string> title_;
  std::vector<Line> lines_;
};

/// What stands at a place in a photo: a name and its figures, each with its verdict and limit, the worst first; in the
/// tone of the worst.
class PlaceWords {
 public:
  explicit PlaceWords(std::string name, Tone tone = kGood) : lines_({std::move(name)}), tone_(tone) {}

  /// A figure of this place alone, as these words tell it.
  void Add(const Reading& figure, const std::string& words);
  /// A list's entry, where it has a limit.
  void AddEntry(const Reading* list, std::size_t place);
  /// The entry, where the figure that is the list's largest, or least, has a limit: what bounds the largest from above
  /// bounds each.
  void AddExtreme(const Reading* extreme, bool most, const Reading& list, std::size_t place);

  std::vector<std::string> Lines() const;
  /// The worst of the entries, without its value; MEASURED where none has a limit.
  std::string Verdict() const;
  Tone tone() const;
  bool judged() const { return !judged_.empty(); }

 private:
  struct Entry {
    std::string words, verdict;
    Tone tone;
  };
  std::vector<Entry> Worst() const;

  std::vector<std::string> lines_;
  Tone tone_;
  std::vector<Entry> judged_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_HEADING_H_
