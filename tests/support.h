#pragma once

// What the tests share: an appliance in its first state, jobs in its store, small scripts in the place of its
// programs, and a look at what a run left.

#include "common/job_name.h"
#include "config/job.h"

#include <functional>
#include <gtest/gtest.h>
#include <map>
#include <string>
#include <sys/types.h>
#include <vector>

using Keys = std::map<std::string, std::string>;

inline const std::string STORE = "/etc/NAS_CFG/config.xml";
inline const std::string FLASH = "/var/lib/device_flash/config.xml";
inline const std::string CRON = "/etc/cron.d/device_scheduler";
inline const std::string SHARE = "/mnt/HD/HD_a2/Public";
inline const std::string PID_FILE = "/var/run/bakjob_daily.pid";
inline const std::string RSYNC = "/usr/sbin/rsync";
inline const std::string SSH = "/usr/sbin/ssh";

std::string read_file(const std::string &path);
void write_file(const std::string &path, const std::string &text);
bool exists(const std::string &path);
std::string octal_mode(const std::string &path);
std::vector<std::string> lines_of(const std::string &text);

// Runs a shell command with its output read: setting up, and looking at results.
struct Ran {
    int status;
    std::string output;
};
Ran shell(const std::string &command);

// Runs /usr/sbin/bakjob with arguments as a shell reads them.
Ran bakjob_program(const std::string &arguments);

// The same with arguments that no shell sees; its output goes to /tmp/output.
pid_t start(const std::vector<std::string> &arguments);

// The exit code of a child, or 128 and the signal that ended it.
int wait_for(pid_t child);

// Runs `body` in a child process, for what is chosen once per process. Its result, at most 255.
int in_child(const std::function<int()> &body);

// From now on this process is another user's. For children.
void become_neighbour();

// What `body` prints by the C++ library and stdio.
std::string printed_by(const std::function<void()> &body);
std::string complaints_of(const std::function<void()> &body);

// Tells the text when it does not hold the part.
testing::AssertionResult has(const std::string &text, const std::string &part);

// Waits until the condition holds; false after `seconds`.
bool eventually(const std::function<bool()> &condition, int seconds = 10);

// Whether a process has what is at `path` now open: as it does while it waits for a lock on it.
bool has_open(pid_t process, const std::string &path);

// Clears what earlier tests left: store, shares, alerts, files of jobs, trace.
class Appliance : public testing::Test
{
protected:
    void SetUp() override;
    void TearDown() override;
};

// With the share "Public" and a file in it, the serial text S1, and no host key known.
class ApplianceWithShare : public Appliance
{
protected:
    void SetUp() override;
};

// Store access past the module.
void store_set(const std::string &path, const std::string &text);
std::string store_get(const std::string &path);
void store_save();

// Of words such as "retry=0 rsync_user=bk".
Keys keys_of(const std::string &words);

// Adds a job "daily" with plausible values, changed by `keys`, and saves. Its item number.
int add_job(const Keys &keys);
std::string job_key(int item, const std::string &key);
void add_share(const std::string &name, const std::string &path);

// The scheduler's entries of jobs, by their commands, in the last of so many groups.
void set_schedule(const std::vector<std::string> &commands);

// A job's name that is one.
bakjob::JobName named(const std::string &name);

// A record as the loader leaves it: passwords in base64.
bakjob::RsyncJob make_job(const std::string &name);

// A script in the place of a program of the appliance, or where there was none; all is as before when this
// goes. Meanwhile the program itself is at its own name with ".real".
class Fake
{
public:
    Fake(std::string program, const std::string &script);
    Fake(const Fake &) = delete;
    Fake &operator=(const Fake &) = delete;
    ~Fake();

private:
    std::string program_;
};

// For a script in the place of rsync: what it is called for, as $kind. "list" and "write" are the probes,
// "dry" and "run" the transfer; "none" is a far end.
inline const std::string KIND_OF_CALL =
    "case $* in --server*) kind=none ;; *--job-name=*--dry-run*) kind=dry ;; *--job-name=*) kind=run ;; "
    "*--dry-run*) kind=write ;; *) kind=list ;; esac\n";

// Nothing in the folder can be written while this lives.
class ReadOnly
{
public:
    explicit ReadOnly(std::string folder);
    ReadOnly(const ReadOnly &) = delete;
    ReadOnly &operator=(const ReadOnly &) = delete;
    ~ReadOnly();

private:
    std::string folder_;
};

std::vector<std::string> alerts();
