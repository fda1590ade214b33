#include "tests/fakes/CallRecorder.h"

#include <utility>

namespace welcomer::fakes {

void CallRecorder::record(std::string call) {
    const std::lock_guard lock(_mutex);
    _calls.push_back(std::move(call));
}

std::vector<std::string> CallRecorder::calls() const {
    return callsTo("");
}

std::vector<std::string> CallRecorder::callsTo(std::string_view prefix) const {
    const std::lock_guard lock(_mutex);
    std::vector<std::string> found;
    for (const std::string& call : _calls) {
        if (call.starts_with(prefix)) {
            found.push_back(call);
        }
    }
    return found;
}

void CallRecorder::clear() {
    const std::lock_guard lock(_mutex);
    _calls.clear();
}

} // namespace welcomer::fakes
