#include "remote/reply.h"

#include "common/debug_log.h"
#include "common/shell.h"
#include "common/text.h"

#include <array>

namespace bakjob
{

namespace
{

struct Fragment {
    std::string_view text;
    RemoteReplyCode code;
};

// The first hit decides, so the special comes before the general.
constexpr std::array FRAGMENTS = {
    Fragment{"No route to host", REPLY_NO_ROUTE},
    Fragment{"Connection refused", REPLY_REFUSED},
    Fragment{"ERROR: module is read only", REPLY_READ_ONLY},
    Fragment{"Not a directory", REPLY_NO_DIR},
    Fragment{"No such file or directory", REPLY_NO_DIR},
    Fragment{"ls: ", REPLY_NO_DIR},
    Fragment{"ERROR: chdir failed", REPLY_NO_DIR},
    Fragment{"@ERROR: Unknown module", REPLY_UNKNOWN_MODULE},
    Fragment{"ERROR: auth failed on module", REPLY_AUTH_FAILED},
    Fragment{"No address associated with hostname", REPLY_NO_ADDRESS},
    Fragment{"Name or service not known", REPLY_HOST_UNREACHABLE},
    Fragment{"Connection timed out", REPLY_HOST_UNREACHABLE},
    Fragment{"ERROR:", REPLY_ERROR},
};

} // namespace

RemoteReplyCode classify_reply_line(std::string_view line)
{
    for (const Fragment &fragment : FRAGMENTS) {
        if (contains(line, fragment.text)) return fragment.code;
    }
    return REPLY_OK;
}

ProbeReply ask(const Checked &command)
{
    if (!command) return {REPLY_ERROR, command.refusal().why};
    if (!fits_command(*command)) return {REPLY_ERROR, refused("probe command", "too long").why};
    const auto line = first_reply_line(*command);
    if (!line) return {REPLY_ERROR, NOT_STARTED};
    DebugLog("--->[%s]\n", line->c_str());
    return {classify_reply_line(*line), *line};
}

RemoteReplyCode rsync_classify_reply(const std::string &command)
{
    return ask(command).code;
}

} // namespace bakjob
