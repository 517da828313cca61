// Drives the module with random calls beside the model, and compares after each of them.
#pragma once

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "model/algebra.hpp"
#include "model/coverage.hpp"
#include "model/model.hpp"
#include "support/module_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {

// What a call should leave in an output array: each element within its slack (0: equal).
class Wanted {
 public:
  static constexpr double kUntouched = 777.25;
  explicit Wanted(Index n) : value_(static_cast<std::size_t>(n), kUntouched), slack_(value_.size(), 0.0) {}
  Index size() const { return static_cast<Index>(value_.size()); }
  void clear(Index n) {
    for (Index i = 0; i < n; ++i) set(i, 0.0);
  }
  bool untouched(Index i) const { return value(i) == kUntouched && slack(i) == 0; }
  void set(Index i, double value, double slack = 0) {
    value_.at(static_cast<std::size_t>(i)) = value;
    slack_.at(static_cast<std::size_t>(i)) = slack;
  }
  void set(Index i, const Sum& sum) { set(i, sum.value(), sum.slack()); }
  double value(Index i) const { return value_.at(static_cast<std::size_t>(i)); }
  double slack(Index i) const { return slack_.at(static_cast<std::size_t>(i)); }

 private:
  std::vector<double> value_;
  std::vector<double> slack_;
};

// Kind, format, state, where the factor is, whether tied: "3/22 state 5 in place tied".
std::string situation(const Model& m);

// Beyond this order a record is reset; up to the small one every order of elimination is looked at.
constexpr Index kLargestOrder = 26;
constexpr Index kSmallOrder = 8;
constexpr Index kBlock = 4 * kLargestOrder;  // room for the vectors of a call

class Machine {
 public:
  Machine(HostKind host, std::uint64_t seed);
  // Makes the calls; the account of the first difference, or nothing.
  std::string run(Index steps);
  // Destroys instance and extension; what they have left behind, or nothing.
  std::string close();
  const Coverage& coverage() const { return coverage_; }

  // For the calls.
  Random random;
  SmInstance* instance() { return session_.instance(); }
  SmExtension* extension() { return session_.extension(); }
  const SmFunctionTable& fn() { return session_.fn(); }
  // A record of the pool with a handle; one whose model passes the test, as far as a few draws find it; or null. In
  // some steps the test is passed over, so that every type comes to every place: only() always asks it.
  Model* any();
  Model* any(const std::function<bool(const Model&)>& test);
  Model* only(const std::function<bool(const Model&)>& test);
  // Likewise, and rarely one of those that the call has already.
  Model* other(const std::vector<const Model*>& taken, const std::function<bool(const Model&)>& test);
  Model* vacant();                                  // without a handle
  double* lend(const std::vector<double>& values);  // an array that lives as long as the session
  // An array of n places that holds kUntouched.
  std::vector<double> blank(Index n) const {
    return std::vector<double>(static_cast<std::size_t>(n), Wanted::kUntouched);
  }
  double dyadic() { return random.chance(10) ? 0.0 : random.dyadic(); }
  std::vector<double> dyadics(Index n);
  Index number(const Model& model) const { return &model - records_.data(); }
  // An order for a matrix: through a stretch of calls mostly the same one, so that operands fit each other.
  Index order() { return random.chance(75) ? usual_order_ : random.below(8); }
  // An index near 0 .. n - 1, now and then one far outside.
  Index place(Index n);

  template <class... Arguments>
  void begin(const char* name, const Arguments&... arguments) {
    std::ostringstream text;
    text.precision(17);
    text << name << "(";
    start_call(name);
    ((text << " ", print(text, arguments)), ...);
    text << " )";
    trail_.push_back(text.str());
    if (trail_.size() > 40) trail_.pop_front();
  }
  // The call that was begun last is about a new type, not about what its operand was.
  void asks_for(std::int32_t kind, std::int32_t format) { operands_ = {type_of(kind, format)}; }
  // The answer of the call that was begun last.
  void answer(SmStatus got, SmStatus want);
  // Whether the predictions of this step do not hold: a request was refused, or a pivot fell too near a limit. Records
  // that were drawn for the step are then taken over as they are found, within what may have become of them.
  bool loose();
  void output(const double* got, const Wanted& want);
  void same(double got, double want, double slack, const char* what);
  void wrong(const std::string& text);

 private:
  template <class T>
  static void print(std::ostream& text, const T& value) {
    text << value;
  }
  void print(std::ostream& text, const Model& model);
  void print(std::ostream& text, Model* model);
  void start_call(const char* name);
  void start_step();
  void end_step();
  void compare(Model& model);
  void compare_all();
  void read_all();
  void take_over(Index k);
  void reset(Model& model);
  void keep_small();

  Session session_;
  std::vector<Model> records_;
  std::vector<Model> before_;  // the records when the step began
  std::vector<bool> drawn_;    // those that the step has looked at
  std::vector<std::unique_ptr<double[]>> arrays_;
  std::deque<std::string> trail_;
  std::string name_;
  std::vector<int> operands_;
  Coverage coverage_;
  std::string wrong_;
  Index usual_order_ = 4;
  Index stretch_ = 0;    // steps until the usual order changes
  bool faulty_ = false;  // a request of the next call is going to be refused
  bool armed_ = false;
  bool wide_ = false;  // the step passes over what the generators look for
  Index refused_ = 0;
  Index reader_ = 0;
};

// One operation's generator: chooses arguments, makes the call, predicts it. It may find nothing to do.
struct Call {
  void (*make)(Machine&);
  int weight;
};
const std::vector<Call>& all_calls();

void add_store_calls(std::vector<Call>& list);
void add_assembly_calls(std::vector<Call>& list);
void add_reading_calls(std::vector<Call>& list);
void add_copying_calls(std::vector<Call>& list);
void add_factor_calls(std::vector<Call>& list);
void add_solve_calls(std::vector<Call>& list);
void add_form_calls(std::vector<Call>& list);
void add_product_calls(std::vector<Call>& list);
void add_inverse_form_calls(std::vector<Call>& list);
void add_matrix_form_calls(std::vector<Call>& list);
void add_update_calls(std::vector<Call>& list);
void add_instance_calls(std::vector<Call>& list);
void add_trace_calls(std::vector<Call>& list);
void add_estimability_calls(std::vector<Call>& list);
void add_filling_calls(std::vector<Call>& list);

// The steps that operations have in common, on the model alone.
SmStatus model_resize(Model& m, Index rows, Index cols);
void model_reset(Model& m);
void model_new(Model& m, std::int32_t kind, std::int32_t format);
SmStatus model_assign(Model& m, Index row, Index col, bool add, double value);
SmStatus model_close(Model& m, double tolerance);
// The checks that most operations begin with: empty 0, none 1, not closed 113.
std::optional<SmStatus> not_readable(const Model& m);
// Factors the model as qxsmfact would; call it after the module's call, when a sparse record tells its order.
SmStatus model_factor(Model& m, bool in_place);
// A^- b as qxsminvmultv tells it; a factor that this makes is compared and taken over first.
SmStatus model_inverse_product(Machine& m, Model& x, const double* b, bool same, Index count, Wanted& want);
SmStatus model_solve(const Model& x, const double* b, Wanted& want);  // qxsmsubst for one right-hand side
SmStatus model_invert(Model& x, bool in_place, double tolerance);
bool inverse_is_clear(const Model& x, double tolerance = kTolerance);
SmStatus model_convert(const Model& source, Model& target, bool flag);
SmStatus want_row(const Model& x, Index row, Index start, Wanted& out);
// Reads a closed record back through one of the public readers, in turn.
void read_back(Machine& m, Model& x, Index which);
double element_read(const Model& x, Index row, Index col);  // what qxsmget stores
// Compares one record at once, so that what it holds now can be predicted with.
void settle(Machine& m, Model& x);
// A record whose factor can be predicted; mostly one that has one.
Model* solvable(Machine& m);
// Whether that can be predicted: no pivot near a limit.
bool factor_is_clear(const Model& m);

}  // namespace sm::test
