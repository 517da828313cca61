// What surrounds the calls of a step: refused requests, the comparison of all records, the end of large ones.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

void Machine::start_step() {
  before_ = records_;
  drawn_.assign(drawn_.size(), false);
  name_.clear();
  refused_ = 0;
  faulty_ = random.chance(6);
  wide_ = random.chance(20);
  if (stretch_-- > 0) return;
  stretch_ = 60 + random.below(120);
  usual_order_ = random.chance(20)   ? random.below(4)
                 : random.chance(12) ? kSmallOrder + 1 + random.below(kLargestOrder - kSmallOrder - 2)
                                     : 4 + random.below(4);
}

void Machine::start_call(const char* name) {
  // Of several calls in a step the records of each are compared before the next.
  if (!name_.empty() && !loose())
    for (std::size_t k = 0; k < records_.size(); ++k)
      if (drawn_[k]) compare(records_[k]);
  name_ = name;
  operands_.clear();
  if (!faulty_ || armed_) return;
  session_.host().fail_request(random.below(5), random.chance(50));
  armed_ = true;
}

void Machine::compare(Model& m) {
  const std::string text = difference(m);
  if (!text.empty() && wrong_.empty())
    wrong_ = "record " + std::to_string(number(m)) + ": " + text + "\n  model: " + describe(m);
}

void Machine::compare_all() {
  for (Model& m : records_) {
    compare(m);
    if (m.handle) coverage_.record(situation(m), m.rows);
  }
}

// Every closed record is read through the module too, by one operation after the other.
void Machine::read_all() {
  reader_ += 1;
  for (Model& m : records_)
    if (m.handle && m.closed() && !m.empty() && wrong_.empty()) read_back(*this, m, reader_);
}

// After a refused request a record of the call is as it was, as predicted, or something on the way; on the way it keeps
// its elements unless the call was to write it.
void Machine::take_over(Index k) {
  Model& m = records_[static_cast<std::size_t>(k)];
  Model predicted = m;
  if (!m.handle) return;
  Model& before = before_[static_cast<std::size_t>(k)];
  const std::optional<Model> now = found(before, m.handle);
  if (!now) return reset(m);
  const bool written = predicted.touched != before.touched || before.handle != m.handle;
  if (Model same = before; before.handle == m.handle && difference(same).empty()) {
    m = same;
    return;
  }
  if (!m.unsure && difference(predicted).empty()) {
    m = predicted;
    return;
  }
  const bool unsure = m.unsure;
  m = *now;
  m.touched = predicted.touched;
  compare(m);
  if (!written && !unsure && !kept(m, before, predicted) && wrong_.empty())
    wrong_ = "record " + std::to_string(k) + " has changed though memory was refused\n  before: " + describe(before) +
             "\n  now: " + describe(m);
}

void Machine::reset(Model& m) {
  begin("qxsmdelete", m);
  answer(fn().qxsmdelete(m.handle), SM_OK);
  model_reset(m);
}

void Machine::end_step() {
  faulty_ = false;
  if (loose())
    for (std::size_t k = 0; k < records_.size(); ++k)
      if (drawn_[k]) take_over(static_cast<Index>(k));
  drawn_.assign(drawn_.size(), false);
  refused_ = 0;
  name_.clear();
  compare_all();
  read_all();
  if (session_.host().violations() != 0 && wrong_.empty()) wrong_ = "the host counts violations";
  keep_small();
}

// Values that have grown or shrunk out of the range where predictions are sharp end with their record.
void Machine::keep_small() {
  for (Model& m : records_) {
    if (!m.handle || !wrong_.empty()) continue;
    bool large = m.rows > kLargestOrder || m.cols > kLargestOrder;
    for (const Values* values : {&m.v, &m.w})
      for (Index r = 0; r < values->rows() && !large; ++r)
        for (Index c = 0; c < values->cols(); ++c) {
          const double x = std::fabs((*values)(r, c));
          large = large || !(x < 1e5) || (x > 0 && x < 1e-6);
        }
    if (large) reset(m);
  }
}

}  // namespace sm::test
