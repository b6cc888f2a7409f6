#pragma once

// Why a run, or its part for one folder, has failed: made where it happens, passed up, and told by whoever
// started the run.

#include <string>

namespace bakjob
{

enum class RunStep {
    NONE,     // nothing has failed
    START,    // the run may not begin
    FOLDER,   // a local folder, its share, or what stands at the names of its snapshots
    LOGIN,    // over ssh
    PASSWORD, // its file
    DAEMON,   // whether it answers
    TARGET,   // whether the remote side lets the transfer in, and making a folder that is missing there
    COMMAND,  // a value may not stand in the transfer's command
    SNAPSHOTS,
    DRY_RUN,
    TRANSFER,
    INTERRUPTED
};

struct Reason {
    RunStep step = RunStep::NONE;
    std::string seen{}; // what told it: a line of the remote side, or words. Never holds a secret
    int code = 0;       // of a probe: a RemoteReplyCode or, of a login, an SshTestResult
    int exit_code = 0;  // of the command; -1 when it could not be started
    int attempt = 0;    // from 1; 0: before the first
    std::string folder{};

    explicit operator bool() const { return step != RunStep::NONE; }
};

} // namespace bakjob
