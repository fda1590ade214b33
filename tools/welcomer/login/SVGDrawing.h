// A drawing in SVG, put together from top to bottom.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::tool {

// The text as an XML document holds it, on one line: what has no place there becomes U+FFFD. Any thread.
std::string xmlText(std::string_view text);

// What is drawn gets its colours from its class, so that the drawing follows the reader's theme. Lengths are in
// pixels.
class SVGDrawing {
  public:
    // What follows belongs together, and says this to who points at it or has it read out.
    void beginGroup(std::string_view says);
    void endGroup();

    void rectangle(std::string_view className, double x, double y, double width, double height,
                   double radius = 0);
    void line(std::string_view className, double x1, double y1, double x2, double y2);
    void circle(std::string_view className, double x, double y, double radius);

    //  path  as the attribute "d" has it, around a point
    void path(std::string_view className, double x, double y, std::string_view path);

    //  x  of its beginning, or of its end where the class is anchored there
    void text(std::string_view className, double x, double y, std::string_view text);

    // Puts another drawing on top of this one.
    void add(const SVGDrawing& other) { _body += other._body; }

    // All of it.
    //  says   what the whole drawing is, for who does not see it
    //  style  the rules of its classes, as CSS
    //  shared what lies in <defs>
    std::string document(double width, double height, std::string_view says, std::string_view style,
                         std::string_view shared) const;

  private:
    std::string _body;
};

} // namespace welcomer::tool
