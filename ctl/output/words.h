#pragma once

// What codes mean, in words, and what to do about them.

#include "config/job_state.h"
#include "remote/reply.h"
#include "remote/ssh_probe.h"

#include <optional>
#include <string>
#include <string_view>

namespace bakjob::ctl
{

enum class Outcome { FINE, FAILED, RUNNING };

struct StateWords {
    const char *words;
    Outcome outcome;
};

StateWords words_of_state(std::int32_t state);

struct Advice {
    const char *what;
    const char *todo; // empty when there is nothing to do
};

// Of a probe of the rsync daemon.
Advice advice_of_reply(RemoteReplyCode code);

// Of an ssh login; nullopt: the host's key has changed.
Advice advice_of_login(std::optional<SshTestResult> result);

} // namespace bakjob::ctl
