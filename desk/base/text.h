#ifndef QVTESTER_DESK_BASE_TEXT_H_
#define QVTESTER_DESK_BASE_TEXT_H_

#include <string>
#include <vector>

namespace qv {

/// printf into a string.
std::string Format(const char* format, ...) __attribute__((format(printf, 1, 2)));

/// The text as a terminal may see it: control characters, and bytes that are no UTF-8, stand as \x1b and the like.
std::string Printable(const std::string& text);

/// At most so many bytes; a longer text ends in "...", cut between characters.
std::string Shortened(const std::string& text, std::size_t most);

/// "; did you mean \"limits\"?" with the known name that is nearest by edits, or nothing when none is near.
std::string DidYouMean(const std::string& word, const std::vector<std::string>& known);

/// In lines of at most that width, broken between words; the second and further ones begin with so many blanks, which
/// don't count.
std::string Wrapped(const std::string& text, std::size_t width, std::size_t indent = 0);

/// Characters of a UTF-8 text: how wide it stands in a table.
std::size_t TextWidth(const std::string& text);

/// "1 photo", "2 photos"; a plural of its own where an s does not make one.
std::string Count(std::size_t count, const std::string& one, const std::string& many = "");

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_TEXT_H_
