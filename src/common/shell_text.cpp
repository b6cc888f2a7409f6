#include "common/shell_text.h"

#include "common/debug_log.h"
#include "common/text.h"

#include <algorithm>

namespace bakjob
{

namespace
{

constexpr std::size_t JOB_NAME_LENGTH = 127;
constexpr std::string_view LEFT_TO_THE_SHELL = "\"\\|<>*?";        // by escape_path
constexpr std::string_view SHELL_SPECIAL = "\"\\|<>*?$`&(){};[]'"; // anywhere in a word
constexpr std::string_view SPECIAL_IN_FRONT = "#~=^%";             // of a word, to one shell or another
constexpr std::string_view ESCAPED_IN_WORD = "$`#&(){};[]' ";

bool refused(const char *field, const char *why)
{
    DebugLog("ERROR: %s refused: %s\n", field, why);
    return false;
}

bool holds_any(std::string_view text, std::string_view characters)
{
    return text.find_first_of(characters) != std::string_view::npos;
}

bool is_one_word(const char *field, std::string_view text)
{
    if (text.starts_with('-')) return refused(field, "begins with an option's dash");
    return !(holds_control(text) || contains(text, " ")) || refused(field, "blank or control character");
}

// Names are short and come from people: what is special anywhere is refused everywhere. `ending` holds the
// characters that end a name of this kind within rsync's or ssh's own argument.
bool is_safe_name(const char *field, std::string_view name, std::string_view ending)
{
    if (!is_one_word(field, name)) return false;
    if (holds_any(name, SHELL_SPECIAL) || holds_any(name, "#!~")) {
        return refused(field, "character special to the shell");
    }
    return !holds_any(name, ending) || refused(field, "character that ends a name");
}

// A C shell looks for an earlier command behind "!" but at a word's end; others replace "~" behind what looks
// like an assignment.
bool is_special_inside(std::string_view path)
{
    return path.find('!') < path.size() - 1 || contains(path, "=~") || contains(path, ":~");
}

std::string with_backslashes(std::string_view text, std::string_view before)
{
    std::string result;
    for (const char c : text) {
        if (contains(before, {&c, 1})) result += '\\';
        result += c;
    }
    return result;
}

} // namespace

bool is_job_name(std::string_view name)
{
    return !name.empty() && name.size() <= JOB_NAME_LENGTH && name != "." && name != ".." &&
           !holds_control(name) && !holds_any(name, LEFT_TO_THE_SHELL) && !contains(name, "/");
}

std::optional<std::string> shell_path(const char *field, std::string_view path)
{
    if (!path.starts_with('-') && !path.starts_with('~')) return shell_path_part(field, path);
    refused(field, "begins with a dash or a tilde");
    return std::nullopt;
}

std::optional<std::string> shell_path_part(const char *field, std::string_view path)
{
    if (holds_control(path) || holds_any(path, LEFT_TO_THE_SHELL)) {
        refused(field, "character special to the shell");
        return std::nullopt;
    }
    std::string escaped = escape_path(path);
    if (escaped.size() >= PATH_SIZE) {
        refused(field, "too long");
        return std::nullopt;
    }
    return escaped;
}

bool is_plain_for_shells(const char *field, std::string_view path)
{
    if (!is_one_word(field, path)) return false;
    const bool special = holds_any(path, SHELL_SPECIAL) || holds_any(path.substr(0, 1), SPECIAL_IN_FRONT) ||
                         is_special_inside(path);
    return !special || refused(field, "character special to the shell");
}

std::string shell_word(std::string_view job_name)
{
    return with_backslashes(job_name, ESCAPED_IN_WORD);
}

std::string grep_word(std::string_view job_name)
{
    const std::string pattern = with_backslashes(job_name, "\\.[]*^$");
    const bool plain = shell_word(pattern) == pattern && !contains(pattern, "\\");
    return plain ? pattern : in_single_quotes(pattern);
}

bool is_safe_host(std::string_view remote_ip)
{
    // A bracket pair is the caller's to write, around an IPv6 address.
    return is_safe_name("remote_ip", remote_ip, "/@");
}

bool is_safe_rsync_user(std::string_view user)
{
    return is_safe_name("rsync_user", user, "/:");
}

bool is_safe_ssh_user(std::string_view user)
{
    return is_safe_name("ssh_user", user, ":");
}

bool is_safe_port(std::string_view port)
{
    const std::string_view trimmed = port.substr(0, port.find_last_not_of(' ') + 1);
    if (holds_control(trimmed) || contains(trimmed, " ")) {
        return refused("port", "blank or control character");
    }
    return !(holds_any(trimmed, SHELL_SPECIAL) || holds_any(trimmed, "#!~")) ||
           refused("port", "character special to the shell");
}

bool is_base64(const char *field, std::string_view password)
{
    const auto allowed = [](char c) {
        return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
               contains("+/=", {&c, 1});
    };
    return std::all_of(password.begin(), password.end(), allowed) || refused(field, "not base64 text");
}

std::string in_double_quotes(std::string_view text)
{
    return '"' + with_backslashes(text, "$`\"\\") + '"';
}

std::string in_single_quotes(std::string_view text)
{
    std::string quoted = "'";
    for (const char c : text) {
        if (c == '\'') {
            quoted += "'\\''";
        } else {
            quoted += c;
        }
    }
    return quoted + '\'';
}

std::string in_backquotes(std::string_view text)
{
    return with_backslashes(text, "$`\\");
}

} // namespace bakjob
