// bench_parse_and_write FILE COPY: for what a process needs that does nothing else.

#include "bare_store.h"

int main(int argc, char **argv)
{
    return argc == 3 && parse_and_write(argv[1], argv[2]) ? 0 : 1;
}
