#include <fmt/core.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <iterator>
#include <memory>
#include <utility>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/output_file.hpp"
#include "cli/phases.hpp"
#include "cli/sparse.hpp"
#include "mixed/inbreeding.hpp"
#include "mixed/pedigree_file.hpp"
#include "mixed/relationship.hpp"

namespace sm::cli {
namespace {

// What the largest step takes for each animal: names and indices, the parts of the inverse, the sweeps over parents.
constexpr double kBytesPerAnimal = 450.0;

// The files that were asked for, opened before the work begins.
struct Outputs {
  std::unique_ptr<OutputFile> a;
  std::unique_ptr<OutputFile> ainv;
  std::unique_ptr<OutputFile> inbreeding;
  std::unique_ptr<OutputFile> mendelian;
  std::unique_ptr<OutputFile> ids;
};

std::unique_ptr<OutputFile> opened(const std::string& path, const std::string& input) {
  return path.empty() ? nullptr : std::make_unique<OutputFile>(path, std::vector<std::string>{input});
}

void require_different(const PedigreeOptions& options) {
  std::vector<std::string> paths;
  for (const std::string* path : {&options.a, &options.ainv, &options.inbreeding, &options.mendelian, &options.ids}) {
    if (!path->empty()) paths.push_back(*path);
  }
  std::sort(paths.begin(), paths.end());
  const auto twice = std::adjacent_find(paths.begin(), paths.end());
  if (twice == paths.end()) return;
  throw CommandError({.file = *twice == "-" ? "standard output" : *twice,
                      .what = "two results are to go there",
                      .advice = "give each a file of its own"});
}

// A field of a CSV file, in quotes where it needs them.
std::string csv_field(const std::string& text) {
  const bool plain = text.find_first_of(",\"\r\n") == std::string::npos && text.front() != ' ' && text.back() != ' ';
  if (plain) return text;
  std::string quoted = "\"";
  for (const char c : text) quoted += c == '"' ? std::string("\"\"") : std::string(1, c);
  return quoted + "\"";
}

void write_column(OutputFile& out, const mixed::Pedigree& pedigree, const char* name,
                  const std::vector<double>& values) {
  auto to = std::back_inserter(out.buffer());
  fmt::format_to(to, "id,{}\n", name);
  for (std::size_t i = 0; i < values.size(); ++i) {
    fmt::format_to(to, "{},{}\n", csv_field(pedigree.ids[i]), values[i]);
    out.flush_if_full();
  }
  out.finish();
}

void write_ids(OutputFile& out, const mixed::Pedigree& pedigree) {
  auto to = std::back_inserter(out.buffer());
  for (const std::string& id : pedigree.ids) {
    fmt::format_to(to, "{}\n", id);
    out.flush_if_full();
  }
  out.finish();
}

void write_matrix(OutputFile& out, const mixed::Precision& inverse, const std::string& comment) {
  auto to = std::back_inserter(out.buffer());
  fmt::format_to(to, "%%MatrixMarket matrix coordinate real symmetric\n% {}\n{} {} {}\n", comment, inverse.order,
                 inverse.order, inverse.col.size());
  for (std::int64_t i = 0; i < inverse.order; ++i) {
    const auto begin = static_cast<std::size_t>(inverse.row_start[static_cast<std::size_t>(i)]);
    const auto end = static_cast<std::size_t>(inverse.row_start[static_cast<std::size_t>(i) + 1]);
    for (std::size_t p = begin; p < end; ++p) {
      // The upper triangle by rows, read the other way round, is the lower one by columns.
      fmt::format_to(to, "{} {} {:.16e}\n", inverse.col[p] + 1, i + 1, inverse.value[p]);
      out.flush_if_full();
    }
  }
  out.finish();
}

void write_packed(OutputFile& out, std::int64_t order, const std::vector<double>& values, const std::string& comment) {
  auto to = std::back_inserter(out.buffer());
  fmt::format_to(to, "%%MatrixMarket matrix array real symmetric\n% {}\n{} {}\n", comment, order, order);
  for (const double value : values) {
    fmt::format_to(to, "{:.16e}\n", value);
    out.flush_if_full();
  }
  out.finish();
}

void report_animals(Report& report, const mixed::Pedigree& pedigree) {
  std::int64_t founders = 0;
  for (const std::int64_t generation : pedigree.generation) founders += generation == 0 ? 1 : 0;
  const std::int64_t last = pedigree.generation[static_cast<std::size_t>(pedigree.order.back())];
  report.add("animals", pedigree.size(), "animals", fmt::format("{}", pedigree.size()));
  report.add("founders", founders, "founders", fmt::format("{}", founders));
  report.add("generations", last + 1, "generations", fmt::format("{}, the founders' included", last + 1));
}

void report_inbreeding(Report& report, const std::vector<double>& f) {
  double sum = 0.0;
  std::int64_t inbred = 0;
  for (const double each : f) {
    sum += each;
    inbred += each > 0.0 ? 1 : 0;
  }
  const double mean = sum / static_cast<double>(f.size());
  const double largest = *std::max_element(f.begin(), f.end());
  report.add("inbred", inbred, "inbred", fmt::format("{}", inbred));
  report.add("mean_inbreeding", mean, "mean F", fmt::format("{:.6g}", mean));
  report.add("max_inbreeding", largest, "largest F", number_text(largest));
}

void report_inverse(Report& report, const mixed::Precision& inverse) {
  // A pedigree of founders has log 1, which is not to be printed as -0.
  const double log_determinant = 0.0 - inverse.log_det;
  report.add("log_determinant", log_determinant, "log-determinant", number_text(log_determinant) + " (of A)");
  report.add("inverse_entries", inverse.col.size(), "A-inverse",
             fmt::format("{} entries in its lower triangle", inverse.col.size()));
}

// What was asked for without a file: a line for each of the first animals, and all of them in JSON.
void report_animals(Report& report, const PedigreeOptions& options, const mixed::Pedigree& pedigree,
                    const std::vector<double>& f) {
  if (!options.report_inbreeding && !options.report_mendelian) return;
  constexpr std::size_t kShown = 60;
  const std::vector<double> d =
      options.report_mendelian ? mixed::mendelian_variances(pedigree, f) : std::vector<double>();
  Json list = Json::array();
  for (std::size_t i = 0; i < f.size(); ++i) {
    Json animal{{"id", pedigree.ids[i]}};
    std::string text;
    if (options.report_inbreeding) {
      animal["inbreeding"] = f[i];
      text = fmt::format("F {}", number_text(f[i]));
    }
    if (options.report_mendelian) {
      animal["mendelian_variance"] = d[i];
      text += fmt::format("{}Mendelian variance {}", text.empty() ? "" : ", ", number_text(d[i]));
    }
    list.push_back(std::move(animal));
    if (i < kShown) report.add_text("animal " + pedigree.ids[i], text);
  }
  if (f.size() > kShown) report.add_text("...", fmt::format("{} more; name a file for all", f.size() - kShown));
  report.add_json("per_animal", std::move(list));
}

void report_outputs(Report& report, const Outputs& outputs) {
  const std::array<std::pair<const char*, const OutputFile*>, 5> all{{{"a", outputs.a.get()},
                                                                      {"ainv", outputs.ainv.get()},
                                                                      {"inbreeding", outputs.inbreeding.get()},
                                                                      {"mendelian", outputs.mendelian.get()},
                                                                      {"ids", outputs.ids.get()}}};
  Json written = Json::object();
  for (const auto& [name, output] : all) {
    if (!output) continue;
    written[name] = output->path();
    report.add_text("written", fmt::format("{}, in {}", name, output->path()));
  }
  report.add_json("written", std::move(written));
}

}  // namespace

Report run_pedigree(const PedigreeOptions& options, const CommonOptions& common, Progress& progress) {
  require_different(options);
  PhaseClock clock(progress);
  const mixed::Pedigree pedigree = clock.timed("reading", [&] { return mixed::read_pedigree(options.pedigree); });
  const std::string animals = fmt::format("a pedigree of {} animals", pedigree.size());
  require_memory(kBytesPerAnimal * static_cast<double>(pedigree.size()), common.ceiling, animals);
  if (!options.a.empty()) {
    require_memory(mixed::relationship_matrix_bytes(pedigree.size()), common.ceiling,
                   "the relationship matrix A of " + animals + " (its inverse, --ainv, is sparse)");
  }
  const Outputs outputs{.a = opened(options.a, options.pedigree),
                        .ainv = opened(options.ainv, options.pedigree),
                        .inbreeding = opened(options.inbreeding, options.pedigree),
                        .mendelian = opened(options.mendelian, options.pedigree),
                        .ids = opened(options.ids, options.pedigree)};
  Report report("pedigree");
  const std::string name = options.pedigree == "-" ? "standard input" : options.pedigree;
  report.add("file", name, "pedigree", name);
  report_animals(report, pedigree);
  const std::vector<double> f = clock.timed("inbreeding", [&] { return mixed::inbreeding(pedigree); });
  report_inbreeding(report, f);
  const mixed::Precision inverse =
      clock.timed("inverting", [&] { return mixed::relationship_inverse(pedigree, f, name); });
  report_inverse(report, inverse);
  report_animals(report, options, pedigree, f);
  for (const std::string& note : pedigree.notes) report.add_text("note", note);
  report.add_json("notes", pedigree.notes);
  clock.timed("writing", [&] {
    if (outputs.a) {
      write_packed(*outputs.a, pedigree.size(), mixed::relationship_matrix(pedigree),
                   comment_text("relationship matrix of " + name));
    }
    if (outputs.ainv) write_matrix(*outputs.ainv, inverse, comment_text("inverse relationship matrix of " + name));
    if (outputs.inbreeding) write_column(*outputs.inbreeding, pedigree, "inbreeding", f);
    if (outputs.mendelian) {
      write_column(*outputs.mendelian, pedigree, "mendelian_variance", mixed::mendelian_variances(pedigree, f));
    }
    if (outputs.ids) write_ids(*outputs.ids, pedigree);
    return 0;
  });
  report_outputs(report, outputs);
  report_phases(report, clock);
  return report;
}

}  // namespace sm::cli
