// A fit as a JSON object of the schema docs/qxsm-fit-1.schema.json, and what a later fit reads of it.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

constexpr const char* kFitSchema = "qxsm-fit/1";

// Numbers are written with as many digits as it takes to read the same double back; NaN and infinities as null, bytes
// that are not UTF-8 as U+FFFD. Ends in a newline.
std::string fit_json(const Model& model, const Fit& fit);

// Where an earlier fit ended.
struct StartValues {
  struct Term {
    std::string group;
    std::vector<std::string> coefs;
  };
  std::vector<Term> terms;
  std::vector<double> theta;  // of the terms one after the other, column-major lower triangles
};

// Nothing when the text is no fit of this schema with all of its theta.
std::optional<StartValues> read_start(std::string_view text);

// theta for the terms of `model`, which may stand in another order there. Throws ModelError, naming `file`, when the
// text is no such fit or was fitted to other terms.
std::vector<double> start_theta(std::string_view text, const Model& model, const std::string& file);

}  // namespace sm::mixed
