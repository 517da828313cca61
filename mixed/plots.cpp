#include "mixed/plots.hpp"

namespace sm::mixed {

std::vector<NamedText> plots(const Model& model, const Fit& fit) {
  return {{"caterpillar.svg", caterpillar_plot(model, fit)},
          {"residuals.svg", residual_plot(model, fit)},
          {"qq.svg", quantile_plot(model, fit)},
          {"criterion.svg", criterion_plot(model, fit)},
          {"spy.svg", spy_plot(model, fit)}};
}

void write_plots(const std::string& folder, const Model& model, const Fit& fit) {
  write_files(folder, plots(model, fit));
}

}  // namespace sm::mixed
