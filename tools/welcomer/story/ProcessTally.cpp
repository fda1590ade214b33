#include "tools/welcomer/story/ProcessTally.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <unistd.h>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;
namespace fs = std::filesystem;

constexpr char kTasks[] = "/proc/self/task";

std::set<int> threadsOfThisProcess() {
    std::set<int> threads;
    std::error_code error;
    for (const auto& each : fs::directory_iterator(kTasks, error)) {
        threads.insert(std::stoi(each.path().filename().string()));
    }
    return threads;
}

// Empty when it has ended.
std::string nameOf(const std::string& folder) {
    std::ifstream file(folder + "/comm");
    std::string name;
    std::getline(file, name);
    return name;
}

} // namespace

ThreadTally::ThreadTally() : _atFirst(threadsOfThisProcess()), _watcher([this] { _watch(); }) {}

ThreadTally::~ThreadTally() {
    {
        const std::lock_guard lock(_mutex);
        _isEnding = true;
    }
    _ends.notify_all();
    _watcher.join();
}

std::size_t ThreadTally::seen() const {
    const std::lock_guard lock(_mutex);
    return _seen.size();
}

std::vector<RunningTask> ThreadTally::running() const {
    const std::lock_guard lock(_mutex);
    std::vector<RunningTask> tasks;
    for (const int id : threadsOfThisProcess()) {
        const std::string name = nameOf(std::string(kTasks) + "/" + std::to_string(id));
        if (id != _own && !_atFirst.contains(id) && !name.empty()) {
            tasks.push_back({id, name});
        }
    }
    return tasks;
}

void ThreadTally::_watch() {
    std::unique_lock lock(_mutex);
    _own = ::gettid();
    do {
        for (const int id : threadsOfThisProcess()) {
            if (id != _own && !_atFirst.contains(id)) {
                _seen.insert(id);
            }
        }
    } while (!_ends.wait_for(lock, 1ms, [this] { return _isEnding; }));
}

std::vector<RunningTask> childProcesses() {
    std::vector<RunningTask> tasks;
    std::error_code error;
    for (const auto& thread : fs::directory_iterator(kTasks, error)) {
        std::ifstream file(thread.path() / "children");
        for (int id = 0; file >> id;) {
            if (std::string name = nameOf("/proc/" + std::to_string(id)); !name.empty()) {
                tasks.push_back({id, std::move(name)});
            }
        }
    }
    return tasks;
}

} // namespace welcomer::tool
