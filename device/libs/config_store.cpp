// The configuration store: the tree of one XML file, whose root element is <config>.
//
// Other processes write the file too. As long as this process has no unsaved change of its own, the file is
// looked at before a change, and before a read of a path without a numbered step, and read again when it is
// another one. Reads through a numbered step, "item:3/name", take the tree as it is: whoever walks a list has
// read its count before, and must see the whole walk in one tree.

#include "platform/config_store.h"

#include "atomic_file.h"
#include "common/handles.h"
#include "list_cursors.h"
#include "store.h"
#include "store_path.h"
#include "store_paths.h"

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <pugixml.hpp>
#include <sys/stat.h>

using bakjob::UniqueFd;
using pugi::xml_node;

namespace device
{
namespace
{

constexpr const char *ROOT_NAME = "config";

// Values keep every byte: no trimming, no conversion of line ends. What a person adds by hand stays as well.
constexpr unsigned PARSE_FLAGS = pugi::parse_cdata | pugi::parse_escapes | pugi::parse_ws_pcdata_single |
                                 pugi::parse_comments | pugi::parse_declaration | pugi::parse_doctype |
                                 pugi::parse_pi;

struct FileVersion {
    int error = 0; // of looking at it; ENOENT when there is no file
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    time_t seconds = 0;
    long nanoseconds = 0;

    bool operator==(const FileVersion &) const = default;
};

FileVersion version_of(const struct stat &status)
{
    return {0, status.st_dev, status.st_ino, status.st_size, status.st_mtim.tv_sec, status.st_mtim.tv_nsec};
}

FileVersion current_version()
{
    struct stat status = {};
    if (stat(STORE_FILE, &status) < 0) return {.error = errno};
    return version_of(status);
}

struct Store {
    enum class State { NOT_READ, GOOD, DAMAGED };

    State state = State::NOT_READ;
    bool unsaved = false;
    FileVersion version;
    UniqueFd file; // stays open, so that no later file can have the same inode
    FileVersion complained_about;
    pugi::xml_document document;
    ListCursors cursors;
    RecordCursor record;

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

const char *parse(const std::string &text)
{
    pugi::xml_document &document = store().document;
    const auto result = document.load_buffer(text.data(), text.size(), PARSE_FLAGS, pugi::encoding_utf8);
    if (!result) return result.description();
    if (std::strcmp(document.document_element().name(), ROOT_NAME) != 0) return "the root is not <config>";
    return nullptr;
}

// Opens and parses the file. The result is why that failed, or null.
const char *load()
{
    Store &s = store();
    // A fifo in its place must not make us wait.
    s.file = UniqueFd(open(STORE_FILE, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (!s.file) {
        s.version = {.error = errno};
        return errno == ENOENT ? nullptr : std::strerror(errno);
    }
    struct stat status = {};
    if (fstat(s.file.get(), &status) < 0) return std::strerror(errno);
    s.version = version_of(status);
    if (!S_ISREG(status.st_mode)) return "not a regular file";
    std::string text;
    if (!read_whole(s.file.get(), text)) return std::strerror(errno);
    return parse(text);
}

void read_file()
{
    Store &s = store();
    s.forget_nodes();
    s.document.reset();
    s.unsaved = false;
    const char *const why = load();
    s.state = why ? Store::State::DAMAGED : Store::State::GOOD;
    if (why) {
        complain(s.version, why);
        s.document.reset();
    }
}

void look_at_file()
{
    const Store &s = store();
    if (s.unsaved) return;
    if (s.state == Store::State::NOT_READ || s.version != current_version()) read_file();
}

void drop_tree()
{
    store().state = Store::State::NOT_READ;
    store().unsaved = false;
}

xml_node plain_child(xml_node parent, std::string_view name)
{
    for (const xml_node child : parent.children()) {
        if (child.type() == pugi::node_element && child.name() == name) return child;
    }
    return {};
}

// The node of a path, made when missing if `create` says so. Null when there is none.
xml_node resolve(const StorePath &path, bool create)
{
    Store &s = store();
    if (path.depth == 0 || s.state != Store::State::GOOD) return {};
    xml_node node = s.document.document_element();
    if (!node && create) node = s.document.append_child(ROOT_NAME);
    xml_node parent;
    for (const Step &step : path.used()) {
        parent = node;
        if (step.index > 0) {
            node = s.cursors.numbered_child(parent, step.name, step.index, create);
        } else {
            node = plain_child(parent, step.name);
            if (!node && create) node = parent.append_child(std::string(step.name).c_str());
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
    if (!path.numbered() || store().state != Store::State::GOOD) look_at_file();
    return resolve(path, false);
}

xml_node find_or_make(const char *path_text)
{
    look_at_file();
    if (const char *const key = key_of_latest_record(path_text)) return store().record.key(key, true);
    return resolve(parse_store_path(path_text), true);
}

struct StringWriter : pugi::xml_writer {
    std::string text;
    void write(const void *data, size_t size) override { text.append(static_cast<const char *>(data), size); }
};

std::string as_file()
{
    StringWriter writer;
    store().document.save(writer, " ", pugi::format_default, pugi::encoding_utf8);
    return std::move(writer.text);
}

void adopt_version(UniqueFd file)
{
    Store &s = store();
    struct stat status = {};
    if (fstat(file.get(), &status) < 0) return drop_tree();
    s.unsaved = false;
    s.version = version_of(status);
    s.file = std::move(file);
}

} // namespace

std::optional<std::string> store_text(const std::string &path)
{
    const xml_node node = find(path.c_str());
    if (!node) return std::nullopt;
    return node.text().get();
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
    if (!node || !buffer) return -1;
    if (size <= 0) return 0;
    const std::string_view text = node.text().get();
    const std::size_t length = std::min(text.size(), static_cast<std::size_t>(size) - 1);
    text.copy(buffer, length);
    buffer[length] = '\0';
    return 0;
}

int xml_get_int(const char *path)
{
    const char *const text = find(path).text().get();
    char *end = nullptr;
    const long value = std::strtol(text, &end, 10);
    if (end == text) return -1;
    return static_cast<int>(std::clamp<long>(value, INT_MIN, INT_MAX));
}

int xml_set_str(const char *path, const char *text)
{
    if (!path || !text) return -1;
    const xml_node node = find_or_make(path);
    if (!node) return -1;
    store().unsaved = true;
    return node.text().set(text) ? 0 : -1;
}

int xml_set_int(const char *path, int value)
{
    return xml_set_str(path, std::to_string(value).c_str());
}

int xml_del(const char *path)
{
    if (!path) return -1;
    look_at_file();
    const xml_node node = resolve(parse_store_path(path), false);
    if (!node || !node.parent().remove_child(node)) return -1;
    store().forget_nodes();
    store().unsaved = true;
    return 0;
}

// When the store's own file cannot be written, the changes that were meant for it go: kept, they would
// overwrite with a later success what others wrote in the meantime.
int xml_write_file(const char *file_name)
{
    if (!file_name || !store_usable()) return -1;
    if (!store().document.document_element()) store().document.append_child(ROOT_NAME);
    const bool is_own_file = std::strcmp(file_name, STORE_FILE) == 0;
    UniqueFd file = replace_file(file_name, as_file(), 0600);
    if (!file) {
        std::fprintf(stderr, "config store: cannot write %s: %s\n", file_name, std::strerror(errno));
        if (is_own_file) drop_tree();
        return -1;
    }
    if (is_own_file) adopt_version(std::move(file));
    return 0;
}
