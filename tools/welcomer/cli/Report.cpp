#include "tools/welcomer/cli/Report.h"

#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <ostream>

namespace welcomer::tool {

namespace {

constexpr const char* kNothing = "-";
constexpr std::size_t kBetween = 2; // columns

std::string shown(const Json& value, const char* none = kNothing) {
    if (value.is_boolean()) {
        return value.get<bool>() ? "yes" : "no";
    }
    if (value.is_string()) {
        return value.get<std::string>();
    }
    if (!value.is_array()) {
        return value.is_null() ? none : value.dump();
    }
    std::string text;
    for (const Json& each : value) {
        text += (text.empty() ? "" : " ") + shown(each);
    }
    return text.empty() ? none : text;
}

} // namespace

Report& Report::line(const std::string& text) {
    _parts.emplace_back(printable(text));
    return *this;
}

Report& Report::lines(const std::vector<std::string>& texts) {
    for (const std::string& text : texts) {
        line(text);
    }
    return *this;
}

Report& Report::fields(std::initializer_list<Field> fields) {
    std::vector<std::pair<std::string, std::string>> texts;
    for (const Field& field : fields) {
        texts.emplace_back(field.label, shown(document.at(field.key)));
    }
    return this->fields(texts);
}

Report& Report::fields(const std::vector<std::pair<std::string, std::string>>& fields) {
    std::size_t width = 0;
    for (const auto& [label, value] : fields) {
        width = std::max(width, label.size() + kBetween);
    }
    for (const auto& [label, value] : fields) {
        std::string text = label;
        text.resize(width, ' ');
        line(text += value);
    }
    return *this;
}

Report& Report::table(const Json& rows, std::initializer_list<Column> columns, const std::string& indent) {
    std::vector<std::string> headings;
    std::ranges::transform(columns, std::back_inserter(headings), &Column::heading);
    TextTable table(std::move(headings), indent);
    for (const Json& row : rows) {
        std::vector<std::string> cells;
        for (const Column& column : columns) {
            cells.push_back(shown(row.at(column.key), column.none));
        }
        table.addRow(cells);
    }
    return this->table(std::move(table));
}

Report& Report::table(TextTable table) {
    _parts.emplace_back(std::move(table));
    return *this;
}

void ReportPrinter::print(const Report& report) {
    if (_isForPrograms) {
        printJson(_out, report.document);
    } else {
        _printForPeople(report);
    }
}

void ReportPrinter::tell(const Report& report) {
    if (!_isForPrograms) {
        _printForPeople(report);
        _out.flush();
    }
}

void ReportPrinter::_printForPeople(const Report& report) {
    for (const auto& part : report._parts) {
        if (const auto* line = std::get_if<std::string>(&part)) {
            _out << *line << '\n';
        } else {
            std::get<TextTable>(part).print(_out, terminalWidth(_descriptor));
        }
    }
}

} // namespace welcomer::tool
