// Searches of ascending lists of columns.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Where the list has c, or its length. Without branches on what is read: searches of one list go everywhere in it.
inline i64 find_column(const i64* list, i64 length, i64 c) {
  const i64* at = list;
  for (i64 left = length; left > 1; left -= left / 2) at += at[left / 2 - 1] < c ? left / 2 : 0;
  return length > 0 && *at == c ? at - list : length;
}

}  // namespace sm
