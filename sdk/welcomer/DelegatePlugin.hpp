// Delegate plug-ins in C++17 or later: derive a class from welcomer::sdk::WLFirstRunDelegateConfiguration and
// export it with WL_EXPORT_DELEGATE_PLUGIN. Header-only, over delegate_plugin.h, which says more of threads
// and ownership.
//
//     class Mail : public welcomer::sdk::WLFirstRunDelegateConfiguration { ... };
//     WL_EXPORT_DELEGATE_PLUGIN(Mail)
//
// An operation raises by throwing: the exception is caught before it leaves the plug-in, and the text of a
// std::exception is what the host logs. A thread of the plug-in's own must catch its exceptions itself.

#ifndef WELCOMER_DELEGATE_PLUGIN_HPP
#define WELCOMER_DELEGATE_PLUGIN_HPP

#include <welcomer/delegate_plugin.h>

#include <cstddef>
#include <cstdint>
#include <exception>
#include <mutex>
#include <optional>
#include <set>
#include <stdexcept>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

// Two plug-ins built against different versions of this header share no symbol of it: all of it is hidden.
// GCC then warns of a derived class in a library that is not compiled with -fvisibility=hidden, which does no
// harm here; so that authors need no option, that warning is off from here on.
#if defined(__GNUC__) && !defined(__clang__)
#pragma GCC diagnostic ignored "-Wattributes"
#endif
#pragma GCC visibility push(hidden)

namespace welcomer::sdk {

namespace detail {

inline const wl_host* hostTable = nullptr; // set when the first instance is made, the same for all

} // namespace detail

// The host's functions, once an instance is being made.
inline const wl_host& host() {
    return *detail::hostTable;
}

// Why a setup failed.
struct Error {
    std::int32_t number = 0; // an errno value where there is one
    std::string message;     // one line
};

class Value;

// A property-list value that belongs to somebody else: the response, or what is inside a Value. It is as
// valid as what it was taken from, a response for the length of the call; keep a copy() for longer. May be no
// value at all, which is of no type and has no elements.
class ValueView {
  public:
    ValueView() = default;
    explicit ValueView(const wl_value* handle) : _handle(handle) {}

    explicit operator bool() const { return _handle != nullptr; }
    const wl_value* handle() const { return _handle; }
    wl_value_type type() const { return host().value_type(_handle); }

    // Each gives the content when the value is of exactly that type, else none.
    std::optional<bool> boolean() const { return get<bool>(host().get_boolean); }
    std::optional<std::int64_t> integer() const { return get<std::int64_t>(host().get_integer); }
    std::optional<std::uint64_t> unsignedInteger() const { return get<std::uint64_t>(host().get_unsigned); }
    std::optional<double> real() const { return get<double>(host().get_real); }
    std::optional<double> secondsSince1970() const { return get<double>(host().get_date); } // a date

    std::optional<std::string> string() const {
        std::size_t length = 0;
        const char* text = host().get_string(_handle, &length);
        return text ? std::optional<std::string>(std::in_place, text, length) : std::nullopt;
    }

    std::optional<std::string> data() const {
        std::size_t length = 0;
        const void* bytes = host().get_data(_handle, &length);
        return bytes ? std::optional<std::string>(std::in_place, static_cast<const char*>(bytes), length)
                     : std::nullopt;
    }

    // How many elements or entries.
    std::size_t size() const { return host().count(_handle); }

    // An element, or the value of a key; no value when there is none.
    ValueView at(std::size_t index) const { return ValueView(host().array_at(_handle, index)); }
    ValueView find(std::string_view key) const {
        return ValueView(host().dictionary_get(_handle, key.data() ? key.data() : "", key.size()));
    }

    // Calls `visit(std::string_view key, ValueView value)` for each entry, in key order.
    template <class Visit>
    void forEach(Visit visit) const {
        const char* key = nullptr;
        std::size_t length = 0;
        const wl_value* value = nullptr;
        while (host().dictionary_next(_handle, &key, &length, &value)) {
            visit(std::string_view(key, length), ValueView(value));
        }
    }

    // The same value, of one's own. Throws for no value.
    inline Value copy() const;

  private:
    template <class T>
    std::optional<T> get(bool (*getter)(const wl_value*, T*)) const {
        T result{};
        return getter(_handle, &result) ? std::optional<T>(result) : std::nullopt;
    }

    const wl_value* _handle = nullptr;
};

// A property-list value of one's own. Throws std::invalid_argument when it cannot be built: text that is no
// UTF-8 or holds a character that XML cannot hold (control characters), a date outside the years 0000 to
// 9999, nesting beyond WL_VALUE_DEPTH_LIMIT, an entry for what is no dictionary.
class Value {
  public:
    Value(std::string_view text) : _handle(host().new_string(text.data() ? text.data() : "", text.size())) {
        require();
    }
    Value(const std::string& text) : Value(std::string_view(text)) {}
    Value(const char* text) : Value(std::string_view(text)) {}
    template <class T, std::enable_if_t<std::is_arithmetic_v<T>, int> = 0>
    Value(T number) : _handle(make(number)) {
        require();
    }
    static Value dictionary() { return adopt(host().new_dictionary()); }
    static Value array() { return adopt(host().new_array()); }
    static Value data(std::string_view bytes) { return adopt(host().new_data(bytes.data(), bytes.size())); }
    static Value date(double secondsSince1970) { return adopt(host().new_date(secondsSince1970)); }

    // Takes over a handle.
    static Value adopt(wl_value* handle) { return Value(handle, 0); }

    Value(Value&& other) noexcept : _handle(std::exchange(other._handle, nullptr)) {}
    Value& operator=(Value&& other) noexcept {
        std::swap(_handle, other._handle);
        return *this;
    }
    ~Value() { host().release(_handle); }

    Value& set(std::string_view key, Value value) {
        if (!host().dictionary_set(_handle, key.data() ? key.data() : "", key.size(), value.giveUp())) {
            throw std::invalid_argument("an entry that cannot be set");
        }
        return *this;
    }

    Value& append(Value value) {
        if (!host().array_append(_handle, value.giveUp())) {
            throw std::invalid_argument("an element that cannot be appended");
        }
        return *this;
    }

    ValueView view() const { return ValueView(_handle); }

    // Hands the handle to the caller.
    wl_value* giveUp() { return std::exchange(_handle, nullptr); }

  private:
    Value(wl_value* handle, int /*tells it from a number*/) : _handle(handle) { require(); }

    template <class T>
    static wl_value* make(T number) {
        if constexpr (std::is_same_v<T, bool>) {
            return host().new_boolean(number);
        } else if constexpr (std::is_floating_point_v<T>) {
            return host().new_real(static_cast<double>(number));
        } else if constexpr (std::is_signed_v<T>) {
            return host().new_integer(number);
        } else {
            return host().new_unsigned(number);
        }
    }

    void require() const {
        if (!_handle) {
            throw std::invalid_argument("a value that cannot be built");
        }
    }

    wl_value* _handle;
};

inline Value ValueView::copy() const {
    return Value::adopt(host().copy(_handle));
}

// Reports that a setup has ended. Copied freely; call it once, on any thread, at any time. Of several calls
// the first counts, and none counts after the operation has thrown.
class CompletionHandler {
  public:
    explicit CompletionHandler(wl_completion_handler handler) : _handler(handler) {}

    void operator()(bool succeeded, const std::optional<Error>& error = std::nullopt) const {
        _handler.call(_handler.context, succeeded, error ? error->number : 0,
                      error ? error->message.c_str() : nullptr);
    }

  private:
    wl_completion_handler _handler;
};

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
    virtual void
    completeSetupWithResponseChosenAliasesHandler(ValueView /*response*/,
                                                  const std::optional<std::vector<std::string>>& /*aliases*/,
                                                  CompletionHandler /*handler*/) {
        throw std::logic_error("completeSetupWithResponse:chosenAliases:handler: is not implemented");
    }

    // For these two as well: the aliases that the server offers in its response. Raises as above.
    virtual std::optional<std::vector<std::string>> messagingAliasesFromResponse(ValueView /*response*/) {
        throw std::logic_error("messagingAliasesFromResponse: is not implemented");
    }
};

namespace detail {

// Runs an operation and turns what it throws into the error slot.
template <class Operation>
auto guarded(wl_error_slot* slot, Operation operation) noexcept -> decltype(operation()) {
    try {
        return operation();
    } catch (const std::exception& exception) {
        host().raise(slot, exception.what());
    } catch (...) {
        host().raise(slot, "unknown exception");
    }
    return decltype(operation())();
}

// An author's object with the C structure that stands for it.
template <class Delegate>
class Adapter {
  public:
    static wl_delegate* create(const wl_host* table, wl_error_slot* slot) {
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
                throw std::invalid_argument("delegateIdentifier returned a NUL");
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
        guarded(slot, [&] {
            delegate(self).completeSetupWithResponseHandler(ValueView(response), CompletionHandler(handler));
        });
    }

    static void terminateSetupCompletion(wl_delegate* self, wl_error_slot* slot) {
        guarded(slot, [self] { delegate(self).terminateSetupCompletion(); });
    }

    static void completeSetupWithResponseChosenAliases(wl_delegate* self, const wl_value* response,
                                                       const wl_value* aliases, wl_completion_handler handler,
                                                       wl_error_slot* slot) {
        guarded(slot, [&] {
            std::optional<std::vector<std::string>> texts;
            if (const ValueView array(aliases); array) {
                texts.emplace();
                for (std::size_t index = 0; index < array.size(); ++index) {
                    texts->push_back(array.at(index).string().value_or(std::string()));
                }
            }
            delegate(self).completeSetupWithResponseChosenAliasesHandler(ValueView(response), texts,
                                                                         CompletionHandler(handler));
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
