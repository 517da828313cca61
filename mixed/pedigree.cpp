#include "mixed/pedigree.hpp"

#include <fmt/format.h>

#include <algorithm>
#include <unordered_map>

#include "mixed/error.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kNamed = 5;         // animals that a note names
constexpr std::size_t kLongestLoop = 12;  // animals that are named of a loop

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// "3 parents have ...: A, B, C"; the first few are named, the rest counted.
struct Finding {
  std::int64_t count = 0;
  std::vector<std::string_view> first;

  void add(std::string_view id) {
    ++count;
    if (first.size() < kNamed) first.push_back(id);
  }
  void note(std::vector<std::string>& notes, const char* one, const char* many) const {
    if (count == 0) return;
    const bool more = count > static_cast<std::int64_t>(first.size());
    notes.push_back(
        fmt::format("{} {}: {}{}", count, count == 1 ? one : many, fmt::join(first, ", "), more ? ", ..." : ""));
  }
};

// The places of the animals by name, while the pedigree is built. The names are those of the rows, which stay.
class Animals {
 public:
  Animals(const std::vector<PedigreeRow>& rows, const std::string& file) : rows_(rows), file_(file) {
    places_.reserve(rows.size());
    for (const PedigreeRow& row : rows) enter(row);
  }

  // The place of a parent; one without a row gets the next place.
  std::int64_t parent(const std::string& id, Pedigree& pedigree, Finding& added) {
    if (is_unknown_animal(id)) return kUnknownParent;
    const auto [entry, is_new] = places_.try_emplace(id, pedigree.size());
    if (is_new) {
      pedigree.ids.push_back(id);
      added.add(id);
    }
    return entry->second;
  }

 private:
  void enter(const PedigreeRow& row) {
    const auto place = static_cast<std::int64_t>(places_.size());
    if (is_unknown_animal(row.id)) {
      throw ModelError({.file = file_,
                        .line = row.line,
                        .variable = row.id,
                        .what = row.id.empty() ? "the row names no animal" : "this stands for an unknown parent",
                        .expected = "an id of the animal",
                        .advice = "give the animal another id, or remove the row"});
    }
    const auto [entry, is_new] = places_.try_emplace(row.id, place);
    if (is_new) return;
    throw ModelError({.file = file_,
                      .line = row.line,
                      .variable = row.id,
                      .what = fmt::format("the animal has a row already, in line {}", rows_[at(entry->second)].line),
                      .expected = "one row for each animal",
                      .advice = "remove one of the two, or correct its id"});
  }

  const std::vector<PedigreeRow>& rows_;
  const std::string& file_;
  std::unordered_map<std::string_view, std::int64_t> places_;
};

void refuse_own_parent(const PedigreeRow& row, const std::string& file) {
  if (row.id != row.sire && row.id != row.dam) return;
  throw ModelError({.file = file,
                    .line = row.line,
                    .variable = row.id,
                    .what = fmt::format("the animal is its own {}", row.id == row.sire ? "sire" : "dam"),
                    .expected = "another animal, or an unknown parent",
                    .advice = "correct the row, or leave the parent empty"});
}

void note_both_roles(Pedigree& pedigree, std::int64_t rows) {
  std::vector<char> is_sire(at(pedigree.size()), 0);
  Finding both;
  Finding selfed;
  for (std::int64_t i = 0; i < rows; ++i) {
    if (pedigree.sire[at(i)] != kUnknownParent) is_sire[at(pedigree.sire[at(i)])] = 1;
    if (pedigree.sire[at(i)] != kUnknownParent && pedigree.sire[at(i)] == pedigree.dam[at(i)]) {
      selfed.add(pedigree.ids[at(i)]);
    }
  }
  for (std::int64_t i = 0; i < rows; ++i) {
    const std::int64_t dam = pedigree.dam[at(i)];
    if (dam == kUnknownParent || is_sire[at(dam)] != 1) continue;
    is_sire[at(dam)] = 2;  // named once
    both.add(pedigree.ids[at(dam)]);
  }
  selfed.note(pedigree.notes, "animal has one animal as both parents (selfing)",
              "animals have one animal as both parents (selfing)");
  both.note(pedigree.notes, "animal is a sire in one place and a dam in another",
            "animals are sires in one place and dams in another");
}

// Offspring of each animal, as compressed rows; those of a selfed parent twice.
struct Offspring {
  std::vector<std::int64_t> start;
  std::vector<std::int64_t> animal;
};

Offspring find_offspring(const Pedigree& pedigree) {
  Offspring of;
  of.start.assign(at(pedigree.size()) + 2, 0);
  for (const auto* parents : {&pedigree.sire, &pedigree.dam}) {
    for (const std::int64_t parent : *parents) {
      if (parent != kUnknownParent) ++of.start[at(parent) + 2];
    }
  }
  for (std::size_t i = 2; i < of.start.size(); ++i) of.start[i] += of.start[i - 1];
  of.animal.resize(at(of.start.back()));
  for (std::int64_t i = 0; i < pedigree.size(); ++i) {
    for (const std::int64_t parent : {pedigree.sire[at(i)], pedigree.dam[at(i)]}) {
      if (parent != kUnknownParent) of.animal[at(of.start[at(parent) + 1]++)] = i;
    }
  }
  of.start.pop_back();
  return of;
}

// Every animal that is left has a parent that is left, so that a walk upwards comes back to where it was.
[[noreturn]] void refuse_loop(const Pedigree& pedigree, const std::vector<std::int64_t>& waiting,
                              const std::vector<PedigreeRow>& rows, const std::string& file) {
  const auto is_left = [&](std::int64_t i) { return i != kUnknownParent && waiting[at(i)] > 0; };
  std::int64_t animal = 0;
  while (!is_left(animal)) ++animal;
  std::vector<std::int64_t> step(at(pedigree.size()), -1);
  std::vector<std::int64_t> walk;
  while (step[at(animal)] < 0) {
    step[at(animal)] = static_cast<std::int64_t>(walk.size());
    walk.push_back(animal);
    animal = is_left(pedigree.sire[at(animal)]) ? pedigree.sire[at(animal)] : pedigree.dam[at(animal)];
  }
  // The walk went from offspring to parent; people read pedigrees the other way round.
  std::vector<std::string_view> names{pedigree.ids[at(animal)]};
  for (std::size_t i = walk.size(); i-- > at(step[at(animal)]);) names.push_back(pedigree.ids[at(walk[i])]);
  const std::size_t length = names.size() - 1;
  if (names.size() > kLongestLoop) {
    names.erase(names.begin() + kLongestLoop - 2, names.end() - 1);
    names.insert(names.end() - 1, "...");
  }
  throw ModelError({.file = file,
                    .line = rows[at(animal)].line,
                    .variable = pedigree.ids[at(animal)],
                    .what = fmt::format("{} animals descend from themselves ({}, each a parent of the next)", length,
                                        fmt::join(names, " -> ")),
                    .expected = "parents that are older than their offspring",
                    .advice = "correct the parents of one of them"});
}

// Topological order by counting parents that are still to come: A. B. Kahn, Comm. ACM 5 (1962) 558-562.
void find_generations(Pedigree& pedigree, const std::vector<PedigreeRow>& rows, const std::string& file) {
  const Offspring offspring = find_offspring(pedigree);
  const std::int64_t n = pedigree.size();
  std::vector<std::int64_t> waiting(at(n), 0);
  for (const std::int64_t child : offspring.animal) ++waiting[at(child)];
  std::vector<std::int64_t> ready;
  ready.reserve(at(n));
  for (std::int64_t i = 0; i < n; ++i) {
    if (waiting[at(i)] == 0) ready.push_back(i);
  }
  pedigree.generation.assign(at(n), 0);
  for (std::size_t next = 0; next < ready.size(); ++next) {
    const std::int64_t parent = ready[next];
    for (std::int64_t p = offspring.start[at(parent)]; p < offspring.start[at(parent) + 1]; ++p) {
      const std::int64_t child = offspring.animal[at(p)];
      pedigree.generation[at(child)] = std::max(pedigree.generation[at(child)], pedigree.generation[at(parent)] + 1);
      if (--waiting[at(child)] == 0) ready.push_back(child);
    }
  }
  if (static_cast<std::int64_t>(ready.size()) < n) refuse_loop(pedigree, waiting, rows, file);
}

void sort_by_generation(Pedigree& pedigree) {
  std::vector<std::int64_t> next(2, 0);
  for (const std::int64_t g : pedigree.generation) {
    if (at(g) + 2 > next.size()) next.resize(at(g) + 2, 0);
    ++next[at(g) + 1];
  }
  for (std::size_t g = 1; g < next.size(); ++g) next[g] += next[g - 1];
  pedigree.order.resize(pedigree.ids.size());
  for (std::int64_t i = 0; i < pedigree.size(); ++i) {
    pedigree.order[at(next[at(pedigree.generation[at(i)])]++)] = i;
  }
}

}  // namespace

bool is_unknown_animal(std::string_view id) { return id.empty() || id == "NA" || id == "0" || id == "."; }

Pedigree make_pedigree(const std::vector<PedigreeRow>& rows, const std::string& file) {
  Pedigree pedigree;
  Animals animals(rows, file);
  pedigree.ids.reserve(rows.size());
  for (const PedigreeRow& row : rows) pedigree.ids.push_back(row.id);
  Finding added;
  for (const PedigreeRow& row : rows) {
    refuse_own_parent(row, file);
    pedigree.sire.push_back(animals.parent(row.sire, pedigree, added));
    pedigree.dam.push_back(animals.parent(row.dam, pedigree, added));
  }
  pedigree.sire.resize(pedigree.ids.size(), kUnknownParent);
  pedigree.dam.resize(pedigree.ids.size(), kUnknownParent);
  added.note(pedigree.notes, "parent has no row of its own and was added as a founder",
             "parents have no row of their own and were added as founders");
  note_both_roles(pedigree, static_cast<std::int64_t>(rows.size()));
  find_generations(pedigree, rows, file);
  sort_by_generation(pedigree);
  return pedigree;
}

}  // namespace sm::mixed
