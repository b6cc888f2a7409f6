#pragma once

// The dry run that stands in front of a job's transfer.

#include <string>
#include <vector>

// Arguments of the stock rsync that ask for all that can fail at the start of this dry run, and no more: the
// connection, the login, the module, and whether both ends are there. It goes into no folder. Its exit code
// is that of the whole dry run. Only a source that is there and cannot be read as a folder may be left to the
// transfer; a dry run that ends with code 23 leaves that to it, too.
std::vector<std::string> start_check(std::vector<std::string> arguments);
