#include "model/machine.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

namespace sm::test {

namespace {
constexpr std::size_t kRecords = 10;
}

void Machine::print(std::ostream& text, const Model& model) {
  text << '#' << number(model);
  const int type = type_of(model.kind, model.format);
  operands_.push_back(type != kUntyped && model.empty() ? kWithoutEntries : type);
}

void Machine::print(std::ostream& text, Model* model) {
  if (model)
    print(text, *model);
  else
    text << "null";
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
    add_filling_calls(calls);
    return calls;
  }();
  return list;
}

Machine::Machine(HostKind host, std::uint64_t seed)
    : random(seed), session_(host), records_(kRecords), drawn_(kRecords, false) {}

Model* Machine::any() {
  return any([](const Model&) { return true; });
}

Model* Machine::any(const std::function<bool(const Model&)>& test) {
  return only([&](const Model& m) { return wide_ || test(m); });
}

Model* Machine::only(const std::function<bool(const Model&)>& test) {
  for (int draw = 0; draw < 20; ++draw) {
    Model& m = records_[static_cast<std::size_t>(random.below(kRecords))];
    if (!m.handle || !test(m)) continue;
    drawn_[static_cast<std::size_t>(number(m))] = true;
    return &m;
  }
  return nullptr;
}

Model* Machine::other(const std::vector<const Model*>& taken, const std::function<bool(const Model&)>& test) {
  const bool any_at_all = random.chance(5);
  return any([&](const Model& x) {
    return test(x) && (any_at_all || std::find(taken.begin(), taken.end(), &x) == taken.end());
  });
}

Model* Machine::vacant() {
  for (Model& m : records_) {
    if (m.handle) continue;
    drawn_[static_cast<std::size_t>(number(m))] = true;
    return &m;
  }
  return nullptr;
}

Index Machine::place(Index n) {
  constexpr Index kFar[] = {std::numeric_limits<Index>::max(), std::numeric_limits<Index>::min(), Index{1} << 32};
  if (random.chance(2)) return kFar[random.below(3)];
  return random.below(n + 1) - (random.chance(3) ? 1 : 0);
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
  if (wrong_.empty() && !loose()) wrong_ = text;
}

bool Machine::loose() {
  if (armed_) {
    refused_ += session_.host().stop_failing();
    armed_ = faulty_ = false;
  }
  for (std::size_t k = 0; k < records_.size(); ++k)
    if (drawn_[k] && records_[k].unsure) return true;
  return refused_ > 0;
}

void Machine::answer(SmStatus got, SmStatus want) {
  const bool free = loose();
  coverage_.call(name_, operands_, got, refused_ > 0);
  trail_.back() += " -> " + std::to_string(got) + (refused_ > 0 ? " (refused)" : free ? " (unsure)" : "");
  bool told = got == want;
  if (refused_ > 0)
    told = told || got == SM_NO_MEMORY || (got == SM_NOTHING_TO_REPORT && name_ == "qxsmGetANewInstance") ||
           (got == SM_NO_ELEMENT && name_ == "qxsmhermite");
  else if (free)
    told = true;
  if (!told && wrong_.empty()) wrong_ = "answered " + std::to_string(got) + ", not " + std::to_string(want);
}

void Machine::same(double got, double want, double slack, const char* what) {
  if (same_value(got, want) || (slack > 0 && std::fabs(got - want) <= slack)) return;
  std::ostringstream text;
  text.precision(17);
  text << what << " is " << got << ", not " << want << " within " << slack;
  wrong(text.str());
}

void Machine::output(const double* got, const Wanted& want) {
  // What no answer may write stays, whatever happened.
  for (Index i = 0; i < want.size(); ++i)
    if (want.untouched(i) && got[i] != Wanted::kUntouched && wrong_.empty())
      wrong_ = "output " + std::to_string(i) + " is written";
  for (Index i = 0; i < want.size(); ++i)
    same(got[i], want.value(i), want.slack(i), ("output " + std::to_string(i)).c_str());
}

std::string Machine::run(Index steps) {
  const std::vector<Call>& calls = all_calls();
  int total = 0;
  for (const Call& call : calls) total += call.weight;
  for (Index step = 0; step < steps && wrong_.empty(); ++step) {
    Index draw = random.below(total);
    std::size_t k = 0;
    while (draw >= calls[k].weight) draw -= calls[k++].weight;
    start_step();
    calls[k].make(*this);
    end_step();
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
