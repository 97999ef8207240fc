#include "desk/base/text.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <numeric>
#include <sstream>

namespace qv {

namespace {

// Bytes of the UTF-8 character that starts there, 0 where none does (overlong forms and surrogates among them).
std::size_t CharacterBytes(const std::string& text, std::size_t at) {
  const auto byte = [&](std::size_t i) { return i < text.size() ? static_cast<unsigned char>(text[i]) : 0U; };
  const unsigned first = byte(at);
  const std::size_t bytes = first < 0x80   ? 1
                            : first < 0xC2 ? 0
                            : first < 0xE0 ? 2
                            : first < 0xF0 ? 3
                            : first < 0xF5 ? 4
                                           : 0;
  for (std::size_t i = 1; i < bytes; ++i) {
    if ((byte(at + i) & 0xC0U) != 0x80U) return 0;
  }
  const unsigned second = byte(at + 1);
  const bool refused = (first == 0xE0 && second < 0xA0) || (first == 0xED && second >= 0xA0) ||
                       (first == 0xF0 && second < 0x90) || (first == 0xF4 && second >= 0x90);
  return refused ? 0 : bytes;
}

// Levenshtein's distance: how many letters to insert, delete or replace.
std::size_t Edits(const std::string& from, const std::string& to) {
  std::vector<std::size_t> row(to.size() + 1);
  std::iota(row.begin(), row.end(), std::size_t{0});
  for (std::size_t i = 0; i < from.size(); ++i) {
    std::size_t diagonal = row[0];
    row[0] = i + 1;
    for (std::size_t k = 0; k < to.size(); ++k) {
      const std::size_t replaced = diagonal + (from[i] == to[k] ? 0 : 1);
      diagonal = row[k + 1];
      row[k + 1] = std::min({replaced, row[k] + 1, row[k + 1] + 1});
    }
  }
  return row.back();
}

}  // namespace

std::string Format(const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  va_list again;
  va_copy(again, arguments);
  const int length = std::vsnprintf(nullptr, 0, format, arguments);
  va_end(arguments);
  std::string text(static_cast<std::size_t>(std::max(length, 0)), '\0');
  std::vsnprintf(text.data(), text.size() + 1, format, again);
  va_end(again);
  return text;
}

std::string Printable(const std::string& text) {
  std::string shown;
  for (std::size_t i = 0; i < text.size();) {
    const std::size_t bytes = CharacterBytes(text, i);
    const auto first = static_cast<unsigned char>(text[i]);
    // C1 controls, U+0080 to U+009F, are two bytes in UTF-8.
    const bool control = first < 0x20 || first == 0x7F ||
                         (bytes == 2 && first == 0xC2 && static_cast<unsigned char>(text[i + 1]) < 0xA0);
    const std::size_t taken = std::max<std::size_t>(bytes, 1);
    if (bytes == 0 || control) {
      for (std::size_t k = 0; k < taken; ++k) shown += Format("\\x%02x", static_cast<unsigned char>(text[i + k]));
    } else {
      shown.append(text, i, taken);
    }
    i += taken;
  }
  return shown;
}

std::string Shortened(const std::string& text, std::size_t most) {
  if (text.size() <= most) return text;
  std::size_t end = most < 3 ? 0 : most - 3;
  while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0U) == 0x80U) --end;
  return text.substr(0, end) + "...";
}

std::string DidYouMean(const std::string& word, const std::vector<std::string>& known) {
  constexpr std::size_t kLongest = 80;  // no name is longer
  if (word.size() > kLongest) return "";
  std::size_t fewest = std::max<std::size_t>(1, word.size() / 3) + 1;
  const std::string* nearest = nullptr;
  for (const std::string& name : known) {
    const bool begins = std::min(word.size(), name.size()) >= 3 && (word.find(name) == 0 || name.find(word) == 0);
    const std::size_t edits = begins ? 1 : Edits(word, name);
    if (edits < fewest) {
      fewest = edits;
      nearest = &name;
    }
  }
  return nearest == nullptr ? "" : "; did you mean \"" + *nearest + "\"?";
}

std::string Wrapped(const std::string& text, std::size_t width, std::size_t indent) {
  std::string lines;
  std::size_t length = 0;
  std::istringstream words(text);
  for (std::string word; words >> word;) {
    const std::size_t more = TextWidth(word);
    const bool fits = length + 1 + more <= width;
    lines += (lines.empty() ? "" : fits ? " " : "\n" + std::string(indent, ' ')) + word;
    length = fits && length > 0 ? length + 1 + more : more;
  }
  return lines;
}

std::size_t TextWidth(const std::string& text) {
  return static_cast<std::size_t>(
      std::count_if(text.begin(), text.end(), [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) != 0x80U; }));
}

std::string Count(std::size_t count, const std::string& one, const std::string& many) {
  const std::string& plural = many.empty() ? one + "s" : many;
  return std::to_string(count) + " " + (count == 1 ? one : plural);
}

}  // namespace qv
