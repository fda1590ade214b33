// Running other programs.

#pragma once

#include <string>
#include <vector>

namespace welcomer::platform {

class ProcessLauncher {
  public:
    virtual ~ProcessLauncher() = default;

    // Launches a program and blocks until it has ended.
    //  program    its absolute path: the machine's own program, also where files are looked up below a root
    //             folder
    //  arguments  what follows the program's name, passed on as they stand; no shell sees them
    //  result     its exit status, or 128 and the signal's number when a signal ended it
    // Throws Exception when the program cannot be launched or waited for. The program inherits this process's
    // environment and working folder, with no signal blocked or ignored; it has nothing to read, and what it
    // says is dropped: only its end counts. Any thread.
    virtual int launchAndWait(const std::string& program, const std::vector<std::string>& arguments) = 0;
};

} // namespace welcomer::platform
