#pragma once

// Passwords as base64 text (RFC 4648): a form to carry them in, not a secret.

#include <cstddef>

namespace bakjob
{

inline constexpr std::size_t PASSWORD_SIZE = 128; // bytes of a password field, terminator included
inline constexpr std::size_t MAX_ENCODED_PASSWORD =
    (PASSWORD_SIZE - 1) / 4 * 3; // whose base64 text fits there
inline constexpr const char *DEFAULT_DAEMON_PASSWORD = "pakto";

// The length of the base64 text of `source` written to `destination` with its terminator, or -1 when it does
// not fit in `size` bytes: up to MAX_ENCODED_PASSWORD bytes fit PASSWORD_SIZE.
int password_encode(char *destination, const char *source, std::size_t size);

// The number of bytes decoded into `destination`, without a terminator: the caller zeroes it beforehand. -1
// for text that is not base64 or does not fit; some bytes may then have been written.
int password_decode(char *destination, const char *source, std::size_t size);

} // namespace bakjob
