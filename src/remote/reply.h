#pragma once

// What the first line of a probe's output says about the remote side.

#include "common/refusal.h"

#include <cstdint>
#include <string>
#include <string_view>

namespace bakjob
{

enum RemoteReplyCode : std::int32_t {
    REPLY_OK = 101,    // no known failure, also an empty reply
    REPLY_ERROR = 102, // any other error; the command could not be started or was refused
    REPLY_NO_ROUTE = 103,
    REPLY_REFUSED = 104,
    REPLY_NO_DIR = 105, // the remote path does not exist or is no folder
    REPLY_READ_ONLY = 106,
    REPLY_UNKNOWN_MODULE = 107,
    REPLY_AUTH_FAILED = 108,
    REPLY_NO_ADDRESS = 109,
    REPLY_HOST_UNREACHABLE = 110 // unknown host name, or the connection timed out
};

// The code of a first line, already without trailing white space.
RemoteReplyCode classify_reply_line(std::string_view line);

struct ProbeReply {
    RemoteReplyCode code;
    std::string line; // that told it, or why there was none
};

// Runs a probe command, which must send its errors into its output, to its end, and classifies the first
// line. A refused command is not run.
ProbeReply ask(const Checked &command);

// The code alone.
RemoteReplyCode rsync_classify_reply(const std::string &command);

} // namespace bakjob
