#include "mixed/variance_blocks.hpp"

#include <cmath>
#include <utility>

namespace sm::mixed {

std::vector<VarianceBlock> variance_blocks(const std::vector<VarianceComponent>& components) {
  std::vector<VarianceBlock> blocks;
  // The first column of a lower triangle says how many coefficients there are.
  for (std::size_t i = 0; i < components.size();) {
    VarianceBlock block{.group = components[i].group, .variances = {}, .correlations = {}};
    std::size_t count = 1;
    while (i + count < components.size() && !components[i + count].var2.empty()) ++count;
    block.correlations.resize(count);
    for (std::size_t column = 0; column < count; ++column) {
      for (std::size_t row = column; row < count && i < components.size(); ++row, ++i) {
        if (row == column) {
          block.variances.push_back(i);
        } else {
          block.correlations[row].push_back(i);
        }
      }
    }
    blocks.push_back(std::move(block));
  }
  return blocks;
}

std::string variance_name(const VarianceComponent& component) {
  std::string name = component.group;
  if (!component.var1.empty()) name += " " + component.var1;
  if (!component.var2.empty()) name += ", " + component.var2;
  return name;
}

std::vector<std::string> boundary_sentences(const std::vector<VarianceComponent>& components) {
  constexpr double kOne = 1.0 - 1e-9;
  std::vector<std::string> sentences;
  for (const VarianceComponent& component : components) {
    const std::string of = "of " + variance_name(component);
    if (component.var2.empty() && component.vcov == 0.0) {
      sentences.push_back("The variance " + of + " is estimated as zero, on the boundary of what it can be.");
    } else if (!component.var2.empty() && std::fabs(component.sdcor) > kOne) {
      sentences.push_back("The correlation " + of + " is estimated as " + (component.sdcor > 0.0 ? "1" : "-1") +
                          ", on the boundary of what it can be.");
    }
  }
  return sentences;
}

}  // namespace sm::mixed
