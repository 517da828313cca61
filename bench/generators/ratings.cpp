#include <fmt/format.h>

#include <array>

#include "bench/generators/generators.hpp"
#include "bench/generators/random.hpp"

namespace sm::bench {
namespace {

constexpr int kDepartments = 14;
constexpr int kServices = 2;
constexpr int kStudentAges = 4;
constexpr int kLecturerAges = 6;
constexpr double kStudentRatio = 10.0;  // residual variance over the variance of the effect
constexpr double kLecturerRatio = 5.0;

// The equations of one rating: at most seven effects with coefficient 1.
struct Effects {
  std::array<int, 7> index{};
  std::size_t count = 0;
  void add(int i) { index[count++] = i; }
};

// Where the levels of a factor begin; without its first dummy, level 0 has no equation.
struct Factor {
  int first = 0;
  bool all = false;
  void enter(Effects& effects, int level) const {
    if (all || level > 0) effects.add(first + level - (all ? 0 : 1));
  }
};

struct Layout {
  explicit Layout(const Ratings& size) {
    int next = 1;  // behind the mean
    const auto place = [&](int levels) {
      const Factor factor{next, size.all_dummies};
      next += levels - (size.all_dummies ? 0 : 1);
      return factor;
    };
    department = place(kDepartments);
    service = place(kServices);
    student_age = place(kStudentAges);
    lecturer_age = place(kLecturerAges);
    first_student = next;
    first_lecturer = next + size.students;
    n = first_lecturer + size.lecturers;
  }
  Factor department, service, student_age, lecturer_age;
  int first_student = 0, first_lecturer = 0, n = 0;
};

int choose_lecturer(Random& random, int department, int lecturers) {
  const int begin = static_cast<int>(static_cast<long>(lecturers) * department / kDepartments);
  const int end = static_cast<int>(static_cast<long>(lecturers) * (department + 1) / kDepartments);
  const double z = random.uniform();
  return begin + static_cast<int>(z * z * (end - begin));
}

void enter(Problem& p, const Effects& effects, double rating) {
  for (std::size_t a = 0; a < effects.count; ++a) {
    p.rhs[static_cast<std::size_t>(effects.index[a])] += rating;
    for (std::size_t b = a; b < effects.count; ++b) p.upper.add(effects.index[a], effects.index[b], 1.0);
  }
}

}  // namespace

Problem crossed_ratings(const Ratings& size) {
  const Layout layout(size);
  Problem p{.family = "c",
            .name = fmt::format("{} x {}{}", size.students, size.lecturers, size.all_dummies ? ", all dummies" : ""),
            .n = layout.n,
            .rank = layout.n - (size.all_dummies ? 4 : 0),
            .upper = {},
            .rhs = std::vector<double>(static_cast<std::size_t>(layout.n))};
  Random random(2);
  for (int s = 0; s < size.students; ++s) {
    const int age = random.below(kStudentAges);
    const int ratings = size.fewest + random.below(size.most - size.fewest + 1);
    for (int r = 0; r < ratings; ++r) {
      const int department = random.below(kDepartments);
      Effects effects;
      effects.add(0);
      layout.department.enter(effects, department);
      layout.service.enter(effects, random.below(kServices));
      layout.student_age.enter(effects, age);
      layout.lecturer_age.enter(effects, random.below(kLecturerAges));
      effects.add(layout.first_student + s);
      effects.add(layout.first_lecturer + choose_lecturer(random, department, size.lecturers));
      enter(p, effects, 1.0 + random.below(5));
    }
  }
  for (int s = 0; s < size.students; ++s)
    p.upper.add(layout.first_student + s, layout.first_student + s, kStudentRatio);
  for (int l = layout.first_lecturer; l < layout.n; ++l) p.upper.add(l, l, kLecturerRatio);
  return p;
}

Problem crossed_factors(int first, int second, int meetings) {
  const int n = 1 + first + second;
  Problem p{.family = "crossed",
            .name = fmt::format("1 + {} x {}", first, second),
            .n = n,
            .rank = n,
            .upper = {},
            .rhs = std::vector<double>(static_cast<std::size_t>(n))};
  Random random(3);
  for (int level = 0; level < second; ++level) {
    for (int m = 0; m < meetings; ++m) {
      Effects effects;
      effects.add(0);
      effects.add(1 + random.below(first));
      effects.add(1 + first + level);
      enter(p, effects, random.between(-1.0, 1.0));
    }
  }
  for (int i = 0; i < n; ++i) p.upper.add(i, i, 1.0);
  return p;
}

}  // namespace sm::bench
