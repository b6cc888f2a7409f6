// Passwords to and from base64.

#include "common/password.h"
#include "common/text.h"
#include "fuzz.h"

#include <algorithm>
#include <cctype>
#include <cstring>

using namespace bakjob;

namespace
{

constexpr std::size_t LONGEST = 93;
constexpr char UNTOUCHED = '\x5a';

// The C library's own routines do the work, unseen by the sanitizers: the bytes behind the field tell.
struct Guarded {
    char field[PASSWORD_SIZE];
    char behind[64];

    Guarded()
    {
        std::memset(field, 0, sizeof field);
        std::memset(behind, UNTOUCHED, sizeof behind);
    }
    void check() const
    {
        const auto untouched = [](char c) { return c == UNTOUCHED; };
        must(std::all_of(std::begin(behind), std::end(behind), untouched), "nothing is written past a field");
    }
};

void check_encoding(const std::string &password)
{
    Guarded encoded;
    const int length = password_encode(encoded.field, password.c_str(), sizeof encoded.field);
    encoded.check();
    must((length >= 0) == (password.size() <= LONGEST), "what fits is encoded, and nothing else");
    if (length < 0) return;
    must(is_terminated(encoded.field) && std::strlen(encoded.field) == static_cast<std::size_t>(length) &&
             static_cast<std::size_t>(length) == (password.size() + 2) / 3 * 4,
         "the text is as long as is said");
    Guarded decoded;
    const int bytes = password_decode(decoded.field, encoded.field, sizeof decoded.field);
    decoded.check();
    must(bytes >= 0 && std::string_view(decoded.field, static_cast<std::size_t>(bytes)) == password,
         "a password comes back");
}

void check_decoding(const std::string &text)
{
    Guarded decoded;
    const int bytes = password_decode(decoded.field, text.c_str(), sizeof decoded.field);
    decoded.check();
    if (bytes < 0) return;
    must(static_cast<std::size_t>(bytes) <= sizeof decoded.field, "no more bytes than fit");
    const std::string password(decoded.field, static_cast<std::size_t>(bytes));
    if (password.size() > LONGEST || contains(password, std::string_view("\0", 1))) return;
    std::string plain = text;
    std::erase_if(plain, [](unsigned char c) { return std::isspace(c) != 0; });
    Guarded encoded;
    password_encode(encoded.field, password.c_str(), sizeof encoded.field);
    must(plain == encoded.field, "one password has one base64 text");
}

} // namespace

void check(std::string_view text)
{
    const std::string password(text.substr(0, text.find('\0')));
    check_encoding(password);
    check_decoding(password);
}
