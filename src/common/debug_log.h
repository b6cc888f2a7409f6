#pragma once

// The one trace routine. Silent unless `debug_mode` says otherwise; tracing never changes what the program
// does.

namespace bakjob
{

// printf for the trace; the caller supplies the line end. In TRACE_FILE a message is cut at 1023 bytes, and
// the first message of a process replaces the file.
[[gnu::format(printf, 1, 2)]] void DebugLog(const char *format, ...);

} // namespace bakjob
