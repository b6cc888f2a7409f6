#pragma once

// A job's list of folders, cut into entries.

namespace bakjob
{

struct FolderTable {
    static constexpr int SIZE = 10;
    static constexpr int WIDTH = 260; // bytes of an entry, terminator included

    char entries[SIZE][WIDTH];
    int count;    // entries filled
    int left_out; // folders that did not fit: too many or too long
};

// Cuts the text in place at any of the separators, as strtok does: no empty entries. Returns the number of
// entries filled.
int rsync_split_list(char *text, const char *separators, FolderTable &table);

} // namespace bakjob
