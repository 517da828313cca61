#include "cli/loading.hpp"

#include <gtest/gtest.h>
#include <unistd.h>

#include <fstream>

#include "cli/error.hpp"
#include "cli/reading.hpp"

namespace sm::test {
namespace {

constexpr std::uint64_t kPlenty = std::uint64_t{1} << 40;

class Loading : public ::testing::Test {
 protected:
  ~Loading() override { unlink(path_.c_str()); }
  const std::string& file(const std::string& text) {
    std::ofstream(path_, std::ios::binary) << text;
    return path_;
  }
  cli::LoadedMatrix matrix(const std::string& text) { return cli::load_matrix(file(text), kPlenty, progress_); }
  cli::Columns columns(const std::string& text, std::int64_t order, std::uint64_t limit = kPlenty) {
    return cli::load_columns(file(text), order, limit, progress_);
  }
  // The refusal of what `work` does.
  template <class Work>
  static cli::Problem refusal_of(Work work) {
    try {
      work();
    } catch (const cli::CommandError& error) {
      return error.problem();
    }
    ADD_FAILURE() << "was accepted";
    return {};
  }

  cli::Progress progress_{-1, false};
  std::string path_ = ::testing::TempDir() + "qxsm_loading_" + std::to_string(getpid()) + ".mtx";
};

TEST_F(Loading, general_files_that_are_symmetric_in_value_are_reduced_to_a_triangle) {
  auto m = matrix(file_of("coordinate real general", "2 2 5\n1 1 4\n1 2 1\n1 2 2\n2 1 3\n2 2 5\n"));
  EXPECT_EQ(m.file_entries, 5);
  require_symmetric(m);
  EXPECT_EQ(m.rows.col, (std::vector<std::int64_t>{0, 1, 1}));
  EXPECT_EQ(m.rows.value, (std::vector<double>{4.0, 3.0, 5.0}));
}

TEST_F(Loading, symmetric_files_plain_or_gzip_are_the_same) {
  const std::string text = file_of("coordinate real symmetric", "2 2 3\n1 1 4\n2 1 -1\n2 2 5\n");
  auto plain = matrix(text);
  auto packed = matrix(gzip(text));
  require_symmetric(plain);
  EXPECT_EQ(plain.rows.col, (std::vector<std::int64_t>{0, 1, 1}));
  EXPECT_EQ(packed.rows.col, plain.rows.col);
  EXPECT_EQ(packed.rows.value, plain.rows.value);
}

TEST_F(Loading, a_rectangular_matrix_is_refused_at_its_size_line) {
  auto m = matrix(file_of("coordinate real general", "2 3 1\n1 1 4\n"));
  const auto problem = refusal_of([&] { require_symmetric(m); });
  EXPECT_EQ(problem.line, 2);
  EXPECT_EQ(problem.what, "found 2 rows and 3 columns");
}

TEST_F(Loading, the_first_pair_that_is_not_symmetric_is_named) {
  auto m = matrix(file_of("coordinate real general", "3 3 4\n1 1 4\n1 3 2\n3 1 2.5\n3 2 7\n"));
  const auto problem = refusal_of([&] { require_symmetric(m); });
  EXPECT_EQ(problem.what, "found 2.5 at (3, 1) and 2 at (1, 3)");
  EXPECT_EQ(problem.code, cli::ExitCode::bad_input);
}

TEST_F(Loading, right_hand_sides_may_be_an_array_or_coordinates) {
  const std::vector<double> expected{1.0, 0.0, 0.0, 2.5};
  EXPECT_EQ(columns(file_of("array real general", "2 2\n1\n0\n0\n2.5\n"), 2).values, expected);
  EXPECT_EQ(columns(file_of("coordinate real general", "2 2 3\n1 1 1\n2 2 2\n2 2 .5\n"), 2).values, expected);
  EXPECT_EQ(columns(file_of("array real general", "2 2\n1\n0\n0\n2.5\n"), 2).count, 2);
}

TEST_F(Loading, symmetric_right_hand_sides_are_filled_in_on_both_sides) {
  const std::vector<double> expected{1.0, 3.0, 3.0, 2.0};
  EXPECT_EQ(columns(file_of("coordinate real symmetric", "2 2 3\n1 1 1\n2 1 3\n2 2 2\n"), 2).values, expected);
  EXPECT_EQ(columns(file_of("array real symmetric", "2 2\n1\n3\n2\n"), 2).values, expected);
}

TEST_F(Loading, right_hand_sides_of_another_length_are_refused) {
  const auto problem = refusal_of([&] { columns(file_of("array real general", "3 1\n1\n2\n3\n"), 2); });
  EXPECT_EQ(problem.line, 2);
  EXPECT_EQ(problem.what, "found 3 rows");
  EXPECT_EQ(problem.expected, "2, the order of the matrix");
}

TEST_F(Loading, right_hand_sides_that_only_the_header_knows_of_are_not_allocated) {
  const std::string text = file_of("coordinate real general", "2 4611686018427387904 1\n1 1 1\n");
  EXPECT_EQ(refusal_of([&] { columns(text, 2, std::uint64_t{1} << 30); }).code, cli::ExitCode::no_memory);
  const std::string array = file_of("array real general", "2 4611686018427387\n1\n");
  EXPECT_NE(refusal_of([&] { columns(array, 2); }).what.find("the file ends after 1 of"), std::string::npos);
}

TEST_F(Loading, the_kind_of_a_file_is_named_in_the_words_of_its_banner) {
  EXPECT_EQ(kind_text(matrix(file_of("coordinate pattern symmetric", "1 1 1\n1 1\n")).header),
            "coordinate pattern symmetric");
  EXPECT_EQ(kind_text(matrix(file_of("array integer general", "1 1\n1\n")).header), "array integer general");
}

}  // namespace
}  // namespace sm::test
