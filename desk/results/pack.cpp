#include "desk/results/pack.h"

#include <openssl/evp.h>
#include <zlib.h>

#include <array>
#include <climits>

#include "desk/base/failure.h"

namespace qv {

namespace {

constexpr std::size_t kLargest = std::size_t{256} << 20;

unsigned char* Bytes(std::string& text) { return reinterpret_cast<unsigned char*>(text.data()); }
const unsigned char* Bytes(const std::string& text) { return reinterpret_cast<const unsigned char*>(text.data()); }

}  // namespace

std::string Base64(const std::string& bytes) {
  if (bytes.size() > kLargest) throw Failure(kInternalFault, "what is to be stored is larger than 256 MB");
  std::string text(4 * ((bytes.size() + 2) / 3) + 1, '\0');  // the encoder ends it with a zero
  text.resize(static_cast<std::size_t>(EVP_EncodeBlock(Bytes(text), Bytes(bytes), static_cast<int>(bytes.size()))));
  return text;
}

std::string FromBase64(const std::string& text) {
  std::string bytes(3 * (text.size() / 4), '\0');
  const int size =
      text.size() < INT_MAX ? EVP_DecodeBlock(Bytes(bytes), Bytes(text), static_cast<int>(text.size())) : -1;
  if (size < 0 || text.size() % 4 != 0) throw Failure(kWrongUsage, "what should be Base64 is not");
  std::size_t padding = 0;
  while (padding < 2 && padding < text.size() && text[text.size() - 1 - padding] == '=') ++padding;
  bytes.resize(static_cast<std::size_t>(size) - padding);
  return bytes;
}

std::string Pack(const std::string& text, Effort effort) {
  std::string packed(compressBound(text.size()), '\0');
  uLongf size = packed.size();
  if (compress2(Bytes(packed), &size, Bytes(text), text.size(),
                effort == Effort::kFast ? Z_BEST_SPEED : Z_DEFAULT_COMPRESSION) != Z_OK) {
    throw Failure(kInternalFault, "a record can't be compressed");
  }
  packed.resize(size);
  return Base64(packed);
}

std::string Unpack(const std::string& packed) {
  std::string bytes = FromBase64(packed);
  z_stream stream = {};
  stream.next_in = Bytes(bytes);
  stream.avail_in = static_cast<uInt>(bytes.size());
  std::string text;
  std::array<char, 1 << 16> part = {};
  int status = inflateInit(&stream);
  while (status == Z_OK && text.size() <= kLargest) {
    stream.next_out = reinterpret_cast<unsigned char*>(part.data());
    stream.avail_out = part.size();
    status = inflate(&stream, Z_NO_FLUSH);
    text.append(part.data(), part.size() - stream.avail_out);
  }
  inflateEnd(&stream);
  if (status != Z_STREAM_END) throw Failure(kInternalFault, "a stored record can't be unpacked: it is damaged");
  return text;
}

}  // namespace qv
