// Inbreeding coefficients of large pedigrees.
#pragma once

#include <vector>

#include "mixed/pedigree.hpp"

namespace sm::mixed {

// F of each animal, in the order of pedigree.ids: half the relationship of its parents.
//
// The relationship of two animals is the sum over common ancestors j of L_xj L_yj d_j, with A = L diag(d) L' (Meuwissen
// and Luo, Genet. Sel. Evol. 24 (1992) 305-313). For one animal and all its mates it comes from two sweeps over their
// ancestors, up and down again (Colleau, Genet. Sel. Evol. 34 (2002) 409-421); that many animals share mates and
// ancestors is what makes it quick (Sargolzaei, Iwaisaki and Colleau, J. Anim. Breed. Genet. 122 (2005) 325-331).
// Several such animals go through the sweeps together here, side by side.
std::vector<double> inbreeding(const Pedigree& pedigree);

}  // namespace sm::mixed
