#pragma once

// A command line of bakjobctl. Every command takes one, and gives the program's exit status (failure.h) or
// throws a Failure.

#include <string>
#include <vector>

namespace bakjob::ctl
{

struct Request {
    std::string name;                  // of the job
    std::vector<std::string> settings; // "key=value"
    std::string times;                 // in cron's notation
    bool named = false;                // whether a name was given at all
    bool json = false;
    bool names = false; // nothing but names, one a line
    bool probe = false; // ask the remote side, too
};

} // namespace bakjob::ctl
