#ifndef QVTESTER_DESK_BASE_DIGEST_H_
#define QVTESTER_DESK_BASE_DIGEST_H_

#include <string>

namespace qv {

/// Lower-case hexadecimal digest; `algorithm` as OpenSSL names it ("SHA256", "SHA1").
std::string HexDigest(const std::string& content, const char* algorithm);

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_DIGEST_H_
