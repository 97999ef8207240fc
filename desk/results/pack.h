#ifndef QVTESTER_DESK_RESULTS_PACK_H_
#define QVTESTER_DESK_RESULTS_PACK_H_

#include <string>

namespace qv {

/// RFC 4648, without line ends.
std::string Base64(const std::string& bytes);
/// Throws Failure (wrong usage) where the text is none.
std::string FromBase64(const std::string& text);

/// zlib's format in Base64, so that it is plain text in every database.
enum class Effort { kFast, kSmall };
std::string Pack(const std::string& text, Effort effort = Effort::kFast);
/// Throws Failure (internal fault) where it was not packed, or is over 256 MB.
std::string Unpack(const std::string& packed);

}  // namespace qv

#endif  // QVTESTER_DESK_RESULTS_PACK_H_
