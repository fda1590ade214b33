#include "propertylist/UnwritableValue.h"

#include "propertylist/CalendarDate.h"
#include "propertylist/PropertyListReadError.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/UTF8.h"

#include <algorithm>
#include <cstddef>
#include <string_view>
#include <utility>
#include <vector>

namespace welcomer {

namespace {

// Deeper places are told by the way's beginning.
constexpr std::size_t kMostSteps = 8;

// What cannot be written, and the way to it.
struct Finding {
    std::string reason;
    std::vector<std::string> steps = {}; // the innermost first

    std::string text() const {
        std::string where;
        const std::size_t shown = std::min(steps.size(), kMostSteps);
        for (std::size_t index = 0; index < shown; ++index) {
            where += (index == 0 ? "" : "/") + steps[steps.size() - 1 - index];
        }
        where += shown < steps.size() ? "/..." : "";
        return (steps.empty() ? "the value" : where) + ' ' + reason;
    }
};

std::optional<Finding> findIn(const PropertyList& value, int depth);

std::optional<Finding> findInText(std::string_view text, const char* holds) {
    const std::size_t offset = findInvalidXMLText(text);
    if (offset == std::string_view::npos) {
        return std::nullopt;
    }
    return Finding{holds + describeInvalidXMLText(text, offset) + ", for which XML has no place"};
}

std::optional<Finding> findInEntry(const std::string& key, const PropertyList& value, int depth) {
    std::optional<Finding> finding = findInText(key, "is a key that holds ");
    if (!finding) {
        finding = findIn(value, depth);
    }
    if (finding) {
        finding->steps.push_back(excerpt(key));
    }
    return finding;
}

std::optional<Finding> findInContainer(const PropertyList& value, int depth) {
    if (depth == kPropertyListMaximumDepth) {
        return Finding{"is nested more than " + std::to_string(kPropertyListMaximumDepth) + " deep"};
    }
    if (const auto* dictionary = value.dictionary()) {
        for (const auto& [key, entry] : *dictionary) {
            if (auto finding = findInEntry(key, entry, depth + 1)) {
                return finding;
            }
        }
        return std::nullopt;
    }
    std::size_t index = 0;
    for (const PropertyList& element : *value.array()) {
        if (auto finding = findIn(element, depth + 1)) {
            finding->steps.push_back(std::to_string(index));
            return finding;
        }
        ++index;
    }
    return std::nullopt;
}

// Looks through a value with so many dictionaries and arrays around it.
std::optional<Finding> findIn(const PropertyList& value, int depth) {
    if (value.isDictionary() || value.isArray()) {
        return findInContainer(value, depth);
    }
    if (const std::string* text = value.string()) {
        return findInText(*text, "holds ");
    }
    if (value.date() && !formatCalendarDate(*value.date())) {
        return Finding{"is a date outside the years 0000 to 9999"};
    }
    return std::nullopt;
}

std::optional<std::string> textOf(const std::optional<Finding>& finding) {
    return finding ? std::optional(finding->text()) : std::nullopt;
}

} // namespace

std::optional<std::string> findUnwritableValue(const PropertyList& value) {
    return textOf(findIn(value, 0));
}

std::optional<std::string> findUnwritableEntry(const std::string& key, const PropertyList& value) {
    return textOf(findInEntry(key, value, 1));
}

} // namespace welcomer
