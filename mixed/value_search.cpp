#include "mixed/value_search.hpp"

#include <nlopt.h>

#include <algorithm>
#include <cmath>
#include <exception>
#include <limits>
#include <memory>
#include <new>
#include <utility>

namespace sm::mixed {
namespace {

// What stands behind the C interface, which no exception may cross.
struct Context {
  const ValueFunction& function;
  nlopt_opt optimizer;
  ValueSearch best;
  double worst;  // of the finite values met
  std::exception_ptr thrown;
};

// The algorithms fit models to the values: infinity has to look like a high wall.
double wall(const Context& context) {
  return context.worst + 10.0 * (1.0 + std::abs(context.worst - context.best.value));
}

double answer(unsigned count, const double* x, double* /*gradient*/, void* data) {
  Context& context = *static_cast<Context*>(data);
  double value = std::numeric_limits<double>::infinity();
  bool go_on = false;
  try {
    go_on = context.function({x, count}, value);
    if (value < context.best.value) {
      context.best.value = value;
      context.best.x.assign(x, x + count);
    }
  } catch (...) {
    context.thrown = std::current_exception();
  }
  if (!go_on) {
    context.best.stopped = true;
    nlopt_force_stop(context.optimizer);
  }
  if (!std::isfinite(value)) return wall(context);
  context.worst = std::max(context.worst, value);
  return value;
}

}  // namespace

ValueSearch search_by_values(const ValueFunction& function, ValueMethod method, std::vector<double> start,
                             std::span<const double> steps, int max_evaluations) {
  // BOBYQA's models need more than one parameter.
  const bool bobyqa = method == ValueMethod::bobyqa && start.size() > 1;
  const std::unique_ptr<nlopt_opt_s, decltype(&nlopt_destroy)> optimizer(
      nlopt_create(bobyqa ? NLOPT_LN_BOBYQA : NLOPT_LN_SBPLX, static_cast<unsigned>(start.size())), &nlopt_destroy);
  if (!optimizer) throw std::bad_alloc();
  double first = std::numeric_limits<double>::infinity();
  ValueSearch best{.x = start, .name = bobyqa ? "NLopt BOBYQA" : "NLopt Sbplx"};
  best.stopped = !function(start, first);
  best.value = first;
  if (best.stopped) return best;
  Context context{.function = function, .optimizer = optimizer.get(), .best = best, .worst = first, .thrown = {}};
  nlopt_set_min_objective(optimizer.get(), answer, &context);
  nlopt_set_initial_step(optimizer.get(), steps.data());
  nlopt_set_maxeval(optimizer.get(), max_evaluations);
  nlopt_set_xtol_rel(optimizer.get(), 1e-10);
  nlopt_set_ftol_rel(optimizer.get(), 1e-15);
  double value = first;
  const nlopt_result result = nlopt_optimize(optimizer.get(), start.data(), &value);
  if (context.thrown) std::rethrow_exception(context.thrown);
  if (result == NLOPT_OUT_OF_MEMORY) throw std::bad_alloc();
  return std::move(context.best);
}

}  // namespace sm::mixed
