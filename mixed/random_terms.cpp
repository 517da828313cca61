#include "mixed/random_terms.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <numeric>
#include <set>
#include <unordered_map>

#include "mixed/error.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr std::int64_t kMostCoefficients = 100;

struct Levels {
  std::vector<std::string> names;
  std::vector<std::int64_t> of_row;
};

// The combinations of levels that occur, those of the first factor varying slowest.
Levels combined(Levels outer, const Factor& inner) {
  const auto width = static_cast<std::int64_t>(inner.levels.size());
  std::vector<std::int64_t> keys(outer.of_row.size());
  for (std::size_t i = 0; i < keys.size(); ++i) keys[i] = outer.of_row[i] * width + inner.code[i];
  std::vector<std::int64_t> distinct = keys;
  std::sort(distinct.begin(), distinct.end());
  distinct.erase(std::unique(distinct.begin(), distinct.end()), distinct.end());
  Levels both;
  both.names.reserve(distinct.size());
  for (const std::int64_t key : distinct) {
    both.names.push_back(outer.names[static_cast<std::size_t>(key / width)] + ":" +
                         inner.levels[static_cast<std::size_t>(key % width)]);
  }
  both.of_row.reserve(keys.size());
  for (const std::int64_t key : keys) {
    both.of_row.push_back(std::lower_bound(distinct.begin(), distinct.end(), key) - distinct.begin());
  }
  return both;
}

Levels levels_of(const std::vector<Node>& group, Variables& variables) {
  Levels levels;
  for (const Node& name : group) {
    const Factor& factor = variables.factor(name);
    if (&name == &group.front()) {
      levels.names = factor.levels;
      levels.of_row.assign(factor.code.begin(), factor.code.end());
    } else {
      levels = combined(std::move(levels), factor);
    }
  }
  return levels;
}

class RandomMaker {
 public:
  RandomMaker(const Formula& formula, const Frame& frame, Variables& variables, const DesignOptions& options)
      : formula_(formula), frame_(frame), variables_(variables), options_(options) {}

  void add(const RandomPart& part, RandomDesign& design) {
    RandomTerm term;
    term.group = part.group_label();
    term.known = part.known;
    Levels levels = levels_of(part.group, variables_);
    Variables::Made made = variables_.make(part.terms);
    Coding coding = make_coding(part.terms, std::move(made.coded), options_.contrasts, kMostCoefficients);
    term.coefs = coding.names;
    check_fixed_twin(part, coding);
    if (part.known.empty()) {
      check_sizes(part, coding, static_cast<std::int64_t>(levels.names.size()));
      term.levels = std::move(levels.names);
      term.level = std::move(levels.of_row);
    } else {
      take_known(part, levels, term);
    }
    term.z = dense_rows(coding, made.data, static_cast<std::int64_t>(frame_.size()));
    note_split_factor(part, coding);
    design.recipes.push_back(
        {.coding = std::move(coding), .group = part.group, .label = term.group, .levels = term.levels});
    design.terms.push_back(std::move(term));
  }

 private:
  void check_sizes(const RandomPart& part, const Coding& coding, std::int64_t levels) const {
    if (levels < 2) {
      refuse(part, "the grouping factor has one level in the rows used", "two or more",
             "leave the term out: its variance cannot be told from the intercept");
    }
    const auto observations = static_cast<std::int64_t>(frame_.size());
    const std::int64_t effects = levels * coding.cols();
    if (options_.variances_given || effects < observations) return;
    refuse(part,
           coding.cols() == 1
               ? fmt::format("has {} for {}", count_of(levels, "level"), count_of(observations, "observation"))
               : fmt::format("has {} ({} of {} levels) for {}", count_of(effects, "random effect"),
                             count_of(coding.cols(), "coefficient"), levels, count_of(observations, "observation")),
           "fewer, or the variances cannot be told from the residual's",
           coding.cols() == 1 ? "leave the term out, or give variances" : "write (x || g), or leave a slope out");
  }

  // Nothing is left for the variance of a group whose levels are fixed effects already: the likelihood does not depend
  // on it.
  void check_fixed_twin(const RandomPart& part, const Coding& coding) const {
    if (options_.variances_given || coding.cols() != 1 || !part.terms.intercept) return;
    std::set<std::string> group;
    for (const Node& name : part.group) group.insert(name.text);
    for (std::size_t t = 0; t < formula_.fixed.terms.size(); ++t) {
      std::set<std::string> factors;
      bool all_factors = true;
      for (const int v : formula_.fixed.terms[t]) {
        const Variable& variable = formula_.fixed.variables[static_cast<std::size_t>(v)];
        all_factors = all_factors && variable.bare() && variables_.is_factor(frame_.column(variable.expression));
        factors.insert(variable.label);
      }
      if (!all_factors || factors != group) continue;
      refuse(part, fmt::format("the fixed part holds '{}' as a factor too", formula_.fixed.label(t)),
             "a group whose levels are no fixed effects, or there is no variance between them to be told",
             part.group.size() > 1 ? "leave it out of one of the two"
                                   : "leave it out of one of the two; a group within it is (1 | a:b), not (1 | a/b)");
    }
  }

  // Levels are the rows of the precision, whether they have records or not.
  void take_known(const RandomPart& part, const Levels& levels, RandomTerm& term) const {
    if (!options_.known) {
      refuse(part, fmt::format("no precision of the name '{}' is given", part.known), "",
             part.known == "pedigree" ? "give --pedigree p.csv" : "give --kinv and --ids, or leave '; name' out");
    }
    KnownPrecision known = options_.known(part.known);
    std::unordered_map<std::string, std::int64_t> row_of;
    row_of.reserve(known.labels.size());
    for (std::size_t r = 0; r < known.labels.size(); ++r) row_of.emplace(known.labels[r], static_cast<std::int64_t>(r));
    std::vector<std::int64_t> rows;
    rows.reserve(levels.names.size());
    for (const std::string& name : levels.names) {
      const auto found = row_of.find(name);
      if (found == row_of.end()) unknown_level(part, levels, static_cast<std::int64_t>(rows.size()));
      rows.push_back(found->second);
    }
    term.level.reserve(levels.of_row.size());
    for (const std::int64_t level : levels.of_row) term.level.push_back(rows[static_cast<std::size_t>(level)]);
    term.levels = std::move(known.labels);
    term.precision = std::move(known.precision);
  }

  [[noreturn]] void unknown_level(const RandomPart& part, const Levels& levels, std::int64_t level) const {
    const auto row = std::find(levels.of_row.begin(), levels.of_row.end(), level) - levels.of_row.begin();
    const Cell cell = frame_.cell(frame_.column(part.group.front()), static_cast<std::size_t>(row));
    const bool pedigree = part.known == "pedigree";
    throw ModelError({.file = frame_.table().name(),
                      .line = cell.line,
                      .column = cell.column,
                      .variable = part.group_label(),
                      .what = fmt::format("{} is not in {}", quote(levels.names[static_cast<std::size_t>(level)]),
                                          pedigree ? "the pedigree" : fmt::format("the labels of '{}'", part.known)),
                      .advice = pedigree ? "add a row for it there, with unknown parents if need be"
                                         : "add it there, or leave the row out of the data"});
  }

  void note_split_factor(const RandomPart& part, const Coding& coding) {
    if (!part.uncorrelated || coding.cols() == 1) return;
    const auto factor = std::find_if(coding.variables.begin(), coding.variables.end(),
                                     [](const CodedVariable& variable) { return variable.factor; });
    if (factor == coding.variables.end()) return;
    variables_.notes().push_back(
        fmt::format("({} || {}): the levels of the factor '{}' stay correlated with each other",
                    coding.terms.front().label, part.group_label(), factor->label));
  }

  [[noreturn]] void refuse(const RandomPart& part, const std::string& what, const std::string& expected,
                           const std::string& advice) const {
    refuse_formula(
        formula_.text,
        {.column = part.column, .variable = part.group_label(), .what = what, .expected = expected, .advice = advice});
  }

  const Formula& formula_;
  const Frame& frame_;
  Variables& variables_;
  const DesignOptions& options_;
};

}  // namespace

RandomDesign make_random(const Formula& formula, const Frame& frame, Variables& variables,
                         const DesignOptions& options) {
  RandomDesign made;
  RandomMaker maker(formula, frame, variables, options);
  for (const RandomPart& part : formula.random) maker.add(part, made);
  std::vector<std::size_t> order(made.terms.size());
  std::iota(order.begin(), order.end(), 0);
  std::stable_sort(order.begin(), order.end(), [&](std::size_t a, std::size_t b) {
    return made.terms[a].level_count() > made.terms[b].level_count();
  });
  RandomDesign sorted;
  for (const std::size_t place : order) {
    sorted.terms.push_back(std::move(made.terms[place]));
    sorted.recipes.push_back(std::move(made.recipes[place]));
  }
  return sorted;
}

}  // namespace sm::mixed
