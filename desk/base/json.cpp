#include "desk/base/json.h"

#include <algorithm>
#include <cmath>
#include <unordered_set>

#include "desk/base/files.h"
#include "desk/base/text.h"

namespace qv {

namespace {

constexpr std::size_t kMostBytes = std::size_t{256} << 20;
constexpr std::size_t kShown = 60;  // bytes of a value in a sentence

long LineOf(const std::string& text, std::size_t byte) {
  const auto end = text.begin() + static_cast<std::ptrdiff_t>(std::min(byte, text.size()));
  return 1 + std::count(text.begin(), end, '\n');
}

// The levels are counted before anything is built: a parsed tree is torn down level by level, on the stack.
void RefuseDepth(const std::string& text, const std::string& where, long first_line) {
  int level = 0;
  bool quoted = false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const char c = text[i];
    if (c == '"') quoted = !quoted;
    if (quoted) {
      if (c == '\\') ++i;
      continue;
    }
    if (c == '[' || c == '{') ++level;
    if (c == ']' || c == '}') --level;
    if (level > kMostJsonLevels) {
      throw Failure(kWrongUsage, Format("%s: line %ld: nested deeper than %d levels", where.c_str(),
                                        first_line - 1 + LineOf(text, i), kMostJsonLevels));
    }
  }
}

// Refuses what the parser lets pass: a name given twice in one object.
class NamesOnce {
 public:
  explicit NamesOnce(std::string where) : where_(std::move(where)) {}

  bool operator()(int /*depth*/, Json::parse_event_t event, const Json& parsed) {
    if (event == Json::parse_event_t::object_start) open_.emplace_back();
    if (event == Json::parse_event_t::object_end) open_.pop_back();
    if (event == Json::parse_event_t::key && !open_.back().insert(parsed.get<std::string>()).second) {
      throw Failure(kWrongUsage, where_ + ": \"" + Printable(parsed.get<std::string>()) + "\" stands there twice");
    }
    return true;
  }

 private:
  std::string where_;
  std::vector<std::unordered_set<std::string>> open_;  // names of the objects around, outermost first
};

std::string Shown(const Json& value) {
  if (value.is_object()) return "an object";
  if (value.is_array()) return "a list";
  return Printable(Shortened(value.dump(-1, ' ', false, Json::error_handler_t::replace), kShown));
}

}  // namespace

Json ParseJson(const std::string& text, const std::string& where, long first_line) {
  RefuseDepth(text, where, first_line);
  try {
    NamesOnce names(where);
    return Json::parse(text, std::ref(names));
  } catch (const Json::parse_error& e) {
    const bool cut = e.byte > text.size();
    throw Failure(kWrongUsage,
                  Format("%s: line %ld: %s", where.c_str(), first_line - 1 + LineOf(text, e.byte == 0 ? 0 : e.byte - 1),
                         cut ? "ends before the document does" : "this is no JSON"));
  } catch (const Json::exception&) {
    throw Failure(kWrongUsage, where + ": holds a number that no double can take");
  }
}

Json ReadJson(const std::string& path, FailureKind kind) {
  return ParseJson(ReadWholeFile(path, kind, kMostBytes), Printable(path));
}

std::string SentenceOf(const Json::exception& e) {
  const std::string text = e.what();
  const std::size_t end = text.find("] ");
  return Printable(end == std::string::npos ? text : text.substr(end + 2));
}

bool JsonView::Has(const char* name) const { return value_->is_object() && value_->contains(name); }

JsonView JsonView::At(const std::string& name) const {
  if (!value_->is_object()) RefuseAs("an object");
  const auto found = value_->find(name);
  if (found == value_->end()) Refuse("holds no \"" + name + "\"");
  return {*found, where_ + ": " + Printable(name)};
}

std::vector<JsonView> JsonView::Elements() const {
  if (!value_->is_array()) RefuseAs("a list");
  std::vector<JsonView> elements;
  elements.reserve(value_->size());
  for (std::size_t i = 0; i < value_->size(); ++i)
    elements.emplace_back((*value_)[i], Format("%s[%zu]", where_.c_str(), i));
  return elements;
}

std::vector<std::pair<std::string, JsonView>> JsonView::Members() const {
  if (!value_->is_object()) RefuseAs("an object");
  std::vector<std::pair<std::string, JsonView>> members;
  for (const auto& [name, value] : value_->items()) {
    members.emplace_back(name, JsonView(value, where_ + ": " + Printable(name)));
  }
  return members;
}

std::string JsonView::Text() const {
  if (!value_->is_string()) RefuseAs("a text");
  return value_->get<std::string>();
}

double JsonView::Number() const {
  if (!value_->is_number() || !std::isfinite(value_->get<double>())) RefuseAs("a number");
  return value_->get<double>();
}

std::int64_t JsonView::Integer(std::int64_t low, std::int64_t high) const {
  const bool whole = value_->is_number_integer() &&
                     !(value_->is_number_unsigned() && value_->get<std::uint64_t>() > std::uint64_t{INT64_MAX});
  if (!whole || value_->get<std::int64_t>() < low || value_->get<std::int64_t>() > high) {
    Refuse(Format("is %s, not a whole number from %lld to %lld", Shown(*value_).c_str(), static_cast<long long>(low),
                  static_cast<long long>(high)));
  }
  return value_->get<std::int64_t>();
}

bool JsonView::Boolean() const {
  if (!value_->is_boolean()) RefuseAs("true or false");
  return value_->get<bool>();
}

void JsonView::KnowOnly(std::initializer_list<const char*> names) const {
  KnowOnly(std::vector<std::string>(names.begin(), names.end()));
}

void JsonView::KnowOnly(const std::vector<std::string>& names) const {
  if (!value_->is_object()) RefuseAs("an object");
  for (const auto& [name, value] : value_->items()) {
    if (std::find(names.begin(), names.end(), name) != names.end()) continue;
    Refuse("\"" + Printable(name) + "\" is not known here" + DidYouMean(name, names));
  }
}

void JsonView::Refuse(const std::string& why) const { throw Failure(kWrongUsage, where_ + ": " + why); }

void JsonView::RefuseAs(const char* wanted) const { Refuse("is " + Shown(*value_) + ", not " + wanted); }

const Json& MemberOf(const Json& object, const char* name) {
  static const Json nothing;
  const auto found = object.find(name);  // the end of what is no object
  return found != object.end() ? *found : nothing;
}

const Json& FirstOf(const Json& list) {
  static const Json nothing;
  return list.is_array() && !list.empty() ? list[0] : nothing;
}

std::int64_t WholeAt(const Json& object, const char* name) {
  const Json& value = MemberOf(object, name);
  return value.is_number() ? value.get<std::int64_t>() : 0;
}

}  // namespace qv
