#include "tools/welcomer/story/FolderSnapshot.h"

namespace welcomer::tool {

namespace fs = std::filesystem;

bool FolderSnapshot::State::operator==(const State& other) const {
    return status.type() == other.status.type() && status.permissions() == other.status.permissions() &&
           written == other.written && size == other.size;
}

FolderSnapshot::FolderSnapshot(const fs::path& folder) : _folder(folder), _states(_look(folder)) {}

std::vector<std::string> FolderSnapshot::changesUntilNow() const {
    const States now = _look(_folder);
    std::vector<std::string> changes;
    for (const auto& [path, state] : _states) {
        const auto found = now.find(path);
        if (found == now.end() || !(found->second == state)) {
            changes.push_back(path);
        }
    }
    for (const auto& entry : now) {
        if (!_states.contains(entry.first)) {
            changes.push_back(entry.first);
        }
    }
    return changes;
}

FolderSnapshot::States FolderSnapshot::_look(const fs::path& folder) {
    States states;
    for (const auto& entry : fs::recursive_directory_iterator(folder)) {
        // What a symbolic link points to is not this folder's.
        State state{entry.symlink_status(), {}, 0};
        if (!entry.is_symlink()) {
            state.written = entry.last_write_time();
            state.size = entry.is_regular_file() ? entry.file_size() : 0;
        }
        states.emplace(entry.path().lexically_relative(folder).string(), state);
    }
    return states;
}

} // namespace welcomer::tool
