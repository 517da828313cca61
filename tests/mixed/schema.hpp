// The part of JSON Schema (draft 2020-12) that the published schema uses. A keyword that it does not know is an error,
// so that nothing is taken for checked that is not.
#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>
#include <vector>

namespace sm::mixed::test {

// One line for each place that does not conform: "/fixef/0/se: not of type number"
std::vector<std::string> violations(const nlohmann::json& schema, const nlohmann::json& instance);

}  // namespace sm::mixed::test
