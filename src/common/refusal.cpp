#include "common/refusal.h"

#include "common/debug_log.h"

namespace bakjob
{

Refusal trace_refusal(std::string why)
{
    DebugLog("ERROR: %s\n", why.c_str());
    return {std::move(why)};
}

Refusal refused(std::string_view field, std::string_view why)
{
    return trace_refusal(std::string(field) + " refused: " + std::string(why));
}

} // namespace bakjob
