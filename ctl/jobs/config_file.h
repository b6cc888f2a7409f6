#pragma once

// The configuration file, as far as people must look after it.

#include <string>

namespace bakjob::ctl
{

// Why the next change of the configuration would fail, in words; empty when it would not. Each is written as
// a new file beside the old one.
std::string why_not_writable();

} // namespace bakjob::ctl
