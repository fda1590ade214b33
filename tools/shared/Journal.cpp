#include "tools/shared/Journal.h"

namespace welcomer::journal {

bool match(sd_journal* journal, const std::string& name, const std::string& value) {
    const std::string wanted = name + "=" + value;
    return ::sd_journal_add_match(journal, wanted.data(), wanted.size()) >= 0;
}

std::optional<std::string> field(sd_journal* journal, const std::string& name) {
    const void* data = nullptr;
    std::size_t size = 0;
    if (::sd_journal_get_data(journal, name.c_str(), &data, &size) < 0 || size <= name.size()) {
        return std::nullopt;
    }
    // "NAME=value"
    return std::string(static_cast<const char*>(data) + name.size() + 1, size - name.size() - 1);
}

} // namespace welcomer::journal
