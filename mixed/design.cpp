#include "mixed/design.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "mixed/aliasing.hpp"
#include "mixed/error.hpp"
#include "mixed/random_terms.hpp"
#include "mixed/variables.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr std::int64_t kMostColumns = 20'000;

class ModelBuilder {
 public:
  ModelBuilder(const Table& table, const Formula& formula, const DesignOptions& options)
      : formula_(formula), options_(options), frame_(table, formula.text), variables_(frame_, formula.text, options) {}

  Model run() {
    use_columns();
    frame_.take_rows(options_.missing);
    model_.missing = frame_.missing();
    model_.rows_dropped = frame_.table().rows() - static_cast<std::int64_t>(frame_.size());
    take_weights();
    take_response();
    auto recipe = std::make_shared<DesignRecipe>();
    recipe->formula = formula_.text;
    take_fixed(*recipe);
    RandomDesign random = make_random(formula_, frame_, variables_, options_);
    model_.random = std::move(random.terms);
    recipe->random = std::move(random.recipes);
    model_.recipe = std::move(recipe);
    model_.row = frame_.rows();
    model_.notes.insert(model_.notes.end(), variables_.notes().begin(), variables_.notes().end());
    find_aliased(model_.fixed, model_.weights);
    refuse_saturated();
    return std::move(model_);
  }

 private:
  void use_columns() {
    for (const Node* name : names_in(formula_.response)) frame_.use(*name);
    const auto use_terms = [this](const TermList& list) {
      for (const Variable& variable : list.variables) {
        for (const Node* name : names_in(variable.expression)) frame_.use(*name);
      }
    };
    use_terms(formula_.fixed);
    for (const RandomPart& part : formula_.random) {
      use_terms(part.terms);
      for (const Node& name : part.group) frame_.use(name);
    }
    if (!options_.weights.empty()) frame_.use(option_name(options_.weights));
    for (const std::string& name : options_.factors) frame_.column(option_name(name));
    for (const auto& [name, levels] : options_.levels) frame_.column(option_name(name));
  }

  static Node option_name(const std::string& name) { return {.kind = NodeKind::name, .text = name}; }

  void take_weights() {
    if (options_.weights.empty()) return;
    const Node name = option_name(options_.weights);
    std::vector<double> weights = frame_.numbers(name, options_.weights);
    std::vector<char> keep;
    keep.reserve(weights.size());
    for (std::size_t i = 0; i < weights.size(); ++i) {
      if (weights[i] < 0.0) {
        const Cell cell = frame_.cell(frame_.column(name), i);
        throw ModelError({.file = frame_.table().name(),
                          .line = cell.line,
                          .column = cell.column,
                          .variable = options_.weights,
                          .what = fmt::format("found the weight {}", cell.text),
                          .expected = "a positive number",
                          .advice = "a weight is the inverse of a variance, up to a factor"});
      }
      keep.push_back(weights[i] > 0.0);
    }
    const auto zeros = std::erase(weights, 0.0);
    if (zeros > 0) {
      frame_.keep_rows(keep);
      model_.notes.push_back(
          fmt::format("{} with weight 0 left out", count_of(static_cast<std::int64_t>(zeros), "row")));
    }
    if (weights.empty()) {
      throw ModelError({.file = frame_.table().name(),
                        .variable = options_.weights,
                        .what = "no observation is left: every weight is 0",
                        .advice = "give positive weights"});
    }
    model_.weights = std::move(weights);
  }

  void take_response() {
    model_.formula = formula_.text;
    model_.response = formula_.response_label;
    variables_.expect_numbers(formula_.response, "the response");
    model_.y = frame_.numbers(formula_.response, formula_.response_label);
    const bool constant = std::all_of(model_.y.begin(), model_.y.end(), [&](double y) { return y == model_.y[0]; });
    if (!constant || options_.variances_given) return;
    refuse_formula(formula_.text, {.column = formula_.response.column,
                                   .variable = formula_.response_label,
                                   .what = fmt::format("the response is {} in {}", print_number(model_.y[0]),
                                                       model_.y.size() == 1 ? "the one row used" : "all rows used"),
                                   .expected = "values that differ",
                                   .advice = "there is nothing to model"});
  }

  void take_fixed(DesignRecipe& recipe) {
    Variables::Made made = variables_.make(formula_.fixed);
    recipe.fixed = make_coding(formula_.fixed, std::move(made.coded), options_.contrasts, kMostColumns);
    FixedDesign& fixed = model_.fixed;
    fixed.x = sparse_columns(recipe.fixed, made.data, static_cast<std::int64_t>(frame_.size()));
    fixed.names = recipe.fixed.names;
    for (std::size_t t = 0; t < recipe.fixed.terms.size(); ++t) {
      const CodedTerm& term = recipe.fixed.terms[t];
      fixed.term_names.push_back(term.label);
      fixed.term.insert(fixed.term.end(), static_cast<std::size_t>(term.count), static_cast<std::int64_t>(t));
    }
    for (const CodedVariable& variable : recipe.fixed.variables) {
      if (variable.factor) model_.factors.push_back({.name = variable.label, .levels = variable.levels});
    }
    model_.sum_contrasts = options_.contrasts == Contrasts::sum;
  }

  void refuse_saturated() const {
    if (model_.fixed.rank() < model_.rows() || options_.variances_given) return;
    throw ModelError(
        {.file = frame_.table().name(),
         .what = fmt::format("the fixed part has {} for {}", count_of(model_.fixed.rank(), "independent column"),
                             count_of(model_.rows(), "observation")),
         .expected = "fewer: nothing is left for a variance",
         .advice = "leave terms out, or make a factor of many levels a random term"});
  }

  const Formula& formula_;
  const DesignOptions& options_;
  Frame frame_;
  Variables variables_;
  Model model_;
};

}  // namespace

Model build_model(const Table& table, const Formula& formula, const DesignOptions& options) {
  return ModelBuilder(table, formula, options).run();
}

}  // namespace sm::mixed
