#pragma once

// Passwords, read so that nobody else sees them.

#include <string>

namespace bakjob::ctl
{

// Asks on the terminal without showing what is typed; without a terminal, the next line of standard input.
// Failure when there is none.
std::string read_secret(const std::string &what);

} // namespace bakjob::ctl
