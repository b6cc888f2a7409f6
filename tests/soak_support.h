#pragma once

// For tests of what must hold however often it is tried: a few rounds in the tests; with BAKJOB_SOAK in the
// environment many, and a line per subject in the file that it names (see scripts/soak).

#include "support.h"

#include <functional>
#include <string>
#include <sys/types.h>
#include <vector>

inline constexpr const char *SHARE = "/mnt/HD/HD_a2/Public";

// The file of the table; null in the tests.
const char *soak_table();

int rounds(int here, int soaking);

// Starts the program; its output goes to /tmp/output.
pid_t start(const std::vector<std::string> &arguments);

// The exit code of a child, or 128 and the signal that ended it.
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
