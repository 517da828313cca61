#include "cli/model_error.hpp"

#include "mixed/precision.hpp"

namespace sm::cli {

ExitCode exit_code_of(const mixed::ModelError& error) {
  return dynamic_cast<const mixed::NotSemidefinite*>(&error) ? ExitCode::no : ExitCode::bad_input;
}

Json error_object(const mixed::ModelError& error) {
  const mixed::Fault& fault = error.fault();
  Json json = error_object(Problem{.code = exit_code_of(error),
                                   .file = fault.file,
                                   .line = fault.line,
                                   .what = fault.what,
                                   .expected = fault.expected,
                                   .advice = fault.advice});
  json["column"] = fault.column > 0 ? Json(fault.column) : Json();
  json["variable"] = fault.variable.empty() ? Json() : Json(fault.variable);
  json["message"] = error.what();
  return json;
}

}  // namespace sm::cli
