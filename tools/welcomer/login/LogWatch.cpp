#include "tools/welcomer/login/LogWatch.h"

#include "backends/posix/FileContent.h"
#include "backends/posix/RootFolder.h"
#include "handoff/LaunchAgentFile.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <sys/inotify.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <vector>

namespace welcomer::tool {

namespace {

constexpr std::size_t kMostAtOnce = std::size_t{1} << 20U; // bytes; what is more is not searched

CommandFailure failure() {
    return CommandFailure("the log cannot be followed: " + std::generic_category().message(errno));
}

// A syslog file, and how far it is known.
class SyslogFile {
  public:
    // What is there now is known.
    SyslogFile(const posix::RootFolder& root, const char* path) : _root(root), _path(path) {
        const posix::FileDescriptor file = _open();
        _end = file ? _status.st_size : 0;
    }

    // Whether lines of logins may have come since the last call.
    bool hasMore() {
        const struct stat before = _status;
        const posix::FileDescriptor file = _open();
        if (before.st_ino != _status.st_ino || before.st_dev != _status.st_dev || _status.st_size < _end) {
            _end = file ? _status.st_size : 0; // begun anew
            return true;
        }
        std::string content;
        if (!file || ::lseek(file.get(), _end, SEEK_SET) < 0 ||
            posix::readAll(file.get(), content, kMostAtOnce) != 0) {
            _end = _status.st_size;
            return static_cast<bool>(file);
        }
        content.resize(content.rfind('\n') + 1); // the rest of the last line is still to come
        _end += static_cast<off_t>(content.size());
        return content.find(kAgentProgramName) != std::string::npos ||
               content.find(kLauncherProgram) != std::string::npos;
    }

  private:
    // None where it is not there, or is no file; its status is nothing then.
    posix::FileDescriptor _open() {
        posix::FileDescriptor file = _root.open(_path, O_RDONLY | O_NONBLOCK | O_CLOEXEC);
        if (!file || ::fstat(file.get(), &_status) != 0 || !S_ISREG(_status.st_mode)) {
            _status = {};
            return posix::FileDescriptor();
        }
        return file;
    }

    const posix::RootFolder& _root;
    const char* _path;
    struct stat _status {};
    off_t _end = 0; // of what is known
};

// The kernel tells when something is written to a file, and when another file takes its place.
class SyslogWatch : public LogWatch {
  public:
    explicit SyslogWatch(const std::string& root) : _root(root), _queue(::inotify_init1(IN_CLOEXEC)) {
        if (!_watchAll()) {
            throw failure();
        }
        for (const char* path : kSyslogFiles) {
            _files.emplace_back(_root, path);
        }
    }

    void wait() override {
        do {
            _sleep();
            _watchAll();
        } while (std::ranges::count_if(_files, &SyslogFile::hasMore) == 0);
    }

  private:
    void _sleep() {
        alignas(inotify_event) std::array<char, 4096> told{};
        while (::read(_queue.get(), told.data(), told.size()) < 0) {
            if (errno != EINTR) { // as a process has it that was stopped and goes on
                throw failure();
            }
        }
    }

    // The folders first: a file that comes meanwhile is told of. Watching a second time changes nothing.
    bool _watchAll() {
        bool watches = false;
        for (const char* path : kSyslogFiles) {
            watches = _watch(posix::splitPath(path).folder, IN_CREATE | IN_MOVED_TO | IN_ONLYDIR) || watches;
        }
        for (const char* path : kSyslogFiles) {
            watches = _watch(path, IN_MODIFY) || watches;
        }
        return watches;
    }

    bool _watch(const std::string& path, std::uint32_t events) {
        const auto resolved = _root.resolve(path);
        return resolved && ::inotify_add_watch(_queue.get(), resolved->c_str(), events) >= 0;
    }

    posix::RootFolder _root;
    posix::FileDescriptor _queue;
    std::vector<SyslogFile> _files;
};

} // namespace

std::unique_ptr<LogWatch> watchSyslogFiles(const std::string& root) {
    return std::make_unique<SyslogWatch>(root);
}

std::unique_ptr<LogWatch> watchLog(const LoginQuery& query, const std::string& source) {
    return source == kJournalName ? watchJournal(query) : watchSyslogFiles(query.root);
}

} // namespace welcomer::tool
