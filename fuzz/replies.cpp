// The first line of a probe's reply, and what the two judges make of it.

#include "common/text.h"
#include "fuzz.h"
#include "remote/reply.h"
#include "remote/ssh_probe.h"

#include <algorithm>

using namespace bakjob;

namespace
{

constexpr std::size_t FIRST_LINE_LENGTH = 1023;

std::string first_line(std::string_view reply)
{
    const UniqueFile file = open_text(reply);
    std::string line;
    must(read_line(file.get(), line) == !reply.empty(), "there is a line as long as there is text");
    const std::string_view whole = reply.substr(0, reply.find('\n'));
    must(whole.size() > LINE_LENGTH ? line.size() == LINE_LENGTH : line == whole, "a line ends at its break");
    line.resize(std::min(line.size(), FIRST_LINE_LENGTH));
    return line;
}

void check_trimming(const std::string &line)
{
    const std::string kept = trimmed(line);
    const auto is_blank = [](unsigned char c) { return c <= ' ' || c == 127; };
    must(line.starts_with(kept), "trimming only takes away");
    must(kept.empty() || !is_blank(static_cast<unsigned char>(kept.back())), "trimming takes all");
    must(std::all_of(line.begin() + static_cast<std::ptrdiff_t>(kept.size()), line.end(), is_blank),
         "trimming takes blanks only");
    std::string in_place = line.c_str();
    trim_right(in_place.data());
    must(in_place.c_str() == trimmed(line.c_str()), "both ways of trimming agree");
}

// No fragment holds the byte between the parts, so a line is judged by the worse of them, wherever it stands.
void check_judgement(const std::string &left, const std::string &right)
{
    const std::string line = left + '\1' + right;
    const std::string turned = right + '\1' + left;
    const RemoteReplyCode code = classify_reply_line(line);
    const RemoteReplyCode parts[] = {classify_reply_line(left), classify_reply_line(right)};
    must(code >= REPLY_OK && code <= REPLY_HOST_UNREACHABLE, "a code is one of the table");
    must(code == parts[0] || code == parts[1], "a line is judged by what it holds");
    must(code != REPLY_OK || (parts[0] == REPLY_OK && parts[1] == REPLY_OK), "no failure is overlooked");
    must(code == classify_reply_line(turned), "a fragment counts wherever it stands");
    must(code != REPLY_OK || !contains(line, "ERROR:"), "an error is never fine");

    const auto result = judge_ssh_reply(line);
    must(!result || (*result >= SSH_OK && *result <= SSH_DENIED) || *result == SSH_TIMED_OUT,
         "a result is one of the table");
    must(result != SSH_FAILED, "a reply that is not empty says more than nothing");
    must(result == judge_ssh_reply(turned), "a fragment counts wherever it stands");
    must(result != SSH_OK || !contains(line, "Permission denied"), "a login refused is never fine");
    must(result || contains(line, std::string(28, '@')), "only the warning means a changed key");
}

} // namespace

void check(std::string_view reply)
{
    std::string line = first_line(reply);
    check_trimming(line);
    trim_right(line);
    const std::size_t middle = line.size() / 2;
    check_judgement(line.substr(0, middle), line.substr(middle));
    check_judgement(line, "");
    must(judge_ssh_reply("") == SSH_FAILED && classify_reply_line("") == REPLY_OK, "no reply");
}
