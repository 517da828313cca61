// What every file of the module uses: names, the missing value, and the way checks and failures travel.
#pragma once

#include <qxesm/qxesm.h>

#include <bit>
#include <cstdint>

namespace sm {

using i64 = std::int64_t;

inline double missing() { return std::bit_cast<double>(SM_MISSING_BITS); }

// A list of checks answers with a gate: `stop` says whether the operation ends here. An answer of 0 that ends it
// ("nothing to do") is thereby not mistaken for "go on".
struct Gate {
  SmStatus status = SM_OK;
  bool stop = false;
};

}  // namespace sm

#define SM_STOP_IF(bad, answer)                 \
  do {                                          \
    if (bad) return ::sm::Gate{(answer), true}; \
  } while (0)
#define SM_STOP_WITH(gate)                                \
  do {                                                    \
    if (const ::sm::Gate g_ = (gate); g_.stop) return g_; \
  } while (0)
#define SM_PASS(gate)                                            \
  do {                                                           \
    if (const ::sm::Gate g_ = (gate); g_.stop) return g_.status; \
  } while (0)
#define SM_TRY(call)                                        \
  do {                                                      \
    if (const SmStatus s_ = (call); s_ != SM_OK) return s_; \
  } while (0)
