#include "random_models.hpp"

#include <cmath>
#include <memory>

#include "mixed/eigenvalues.hpp"

namespace sm::mixed::test {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

using Column = std::vector<double>;

void append(FixedDesign& fixed, const Column& column, const std::string& name, bool aliased) {
  for (std::size_t i = 0; i < column.size(); ++i) {
    if (column[i] == 0.0) continue;
    fixed.x.row.push_back(static_cast<std::int64_t>(i));
    fixed.x.value.push_back(column[i]);
  }
  const std::int64_t j = fixed.x.cols();
  fixed.x.start.push_back(static_cast<std::int64_t>(fixed.x.row.size()));
  fixed.names.push_back(name);
  fixed.term.push_back(j);
  fixed.term_names.push_back(name);
  (aliased ? fixed.aliased : fixed.kept).push_back(j);
}

std::vector<Column> kept_columns(const ModelShape& shape, Random& random) {
  const std::size_t n = at(shape.rows);
  std::vector<Column> columns;
  if (shape.intercept) columns.emplace_back(n, 1.0);
  for (std::int64_t j = 0; j < shape.numeric; ++j) {
    Column column(n);
    for (double& value : column)
      value = shape.offset + (shape.offset != 0.0 ? double(random.below(31)) : random.normal());
    columns.push_back(column);
    if (shape.offset == 0.0) continue;
    for (double& value : column) value *= value;
    columns.push_back(column);
  }
  for (std::int64_t level = 1; level < shape.factor; ++level) {
    Column column(n, 0.0);
    for (std::size_t i = 0; i < n; ++i) column[i] = (i * 7 + i / 5) % at(shape.factor) == at(level) ? 1.0 : 0.0;
    columns.push_back(column);
  }
  return columns;
}

FixedDesign fixed_design(const ModelShape& shape, Random& random) {
  FixedDesign fixed;
  fixed.x.rows = shape.rows;
  const std::vector<Column> columns = kept_columns(shape, random);
  for (const Column& column : columns) append(fixed, column, "x" + std::to_string(fixed.x.cols()), false);
  for (std::int64_t a = 0; a < shape.aliased; ++a) {
    Column sum(at(shape.rows), 0.0);
    for (std::size_t j = 0; j < columns.size(); ++j) {
      const double factor = (at(a) + j) % 3 == 2 ? 0.0 : static_cast<double>(j + at(a)) - 1.5;
      fixed.dependence.push_back(factor);
      for (std::size_t i = 0; i < sum.size(); ++i) sum[i] += factor * columns[j][i];
    }
    append(fixed, sum, "a" + std::to_string(a), true);
  }
  return fixed;
}

// A random walk along the levels, tied to zero at its first one when it is a chain; around a circle when it is a ring.
std::shared_ptr<const Precision> precision_of(Field field, std::int64_t order) {
  if (field == Field::independent) return nullptr;
  auto made = std::make_shared<Precision>();
  made->order = order;
  made->row_start = {0};
  Eigen::MatrixXd dense = Eigen::MatrixXd::Zero(order, order);
  const auto link = [&](std::int64_t i, std::int64_t j, double weight) {
    dense(i, i) += weight;
    dense(j, j) += weight;
    dense(i, j) -= weight;
    dense(j, i) -= weight;
  };
  for (std::int64_t i = 0; i + 1 < order; ++i) link(i, i + 1, 1.0 + 0.25 * static_cast<double>(i % 3));
  if (field == Field::ring) link(0, order - 1, 0.5);
  if (field == Field::chain) dense(0, 0) += 1.0;
  for (std::int64_t i = 0; i < order; ++i) {
    for (std::int64_t j = i; j < order; ++j) {
      if (dense(i, j) == 0.0) continue;
      made->col.push_back(j);
      made->value.push_back(dense(i, j));
    }
    made->row_start.push_back(static_cast<std::int64_t>(made->col.size()));
  }
  const Eigen::VectorXd eigenvalues = eigenvalues_of(dense);
  const bool singular = field == Field::ring;
  for (Eigen::Index i = singular ? 1 : 0; i < order; ++i) made->log_det += std::log(eigenvalues(i));
  if (singular) {
    made->nullity = 1;
    made->null_basis.assign(at(order), 1.0 / std::sqrt(static_cast<double>(order)));
    made->null_rows = {order / 2};
  }
  return made;
}

RandomTerm random_term(const TermShape& shape, std::int64_t rows, std::size_t number, Random& random) {
  RandomTerm term;
  term.group = "g" + std::to_string(number);
  for (std::int64_t c = 0; c < shape.coefs; ++c) term.coefs.push_back(c == 0 ? "(Intercept)" : "z" + std::to_string(c));
  for (std::int64_t l = 0; l < shape.levels; ++l) term.levels.push_back(std::to_string(l));
  for (std::int64_t i = 0; i < rows; ++i) {
    term.level.push_back(random.below(shape.levels));
    term.z.push_back(1.0);
    for (std::int64_t c = 1; c < shape.coefs; ++c) {
      term.z.push_back(shape.centred ? random.normal() : 2005.0 + static_cast<double>(random.below(20)) - 10.0);
    }
  }
  term.precision = precision_of(shape.field, shape.levels);
  return term;
}

}  // namespace

double Random::uniform() {
  state_ = state_ * UINT64_C(6364136223846793005) + UINT64_C(1442695040888963407);
  return (static_cast<double>(state_ >> 11) + 0.5) / 9007199254740992.0;
}

double Random::normal() { return std::sqrt(-2.0 * std::log(uniform())) * std::cos(6.283185307179586 * uniform()); }

std::int64_t Random::below(std::int64_t count) {
  return static_cast<std::int64_t>(uniform() * static_cast<double>(count));
}

Model random_model(const ModelShape& shape, std::uint64_t seed) {
  Random random(seed);
  Model model;
  model.fixed = fixed_design(shape, random);
  for (const TermShape& term : shape.terms) {
    model.random.push_back(random_term(term, shape.rows, model.random.size(), random));
  }
  model.y.resize(at(shape.rows));
  for (double& y : model.y) y = shape.response_offset + shape.noise * random.normal();
  for (std::size_t t = 0; t < model.random.size(); ++t) {
    const RandomTerm& term = model.random[t];
    const auto k = at(term.coef_count());
    std::vector<double> effects(term.levels.size() * k);
    for (double& effect : effects) effect = shape.terms[t].sd * random.normal();
    for (std::size_t i = 0; i < model.y.size(); ++i) {
      model.y[i] += effects[at(term.level[i]) * k];
      for (std::size_t c = 1; c < k; ++c) {
        const double centre = shape.terms[t].centred ? 0.0 : 2005.0;
        model.y[i] += effects[at(term.level[i]) * k + c] * (term.z[i * k + c] - centre);
      }
    }
  }
  for (std::int64_t i = 0; i < shape.rows; ++i) {
    model.row.push_back(i);
    if (shape.weighted) model.weights.push_back(0.25 + 2.0 * random.uniform());
  }
  return model;
}

}  // namespace sm::mixed::test
