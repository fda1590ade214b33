#include "tests/fakes/FakeSystemLog.h"

namespace welcomer::fakes {

void FakeSystemLog::write(int priority, const std::string& message) {
    _recorder.record("SystemLog.write " + std::to_string(priority) + ", " + message);
    const std::lock_guard lock(_mutex);
    _records.push_back({priority, message});
}

std::vector<FakeSystemLog::Record> FakeSystemLog::records() const {
    const std::lock_guard lock(_mutex);
    return _records;
}

std::vector<std::string> FakeSystemLog::lines() const {
    const std::lock_guard lock(_mutex);
    std::vector<std::string> lines;
    for (const Record& record : _records) {
        lines.push_back(record.message);
    }
    return lines;
}

void FakeSystemLog::clear() {
    const std::lock_guard lock(_mutex);
    _records.clear();
}

} // namespace welcomer::fakes
