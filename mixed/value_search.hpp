// Minimization by values alone, for where steps along gradients have failed: the algorithms of NLopt.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <vector>

namespace sm::mixed {

enum class ValueMethod { bobyqa, subplex };

struct ValueSearch {
  std::vector<double> x;  // the best point met
  double value = 0.0;
  std::string name;  // "NLopt BOBYQA"
  bool stopped = false;
};

// `function` answers a value, +inf outside the domain, or nothing to stop the search; what it throws is thrown on.
// `steps` are the first steps of each parameter, not 0.
using ValueFunction = std::function<bool(std::span<const double> x, double& value)>;
ValueSearch search_by_values(const ValueFunction& function, ValueMethod method, std::vector<double> start,
                             std::span<const double> steps, int max_evaluations);

}  // namespace sm::mixed
