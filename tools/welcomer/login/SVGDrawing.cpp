#include "tools/welcomer/login/SVGDrawing.h"

#include "propertylist/UTF8.h"
#include "tools/welcomer/terminal/Printable.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <initializer_list>
#include <utility>

namespace welcomer::tool {

namespace {

std::string pixels(double length) {
    std::array<char, 32> buffer{};
    const auto result =
        std::to_chars(buffer.data(), buffer.data() + buffer.size(), length, std::chars_format::fixed, 1);
    return {buffer.data(), result.ptr};
}

std::string attributes(std::string_view className,
                       std::initializer_list<std::pair<const char*, double>> lengths) {
    std::string text = " class=\"" + std::string(className) + '"';
    for (const auto& [name, length] : lengths) {
        text += std::string(" ") + name + "=\"" + pixels(length) + '"';
    }
    return text;
}

std::string escaped(char character) {
    switch (character) {
    case '&':
        return "&amp;";
    case '<':
        return "&lt;";
    case '>':
        return "&gt;";
    case '"':
        return "&quot;";
    default:
        return {character};
    }
}

} // namespace

std::string xmlText(std::string_view text) {
    std::string line = printable(text);
    std::string result;
    for (std::string_view rest = line; !rest.empty();) {
        const std::size_t valid = std::min(findInvalidXMLText(rest), rest.size());
        for (const char character : rest.substr(0, valid)) {
            result += escaped(character);
        }
        rest.remove_prefix(valid);
        if (!rest.empty()) {
            result += "\xEF\xBF\xBD";
            rest.remove_prefix(1);
        }
    }
    return result;
}

void SVGDrawing::beginGroup(std::string_view says) {
    _body += "<g><title>" + xmlText(says) + "</title>\n";
}

void SVGDrawing::endGroup() {
    _body += "</g>\n";
}

void SVGDrawing::rectangle(std::string_view className, double x, double y, double width, double height,
                           double radius) {
    _body +=
        "<rect" +
        attributes(className, {{"x", x}, {"y", y}, {"width", width}, {"height", height}, {"rx", radius}}) +
        "/>\n";
}

void SVGDrawing::line(std::string_view className, double x1, double y1, double x2, double y2) {
    _body += "<line" + attributes(className, {{"x1", x1}, {"y1", y1}, {"x2", x2}, {"y2", y2}}) + "/>\n";
}

void SVGDrawing::circle(std::string_view className, double x, double y, double radius) {
    _body += "<circle" + attributes(className, {{"cx", x}, {"cy", y}, {"r", radius}}) + "/>\n";
}

void SVGDrawing::path(std::string_view className, double x, double y, std::string_view path) {
    _body += "<path" + attributes(className, {}) + " transform=\"translate(" + pixels(x) + " " + pixels(y) +
             ")\" d=\"" + std::string(path) + "\"/>\n";
}

void SVGDrawing::text(std::string_view className, double x, double y, std::string_view text) {
    _body += "<text" + attributes(className, {{"x", x}, {"y", y}}) + ">" + xmlText(text) + "</text>\n";
}

std::string SVGDrawing::document(double width, double height, std::string_view says, std::string_view style,
                                 std::string_view shared) const {
    const std::string size = pixels(width) + "\" height=\"" + pixels(height);
    return "<svg xmlns=\"http://www.w3.org/2000/svg\" role=\"img\" width=\"" + size + "\" viewBox=\"0 0 " +
           pixels(width) + " " + pixels(height) + "\">\n<title>" + xmlText(says) + "</title>\n<style>" +
           std::string(style) + "</style>\n<defs>" + std::string(shared) + "</defs>\n" + _body + "</svg>\n";
}

} // namespace welcomer::tool
