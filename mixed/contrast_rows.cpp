#include "mixed/contrast_rows.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <map>
#include <optional>
#include <set>

#include "mixed/error.hpp"
#include "mixed/expression.hpp"
#include "mixed/lexer.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr std::string_view kIntercept = "(Intercept)";
constexpr std::size_t kMostShown = 160;

class ContrastParser {
 public:
  ContrastParser(std::string_view text, const DesignRecipe& recipe) : text_(text), coding_(recipe.fixed) {}

  ContrastRow run() {
    row_.l.assign(coding_.names.size(), 0.0);
    take_name();
    skip_blanks();
    if (ended()) fail(at_, "there is no combination", "such as 1*f[b] - 1*f[a]", "write one");
    double sign = take_sign().value_or(1.0);
    for (;;) {
      item(sign);
      skip_blanks();
      if (ended()) break;
      const std::optional<double> next = take_sign();
      if (!next) fail(at_, "found " + rest(), "+ or -", "put levels in brackets: f[b]");
      sign = *next;
    }
    return std::move(row_);
  }

 private:
  // The name ends at the first colon with a blank behind it; the colon of an interaction has none.
  void take_name() {
    row_.name = text_;
    for (std::size_t i = 0; i + 1 < text_.size(); ++i) {
      if (text_[i] != ':' || text_[i + 1] != ' ') continue;
      row_.name = text_.substr(0, i);
      at_ = i + 1;
      return;
    }
  }

  std::optional<double> take_sign() {
    skip_blanks();
    if (ended() || (text_[at_] != '+' && text_[at_] != '-')) return std::nullopt;
    const double sign = text_[at_++] == '+' ? 1.0 : -1.0;
    skip_blanks();
    return sign;
  }

  void item(double factor) {
    factor *= coefficient();
    skip_blanks();
    if (ended()) fail(at_, "found the end", "an effect, such as f[b] or x", "write one");
    if (column_itself(factor)) return;
    if (text_.substr(at_).starts_with(kIntercept)) fail(at_, "the model has no intercept", "", "leave it out");
    if (text_.substr(at_).starts_with("at(")) return cell(factor);
    effect(factor);
  }

  // "0.5*", "2 *", or nothing.
  double coefficient() {
    std::size_t end = at_;
    while (end < text_.size() && (is_name_part(text_[end]) || ((text_[end] == '+' || text_[end] == '-') && end > at_ &&
                                                               (text_[end - 1] == 'e' || text_[end - 1] == 'E')))) {
      ++end;
    }
    double value = 0.0;
    if (!parse_number(text_.substr(at_, end - at_), value)) return 1.0;
    const std::size_t begin = at_;
    at_ = end;
    skip_blanks();
    if (ended() || text_[at_] != '*') {
      fail(begin, fmt::format("found the number {} alone", print_number(value)), "number * effect",
           "write the intercept as (Intercept)");
    }
    ++at_;
    return value;
  }

  void effect(double factor) {
    const std::size_t begin = at_;
    std::vector<Setting> settings(coding_.variables.size());
    std::vector<int> variables;
    for (;;) {
      const std::size_t part = at_;
      const std::string name = take_variable();
      const int variable = find_variable(name);
      if (variable < 0) unknown_variable(part, name);
      if (std::find(variables.begin(), variables.end(), variable) != variables.end()) {
        fail(part, fmt::format("found '{}' twice", name), "each variable of an interaction once", "");
      }
      variables.push_back(variable);
      take_setting(part, coding_.variables[static_cast<std::size_t>(variable)],
                   settings[static_cast<std::size_t>(variable)]);
      if (ended() || text_[at_] != ':') break;
      ++at_;
    }
    std::sort(variables.begin(), variables.end());
    for (const CodedTerm& term : coding_.terms) {
      if (term.variables == variables) return add(term, settings, factor);
    }
    fail(begin, fmt::format("found {}, which is no term of the model", quote(text_.substr(begin, at_ - begin))),
         fmt::format("one of {}", listed(term_labels())), "add the effects of the terms there are");
  }

  // A column of X by its name, the longest that stands here, in backquotes or not.
  bool column_itself(double factor) {
    const bool quoted = text_[at_] == '`';
    const std::string_view here = text_.substr(at_ + (quoted ? 1 : 0));
    std::size_t longest = 0;
    std::size_t column = 0;
    for (std::size_t j = 0; j < coding_.names.size(); ++j) {
      const std::string& name = coding_.names[j];
      if (name.size() <= longest || !here.starts_with(name)) continue;
      const char next = here.size() > name.size() ? here[name.size()] : ' ';
      if (quoted ? next != '`' : next != ' ' && next != '+' && next != '-') continue;
      longest = name.size();
      column = j;
    }
    if (longest == 0) return false;
    at_ += longest + (quoted ? 2 : 0);
    row_.l[column] += factor;
    return true;
  }

  void take_setting(std::size_t part, const CodedVariable& variable, Setting& setting) {
    const bool bracket = !ended() && text_[at_] == '[';
    setting.number = 1.0;
    if (!bracket) {
      if (variable.factor) {
        fail(part, fmt::format("found the factor '{}' without a level", variable.label),
             fmt::format("{}[{}]", variable.label, variable.levels.back()), "put one of its levels in brackets");
      }
      return;
    }
    const std::size_t begin = ++at_;
    const std::string value = take_until(begin, "]");
    if (!variable.factor) {
      if (!parse_number(value, setting.number)) {
        fail(begin, "found " + quote(value), "a number", fmt::format("'{}' is no factor", variable.label));
      }
      return;
    }
    setting.code = level(variable, value, begin);
  }

  // The text up to one of `ends`, blanks around it taken off, or what stands in quotes; goes behind the end.
  std::string take_until(std::size_t begin, std::string_view ends) {
    skip_blanks();
    std::string value;
    if (!ended() && text_[at_] == '"') {
      const std::size_t close = text_.find('"', at_ + 1);
      if (close == std::string_view::npos) fail(at_, "found a quote that is never closed", "", "close it");
      value = text_.substr(at_ + 1, close - at_ - 1);
      at_ = close + 1;
      skip_blanks();
    } else {
      const std::size_t end = std::min(text_.find_first_of(ends, at_), text_.size());
      value = text_.substr(at_, end - at_);
      while (!value.empty() && value.back() == ' ') value.pop_back();
      at_ = end;
    }
    if (ended() || ends.find(text_[at_]) == std::string_view::npos) {
      fail(begin, "found no end of " + quote(value), fmt::format("{} behind it", quote(ends.substr(ends.size() - 1))),
           "close it");
    }
    ++at_;
    return value;
  }

  std::int32_t level(const CodedVariable& variable, const std::string& name, std::size_t place) const {
    const std::int64_t found = variable.level(name);
    if (found < 0) {
      const std::string nearest = nearest_name(name, variable.levels);
      fail(place, fmt::format("'{}' has no level {}", variable.label, quote(name)),
           fmt::format("one of {}", listed(variable.levels)),
           nearest.empty() ? "" : fmt::format("did you mean {}?", quote(nearest)));
    }
    return static_cast<std::int32_t>(found);
  }

  // at(f=b, x=8): all variables of the model must be told; expressions are computed.
  void cell(double factor) {
    const std::size_t begin = at_;
    at_ += std::string_view("at(").size();
    std::map<std::string, std::pair<std::string, std::size_t>> told;
    for (;;) {
      skip_blanks();
      const std::size_t place = at_;
      const std::string name = take_word();
      skip_blanks();
      if (ended() || text_[at_] != '=') fail(at_, "found " + rest(), "= behind the name of a column", "");
      ++at_;
      const std::string value = take_until(place, ",)");
      if (!told.emplace(name, std::make_pair(value, place)).second) {
        fail(place, fmt::format("'{}' is told twice", name), "each variable once", "leave one out");
      }
      if (text_[at_ - 1] == ')') break;
    }
    std::vector<Setting> settings;
    for (const CodedVariable& variable : coding_.variables) settings.push_back(setting_of(variable, told, begin));
    for (const auto& [name, value] : told) {
      if (!used_.contains(name)) {
        fail(value.second, fmt::format("'{}' is no variable of the fixed part", name), "", "leave it out");
      }
    }
    for (const CodedTerm& term : coding_.terms) add(term, settings, factor);
  }

  Setting setting_of(const CodedVariable& variable,
                     const std::map<std::string, std::pair<std::string, std::size_t>>& told, std::size_t begin) {
    const auto value_of = [&](const Node& name) {
      const auto found = told.find(name.text);
      if (found == told.end()) {
        fail(begin, fmt::format("'{}' is not told", name.text), "a value for every variable of the fixed part",
             fmt::format("add {}=...", name.text));
      }
      used_.insert(name.text);
      return found->second;
    };
    if (variable.factor) {
      const auto [value, place] = value_of(variable.expression);
      return {.number = 1.0, .code = level(variable, value, place)};
    }
    const std::vector<double> number = evaluate(variable.expression, 1, [&](const Node& name) {
      const auto [value, place] = value_of(name);
      double parsed = 0.0;
      if (!parse_number(value, parsed)) fail(place, "found " + quote(value), "a number", "");
      return std::vector<double>{parsed};
    });
    return {.number = number[0], .code = 0};
  }

  void add(const CodedTerm& term, const std::vector<Setting>& settings, double factor) {
    encode(coding_, term, settings, entries_);
    for (const CodedEntry& entry : entries_) row_.l[static_cast<std::size_t>(entry.column)] += factor * entry.value;
  }

  // A name, a backquoted one, or a call with its parentheses: the label of a variable or the name of a column.
  std::string take_variable() {
    std::string name = take_word();
    if (ended() || text_[at_] != '(') return name;
    int open = 0;
    do {
      if (ended()) fail(at_, "found a parenthesis that is never closed", "a closing parenthesis", "close it");
      if (text_[at_] == '(') ++open;
      if (text_[at_] == ')') --open;
      name += text_[at_++];
    } while (open > 0);
    return name;
  }

  std::string take_word() {
    const std::size_t begin = at_;
    if (!ended() && text_[at_] == '`') {
      const std::size_t close = text_.find('`', begin + 1);
      if (close == std::string_view::npos) fail(begin, "found a backquote that is never closed", "", "close it");
      at_ = close + 1;
      return std::string(text_.substr(begin + 1, close - begin - 1));
    }
    while (!ended() && is_name_part(text_[at_])) ++at_;
    if (at_ == begin) fail(begin, "found " + rest(), "a term, such as f[b] or x", "");
    return std::string(text_.substr(begin, at_ - begin));
  }

  int find_variable(const std::string& name) const {
    const auto without_blanks = [](std::string text) {
      std::erase(text, ' ');
      return text;
    };
    for (std::size_t v = 0; v < coding_.variables.size(); ++v) {
      const std::string& label = coding_.variables[v].label;
      if (without_blanks(label) == without_blanks(name) || label == fmt::format("`{}`", name))
        return static_cast<int>(v);
    }
    return -1;
  }

  [[noreturn]] void unknown_variable(std::size_t place, const std::string& name) const {
    std::vector<std::string> names;
    for (const CodedVariable& variable : coding_.variables) names.push_back(variable.label);
    const std::string nearest = nearest_name(name, names);
    fail(place, fmt::format("'{}' is neither a variable nor a column of the fixed part", name),
         fmt::format("one of {}", listed(names)),
         nearest.empty() ? "a name for the whole ends with a colon and a blank"
                         : fmt::format("did you mean '{}'?", nearest));
  }

  std::vector<std::string> term_labels() const {
    std::vector<std::string> labels;
    for (const CodedTerm& term : coding_.terms) labels.push_back(term.label);
    return labels;
  }

  bool ended() const { return at_ == text_.size(); }
  void skip_blanks() {
    while (!ended() && text_[at_] == ' ') ++at_;
  }
  std::string rest() const { return ended() ? "the end" : quote(text_.substr(at_, text_.find(' ', at_) - at_)); }

  [[noreturn]] void fail(std::size_t place, const std::string& what, const std::string& expected,
                         const std::string& advice) const {
    Fault fault{.file = "contrast",
                .column = 1 + characters(text_.substr(0, place)),
                .what = what,
                .expected = expected,
                .advice = advice};
    if (text_.size() <= kMostShown) {
      fault.excerpt = fmt::format("  {}\n  {}^", text_, std::string(static_cast<std::size_t>(fault.column - 1), ' '));
    }
    throw ModelError(fault);
  }

  std::string_view text_;
  const Coding& coding_;
  std::size_t at_ = 0;
  ContrastRow row_;
  std::set<std::string> used_;
  std::vector<CodedEntry> entries_;
};

}  // namespace

ContrastRow parse_contrast(std::string_view text, const DesignRecipe& recipe) {
  return ContrastParser(text, recipe).run();
}

}  // namespace sm::mixed
