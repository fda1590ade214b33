#include "tools/welcomer/story/SetupAnswers.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "text/Format.h"
#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/story/ServiceStates.h"
#include "tools/welcomer/terminal/Failure.h"

#include <algorithm>
#include <utility>

namespace welcomer::tool {

namespace {

constexpr const char* kAccountKey = "Account";
constexpr const char* kServicesKey = "Services";
constexpr const char* kAliasesKey = "Aliases";
constexpr const char* kJustTheAccountAndKVSKey = "JustTheAccountAndKVS";

} // namespace

SetupAnswers::SetupAnswers(const std::string& file) : _file(file) {
    const PropertyList content = readPropertyListFile(file);
    if (!content.isDictionary()) {
        _fail("the answers are no dictionary");
    }
    _values = *content.dictionary();
    for (const auto& [key, value] : _values) {
        if (key != kAccountKey && key != kServicesKey && key != kAliasesKey &&
            key != kJustTheAccountAndKVSKey) {
            _fail("no question is called " + key);
        }
    }
    const PropertyList* account = _find(kAccountKey);
    if (!account || !account->isString() || account->string()->empty()) {
        _fail(std::string(kAccountKey) + " is to be the account's name");
    }
    decisions.account = *account->string();
    _readServices();
    if (const PropertyList* flag = _find(kJustTheAccountAndKVSKey)) {
        if (!flag->boolean()) {
            _fail(std::string(kJustTheAccountAndKVSKey) + " is to be true or false");
        }
        decisions.justTheAccountAndKVS = *flag->boolean();
    }
    _checkAliases();
}

void SetupAnswers::choose(const std::vector<AliasOffer>& offers) {
    for (const AliasOffer& offer : offers) {
        decisions.aliases[offer.identifier] = offer.aliases;
    }
    const PropertyList* aliases = _find(kAliasesKey);
    for (const auto& [identifier, wanted] : aliases ? *aliases->dictionary() : PropertyList::Dictionary()) {
        const auto offer = std::ranges::find(offers, identifier, &AliasOffer::identifier);
        if (offer == offers.end()) {
            _fail(identifier + " has no aliases on offer");
        }
        std::vector<std::string> chosen = _texts(wanted, kAliasesKey);
        for (const std::string& alias : chosen) {
            if (std::ranges::find(offer->aliases, alias) == offer->aliases.end()) {
                _fail(text::format("%@ has no alias %@ on offer", identifier, alias));
            }
        }
        decisions.aliases[identifier] = std::move(chosen);
    }
}

void SetupAnswers::_fail(const std::string& reason) const {
    throw CommandFailure(_file + ": " + reason);
}

const PropertyList* SetupAnswers::_find(const char* key) const {
    const auto found = _values.find(key);
    return found == _values.end() ? nullptr : &found->second;
}

std::vector<std::string> SetupAnswers::_texts(const PropertyList& value, const char* key) const {
    std::vector<std::string> texts;
    if (!value.isArray()) {
        _fail(std::string(key) + " is to hold texts in an array");
    }
    for (const PropertyList& element : *value.array()) {
        if (!element.isString()) {
            _fail(std::string(key) + " is to hold texts in an array");
        }
        texts.push_back(*element.string());
    }
    return texts;
}

void SetupAnswers::_readServices() {
    decisions.services = WLNimbusAllSetupServiceIDs();
    if (const PropertyList* services = _find(kServicesKey)) {
        decisions.services.clear();
        for (const std::string& name : _texts(*services, kServicesKey)) {
            try {
                decisions.services.push_back(serviceNamed(name));
            } catch (const UsageError& error) {
                _fail(error.what());
            }
        }
    }
}

// As far as that is possible before the server has said what is on offer.
void SetupAnswers::_checkAliases() const {
    const PropertyList* aliases = _find(kAliasesKey);
    if (aliases && !aliases->isDictionary()) {
        _fail(std::string(kAliasesKey) + " is to be a dictionary by delegate identifier");
    }
}

} // namespace welcomer::tool
