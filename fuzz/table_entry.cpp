#include "fuzz/table_entry.hpp"

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <optional>
#include <string>
#include <string_view>

#include "mixed/design.hpp"
#include "mixed/error.hpp"
#include "mixed/formula.hpp"
#include "mixed/table.hpp"

namespace sm::fuzz {
namespace {

constexpr const char* kName = "t.csv";
// Numbers, text, both kinds with missing values, odd names.
constexpr const char* kTable =
    "y,x,f,g,n,my x,h\n1,1,a,p,1,0.5,1\n2.5,2,b,q,1,-1,2\n3,4,a,q,2,NA,3\n2,3,c,p,2,2,1\n5,,b,p,3,1e3,2\n"
    "4,6,c,q,3,1,3\n1.5,2,a,,1,7,1\n2.25,9,b,q,2,3,2\n6,5,c,p,3,1,3\n3.5,7,a,q,1,8,1\n";

void promise(bool kept) {
  if (!kept) std::abort();
}

void check(const mixed::ModelError& error) {
  const mixed::Fault& fault = error.fault();
  const std::string_view message = error.what();
  promise(!fault.what.empty() && fault.line >= 0 && fault.column >= 0);
  promise(fault.file.empty() || fault.file == kName || fault.file == "formula");
  promise(!fault.advice.empty() || !fault.expected.empty() || !fault.excerpt.empty());
  promise(fault.line == 0 || fault.file == kName);
  promise(std::none_of(message.begin(), message.end(), [](char c) { return c >= 0 && c < 0x20 && c != '\n'; }));
  promise(std::count(message.begin(), message.end(), '\n') == (fault.excerpt.empty() ? 0 : 2));
}

void check(const mixed::Table& table) {
  for (const mixed::Column& column : table.columns()) {
    const std::size_t cells = column.numeric ? column.number.size() : column.code.size();
    promise(static_cast<std::int64_t>(cells) == table.rows());
    std::int64_t missing = 0;
    for (std::int64_t row = 0; row < table.rows(); ++row) missing += column.missing_at(row) ? 1 : 0;
    promise(missing == column.missing);
    for (const std::int32_t code : column.code) {
      promise(code >= -1 && code < static_cast<std::int32_t>(column.labels.size()));
    }
    // Its last cell is where it is said to be.
    const std::int64_t last = table.rows() - 1;
    const mixed::Cell cell = table.cell(column, last);
    promise(cell.line > 1 && cell.column > 0);
    promise(mixed::is_missing(cell.text) == column.missing_at(last));
    if (!column.numeric && !column.missing_at(last)) {
      promise(cell.text == column.labels[static_cast<std::size_t>(column.code.back())]);
    }
  }
}

void check(const mixed::SparseColumns& x) {
  promise(x.start.size() == static_cast<std::size_t>(x.cols()) + 1 && x.row.size() == x.value.size());
  for (const std::int64_t row : x.row) promise(row >= 0 && row < x.rows);
  promise(std::all_of(x.value.begin(), x.value.end(), [](double v) { return std::isfinite(v); }));
}

void check(const mixed::Model& model) {
  promise(model.rows() > 0 && model.fixed.rank() <= model.fixed.x.cols());
  promise(std::all_of(model.y.begin(), model.y.end(), [](double v) { return std::isfinite(v); }));
  check(model.fixed.x);
  promise(model.fixed.names.size() == static_cast<std::size_t>(model.fixed.x.cols()));
  promise(model.fixed.kept.size() + model.fixed.aliased.size() == model.fixed.names.size());
  for (const mixed::RandomTerm& term : model.random) {
    promise(static_cast<std::int64_t>(term.level.size()) == model.rows());
    promise(term.z.size() == term.level.size() * static_cast<std::size_t>(term.coef_count()));
    for (const std::int64_t level : term.level) promise(level >= 0 && level < term.level_count());
    promise(std::all_of(term.z.begin(), term.z.end(), [](double v) { return std::isfinite(v); }));
  }
}

template <class Make>
auto attempt(Make&& make) -> std::optional<decltype(make())> {
  try {
    return make();
  } catch (const mixed::ModelError& error) {
    check(error);
    return std::nullopt;
  }
}

std::optional<mixed::Model> model_of(const mixed::Table& table, const mixed::Formula& formula) {
  std::optional<mixed::Model> model = attempt([&] { return mixed::build_model(table, formula, {}); });
  if (model) check(*model);
  return model;
}

}  // namespace

void read_table(const std::uint8_t* data, std::size_t size) {
  const std::string_view bytes(reinterpret_cast<const char*>(data), size);
  const std::size_t end = std::min(bytes.find('\n'), bytes.size());
  const auto formula = attempt([&] { return mixed::parse_formula(bytes.substr(0, end)); });
  const auto table =
      attempt([&] { return mixed::Table::parse(std::string(bytes.substr(std::min(end + 1, size))), kName); });
  if (table) check(*table);
  if (!formula) return;
  const auto model = model_of(mixed::Table::parse(kTable, kName), *formula);
  if (!table) return;
  model_of(*table, *formula);
  if (!model) return;
  const auto rows = attempt([&] { return mixed::new_rows(*model->recipe, *table); });
  if (!rows) return;
  check(rows->x);
  promise(rows->random.size() == model->random.size() && rows->x.cols() == model->fixed.x.cols());
}

}  // namespace sm::fuzz
