#include "mixed/pedigree.hpp"

#include <gtest/gtest.h>

#include <algorithm>

#include "mixed/error.hpp"
#include "mixed/pedigrees.hpp"

namespace sm::mixed::test {
namespace {

std::string refusal(const std::vector<PedigreeRow>& rows) {
  try {
    make_pedigree(rows, "p.csv");
  } catch (const ModelError& error) {
    return error.what();
  }
  ADD_FAILURE() << "the pedigree was taken";
  return {};
}

TEST(Pedigree, keeps_the_order_of_the_file_and_puts_parents_first_in_its_own) {
  const Pedigree p = make_pedigree(rows_of("c a b  a . .  d c b  b . ."), "p.csv");
  EXPECT_EQ(p.ids, (std::vector<std::string>{"c", "a", "d", "b"}));
  EXPECT_EQ(p.sire, (std::vector<std::int64_t>{1, -1, 0, -1}));
  EXPECT_EQ(p.dam, (std::vector<std::int64_t>{3, -1, 3, -1}));
  EXPECT_EQ(p.generation, (std::vector<std::int64_t>{1, 0, 2, 0}));
  EXPECT_EQ(p.order, (std::vector<std::int64_t>{1, 3, 0, 2}));
  EXPECT_TRUE(p.notes.empty());
}

TEST(Pedigree, orders_random_pedigrees_so_that_parents_come_first) {
  for (std::uint64_t seed = 1; seed <= 20; ++seed) {
    const Pedigree p =
        make_pedigree(random_rows({.seed = seed, .animals = 200, .selfed = 10, .shuffled = true}), "p.csv");
    std::vector<std::int64_t> place(p.ids.size(), -1);
    for (std::size_t k = 0; k < p.order.size(); ++k) place[static_cast<std::size_t>(p.order[k])] = static_cast<int>(k);
    EXPECT_EQ(std::count(place.begin(), place.end(), -1), 0);
    for (std::size_t i = 0; i < p.ids.size(); ++i) {
      for (const std::int64_t parent : {p.sire[i], p.dam[i]}) {
        if (parent == kUnknownParent) continue;
        EXPECT_LT(place[static_cast<std::size_t>(parent)], place[i]);
        EXPECT_LT(p.generation[static_cast<std::size_t>(parent)], p.generation[i]);
      }
    }
  }
}

TEST(Pedigree, takes_four_spellings_of_an_unknown_parent) {
  const std::vector<PedigreeRow> rows{{"a", "", "NA", 2}, {"b", "0", ".", 3}, {"00", "a", "b", 4}};
  const Pedigree p = make_pedigree(rows, "p.csv");
  EXPECT_EQ(p.size(), 3);
  EXPECT_EQ(p.sire, (std::vector<std::int64_t>{-1, -1, 0}));
  EXPECT_EQ(p.dam, (std::vector<std::int64_t>{-1, -1, 1}));
}

TEST(Pedigree, adds_parents_without_a_row_as_founders_and_says_so) {
  const Pedigree p = make_pedigree(rows_of("x s1 d1  y s1 d2  z s2 d1"), "p.csv");
  EXPECT_EQ(p.ids, (std::vector<std::string>{"x", "y", "z", "s1", "d1", "d2", "s2"}));
  EXPECT_EQ(p.sire[3], kUnknownParent);
  EXPECT_EQ(p.dam[6], kUnknownParent);
  ASSERT_EQ(p.notes.size(), 1u);
  EXPECT_EQ(p.notes[0], "4 parents have no row of their own and were added as founders: s1, d1, d2, s2");
  const Pedigree one = make_pedigree(rows_of("x s1 ."), "p.csv");
  EXPECT_EQ(one.notes.at(0), "1 parent has no row of its own and was added as a founder: s1");
  const Pedigree many = make_pedigree(rows_of("x 1 2  y 3 4  z 5 6"), "p.csv");
  EXPECT_EQ(many.notes.at(0), "6 parents have no row of their own and were added as founders: 1, 2, 3, 4, 5, ...");
}

TEST(Pedigree, notes_selfing_and_animals_in_both_roles) {
  const Pedigree p = make_pedigree(rows_of("a . .  b . .  c a a  d a b  e b c  f d b"), "p.csv");
  ASSERT_EQ(p.notes.size(), 2u);
  EXPECT_EQ(p.notes[0], "1 animal has one animal as both parents (selfing): c");
  EXPECT_EQ(p.notes[1], "2 animals are sires in one place and dams in another: a, b");
}

TEST(Pedigree, refuses_what_cannot_be_an_animal) {
  EXPECT_EQ(refusal({{"a", "", "", 2}, {"", "a", "", 3}}),
            "p.csv:3: the row names no animal, expected an id of the animal; give the animal another id, or remove the "
            "row");
  EXPECT_EQ(refusal({{"NA", "", "", 2}}),
            "p.csv:2: 'NA': this stands for an unknown parent, expected an id of the animal; give the animal another "
            "id, or remove the row");
  EXPECT_EQ(
      refusal(rows_of("a . .  b . .  a b .")),
      "p.csv:4: 'a': the animal has a row already, in line 2, expected one row for each animal; remove one of the "
      "two, or correct its id");
  EXPECT_EQ(refusal(rows_of("a . .  b a b")),
            "p.csv:3: 'b': the animal is its own dam, expected another animal, or an unknown parent; correct the row, "
            "or leave the parent empty");
  EXPECT_NE(refusal(rows_of("b b a")).find("p.csv:2: 'b': the animal is its own sire"), std::string::npos);
}

TEST(Pedigree, names_the_animals_of_a_loop_in_order) {
  // g is a founder, x descends from the loop and is no part of it.
  EXPECT_EQ(refusal(rows_of("x c .  g . .  a c g  b g a  c b .")),
            "p.csv:6: 'c': 3 animals descend from themselves (c -> a -> b -> c, each a parent of the next), expected "
            "parents that are older than their offspring; correct the parents of one of them");
  EXPECT_NE(refusal(rows_of("a b .  b a .")).find("(a -> b -> a, each a parent of the next)"), std::string::npos);
}

TEST(Pedigree, cuts_a_long_loop_short) {
  std::string text = "n0 n999 .";
  for (int i = 1; i < 1000; ++i) text += "  n" + std::to_string(i) + " n" + std::to_string(i - 1) + " .";
  const std::string message = refusal(rows_of(text));
  EXPECT_NE(message.find("1000 animals descend from themselves (n0 -> n1 -> n2 -> n3 -> n4 -> n5 -> n6 -> n7 -> n8 -> "
                         "n9 -> ... -> n0,"),
            std::string::npos)
      << message;
}

// Recursion would not survive this.
TEST(Pedigree, orders_a_line_of_a_hundred_thousand_generations) {
  std::vector<PedigreeRow> rows;
  for (int i = 100'000; i > 0; --i) rows.push_back({std::to_string(i), std::to_string(i - 1), "", 100'002 - i});
  const Pedigree p = make_pedigree(rows, "p.csv");
  EXPECT_EQ(p.size(), 100'000);
  EXPECT_EQ(p.generation[0], 99'999);
  EXPECT_EQ(p.order[0], 99'999);
}

}  // namespace
}  // namespace sm::mixed::test
