// Linear functions of the fixed effects, as a user writes them.
//
//   contrast   = [name ": "] combination              the name ends at the first colon that a blank follows
//   combination = [sign] item { sign item }
//   item       = [number ["*"]] (effect | cell)
//   effect     = "(Intercept)" | part { ":" part }    the effect of a term of the formula at these levels
//   part       = factor "[" level "]" | variable [ "[" number "]" ]
//   cell       = "at(" column "=" value { "," column "=" value } ")"    the whole row of X in that cell
//
// f[b] is the coding of level b in the columns of the term f: of treatment contrasts the column fb, and nothing for the
// reference; of sum contrasts its column, and minus all of them for the last level. A variable of numbers counts 1 or
// the number in its brackets, and a column may also be called by its own name, in backquotes where that is no ordinary
// one: `VarietyMarvellous:nitrofn0.6`.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "mixed/coding.hpp"
#include "mixed/design.hpp"

namespace sm::mixed {

struct ContrastRow {
  std::string name;
  std::vector<double> l;  // over all columns of X
};

// Throws ModelError with the place in the text.
ContrastRow parse_contrast(std::string_view text, const DesignRecipe& recipe);

}  // namespace sm::mixed
