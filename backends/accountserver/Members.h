// The members of a message: writing them into a body, and taking them out of one with a name for whatever is
// wrong.

#pragma once

#include "backends/accountserver/Protocol.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace welcomer::accountserver {

// The bytes of a body with these members; see encode() in Messages.h.
std::optional<std::string> encodeMembers(const PropertyList::Dictionary& members, ContentType type,
                                         std::string* error);

// The members of one body, of which each is taken once. What is wrong with the first that is missing or no
// such thing is kept. Members that nobody takes are passed over.
class Members {
  public:
    // Reads a body.
    Members(std::string_view body, ContentType type);

    // Looks into an object within a body.
    //  path  what its members' names begin with in `error`
    Members(PropertyList::Dictionary members, std::string path)
        : _members(std::move(members)),
          _path(std::move(path)) {}

    // Each gives a member that has to be there, or something empty.
    std::string text(const char* name);
    std::string boundedText(const char* name, std::size_t minimum, std::size_t maximum); // sizes in bytes
    std::int64_t integer(const char* name);
    PropertyList::Dictionary dictionary(const char* name);
    PropertyList value(const char* name);
    Members object(const char* name);

    // Each gives a member that may be missing.
    std::optional<std::string> optionalText(const char* name);
    std::optional<bool> optionalBoolean(const char* name);
    std::optional<PropertyList::Dictionary> optionalDictionary(const char* name);
    std::optional<PropertyList> optionalValue(const char* name);

    // Says what is wrong, unless something is already.
    void refuse(const std::string& what);

    // Takes over what is wrong with an object within.
    void check(const Members& within) { refuse(within.error()); }

    // One line of printable ASCII; empty while nothing is wrong.
    const std::string& error() const { return _error; }

  private:
    void _refuseMember(const char* name, const char* why);
    template <class Content>
    std::optional<Content> _take(const char* name, const char* whatItIs, bool isRequired);

    PropertyList::Dictionary _members;
    std::string _path;
    std::string _error;
};

} // namespace welcomer::accountserver
