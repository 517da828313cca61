// The first part of a Matrix Market file: banner and size line.
#pragma once

#include "cli/lines.hpp"
#include "cli/matrix_market.hpp"

namespace sm::cli {

Header read_header(LineReader& lines);

// A line that carries no data: blank, or a comment.
bool is_skipped(std::string_view line);

}  // namespace sm::cli
