// What the host offers beyond the first version of its table, in C++17 or later: lines of the log, whom the setup is
// for, progress, and blocks on the main loop. A host may lack any of them: then there is no context, no block is taken,
// and what is said leads nowhere. The headers in extensions/ say more of threads and limits.

#ifndef WELCOMER_EXTENSIONS_HPP
#define WELCOMER_EXTENSIONS_HPP

#include <welcomer/DelegatePlugin.hpp>
#include <welcomer/extensions/context.h>
#include <welcomer/extensions/dispatch.h>
#include <welcomer/extensions/log.h>
#include <welcomer/extensions/progress.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>

#pragma GCC visibility push(hidden) // as in Value.hpp

namespace welcomer::sdk {

// The host's extension of an identifier, or null. Once an instance is being made. Any thread.
template <class Extension>
const Extension* extension(const char* identifier) {
    const wl_host& table = host();
    return WL_HAS_MEMBER(&table, get_extension) && table.get_extension
               ? static_cast<const Extension*>(table.get_extension(identifier))
               : nullptr;
}

enum class LogLevel : wl_log_level {
    Error = WL_LOG_ERROR,
    Warning = WL_LOG_WARNING,
    Information = WL_LOG_INFORMATION,
    Debug = WL_LOG_DEBUG
};

// Writes a line of the system log, under the plug-in's name. Any thread; in the delegate's constructor on its thread.
inline void log(const WLFirstRunDelegateConfiguration& delegate, LogLevel level, const std::string& text) {
    if (const auto* const lines = extension<wl_log>(WL_EXTENSION_LOG)) {
        lines->write(delegate.handle(), static_cast<wl_log_level>(level), text.c_str());
    }
}

// Says how far the setup has come: a fraction from 0 to 1, and a text for people. Any thread.
inline void reportProgress(const WLFirstRunDelegateConfiguration& delegate, double fraction,
                           const std::string& text = {}) {
    if (const auto* const progress = extension<wl_progress>(WL_EXTENSION_PROGRESS)) {
        progress->report(delegate.handle(), fraction, text.c_str());
    }
}

// Whom the setup is for, and where.
struct Context {
    std::optional<std::string> accountName; // none before the user has signed in
    std::optional<std::string> homeFolder;  // none for a user without one
    std::string rootFolder;                 // "/" but in a trial
    bool isTrial = false;
    std::string hostVersion;
};

// As it is now. Any thread.
inline std::optional<Context> context() {
    const auto* const known = extension<wl_context>(WL_EXTENSION_CONTEXT);
    if (!known) {
        return std::nullopt;
    }
    const auto text = [](const char* each) {
        return each ? std::optional<std::string>(each) : std::nullopt;
    };
    return Context{text(known->account_name()), text(known->home_folder()), known->root_folder(),
                   known->is_trial(), known->host_version()};
}

// Has a block run on the host's main loop, not before the seconds have passed; what it holds goes with it. What it
// throws is logged and goes no further.
//  result  a number for `cancel`; 0 where it is refused, in the delegate's constructor for instance
// Any thread.
inline std::uint64_t dispatch(const WLFirstRunDelegateConfiguration& delegate, double seconds,
                              std::function<void()> block) {
    const auto* const loop = extension<wl_dispatch>(WL_EXTENSION_DISPATCH);
    if (!loop) {
        return 0;
    }
    using Block = std::function<void()>;
    auto owned = std::make_unique<Block>(std::move(block));
    const std::uint64_t number = loop->after(
        delegate.handle(), seconds,
        [](void* data) {
            const std::unique_ptr<Block> running(static_cast<Block*>(data));
            (*running)();
        },
        [](void* data) { delete static_cast<Block*>(data); }, owned.get());
    if (number != 0) {
        static_cast<void>(owned.release());
    }
    return number;
}

// Has a block not run.
//  result  whether it will not
// Any thread.
inline bool cancel(const WLFirstRunDelegateConfiguration& delegate, std::uint64_t number) {
    const auto* const loop = extension<wl_dispatch>(WL_EXTENSION_DISPATCH);
    return loop && loop->cancel(delegate.handle(), number);
}

} // namespace welcomer::sdk

#pragma GCC visibility pop

#endif
