#include "mixed/svg.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <iterator>
#include <map>
#include <vector>

#include "mixed/text.hpp"

namespace sm::mixed::svg {
namespace {

// Of a character in parts of the font's size. Those of DejaVu Sans, which is wider than the fonts asked for first.
double advance(char32_t character) {
  constexpr double kWide = 1.0;
  if (character >= 0x80) return character >= 0x1100 ? kWide : 0.65;
  const char c = static_cast<char>(character);
  constexpr std::string_view kNarrow = "iljtfrI.,:;'|!()[]/ -";
  if (kNarrow.find(c) != std::string_view::npos) return 0.4;
  if (c == 'm' || c == 'w' || c == 'M' || c == 'W' || c == '%' || c == '@') return 0.98;
  if (c >= 'A' && c <= 'Z') return 0.73;
  return c == '=' || c == '+' || c == '<' || c == '>' || c == '~' ? 0.84 : 0.63;
}

const char* anchor_name(Anchor anchor) {
  return anchor == Anchor::start ? "start" : anchor == Anchor::middle ? "middle" : "end";
}

std::vector<std::string_view> characters_of(std::string_view text) {
  std::vector<std::string_view> characters;
  while (!text.empty()) {
    const std::string_view before = text;
    next_character(text);
    characters.push_back(before.substr(0, before.size() - text.size()));
  }
  return characters;
}

// A third of the width for what stands before a place, and the rest from there on.
std::string cut_around(std::string_view text, std::size_t place, double size, double width) {
  std::size_t bytes = 0;
  std::string head;
  std::string tail;
  double left = width - 2.0 * text_width("…", size);
  for (const std::string_view next : characters_of(text)) {
    bytes += next.size();
    if (bytes <= place) {
      head += next;
      continue;
    }
    if (tail.empty()) {
      std::vector<std::string_view> before = characters_of(head);
      while (!before.empty() && text_width(head, size) > width / 3.0) {
        head.erase(0, before.front().size());
        before.erase(before.begin());
      }
      left -= text_width(head, size);
    }
    left -= text_width(next, size);
    if (left < 0.0) return fmt::format("…{}{}…", head, tail);
    tail += next;
  }
  return fmt::format("…{}{}", head, tail);
}

}  // namespace

std::string escaped(std::string_view text) {
  std::string out;
  for (const char c : printable(text)) {
    switch (c) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '"':
        out += "&quot;";
        break;
      default:
        out += c;
    }
  }
  return out;
}

double text_width(std::string_view text, double size) {
  double width = 0.0;
  while (!text.empty()) width += advance(next_character(text));
  return width * size;
}

std::string fitted(std::string_view text, double size, double width) {
  std::string shown = printable(text);
  if (text_width(shown, size) <= width) return shown;
  const std::vector<std::string_view> characters = characters_of(shown);
  std::string head;
  std::string tail;
  double left = width - text_width("…", size);
  for (std::size_t i = 0; i < characters.size(); ++i) {
    const bool at_end = i % 2 == 1;
    const std::string_view next = at_end ? characters[characters.size() - 1 - i / 2] : characters[i / 2];
    left -= text_width(next, size);
    if (left < 0.0) break;
    if (at_end) {
      tail.insert(0, next);
    } else {
      head += next;
    }
  }
  return head + "…" + tail;
}

std::vector<std::string> told_apart(const std::vector<std::string>& names, double size, double width) {
  std::vector<std::string> shown;
  std::map<std::string, std::vector<std::size_t>> alike;
  for (const std::string& name : names) {
    shown.push_back(fitted(name, size, width));
    alike[shown.back()].push_back(shown.size() - 1);
  }
  for (const auto& [text, places] : alike) {
    const std::string first = printable(names[places.front()]);
    std::size_t same = first.size();
    for (const std::size_t place : places) {
      const std::string other = printable(names[place]);
      const auto ends =
          std::mismatch(first.begin(), first.begin() + static_cast<std::ptrdiff_t>(same), other.begin(), other.end());
      same = static_cast<std::size_t>(ends.first - first.begin());
    }
    if (places.size() == 1) continue;
    for (const std::size_t place : places) {
      const std::string name = printable(names[place]);
      if (same < name.size()) shown[place] = cut_around(name, same, size, width);
    }
  }
  return shown;
}

std::string coordinate(double value) {
  std::string text = fmt::format("{:.2f}", value);
  text.erase(text.find_last_not_of('0') + 1);
  if (text.ends_with('.')) text.pop_back();
  return text == "-0" ? "0" : text;
}

Canvas::Canvas(double width, double height, std::string_view title)
    : width_(width), height_(height), title_(escaped(title)) {}

void Canvas::line(double x1, double y1, double x2, double y2, const char* stroke, double stroke_width) {
  fmt::format_to(std::back_inserter(body_), "<path d=\"M{} {}L{} {}\" stroke=\"{}\" stroke-width=\"{}\"/>\n",
                 coordinate(x1), coordinate(y1), coordinate(x2), coordinate(y2), stroke, coordinate(stroke_width));
}

void Canvas::frame(double x, double y, double width, double height, const char* stroke) {
  fmt::format_to(std::back_inserter(body_),
                 "<rect x=\"{}\" y=\"{}\" width=\"{}\" height=\"{}\" fill=\"none\" stroke=\"{}\"/>\n", coordinate(x),
                 coordinate(y), coordinate(width), coordinate(height), stroke);
}

void Canvas::text(double x, double y, std::string_view text, const TextStyle& style) {
  auto out = std::back_inserter(body_);
  fmt::format_to(out, "<text x=\"{}\" y=\"{}\" font-size=\"{}\" fill=\"{}\"", coordinate(x), coordinate(y),
                 coordinate(style.size), style.fill);
  if (style.anchor != Anchor::start) fmt::format_to(out, " text-anchor=\"{}\"", anchor_name(style.anchor));
  if (style.bold) body_ += " font-weight=\"bold\"";
  if (style.upwards) fmt::format_to(out, " transform=\"rotate(-90 {} {})\"", coordinate(x), coordinate(y));
  fmt::format_to(out, ">{}</text>\n", escaped(text));
}

void Canvas::stroke_path(const std::string& d, const char* stroke, double stroke_width) {
  fmt::format_to(std::back_inserter(body_), "<path d=\"{}\" fill=\"none\" stroke=\"{}\" stroke-width=\"{}\"/>\n", d,
                 stroke, coordinate(stroke_width));
}

void Canvas::fill_path(const std::string& d, const char* fill, double opacity) {
  fmt::format_to(std::back_inserter(body_), "<path d=\"{}\" fill=\"{}\" fill-opacity=\"{}\"/>\n", d, fill,
                 coordinate(opacity));
}

void Canvas::begin_circles(const char* fill, double opacity) {
  fmt::format_to(std::back_inserter(body_), "<g fill=\"{}\" fill-opacity=\"{}\">\n", fill, coordinate(opacity));
}

void Canvas::circle(double x, double y, double radius) {
  fmt::format_to(std::back_inserter(body_), "<circle cx=\"{}\" cy=\"{}\" r=\"{}\"/>\n", coordinate(x), coordinate(y),
                 coordinate(radius));
}

void Canvas::ring(double x, double y, double radius, const char* stroke) {
  fmt::format_to(std::back_inserter(body_),
                 "<circle cx=\"{}\" cy=\"{}\" r=\"{}\" fill=\"#ffffff\" stroke=\"{}\" stroke-width=\"1.5\"/>\n",
                 coordinate(x), coordinate(y), coordinate(radius), stroke);
}

void Canvas::begin_scaled(double x, double y, double scale) {
  fmt::format_to(std::back_inserter(body_),
                 "<g transform=\"translate({} {}) scale({:.6g})\" shape-rendering=\"crispEdges\">\n", coordinate(x),
                 coordinate(y), scale);
}

std::string Canvas::finished() const {
  return fmt::format(
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"{0}\" height=\"{1}\" viewBox=\"0 0 {0} {1}\" role=\"img\" "
      "font-family=\"Helvetica, Arial, 'Liberation Sans', 'DejaVu Sans', sans-serif\">\n"
      "<title>{2}</title>\n<rect width=\"{0}\" height=\"{1}\" fill=\"#ffffff\"/>\n{3}</svg>\n",
      coordinate(width_), coordinate(height_), title_, body_);
}

}  // namespace sm::mixed::svg
