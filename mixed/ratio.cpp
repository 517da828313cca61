#include "mixed/ratio.hpp"

#include <fmt/core.h>

#include <cctype>
#include <charconv>
#include <cmath>
#include <utility>

#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

constexpr const char* kWhatCanStand = "a number, a group of the model, residual, total or a parenthesis";

bool is_residual(const VarianceComponent& component) {
  return component.group == "Residual" && component.var1.empty() && component.var2.empty();
}

bool is_variance(const VarianceComponent& component) { return component.var2.empty(); }

// "Subject[Days]": how a component is written.
std::string component_text(const VarianceComponent& component) {
  if (!is_variance(component)) return fmt::format("{}[{}, {}]", component.group, component.var1, component.var2);
  return fmt::format("{}[{}]", component.group, component.var1);
}

std::vector<std::size_t> variances(std::span<const VarianceComponent> components) {
  std::vector<std::size_t> places;
  for (std::size_t i = 0; i < components.size(); ++i) {
    if (is_variance(components[i])) places.push_back(i);
  }
  return places;
}

std::string_view trimmed(std::string_view text) {
  const std::size_t begin = text.find_first_not_of(" \t");
  return begin == std::string_view::npos ? "" : text.substr(begin, text.find_last_not_of(" \t") + 1 - begin);
}

bool is_blank(char c) { return c == ' ' || c == '\t'; }
bool is_digit(char c) { return c >= '0' && c <= '9'; }
// Bytes of other alphabets are letters.
bool begins_name(char c) { return std::isalpha(static_cast<unsigned char>(c)) != 0 || c == '_' || (c & 0x80) != 0; }
bool continues_name(char c) { return begins_name(c) || is_digit(c) || c == '.' || c == ':'; }

}  // namespace

// By recursive descent; parentheses nest at most kDeepest times.
class RatioParser {
 public:
  RatioParser(const std::string& text, std::span<const VarianceComponent> components)
      : text_(text), components_(components) {}

  RatioFunction parse() {
    const std::size_t equals = text_.find('=');
    if (equals != std::string::npos) {
      ratio_.name_ = trimmed(std::string_view(text_).substr(0, equals));
      if (ratio_.name_.empty()) refuse(equals, "found no name before '='", "a name: h2 = ...");
      position_ = equals + 1;
    } else {
      ratio_.name_ = trimmed(text_);
    }
    sum();
    if (!at_end()) refuse(position_, found(), "an operator (+ - * /) or the end");
    return std::move(ratio_);
  }

 private:
  using Step = RatioFunction::Step;
  static constexpr int kDeepest = 200;

  [[noreturn]] void refuse(std::size_t place, std::string what, std::string expected) const {
    throw ModelError({.column = static_cast<std::int64_t>(place) + 1,
                      .variable = text_,
                      .what = std::move(what),
                      .expected = std::move(expected),
                      .advice = "write the ratio like this: h2 = animal / (animal + residual)"});
  }
  std::string found() {
    if (at_end()) return "the text ends";
    return fmt::format("found '{}'", text_[position_]);
  }

  void skip_blanks() {
    while (position_ < text_.size() && is_blank(text_[position_])) ++position_;
  }
  bool at_end() {
    skip_blanks();
    return position_ == text_.size();
  }
  bool take(char c) {
    if (at_end() || text_[position_] != c) return false;
    ++position_;
    return true;
  }
  void emit(Step step) { ratio_.program_.push_back({.step = step}); }

  void sum() {
    product();
    for (;;) {
      if (take('+')) {
        product();
        emit(Step::add);
      } else if (take('-')) {
        product();
        emit(Step::subtract);
      } else {
        return;
      }
    }
  }

  void product() {
    factor();
    for (;;) {
      if (take('*')) {
        factor();
        emit(Step::multiply);
      } else if (take('/')) {
        factor();
        emit(Step::divide);
      } else {
        return;
      }
    }
  }

  void factor() {
    bool negative = false;
    while (take('-')) negative = !negative;
    if (take('(')) {
      if (++depth_ > kDeepest) refuse(position_ - 1, "parentheses nest too deeply", "a simpler expression");
      sum();
      if (!take(')')) refuse(position_, found(), "')' or an operator");
      --depth_;
    } else if (!at_end() && (is_digit(text_[position_]) || text_[position_] == '.')) {
      number();
    } else {
      variance();
    }
    if (negative) emit(Step::negate);
  }

  void number() {
    double value = 0.0;
    const char* const begin = text_.data() + position_;
    const auto [stop, error] = std::from_chars(begin, text_.data() + text_.size(), value);
    if (error != std::errc() || !std::isfinite(value)) refuse(position_, found(), "a finite number");
    ratio_.program_.push_back({.step = Step::number, .number = value});
    position_ += static_cast<std::size_t>(stop - begin);
  }

  void variance() {
    skip_blanks();
    const std::size_t begin = position_;
    const bool quoted = begin < text_.size() && text_[begin] == '`';
    const std::string group = name();
    const bool with_term = !at_end() && text_[position_] == '[';
    std::vector<std::size_t> places;
    if (with_term) {
      places = {component(begin, group, bracket())};
    } else if (is_group(group)) {
      places = {only_variance(begin, group)};
    } else if (!quoted && group == "residual") {
      places = {component(begin, "Residual", {})};
    } else if (!quoted && group == "total") {
      places = variances(components_);
    } else {
      refuse_group(begin, group);
    }
    ratio_.program_.push_back({.step = Step::sum, .components = std::move(places)});
  }

  std::string name() {
    if (take('`')) {
      const std::size_t end = text_.find('`', position_);
      if (end == std::string::npos) refuse(position_ - 1, "the backquote is not closed", "another one behind the name");
      std::string quoted = text_.substr(position_, end - position_);
      position_ = end + 1;
      return quoted;
    }
    const std::size_t begin = position_;
    if (at_end() || !begins_name(text_[position_])) refuse(position_, found(), kWhatCanStand);
    while (position_ < text_.size() && continues_name(text_[position_])) ++position_;
    return text_.substr(begin, position_ - begin);
  }

  // The terms in brackets: one, or two behind each other. Those of a call like I(x, y) belong together.
  std::vector<std::string> bracket() {
    const std::size_t open = position_++;
    std::vector<std::string> terms(1);
    for (int depth = 0; position_ < text_.size(); ++position_) {
      const char c = text_[position_];
      if (c == ']' && depth == 0) {
        ++position_;
        for (std::string& term : terms) term = trimmed(term);
        return terms;
      }
      depth += c == '(' || c == '[' ? 1 : c == ')' || c == ']' ? -1 : 0;
      if (c == ',' && depth == 0) {
        terms.emplace_back();
      } else {
        terms.back() += c;
      }
    }
    refuse(open, "the bracket is not closed", "']' behind the term");
  }

  bool is_group(const std::string& group) const {
    for (const VarianceComponent& component : components_) {
      if (component.group == group) return true;
    }
    return false;
  }

  std::size_t only_variance(std::size_t place, const std::string& group) const {
    std::vector<std::size_t> places;
    std::string names;
    for (const std::size_t i : variances(components_)) {
      if (components_[i].group != group) continue;
      places.push_back(i);
      names += (names.empty() ? "" : " or ") + component_text(components_[i]);
    }
    if (places.size() != 1) refuse(place, fmt::format("'{}' has {} variances", group, places.size()), names);
    return places.front();
  }

  std::size_t component(std::size_t place, const std::string& group, const std::vector<std::string>& terms) const {
    if (!is_group(group)) refuse_group(place, group);
    std::vector<std::size_t> places;
    std::string names;
    for (std::size_t i = 0; i < components_.size(); ++i) {
      const VarianceComponent& c = components_[i];
      if (c.group != group) continue;
      names += (names.empty() ? "" : " or ") + component_text(c);
      const bool one = terms.size() <= 1 && is_variance(c) && c.var1 == (terms.empty() ? "" : terms[0]);
      const bool two = terms.size() == 2 && !is_variance(c) &&
                       ((c.var1 == terms[0] && c.var2 == terms[1]) || (c.var1 == terms[1] && c.var2 == terms[0]));
      if (one || two) places.push_back(i);
    }
    if (places.empty()) refuse(place, fmt::format("'{}' has no such term", group), names);
    if (places.size() > 1) refuse(place, fmt::format("'{}' has two terms of that name", group), "one of them");
    return places.front();
  }

  [[noreturn]] void refuse_group(std::size_t place, const std::string& group) const {
    std::string names;
    for (const std::size_t i : variances(components_)) {
      const VarianceComponent& c = components_[i];
      if (!is_residual(c) && names.find("'" + c.group + "'") == std::string::npos) names += "'" + c.group + "', ";
    }
    refuse(place, fmt::format("'{}' is no group of the model", group), names + "residual or total");
  }

  const std::string& text_;
  std::span<const VarianceComponent> components_;
  std::size_t position_ = 0;
  int depth_ = 0;
  RatioFunction ratio_;
};

// Every operation carries the derivatives of its result along.
RatioFunction::Value RatioFunction::operator()(std::span<const double> components) const {
  std::vector<Value> stack;
  const std::size_t n = components.size();
  // left <- left op right, the derivative being a * left' + b * right'
  const auto combine = [&](double value, double a, double b) {
    const Value right = std::move(stack.back());
    stack.pop_back();
    Value& left = stack.back();
    left.value = value;
    for (std::size_t i = 0; i < n; ++i) left.gradient[i] = a * left.gradient[i] + b * right.gradient[i];
  };
  for (const Instruction& instruction : program_) {
    const double y = stack.empty() ? 0.0 : stack.back().value;
    const double x = stack.size() < 2 ? 0.0 : stack[stack.size() - 2].value;
    switch (instruction.step) {
      case Step::number:
        stack.push_back({instruction.number, std::vector<double>(n, 0.0)});
        break;
      case Step::sum:
        stack.push_back({0.0, std::vector<double>(n, 0.0)});
        for (const std::size_t i : instruction.components) {
          stack.back().value += components[i];
          stack.back().gradient[i] = 1.0;
        }
        break;
      case Step::add:
        combine(x + y, 1.0, 1.0);
        break;
      case Step::subtract:
        combine(x - y, 1.0, -1.0);
        break;
      case Step::multiply:
        combine(x * y, y, x);
        break;
      case Step::divide:
        combine(x / y, 1.0 / y, -x / (y * y));
        break;
      case Step::negate:
        stack.back().value = -y;
        for (double& g : stack.back().gradient) g = -g;
        break;
    }
  }
  return std::move(stack.back());
}

RatioFunction parse_ratio(const std::string& text, std::span<const VarianceComponent> components) {
  return RatioParser(text, components).parse();
}

std::vector<RatioFunction> default_ratios(std::span<const VarianceComponent> components) {
  const std::vector<std::size_t> all = variances(components);
  std::vector<RatioFunction> ratios;
  for (const std::size_t i : all) {
    if (is_residual(components[i])) continue;
    std::size_t of_group = 0;
    for (const std::size_t j : all) of_group += components[j].group == components[i].group ? 1 : 0;
    RatioFunction ratio;
    ratio.name_ = (of_group > 1 ? component_text(components[i]) : components[i].group) + " / total";
    ratio.program_ = {{.step = RatioFunction::Step::sum, .components = {i}},
                      {.step = RatioFunction::Step::sum, .components = all},
                      {.step = RatioFunction::Step::divide}};
    ratios.push_back(std::move(ratio));
  }
  return ratios;
}

Ratio estimate_ratio(const RatioFunction& ratio, std::span<const VarianceComponent> components,
                     std::span<const std::size_t> free, std::span<const double> covariance) {
  std::vector<double> values;
  for (const VarianceComponent& component : components) values.push_back(component.vcov);
  const RatioFunction::Value at_estimates = ratio(values);
  Ratio result{.name = ratio.name(), .estimate = at_estimates.value, .se_delta = {}};
  if (covariance.empty()) return result;
  double variance = 0.0;
  for (std::size_t i = 0; i < free.size(); ++i) {
    for (std::size_t j = 0; j < free.size(); ++j) {
      variance += at_estimates.gradient[free[i]] * covariance[i * free.size() + j] * at_estimates.gradient[free[j]];
    }
  }
  if (variance >= 0.0) result.se_delta = std::sqrt(variance);  // a covariance may fail to be one
  return result;
}

}  // namespace sm::mixed
