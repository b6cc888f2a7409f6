// To be preloaded: the allocation number FAIL_AT of the process fails, with FAIL_ON in the environment also
// all behind it. At the end the file FAIL_COUNT, if named, gets the number of allocations.

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstdlib>

extern "C" {
void *__libc_malloc(std::size_t size);
void *__libc_calloc(std::size_t number, std::size_t size);
void *__libc_realloc(void *memory, std::size_t size);
}

namespace
{

std::atomic<long> allocations = 0;

bool fails()
{
    static const char *const at = std::getenv("FAIL_AT");
    static const long first = at == nullptr ? 0 : std::atol(at);
    static const bool on = std::getenv("FAIL_ON") != nullptr;
    const long number = ++allocations;
    const bool failing = first > 0 && (number == first || (on && number > first));
    if (failing) errno = ENOMEM;
    return failing;
}

__attribute__((destructor)) void tell()
{
    const long number = allocations;
    const char *const path = std::getenv("FAIL_COUNT");
    std::FILE *const file = path == nullptr ? nullptr : std::fopen(path, "w");
    if (file == nullptr) return;
    std::fprintf(file, "%ld\n", number);
    std::fclose(file);
}

} // namespace

extern "C" {

void *malloc(std::size_t size)
{
    return fails() ? nullptr : __libc_malloc(size);
}

void *calloc(std::size_t number, std::size_t size)
{
    return fails() ? nullptr : __libc_calloc(number, size);
}

void *realloc(void *memory, std::size_t size)
{
    return fails() ? nullptr : __libc_realloc(memory, size);
}
}
