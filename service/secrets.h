// secrets.h - comparing passwords that clients give.
#pragma once

#include <string_view>

#include <openssl/crypto.h>

namespace service {

// In a time that does not reveal where the texts differ.
inline bool same_secret(std::string_view given, std::string_view expected)
{
    return given.size() == expected.size() && CRYPTO_memcmp(given.data(), expected.data(), given.size()) == 0;
}

} // namespace service
