// A drawing as SVG text: what the plots need of it, in one quiet style.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed::svg {

constexpr const char* kInk = "#222222";
constexpr const char* kMuted = "#5c6370";
constexpr const char* kRule = "#9aa0a8";
constexpr const char* kGrid = "#e7e9ec";
constexpr const char* kAccent = "#1c5d99";
constexpr const char* kPale = "#a9c5e0";  // of the accent

enum class Anchor { start, middle, end };

struct TextStyle {
  double size = 11.0;
  Anchor anchor = Anchor::start;
  const char* fill = kInk;
  bool bold = false;
  bool upwards = false;  // turned to be read from bottom to top
};

// Fit for the content of an element or an attribute: markup escaped, what cannot be printed made visible.
std::string escaped(std::string_view text);

// An estimate of a text's width, on the side of too wide: fonts differ.
double text_width(std::string_view text, double size);

// The text no wider than that, with an ellipsis for its middle: names often differ at their ends.
std::string fitted(std::string_view text, double size, double width);

// Names that fitted() would make look alike are cut around the place where they begin to differ instead.
std::vector<std::string> told_apart(const std::vector<std::string>& names, double size, double width);

// Coordinates in pixels, the origin at the upper left; written to a hundredth.
std::string coordinate(double value);

class Canvas {
 public:
  Canvas(double width, double height, std::string_view title);

  double width() const { return width_; }
  double height() const { return height_; }

  void line(double x1, double y1, double x2, double y2, const char* stroke, double stroke_width = 1.0);
  void frame(double x, double y, double width, double height, const char* stroke);
  void text(double x, double y, std::string_view text, const TextStyle& style = {});
  void stroke_path(const std::string& d, const char* stroke, double stroke_width);
  void fill_path(const std::string& d, const char* fill, double opacity = 1.0);

  // Between these, circles of one radius; a group spares each of them its style.
  void begin_circles(const char* fill, double opacity);
  void circle(double x, double y, double radius);
  void ring(double x, double y, double radius, const char* stroke);
  // Between these, one unit of a path is `scale` pixels, and the origin is at (x, y).
  void begin_scaled(double x, double y, double scale);
  void end_group() { body_ += "</g>\n"; }

  // The whole document.
  std::string finished() const;

 private:
  double width_;
  double height_;
  std::string title_;
  std::string body_;
};

}  // namespace sm::mixed::svg
