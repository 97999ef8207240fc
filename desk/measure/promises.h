#ifndef QVTESTER_DESK_MEASURE_PROMISES_H_
#define QVTESTER_DESK_MEASURE_PROMISES_H_

#include <string>
#include <string_view>
#include <vector>

namespace qv {

// The numbers that figures are promised to keep to. Each stands here alone: what `explain` says, the README's table and
// what `scripts/accuracy --check` holds the figures to are made of it.

struct Promise {
  enum Bound { kAtMost, kAtLeast, kAbout };
  const char* name;  // in braces it stands for the number in a text: "within {own_law}"
  Bound bound;
  double value;
  const char* unit;  // shown behind the number
  const char* of;    // of what, and under which conditions
  double slack = 0;  // kAbout: how far it may be off
};

const std::vector<Promise>& Promises();

/// Throws std::logic_error for a name that there is none of.
const Promise& FindPromise(std::string_view name);

bool IsKept(const Promise& promise, double measured);

/// The number with its unit.
std::string NumberText(const Promise& promise);

/// The text with each name in braces replaced by its number.
std::string WithNumbers(std::string_view text);

/// The README's table "How true the numbers are", in Markdown.
std::string PromiseTable();

/// All of them, a line each, in Markdown.
std::string PromiseList();

}  // namespace qv

#endif  // QVTESTER_DESK_MEASURE_PROMISES_H_
