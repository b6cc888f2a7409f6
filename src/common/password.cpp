#include "common/password.h"

#include <cstring>
#include <resolv.h>

namespace bakjob
{

int password_encode(char *destination, const char *source, std::size_t size)
{
    return b64_ntop(reinterpret_cast<const unsigned char *>(source), std::strlen(source), destination, size);
}

int password_decode(char *destination, const char *source, std::size_t size)
{
    return b64_pton(source, reinterpret_cast<unsigned char *>(destination), size);
}

} // namespace bakjob
