#pragma once

// For tests of what must hold however often it is tried: a few rounds in the tests; with BAKJOB_SOAK in the
// environment many, and a line per subject in the file that it names (see scripts/soak).

#include "support.h"

#include <chrono>
#include <cstdint>
#include <random>

// The file of the table; null in the tests.
const char *soak_table();

int rounds(int here, int soaking);

// The program's trace of a run with these arguments, which no shell sees.
std::string traced(std::vector<std::string> arguments);

class Holds : public ApplianceWithShare
{
protected:
    void SetUp() override;

    // A row of the soak's table, and the verdict.
    static void expect_none_of(int tries, int failures, const std::string &what);
};

// The same numbers in every soak.
class Chance
{
public:
    explicit Chance(unsigned seed) : random_(seed) {}
    int number(int from, int to) { return std::uniform_int_distribution(from, to)(random_); }
    template <typename Choices>
    auto one_of(const Choices &choices)
    {
        return choices[static_cast<std::size_t>(number(0, static_cast<int>(std::size(choices)) - 1))];
    }
    // Some moment of the time.
    void pause(std::chrono::microseconds most);

private:
    std::mt19937 random_;
};

// How long a run takes.
std::chrono::microseconds time_of_run(const std::vector<std::string> &arguments);

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
