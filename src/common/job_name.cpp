#include "common/job_name.h"

#include "common/shell_text.h"

namespace bakjob
{

std::optional<JobName> JobName::checked(std::string_view text)
{
    return is_job_name(text) ? std::optional(JobName(text)) : std::nullopt;
}

} // namespace bakjob
