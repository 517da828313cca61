// A fitted model: what the summary prints, the files hold and the plots show.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace sm::mixed {

// A variance (var2 empty) or a covariance of two coefficients; the residual variance is the last, without var1.
struct VarianceComponent {
  std::string group;  // "Subject", "Residual"
  std::string var1;
  std::string var2;
  double vcov = 0.0;
  double sdcor = 0.0;                 // standard deviation, or correlation (NaN when a variance of the two is zero)
  std::optional<double> se_observed;  // none on the boundary
  std::optional<double> se_average;
};

struct FixedEffect {
  std::string name;
  bool aliased = false;
  std::string dependence;  // of an aliased one: "agefa14 = -8*(Intercept) + age"
  double estimate = 0.0;   // of a kept one, as the rest
  double se = 0.0;
  std::optional<double> df;  // Satterthwaite; none where the information is singular or nearly so
  double t = 0.0;
};

// One coefficient of one term, over all levels.
struct RandomEffects {
  std::string group;
  std::string term;  // "(Intercept)"
  std::vector<std::string> levels;
  std::vector<double> estimate;
  std::vector<double> cond_sd;      // given the fixed effects
  std::vector<double> pev_sd;       // sqrt(Var(u - u^)), the fixed effects' uncertainty included
  std::vector<double> reliability;  // 1 - pev / (variance (1 + F)) where there is a pedigree; else empty
};

struct Contrast {
  std::string name;
  std::vector<double> l;  // over all columns of X, aliased ones included
  bool estimable = false;
  std::string reason;     // when not: which columns it would need
  double estimate = 0.0;  // these only when estimable
  double se = 0.0;
  std::optional<double> df;
  double t = 0.0;
};

struct Ratio {
  std::string name;  // "animal / total", "h2"
  double estimate = 0.0;
  std::optional<double> se_delta;  // from the observed information
};

struct Iteration {
  double criterion = 0.0;
  double score = 0.0;  // the largest scaled element of the gradient
  double step = 0.0;   // the length of the step that led here
};

// Positions of the entries of a symmetric matrix, thinned where there are too many to draw.
struct SpyPattern {
  std::int64_t order = 0;
  std::int64_t entries = 0;                                   // of the whole upper triangle
  std::vector<std::pair<std::int64_t, std::int64_t>> places;  // row <= column, of at most some 200,000 of them
};

struct EquationFacts {
  std::int64_t order = 0;
  std::int64_t entries = 0;         // stored: the upper triangle
  std::int64_t factor_entries = 0;  // of U, with the diagonal
  double flops = 0.0;               // multiplications and additions of one factorization
  double bytes = 0.0;               // that a fit is expected to need at its peak
};

enum class Convergence { converged, stopped, not_converged };  // stopped: by the user

struct Fit {
  bool reml = true;
  Convergence convergence = Convergence::not_converged;
  bool variances_given = false;       // a prediction with known variances: nothing was iterated
  std::string optimizer;              // "trust-region Newton", or what had to step in: "NLopt BOBYQA"
  std::vector<std::string> messages;  // in words: boundary terms, doubts
  std::string obstacle;               // that of the messages which says why there is no optimum; may be empty
  std::vector<Iteration> iterations;

  double criterion = 0.0;  // -2 log (restricted) likelihood, constants included
  double loglik = 0.0;
  std::int64_t n_par = 0;
  double aic = 0.0;
  double bic = 0.0;
  std::int64_t observations = 0;
  std::int64_t df_residual = 0;
  double sigma = 0.0;
  bool singular = false;      // on the boundary of the parameter space
  std::vector<double> theta;  // relative Cholesky factors, column-major lower triangles, term after term

  std::vector<VarianceComponent> varcomp;
  std::vector<std::size_t> free;             // those off the boundary, which the information is about
  std::vector<double> information_observed;  // |free| x |free|, by columns
  std::vector<double> information_average;
  std::vector<Ratio> ratios;
  std::vector<FixedEffect> fixef;  // all columns of X in formula order
  std::vector<double> vcov_fixef;  // of the kept ones, rank x rank; empty where there are too many
  std::vector<RandomEffects> ranef;
  std::vector<Contrast> contrasts;
  std::vector<double> fitted;     // of each observation, random effects included
  std::vector<double> residuals;  // response - fitted
  std::vector<double> predicted;  // of new data, when asked

  double log_det_equations = 0.0;   // of the equations in units of the residual variance, kept columns of X
  std::int64_t rank_equations = 0;  // with all columns
  double ypy = 0.0;                 // y'Py
  EquationFacts equations;
  SpyPattern spy_equations;
  SpyPattern spy_factor;
  double seconds = 0.0;
  double peak_bytes = 0.0;
};

}  // namespace sm::mixed
