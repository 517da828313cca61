#include "cli/known_precision.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <filesystem>
#include <fstream>

#include "cli/error.hpp"
#include "mixed/loaded_module.hpp"
#include "mixed/precision.hpp"

namespace sm::mixed::test {
namespace {

class KnownPrecisionFiles : public ::testing::Test {
 protected:
  KnownPrecisionFiles() : folder_(::testing::TempDir() + "qxsm_known_XXXXXX") {
    EXPECT_NE(mkdtemp(folder_.data()), nullptr);
  }
  ~KnownPrecisionFiles() override { std::filesystem::remove_all(folder_); }

  std::string file(const std::string& name, const std::string& content) const {
    std::ofstream(folder_ + "/" + name) << content;
    return folder_ + "/" + name;
  }
  std::string matrix(const std::string& kind, const std::string& rest) const {
    return file("k.mtx", "%%MatrixMarket matrix " + kind + "\n" + rest);
  }
  KnownPrecision load(const std::string& matrix, const std::string& ids = {}) {
    cli::Progress silent(2, false);
    return cli::load_precision(matrix, ids, module_.module(), std::uint64_t{1} << 30, silent);
  }

 private:
  std::string folder_;
  LoadedModule module_;
};

// The path a - b - c, whose one nonzero minor is 1 and whose null vector is constant.
void expect_path(const KnownPrecision& known) {
  const Precision& k = *known.precision;
  EXPECT_EQ(k.row_start, (std::vector<std::int64_t>{0, 2, 4, 5}));
  EXPECT_EQ(k.col, (std::vector<std::int64_t>{0, 1, 1, 2, 2}));
  EXPECT_EQ(k.value, (std::vector<double>{1, -1, 2, -1, 1}));
  EXPECT_EQ(k.nullity, 1);
  EXPECT_NEAR(k.log_det, std::log(3.0), 1e-14);
}

TEST_F(KnownPrecisionFiles, are_symmetric_files_and_those_that_are_symmetric_in_value) {
  const std::string ids = file("ids.txt", "a\nb\nc\n");
  const KnownPrecision half =
      load(matrix("coordinate real symmetric", "3 3 5\n1 1 1\n2 1 -1\n2 2 2\n3 2 -1\n3 3 1\n"), ids);
  EXPECT_EQ(half.labels, (std::vector<std::string>{"a", "b", "c"}));
  expect_path(half);
  const KnownPrecision whole = load(matrix("array integer general", "3 3\n1\n-1\n0\n-1\n2\n-1\n0\n-1\n1\n"));
  EXPECT_EQ(whole.labels, (std::vector<std::string>{"1", "2", "3"}));
  expect_path(whole);
}

TEST_F(KnownPrecisionFiles, that_are_not_symmetric_are_refused_with_the_place) {
  try {
    load(matrix("coordinate real general", "3 3 4\n1 1 1\n2 2 1\n3 3 1\n3 1 7\n"));
    FAIL() << "taken";
  } catch (const ModelError& error) {
    EXPECT_EQ(error.fault().what, "found 7 at (3, 1) and 0 at (1, 3)");
  }
  EXPECT_THROW(load(matrix("coordinate real general", "2 3 1\n1 1 1\n")), ModelError);
}

TEST_F(KnownPrecisionFiles, that_are_indefinite_are_refused_by_the_name_of_the_row) {
  const std::string ids = file("ids.txt", "north\nsouth\n");
  try {
    load(matrix("coordinate real symmetric", "2 2 2\n1 1 1\n2 2 -1\n"), ids);
    FAIL() << "taken";
  } catch (const NotSemidefinite& error) {
    EXPECT_EQ(error.fault().what, "row 2 (south) has -1 on the diagonal");
  }
}

TEST_F(KnownPrecisionFiles, are_pedigrees_too) {
  std::vector<std::string> notes{"before"};
  const KnownPrecision known = cli::load_pedigree(file("p.csv", "id,sire,dam\nx,s,d\nd,,\n"), notes);
  EXPECT_EQ(known.labels, (std::vector<std::string>{"x", "d", "s"}));
  EXPECT_EQ(known.precision->order, 3);
  EXPECT_NEAR(known.precision->log_det, std::log(2.0), 1e-15);
  ASSERT_EQ(notes.size(), 2u);
  EXPECT_NE(notes[1].find("added as a founder: s"), std::string::npos);
}

TEST_F(KnownPrecisionFiles, that_are_not_there_are_refused) {
  EXPECT_THROW(load("/nowhere/k.mtx"), cli::CommandError);
  EXPECT_THROW(load(matrix("coordinate real symmetric", "1 1 1\n1 1 1\n"), "/nowhere/ids.txt"), ModelError);
}

}  // namespace
}  // namespace sm::mixed::test
