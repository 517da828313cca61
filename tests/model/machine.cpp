#include "model/machine.hpp"

#include <algorithm>
#include <cmath>

namespace sm::test {

namespace {
constexpr std::size_t kRecords = 7;
}

std::string situation(const Model& m) {
  std::string text = std::to_string(m.kind) + "/" + std::to_string(m.format) + " state " + std::to_string(m.state);
  if (m.dense() && m.state >= SM_STATE_FACTORED) text += m.separate ? " separate" : " in place";
  return text + (m.lent ? " tied" : "");
}

const std::vector<Call>& all_calls() {
  static const std::vector<Call> list = [] {
    std::vector<Call> calls;
    add_store_calls(calls);
    add_assembly_calls(calls);
    add_reading_calls(calls);
    add_copying_calls(calls);
    add_factor_calls(calls);
    add_solve_calls(calls);
    add_form_calls(calls);
    add_product_calls(calls);
    add_inverse_form_calls(calls);
    add_matrix_form_calls(calls);
    add_update_calls(calls);
    add_instance_calls(calls);
    add_trace_calls(calls);
    add_estimability_calls(calls);
    return calls;
  }();
  return list;
}

Machine::Machine(HostKind host, std::uint64_t seed) : random(seed), session_(host), records_(kRecords) {}

Model* Machine::any() {
  return any([](const Model&) { return true; });
}

Model* Machine::any(const std::function<bool(const Model&)>& test) {
  for (int draw = 0; draw < 12; ++draw) {
    Model& m = records_[static_cast<std::size_t>(random.below(kRecords))];
    if (m.handle && test(m)) return &m;
  }
  return nullptr;
}

Model* Machine::vacant() {
  for (Model& m : records_)
    if (!m.handle) return &m;
  return nullptr;
}

double* Machine::lend(const std::vector<double>& values) {
  arrays_.push_back(std::make_unique<double[]>(values.size()));
  std::copy(values.begin(), values.end(), arrays_.back().get());
  return arrays_.back().get();
}

std::vector<double> Machine::dyadics(Index n) {
  std::vector<double> out;
  for (Index i = 0; i < n; ++i) out.push_back(dyadic());
  return out;
}

void Machine::wrong(const std::string& text) {
  if (wrong_.empty()) wrong_ = text;
}

void Machine::answer(SmStatus got, SmStatus want) {
  Count& count = counts_[name_];
  count.calls += 1;
  count.served += got == SM_OK;
  trail_.back() += " -> " + std::to_string(got);
  if (got != want) wrong("answered " + std::to_string(got) + ", not " + std::to_string(want));
}

void Machine::same(double got, double want, double slack, const char* what) {
  if (same_value(got, want) || (slack > 0 && std::fabs(got - want) <= slack)) return;
  std::ostringstream text;
  text.precision(17);
  text << what << " is " << got << ", not " << want << " within " << slack;
  wrong(text.str());
}

void Machine::output(const double* got, const Wanted& want) {
  for (Index i = 0; i < want.size(); ++i)
    same(got[i], want.value(i), want.slack(i), ("output " + std::to_string(i)).c_str());
}

void Machine::compare_all() {
  for (Model& m : records_) {
    const std::string text = difference(m);
    if (!text.empty()) wrong("record " + std::to_string(number(m)) + ": " + text + "\n  model: " + describe(m));
    if (m.handle) met_[situation(m)] += 1;
  }
  if (session_.host().violations() != 0) wrong("the host counts violations");
}

// Values that have grown or shrunk out of the range where predictions are sharp end with their record.
void Machine::keep_small() {
  for (Model& m : records_) {
    bool large = false;
    for (const Values* values : {&m.v, &m.w})
      for (Index r = 0; r < values->rows(); ++r)
        for (Index c = 0; c < values->cols(); ++c) {
          const double x = std::fabs((*values)(r, c));
          large = large || !(x < 1e5) || (x > 0 && x < 1e-6);
        }
    if (!m.handle || (!large && m.rows < 9 && m.cols < 9)) continue;
    begin("qxsmdelete", number(m));
    answer(fn().qxsmdelete(m.handle), SM_OK);
    model_reset(m);
  }
}

std::string Machine::run(Index steps) {
  const std::vector<Call>& calls = all_calls();
  int total = 0;
  for (const Call& call : calls) total += call.weight;
  for (Index step = 0; step < steps && wrong_.empty(); ++step) {
    Index draw = random.below(total);
    std::size_t k = 0;
    while (draw >= calls[k].weight) draw -= calls[k++].weight;
    calls[k].make(*this);
    compare_all();
    if (wrong_.empty()) keep_small();
  }
  if (wrong_.empty()) return "";
  std::string text = wrong_ + "\nlast calls:";
  for (const std::string& line : trail_) text += "\n  " + line;
  for (Model& m : records_)
    if (m.handle) text += "\n  record " + std::to_string(number(m)) + ": " + describe(m);
  return text;
}

std::string Machine::close() {
  session_.close();
  TestHost& host = session_.host();
  if (host.live_pools() == 0 && host.live_blocks() == 0 && host.violations() == 0) return "";
  return std::to_string(host.live_pools()) + " pools, " + std::to_string(host.live_blocks()) + " blocks left, " +
         std::to_string(host.violations()) + " violations";
}

std::optional<SmStatus> not_readable(const Model& m) {
  if (m.empty()) return SM_OK;
  if (m.none()) return SM_UNTYPED;
  if (!m.closed()) return SM_NOT_CLOSED;
  return std::nullopt;
}

}  // namespace sm::test
