// What a library's file says of itself.

#include "tools/welcomer/plugins/Checks.h"
#include "tools/welcomer/plugins/LibrarySymbols.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace welcomer::tool::checks {

namespace {

constexpr std::size_t kShown = 3; // of many symbols

void drop(std::string_view& text, std::string_view prefix) {
    if (text.starts_with(prefix)) {
        text.remove_prefix(prefix.size());
    }
}

// What compilers and their own headers make visible, whatever the options say: it is the same in every library. By the
// names of the C++ ABI: variables in functions, guards, tables of types, and what is in the namespaces of the runtime.
bool isOfTheRuntime(std::string_view name) {
    constexpr std::array<std::string_view, 13> kScopes{
        "St", "Sa", "Sb", "Ss", "Si", "So", "Sd", "9__gnu_cxx", "10__cxxabiv1", "dl", "da", "nw", "na"};
    if (!name.starts_with("_Z")) {
        return name.starts_with("__odr_asan");
    }
    for (const std::string_view prefix : {"_Z", "GV", "TV", "TI", "TS", "TT", "Z", "N", "K", "R", "O"}) {
        drop(name, prefix);
    }
    return std::ranges::any_of(kScopes, [&](std::string_view scope) { return name.starts_with(scope); });
}

std::string listed(const std::vector<std::string>& names) {
    std::string text;
    for (std::size_t index = 0; index < std::min(names.size(), kShown); ++index) {
        text += (text.empty() ? "" : ", ") + names[index];
    }
    return names.size() > kShown ? text + " and " + std::to_string(names.size() - kShown) + " more" : text;
}

std::vector<std::string> othersThat(const LibrarySymbols& symbols, bool areUnique) {
    std::vector<std::string> names;
    for (const ExportedSymbol& symbol : symbols.exported) {
        if (symbol.name != WL_DELEGATE_PLUGIN_SYMBOL && symbol.isUnique == areUnique &&
            !isOfTheRuntime(symbol.name)) {
            names.push_back(symbol.name);
        }
    }
    return names;
}

} // namespace

void library(CheckedPlugin& /*plugin*/, CheckReport& report, const CheckInput& input) {
    const LibrarySymbols symbols = readLibrarySymbols(input.library);
    if (!symbols.trouble.empty()) {
        report.find(symbols.trouble);
    }
}

void exportedSymbol(CheckedPlugin& /*plugin*/, CheckReport& report, const CheckInput& input) {
    const LibrarySymbols symbols = readLibrarySymbols(input.library);
    if (std::ranges::find(symbols.exported, WL_DELEGATE_PLUGIN_SYMBOL, &ExportedSymbol::name) ==
        symbols.exported.end()) {
        report.find("it does not export " WL_DELEGATE_PLUGIN_SYMBOL);
    }
}

void uniqueSymbols(CheckedPlugin& /*plugin*/, CheckReport& report, const CheckInput& input) {
    const auto names = othersThat(readLibrarySymbols(input.library), true);
    if (!names.empty()) {
        report.find("another plug-in with the same names shares these: " + listed(names) +
                    "; compile with -fvisibility=hidden -fno-gnu-unique");
    }
}

void visibility(CheckedPlugin& /*plugin*/, CheckReport& report, const CheckInput& input) {
    const auto names = othersThat(readLibrarySymbols(input.library), false);
    if (!names.empty()) {
        report.find("it exports more than " WL_DELEGATE_PLUGIN_SYMBOL ": " + listed(names) +
                    "; compile with -fvisibility=hidden");
    }
}

} // namespace welcomer::tool::checks
