// The values that a plug-in holds, each behind a handle that says whose it is.

#pragma once

#include "sdk/welcomer/delegate_plugin.h"

#include <cstddef>
#include <deque>
#include <mutex>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

namespace welcomer::tool {

// How a plug-in treated a handle that was not so for it to use.
enum class Misuse {
    ReleasedTwice,    // released, or passed on, when it was gone already
    ChangedBorrowed,  // changed, released or passed on, though it was only lent
    UsedAfterRelease, // read or changed when it was gone, or no longer lent
    SlotOfAnother,    // an error slot of another call, or of one that has ended
};

struct MisuseRecord {
    Misuse misuse;
    std::string text; // one line for people
};

// Gives out handles, each of them once in the life of the process, so that one that was given back is known for what it
// is. The values behind them stay as long as the book, also those that were released: what a plug-in does with one is
// reported, and does no harm. Any thread; a handle is never used by two at once.
class HandleBook {
  public:
    HandleBook() = default;
    ~HandleBook(); // with what was owned and not passed on
    HandleBook(const HandleBook&) = delete;
    HandleBook& operator=(const HandleBook&) = delete;

    // The one that the checking host writes into. Lives until the process ends.
    static HandleBook& instance();

    // A handle for what the plug-in now owns.
    //  value     null gives null
    //  function  the host's that made it
    wl_value* own(wl_value* value, const char* function);

    // A handle for what the plug-in may read until `source` changes or goes, or, without one, until endLoan().
    //  value  null gives null
    const wl_value* lend(const wl_value* value, const wl_value* source, const char* function);
    void endLoan(const wl_value* handle);

    // The value behind a handle, to be read; null for null, and where there is none any more.
    const wl_value* read(const wl_value* handle, const char* function);

    // The value behind an owned handle, to be changed: what was lent of it is no longer. Null as above.
    wl_value* change(wl_value* handle, const char* function);

    // What becomes the host's: the handle is gone then.
    //  result  the value; null where the plug-in did not own it
    wl_value* pass(wl_value* handle, const char* function);

    // Ends what a handle stands for. Null does nothing.
    void release(wl_value* handle);

    // Error slots, for as long as a call lasts.
    void open(const wl_error_slot* slot);
    void close(const wl_error_slot* slot);
    bool isOpen(const wl_error_slot* slot);

    // How many values the plug-in owns now, and by which functions they came, with a comma between.
    std::size_t owned() const;
    std::string ownedTexts() const;

    // What was misused so far.
    std::vector<MisuseRecord> misuses() const;

  private:
    enum class State { Owned, Lent, Released, Passed, Returned };
    struct Handle {
        State state;
        wl_value* value;       // null once it is part of another
        const Handle* source;  // what it was lent of, or null
        std::size_t versionOf; // that one's, when it was lent
        std::size_t version = 0;
        std::string from;
    };

    Handle* _find(const wl_value* handle, const char* function);
    bool _isStale(const Handle& handle) const;
    bool _isGone(const Handle& handle, Misuse misuse, const char* function);
    void _note(Misuse misuse, const Handle& handle, const char* function, const char* what);

    mutable std::mutex _mutex;
    std::deque<Handle> _handles; // never shrinks
    std::unordered_set<const void*> _known;
    std::unordered_set<const wl_error_slot*> _slots;
    std::vector<MisuseRecord> _misuses;
};

} // namespace welcomer::tool
