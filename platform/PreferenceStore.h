// The current user's preferences on any host, in named domains.

#pragma once

#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace welcomer::platform {

// The domain of the application's standard defaults.
inline constexpr char kStandardDefaultsDomain[] = "com.corvid.welcomer";

// What a store found in place of a domain: something that is no property list or holds no dictionary, or a
// dictionary with a value that cannot be written back.
struct DamagedPreferences {
    std::string domain;
    std::string reason;       // one line
    std::string setAsidePath; // where the damaged content is now; empty while it is still in its place
    friend bool operator==(const DamagedPreferences&, const DamagedPreferences&) = default;
};

// Changes are seen by this store at once and by others after `synchronise`; what others have changed is seen
// after `synchronise`, and when a domain is first used. A domain that is damaged counts as empty; it is never
// overwritten, but set aside. A domain's name is a reverse-domain name; one that is empty or holds a slash
// names a domain that is always empty and never synchronises.
//
// What is stored is what propertylist/UnwritableValue.h finds no fault with. A domain whose stored content
// holds something else (another tool wrote it in another format) can be read, every value of it. It is left
// as it is, and does not synchronise with changes, until they set or remove the key in question: no value is
// lost, or changes its type, for the sake of another. Refusals and damage are told in the system log, one
// line each.
//
// Any thread. Values and defaults may be read from a file, which setting and removing never changes.
class PreferenceStore {
  public:
    virtual ~PreferenceStore() = default;

    // A copy of the value, or none when the domain has no such key.
    virtual std::optional<PropertyList> copyValue(const std::string& key, const std::string& domain) = 0;

    // Copies of several values; unless a store does better, one `copyValue` after the other.
    //  keys    distinct ones
    //  result  one for each key, in their order; none where the domain has no such key
    virtual std::vector<std::optional<PropertyList>> copyValues(std::span<const std::string> keys,
                                                                const std::string& domain);

    // Sets or removes a value. One that cannot be written is refused with a line that names domain and key;
    // what was there stays.
    virtual void setValue(const std::string& key, const PropertyList& value, const std::string& domain) = 0;
    virtual void removeValue(const std::string& key, const std::string& domain) = 0;

    // Brings a domain and this store in line: stores the keys that were changed here, and those alone, and
    // then sees what others have stored. All or nothing, also when the process is killed meanwhile; without
    // changes nothing is written. Any process; may block while another one synchronises.
    //  result  false when the changes could not be stored; they are kept, and the next call tries again
    virtual bool synchronise(const std::string& domain) = 0;

    // The damage that this store has met so far, in order.
    virtual std::vector<DamagedPreferences> damagedPreferences() = 0;

    // The application's standard defaults, read as `copyValue` reads.
    bool booleanDefault(const std::string& key);
    std::int64_t integerDefault(const std::string& key);
};

} // namespace welcomer::platform
