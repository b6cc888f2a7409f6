#include "output/words.h"

#include <array>

namespace bakjob::ctl
{

namespace
{

struct StateRow {
    JobState state;
    StateWords words;
};

constexpr std::array STATES = {
    StateRow{JOB_IDLE, {"never ran", Outcome::FINE}},
    StateRow{JOB_DONE_SCHEDULED, {"done", Outcome::FINE}},
    StateRow{JOB_DONE, {"done", Outcome::FINE}},
    StateRow{JOB_RUNNING, {"running", Outcome::RUNNING}},
    StateRow{JOB_FAILED, {"failed", Outcome::FAILED}},
    StateRow{JOB_INTERRUPTED, {"interrupted", Outcome::FAILED}},
    StateRow{JOB_RECOVER_FAILED, {"recovery failed", Outcome::FAILED}},
    StateRow{JOB_RECOVER_RUNNING, {"recovering", Outcome::RUNNING}},
    StateRow{JOB_KILLED, {"killed", Outcome::FAILED}},
    StateRow{JOB_STARTING, {"starting", Outcome::RUNNING}},
};

struct ReplyRow {
    RemoteReplyCode code;
    Advice advice;
};

constexpr std::array REPLIES = {
    ReplyRow{REPLY_OK, {"lets the job in", ""}},
    ReplyRow{REPLY_ERROR, {"reports an error", "The answer says which; the daemon's log may say more."}},
    ReplyRow{
        REPLY_NO_ROUTE,
        {"cannot be reached: no route to the host", "Look at remote_ip, the cable and whether it is on."}},
    ReplyRow{REPLY_REFUSED,
             {"refuses the connection",
              "The host is up, but no rsync daemon listens on port 873: start it there."}},
    ReplyRow{REPLY_NO_DIR, {"does not have the folder", "Look at remote_path, or make the folder there."}},
    ReplyRow{REPLY_READ_ONLY,
             {"has the module for reading only", "Set \"read only = no\" for the module over there."}},
    ReplyRow{REPLY_UNKNOWN_MODULE,
             {"has no such module",
              "remote_path begins with the module's name; bakjobctl remote NAME lists the modules."}},
    ReplyRow{REPLY_AUTH_FAILED,
             {"does not take user and password",
              "bakjobctl set NAME rsync_user=USER rsync_pwd=-; the daemon's secrets file has both."}},
    ReplyRow{REPLY_NO_ADDRESS, {"has no address", "Look at remote_ip: the name has no address."}},
    ReplyRow{REPLY_HOST_UNREACHABLE,
             {"cannot be reached: unknown name, or no answer",
              "Look at remote_ip, the name service and whether the host is on."}},
};

struct LoginRow {
    std::optional<SshTestResult> result;
    Advice advice;
};

constexpr std::array LOGINS = {
    LoginRow{SSH_OK, {"is let in", ""}},
    LoginRow{SSH_FAILED, {"fails", "Look at remote_ip and the ssh server's log."}},
    LoginRow{SSH_NO_ROUTE,
             {"fails: no route to the host", "Look at remote_ip, the cable and whether it is on."}},
    LoginRow{SSH_REFUSED,
             {"is refused", "The host is up, but no ssh server listens on port 22: start it there."}},
    LoginRow{SSH_DENIED,
             {"is denied",
              "With use_ssh=yes, bakjobctl set NAME ssh_user=USER ssh_pwd=-; otherwise keys must do."}},
    LoginRow{SSH_TIMED_OUT, {"gets no answer", "Look at remote_ip and whether the host is on."}},
    LoginRow{std::nullopt,
             {"meets another host key than before",
              "If the host was not set up anew, somebody may be in between: find out first. A run with "
              "use_ssh=yes "
              "takes the new key by itself; ssh-keygen -R HOST forgets the old one for the others."}},
};

} // namespace

StateWords words_of_state(std::int32_t state)
{
    for (const StateRow &row : STATES) {
        if (row.state == state) return row.words;
    }
    return {"in an unknown state", Outcome::FAILED};
}

Advice advice_of_reply(RemoteReplyCode code)
{
    for (const ReplyRow &row : REPLIES) {
        if (row.code == code) return row.advice;
    }
    return advice_of_reply(REPLY_ERROR);
}

Advice advice_of_login(std::optional<SshTestResult> result)
{
    for (const LoginRow &row : LOGINS) {
        if (row.result == result) return row.advice;
    }
    return advice_of_login(SSH_FAILED);
}

} // namespace bakjob::ctl
