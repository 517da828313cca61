// Functions of variance components that people ask for: heritabilities, repeatabilities.
#pragma once

#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "mixed/fit.hpp"

namespace sm::mixed {

// A ratio as written, compiled for the components of one model.
class RatioFunction {
 public:
  struct Value {
    double value = 0.0;
    std::vector<double> gradient;  // with respect to each of the variance components
  };

  const std::string& name() const { return name_; }
  // `components`: the values of the variance components, in the order that the function was made for.
  Value operator()(std::span<const double> components) const;

 private:
  friend class RatioParser;
  friend std::vector<RatioFunction> default_ratios(std::span<const VarianceComponent> components);
  enum class Step { number, sum, add, subtract, multiply, divide, negate };
  struct Instruction {
    Step step;
    double number = 0.0;
    std::vector<std::size_t> components{};  // of a sum
  };

  std::string name_;
  std::vector<Instruction> program_;  // operands before their operation
};

// "h2 = animal / (animal + residual)", or without a name, for which the text then stands. What can be added,
// subtracted, multiplied and divided: numbers; a group with one variance; group[term] and the covariance
// group[term, term]; residual; total, the sum of all variances. Names with other characters than letters, digits and
// . _ : stand in backquotes. Only the names of the components are looked at. Throws ModelError with the column of
// `text`.
RatioFunction parse_ratio(const std::string& text, std::span<const VarianceComponent> components);

// What is told when nothing is asked: "animal / total" for each variance but the residual one.
std::vector<RatioFunction> default_ratios(std::span<const VarianceComponent> components);

// The estimate with its standard error by the delta method. `covariance` is that of the components at places `free`,
// |free| x |free|; the others are on the boundary and count as known. When it is empty there is no standard error.
Ratio estimate_ratio(const RatioFunction& ratio, std::span<const VarianceComponent> components,
                     std::span<const std::size_t> free, std::span<const double> covariance);

}  // namespace sm::mixed
