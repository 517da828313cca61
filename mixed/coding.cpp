// Rules: J. M. Chambers and T. J. Hastie, "Statistical Models in S" (1992), section 2.4.1.
#include "mixed/coding.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "mixed/error.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

// Whether a factor of a term may have contrasts: an earlier term spans what the term is without it.
bool margin_is_present(const TermList& list, std::size_t term, int variable) {
  std::vector<int> margin = list.terms[term];
  std::erase(margin, variable);
  if (margin.empty()) return true;
  for (std::size_t earlier = 0; earlier < term; ++earlier) {
    const std::vector<int>& other = list.terms[earlier];
    if (std::includes(other.begin(), other.end(), margin.begin(), margin.end())) return true;
  }
  return false;
}

std::int64_t columns_of(const CodedVariable& variable, bool dummies) {
  if (!variable.factor) return 1;
  return static_cast<std::int64_t>(variable.levels.size()) - (dummies ? 0 : 1);
}

std::vector<std::string> column_names(const CodedVariable& variable, bool dummies, Contrasts contrasts) {
  if (!variable.factor) return {variable.label};
  std::vector<std::string> names;
  const bool numbered = !dummies && contrasts == Contrasts::sum;
  for (std::size_t l = dummies || numbered ? 0 : 1; l < variable.levels.size() - (numbered ? 1 : 0); ++l) {
    names.push_back(variable.label + (numbered ? std::to_string(l + 1) : variable.levels[l]));
  }
  return names;
}

void name_columns(Coding& coding, const CodedTerm& term) {
  std::vector<std::string> names{""};
  for (std::size_t i = 0; i < term.variables.size(); ++i) {
    const CodedVariable& variable = coding.variables[static_cast<std::size_t>(term.variables[i])];
    std::vector<std::string> longer;
    for (const std::string& own : column_names(variable, term.dummies[i] != 0, coding.contrasts)) {
      for (const std::string& name : names) longer.push_back(name.empty() ? own : fmt::format("{}:{}", name, own));
    }
    names = std::move(longer);
  }
  if (term.variables.empty()) names = {"(Intercept)"};
  for (std::string& name : names) coding.names.push_back(std::move(name));
}

// Counts the columns of a term; the first factor varies fastest.
void place_term(Coding& coding, CodedTerm term, std::int64_t most) {
  term.first = coding.cols();
  for (std::size_t i = 0; i < term.variables.size(); ++i) {
    const CodedVariable& variable = coding.variables[static_cast<std::size_t>(term.variables[i])];
    term.count *= columns_of(variable, term.dummies[i] != 0);
    if (term.first + term.count > most) {
      throw ModelError({.variable = term.label,
                        .what = fmt::format("the columns of the terms are more than {}", most),
                        .advice = "make a factor of many levels a random term"});
    }
  }
  name_columns(coding, term);
  coding.terms.push_back(std::move(term));
}

// Multiplies the entries by the columns of one factor.
void multiply_level(const CodedVariable& variable, bool dummies, Contrasts contrasts, std::int32_t code,
                    std::int64_t stride, std::vector<CodedEntry>& entries) {
  const auto last = static_cast<std::int32_t>(variable.levels.size()) - 1;
  if (dummies || (contrasts == Contrasts::sum && code < last)) {
    for (CodedEntry& entry : entries) entry.column += code * stride;
    return;
  }
  if (contrasts == Contrasts::treatment) {
    if (code == 0) return entries.clear();
    for (CodedEntry& entry : entries) entry.column += (code - 1) * stride;
    return;
  }
  const std::vector<CodedEntry> before = std::move(entries);
  entries.clear();
  for (std::int32_t column = 0; column < last; ++column) {
    for (const CodedEntry& entry : before) entries.push_back({entry.column + column * stride, -entry.value});
  }
}

// Calls visit(row, column, value) for what is not zero, terms outermost.
template <class Visit>
void for_each_entry(const Coding& coding, const CodedData& data, std::int64_t rows, Visit&& visit) {
  std::vector<Setting> settings(coding.variables.size());
  std::vector<CodedEntry> entries;
  for (const CodedTerm& term : coding.terms) {
    for (std::int64_t row = 0; row < rows; ++row) {
      for (const int v : term.variables) {
        const auto place = static_cast<std::size_t>(v);
        if (coding.variables[place].factor) {
          settings[place].code = data.code[place][static_cast<std::size_t>(row)];
        } else {
          settings[place].number = data.number[place][static_cast<std::size_t>(row)];
        }
      }
      encode(coding, term, settings, entries);
      for (const CodedEntry& entry : entries) {
        if (entry.value != 0.0) visit(row, entry.column, entry.value);
      }
    }
  }
}

}  // namespace

std::int64_t CodedVariable::level(const std::string& name) const {
  const auto found = std::find(levels.begin(), levels.end(), name);
  if (found != levels.end()) return found - levels.begin();
  double value = 0.0;
  double other = 0.0;
  if (!parse_number(name, value)) return -1;
  for (std::size_t l = 0; l < levels.size(); ++l) {
    if (parse_number(levels[l], other) && other == value) return static_cast<std::int64_t>(l);
  }
  return -1;
}

Coding make_coding(const TermList& list, std::vector<CodedVariable> variables, Contrasts contrasts, std::int64_t most) {
  Coding coding{.contrasts = contrasts, .variables = std::move(variables), .terms = {}, .names = {}};
  if (list.intercept) place_term(coding, {.label = "(Intercept)", .variables = {}, .dummies = {}}, most);
  bool need_dummies = !list.intercept;  // without an intercept the first factor spans it
  for (std::size_t t = 0; t < list.terms.size(); ++t) {
    CodedTerm term{.label = list.label(t), .variables = list.terms[t], .dummies = {}};
    for (const int v : term.variables) {
      const bool factor = coding.variables[static_cast<std::size_t>(v)].factor;
      const bool dummies = factor && (need_dummies || !margin_is_present(list, t, v));
      if (factor) need_dummies = false;
      term.dummies.push_back(dummies ? 1 : 0);
    }
    place_term(coding, std::move(term), most);
  }
  return coding;
}

void encode(const Coding& coding, const CodedTerm& term, const std::vector<Setting>& settings,
            std::vector<CodedEntry>& entries) {
  entries.assign(1, {term.first, 1.0});
  std::int64_t stride = 1;
  for (std::size_t i = 0; i < term.variables.size(); ++i) {
    const auto place = static_cast<std::size_t>(term.variables[i]);
    const CodedVariable& variable = coding.variables[place];
    if (!variable.factor) {
      for (CodedEntry& entry : entries) entry.value *= settings[place].number;
      continue;
    }
    const bool dummies = term.dummies[i] != 0;
    multiply_level(variable, dummies, coding.contrasts, settings[place].code, stride, entries);
    stride *= columns_of(variable, dummies);
  }
}

SparseColumns sparse_columns(const Coding& coding, const CodedData& data, std::int64_t rows) {
  SparseColumns x;
  x.rows = rows;
  x.start.assign(static_cast<std::size_t>(coding.cols()) + 1, 0);
  for_each_entry(coding, data, rows,
                 [&](std::int64_t, std::int64_t column, double) { ++x.start[static_cast<std::size_t>(column) + 1]; });
  for (std::size_t j = 1; j < x.start.size(); ++j) x.start[j] += x.start[j - 1];
  x.row.resize(static_cast<std::size_t>(x.start.back()));
  x.value.resize(x.row.size());
  std::vector<std::int64_t> next(x.start.begin(), x.start.end() - 1);
  for_each_entry(coding, data, rows, [&](std::int64_t row, std::int64_t column, double value) {
    const auto place = static_cast<std::size_t>(next[static_cast<std::size_t>(column)]++);
    x.row[place] = row;
    x.value[place] = value;
  });
  return x;
}

std::vector<double> dense_rows(const Coding& coding, const CodedData& data, std::int64_t rows) {
  std::vector<double> z(static_cast<std::size_t>(rows * coding.cols()), 0.0);
  for_each_entry(coding, data, rows, [&](std::int64_t row, std::int64_t column, double value) {
    z[static_cast<std::size_t>(row * coding.cols() + column)] = value;
  });
  return z;
}

}  // namespace sm::mixed
