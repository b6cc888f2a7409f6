#include "common/shell_text.h"

#include "common/job_name.h"
#include "common/text.h"

#include <algorithm>

namespace bakjob
{

namespace
{

constexpr std::string_view LEFT_TO_THE_SHELL = "\"\\|<>*?";        // by escape_path
constexpr std::string_view SHELL_SPECIAL = "\"\\|<>*?$`&(){};[]'"; // anywhere in a word
constexpr std::string_view SPECIAL_IN_FRONT = "#~=^%";             // of a word, to one shell or another
constexpr std::string_view SPECIAL = "character special to the shell";
constexpr std::string_view ESCAPED_IN_WORD = "$`#&(){};[]' ";

bool holds_any(std::string_view text, std::string_view characters)
{
    return text.find_first_of(characters) != std::string_view::npos;
}

Refusal refusal_of_word(const char *field, std::string_view text)
{
    if (text.starts_with('-')) return refused(field, "begins with an option's dash");
    if (holds_control(text) || contains(text, " ")) return refused(field, "blank or control character");
    return {};
}

// Names are short and come from people: what is special anywhere is refused everywhere. `ending` holds the
// characters that end a name of this kind within rsync's or ssh's own argument.
Refusal refusal_of_name(const char *field, std::string_view name, std::string_view ending)
{
    if (Refusal refusal = refusal_of_word(field, name)) return refusal;
    if (holds_any(name, SHELL_SPECIAL) || holds_any(name, "#!~")) return refused(field, SPECIAL);
    if (holds_any(name, ending)) return refused(field, "character that ends a name");
    return {};
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
    return !name.empty() && name.size() < JOB_NAME_SIZE && name != "." && name != ".." &&
           !holds_control(name) && !holds_any(name, LEFT_TO_THE_SHELL) && !contains(name, "/");
}

Checked shell_path(const char *field, std::string_view path)
{
    if (!path.starts_with('-') && !path.starts_with('~')) return shell_path_part(field, path);
    return refused(field, "begins with a dash or a tilde");
}

Checked shell_path_part(const char *field, std::string_view path)
{
    if (holds_control(path) || holds_any(path, LEFT_TO_THE_SHELL)) return refused(field, SPECIAL);
    std::string escaped = escape_path(path);
    if (escaped.size() >= PATH_SIZE) return refused(field, "too long");
    return escaped;
}

Refusal refusal_for_shells(const char *field, std::string_view path)
{
    if (Refusal refusal = refusal_of_word(field, path)) return refusal;
    const bool special = holds_any(path, SHELL_SPECIAL) || holds_any(path.substr(0, 1), SPECIAL_IN_FRONT) ||
                         is_special_inside(path);
    return special ? refused(field, SPECIAL) : Refusal();
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

Refusal refusal_of_host(std::string_view remote_ip)
{
    if (remote_ip.empty()) return {"remote_ip refused: empty"}; // without a trace: there is nothing to ask
    // A bracket pair is the caller's to write, around an IPv6 address.
    return refusal_of_name("remote_ip", remote_ip, "/@");
}

Refusal refusal_of_rsync_user(std::string_view user)
{
    return refusal_of_name("rsync_user", user, "/:");
}

Refusal refusal_of_ssh_user(std::string_view user)
{
    return refusal_of_name("ssh_user", user, ":");
}

Refusal refusal_of_port(std::string_view port)
{
    const std::string_view trimmed = port.substr(0, port.find_last_not_of(' ') + 1);
    if (holds_control(trimmed) || contains(trimmed, " ")) {
        return refused("port", "blank or control character");
    }
    if (holds_any(trimmed, SHELL_SPECIAL) || holds_any(trimmed, "#!~")) return refused("port", SPECIAL);
    return {};
}

Refusal refusal_of_base64(const char *field, std::string_view password)
{
    const auto allowed = [](char c) {
        return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') ||
               contains("+/=", {&c, 1});
    };
    if (std::all_of(password.begin(), password.end(), allowed)) return {};
    return refused(field, "not base64 text");
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
