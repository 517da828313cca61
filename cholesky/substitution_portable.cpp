// The passes of substitution with the vectors that every processor of the build has.
#include <algorithm>

#include "cholesky/substitution.hpp"

#define SM_PASS_TARGET
#define SM_PASS_INLINE __attribute__((always_inline)) inline

namespace sm {

namespace {

#include "cholesky/substitution_access.hpp"

using Access = PlainAccess;

#include "cholesky/substitution_body.hpp"

}  // namespace

const SubstitutionPasses kPortableSubstitution = kPasses;

}  // namespace sm
