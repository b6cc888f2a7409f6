#include "xml_tree.h"

#include <cstring>
#include <new>
#include <utility>

using pugi::xml_node;

namespace device
{
namespace
{

constexpr const char *ROOT_NAME = "config";

// Written with one blank for each level, a tree of a few kilobytes that is nested further and further takes
// gigabytes.
constexpr int MAX_LEVELS = 100;

// Values keep every byte: no trimming, no conversion of line ends. What a person adds by hand stays as well.
constexpr unsigned PARSE_FLAGS = pugi::parse_cdata | pugi::parse_escapes | pugi::parse_ws_pcdata_single |
                                 pugi::parse_comments | pugi::parse_declaration | pugi::parse_doctype |
                                 pugi::parse_pi;

bool is_text(xml_node node)
{
    return node.type() == pugi::node_pcdata || node.type() == pugi::node_cdata;
}

bool is_too_deep(const pugi::xml_document &document)
{
    int level = 0;
    xml_node node = document.first_child();
    while (node) {
        if (const xml_node child = node.first_child()) {
            if (++level > MAX_LEVELS) return true;
            node = child;
            continue;
        }
        while (node && !node.next_sibling()) {
            node = node.parent();
            --level;
        }
        if (node) node = node.next_sibling();
    }
    return false;
}

struct StringWriter : pugi::xml_writer {
    std::string text;
    void write(const void *data, size_t size) override { text.append(static_cast<const char *>(data), size); }
};

} // namespace

const char *parse_tree(pugi::xml_document &document, const std::string &text)
{
    // What the parser would not keep as it is.
    if (text.find('\0') != std::string::npos) return "it holds a NUL byte";
    if (text.find("<!ENTITY") != std::string::npos) return "it declares entities";
    const auto result = document.load_buffer(text.data(), text.size(), PARSE_FLAGS, pugi::encoding_utf8);
    if (result.status == pugi::status_out_of_memory) throw std::bad_alloc();
    if (!result) return result.description();
    if (std::strcmp(document.document_element().name(), ROOT_NAME) != 0) return "the root is not <config>";
    return is_too_deep(document) ? "its elements are nested too deep" : nullptr;
}

std::string_view value_of(xml_node node)
{
    static std::string joined;
    int pieces = 0;
    xml_node first;
    for (const xml_node child : node.children()) {
        if (!is_text(child)) continue;
        if (++pieces == 1) first = child;
        if (pieces == 2) joined = first.value();
        if (pieces >= 2) joined += child.value();
    }
    return pieces > 1 ? std::string_view(joined) : first.value();
}

bool set_value(xml_node node, const char *text)
{
    if (!node.text().set(text)) return false;
    xml_node child = node.first_child();
    while (child && !is_text(child)) {
        child = child.next_sibling();
    }
    while (child) {
        const xml_node next = child.next_sibling();
        const bool is_rest = is_text(next);
        if (is_rest) {
            node.remove_child(next);
        } else {
            child = next;
        }
    }
    return true;
}

xml_node plain_child(xml_node parent, std::string_view name)
{
    for (const xml_node child : parent.children()) {
        if (child.type() == pugi::node_element && child.name() == name) return child;
    }
    return {};
}

xml_node append_element(xml_node parent, const char *name)
{
    xml_node child = parent.append_child(pugi::node_element);
    if (!child || child.set_name(name)) return child;
    parent.remove_child(child);
    return {};
}

std::string text_of(const pugi::xml_document &document)
{
    StringWriter writer;
    document.save(writer, " ", pugi::format_default, pugi::encoding_utf8);
    return std::move(writer.text);
}

std::string raw_text_of(xml_node node)
{
    StringWriter writer;
    node.print(writer, "", pugi::format_raw, pugi::encoding_utf8);
    return std::move(writer.text);
}

} // namespace device
