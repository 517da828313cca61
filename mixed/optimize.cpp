#include "mixed/optimize.hpp"

#include <algorithm>
#include <cmath>
#include <limits>
#include <utility>

#include "mixed/error.hpp"
#include "mixed/search.hpp"

namespace sm::mixed {
namespace {

// Differences of values below this part of their size are rounding; the gradient tells then whether a step led down.
constexpr double kValueNoise = 1e-8;
// Eigenvalues from differences of gradients below this are looked at again before a point counts as a minimum.
constexpr double kDoubtful = 1e-3;
// What the gradient alone can be trusted with, in units of the function.
constexpr double kGradientNoise = 1e-9;
// Newton decrements below these promise that a step with the true Hessian ends at the minimum: it errs by the square.
// Of the Hessian from differences where it began not much is lost on the way: nothing that counts where the way is
// short, and where the Hessian can be approximated, most of the change is seen in the approximation.
constexpr double kVeryNear = 1e-8;
constexpr double kNear = 1e-5;
// Of the tolerance: what one more step is not worth an evaluation for.
constexpr double kPolished = 1e-3;

}  // namespace

Search::Search(const Objective& objective, std::vector<double> start, const MinimiseOptions& options)
    : objective_(objective), options_(options), x_(std::move(start)) {
  double largest = 0.0;
  for (const double v : x_) largest = std::max(largest, std::abs(v));
  if (largest > 0.0) size_ = largest;
  at_ = evaluate(x_);
  here_ = true;
  if (!std::isfinite(at_.value)) {
    throw ModelError({.what = "the criterion has no finite value at the starting values",
                      .advice = "start from other ones (--start), nearer to 1"});
  }
}

// A value without a gradient is of no use here: such a point counts as outside.
Evaluation Search::evaluate(std::span<const double> x) {
  ++evaluations_;
  here_ = false;
  Evaluation e = objective_(x);
  const bool finite = std::isfinite(e.value) &&
                      std::all_of(e.gradient.begin(), e.gradient.end(), [](double g) { return std::isfinite(g); });
  if (!finite) e.value = std::numeric_limits<double>::infinity();
  return e;
}

std::vector<double> Search::naturals() const {
  std::vector<double> lengths(x_.size());
  for (std::size_t i = 0; i < lengths.size(); ++i) lengths[i] = natural(i);
  return lengths;
}

// No parameter goes beyond three times the largest of its past: far out a likelihood is flat, and says nothing.
double Search::shorten(TrialStep& step) const {
  double factor = 1.0;
  for (std::size_t i = 0; i < x_.size(); ++i) {
    const double most = 2.0 * std::max(std::abs(x_[i]), size_);
    if (std::abs(step.p[i]) > most) factor = std::min(factor, most / std::abs(step.p[i]));
  }
  if (factor == 1.0) return 1.0;
  for (double& v : step.p) v *= factor;
  step.length *= factor;
  step.predicted = -dot(at_.gradient, step.p) - 0.5 * dot(step.p, hessian_times(step.p));
  return factor;
}

// By how much the function fell. Near the minimum values drown in rounding, and gradients at both ends do better.
double Search::decrease(const TrialStep& step, const Evaluation& trial) const {
  const double noise = kValueNoise * std::max(1.0, std::abs(at_.value));
  const double fall = at_.value - trial.value;
  if (step.predicted > noise || fall < -noise) return fall;
  return -0.5 * (dot(at_.gradient, step.p) + dot(trial.gradient, step.p));
}

bool Search::mispredicted(const TrialStep& step, std::span<const double> gradient) const {
  const std::vector<double> expected = hessian_times(step.p);
  double error = 0.0;
  double change = 0.0;
  for (std::size_t i = 0; i < expected.size(); ++i) {
    const double inverse = 1.0 / (scale_[i] * scale_[i]);
    const double miss = gradient[i] - at_.gradient[i] - expected[i];
    error += miss * miss * inverse;
    change += expected[i] * expected[i] * inverse;
  }
  return error > 0.25 * change;
}

void Search::move(std::span<const double> p, Evaluation&& there) {
  x_ = shifted(x_, p);
  const Evaluation before = std::exchange(at_, std::move(there));
  here_ = true;
  const double length = scaled_norm(p, scale_);
  fresh_ = fresh_ && length * length <= 4.0 * nearly() && follow_hessian(p, before.gradient);
  rejected_ = 0;
  if (!report(std::sqrt(dot(p, p)))) stopped_ = true;
}

// Notes where the search has come to; false when the caller wants no more.
bool Search::report(double step) {
  double score = 0.0;
  for (std::size_t i = 0; i < x_.size() && !scale_.empty(); ++i) {
    score = std::max(score, std::abs(at_.gradient[i]) / scale_[i]);
  }
  iterations_.push_back({.criterion = at_.value, .score = score, .step = step});
  return !options_.progress || options_.progress(iterations_.back());
}

// Whether a short way along a direction leads down, to either side; if so the search goes on from there.
bool Search::leads_down(std::span<const double> direction) {
  double part = 0.1 / scaled_norm(direction, scale_);
  for (std::size_t i = 0; i < x_.size(); ++i) {
    const double most = 0.1 * std::max(std::abs(x_[i]), 0.1 * size_);
    if (std::abs(part * direction[i]) > most) part = most / std::abs(direction[i]);
  }
  for (const double sign : {1.0, -1.0}) {
    std::vector<double> p(direction.begin(), direction.end());
    for (double& v : p) v *= sign * part;
    Evaluation there = evaluate(shifted(x_, p));
    if (!std::isfinite(there.value)) continue;
    const double noise = kValueNoise * std::max(1.0, std::abs(at_.value));
    if (dot(there.gradient, p) >= -kGradientNoise || there.value > at_.value + noise) continue;
    move(p, std::move(there));
    return true;
  }
  return false;
}

// A stationary point is a minimum when no direction bends down: those whose curvature is in doubt are walked along.
bool Search::is_minimum(const Spectrum& spectrum) {
  for (std::size_t j = 0; j < x_.size() && spectrum.values[j] < kDoubtful; ++j) {
    if (spectrum.values[j] < -kDoubtful || leads_down(spectrum.direction(j))) return false;
  }
  return true;
}

// How small a decrement makes the next step with the true Hessian the last one.
double Search::nearly() const { return approximation_.empty() ? kVeryNear : kNear; }

bool Search::settled(double tolerance) {
  const double enough = fresh_ ? tolerance : std::max(tolerance, nearly());
  if (!(newton_decrement(decompose(hessian_, scale_), at_.gradient) <= enough)) return false;
  if (!fresh_) refresh();
  const Spectrum spectrum = decompose(hessian_, scale_);
  return newton_decrement(spectrum, at_.gradient) <= tolerance && is_minimum(spectrum);
}

// The Hessian at hand makes one more step cheap, and it leaves next to nothing of the gradient.
void Search::polish() {
  const Spectrum spectrum = decompose(hessian_, scale_);
  if (here_ && newton_decrement(spectrum, at_.gradient) <= kPolished * options_.tolerance) return;
  const TrialStep step = trust_region_step(spectrum, at_.gradient, radius_);
  Evaluation there = evaluate(shifted(x_, step.p));
  const double noise = kValueNoise * std::max(1.0, std::abs(at_.value));
  if (!(there.value <= at_.value + noise)) return;
  if (!(newton_decrement(spectrum, there.gradient) < 0.25 * newton_decrement(spectrum, at_.gradient))) return;
  x_ = shifted(x_, step.p);
  at_ = std::move(there);
  here_ = true;
}

// One trial step; false when there is no way on.
bool Search::try_step() {
  TrialStep step = trust_region_step(decompose(hessian_, scale_), at_.gradient, radius_);
  const double factor = shorten(step);
  if (!(step.length > 1e-13 * scaled_norm(naturals(), scale_)) || rejected_ > 40) return false;
  Evaluation there = evaluate(shifted(x_, step.p));
  const bool finite = std::isfinite(there.value);
  const double ratio = finite && step.predicted > 0.0 ? decrease(step, there) / step.predicted : -1.0;
  // Of a step as short as this only rounding is to be learnt.
  const bool same = fresh_ && step.length * step.length <= 4.0 * nearly();
  const bool wrong = finite && !same && mispredicted(step, there.gradient);
  misjudged_ += wrong ? 1 : 0;
  const std::vector<double> before = at_.gradient;
  if (finite && !same) update(step.p, there.gradient, before);
  if (ratio < 0.1) {
    radius_ = 0.25 * step.length;
  } else if (ratio > 0.75 && step.bounded && factor == 1.0) {
    radius_ = std::max(radius_, 3.0 * step.length);
  }
  const bool accepted = ratio > 1e-4;
  if (accepted) {
    move(step.p, std::move(there));
  } else {
    ++rejected_;
  }
  if (stopped_) return true;
  const bool renewed = accepted && renew_model(step, before);
  // A model that misjudges is made anew, but not twice at one place.
  if (wrong && !renewed && (accepted || rejected_ == (options_.curvature ? 3 : 1))) refresh();
  return true;
}

Search::Ending Search::newton(int iterations) {
  scale_.clear();
  correction_.clear();
  rejected_ = 0;
  if (!approximate()) refresh();
  if (iterations_.empty() && !report(0.0)) return Ending::stopped;
  for (int k = 0; k < iterations; ++k) {
    if (settled(options_.tolerance)) {
      polish();
      return Ending::converged;
    }
    if (stopped_) return Ending::stopped;
    if (!try_step()) break;
    if (stopped_) return Ending::stopped;
  }
  // No step leads on: the place is judged by what rounding allows, ten times as far in the parameters.
  if (settled(100.0 * options_.tolerance)) return Ending::converged;
  return stopped_ ? Ending::stopped : Ending::stuck;
}

Search::Ending Search::by_values(ValueMethod method) {
  std::vector<double> steps = naturals();
  for (double& step : steps) step *= 0.3;
  Evaluation best = at_;
  const ValueFunction function = [&](std::span<const double> x, double& value) {
    Evaluation there = evaluate(x);
    value = there.value;
    if (!(value < best.value)) return true;
    std::vector<double> p(x.begin(), x.end());
    for (std::size_t i = 0; i < p.size(); ++i) p[i] -= x_[i];
    x_.assign(x.begin(), x.end());
    at_ = best = std::move(there);
    return report(std::sqrt(dot(p, p)));
  };
  const ValueSearch found = search_by_values(function, method, x_, steps, 500 + 100 * static_cast<int>(x_.size()));
  name_ = found.name;
  if (found.stopped) return Ending::stopped;
  scale_.clear();
  refresh();
  // Values alone do not see below the root of their rounding.
  return settled(options_.derivative_free ? std::max(options_.tolerance, 1e-8) : options_.tolerance) ? Ending::converged
                                                                                                     : Ending::stuck;
}

void Search::search_without_derivatives(Ending& ending) {
  for (const ValueMethod method : {ValueMethod::bobyqa, ValueMethod::subplex}) {
    if (ending != Ending::stuck) return;
    ending = by_values(method);
    if (ending != Ending::stuck || options_.derivative_free) continue;
    const std::size_t before = iterations_.size();
    ending = newton(50);
    if (iterations_.size() > before) name_ += ", then trust-region Newton";
  }
}

Minimum Search::run() {
  Ending ending = x_.empty() ? Ending::converged : Ending::stuck;
  if (x_.empty()) report(0.0);
  if (!x_.empty() && !options_.derivative_free) ending = newton(options_.max_iterations);
  search_without_derivatives(ending);
  // After a stop nothing dear is begun; after the last short step the Hessian is as good as that before it.
  if (ending == Ending::stuck && !fresh_) refresh();
  return {.x = x_,
          .value = at_.value,
          .gradient = at_.gradient,
          .hessian = hessian_,
          .convergence = ending == Ending::converged ? Convergence::converged
                         : ending == Ending::stopped ? Convergence::stopped
                                                     : Convergence::not_converged,
          .optimizer = name_,
          .iterations = iterations_,
          .evaluations = evaluations_};
}

Minimum minimise(const Objective& objective, std::vector<double> start, const MinimiseOptions& options) {
  return Search(objective, std::move(start), options).run();
}

}  // namespace sm::mixed
