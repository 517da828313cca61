#include "cli/model_input.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <memory>

#include "cli/error.hpp"
#include "cli/fields.hpp"
#include "mixed/contrast_rows.hpp"
#include "mixed/ratio.hpp"

namespace sm::cli {
namespace {

constexpr const char* kPedigreeName = "pedigree";

std::string trimmed(std::string_view text) {
  while (!text.empty() && is_blank(text.front())) text.remove_prefix(1);
  while (!text.empty() && is_blank(text.back())) text.remove_suffix(1);
  return std::string(text);
}

[[noreturn]] void refuse(std::string what, std::string expected, std::string advice) {
  throw CommandError({.what = std::move(what), .expected = std::move(expected), .advice = std::move(advice)});
}

}  // namespace

std::vector<std::string> split_list(std::string_view text) {
  std::vector<std::string> parts(1);
  bool quoted = false;
  for (const char c : text) {
    if (c == '"') {
      quoted = !quoted;
    } else if (c == ',' && !quoted) {
      parts.emplace_back();
    } else {
      parts.back() += c;
    }
  }
  for (std::string& part : parts) part = trimmed(part);
  return parts;
}

std::pair<std::string, std::string> split_assignment(std::string_view text) {
  const std::size_t equals = text.find('=');
  return {trimmed(text.substr(0, equals)), trimmed(text.substr(equals + 1))};
}

KnownPrecisions::KnownPrecisions(const ModelOptions& options, const mixed::Formula& formula) {
  const auto add = [&](const std::string& name, Source source, const std::string& option) {
    const bool used = std::any_of(formula.random.begin(), formula.random.end(),
                                  [&](const mixed::RandomPart& part) { return part.known == name; });
    if (!used) {
      refuse(fmt::format("{} is given, but no term of the formula uses it", option),
             fmt::format("a term such as (1 | g; {})", name),
             "add the name behind a semicolon, or leave the option out");
    }
    if (!sources_.emplace(name, std::move(source)).second) {
      refuse(fmt::format("{} is given twice for {}", option, quote(name)), "", "give each name one file");
    }
  };
  if (!options.pedigree.empty())
    add(kPedigreeName, {.path = options.pedigree, .ids = {}, .pedigree = true}, "--pedigree");
  for (const std::string& text : options.kinv) {
    const auto [name, path] = split_assignment(text);
    add(name, {.path = path, .ids = {}}, "--kinv " + name);
  }
  for (const std::string& text : options.ids) {
    const auto [name, path] = split_assignment(text);
    const auto source = sources_.find(name);
    if (source == sources_.end() || source->second.pedigree) {
      refuse(fmt::format("--ids is given for {}", quote(name)), "the name of a --kinv",
             fmt::format("add --kinv {}=K.mtx", name));
    }
    source->second.ids = path;
  }
}

mixed::KnownPrecision KnownPrecisions::get(const std::string& name, const mixed::Module& module, std::uint64_t limit,
                                           Progress& progress) {
  if (const auto known = read_.find(name); known != read_.end()) return known->second;
  const auto source = sources_.find(name);
  if (source == sources_.end()) {
    refuse(fmt::format("the formula asks for the precision {}, which no option gives", quote(name)),
           name == kPedigreeName ? "--pedigree P.csv" : fmt::format("--kinv {}=K.mtx", name), "add it");
  }
  const Source& from = source->second;
  return read_
      .emplace(name, from.pedigree ? load_pedigree(from.path, notes_)
                                   : load_precision(from.path, from.ids, module, limit, progress))
      .first->second;
}

mixed::DesignOptions design_options(const ModelOptions& options) {
  mixed::DesignOptions design;
  design.weights = options.weights;
  for (const std::string& text : options.factors) {
    const std::vector<std::string> names = split_list(text);
    design.factors.insert(design.factors.end(), names.begin(), names.end());
  }
  for (const std::string& text : options.levels) {
    const auto [name, levels] = split_assignment(text);
    design.levels.emplace_back(name, split_list(levels));
  }
  if (options.contrasts == "sum") design.contrasts = mixed::Contrasts::sum;
  if (options.missing == "fail") design.missing = mixed::MissingValues::fail;
  return design;
}

std::vector<mixed::VarianceComponent> components_of(const mixed::Model& model) {
  std::vector<mixed::VarianceComponent> components;
  for (const mixed::RandomTerm& term : model.random) {
    for (std::size_t b = 0; b < term.coefs.size(); ++b) {
      components.push_back(
          {.group = term.group, .var1 = term.coefs[b], .var2 = {}, .se_observed = {}, .se_average = {}});
      for (std::size_t a = b + 1; a < term.coefs.size(); ++a) {
        components.push_back(
            {.group = term.group, .var1 = term.coefs[b], .var2 = term.coefs[a], .se_observed = {}, .se_average = {}});
      }
    }
  }
  components.push_back({.group = "Residual", .var1 = {}, .var2 = {}, .se_observed = {}, .se_average = {}});
  return components;
}

namespace {

// What --var may call a term: its group; with its coefficient, or with its precision, where that is not enough.
std::vector<std::string> names_of(const mixed::RandomTerm& term, const mixed::Formula& formula) {
  std::vector<std::string> names{term.group};
  if (term.coefs.size() == 1) names.push_back(fmt::format("{}[{}]", term.group, term.coefs.front()));
  for (const mixed::RandomPart& part : formula.random) {
    if (part.group_label() != term.group || part.known.empty() != (term.precision == nullptr)) continue;
    names.push_back(part.known.empty() ? term.group + ";" : fmt::format("{};{}", term.group, part.known));
  }
  return names;
}

std::vector<double> numbers_of(const std::string& name, const std::string& text, std::size_t count) {
  std::vector<double> values;
  for (const std::string& field : split_list(text)) {
    double value = 0.0;
    if (!parse_real(field, value))
      refuse(fmt::format("--var {}: found {}", name, quote(field)), "a number", "correct it");
    values.push_back(value);
  }
  if (values.size() != count) {
    refuse(fmt::format("--var {}: found {} values", name, values.size()),
           count == 1 ? "one variance" : fmt::format("{}, the lower triangle of a covariance matrix by columns", count),
           "correct it");
  }
  return values;
}

struct Given {
  std::string name;
  std::string text;
  bool used = false;
};

// The one value that goes by one of the names.
Given& find_given(std::vector<Given>& given, const std::vector<std::string>& names) {
  Given* found = nullptr;
  for (Given& each : given) {
    if (std::find(names.begin(), names.end(), each.name) == names.end()) continue;
    if (found || each.used) {
      refuse(fmt::format("--var {} could be more than one term's", quote(each.name)),
             fmt::format("names such as {}", names.back()), "give each term a name of its own");
    }
    found = &each;
  }
  if (!found) {
    refuse(fmt::format("no variance is given for {}", quote(names.front())),
           fmt::format("--var '{}=...'", names.front()), "add it");
  }
  found->used = true;
  return *found;
}

}  // namespace

std::vector<double> given_variances(const std::vector<std::string>& texts, const mixed::Model& model,
                                    const mixed::Formula& formula) {
  std::vector<Given> given;
  for (const std::string& text : texts) {
    auto [name, value] = split_assignment(text);
    given.push_back({.name = std::move(name), .text = std::move(value)});
  }
  std::vector<double> values;
  for (const mixed::RandomTerm& term : model.random) {
    const Given& one = find_given(given, names_of(term, formula));
    const std::size_t k = term.coefs.size();
    const std::vector<double> numbers = numbers_of(one.name, one.text, k * (k + 1) / 2);
    values.insert(values.end(), numbers.begin(), numbers.end());
  }
  const Given& residual = find_given(given, {"residual", "Residual"});
  values.push_back(numbers_of("residual", residual.text, 1).front());
  if (values.back() <= 0.0) refuse("--var residual: found " + residual.text, "a number above 0", "correct it");
  for (const Given& each : given) {
    if (!each.used) refuse(fmt::format("--var {}: there is no such term", quote(each.name)), "", "leave it out");
  }
  return values;
}

std::vector<mixed::ContrastRequest> contrast_requests(const std::vector<std::string>& texts,
                                                      const mixed::Model& model) {
  std::vector<mixed::ContrastRequest> requests;
  for (const std::string& text : texts) {
    mixed::ContrastRow row = mixed::parse_contrast(text, *model.recipe);
    requests.push_back({.name = std::move(row.name), .l = std::move(row.l)});
  }
  return requests;
}

std::vector<mixed::RatioRequest> ratio_requests(const std::vector<std::string>& texts, const mixed::Model& model,
                                                bool defaults) {
  const std::vector<mixed::VarianceComponent> components = components_of(model);
  std::vector<mixed::RatioFunction> functions;
  functions.reserve(texts.size());
  for (const std::string& text : texts) functions.push_back(mixed::parse_ratio(text, components));
  if (texts.empty() && defaults) functions = mixed::default_ratios(components);
  std::vector<mixed::RatioRequest> requests;
  requests.reserve(functions.size());
  for (mixed::RatioFunction& function : functions) {
    std::string name = function.name();
    requests.push_back(
        {.name = std::move(name), .value = [function](std::span<const double> vcov, std::span<double> gradient) {
           const mixed::RatioFunction::Value at = function(vcov);
           std::copy(at.gradient.begin(), at.gradient.end(), gradient.begin());
           return at.value;
         }});
  }
  return requests;
}

}  // namespace sm::cli
