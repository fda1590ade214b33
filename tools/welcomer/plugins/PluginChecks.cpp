#include "tools/welcomer/plugins/PluginChecks.h"

#include <array>

namespace welcomer::tool {

namespace {

using enum Severity;
using enum EndsThatCount;

constexpr auto kLibraryChecks = std::to_array<PluginCheck>({
    {"library", "is a shared library for this kind of machine", "plugins.md: shared library", "", Failure,
     All, checks::library},
    {"exported-symbol", "exports wl_delegate_plugin", "welcomer/delegate_plugin.h: WL_DELEGATE_PLUGIN_SYMBOL",
     "library", Failure, All, checks::exportedSymbol},
    {"unique-symbols", "shares no variable of its own with other plug-ins", "plugins.md: -fno-gnu-unique",
     "library", Failure, All, checks::uniqueSymbols},
    {"visibility", "exports nothing else", "welcomer/delegate_plugin.h: -fvisibility=hidden", "library",
     Warning, All, checks::visibility},
    {"static-initialisers", "is loaded without ending the process or holding it up",
     "plugins.md: static initialiser", "exported-symbol", Failure, All, checks::staticInitialisers},
    {"loads", "is loaded with all that it needs", "plugins.md: plugins list", "static-initialisers", Failure,
     All, checks::loads},
    {"version", "has the version of the interface", "welcomer/delegate_plugin.h: abi_version", "loads",
     Failure, All, checks::version},
    {"structure-size", "says a size of the exported structure that can be",
     "welcomer/delegate_plugin.h: size", "version", Failure, All, checks::structureSize},
    {"protocol", "names the protocol", "welcomer/delegate_plugin.h: WL_DELEGATE_PLUGIN_PROTOCOL",
     "structure-size", Failure, All, checks::protocol},
    {"class-name", "has a class name for messages", "welcomer/delegate_plugin.h: class_name",
     "structure-size", Warning, All, checks::className},
    {"create-function", "has create", "welcomer/delegate_plugin.h: (*create)", "structure-size", Failure, All,
     checks::createFunction},
    {"destroy-function", "has destroy", "welcomer/delegate_plugin.h: (*destroy)", "structure-size", Warning,
     All, checks::destroyFunction},
    {"address-sanitizer", "draws no report, where it was built with the address sanitizer",
     "plugins.md: address sanitizer", "create-function", Failure, SanitizerReport, checks::wholeLife},
    {"exit", "does not end the process by exit", "plugins.md: exit()", "address-sanitizer", Failure, Exit,
     checks::wholeLife},
    {"exceptions", "lets no exception out", "welcomer/delegate_plugin.h: No C++ exception", "exit", Failure,
     None, checks::exceptions},
    {"calling-thread", "leaves the thread that calls it running", "plugins.md: pthread_exit", "exceptions",
     Failure, None, checks::callingThread},
    {"forks", "does not fork", "plugins.md: forks", "exit", Failure, None, checks::forks},
});

constexpr auto kInstanceChecks = std::to_array<PluginCheck>({
    {"create", "makes an instance", "welcomer/delegate_plugin.h: (*create)", "calling-thread", Failure, All,
     checks::create},
    {"instance-size", "says a size of the instance's structure that can be",
     "welcomer/delegate_plugin.h: size", "create", Failure, All, checks::instanceSize},
    {"required-functions", "has the functions that are required", "welcomer/delegate_plugin.h: Optional: no",
     "instance-size", Failure, All, checks::requiredFunctions},
    {"first-host", "does with a host of the first version, and what its structure has",
     "welcomer/delegate_plugin.h: WL_HAS_MEMBER", "required-functions", Failure, All, checks::firstHost},
    {"extensions", "has no extension that nobody knows", "welcomer/delegate_plugin.h: get_extension",
     "required-functions", Failure, All, checks::extensions},
    {"identifier", "has an identifier in reverse-domain form",
     "welcomer/delegate_plugin.h: delegate_identifier", "required-functions", Failure, All,
     checks::identifier},
    {"identifier-again", "has the same one at every call",
     "welcomer/delegate_plugin.h: the same at every call", "identifier", Failure, All,
     checks::identifierAgain},
    {"identifier-threads", "has the same one on every thread",
     "welcomer/delegate_plugin.h: delegate_identifier", "identifier-again", Failure, All,
     checks::identifierOnThreads},
    {"destroy", "can be destroyed unused, and destroy takes null", "welcomer/delegate_plugin.h: (*destroy)",
     "identifier", Failure, All, checks::destroy},
    {"request", "asks for a dictionary that can be written, or for nothing",
     "welcomer/delegate_plugin.h: delegate_setup_request", "identifier", Failure, All, checks::request},
    {"request-threads", "asks for it on several threads at once",
     "welcomer/delegate_plugin.h: several threads at once", "request", Failure, All,
     checks::requestOnThreads},
    {"completion", "answers the ordinary response",
     "welcomer/delegate_plugin.h: complete_setup_with_response", "request", Failure, All, checks::completion},
    {"handler-once", "answers once", "plugins.md: exactly once", "completion", Failure, All,
     checks::handlerOnce},
    {"handler-context", "answers with the context that it was given", "welcomer/delegate_plugin.h: context",
     "completion", Failure, All, checks::handlerContext},
    {"error-message", "fails with one line of UTF-8", "welcomer/delegate_plugin.h: error_message",
     "completion", Warning, All, checks::errorMessage},
    {"terminated", "answers also when it is to stop",
     "welcomer/delegate_plugin.h: terminate_setup_completion", "handler-once", Failure, All,
     checks::terminated},
    {"caller-gone", "answers when the thread that asked has ended",
     "welcomer/delegate_plugin.h: The call may return", "completion", Failure, All, checks::callerGone},
    {"response-empty", "answers an empty dictionary", "plugins.md: whatever its type", "completion", Failure,
     All, checks::emptyResponse},
    {"response-array", "answers an array", "plugins.md: whatever its type", "completion", Failure, All,
     checks::arrayResponse},
    {"response-string", "answers a text", "plugins.md: whatever its type", "completion", Failure, All,
     checks::stringResponse},
    {"response-integer", "answers a whole number", "plugins.md: whatever its type", "completion", Failure,
     All, checks::integerResponse},
    {"response-real", "answers a real number", "plugins.md: whatever its type", "completion", Failure, All,
     checks::realResponse},
    {"response-boolean", "answers a boolean", "plugins.md: whatever its type", "completion", Failure, All,
     checks::booleanResponse},
    {"response-data", "answers data", "plugins.md: whatever its type", "completion", Failure, All,
     checks::dataResponse},
    {"response-date", "answers a date", "plugins.md: whatever its type", "completion", Failure, All,
     checks::dateResponse},
    {"response-large", "answers a dictionary of several megabytes", "plugins.md: whatever its type",
     "completion", Failure, All, checks::largeResponse},
    {"response-deep", "answers a response that is nested as deep as one can be",
     "welcomer/delegate_plugin.h: WL_VALUE_DEPTH_LIMIT", "completion", Failure, All, checks::deepResponse},
    {"aliases-offered", "offers an array of strings, where it offers aliases",
     "welcomer/delegate_plugin.h: messaging_aliases_from_response", "request", Failure, All,
     checks::aliasesOffered},
    {"aliases-none", "answers also without chosen aliases",
     "welcomer/delegate_plugin.h: complete_setup_with_response_chosen_aliases", "completion", Failure, All,
     checks::aliasesChosen},
});

constexpr auto kHygieneChecks = std::to_array<PluginCheck>({
    {"value-leaks", "releases what it owns", "welcomer/delegate_plugin.h: Ownership", "completion", Failure,
     All, checks::leaks},
    {"value-kept", "holds no values once it has answered", "welcomer/delegate_plugin.h: Ownership",
     "completion", Warning, All, checks::keptValues},
    {"value-released-twice", "releases, or passes on, what it owns once",
     "welcomer/delegate_plugin.h: release", "completion", Failure, All, checks::releasedTwice},
    {"value-lent", "does not change or release what it was lent", "welcomer/delegate_plugin.h: borrowed",
     "completion", Failure, All, checks::changedBorrowed},
    {"value-gone", "does not use values that are gone", "welcomer/delegate_plugin.h: borrowed", "completion",
     Failure, All, checks::usedAfterRelease},
    {"error-slot", "raises with the slot of the call", "welcomer/delegate_plugin.h: wl_error_slot",
     "completion", Failure, All, checks::errorSlots},
    {"working-directory", "leaves the working directory", "plugins.md: everybody's", "completion", Failure,
     All, checks::workingDirectory},
    {"locale", "leaves the locale", "plugins.md: everybody's", "completion", Failure, All, checks::locale},
    {"umask", "leaves the umask", "plugins.md: everybody's", "completion", Failure, All,
     checks::fileModeMask},
    {"signal-handlers", "leaves the handlers of signals", "plugins.md: everybody's", "completion", Warning,
     All, checks::signalHandlers},
    {"descriptors", "leaves the host's descriptors", "plugins.md: everybody's", "completion", Failure, All,
     checks::descriptors},
    {"descriptors-inherited", "leaves none open for programs that are started", "plugins.md: everybody's",
     "completion", Warning, All, checks::openedDescriptors},
});

constexpr auto kAllChecks = [] {
    std::array<PluginCheck, kLibraryChecks.size() + kInstanceChecks.size() + kHygieneChecks.size()> all{};
    auto next = all.begin();
    for (const std::span<const PluginCheck> part :
         {std::span<const PluginCheck>(kLibraryChecks), std::span<const PluginCheck>(kInstanceChecks),
          std::span<const PluginCheck>(kHygieneChecks)}) {
        for (const PluginCheck& check : part) {
            *next++ = check;
        }
    }
    return all;
}();

} // namespace

std::span<const PluginCheck> pluginChecks() {
    return kAllChecks;
}

} // namespace welcomer::tool
