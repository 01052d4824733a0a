// A short name for a long text.
#ifndef VORN_HOST_TEXT_DIGEST_HPP
#define VORN_HOST_TEXT_DIGEST_HPP

#include <string>
#include <string_view>

namespace host {

// The first 8 bytes of the text's SHA-256 as 16 hexadecimal digits: nobody can make up two texts of
// one digest with little effort. Throws std::bad_alloc when OpenSSL gives none.
std::string text_digest(std::string_view text);

}  // namespace host

#endif
