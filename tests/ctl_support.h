#pragma once

// For tests of bakjobctl as people and monitoring systems call it.

#include "support.h"

#include <sys/mount.h>
#include <utility>

inline constexpr const char *STORE = "/etc/NAS_CFG/config.xml";
inline constexpr const char *FLASH = "/var/lib/device_flash/config.xml";
inline constexpr const char *CRON = "/etc/cron.d/device_scheduler";

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

class Ctl : public Appliance
{
protected:
    void SetUp() override
    {
        Appliance::SetUp();
        add_share("Public", "/mnt/HD/HD_a2/Public");
        write_file("/mnt/HD/HD_a2/Public/a", "a");
        write_file("/tmp/kv_serial.txt", "S123");
        shell("rm -f ~root/.ssh/known_hosts");
    }

    // Passwords "secret" and "rootpw", as the remote side takes them.
    static Ran add(const std::string &name, const std::string &more = "")
    {
        return shell("printf 'secret\nrootpw\n' | /usr/sbin/bakjobctl add " + name +
                     " remote_ip=127.0.0.1 remote_path=backup local_path=/mnt/HD/HD_a2/Public rsync_user=bk "
                     "rsync_pwd=- ssh_pwd=- retry=0 " +
                     more + " 2>&1");
    }
};

// Nothing in the folder can be written while this lives.
class ReadOnly
{
public:
    explicit ReadOnly(std::string folder) : folder_(std::move(folder))
    {
        EXPECT_EQ(mount(folder_.c_str(), folder_.c_str(), "", MS_BIND, nullptr), 0) << folder_;
        EXPECT_EQ(mount(nullptr, folder_.c_str(), "", MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
    }
    ReadOnly(const ReadOnly &) = delete;
    ReadOnly &operator=(const ReadOnly &) = delete;
    ~ReadOnly() { umount2(folder_.c_str(), MNT_DETACH); }

private:
    std::string folder_;
};
