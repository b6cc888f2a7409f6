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

std::string read_file(const std::string &path);
void write_file(const std::string &path, const std::string &text);
bool exists(const std::string &path);
std::string octal_mode(const std::string &path);

// Runs a shell command with its output read: setting up, and looking at results.
struct Ran {
    int status;
    std::string output;
};
Ran shell(const std::string &command);

// Runs `body` in a child process, for what is chosen once per process. Its result, at most 255.
int in_child(const std::function<int()> &body);

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

// Store access past the module.
void store_set(const std::string &path, const std::string &text);
std::string store_get(const std::string &path);
void store_save();

// Adds a job with plausible values, changed by `keys`, and saves. Its item number.
int add_job(const Keys &keys);
std::string job_key(int item, const std::string &key);
void add_share(const std::string &name, const std::string &path);

// A job's name that is one.
bakjob::JobName named(const std::string &name);

// A record as the loader leaves it: passwords in base64.
bakjob::RsyncJob make_job(const std::string &name);

// A script in the place of a program of the appliance; the program is back when this goes.
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

// Runs /usr/sbin/bakjob with arguments as a shell reads them.
Ran bakjob_program(const std::string &arguments);
std::vector<std::string> alerts();
std::vector<std::string> lines_of(const std::string &text);
