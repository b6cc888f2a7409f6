#pragma once

// What the commands do, once their words are read. Each gives the program's exit status (failure.h) or throws
// a Failure.

#include <string>
#include <vector>

namespace bakjob::ctl
{

// The words of a command line.
struct Request {
    std::string name;                  // of the job
    std::vector<std::string> settings; // "key=value"
    std::string times;                 // in cron's notation
    bool named = false;                // whether a name was given at all
    bool json = false;
    bool names = false; // nothing but names, one a line
    bool probe = false; // ask the remote side, too
};

int list_jobs(const Request &request);
int show_job(const Request &request);
int show_status(const Request &request);
int show_keys(const Request &request);

int add_job(const Request &request);
int set_job(const Request &request);
int delete_job(const Request &request);
int enable_job(const Request &request);
int disable_job(const Request &request);
int schedule_job(const Request &request);
int unschedule_job(const Request &request);

int check_job(const Request &request);
int watch_job(const Request &request);
int show_snapshots(const Request &request);
int show_remote(const Request &request);

} // namespace bakjob::ctl
