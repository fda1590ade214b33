#include "plugins/AbiDelegatePlugin.h"

#include "log/PCLogManager.h"
#include "plugins/CompletionHandlers.h"
#include "plugins/HostExtensions.h"
#include "plugins/PluginInstances.h"
#include "plugins/PluginMark.h"
#include "plugins/PluginText.h"
#include "plugins/PropertyListHandles.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/UnwritableValue.h"

#include <cstddef>
#include <exception>
#include <string_view>
#include <utility>

namespace welcomer {

namespace {

// The sizes of the first version; members that are added later are looked at only where a plug-in has them.
constexpr std::size_t kDescriptorSize =
    offsetof(wl_delegate_plugin_descriptor, destroy) + sizeof(wl_delegate_plugin_descriptor::destroy);
constexpr std::size_t kInstanceSize = offsetof(wl_delegate, messaging_aliases_from_response) +
                                      sizeof(wl_delegate::messaging_aliases_from_response);

// Calls into the plug-in of this name: `call` gets the error slot. Whatever exception leaves the plug-in's
// function ends here as a raise.
template <class Call>
auto callPlugin(const std::string& name, ErrorSlot& slot, Call call) -> decltype(call(slot.handle())) {
    const PluginMark mark(name.c_str());
    try {
        return call(slot.handle());
    } catch (const std::exception& exception) {
        slot.raise(exception.what());
    } catch (...) {
        slot.raise("unknown exception");
    }
    return decltype(call(slot.handle()))();
}

// The account request wraps a plug-in's request twice ("delegates", identifier), the replay object a response
// once more ("delegatesResponseDict"): both can be written, as deep as a plug-in may build them.
static_assert(WL_VALUE_DEPTH_LIMIT + 3 <= kPropertyListMaximumDepth);

// What goes into the account request or the replay object must be fit to be written there. The host lets a
// plug-in build nothing else, but a copy of a response may hold anything.
void throwIfUnwritable(const PropertyList& value, const char* operation) {
    if (const auto unwritable = findUnwritableValue(value)) {
        throw DelegatePluginException(std::string(operation) +
                                      " returned what cannot be written: " + *unwritable);
    }
}

void throwIfRaised(const ErrorSlot& slot) {
    if (slot.raised()) {
        throw DelegatePluginException(slot.message());
    }
}

// An operation that the plug-in leaves null and that is asked for all the same is its failure, as if it had
// raised.
template <class Function>
void throwIfMissing(Function* function, const char* operation) {
    if (!function) {
        throw DelegatePluginException(std::string(operation) + " is not implemented");
    }
}

// Calls a completion operation, whose handler does nothing more once it has raised.
template <class Call>
void callCompletion(const std::string& name, WLFirstRunDelegateConfiguration::CompletionHandler handler,
                    Call call) {
    const wl_completion_handler issued = issueCompletionHandler(std::move(handler));
    ErrorSlot slot;
    callPlugin(name, slot, [&](wl_error_slot* handle) { call(issued, handle); });
    if (slot.raised()) {
        revokeCompletionHandler(issued);
        throw DelegatePluginException(slot.message());
    }
}

} // namespace

const wl_delegate_plugin_descriptor* AbiDelegatePlugin::principalClass(const void* symbol,
                                                                       std::string& reason) {
    const auto* descriptor = static_cast<const wl_delegate_plugin_descriptor*>(symbol);
    if (!descriptor) {
        reason = "no symbol " WL_DELEGATE_PLUGIN_SYMBOL;
    } else if (descriptor->abi_version != WL_DELEGATE_PLUGIN_ABI_VERSION) {
        reason = "ABI version " + std::to_string(descriptor->abi_version) + " instead of " +
                 std::to_string(WL_DELEGATE_PLUGIN_ABI_VERSION);
    } else if (descriptor->size < kDescriptorSize) {
        reason = "the exported structure has " + std::to_string(descriptor->size) + " bytes instead of " +
                 std::to_string(kDescriptorSize);
    } else {
        return descriptor;
    }
    return nullptr;
}

bool AbiDelegatePlugin::conformsToProtocol(const wl_delegate_plugin_descriptor& principalClass) {
    return principalClass.protocol &&
           std::string_view(principalClass.protocol) == WL_DELEGATE_PLUGIN_PROTOCOL;
}

std::shared_ptr<AbiDelegatePlugin>
AbiDelegatePlugin::create(const wl_delegate_plugin_descriptor& principalClass, const std::string& name) {
    if (!principalClass.create) {
        return nullptr;
    }
    ErrorSlot slot;
    wl_delegate* const instance = callPlugin(name, slot, [&](wl_error_slot* handle) {
        return principalClass.create(&delegatePluginHost(), handle);
    });
    if (!instance) {
        throwIfRaised(slot);
        return nullptr;
    }
    // From here on the destructor gives the instance back.
    std::shared_ptr<AbiDelegatePlugin> plugin(new AbiDelegatePlugin(principalClass, instance, name));
    throwIfRaised(slot);
    if (instance->size < kInstanceSize) {
        return nullptr;
    }
    return plugin;
}

AbiDelegatePlugin::AbiDelegatePlugin(const wl_delegate_plugin_descriptor& principalClass,
                                     wl_delegate* instance, std::string name)
    : _principalClass(principalClass),
      _instance(instance),
      _name(std::move(name)) {
    addPluginInstance(_instance, _name);
}

AbiDelegatePlugin::~AbiDelegatePlugin() {
    dropBlocksOf(_instance);
    removePluginInstance(_instance);
    if (_principalClass.destroy) {
        ErrorSlot slot; // nobody is left to hear of it
        callPlugin(_name, slot, [this](wl_error_slot*) { _principalClass.destroy(_instance); });
    }
}

std::optional<std::string> AbiDelegatePlugin::delegateIdentifier() {
    std::optional<std::string> identifier = _askForIdentifier();
    if (!_firstIdentifier) {
        visitPluginInstance(
            _instance, [&](PluginInstance& known) { known.identifier = identifier.value_or(std::string()); });
        _firstIdentifier = std::move(identifier);
    } else if (identifier != *_firstIdentifier && !_hasChanged.exchange(true)) {
        _logChange(identifier);
    }
    return *_firstIdentifier;
}

// What a plug-in is known by decides what it gets: one that could change it would get what is meant for another.
void AbiDelegatePlugin::_logChange(const std::optional<std::string>& identifier) {
    const auto shown = [](const std::optional<std::string>& each) {
        return each ? std::optional(pluginText(*each)) : std::nullopt;
    };
    WL_LOG("Nimbus Plugins: '%@' has changed its identifier to '%@', the one on load counts: '%@'",
           pluginText(_name), shown(identifier), shown(*_firstIdentifier));
}

std::optional<std::string> AbiDelegatePlugin::_askForIdentifier() {
    throwIfMissing(_instance->delegate_identifier, "delegateIdentifier");
    ErrorSlot slot;
    const char* const identifier = callPlugin(_name, slot, [this](wl_error_slot* handle) {
        return _instance->delegate_identifier(_instance, handle);
    });
    throwIfRaised(slot);
    if (!identifier) {
        return std::nullopt;
    }
    throwIfUnwritable(identifier, "delegateIdentifier");
    return identifier;
}

std::optional<PropertyList> AbiDelegatePlugin::delegateSetupRequest() {
    throwIfMissing(_instance->delegate_setup_request, "delegateSetupRequest");
    ErrorSlot slot;
    auto request = takeHandle(callPlugin(_name, slot, [this](wl_error_slot* handle) {
        return _instance->delegate_setup_request(_instance, handle);
    }));
    throwIfRaised(slot);
    if (request && !request->isDictionary()) {
        throw DelegatePluginException("delegateSetupRequest returned no dictionary");
    }
    if (request) {
        throwIfUnwritable(*request, "delegateSetupRequest");
    }
    return request;
}

void AbiDelegatePlugin::completeSetupWithResponseHandler(const PropertyList& response,
                                                         CompletionHandler handler) {
    throwIfMissing(_instance->complete_setup_with_response, "completeSetupWithResponse:handler:");
    callCompletion(_name, std::move(handler), [&](wl_completion_handler issued, wl_error_slot* slot) {
        _instance->complete_setup_with_response(_instance, borrowedHandle(response), issued, slot);
    });
}

void AbiDelegatePlugin::terminateSetupCompletion() {
    if (!_instance->terminate_setup_completion) {
        return;
    }
    ErrorSlot slot;
    callPlugin(_name, slot,
               [this](wl_error_slot* handle) { _instance->terminate_setup_completion(_instance, handle); });
    throwIfRaised(slot);
}

void AbiDelegatePlugin::completeSetupWithResponseChosenAliasesHandler(
    const PropertyList& response, const std::optional<std::vector<std::string>>& aliases,
    CompletionHandler handler) {
    throwIfMissing(_instance->complete_setup_with_response_chosen_aliases,
                   "completeSetupWithResponse:chosenAliases:handler:");
    std::optional<PropertyList> array;
    if (aliases) {
        array = PropertyList::Array(aliases->begin(), aliases->end());
    }
    callCompletion(_name, std::move(handler), [&](wl_completion_handler issued, wl_error_slot* slot) {
        _instance->complete_setup_with_response_chosen_aliases(
            _instance, borrowedHandle(response), array ? borrowedHandle(*array) : nullptr, issued, slot);
    });
}

std::optional<std::vector<std::string>>
AbiDelegatePlugin::messagingAliasesFromResponse(const PropertyList& response) {
    throwIfMissing(_instance->messaging_aliases_from_response, "messagingAliasesFromResponse:");
    ErrorSlot slot;
    auto aliases = takeHandle(callPlugin(_name, slot, [&](wl_error_slot* handle) {
        return _instance->messaging_aliases_from_response(_instance, borrowedHandle(response), handle);
    }));
    throwIfRaised(slot);
    if (!aliases) {
        return std::nullopt;
    }
    if (!aliases->isArray()) {
        throw DelegatePluginException("messagingAliasesFromResponse: returned no array");
    }
    throwIfUnwritable(*aliases, "messagingAliasesFromResponse:");
    std::vector<std::string> texts;
    for (PropertyList& alias : *aliases->array()) {
        if (!alias.isString()) {
            throw DelegatePluginException(
                "messagingAliasesFromResponse: returned an alias that is no string");
        }
        texts.push_back(std::move(*alias.string()));
    }
    return texts;
}

const void* AbiDelegatePlugin::extension(const char* identifier) {
    if (!WL_HAS_MEMBER(_instance, get_extension) || !_instance->get_extension) {
        return nullptr;
    }
    ErrorSlot slot; // what it throws comes to the same as none
    return callPlugin(_name, slot,
                      [&](wl_error_slot*) { return _instance->get_extension(_instance, identifier); });
}

std::string AbiDelegatePlugin::className() const {
    return _principalClass.class_name ? pluginText(_principalClass.class_name) : "(unnamed)";
}

} // namespace welcomer
