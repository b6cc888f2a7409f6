// The configuration store: the tree of one XML file, whose root element is <config>.
//
// Other processes write the file, too. While this process has no unsaved change, the file is checked before a
// change, and before a read of a path without a numbered step, and is read again when it is a new one. Reads
// through a numbered step, "item:3/name", use the tree as it is: a walk through a list begins with its count,
// and must see one tree to its end.
//
// What was read from one tree must not be changed in another. So a list that was read, and has changed since
// in the file, takes no change until it is read again, and a write replaces only the file that was read.

#include "platform/config_store.h"

#include "atomic_file.h"
#include "list_cursors.h"
#include "read_lists.h"
#include "store.h"
#include "store_file.h"
#include "store_path.h"
#include "store_paths.h"
#include "xml_tree.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <new>
#include <pugixml.hpp>

using pugi::xml_node;

namespace device
{
namespace
{

constexpr const char *ROOT_NAME = "config";

struct Store {
    enum class State { NOT_READ, GOOD, DAMAGED };

    State state = State::NOT_READ;
    bool unsaved = false;
    bool broken = false; // a change failed: the tree is neither the old one nor the new one
    StoreFile file;      // that the tree is from
    FileVersion complained_about;
    pugi::xml_document document;
    ListCursors cursors;
    RecordCursor record;
    ReadLists lists;

    void forget_nodes()
    {
        cursors.forget();
        record.forget();
    }
};

Store &store()
{
    static Store the_store;
    return the_store;
}

void complain(const FileVersion &version, const char *why)
{
    if (version == store().complained_about) return;
    store().complained_about = version;
    std::fprintf(stderr, "config store: %s: %s\n", STORE_FILE, why);
}

// Null, or why the tree cannot be used.
const char *load()
{
    Store &s = store();
    try {
        std::string text;
        if (const char *const why = read_store_file(s.file, text)) return why;
        return s.file.file ? parse_tree(s.document, text) : nullptr;
    } catch (const std::bad_alloc &) {
        s.file.version = {.error = -1};
        return std::strerror(ENOMEM);
    }
}

void read_file()
{
    Store &s = store();
    const ListTexts before = texts_of(s.lists.current(), s.document.document_element());
    s.forget_nodes();
    s.document.reset();
    s.unsaved = s.broken = false;
    const char *const why = load();
    s.state = why ? Store::State::DAMAGED : Store::State::GOOD;
    if (why) {
        complain(s.file.version, why);
        s.document.reset();
    }
    const auto same = unchanged(before, s.document.document_element());
    s.lists.tree_changed([&](const std::string &list) { return same.contains(list); });
}

void look_at_file()
{
    const Store &s = store();
    if (s.unsaved && !s.broken) return;
    if (s.broken || s.state == Store::State::NOT_READ || s.file.version != current_version()) read_file();
}

void drop_tree()
{
    store().state = Store::State::NOT_READ;
    store().unsaved = store().broken = false;
}

bool takes_change(const char *path)
{
    look_at_file();
    const Store &s = store();
    return s.state == Store::State::GOOD && !s.broken && !s.lists.outdated(path);
}

// The node of a path, created when missing if `create` says so; else null.
xml_node resolve(const StorePath &path, bool create)
{
    Store &s = store();
    if (path.depth == 0 || s.state != Store::State::GOOD) return {};
    xml_node node = s.document.document_element();
    if (!node && create) node = append_element(s.document, ROOT_NAME);
    xml_node parent;
    for (const Step &step : path.used()) {
        parent = node;
        if (step.index > 0) {
            node = s.cursors.numbered_child(parent, step.name, step.index, create);
        } else {
            node = plain_child(parent, step.name);
            if (!node && create) node = append_element(parent, std::string(step.name).c_str());
        }
        if (!node) break;
    }
    const std::string_view record = path.record();
    if (node && !record.empty()) s.record.enter(record, parent);
    return node;
}

// The last step of a path to a key of the record that was looked up last; null for other paths.
const char *key_of_latest_record(const char *path)
{
    const Store &s = store();
    const char *const slash = std::strrchr(path, '/');
    if (s.state != Store::State::GOOD || !slash || !s.record.is_at({path, slash})) return nullptr;
    return is_node_name(slash + 1) ? slash + 1 : nullptr;
}

xml_node find(const char *path_text)
{
    if (!path_text) return {};
    if (const char *const key = key_of_latest_record(path_text)) return store().record.key(key, false);
    const StorePath path = parse_store_path(path_text);
    if (!path.numbered()) {
        look_at_file();
        store().lists.read(path_text);
    } else if (store().state == Store::State::NOT_READ) {
        look_at_file();
    }
    return resolve(path, false);
}

xml_node find_or_make(const char *path_text)
{
    if (!takes_change(path_text)) return {};
    if (const char *const key = key_of_latest_record(path_text)) return store().record.key(key, true);
    return resolve(parse_store_path(path_text), true);
}

// A change that fails half way, or without memory, spoils the tree.
template <class Change>
int change(const Change &make)
{
    Store &s = store();
    try {
        const int answer = make();
        s.unsaved |= answer == 0;
        s.broken |= answer == XML_UNREADABLE;
        return answer;
    } catch (const std::bad_alloc &) {
        s.broken = true;
        return XML_UNREADABLE;
    }
}

// When the store's own file cannot be written, its unsaved changes are dropped: a later write would put them
// over what others have written meanwhile.
const char *write_own_file()
{
    Store &s = store();
    const char *why = nullptr;
    if (s.broken) {
        why = "a change could not be made";
    } else if (s.state != Store::State::GOOD) {
        why = "it could not be read";
    } else {
        why = replace_store_file(s.file, text_of(s.document));
    }
    if (why) drop_tree();
    s.unsaved = false;
    return why;
}

const char *write_file(const char *file_name)
{
    if (!store().document.document_element() && !append_element(store().document, ROOT_NAME)) {
        return std::strerror(ENOMEM);
    }
    if (std::strcmp(file_name, STORE_FILE) == 0) return write_own_file();
    const Replaced replaced = replace_file(file_name, text_of(store().document), {.mode = 0600});
    return replaced.on_disk ? nullptr : std::strerror(errno);
}

const char *write_or_say_why(const char *file_name)
{
    try {
        return write_file(file_name);
    } catch (const std::bad_alloc &) {
        drop_tree();
        return std::strerror(ENOMEM);
    }
}

} // namespace

std::optional<std::string> store_text(const std::string &path)
{
    const xml_node node = find(path.c_str());
    if (!node) return std::nullopt;
    return std::string(value_of(node));
}

bool store_usable()
{
    look_at_file();
    return store().state == Store::State::GOOD;
}

} // namespace device

using namespace device;

int xml_get_str(const char *path, int size, char *buffer)
{
    const xml_node node = find(path);
    if (store().state != Store::State::GOOD) return XML_UNREADABLE;
    if (!node || !buffer) return -1;
    if (size <= 0) return 0;
    const std::string_view text = value_of(node);
    const std::size_t length = std::min(text.size(), static_cast<std::size_t>(size) - 1);
    text.copy(buffer, length);
    buffer[length] = '\0';
    return 0;
}

int xml_get_int(const char *path)
{
    const char *const text = value_of(find(path)).data(); // ends with a zero byte
    char *end = nullptr;
    const long value = std::strtol(text, &end, 10);
    if (end == text) return -1;
    return static_cast<int>(std::clamp<long>(value, INT_MIN, INT_MAX));
}

int xml_set_str(const char *path, const char *text)
{
    if (!path || !text || parse_store_path(path).depth == 0) return -1;
    return change([&] {
        const xml_node node = find_or_make(path);
        return node && set_value(node, text) ? 0 : XML_UNREADABLE;
    });
}

int xml_set_int(const char *path, int value)
{
    return xml_set_str(path, std::to_string(value).c_str());
}

int xml_del(const char *path)
{
    if (!path) return -1;
    return change([&] {
        if (!takes_change(path)) return XML_UNREADABLE;
        const xml_node node = resolve(parse_store_path(path), false);
        if (!node || !node.parent().remove_child(node)) return -1;
        store().forget_nodes();
        return 0;
    });
}

int xml_write_file(const char *file_name)
{
    if (!file_name) return -1;
    if (!store().broken && !store().unsaved && !store_usable()) return -1;
    const char *const why = write_or_say_why(file_name);
    if (!why) return 0;
    std::fprintf(stderr, "config store: cannot write %s: %s\n", file_name, why);
    return -1;
}
