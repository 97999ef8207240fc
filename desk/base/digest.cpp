#include "desk/base/digest.h"

#include <openssl/evp.h>

#include "desk/base/text.h"

namespace qv {

std::string HexDigest(const std::string& content, const char* algorithm) {
  unsigned char digest[EVP_MAX_MD_SIZE];
  unsigned int length = 0;
  EVP_Digest(content.data(), content.size(), digest, &length, EVP_get_digestbyname(algorithm), nullptr);
  std::string text;
  for (unsigned int i = 0; i < length; ++i) text += Format("%02x", digest[i]);
  return text;
}

}  // namespace qv
