#include "mixed/table.hpp"

#include <gtest/gtest.h>
#include <unistd.h>
#include <zlib.h>

#include <cmath>
#include <filesystem>
#include <fstream>

#include "mixed/csv.hpp"
#include "mixed/words.hpp"
#include "support.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;
using Numbers = std::vector<double>;

void expect_fault(const std::string& text, std::int64_t line, std::int64_t column, const std::string& what) {
  const Fault fault = fault_of([&] { table_of(text); });
  EXPECT_EQ(fault.file, "t.csv") << text;
  EXPECT_EQ(fault.line, line) << text;
  EXPECT_EQ(fault.column, column) << text;
  EXPECT_NE(fault.what.find(what), std::string::npos) << fault.what;
  EXPECT_FALSE(fault.advice.empty());
}

class TemporaryFile {
 public:
  explicit TemporaryFile(const std::string& name)
      : path_(std::filesystem::temp_directory_path() / (std::to_string(::getpid()) + name)) {}
  ~TemporaryFile() { std::filesystem::remove(path_); }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;
  std::string path() const { return path_.string(); }

 private:
  std::filesystem::path path_;
};

TEST(Table, tells_columns_of_numbers_from_columns_of_text) {
  const Table table = table_of("id,x,g,empty\n007,1.5,b,\n8,-2e-3,a,NA\n9,+.25,b,.\n");
  EXPECT_EQ(table.rows(), 3);
  EXPECT_EQ(table.column_names(), (Strings{"id", "x", "g", "empty"}));
  EXPECT_EQ(table.find("id")->number, (Numbers{7, 8, 9}));
  EXPECT_FALSE(table.find("id")->plain);
  EXPECT_EQ(table.find("x")->number, (Numbers{1.5, -0.002, 0.25}));
  const Column& g = *table.find("g");
  EXPECT_FALSE(g.numeric);
  EXPECT_EQ(g.labels, (Strings{"b", "a"}));
  EXPECT_EQ(g.code, (std::vector<std::int32_t>{0, 1, 0}));
  EXPECT_EQ(table.find("empty")->missing, 3);
  EXPECT_TRUE(table.find("empty")->numeric);
  EXPECT_EQ(table.find("nobody"), nullptr);
}

TEST(Table, counts_missing_cells_in_both_kinds_of_columns) {
  const Table table = table_of("x,g\n1,a\nNA,NA\n,\n.,.\n\"\",\"NA\"\n2,b\n");
  EXPECT_EQ(table.rows(), 6);
  for (const char* name : {"x", "g"}) {
    const Column& column = *table.find(name);
    EXPECT_EQ(column.missing, 4);
    for (std::int64_t row = 0; row < 6; ++row) EXPECT_EQ(column.missing_at(row), row > 0 && row < 5);
  }
}

TEST(Table, keeps_the_text_of_cells_before_the_first_that_is_no_number) {
  const Table table = table_of("x,y\n1.0,1\n007,2\nNA,x\ninf,3\n1.0,NA\n");
  EXPECT_EQ(table.find("x")->labels, (Strings{"1.0", "007", "inf"}));
  EXPECT_EQ(table.find("x")->code, (std::vector<std::int32_t>{0, 1, -1, 2, 0}));
  EXPECT_EQ(table.find("y")->labels, (Strings{"1", "2", "x", "3"}));
}

TEST(Table, takes_words_and_numbers_beyond_all_bounds_for_text) {
  for (const char* cell :
       {"inf", "nan", "NaN", "-inf", "1e999", "0x10", "1,5", "1 2", "--1", "+-1", "+", "-", "1e", "TRUE"}) {
    double value = 0.0;
    EXPECT_FALSE(parse_number(cell, value)) << cell;
  }
  double value = 1.0;
  EXPECT_TRUE(parse_number("1e-999", value));
  EXPECT_EQ(value, 0.0);
}

TEST(Table, sniffs_comma_tab_and_semicolon_outside_quotes) {
  EXPECT_EQ(table_of("a,b\n1,2\n").column_names(), (Strings{"a", "b"}));
  EXPECT_EQ(table_of("a\tb,c\td\n1\t2\t3\n").column_names(), (Strings{"a", "b,c", "d"}));
  EXPECT_EQ(table_of("\"x,y,z\";b\n1;2\n").column_names(), (Strings{"x,y,z", "b"}));
  EXPECT_EQ(table_of("alone\n1\n").column_names(), (Strings{"alone"}));
}

TEST(Table, reads_byte_order_marks_all_line_ends_blank_lines_and_quotes) {
  const Table table =
      table_of("\xef\xbb\xbf\n \"na\"\"me\" , b\r\n\r\n\"a, b\",1\r\"two\nlines\",2\n\n\"\"\"q\"\"\", 3 ");
  EXPECT_EQ(table.column_names(), (Strings{"na\"me", "b"}));
  EXPECT_EQ(table.find("na\"me")->labels, (Strings{"a, b", "two\nlines", "\"q\""}));
  EXPECT_EQ(table.find("b")->number, (Numbers{1, 2, 3}));
}

TEST(Table, knows_where_a_cell_stands) {
  const Table table = table_of("g,x\n\"\xc3\xa9,\xc3\xa9\",1\n\"two\nlines\",2\n\nd,3\n");
  const std::vector<std::int64_t> rows{0, 1, 2};
  const std::vector<Cell> cells = table.cells(*table.find("x"), rows);
  ASSERT_EQ(cells.size(), 3u);
  EXPECT_EQ(cells[0].line, 2);
  EXPECT_EQ(cells[0].column, 7);  // characters, not bytes
  EXPECT_EQ(cells[1].line, 4);
  EXPECT_EQ(cells[1].column, 8);
  EXPECT_EQ(cells[2].line, 6);
  EXPECT_EQ(cells[2].column, 3);
  EXPECT_EQ(table.cell(*table.find("g"), 1).text, "two\nlines");
}

TEST(Table, refuses_ragged_rows_with_their_place) {
  expect_fault("a,b,c\n1,2,3\n4,5\n", 3, 4, "found 2 fields");
  expect_fault("a,b\n1,2\n\n4,5,6\n", 4, 5, "found 3 fields");
  EXPECT_EQ(fault_of([] { table_of("a,b,c\n4,5\n"); }).variable, "c");
  const auto advice = [](const std::string& text) { return fault_of([&] { table_of(text); }).advice; };
  EXPECT_EQ(advice("g,x,y\na,12,5,3\n"), "if 12,5 is one number, write it with a decimal point: 12.5");
  EXPECT_EQ(advice("g,x,y\na,1.5,-12,5\n"), "if -12,5 is one number, write it with a decimal point: -12.5");
  EXPECT_EQ(advice("g,x\na,b,2\n"), "put a field that holds the delimiter in quotes");
  EXPECT_EQ(advice("g;x\na;1;2\n"), "put a field that holds the delimiter in quotes");
  EXPECT_EQ(advice("Trial of 2024\ng,x\na,1\n"), "if the first line is a title, take it away");
}

TEST(Table, refuses_headers_without_a_name_of_its_own_for_each_column) {
  expect_fault("a,,c\n1,2,3\n", 1, 3, "column 2 has no name");
  expect_fault("a,b,a\n1,2,3\n", 1, 5, "columns 1 and 3 have the same name");
  expect_fault("\n1,2.5,-3\n4,5,6\n", 2, 1, "nothing but numbers");
  expect_fault("1,NA,1\n4,5,6\n", 1, 1, "nothing but numbers");  // before it is one name twice, or none
  EXPECT_NE(fault_of([] { table_of("a,b,\n1,2,\n"); }).advice.find("end of the lines"), std::string::npos);
  EXPECT_NE(fault_of([] { table_of(",a,b\n1,2,3\n"); }).advice.find("without row names"), std::string::npos);
}

TEST(Table, refuses_quotes_that_are_open_or_misplaced) {
  expect_fault("a,b\n1,\"x\n2,y\n3,z\n", 2, 3, "never closed");
  expect_fault("a,b\n1,\"x\"\"y\n", 2, 3, "never closed");
  expect_fault("a,b\n1,x\"y\n", 2, 4, "quote inside a field");
  expect_fault("a,b\n1,\"x\"y\n", 2, 6, "behind the closing quote");
}

TEST(Table, refuses_files_without_data) {
  expect_fault("", 1, 0, "empty");
  expect_fault("\n\n", 1, 0, "empty");
  expect_fault("a,b\n", 1, 0, "no row");
}

TEST(Table, reads_plain_and_gzip_files_by_content_and_their_cells_again) {
  const TemporaryFile plain("table.gz");  // the name says nothing
  std::ofstream(plain.path()) << "x,g\n1.50,a\n2,b\n";
  const TemporaryFile packed("table.csv");
  gzFile file = gzopen(packed.path().c_str(), "wb");
  gzputs(file, "x,g\n1.50,a\n2,b\n");
  gzclose(file);
  for (const TemporaryFile* source : {&plain, &packed}) {
    const Table table = Table::read(source->path());
    EXPECT_EQ(table.find("x")->number, (Numbers{1.5, 2}));
    EXPECT_EQ(table.cell(*table.find("x"), 0).text, "1.50");
    EXPECT_EQ(table.name(), source->path());
  }
}

TEST(Table, refuses_files_that_are_not_there_cut_off_or_not_text) {
  EXPECT_NE(fault_of([] { Table::read("/nowhere/t.csv"); }).what.find("No such file"), std::string::npos);
  const TemporaryFile packed("cut.csv.gz");
  gzFile file = gzopen(packed.path().c_str(), "wb");
  std::string text = "x\n";
  for (int i = 0; i < 5000; ++i) text += std::to_string(i * 7919) + "\n";
  gzwrite(file, text.data(), static_cast<unsigned>(text.size()));
  gzclose(file);
  std::filesystem::resize_file(packed.path(), std::filesystem::file_size(packed.path()) / 2);
  EXPECT_NE(fault_of([&] { Table::read(packed.path()); }).what.find("gzip data end early"), std::string::npos);
  const TemporaryFile binary("binary.csv");
  std::ofstream(binary.path()) << std::string("a,b\n1,\0\n", 8);
  const Fault fault = fault_of([&] { Table::read(binary.path()); });
  EXPECT_EQ(fault.line, 2);
  EXPECT_EQ(fault.column, 3);
}

TEST(Table, refuses_bytes_that_are_not_utf8_at_their_place) {
  const auto refused = [](const std::string& bytes) {
    const TemporaryFile file("bytes.csv");
    std::ofstream(file.path(), std::ios::binary) << bytes;
    return fault_of([&] { Table::read(file.path()); });
  };
  const Fault latin = refused(
      "n\xc3\xa4me,b\r\n1234567890,2\r\nMei\xdf"
      "en,3\r\n");
  EXPECT_EQ(latin.line, 3);
  EXPECT_EQ(latin.column, 4);
  EXPECT_EQ(latin.what, "found the byte 0xdf, which is no character of UTF-8");
  EXPECT_NE(latin.advice.find("iconv"), std::string::npos);
  const Fault utf16 =
      refused(std::string("\xff\xfe"
                          "a\0,\0b\0\n\0",
                          10));
  EXPECT_EQ(utf16.line, 1);
  EXPECT_EQ(utf16.column, 1);
  EXPECT_NE(utf16.advice.find("UTF-16"), std::string::npos);
  // A character cut short by the end, by a byte of value 0, and the long way to write a slash.
  EXPECT_EQ(refused("a,b\n1,2\n3,\xe2\x82").column, 3);
  EXPECT_EQ(refused(std::string("a,b\n1,\xe2\x82\0\n", 10)).what,
            "found the byte 0xe2, which is no character of UTF-8");
  EXPECT_EQ(refused("a,b\n1,\xc0\xaf\n").line, 2);
  const TemporaryFile good("good.csv");
  std::ofstream(good.path(), std::ios::binary)
      << "\xef\xbb\xbfg,x\n\xe2\x82\xac,1\n\xf0\x9f\x8c\xbe,2\nabcdefghijk\xc3\xbc,3\n";
  EXPECT_EQ(Table::read(good.path()).find("g")->labels,
            (Strings{"\xe2\x82\xac", "\xf0\x9f\x8c\xbe", "abcdefghijk\xc3\xbc"}));
}

TEST(Words, finds_the_name_that_was_meant_and_no_other) {
  EXPECT_EQ(nearest_name("subject", {"Days", "Subject", "Reaction"}), "Subject");
  EXPECT_EQ(nearest_name("nitr", {"yield", "nitro"}), "nitro");
  EXPECT_EQ(nearest_name("zzzz", {"yield", "nitro"}), "");
  EXPECT_EQ(nearest_name("hight", {"light", "height"}), "height");  // one letter from both
}

TEST(Words, prints_numbers_in_full_and_cuts_long_text) {
  EXPECT_EQ(print_number(100000.0), "100000");
  EXPECT_EQ(print_number(0.2), "0.2");
  EXPECT_EQ(quote("a\tb"), "\"a\\x09b\"");
  EXPECT_EQ(quote(std::string(100, 'x')), "\"" + std::string(40, 'x') + "...\"");
}

}  // namespace
}  // namespace sm::mixed::test
