#include "tools/welcomer/plugins/CheckedPlugin.h"

#include "platform/Platform.h"
#include "platform/PluginDirectory.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginInstances.h"
#include "plugins/PropertyListHandles.h"
#include "text/Describe.h"
#include "tools/welcomer/plugins/CheckingHost.h"
#include "tools/welcomer/plugins/HandleBook.h"

#include <cxxabi.h>
#include <exception>
#include <utility>

namespace welcomer::tool {

namespace {

HandleBook& book() {
    return HandleBook::instance();
}

std::optional<PropertyList> taken(wl_value* handle, const char* operation) {
    return takeHandle(book().pass(handle, operation));
}

} // namespace

// What leaves the operation ends here, but for the end of a thread, which nothing may hold up.
template <class Call>
auto CheckedPlugin::_call(const std::string& operation, CallEnd& end, Call call) -> decltype(call(nullptr)) {
    _report.step(operation);
    ErrorSlot slot;
    // Closes the slot and keeps how it ended, also when the thread ends.
    struct AtEnd {
        CheckedPlugin& plugin;
        const std::string& operation;
        ErrorSlot& slot;
        CallEnd& end;
        ~AtEnd() {
            book().close(slot.handle());
            if (slot.raised()) {
                end.raised = slot.message();
            }
            plugin._keep(operation, end);
        }
    };
    book().open(slot.handle());
    const AtEnd atEnd{*this, operation, slot, end};
    try {
        return call(slot.handle());
    } catch (abi::__forced_unwind&) {
        end.hasEndedThread = true;
        throw;
    } catch (...) {
        end.thrown = text::describe(std::current_exception());
    }
    return decltype(call(nullptr))();
}

void CheckedPlugin::_keep(const std::string& operation, const CallEnd& end) {
    {
        const std::lock_guard lock(_mutex);
        if (end.thrown) {
            _thrown.push_back(operation + " let an exception out: " + *end.thrown);
        }
        if (end.raised) {
            _raised.push_back(operation + " raised: " + *end.raised);
        }
    }
    if (end.hasEndedThread) {
        _hasEndedThread = true;
    }
    if (afterCall) {
        afterCall(operation);
    }
}

std::vector<std::string> CheckedPlugin::thrown() const {
    const std::lock_guard lock(_mutex);
    return _thrown;
}

std::vector<std::string> CheckedPlugin::raised() const {
    const std::lock_guard lock(_mutex);
    return _raised;
}

std::string CheckedPlugin::load() {
    _report.step("loading the library");
    const platform::PluginSymbol symbol = platform::current().pluginBundle.load(
        std::string(platform::kPluginDirectory) + "/" + _name, WL_DELEGATE_PLUGIN_SYMBOL);
    _descriptor = static_cast<const wl_delegate_plugin_descriptor*>(symbol.address);
    if (afterCall) {
        afterCall("loading the library");
    }
    return symbol.address ? "" : symbol.reason;
}

wl_delegate* CheckedPlugin::create(const wl_host& host) {
    CallEnd end;
    wl_delegate* const made =
        _call("create", end, [&](wl_error_slot* slot) { return _descriptor->create(&host, slot); });
    if (!made || end.raised || end.thrown) {
        return nullptr;
    }
    _instance = made;
    addPluginInstance(_instance, _name);
    return made;
}

void CheckedPlugin::destroy() {
    dropBlocksOf(_instance);
    removePluginInstance(_instance);
    if (_descriptor->destroy) {
        CallEnd end;
        _call("destroy", end, [&](wl_error_slot*) { _descriptor->destroy(_instance); });
    }
}

std::optional<std::string> CheckedPlugin::identifier() {
    CallEnd end;
    const char* const text = _call("delegate_identifier", end, [&](wl_error_slot* slot) {
        return _instance->delegate_identifier(_instance, slot);
    });
    if (!text || end.raised || end.thrown) {
        return std::nullopt;
    }
    const std::string identifier = text;
    if (!_isIdentified.exchange(true)) {
        _getsAliases = identifier == kVidlinkIdentifier || identifier == kChatterIdentifier;
        visitPluginInstance(_instance, [&](PluginInstance& known) { known.identifier = identifier; });
    }
    return identifier;
}

std::optional<PropertyList> CheckedPlugin::request() {
    CallEnd end;
    wl_value* const value = _call("delegate_setup_request", end, [&](wl_error_slot* slot) {
        return _instance->delegate_setup_request(_instance, slot);
    });
    return taken(value, "what delegate_setup_request returns");
}

std::optional<PropertyList> CheckedPlugin::aliases(const PropertyList& response) {
    CallEnd end;
    const wl_value* const lent = book().lend(borrowedHandle(response), nullptr, "the response");
    wl_value* const value = _call("messaging_aliases_from_response", end, [&](wl_error_slot* slot) {
        return _instance->messaging_aliases_from_response(_instance, lent, slot);
    });
    book().endLoan(lent);
    return taken(value, "what messaging_aliases_from_response returns");
}

CallEnd CheckedPlugin::complete(const PropertyList& response, const PropertyList* aliases) {
    CallEnd end;
    const wl_completion_handler handler = CheckedHandler::instance().handler();
    const wl_value* const lent = book().lend(borrowedHandle(response), nullptr, "the response");
    const wl_value* const chosen =
        aliases ? book().lend(borrowedHandle(*aliases), nullptr, "the chosen aliases") : nullptr;
    if (_getsAliases) {
        _call("complete_setup_with_response_chosen_aliases", end, [&](wl_error_slot* slot) {
            _instance->complete_setup_with_response_chosen_aliases(_instance, lent, chosen, handler, slot);
        });
    } else {
        _call("complete_setup_with_response", end, [&](wl_error_slot* slot) {
            _instance->complete_setup_with_response(_instance, lent, handler, slot);
        });
    }
    book().endLoan(lent);
    book().endLoan(chosen);
    return end;
}

void CheckedPlugin::terminate() {
    if (_instance->terminate_setup_completion) {
        CallEnd end;
        _call("terminate_setup_completion", end,
              [&](wl_error_slot* slot) { _instance->terminate_setup_completion(_instance, slot); });
    }
}

} // namespace welcomer::tool
