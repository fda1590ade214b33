// Delegate plug-ins in C++17 or later: derive a class from welcomer::sdk::WLFirstRunDelegateConfiguration and
// export it with WL_EXPORT_DELEGATE_PLUGIN. Header-only, over delegate_plugin.h, which says more of threads
// and ownership.
//
//     class Mail : public welcomer::sdk::WLFirstRunDelegateConfiguration { ... };
//     WL_EXPORT_DELEGATE_PLUGIN(Mail)
//
// An operation raises by throwing: the exception is caught before it leaves the plug-in, and the text of a
// std::exception is what the host logs. A thread of the plug-in's own must catch its exceptions itself. A plug-in may
// also be compiled without exceptions, and without run-time type information.

#ifndef WELCOMER_DELEGATE_PLUGIN_HPP
#define WELCOMER_DELEGATE_PLUGIN_HPP

#include <welcomer/Value.hpp>
#include <welcomer/delegate_plugin.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <stdexcept>
#include <string>
#include <type_traits>
#include <vector>

#pragma GCC visibility push(hidden) // as in Value.hpp

namespace welcomer::sdk {

// Why a setup failed.
struct Error {
    std::int32_t number = 0; // an errno value where there is one
    std::string message;     // one line
};

// Reports that a setup has ended. Copied freely; call it once, on any thread, at any time. Of several calls
// the first counts, and none counts after the operation has thrown. When its last copy goes and none was called,
// the setup has failed with "handler dropped": nobody waits for what cannot come any more.
class CompletionHandler {
  public:
    explicit CompletionHandler(wl_completion_handler handler)
        : _counted(std::make_shared<Counted>(handler)) {}
    // Never without its content: where it is moved from, it is copied.
    CompletionHandler(const CompletionHandler&) = default;
    CompletionHandler& operator=(const CompletionHandler&) = default;
    ~CompletionHandler() = default;

    void operator()(bool succeeded, const std::optional<Error>& error = std::nullopt) const {
        _counted->isAnswered = true;
        _counted->report(succeeded, error ? error->number : 0, error ? error->message.c_str() : nullptr);
    }

    // Has it report nothing of itself: the operation's exception is the outcome.
    void withdraw() const { _counted->isAnswered = true; }

  private:
    struct Counted {
        explicit Counted(wl_completion_handler given) : handler(given) {}
        Counted(const Counted&) = delete;
        Counted& operator=(const Counted&) = delete;
        ~Counted() {
            if (!isAnswered) {
                report(false, 0, "handler dropped");
            }
        }
        void report(bool succeeded, std::int32_t number, const char* message) const {
            handler.call(handler.context, succeeded, number, message);
        }

        const wl_completion_handler handler;
        std::atomic<bool> isAnswered{false};
    };

    std::shared_ptr<Counted> _counted;
};

namespace detail {
template <class Delegate>
class Adapter;
}

// A delegate. Made with its plain constructor, on the thread that looks for plug-ins, and alive until the
// process ends when it is used. See wl_delegate for the thread of each operation.
class WLFirstRunDelegateConfiguration {
  public:
    WLFirstRunDelegateConfiguration() = default;
    virtual ~WLFirstRunDelegateConfiguration() = default;
    WLFirstRunDelegateConfiguration(const WLFirstRunDelegateConfiguration&) = delete;
    WLFirstRunDelegateConfiguration& operator=(const WLFirstRunDelegateConfiguration&) = delete;

    // The delegate's identifier in reverse-domain form; with none the plug-in is not used.
    virtual std::optional<std::string> delegateIdentifier() = 0;

    // This delegate's part of the account setup request, a dictionary; none leaves the delegate out of setup.
    virtual std::optional<Value> delegateSetupRequest() = 0;

    // Finishes the delegate's setup from the server's response, whatever its type. The response is valid
    // during the call; the handler is to be called exactly once, during the call or later.
    virtual void completeSetupWithResponseHandler(ValueView response, CompletionHandler handler) = 0;

    // Stops a running completion.
    virtual void terminateSetupCompletion() {}

    // For the video-calling and the messaging delegate, which are called here and not above: the same with
    // the aliases that the user chose. Raises where it is not overridden, which the host logs.
    // NOLINTBEGIN(performance-unnecessary-value-param): whoever overrides it keeps the handler, as above
    virtual void
    completeSetupWithResponseChosenAliasesHandler(ValueView /*response*/,
                                                  const std::optional<std::vector<std::string>>& /*aliases*/,
                                                  [[maybe_unused]] CompletionHandler handler) {
#if WL_DETAIL_HAS_EXCEPTIONS
        throw std::logic_error("completeSetupWithResponse:chosenAliases:handler: is not implemented");
#else
        handler(false, Error{0, "completeSetupWithResponse:chosenAliases:handler: is not implemented"});
#endif
    }
    // NOLINTEND(performance-unnecessary-value-param)

    // For these two as well: the aliases that the server offers in its response. Raises as above.
    virtual std::optional<std::vector<std::string>> messagingAliasesFromResponse(ValueView /*response*/) {
#if WL_DETAIL_HAS_EXCEPTIONS
        throw std::logic_error("messagingAliasesFromResponse: is not implemented");
#else
        return std::nullopt;
#endif
    }

    // What the delegate has to say which one it is to an extension (Extensions.hpp); null in its constructor.
    wl_delegate* handle() const {
        return _handle;
    }

  private:
    template <class Delegate>
    friend class detail::Adapter;

    wl_delegate* _handle = nullptr;
};

namespace detail {

// Runs an operation and turns what it throws into the error slot.
template <class Operation>
auto guarded(wl_error_slot* slot, Operation operation) noexcept -> decltype(operation()) {
#if WL_DETAIL_HAS_EXCEPTIONS
    try {
        return operation();
    } catch (const std::exception& exception) {
        host().raise(slot, exception.what());
    } catch (...) {
        host().raise(slot, "unknown exception");
    }
    return decltype(operation())();
#else
    static_cast<void>(slot);
    return operation();
#endif
}

// An author's object with the C structure that stands for it.
template <class Delegate>
class Adapter {
  public:
    // None for a host of another version, or whose table lacks what this header uses.
    static wl_delegate* create(const wl_host* table, wl_error_slot* slot) {
        if (!table || table->abi_version != WL_DELEGATE_PLUGIN_ABI_VERSION ||
            !WL_HAS_MEMBER(table, release)) {
            return nullptr;
        }
        hostTable = table;
        return guarded(slot, [] { return &(new Adapter)->_interface; });
    }

    static void destroy(wl_delegate* self) {
        if (self) {
            delete static_cast<Adapter*>(self->plugin_data);
        }
    }

  private:
    Adapter() {
        static_cast<WLFirstRunDelegateConfiguration&>(_delegate)._handle = &_interface;
        _interface.size = sizeof(wl_delegate);
        _interface.plugin_data = this;
        _interface.delegate_identifier = delegateIdentifier;
        _interface.delegate_setup_request = delegateSetupRequest;
        _interface.complete_setup_with_response = completeSetupWithResponse;
        _interface.terminate_setup_completion = terminateSetupCompletion;
        _interface.complete_setup_with_response_chosen_aliases = completeSetupWithResponseChosenAliases;
        _interface.messaging_aliases_from_response = messagingAliasesFromResponse;
    }

    // By the base class, so that an author may override with less access.
    static WLFirstRunDelegateConfiguration& delegate(wl_delegate* self) {
        return static_cast<Adapter*>(self->plugin_data)->_delegate;
    }

    static const char* delegateIdentifier(wl_delegate* self, wl_error_slot* slot) {
        return guarded(slot, [self]() -> const char* {
            const std::optional<std::string> identifier = delegate(self).delegateIdentifier();
            if (!identifier) {
                return nullptr;
            }
            if (identifier->find('\0') != std::string::npos) {
                refuse("delegateIdentifier returned a NUL");
            }
            auto* adapter = static_cast<Adapter*>(self->plugin_data);
            const std::lock_guard<std::mutex> lock(adapter->_mutex);
            return adapter->_identifiers.insert(*identifier).first->c_str();
        });
    }

    static wl_value* delegateSetupRequest(wl_delegate* self, wl_error_slot* slot) {
        return guarded(slot, [self]() -> wl_value* {
            std::optional<Value> request = delegate(self).delegateSetupRequest();
            return request ? request->giveUp() : nullptr;
        });
    }

    static void completeSetupWithResponse(wl_delegate* self, const wl_value* response,
                                          wl_completion_handler handler, wl_error_slot* slot) {
        complete(slot, handler, [&](const CompletionHandler& counted) {
            delegate(self).completeSetupWithResponseHandler(ValueView(response), counted);
        });
    }

    static void terminateSetupCompletion(wl_delegate* self, wl_error_slot* slot) {
        guarded(slot, [self] { delegate(self).terminateSetupCompletion(); });
    }

    static void completeSetupWithResponseChosenAliases(wl_delegate* self, const wl_value* response,
                                                       const wl_value* aliases, wl_completion_handler handler,
                                                       wl_error_slot* slot) {
        complete(slot, handler, [&](const CompletionHandler& counted) {
            std::optional<std::vector<std::string>> texts;
            if (const ValueView array(aliases); array) {
                texts.emplace();
                for (std::size_t index = 0; index < array.size(); ++index) {
                    texts->push_back(array.at(index).string().value_or(std::string()));
                }
            }
            delegate(self).completeSetupWithResponseChosenAliasesHandler(ValueView(response), texts, counted);
        });
    }

    // Runs a completion with its counted handler, which reports nothing of itself where the operation throws.
    template <class Operation>
    static void complete(wl_error_slot* slot, wl_completion_handler handler, Operation operation) noexcept {
        guarded(slot, [&] {
            const CompletionHandler counted(handler);
#if WL_DETAIL_HAS_EXCEPTIONS
            try {
                operation(counted);
            } catch (...) {
                counted.withdraw();
                throw;
            }
#else
            operation(counted);
#endif
        });
    }

    static wl_value* messagingAliasesFromResponse(wl_delegate* self, const wl_value* response,
                                                  wl_error_slot* slot) {
        return guarded(slot, [&]() -> wl_value* {
            const auto aliases = delegate(self).messagingAliasesFromResponse(ValueView(response));
            if (!aliases) {
                return nullptr;
            }
            Value array = Value::array();
            for (const std::string& alias : *aliases) {
                array.append(alias);
            }
            return array.giveUp();
        });
    }

    wl_delegate _interface{};
    std::mutex _mutex;
    // The identifiers that were handed out, as a rule one: the host may still be reading any of them on
    // another thread.
    std::set<std::string> _identifiers;
    Delegate _delegate;
};

template <class Delegate>
constexpr wl_delegate_plugin_descriptor describePlugin(const char* className) {
    static_assert(std::is_base_of_v<WLFirstRunDelegateConfiguration, Delegate>,
                  "a delegate derives from WLFirstRunDelegateConfiguration");
    return {WL_DELEGATE_PLUGIN_ABI_VERSION, sizeof(wl_delegate_plugin_descriptor),
            WL_DELEGATE_PLUGIN_PROTOCOL,    className,
            Adapter<Delegate>::create,      Adapter<Delegate>::destroy};
}

} // namespace detail

} // namespace welcomer::sdk

#pragma GCC visibility pop

// Exports a class as the library's plug-in; stands once, at file scope.
#define WL_EXPORT_DELEGATE_PLUGIN(Class)                                                                     \
    extern "C" {                                                                                             \
    const wl_delegate_plugin_descriptor wl_delegate_plugin =                                                 \
        ::welcomer::sdk::detail::describePlugin<Class>(#Class);                                              \
    }

#endif
