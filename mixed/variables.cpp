#include "mixed/variables.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cctype>
#include <numeric>
#include <unordered_map>

#include "mixed/error.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

const std::vector<std::string>* find_levels(const DesignOptions& options, const std::string& name) {
  for (const auto& [column, levels] : options.levels) {
    if (column == name) return &levels;
  }
  return nullptr;
}

// Codes by the new order of the levels.
void reorder(Factor& factor, std::vector<std::string> ordered) {
  std::unordered_map<std::string, std::int32_t> place;
  for (std::size_t l = 0; l < ordered.size(); ++l) place.emplace(ordered[l], static_cast<std::int32_t>(l));
  std::vector<std::int32_t> renumbered;
  renumbered.reserve(factor.levels.size());
  for (const std::string& level : factor.levels) renumbered.push_back(place.at(level));
  for (std::int32_t& code : factor.code) code = renumbered[static_cast<std::size_t>(code)];
  factor.levels = std::move(ordered);
}

}  // namespace

Variables::Variables(const Frame& frame, const std::string& formula, const DesignOptions& options)
    : frame_(frame), formula_(formula), options_(options) {}

bool Variables::is_factor(const Column& column) const {
  const auto& named = options_.factors;
  return !column.numeric || find_levels(options_, column.name) ||
         std::find(named.begin(), named.end(), column.name) != named.end();
}

void Variables::expect_numbers(const Node& expression, const std::string& label) const {
  for (const Node* name : names_in(expression)) {
    const Column& column = frame_.column(*name);
    if (column.numeric && is_factor(column)) {
      refuse_formula(formula_, {.column = name->column,
                                .variable = name->text,
                                .what = fmt::format("is a factor by option, and a number in {}", label),
                                .expected = "one of the two",
                                .advice = "take it out of --factor and --levels, or make a second column"});
    }
  }
}

Variables::Made Variables::make(const TermList& list) {
  Made made;
  for (const Variable& variable : list.variables) {
    CodedVariable coded{.label = variable.label, .expression = variable.expression};
    std::vector<double> number;
    std::vector<std::int32_t> code;
    coded.factor = variable.bare() && is_factor(frame_.column(variable.expression));
    if (coded.factor) {
      const Column& column = frame_.column(variable.expression);
      const auto& named = options_.factors;
      if (std::find(named.begin(), named.end(), column.name) == named.end() && !find_levels(options_, column.name)) {
        frame_.refuse_slip(column);
      }
      const Factor& factor = this->factor(variable.expression);
      if (factor.levels.size() < 2) {
        refuse_formula(formula_, {.column = variable.expression.column,
                                  .variable = column.name,
                                  .what = fmt::format("the factor has one level in the rows used, {}",
                                                      quote(factor.levels.front())),
                                  .expected = "two or more",
                                  .advice = "leave it out of the formula"});
      }
      coded.levels = factor.levels;
      code = factor.code;
    } else {
      expect_numbers(variable.expression, variable.label);
      number = frame_.numbers(variable.expression, variable.label);
    }
    made.coded.push_back(std::move(coded));
    made.data.number.push_back(std::move(number));
    made.data.code.push_back(std::move(code));
  }
  return made;
}

const Factor& Variables::factor(const Node& name) {
  const Column& column = frame_.column(name);
  const auto known = factors_.find(column.name);
  if (known != factors_.end()) return known->second;
  Factor factor = frame_.distinct(column);
  order_levels(column, factor);
  note_twins(column, factor.levels);
  return factors_.emplace(column.name, std::move(factor)).first->second;
}

// Levels that differ in capital letters only are mostly one level, and silently make another model.
void Variables::note_twins(const Column& column, const std::vector<std::string>& levels) {
  constexpr std::size_t kMost = 10'000;  // more than anybody types
  if (column.numeric || levels.size() > kMost) return;
  std::unordered_map<std::string, std::string> seen;
  for (const std::string& level : levels) {
    std::string small = level;
    for (char& c : small) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    const auto [other, is_new] = seen.emplace(small, level);
    if (is_new) continue;
    notes_.push_back(fmt::format("'{}': the levels {} and {} differ in capital letters only, and are taken for two",
                                 column.name, quote(other->second), quote(level)));
    return;
  }
}

void Variables::order_levels(const Column& column, Factor& factor) {
  std::vector<std::string> ordered = given_levels(column, factor);
  if (ordered.empty()) {
    ordered = factor.levels;
    sort_levels(ordered);
  }
  reorder(factor, std::move(ordered));
}

// Those of the option that occur, as the data write them; empty when there is no such option.
std::vector<std::string> Variables::given_levels(const Column& column, const Factor& factor) {
  const std::vector<std::string>* const given = find_levels(options_, column.name);
  std::vector<std::string> ordered;
  if (!given) return ordered;
  const CodedVariable seen{.label = column.name, .expression = {}, .factor = true, .levels = factor.levels};
  std::vector<char> listed_level(factor.levels.size(), 0);
  std::vector<std::string> unseen;
  for (const std::string& level : *given) {
    const std::int64_t place = seen.level(level);
    if (place < 0) {
      unseen.push_back(quote(level));
    } else if (listed_level[static_cast<std::size_t>(place)]) {
      throw ModelError({.variable = column.name,
                        .what = fmt::format("the level {} is given twice", quote(level)),
                        .expected = "each level once",
                        .advice = "correct --levels"});
    } else {
      listed_level[static_cast<std::size_t>(place)] = 1;
      ordered.push_back(factor.levels[static_cast<std::size_t>(place)]);
    }
  }
  const auto missed = std::find(listed_level.begin(), listed_level.end(), 0);
  if (missed != listed_level.end()) {
    const auto level = static_cast<std::int32_t>(missed - listed_level.begin());
    const auto row = std::find(factor.code.begin(), factor.code.end(), level) - factor.code.begin();
    const Cell cell = frame_.cell(column, static_cast<std::size_t>(row));
    throw ModelError({.file = frame_.table().name(),
                      .line = cell.line,
                      .column = cell.column,
                      .variable = column.name,
                      .what = "found the level " + quote(cell.text),
                      .expected = fmt::format("one of those given: {}", listed(*given)),
                      .advice = "add it to --levels, or correct the cell"});
  }
  if (!unseen.empty()) {
    notes_.push_back(fmt::format("'{}': no row has the level{} {}, given by --levels; left out", column.name,
                                 unseen.size() == 1 ? "" : "s", listed(unseen)));
  }
  return ordered;
}

}  // namespace sm::mixed
