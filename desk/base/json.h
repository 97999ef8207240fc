#ifndef QVTESTER_DESK_BASE_JSON_H_
#define QVTESTER_DESK_BASE_JSON_H_

#include <cstdint>
#include <initializer_list>
#include <nlohmann/json.hpp>
#include <string>
#include <utility>
#include <vector>

#include "desk/base/failure.h"

// The one reader of JSON that people or other programs hand in: limits, truth, records, references, plans.

namespace qv {

using Json = nlohmann::ordered_json;

/// Deeper documents are refused: what walks them would run out of stack.
inline constexpr int kMostJsonLevels = 64;

/// Parses a document; `where` names it in sentences. Throws Failure (wrong usage) with the line of what is wrong: no
/// JSON, a name given twice in one object, more than 64 levels, a number beyond double, text that is not UTF-8. A part
/// of a file begins with another line of it than the first.
Json ParseJson(const std::string& text, const std::string& where, long first_line = 1);

/// The same from a file; `kind` is that of the failure when the file itself can't be read (over 256 MB among others).
Json ReadJson(const std::string& path, FailureKind kind = kWrongUsage);

/// What the library says of an access, without its boilerplate in front.
std::string SentenceOf(const Json::exception& e);

/// The member of an object; null where there is none, or no object. For documents whose shape is not known.
const Json& MemberOf(const Json& object, const char* name);

/// The first element of a list; null where there is none, or no list.
const Json& FirstOf(const Json& list);

/// The whole number that a member holds; 0 where it holds none.
std::int64_t WholeAt(const Json& object, const char* name);

/// A value of a document with the way that leads to it, read with checks: each refusal is a Failure (wrong usage) in a
/// sentence such as `plan.json: steps[2].inputs: is 5, not a list`. Refers to the document, which must outlive it.
class JsonView {
 public:
  JsonView(const Json& value, std::string where) : value_(&value), where_(std::move(where)) {}

  const Json& value() const { return *value_; }
  const std::string& where() const { return where_; }

  bool Has(const char* name) const;
  /// A member; refuses what is no object or holds none of this name.
  JsonView At(const std::string& name) const;
  std::vector<JsonView> Elements() const;
  std::vector<std::pair<std::string, JsonView>> Members() const;

  std::string Text() const;
  double Number() const;  // finite
  std::int64_t Integer(std::int64_t low, std::int64_t high) const;
  bool Boolean() const;

  /// Refuses members of any other name, with the nearest known one.
  void KnowOnly(std::initializer_list<const char*> names) const;
  void KnowOnly(const std::vector<std::string>& names) const;

  [[noreturn]] void Refuse(const std::string& why) const;

 private:
  [[noreturn]] void RefuseAs(const char* wanted) const;

  const Json* value_;
  std::string where_;
};

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_JSON_H_
