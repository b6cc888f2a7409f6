#pragma once

// Whether the configuration file can be replaced.

#include <string>

namespace bakjob::ctl
{

// Why the next change of the configuration would fail, in words; empty when it would not. A change writes a
// new file beside the old one.
std::string why_not_writable();

} // namespace bakjob::ctl
