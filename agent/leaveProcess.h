// The end of a process whose other threads are not its own.

#pragma once

namespace welcomer {

// Ends the process without running exit handlers, which would pull the ground from under plug-in threads that
// still run. Builds with WELCOMER_FLUSH_AT_EXIT first hand over what coverage counters and the leak checker
// otherwise do in an exit handler.
[[noreturn]] void leaveProcess(int status);

} // namespace welcomer
