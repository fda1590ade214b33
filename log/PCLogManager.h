// The single logger of the whole program: each call writes one record to the system log, or nothing.

#pragma once

#include "text/Format.h"

#include <cstdint>
#include <functional>
#include <string>

namespace welcomer {

class PCLogManager {
  public:
    // Every call site passes kLogTypeNormal; a type that is neither of the two writes nothing.
    static constexpr std::int32_t kLogTypeDebug = 0;
    static constexpr std::int32_t kLogTypeNormal = 1;

    // Facility 14, "install", which syslog.h has no name for, with severity 3 (error) and 7 (debug).
    static constexpr int kPriorityNormal = (14 << 3) | 3;
    static constexpr int kPriorityDebug = (14 << 3) | 7;

    // The one instance, made on first use, never destroyed. Any thread.
    static PCLogManager& sharedManager();

    // Writes the message alone, as one record. The function text and the line travel with every call, so that
    // call sites say where they are; the system log does not get them.
    //  type      kLogTypeNormal, kLogTypeDebug, or anything else to write nothing
    //  function  the calling function's full signature
    //  line      the source line of the call
    //  message   UTF-8
    // Any thread.
    void logTypeInFunctionAtLineWithString(std::int32_t type, const char* function, std::int32_t line,
                                           const std::string& message);

    // Formats the message first (text/Format.h). The system's own call sites use the string form.
    template <class... Arguments>
    void logTypeInFunctionAtLineWithFormat(std::int32_t type, const char* function, std::int32_t line,
                                           text::FormatString<std::type_identity_t<Arguments>...> format,
                                           const Arguments&... arguments) {
        logTypeInFunctionAtLineWithString(type, function, line, text::format(format, arguments...));
    }

    // One call as an observer sees it, before the function and the line are dropped.
    struct Call {
        std::int32_t type;
        const char* function;
        std::int32_t line;
        const std::string& message;
    };

    // For tests: has every call, also of a type that writes nothing, shown to an observer; an empty function
    // ends that. Set while no other thread logs.
    void setObserver(std::function<void(const Call&)> observer);

  private:
    PCLogManager() = default;

    std::function<void(const Call&)> _observer;
};

} // namespace welcomer

// Formats a message and logs it with type 1, the calling function's signature and line. A macro, because only
// a macro sees the signature of the function that it stands in. WL_LOG_AS is for the functions whose function
// text is fixed.
#define WL_LOG(...) WL_LOG_AS(static_cast<const char*>(__PRETTY_FUNCTION__), __VA_ARGS__)
#define WL_LOG_AS(function, ...)                                                                             \
    ::welcomer::PCLogManager::sharedManager().logTypeInFunctionAtLineWithString(                             \
        ::welcomer::PCLogManager::kLogTypeNormal, (function), __LINE__,                                      \
        ::welcomer::text::format(__VA_ARGS__))
