#include "tools/resolver-sync/FolderWatch.h"

#include <cerrno>
#include <filesystem>
#include <sys/inotify.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::resolver {

FolderWatch::FolderWatch(const std::string& folder)
    : _folder(folder),
      _name(std::filesystem::path(folder).filename()),
      _inotify(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK)) {
    const std::string above = std::filesystem::path(folder).parent_path();
    _above = ::inotify_add_watch(_inotify, above.c_str(),
                                 IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_ONLYDIR);
    if (_above < 0) {
        const int number = errno;
        ::close(_inotify);
        throw std::system_error(number, std::generic_category(), above);
    }
}

FolderWatch::~FolderWatch() {
    ::close(_inotify);
}

void FolderWatch::rearm() {
    const int now =
        ::inotify_add_watch(_inotify, _folder.c_str(),
                            IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_MODIFY | IN_CLOSE_WRITE |
                                IN_ATTRIB | IN_DELETE_SELF | IN_MOVE_SELF | IN_ONLYDIR);
    if (_inside >= 0 && _inside != now) {
        // The one before may live on under another name. Its watch is gone already when it was removed.
        ::inotify_rm_watch(_inotify, _inside);
    }
    _inside = now;
}

bool FolderWatch::drain() {
    bool changed = false;
    alignas(inotify_event) char buffer[8192];
    ssize_t count = 0;
    while ((count = ::read(_inotify, buffer, sizeof buffer)) > 0) {
        for (ssize_t at = 0; at < count;) {
            const auto* const event = reinterpret_cast<const inotify_event*>(buffer + at);
            at += static_cast<ssize_t>(sizeof(inotify_event) + event->len);
            const bool lost = (event->mask & IN_Q_OVERFLOW) != 0;
            changed = changed || lost || (event->wd == _inside && _inside >= 0) ||
                      (event->wd == _above && event->len > 0 && _name == event->name);
        }
    }
    return changed;
}

} // namespace welcomer::resolver
