#include "log/PCLogManager.h"

#include "platform/Platform.h"

#include <utility>

namespace welcomer {

static_assert(PCLogManager::kPriorityNormal == platform::kErrorPriority);

PCLogManager& PCLogManager::sharedManager() {
    static auto* const manager = new PCLogManager;
    return *manager;
}

void PCLogManager::logTypeInFunctionAtLineWithString(std::int32_t type, const char* function,
                                                     std::int32_t line, const std::string& message) {
    if (_observer) {
        _observer({type, function, line, message});
    }
    if (type == kLogTypeNormal) {
        platform::current().systemLog.write(kPriorityNormal, message);
    } else if (type == kLogTypeDebug) {
        platform::current().systemLog.write(kPriorityDebug, message);
    }
}

void PCLogManager::setObserver(std::function<void(const Call&)> observer) {
    _observer = std::move(observer);
}

} // namespace welcomer
