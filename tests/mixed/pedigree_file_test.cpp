#include "mixed/pedigree_file.hpp"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "mixed/error.hpp"

namespace sm::mixed::test {
namespace {

std::string refusal(const std::string& text) {
  try {
    parse_pedigree(text, "p.csv");
  } catch (const ModelError& error) {
    return error.what();
  }
  ADD_FAILURE() << "the pedigree was taken";
  return {};
}

void expect_family(const Pedigree& p) {
  EXPECT_EQ(p.ids, (std::vector<std::string>{"a", "b", "c"}));
  EXPECT_EQ(p.sire, (std::vector<std::int64_t>{-1, -1, 0}));
  EXPECT_EQ(p.dam, (std::vector<std::int64_t>{-1, -1, 1}));
}

TEST(PedigreeFile, has_its_columns_by_name_wherever_they_are) {
  for (const char* text : {"id,sire,dam\na,,\nb,0,NA\nc,a,b\n", "Dam;born;ID;Sire\n;1990;a;\n.;1990;b;.\nb;1991;c;a\n",
                           "id\tdam\tsire\tnote\na\t\t\tx\nb\t\t\t\nc\tb\ta\t\n"}) {
    const Pedigree p = parse_pedigree(text, "p.csv");
    expect_family(p);
    EXPECT_TRUE(p.notes.empty()) << text;
  }
}

TEST(PedigreeFile, has_its_columns_by_place_else_and_says_so) {
  const Pedigree p = parse_pedigree("animal,father,mother\na,,\nb,,\nc,a,b\n", "p.csv");
  expect_family(p);
  ASSERT_EQ(p.notes.size(), 1u);
  EXPECT_EQ(p.notes[0], "animal, sire and dam are taken from the first three columns: animal, father, mother");
  expect_family(parse_pedigree("id,father,mother\na,,\nb,,\nc,a,b\n", "p.csv"));
}

TEST(PedigreeFile, that_is_no_pedigree_is_refused) {
  EXPECT_EQ(refusal("year,id,father,mother\n1,a,,\n"),
            "p.csv:1: the column id is there, but not all of the others, expected columns called id, sire and dam; "
            "begin the file with a line id,sire,dam");
  EXPECT_NE(refusal("1,0,0\n2,0,0\n").find("p.csv:1: the first line is an animal and no heading"), std::string::npos);
  EXPECT_NE(refusal("a,b\nx,y\n").find("p.csv:1: found 2 columns, expected three"), std::string::npos);
  EXPECT_NE(refusal("id,sire,dam,id\n").find("p.csv:1: two columns are called id"), std::string::npos);
  EXPECT_NE(refusal("id,sire,dam\n").find("p.csv: the file has no animals"), std::string::npos);
  EXPECT_NE(refusal("").find("p.csv: the file has no animals"), std::string::npos);
  EXPECT_EQ(refusal("id,sire,dam\na,,\nb,a\n"),
            "p.csv:3: found 2 fields, expected 3, as in the heading; complete the line; leave the field of an unknown "
            "parent empty");
}

TEST(PedigreeFile, is_named_with_the_line_where_its_animals_are_wrong) {
  EXPECT_NE(refusal("id,sire,dam\n\na,,\n\na,,\n").find("p.csv:5: 'a': the animal has a row already, in line 3"),
            std::string::npos);
}

TEST(PedigreeFile, is_read_from_where_it_is) {
  const std::string path = ::testing::TempDir() + "qxsm_pedigree.csv";
  std::ofstream(path) << "id,sire,dam\na,,\nb,,\nc,a,b\n";
  expect_family(read_pedigree(path));
  std::filesystem::remove(path);
  EXPECT_THROW(read_pedigree(path), ModelError);
}

}  // namespace
}  // namespace sm::mixed::test
