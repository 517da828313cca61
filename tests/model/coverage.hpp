// What the random calls have met, and what they are expected to meet, so that the test cannot quietly thin out.
#pragma once

#include <qxesm/qxesm.h>

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace sm::test {

// The eight pairs of a kind and a format; a type is its place here.
constexpr std::array<std::array<std::int32_t, 2>, 8> kTypes{{{SM_KIND_GENERAL, SM_FORMAT_SPARSE},
                                                             {SM_KIND_GENERAL, SM_FORMAT_COLUMNS},
                                                             {SM_KIND_GENERAL, SM_FORMAT_ROWS},
                                                             {SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE},
                                                             {SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS},
                                                             {SM_KIND_SYMMETRIC, SM_FORMAT_ROWS},
                                                             {SM_KIND_DIAGONAL, SM_FORMAT_COLUMNS},
                                                             {SM_KIND_DIAGONAL, SM_FORMAT_ROWS}}};
constexpr int kUntyped = -1;
constexpr int kWithoutEntries = -2;
int type_of(std::int32_t kind, std::int32_t format);

class Coverage {
 public:
  // One call: the types of its operands (kWithoutEntries for an empty one), its answer, whether a request was refused.
  void call(const std::string& name, const std::vector<int>& operands, SmStatus answer, bool refused);
  // One record in the pool after a call.
  void record(const std::string& situation, std::int64_t order);
  void add(const Coverage& other);

  std::int64_t calls() const;
  std::int64_t refused() const { return refused_; }
  std::int64_t calls(const std::string& name) const;
  std::int64_t answers(const std::string& name, SmStatus answer) const;
  // Calls whose operands had these types, kAny standing for every type; of them those that answered 0.
  static constexpr int kAny = -3;
  struct Count {
    std::int64_t calls = 0;
    std::int64_t served = 0;
  };
  Count met(const std::string& name, const std::vector<int>& operands) const;
  std::int64_t records(const std::string& situation) const;
  std::int64_t records_of_order(std::int64_t least, std::int64_t most) const;
  std::string table() const;

 private:
  std::map<std::string, std::map<std::vector<int>, Count>> met_;
  std::map<std::string, std::map<SmStatus, std::int64_t>> answers_;
  std::map<std::string, std::int64_t> records_;
  std::map<std::int64_t, std::int64_t> orders_;
  std::int64_t refused_ = 0;
};

// What is expected and was not met, a line each.
std::vector<std::string> missing_from(const Coverage& coverage);

}  // namespace sm::test
