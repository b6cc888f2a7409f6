#pragma once

// For tests of bakjobctl as people and monitoring systems call it.

#include "support.h"

inline Ran ctl(const std::string &arguments)
{
    return shell("/usr/sbin/bakjobctl " + arguments + " 2>&1");
}

// Tells what the program said when it does not say that.
inline testing::AssertionResult says(const Ran &ran, int status, const std::string &text)
{
    if (ran.status == status && ran.output.find(text) != std::string::npos)
        return testing::AssertionSuccess();
    return testing::AssertionFailure()
           << "exit status " << ran.status << ": " << ran.output << "instead of " << status << ": " << text;
}

class Ctl : public ApplianceWithShare
{
protected:
    // Passwords "secret" and "rootpw", as the remote side takes them.
    static Ran add(const std::string &name, const std::string &more = "")
    {
        return shell("printf 'secret\nrootpw\n' | /usr/sbin/bakjobctl add " + name +
                     " remote_ip=127.0.0.1 remote_path=backup local_path=" + SHARE +
                     " rsync_user=bk rsync_pwd=- ssh_pwd=- retry=0 " + more + " 2>&1");
    }
};

// With a job "daily", whose folder on the remote side is there.
class CtlDaily : public Ctl
{
protected:
    void SetUp() override
    {
        Ctl::SetUp();
        shell("mkdir -p /remote/backup/S1_remote_backup/daily");
        ASSERT_TRUE(says(add("daily"), 0, ""));
    }
};
