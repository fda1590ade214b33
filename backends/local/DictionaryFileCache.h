// A dictionary's file that is asked for often and seldom changes.

#pragma once

#include "backends/local/DictionaryFile.h"

#include <chrono>
#include <memory>
#include <mutex>
#include <string>
#include <sys/types.h>

namespace welcomer::local {

// Any thread.
class DictionaryFileCache {
  public:
    using WallClock = std::chrono::system_clock;

    DictionaryFileCache(posix::RootFolder root, std::string path)
        : _root(std::move(root)),
          _path(std::move(path)) {}

    // What is in the file now, without its bytes. It is read where it is another file than the last time, or has
    // changed since; while one reads, the others wait.
    //  now     by the clock that files are dated with
    //  result  never null
    std::shared_ptr<const DictionaryFileContent> content(WallClock::time_point now = WallClock::now());

  private:
    // Which file it is, and when its content or its permissions were changed. A file's ctime cannot be set.
    struct Version {
        dev_t device = 0;
        ino_t number = 0;
        off_t size = 0;
        WallClock::duration modified{};
        WallClock::duration changed{};
        bool operator==(const Version&) const = default;
    };
    std::optional<Version> _version() const; // none where there is no file, or none that can be looked at

    const posix::RootFolder _root;
    const std::string _path;
    std::mutex _mutex;             // guards what follows
    std::optional<Version> _known; // of the content; none where that cannot be relied on
    std::shared_ptr<const DictionaryFileContent> _content;
};

} // namespace welcomer::local
