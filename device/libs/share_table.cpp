// The table of network shares, laid out as the share library does: a block that points to the first of a
// chain of records.

#include "platform/config_store.h"
#include "platform/device.h"
#include "store.h"

#include <cstring>
#include <new>
#include <optional>
#include <string>
#include <vector>

using bakjob::SHARE_NAME;
using bakjob::SHARE_NEXT;
using bakjob::SHARE_PATH;
using bakjob::SHARE_TABLE_FIRST;
using device::store_text;

char *pss = nullptr;

namespace
{

constexpr std::size_t MAX_TEXT = 1024;

using Bytes = std::vector<char>;

const std::string SHARES = "/system_mgr/samba/share";

// The block, and the records behind it.
std::vector<Bytes> &table()
{
    static std::vector<Bytes> the_table;
    return the_table;
}

void put_pointer(Bytes &bytes, std::size_t offset, const char *pointer)
{
    std::memcpy(bytes.data() + offset, &pointer, sizeof pointer);
}

void put_text(Bytes &bytes, std::size_t offset, const std::string &text)
{
    text.copy(bytes.data() + offset, text.size());
}

// Nullopt when there is no share of that number, or the record cannot hold it.
std::optional<Bytes> read_share(int number)
{
    const std::string item = SHARES + "/item:" + std::to_string(number);
    const auto name = store_text(item + "/name");
    const auto path = store_text(item + "/path");
    if (!name || !path || name->size() > MAX_TEXT || path->size() > MAX_TEXT) return std::nullopt;
    Bytes record(SHARE_NEXT + sizeof(char *), '\0');
    put_text(record, SHARE_NAME, *name);
    put_text(record, SHARE_PATH, *path);
    return record;
}

void load_table()
{
    std::vector<Bytes> loaded;
    loaded.emplace_back(SHARE_TABLE_FIRST + sizeof(char *), '\0');
    const int count = xml_get_int((SHARES + "/count").c_str());
    for (int number = 1; number <= count; ++number) {
        if (auto record = read_share(number)) loaded.push_back(std::move(*record));
    }
    for (std::size_t i = 1; i < loaded.size(); ++i) {
        put_pointer(loaded[i - 1], i == 1 ? SHARE_TABLE_FIRST : SHARE_NEXT, loaded[i].data());
    }
    table() = std::move(loaded);
    pss = table().front().data();
}

} // namespace

int get_samba_info(void)
{
    Free_All_List();
    try {
        load_table();
    } catch (const std::bad_alloc &) {
        return -1;
    }
    return 0;
}

void Free_All_List(void)
{
    pss = nullptr;
    table() = {};
}
