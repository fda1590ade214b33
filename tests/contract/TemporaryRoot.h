// A folder of this machine that stands for the root of a system, removed at the end.

#pragma once

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <optional>
#include <stdexcept>
#include <string>
#include <unistd.h>
#include <vector>

namespace welcomer {

class TemporaryRoot {
  public:
    TemporaryRoot() : _path(_parent() + "/welcomer-root-XXXXXX") {
        if (!::mkdtemp(_path.data())) {
            throw std::runtime_error("cannot make " + _path);
        }
    }
    ~TemporaryRoot() {
        std::error_code error;
        std::filesystem::remove_all(_path, error);
    }
    TemporaryRoot(const TemporaryRoot&) = delete;
    TemporaryRoot& operator=(const TemporaryRoot&) = delete;

    // Without a slash at its end.
    const std::string& path() const { return _path; }

    // Where a path of the system lies on this machine.
    std::string locate(const std::string& path) const { return _path + path; }

    void addDirectory(const std::string& path) const { std::filesystem::create_directories(locate(path)); }

    void addFile(const std::string& path, const std::string& content) const {
        std::filesystem::create_directories(std::filesystem::path(locate(path)).parent_path());
        std::ofstream(locate(path), std::ios::binary) << content;
    }

    // A file's content, or none when there is no such file.
    std::optional<std::string> content(const std::string& path) const {
        std::ifstream file(locate(path), std::ios::binary);
        if (!file) {
            return std::nullopt;
        }
        return std::string(std::istreambuf_iterator<char>(file), {});
    }

    // The names in a folder, in order.
    std::vector<std::string> names(const std::string& path) const {
        std::vector<std::string> found;
        for (const auto& entry : std::filesystem::directory_iterator(locate(path))) {
            found.push_back(entry.path().filename());
        }
        std::sort(found.begin(), found.end());
        return found;
    }

  private:
    // In memory where that is possible: syncing thousands of files to a disk takes its time.
    static std::string _parent() {
        const char* const memory = "/dev/shm";
        return ::access(memory, W_OK) == 0 ? memory : std::filesystem::temp_directory_path().string();
    }

    std::string _path;
};

} // namespace welcomer
