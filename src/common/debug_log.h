#pragma once

// The one trace routine. Silent unless `debug_mode` says otherwise; tracing never changes what the program
// does.

namespace bakjob
{

// printf for the trace; the caller supplies the line end. To TRACE_FILE a message goes cut at 1023 bytes, and
// the first message of a process starts the file anew.
[[gnu::format(printf, 1, 2)]] void DebugLog(const char *format, ...);

} // namespace bakjob
