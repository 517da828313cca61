#include "bench/generators/matrix_file.hpp"

#include <filesystem>
#include <fstream>
#include <numeric>
#include <sstream>
#include <stdexcept>

#include "bench/harness/upper_rows.hpp"
#include "bench/peers/pivots.hpp"

namespace sm::bench {
namespace {

constexpr double kTolerance = 1.110223024625157e-12;  // the module's setting 2

[[noreturn]] void refuse(const std::string& file, const std::string& why) {
  throw std::runtime_error(file + ": " + why);
}

void read_header(const std::string& file, std::ifstream& in) {
  std::string line, banner, object, layout, field, symmetry;
  std::getline(in, line);
  std::istringstream(line) >> banner >> object >> layout >> field >> symmetry;
  const bool numbers = field == "real" || field == "integer";
  if (banner != "%%MatrixMarket" || layout != "coordinate" || !numbers || symmetry != "symmetric") {
    refuse(file, "not a coordinate real symmetric Matrix Market file");
  }
  while (in.peek() == '%') std::getline(in, line);
}

}  // namespace

Problem read_matrix(const std::string& file) {
  std::ifstream in(file);
  if (!in) refuse(file, "cannot be read");
  read_header(file, in);
  int rows = 0, cols = 0;
  std::size_t entries = 0;
  if (!(in >> rows >> cols >> entries) || rows != cols || rows < 1) refuse(file, "no size of a square matrix");
  Problem p{.family = "file",
            .name = std::filesystem::path(file).stem().string(),
            .n = rows,
            .rank = 0,
            .upper = {},
            .rhs = {}};
  for (std::size_t k = 0; k < entries; ++k) {
    int i = 0, j = 0;
    double value = 0.0;
    if (!(in >> i >> j >> value) || i < 1 || i > rows || j < 1 || j > rows) refuse(file, "a broken entry");
    p.upper.add(i - 1, j - 1, value);
  }
  const UpperRows compressed = compress(p);
  p.rhs = multiply(compressed, std::vector<double>(static_cast<std::size_t>(rows), 1.0).data());
  std::vector<int> order(static_cast<std::size_t>(rows));
  std::iota(order.begin(), order.end(), 0);
  p.rank = pivot_margins(compressed, order, kTolerance).accepted;
  return p;
}

}  // namespace sm::bench
