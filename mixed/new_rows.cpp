// Rows of new data, as the model's own rows were made.
#include <fmt/core.h>

#include <algorithm>
#include <unordered_map>

#include "mixed/design.hpp"
#include "mixed/error.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

// Levels by name, and by number where the names differ only in how it is written.
class LevelIndex {
 public:
  explicit LevelIndex(const std::vector<std::string>& levels) {
    for (std::size_t l = 0; l < levels.size(); ++l) {
      const auto place = static_cast<std::int64_t>(l);
      by_name_.emplace(levels[l], place);
      double value = 0.0;
      if (parse_number(levels[l], value)) by_number_.emplace(value, place);
    }
  }

  std::int64_t find(const std::string& name) const {
    const auto same = by_name_.find(name);
    if (same != by_name_.end()) return same->second;
    double value = 0.0;
    if (!parse_number(name, value)) return -1;
    const auto equal = by_number_.find(value);
    return equal == by_number_.end() ? -1 : equal->second;
  }

 private:
  std::unordered_map<std::string, std::int64_t> by_name_;
  std::unordered_map<double, std::int64_t> by_number_;
};

class NewRowMaker {
 public:
  NewRowMaker(const DesignRecipe& recipe, const Table& table) : recipe_(recipe), frame_(table, recipe.formula) {}

  NewRows run() {
    use_columns();
    frame_.take_rows(MissingValues::drop);
    const auto rows = static_cast<std::int64_t>(frame_.size());
    NewRows made;
    made.row = frame_.rows();
    made.rows_dropped = frame_.table().rows() - rows;
    made.x = sparse_columns(recipe_.fixed, data_of(recipe_.fixed), rows);
    for (const RandomRecipe& random : recipe_.random) made.random.push_back(term(random));
    return made;
  }

 private:
  void use_columns() {
    const auto use_coding = [this](const Coding& coding) {
      for (const CodedVariable& variable : coding.variables) {
        for (const Node* name : names_in(variable.expression)) frame_.use(*name);
      }
    };
    use_coding(recipe_.fixed);
    for (const RandomRecipe& random : recipe_.random) {
      use_coding(random.coding);
      for (const Node& name : random.group) frame_.use(name);
    }
  }

  CodedData data_of(const Coding& coding) const {
    CodedData data;
    for (const CodedVariable& variable : coding.variables) {
      data.number.emplace_back();
      data.code.emplace_back();
      if (variable.factor) {
        data.code.back() = codes(variable);
      } else {
        data.number.back() = frame_.numbers(variable.expression, variable.label);
      }
    }
    return data;
  }

  std::vector<std::int32_t> codes(const CodedVariable& variable) const {
    const Column& column = frame_.column(variable.expression);
    const Factor factor = frame_.distinct(column);
    const LevelIndex index(variable.levels);
    std::vector<std::int32_t> places;
    for (const std::string& level : factor.levels) places.push_back(static_cast<std::int32_t>(index.find(level)));
    std::vector<std::int32_t> codes;
    codes.reserve(factor.code.size());
    for (std::size_t i = 0; i < factor.code.size(); ++i) {
      const std::int32_t place = places[static_cast<std::size_t>(factor.code[i])];
      if (place < 0) unknown_level(column, i, variable);
      codes.push_back(place);
    }
    return codes;
  }

  [[noreturn]] void unknown_level(const Column& column, std::size_t place, const CodedVariable& variable) const {
    const Cell cell = frame_.cell(column, place);
    throw ModelError({.file = frame_.table().name(),
                      .line = cell.line,
                      .column = cell.column,
                      .variable = column.name,
                      .what = fmt::format("found {}, a level that the model has not seen", quote(cell.text)),
                      .expected = fmt::format("one of {}", listed(variable.levels)),
                      .advice = "leave the row out, or fit the model to data with this level"});
  }

  NewRows::Term term(const RandomRecipe& random) const {
    NewRows::Term term;
    term.z = dense_rows(random.coding, data_of(random.coding), static_cast<std::int64_t>(frame_.size()));
    std::vector<Factor> parts;
    for (const Node& name : random.group) parts.push_back(frame_.distinct(frame_.column(name)));
    const LevelIndex index(random.levels);
    term.level.reserve(frame_.size());
    for (std::size_t i = 0; i < frame_.size(); ++i) {
      std::string level;
      for (const Factor& part : parts) {
        if (&part != &parts.front()) level += ':';
        level += part.levels[static_cast<std::size_t>(part.code[i])];
      }
      term.level.push_back(index.find(level));
    }
    term.unseen = std::count(term.level.begin(), term.level.end(), -1);
    return term;
  }

  const DesignRecipe& recipe_;
  Frame frame_;
};

}  // namespace

NewRows new_rows(const DesignRecipe& recipe, const Table& table) { return NewRowMaker(recipe, table).run(); }

}  // namespace sm::mixed
