#include <fmt/core.h>

#include <iterator>

#include "cli/commands.hpp"
#include "cli/format.hpp"
#include "cli/output_file.hpp"

namespace sm::cli {
namespace {

// Points are numbered along x first. The lower triangle by columns, as such files usually are.
void write_points(OutputFile& out, const GridOptions& grid) {
  const std::string diagonal = number_text(4.0 + grid.shift);
  auto to = std::back_inserter(out.buffer());
  for (std::int64_t y = 0; y < grid.ny; ++y) {
    for (std::int64_t x = 0; x < grid.nx; ++x) {
      const std::int64_t point = y * grid.nx + x + 1;
      fmt::format_to(to, "{} {} {}\n", point, point, diagonal);
      if (x + 1 < grid.nx) fmt::format_to(to, "{} {} -1\n", point + 1, point);
      if (y + 1 < grid.ny) fmt::format_to(to, "{} {} -1\n", point + grid.nx, point);
      out.flush_if_full();
    }
  }
}

}  // namespace

Report run_grid(const GridOptions& options, const CommonOptions& common, Progress&) {
  std::int64_t order = 0;
  std::int64_t entries = 0;
  if (__builtin_mul_overflow(options.nx, options.ny, &order) || __builtin_mul_overflow(order, 3, &entries)) {
    throw CommandError({.what = fmt::format("a grid of {} x {} has too many points", options.nx, options.ny),
                        .advice = "give smaller numbers"});
  }
  entries -= options.nx + options.ny;
  OutputFile out(common.output, {});
  fmt::format_to(std::back_inserter(out.buffer()),
                 "%%MatrixMarket matrix coordinate real symmetric\n"
                 "% five-point stencil on a {} x {} grid: {} on the diagonal, -1 for each neighbour\n{} {} {}\n",
                 options.nx, options.ny, number_text(4.0 + options.shift), order, order, entries);
  write_points(out, options);
  out.finish();

  Report report("grid");
  report.add("output", common.output, "grid", fmt::format("{} x {}, in {}", options.nx, options.ny, common.output));
  report.add("rows", order, "order", fmt::format("{}", order));
  report.add("stored_entries", entries, "stored entries", fmt::format("{}", entries));
  return report;
}

}  // namespace sm::cli
