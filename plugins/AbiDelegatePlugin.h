// A plug-in on the other side of the C boundary.

#pragma once

#include "platform/Error.h"
#include "plugins/WLFirstRunDelegateConfiguration.h"
#include "sdk/welcomer/delegate_plugin.h"

#include <atomic>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {

// What every call into a plug-in that raises throws, with the plug-in's own text.
class DelegatePluginException : public platform::Exception {
  public:
    using platform::Exception::Exception;
};

// Passes each operation on to an instance that a plug-in made. Whatever the plug-in's function does, nothing
// but a DelegatePluginException (or the standard library's own want of memory) comes out, and a plug-in that
// raises has its handler revoked. The operations are as safe on several threads at once as the plug-in's own.
class AbiDelegatePlugin final : public WLFirstRunDelegateConfiguration {
  public:
    // What a plug-in exports, or null for what no principal class can be taken from: null, another ABI
    // version, or a structure that is too small. Any thread.
    //  symbol  where the exported symbol is; read only as far as it says itself that it reaches
    //  reason  set to one line for people when the result is null
    static const wl_delegate_plugin_descriptor* principalClass(const void* symbol, std::string& reason);

    // Whether a principal class conforms to the plug-in protocol. Any thread.
    static bool conformsToProtocol(const wl_delegate_plugin_descriptor& principalClass);

    // A new instance, or null when the class makes none. Throws DelegatePluginException when that raises. On
    // the calling thread.
    //  principalClass  borrowed until the process ends
    //  name            of the plug-in's entry, with which threads are marked while they are in the plug-in
    static std::shared_ptr<AbiDelegatePlugin> create(const wl_delegate_plugin_descriptor& principalClass,
                                                     const std::string& name);

    ~AbiDelegatePlugin() override;
    AbiDelegatePlugin(const AbiDelegatePlugin&) = delete;
    AbiDelegatePlugin& operator=(const AbiDelegatePlugin&) = delete;

    // An identifier that is no UTF-8 counts as raising. The first answer counts: one that differs later is logged,
    // once, and the first one is given. The first time with no other call on the instance.
    std::optional<std::string> delegateIdentifier() override;
    // A request that is no dictionary counts as raising.
    std::optional<PropertyList> delegateSetupRequest() override;
    void completeSetupWithResponseHandler(const PropertyList& response, CompletionHandler handler) override;
    void terminateSetupCompletion() override;
    void completeSetupWithResponseChosenAliasesHandler(const PropertyList& response,
                                                       const std::optional<std::vector<std::string>>& aliases,
                                                       CompletionHandler handler) override;
    // Aliases that are no array of strings count as raising.
    std::optional<std::vector<std::string>>
    messagingAliasesFromResponse(const PropertyList& response) override;
    // What else the delegate can do: the structure of an extension, or null. Lives as long as this object.
    const void* extension(const char* identifier);

    // "(unnamed)" when the plug-in gives no name.
    std::string className() const override;

  private:
    AbiDelegatePlugin(const wl_delegate_plugin_descriptor& principalClass, wl_delegate* instance,
                      std::string name);

    const wl_delegate_plugin_descriptor& _principalClass;
    wl_delegate* _instance; // owned
    const std::string _name;
    std::optional<std::optional<std::string>> _firstIdentifier; // none until it was asked
    std::atomic<bool> _hasChanged = false;                      // and that was logged

    std::optional<std::string> _askForIdentifier();
    void _logChange(const std::optional<std::string>& identifier);
};

} // namespace welcomer
