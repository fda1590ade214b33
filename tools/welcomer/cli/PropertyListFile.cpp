#include "tools/welcomer/cli/PropertyListFile.h"

#include "propertylist/PropertyListReader.h"
#include "tools/welcomer/terminal/Failure.h"

#include <cerrno>
#include <fstream>
#include <iostream>
#include <iterator>
#include <system_error>
#include <utility>

namespace welcomer::tool {

namespace {

std::string readAll(std::istream& in, const std::string& name) {
    std::string bytes{std::istreambuf_iterator<char>(in), {}};
    if (in.bad()) {
        throw CommandFailure("cannot read " + name);
    }
    return bytes;
}

std::string readFile(const std::string& path) {
    if (path == "-") {
        return readAll(std::cin, "the standard input");
    }
    errno = 0;
    std::ifstream file(path, std::ios::binary);
    // A folder can be opened; only reading it fails.
    if (!file || file.peek() == std::ifstream::traits_type::eof()) {
        const int number = errno;
        if (number != 0) {
            throw CommandFailure("cannot read " + path + ": " + std::generic_category().message(number));
        }
    }
    file.clear();
    return readAll(file, path);
}

} // namespace

PropertyList readPropertyListFile(const std::string& path) {
    PropertyListReadResult result = readPropertyList(readFile(path));
    if (!result) {
        throw CommandFailure(path + " is no property list: " + result.error);
    }
    return std::move(*result.value);
}

} // namespace welcomer::tool
