#include "model/coverage.hpp"

#include <sstream>

namespace sm::test {

int type_of(std::int32_t kind, std::int32_t format) {
  for (std::size_t k = 0; k < kTypes.size(); ++k)
    if (kTypes[k][0] == kind && kTypes[k][1] == format) return static_cast<int>(k);
  return kUntyped;
}

void Coverage::call(const std::string& name, const std::vector<int>& operands, SmStatus answer, bool refused) {
  Count& count = met_[name][operands];
  count.calls += 1;
  count.served += answer == SM_OK;
  answers_[name][answer] += 1;
  refused_ += refused;
}

void Coverage::record(const std::string& situation, std::int64_t order) {
  records_[situation] += 1;
  orders_[order] += 1;
}

void Coverage::add(const Coverage& other) {
  for (const auto& [name, tuples] : other.met_)
    for (const auto& [operands, count] : tuples) {
      met_[name][operands].calls += count.calls;
      met_[name][operands].served += count.served;
    }
  for (const auto& [name, answers] : other.answers_)
    for (const auto& [answer, count] : answers) answers_[name][answer] += count;
  for (const auto& [situation, count] : other.records_) records_[situation] += count;
  for (const auto& [order, count] : other.orders_) orders_[order] += count;
  refused_ += other.refused_;
}

std::int64_t Coverage::calls() const {
  std::int64_t sum = 0;
  for (const auto& [name, answers] : answers_) sum += calls(name);
  return sum;
}

std::int64_t Coverage::calls(const std::string& name) const {
  std::int64_t sum = 0;
  if (const auto found = answers_.find(name); found != answers_.end())
    for (const auto& [answer, count] : found->second) sum += count;
  return sum;
}

std::int64_t Coverage::answers(const std::string& name, SmStatus answer) const {
  const auto found = answers_.find(name);
  if (found == answers_.end()) return 0;
  const auto count = found->second.find(answer);
  return count == found->second.end() ? 0 : count->second;
}

Coverage::Count Coverage::met(const std::string& name, const std::vector<int>& operands) const {
  Count sum;
  const auto found = met_.find(name);
  if (found == met_.end()) return sum;
  for (const auto& [tuple, count] : found->second) {
    bool fits = tuple.size() >= operands.size();
    for (std::size_t k = 0; fits && k < operands.size(); ++k) fits = operands[k] == kAny || operands[k] == tuple[k];
    if (!fits) continue;
    sum.calls += count.calls;
    sum.served += count.served;
  }
  return sum;
}

std::int64_t Coverage::records(const std::string& situation) const {
  const auto found = records_.find(situation);
  return found == records_.end() ? 0 : found->second;
}

std::int64_t Coverage::records_of_order(std::int64_t least, std::int64_t most) const {
  std::int64_t sum = 0;
  for (const auto& [order, count] : orders_) sum += order >= least && order <= most ? count : 0;
  return sum;
}

std::string Coverage::table() const {
  std::ostringstream text;
  text << calls() << " calls, " << refused_ << " refused requests\n";
  for (const auto& [name, answers] : answers_) {
    text << name << ": " << calls(name) << " calls, answers";
    for (const auto& [answer, count] : answers) text << " " << answer << " x" << count;
    text << "\n";
  }
  return text.str();
}

}  // namespace sm::test
