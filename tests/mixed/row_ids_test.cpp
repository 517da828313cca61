#include "mixed/row_ids.hpp"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "mixed/error.hpp"

namespace sm::mixed::test {
namespace {

std::string id_refusal(const std::vector<std::string>& lines, std::int64_t order) {
  try {
    row_ids(lines, order, "ids.txt");
  } catch (const ModelError& error) {
    return error.what();
  }
  ADD_FAILURE() << "the ids were taken";
  return {};
}

TEST(RowIds, are_the_lines_or_the_numbers_of_the_rows) {
  EXPECT_EQ(row_ids({"a", " b c\r", "d"}, 3, "ids.txt"), (std::vector<std::string>{"a", "b c", "d"}));
  EXPECT_EQ(row_ids({}, 3, ""), (std::vector<std::string>{"1", "2", "3"}));
}

TEST(RowIds, that_do_not_name_each_row_once_are_refused) {
  EXPECT_EQ(
      id_refusal({"a", "  ", "b"}, 3),
      "ids.txt:2: the line is empty, expected an id; write one id a line, in the order of the rows of the matrix");
  EXPECT_EQ(id_refusal({"a", "b", "a"}, 3),
            "ids.txt:3: 'a': the id is in line 1 already, expected an id of its own for each row; correct one of the "
            "two");
  EXPECT_EQ(id_refusal({"id", "a", "b"}, 2),
            "ids.txt: found 3 ids, expected 2, one for each row of the matrix; write one id a line, without a heading");
}

TEST(RowIds, are_read_from_a_file_or_counted) {
  const std::string path = ::testing::TempDir() + "qxsm_ids.txt";
  std::ofstream(path) << "x\r\ny z\r\n7";
  EXPECT_EQ(read_row_ids(path, 3), (std::vector<std::string>{"x", "y z", "7"}));
  std::ofstream(path) << "\xef\xbb\xbfx\ny\n";
  EXPECT_EQ(read_row_ids(path, 2), (std::vector<std::string>{"x", "y"}));
  std::ofstream(path).close();
  EXPECT_THROW(read_row_ids(path, 3), ModelError);
  std::filesystem::remove(path);
  EXPECT_EQ(read_row_ids("", 2), (std::vector<std::string>{"1", "2"}));
}

}  // namespace
}  // namespace sm::mixed::test
