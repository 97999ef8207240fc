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

/// What stands above a picture: the verdict as a word on its colour, what was measured, each figure that has a limit
/// with it, and each doubt or reason; wrapped to the width.
class Heading {
 public:
  Heading(const Record& record, const std::string& title, double width);

  double height() const;
  void Draw(Picture& picture) const;

 private:
  struct Line {
    std::string text;
    Tone tone;
  };
  Outcome outcome_;
  std::vector<std::string> title_;
  std::vector<Line> lines_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_HEADING_H_
