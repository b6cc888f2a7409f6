#pragma once

// What the tests of what must always hold share: programs started without a shell, their fixture with its row
// in the table of scripts/soak, and a server that misbehaves.

#include "support.h"

#include <functional>
#include <string>
#include <sys/types.h>
#include <vector>

inline constexpr const char *SHARE = "/mnt/HD/HD_a2/Public";

// The file for the rows of the table; null when there is no soak.
const char *soak_table();

int rounds(int here, int soaking);

// Starts the program; its output goes to /tmp/output.
pid_t start(const std::vector<std::string> &arguments);

// Waits. The exit status, 128 and the signal's number when one ended it.
int wait_for(pid_t child);

// Runs the program with arguments that no shell sees. Its trace.
std::string traced(std::vector<std::string> arguments);

class Holds : public Appliance
{
protected:
    void SetUp() override;

    // A row of the soak's table, and the verdict.
    static void expect_none_of(int tries, int failures, const std::string &what);
};

// A server on 127.0.0.9 that does to each connection as told.
class BadServer
{
public:
    explicit BadServer(const std::function<void(int)> &behave, std::uint16_t port = 873);
    BadServer(const BadServer &) = delete;
    BadServer &operator=(const BadServer &) = delete;
    ~BadServer();
    [[nodiscard]] bool bound() const { return bound_; }

private:
    pid_t server_ = -1;
    bool bound_ = false;
};
