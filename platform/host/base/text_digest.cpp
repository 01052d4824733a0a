#include "base/text_digest.hpp"

#include <openssl/evp.h>

#include <array>
#include <new>

namespace host {

std::string text_digest(std::string_view text) {
  constexpr char kDigits[] = "0123456789abcdef";
  constexpr std::size_t kBytes = 8;
  std::array<unsigned char, EVP_MAX_MD_SIZE> digest{};
  if (EVP_Digest(text.data(), text.size(), digest.data(), nullptr, EVP_sha256(), nullptr) != 1) {
    throw std::bad_alloc();
  }
  std::string digits;
  for (std::size_t i = 0; i < kBytes; ++i) {
    digits += {kDigits[digest[i] >> 4U], kDigits[digest[i] & 15U]};
  }
  return digits;
}

}  // namespace host
