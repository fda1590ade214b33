// What a library's file says of itself, without being loaded.

#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace welcomer::tool {

struct ExportedSymbol {
    std::string name;
    bool isUnique = false; // one for the whole process, whatever library it came with
};

struct LibrarySymbols {
    std::vector<ExportedSymbol> exported; // what it defines for others to see
    std::vector<std::string> needed;      // the libraries that it names
    std::string trouble;                  // why nothing can be said, one line; empty when it can
};

// Reads them. The file may be any file; a folder is none.
LibrarySymbols readLibrarySymbols(const std::filesystem::path& file);

} // namespace welcomer::tool
