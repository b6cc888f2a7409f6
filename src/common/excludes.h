#pragma once

// Names that no backup includes: files of the appliance's own and of its clients.

#include <string>

namespace bakjob
{

// The options that leave those names out, one for each, with a blank in front and behind. The number of
// blanks between them is part of each form.
enum class ExcludeForm {
    TRANSFER,  // rsync
    DU_HERE,   // du
    DU_REMOTE, // du, read by the shell here and by the one on the remote host
};
std::string exclude_options(ExcludeForm form);

} // namespace bakjob
