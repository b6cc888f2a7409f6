#pragma once

// Every command that reaches the remote host over ssh is composed here: two ways to log in, three kinds of
// address, and what to run there.

#include "config/job.h"

#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

enum class SshLogin {
    as_client, // no login name: the ssh client's own default
    as_user    // the job's `ssh_user`
};

// How jobs of a server type log in; nothing for a type that has no login.
std::optional<SshLogin> ssh_login_of(const RsyncJob &job);

// "/usr/sbin/ssh", the job's password (when it has one) and host, and the remote command with whatever
// follows it. Nothing when a value is refused, the password does not fit in base64, or the whole is too long.
std::optional<std::string> ssh_command(const RsyncJob &job, SshLogin login, std::string_view remote_command);

// The job's ssh password as base64 text, empty for none; nothing when it has no such form.
std::optional<std::string> ssh_password(const RsyncJob &job);

// Runs a command line on the remote host of CurrentJob and waits: the wait status of the ssh client, -1 when
// a value is refused. `command` is one word for the local shell: the caller quotes it.
int rsync_remote_exec(std::string_view command);

} // namespace bakjob
