// The little that is needed of the system's journal, over sd-journal.

#pragma once

#include <memory>
#include <optional>
#include <string>
#include <systemd/sd-journal.h>

namespace welcomer::journal {

struct Close {
    void operator()(sd_journal* journal) const { ::sd_journal_close(journal); }
};
using Journal = std::unique_ptr<sd_journal, Close>;

// Has the journal show those entries alone in which a field has this value. Matches of different fields must all
// hold; of several for one field, one.
//  result  whether it could be asked for
bool match(sd_journal* journal, const std::string& name, const std::string& value);

// A field of the entry that the journal is at; none where it has none.
std::optional<std::string> field(sd_journal* journal, const std::string& name);

} // namespace welcomer::journal
