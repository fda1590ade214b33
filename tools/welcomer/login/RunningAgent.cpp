#include "tools/welcomer/login/RunningAgent.h"

#include "backends/posix/Directory.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/RootFolder.h"
#include "handoff/LaunchAgentFile.h"

#include <algorithm>
#include <fcntl.h>
#include <sys/stat.h>

namespace welcomer::tool {

bool agentRuns(const std::string& root, std::uint32_t userID) {
    const posix::RootFolder folder(root);
    const auto names = posix::listDirectory(folder.open("/proc", O_RDONLY | O_DIRECTORY));
    return names && std::ranges::any_of(*names, [&](const std::string& name) {
               const std::string path = "/proc/" + name;
               const posix::FileDescriptor process = folder.open(path, O_RDONLY | O_DIRECTORY);
               struct stat status {};
               std::string program;
               return process && ::fstat(process.get(), &status) == 0 && status.st_uid == userID &&
                      posix::readFile(folder, path + "/comm", program) == 0 &&
                      program == std::string(kAgentProgramName) + '\n';
           });
}

} // namespace welcomer::tool
