#include "backends/desktop/accounts/PendingSwitches.h"

#include "propertylist/PropertyListReadings.h"

namespace welcomer::desktop {

namespace {

// A service's identifier has no space.
std::string keyOf(const std::string& account, const std::string& service) {
    return service + " of " + account;
}

} // namespace

void PendingSwitches::setMade(const std::string& account) const {
    _store.setValue(account, true, kOnlineAccountsDomain);
    _store.synchronise(kOnlineAccountsDomain);
}

bool PendingSwitches::isMade(const std::string& account) const {
    return booleanReading(_store.copyValue(account, kOnlineAccountsDomain));
}

void PendingSwitches::note(const std::string& account, const std::string& service) const {
    refresh();
    if (!has(account, service)) {
        _store.setValue(keyOf(account, service), true, kPendingSwitchesDomain);
        _store.synchronise(kPendingSwitchesDomain);
    }
}

void PendingSwitches::forget(const std::string& account, const std::string& service) const {
    refresh();
    if (has(account, service)) {
        _store.removeValue(keyOf(account, service), kPendingSwitchesDomain);
        _store.synchronise(kPendingSwitchesDomain);
    }
}

void PendingSwitches::refresh() const {
    _store.synchronise(kPendingSwitchesDomain);
}

bool PendingSwitches::has(const std::string& account, const std::string& service) const {
    return booleanReading(_store.copyValue(keyOf(account, service), kPendingSwitchesDomain));
}

} // namespace welcomer::desktop
