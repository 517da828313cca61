// Pictures of a fit, each a self-contained SVG document of less than a megabyte.
#pragma once

#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/folder.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

std::string caterpillar_plot(const Model& model, const Fit& fit);  // random effects in order, with 95 % intervals
std::string residual_plot(const Model& model, const Fit& fit);     // residuals against fitted values
std::string quantile_plot(const Model& model, const Fit& fit);     // normal quantiles of residuals and random effects
std::string criterion_plot(const Model& model, const Fit& fit);    // the criterion and the score by iteration
std::string spy_plot(const Model& model, const Fit& fit);          // patterns of the equations and of their factor

// caterpillar.svg, residuals.svg, qq.svg, criterion.svg, spy.svg
std::vector<NamedText> plots(const Model& model, const Fit& fit);
void write_plots(const std::string& folder, const Model& model, const Fit& fit);  // throws ModelError

}  // namespace sm::mixed
