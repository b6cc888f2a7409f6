#include "common/folder_table.h"

#include "common/text.h"

#include <cstring>

namespace bakjob
{

int rsync_split_list(char *text, const char *separators, FolderTable &table)
{
    table = {};
    char *rest = nullptr;
    for (const char *entry = strtok_r(text, separators, &rest); entry != nullptr;
         entry = strtok_r(nullptr, separators, &rest)) {
        if (table.count < FolderTable::SIZE && copy_text(table.entries[table.count], entry)) {
            ++table.count;
        } else {
            ++table.left_out;
        }
    }
    return table.count;
}

} // namespace bakjob
