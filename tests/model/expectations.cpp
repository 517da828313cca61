// What the random calls of an ordinary run have to meet.
#include <functional>
#include <utility>

#include "model/coverage.hpp"

namespace sm::test {

namespace {

bool general(int t) { return t < 3; }
bool symmetric(int t) { return t >= 3 && t < 6; }
bool diagonal(int t) { return t >= 6; }
bool sparse(int t) { return t == 0 || t == 3; }
bool any(int) { return true; }
bool factored(int t) { return !general(t); }
bool packed(int t) { return symmetric(t) && !sparse(t); }
bool inverted(int t) { return packed(t) || diagonal(t); }

using One = bool (*)(int);
using Two = bool (*)(int, int);
using Statuses = std::vector<SmStatus>;

// An operation of one matrix: every type is met, those that `serves` names are answered 0, and each of the answers is
// given.
struct OfOne {
  const char* name;
  One serves;
  Statuses answers;
};

const std::vector<OfOne>& of_one() {
  static const std::vector<OfOne> list = {
      {"qxsmnew", any, {0, 101, 116, 124}},
      {"qxsmresize", any, {0, 1, 101, 111, 122}},
      {"qxsmdelete", any, {0}},
      {"qxsmDestroyMatrix", any, {0}},
      {"qxsmtie", [](int t) { return !sparse(t); }, {0, 104, 111, 124}},
      {"qxsmremove", [](int t) { return t == 0; }, {0, 117, 124}},
      {"qxsmassign", any, {0, 104, 117, 119}},
      {"qxsmget", any, {0, 113, 117, 123}},
      {"qxsmsetee", any, {0, 113}},
      {"qxsmzscp", symmetric, {0, 104, 119, 124}},
      {"qxsmclose", any, {0, 101}},
      {"qxsmrow", any, {0, 113, 117, 118}},
      {"qxsmUpperRow", [](int t) { return t == 3 || t == 5; }, {0, 113, 117, 118, 124}},
      {"qxsmUpperSub", [](int t) { return t == 3; }, {0, 113, 117, 118, 124}},
      {"qxsmdiag", any, {0, 113, 117}},
      {"qxsmdense", any, {0, 113, 124}},
      {"qxsmIsDiag", any, {0, 113, 121}},
      {"qxsmcopyv", [](int t) { return !sparse(t); }, {0, 1, 101, 111, 116, 122, 124}},
      {"qxsmmd", [](int t) { return t == 3; }, {0, 102, 112}},
      {"qxsmreorder", [](int t) { return t == 3; }, {0, 102}},
      {"qxsmsymbfact", [](int t) { return t == 3; }, {0, 102, 113}},
      {"qxsmnumfact", [](int t) { return t == 3; }, {0, 102, 103, 113}},
      {"qxsmfact", factored, {0, 101, 103, 113, 114, 124}},
      {"qxsmlogdet", factored, {0, 100, 103, 113, 124}},
      {"qxsmrank", factored, {0, 100, 103, 113, 124}},
      {"qxsmpivot", factored, {0, 103, 113, 124}},
      {"qxsmsubst", factored, {0, 102, 104, 113}},
      {"qxsminvmultv", factored, {0, 101, 102, 103, 104, 113, 120, 124}},
      {"qxsmsoldirect", factored, {0, 103, 104, 124}},
      {"qxsminvdiag", factored, {0, 103, 113, 124}},
      {"qxsminv", inverted, {0, 101, 103, 113, 120, 124}},
      {"qxsmmultv", any, {0, 104, 113, 118, 124}},
      {"qxsmvmult", any, {0, 104, 113}},
      {"qxsmquadv", any, {0, 111, 113, 121}},
      {"qxsmbilin", factored, {0, 104, 111, 113, 124}},
      {"qxsminvquadv", factored, {0, 101, 102, 103, 104, 113, 120, 124}},
      {"qxsminvbilin", factored, {0, 101, 102, 103, 104, 113, 120, 124}},
      {"qxsmmults", any, {0, 113}},
      {"qxsmcke", any, {0, 101, 103, 113, 120}},
      {"qxsmorth", [](int t) { return t == 0; }, {0, 124}},
      {"qxsmtrace", any, {0, 100, 113}},
      {"qxsmsolioc", factored, {0, 103, 104, 109, 113, 124}},
  };
  return list;
}

bool convertible(int from, int to) {
  if (general(from)) return general(to);
  return diagonal(from) || !diagonal(to);
}
bool multiplied(int a, int b) {
  if (general(a)) return !symmetric(b);
  return diagonal(a) || a != 4 || !general(b);
}
bool accumulated(int a, int b) {
  if (general(a)) return a == 0 && b == 0;
  return diagonal(a) ? diagonal(b) : a == b;
}
bool added(int g, int b) {
  if (general(g)) return g == 0 && b == 0;
  return diagonal(g) ? diagonal(b) : !general(b);
}
bool alike(int a, int b) { return a == b; }
bool every(int, int) { return true; }

// An operation of several matrices: every pair of types is met at the two places, those that `serves` names are
// answered 0. An operation may stand here more than once, for its other places.
struct OfTwo {
  const char* name;
  std::size_t first;
  std::size_t second;
  Two serves;
  Statuses answers;
};

const std::vector<OfTwo>& of_two() {
  static const std::vector<OfTwo> list = {
      {"qxsmclone", 0, 1, alike, {0, 1, 101, 110, 113}},
      {"qxsmconvert", 0, 1, convertible, {0, 1, 101, 111, 113, 124}},
      {"qxsmtraceAB",
       0,
       1,
       [](int a, int b) { return general(a) ? general(b) : a != 4 || !general(b); },
       {0, 100, 113, 121, 124}},
      {"qxsmtraceinvAB", 0, 1, [](int a, int) { return !general(a); }, {0, 100, 101, 103, 111, 113, 117, 118, 124}},
      {"qxsmAddSS", 0, 1, accumulated, {0, 110, 119, 121, 124}},
      {"qxsmAddSS_10", 0, 1, accumulated, {0, 110, 119, 121, 124}},
      {"qxsmAddGinv", 0, 1, added, {0, 104, 113, 119, 121, 124}},
      {"qxsmUpdateGinv",
       0,
       1,
       [](int g, int a) { return g == 3 ? symmetric(a) : packed(g) && a == g; },
       {0, 104, 110, 113, 124}},
      {"qxsmUpdateGinv", 0, 2, [](int g, int b) { return symmetric(g) && b == g; }, {}},
      {"qxsmhermite",
       0,
       1,
       [](int a, int h) { return symmetric(a) ? general(h) : diagonal(a) && !symmetric(h); },
       {0, 101, 103, 104, 110, 113, 120, 123, 124}},
      {"qxsmquad",
       0,
       1,
       [](int a, int x) { return symmetric(a) || (general(x) && !sparse(x)); },
       {0, 101, 104, 110, 113, 118, 119, 121, 124}},
      {"qxsmquad", 0, 2, [](int, int r) { return symmetric(r); }, {}},
      {"qxsmquad", 1, 2, [](int, int r) { return symmetric(r); }, {}},
      {"qxsmDenseQuad", 0, 1, [](int g, int r) { return g == 0 ? r == 3 : !sparse(g); }, {0, 101, 104, 113, 119, 124}},
      {"qxsminvquad",
       0,
       1,
       [](int a, int x) { return !general(a) && general(x); },
       {0, 101, 103, 104, 110, 113, 120, 124}},
      {"qxsminvquad", 0, 2, [](int a, int r) { return !general(a) && symmetric(r); }, {}},
      {"qxsminvquad", 1, 2, [](int x, int r) { return general(x) && symmetric(r); }, {}},
      {"qxsmmultm", 0, 1, multiplied, {0, 101, 104, 113, 119, 121, 124}},
      {"qxsmmultm", 0, 2, every, {}},
      {"qxsmmultm", 1, 2, every, {}},
      {"qxsmvaxpy",
       1,
       2,
       [](int a, int b) { return b == 0 || (!general(a) && !general(b)); },
       {0, 1, 104, 113, 119, 121, 124}},
      {"qxsmvaxpy",
       0,
       1,
       [](int c, int a) { return convertible(a, c) && (c != 3 || a == 3) && (!general(c) || c == 0); },
       {}},
  };
  return list;
}

std::string type_name(int t) {
  return std::to_string(kTypes[static_cast<std::size_t>(t)][0]) + "/" +
         std::to_string(kTypes[static_cast<std::size_t>(t)][1]);
}

// What takes no matrix, or makes one of its own type.
constexpr const char* kOthers[] = {"qxsmnewss",      "qxsmnewds",           "qxsmnewsg",           "qxsmnewsd",
                                   "CreateInstance", "qxsmGetANewInstance", "qxsmDestroyInstance", "qxsmGetReqVersion",
                                   "qxsmGetVersion", "qxsmsetprogress"};

class Missing {
 public:
  explicit Missing(const Coverage& coverage) : coverage_(coverage) {}
  void expect(bool met, const std::string& text) {
    if (!met) lines_.push_back(text);
  }
  void answers(const char* name, const Statuses& list) {
    for (const SmStatus status : list)
      expect(coverage_.answers(name, status) > 0, std::string(name) + " never answers " + std::to_string(status));
  }
  void types(const OfOne& operation) {
    for (int t = 0; t < static_cast<int>(kTypes.size()); ++t) {
      const Coverage::Count count = coverage_.met(operation.name, {t});
      expect(count.calls >= 5, std::string(operation.name) + " meets " + type_name(t) + " too rarely");
      if (operation.serves(t))
        expect(count.served >= 5, std::string(operation.name) + " serves " + type_name(t) + " too rarely");
    }
  }
  void pairs(const OfTwo& operation) {
    for (int t = 0; t < static_cast<int>(kTypes.size()); ++t)
      for (int u = 0; u < static_cast<int>(kTypes.size()); ++u) {
        std::vector<int> operands(operation.second + 1, Coverage::kAny);
        operands[operation.first] = t;
        operands[operation.second] = u;
        const Coverage::Count count = coverage_.met(operation.name, operands);
        const std::string what = std::string(operation.name) + " " + type_name(t) + " with " + type_name(u) + " (" +
                                 std::to_string(operation.first) + ", " + std::to_string(operation.second) + ")";
        expect(count.calls > 0, what + " is not met");
        if (operation.serves(t, u)) expect(count.served > 0, what + " is not served");
      }
  }
  void situation(const std::string& text) {
    expect(coverage_.records(text) >= 20, "records of " + text + " are met too rarely");
  }
  // Kinds and formats in the states that they can be in, and orders.
  void records() {
    for (const char* type : {"2/21", "2/22", "2/23", "3/22", "3/23", "6/22", "6/23"})
      situation(std::string(type) + " state 1");
    for (const char* type : {"2/22", "2/23", "3/22", "3/23", "6/22", "6/23"})
      for (const char* state : {" state 0 tied", " state 1 tied"}) situation(std::string(type) + state);
    for (const char* state : {"0", "1", "2", "3", "4", "5"}) situation(std::string("3/21 state ") + state);
    for (const char* type : {"3/22", "3/23", "6/22", "6/23"})
      for (const char* state : {" state 5", " state 6"})
        for (const char* place : {" separate", " in place"}) situation(std::string(type) + state + place);
    for (const char* type : {"3/22", "3/23"}) situation(std::string(type) + " state 4");
    for (std::int64_t order = 0; order <= 8; ++order)
      expect(coverage_.records_of_order(order, order) >= 1000, "order " + std::to_string(order) + " is met too rarely");
    expect(coverage_.records_of_order(9, 16) >= 1000, "orders from 9 on are met too rarely");
    expect(coverage_.records_of_order(17, 26) >= 1000, "orders from 17 on are met too rarely");
  }
  std::vector<std::string> lines() { return std::move(lines_); }

 private:
  const Coverage& coverage_;
  std::vector<std::string> lines_;
};

}  // namespace

std::vector<std::string> missing_from(const Coverage& coverage) {
  Missing missing(coverage);
  missing.expect(coverage.calls() >= 100000, "too few calls");
  missing.expect(coverage.refused() >= 300, "too few refused requests");
  missing.records();
  for (const char* name : kOthers)
    missing.expect(coverage.answers(name, SM_OK) >= 5, std::string(name) + " is not met");
  for (const OfOne& operation : of_one()) {
    missing.answers(operation.name, operation.answers);
    missing.types(operation);
  }
  for (const OfTwo& operation : of_two()) {
    missing.answers(operation.name, operation.answers);
    missing.pairs(operation);
  }
  return missing.lines();
}

}  // namespace sm::test
