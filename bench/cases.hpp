// Which sizes of which families a run goes through.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "bench/generators/problem.hpp"

namespace sm::bench {

enum class Size { quick, moderate, full };

struct Case {
  std::string family;
  std::function<Problem()> make;
  std::vector<std::string> phases;  // empty: all of them
};

// Smaller ones first within a family, so that they foretell the larger.
std::vector<Case> cases_of(Size size);
std::vector<int> dense_orders(Size size);

}  // namespace sm::bench
