#include "common/run_options.h"

namespace bakjob
{

RunOptions run_options{};

} // namespace bakjob
