#pragma once

// Every command that reaches the remote host over ssh is composed here: two ways to log in, three kinds of
// address, and what to run there.

#include "common/refusal.h"
#include "config/job.h"

#include <optional>
#include <string>
#include <string_view>

namespace bakjob
{

enum class SshLogin {
    AS_CLIENT, // no login name: the ssh client's own default
    AS_USER    // the job's `ssh_user`
};

// How jobs of a server type log in; nullopt for a type that has no login.
std::optional<SshLogin> ssh_login_of(const RsyncJob &job);
inline const Refusal NO_SSH_LOGIN{"server_type has no login"};

// "/usr/sbin/ssh", the job's password (when it has one) and host, and the remote command with whatever
// follows it. Refused when a value is, the password does not fit in base64, or the whole is too long.
Checked ssh_command(const RsyncJob &job, SshLogin login, std::string_view remote_command);

// The job's ssh password as base64 text, empty for none; refused when it has no such form.
Checked ssh_password(const RsyncJob &job);

// Runs a command line on the job's remote host and waits: the wait status of the ssh client, -1 when a value
// is refused. `command` is one word for the local shell: the caller quotes it.
int run_remotely(const RsyncJob &job, std::string_view command);

// The same on the host of CurrentJob.
int rsync_remote_exec(std::string_view command);

} // namespace bakjob
