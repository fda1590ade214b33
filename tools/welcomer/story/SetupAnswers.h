// What is to be set up, and the file that answers a setup's questions.

#pragma once

#include "propertylist/PropertyList.h"
#include "tools/welcomer/story/SetupFlow.h"

#include <string>
#include <vector>

namespace welcomer::tool {

// What the user decided.
struct Decisions {
    std::string account;
    std::vector<std::string> services; // identifiers
    ChosenAliases aliases;
    bool justTheAccountAndKVS = false;
};

// A file with the answers: a dictionary with the account's name, and where not everything is wanted the
// services and, by delegate identifier, the aliases. What is wrong with it is thrown as CommandFailure.
class SetupAnswers {
  public:
    //  file  as for readPropertyListFile(); it is read at once
    explicit SetupAnswers(const std::string& file);

    // Takes the chosen aliases, all that are on offer where the answers say nothing.
    void choose(const std::vector<AliasOffer>& offers);

    Decisions decisions;

  private:
    [[noreturn]] void _fail(const std::string& reason) const;
    const PropertyList* _find(const char* key) const;
    std::vector<std::string> _texts(const PropertyList& value, const char* key) const;
    void _readServices();
    void _checkAliases() const;

    const std::string _file;
    PropertyList::Dictionary _values;
};

} // namespace welcomer::tool
