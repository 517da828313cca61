// The tables of a summary; each is empty when there is nothing to tell.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

constexpr std::size_t kWidth = 100;  // of the summary's lines

std::string shown_name(const std::string& name);  // printable, and cut where it would fill a line

std::string variance_table(const Fit& fit);
std::string fixed_table(const Fit& fit);
std::string dependences(const Fit& fit);  // of the aliased columns
std::string correlation_table(const Fit& fit, std::size_t most);
std::string contrast_table(const Fit& fit);
std::string ratio_table(const Fit& fit);

// Residuals with variance one where the model holds: sqrt(weight) * residual / sigma. Empty without a sigma.
std::vector<double> standardised_residuals(const Model& model, const Fit& fit);

}  // namespace sm::mixed
