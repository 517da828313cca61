// The numerator relationship matrix A of a pedigree, and its inverse.
#pragma once

#include <vector>

#include "mixed/model.hpp"
#include "mixed/pedigree.hpp"

namespace sm::mixed {

// The variance of an animal's deviation from the mean of its parents, in units of the additive variance. `f` holds the
// inbreeding coefficients.
double mendelian_variance(const Pedigree& pedigree, const std::vector<double>& f, std::int64_t animal);
std::vector<double> mendelian_variances(const Pedigree& pedigree, const std::vector<double>& f);

// The inverse of A with inbreeding, rows in the order of pedigree.ids. Throws ModelError, naming `file` and the animal,
// when A is singular: the parents are inbred so far that they pass on nothing but one kind of gamete.
// Rules: C. R. Henderson, Biometrics 32 (1976) 69-83; with inbreeding R. L. Quaas, Biometrics 32 (1976) 949-953.
Precision relationship_inverse(const Pedigree& pedigree, const std::vector<double>& f, const std::string& file);
// The same, inbreeding coefficients included.
Precision pedigree_precision(const Pedigree& pedigree, const std::string& file);

// A itself by the tabular method (Emik and Terrill, J. Hered. 40 (1949) 51-55), packed: the lower triangle by columns,
// rows in the order of pedigree.ids. For small pedigrees; takes n (n + 1) / 2 doubles twice.
std::vector<double> relationship_matrix(const Pedigree& pedigree);
double relationship_matrix_bytes(std::int64_t animals);

}  // namespace sm::mixed
