// What lies in a folder, to tell later what has changed.

#pragma once

#include <filesystem>
#include <map>
#include <string>
#include <vector>

namespace welcomer::tool {

class FolderSnapshot {
  public:
    // Looks at everything in the folder and below. Throws std::filesystem::filesystem_error.
    explicit FolderSnapshot(const std::filesystem::path& folder);

    // The paths, relative to the folder, of what was made, removed or written since; a folder counts as
    // written when an entry was made or removed in it.
    std::vector<std::string> changesUntilNow() const;

  private:
    struct State {
        std::filesystem::file_status status;
        std::filesystem::file_time_type written;
        std::uintmax_t size;
        bool operator==(const State& other) const;
    };
    using States = std::map<std::string, State>;

    static States _look(const std::filesystem::path& folder);

    const std::filesystem::path _folder;
    const States _states;
};

} // namespace welcomer::tool
