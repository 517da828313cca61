// A fit as files for other programs: CSV tables, a Matrix Market matrix and the JSON object.
#pragma once

#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/folder.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

// fixef.csv, ranef.csv, varcomp.csv, fitted.csv, fit.json, vcov.mtx where the fit has the covariances of its fixed
// effects, predicted.csv where it has predictions. Numbers read back as the same doubles; what is not a number is an
// empty field, which reads back as missing.
std::vector<NamedText> fit_files(const Model& model, const Fit& fit);

// Into the folder, in place of those of an earlier fit. Throws ModelError.
void write_fit(const std::string& folder, const Model& model, const Fit& fit);

// A field of a CSV file (RFC 4180), in quotes where it needs them.
std::string csv_field(const std::string& text);

}  // namespace sm::mixed
