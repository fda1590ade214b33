// The completion, with every kind of response.

#include "platform/AccountService.h"
#include "plugins/PluginText.h"
#include "tools/welcomer/plugins/CheckingHost.h"
#include "tools/welcomer/plugins/Checks.h"

namespace welcomer::tool::checks {

namespace {

using namespace std::chrono_literals;

constexpr auto kWatched = 200ms; // for a second answer
constexpr std::size_t kManyEntries = 20000;
constexpr std::size_t kLongText = std::size_t{4} << 20; // bytes

std::vector<HandlerCall> answers() {
    return CheckedHandler::instance().calls();
}

// One completion from the beginning. That there is an answer at all is what is asked, whichever it is.
CallEnd answerTo(CheckedPlugin& plugin, CheckReport& report, const Completion& completion) {
    return beginLife(plugin) ? completeLife(plugin, report, completion) : CallEnd{};
}

PropertyList largeValue() {
    PropertyList::Dictionary entries{{platform::kStatusKey, 0},
                                     {"text", std::string(kLongText, 'x')},
                                     {"data", PropertyList::Data{std::string(kLongText, '\0')}}};
    PropertyList::Array list;
    for (std::size_t number = 0; number < kManyEntries; ++number) {
        entries["entry " + std::to_string(number)] = static_cast<std::int64_t>(number);
        list.emplace_back("element " + std::to_string(number));
    }
    entries["list"] = std::move(list);
    return entries;
}

// Nested as deep as a response can be, by dictionaries and arrays in turn.
PropertyList deepValue() {
    PropertyList value = "the end";
    for (int depth = 1; depth < WL_VALUE_DEPTH_LIMIT; ++depth) {
        value = depth % 2 == 0 ? PropertyList(PropertyList::Array{std::move(value)})
                               : PropertyList(PropertyList::Dictionary{{"deeper", std::move(value)}});
    }
    return PropertyList::Dictionary{{platform::kStatusKey, 0}, {"deeper", std::move(value)}};
}

// What is wrong with the aliases that it offers for a response.
std::string problemWithAliases(CheckedPlugin& plugin, const PropertyList& response) {
    const auto offered = plugin.aliases(response);
    if (!offered) {
        return "";
    }
    if (!offered->isArray()) {
        return "what messaging_aliases_from_response returns is no array";
    }
    for (const PropertyList& alias : *offered->array()) {
        if (!alias.isString()) {
            return "messaging_aliases_from_response returns an alias that is no string";
        }
    }
    return "";
}

} // namespace

void completion(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    const CallEnd end = answerTo(plugin, report, {.response = input.response});
    if (end.raised) {
        report.see("it raised: " + *end.raised);
    } else if (const auto calls = answers(); !calls.empty()) {
        report.see(calls.front().succeeded ? "it succeeded"
                                           : "it failed: " + pluginText(calls.front().message));
    }
}

void handlerOnce(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    const CallEnd end = answerTo(plugin, report, {.response = input.response, .watched = kWatched});
    const std::size_t count = answers().size();
    if (count > 1) {
        report.find("the handler was called " + std::to_string(count) + " times");
    } else if (end.raised && count > 0) {
        report.find("it raised, and called the handler as well");
    }
}

void handlerContext(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    answerTo(plugin, report, {.response = input.response});
    for (const HandlerCall& call : answers()) {
        if (!call.isOwnContext) {
            report.find("the handler was called with another context than the one that was given");
            return;
        }
    }
}

void errorMessage(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    answerTo(plugin, report, {.response = input.response});
    for (const HandlerCall& call : answers()) {
        if (call.hasMessage && pluginText(call.message) != call.message) {
            report.find("the error's message is no line of UTF-8 of at most " +
                        std::to_string(kMaximumPluginText) + " bytes: " + pluginText(call.message));
        } else if (call.succeeded && call.hasMessage) {
            report.find("it succeeded, and gives an error: " + call.message);
        }
    }
}

void terminated(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    answerTo(plugin, report, {.response = input.response, .isTerminated = true, .watched = kWatched});
    if (const std::size_t count = answers().size(); count > 1) {
        report.find("the handler was called " + std::to_string(count) + " times");
    }
}

void callerGone(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    answerTo(plugin, report, {.response = input.response, .callerEnds = true});
}

void arrayResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = PropertyList::Array{1, "two"}});
}

void stringResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = "text"});
}

void integerResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = -1});
}

void realResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = 0.5});
}

void booleanResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = true});
}

void dataResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = PropertyList::Data{std::string("\0\xff", 2)}});
}

void dateResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = PropertyList::Date{0}});
}

void emptyResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = PropertyList::Dictionary()});
}

void largeResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = largeValue()});
}

void deepResponse(CheckedPlugin& plugin, CheckReport& report, const CheckInput& /*input*/) {
    answerTo(plugin, report, {.response = deepValue()});
}

void aliasesOffered(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    if (!beginLife(plugin) || !plugin.getsAliases()) {
        return;
    }
    for (const PropertyList& response :
         {input.response, PropertyList(PropertyList::Dictionary()), PropertyList("text")}) {
        if (const std::string problem = problemWithAliases(plugin, response); !problem.empty()) {
            report.find(problem);
            return;
        }
    }
}

void aliasesChosen(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input) {
    if (beginLife(plugin) && plugin.getsAliases()) {
        completeLife(plugin, report, {.response = input.response, .aliases = std::nullopt});
    }
}

} // namespace welcomer::tool::checks
