// What a command has to say: one document for programs, and lines and tables for people.

#pragma once

#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/terminal/TextTable.h"

#include <initializer_list>
#include <iosfwd>
#include <optional>
#include <string>
#include <utility>
#include <variant>
#include <vector>

namespace welcomer::tool {

// What people read is added from top to bottom; control characters in it are shown, not sent to the terminal.
class Report {
  public:
    // A label with the value that the document has under a key.
    struct Field {
        const char* label;
        const char* key;
    };
    // A column of a table, with what the rows have under a key.
    struct Column {
        const char* heading;
        const char* key;
        const char* none = "-"; // what stands in the place of null
    };

    Report() = default;

    // The same in a document and in one sentence.
    Report(Json forPrograms, const std::string& sentence) : document(std::move(forPrograms)) {
        line(sentence);
    }

    // One line.
    Report& line(const std::string& text);
    Report& lines(const std::vector<std::string>& texts);

    // One line each, the values below one another: "yes" or "no", a text, texts with a space between them, or
    // "-" for what is missing.
    Report& fields(std::initializer_list<Field> fields);

    // The same with texts for the values.
    Report& fields(const std::vector<std::pair<std::string, std::string>>& fields);

    // One line for each object of an array, below the headings.
    Report& table(const Json& rows, std::initializer_list<Column> columns, const std::string& indent = "");
    Report& table(TextTable table);

    Json document;

    // Why the command failed all the same: its line for the user, which comes after the report.
    std::optional<std::string> failure;
    int failureStatus = 1; // the exit status then

  private:
    friend class ReportPrinter;

    std::vector<std::variant<std::string, TextTable>> _parts;
};

// The one that knows whether people or programs read.
class ReportPrinter {
  public:
    //  out         borrowed
    //  descriptor  where that leads: tables are cut to the width of a terminal; -1 for somewhere else
    ReportPrinter(std::ostream& out, int descriptor, bool isForPrograms)
        : _out(out),
          _descriptor(descriptor),
          _isForPrograms(isForPrograms) {}

    // Prints a command's result.
    void print(const Report& report);

    // Shows people at once what goes on; programs get the result alone.
    void tell(const Report& report);

  private:
    void _printForPeople(const Report& report);

    std::ostream& _out;
    const int _descriptor;
    const bool _isForPrograms;
};

} // namespace welcomer::tool
