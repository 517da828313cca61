// Hanging the blocks of a factor on each other.
#include "cholesky/block_tree.hpp"

namespace sm {

// Blocks go to the head of their parent's list from the last one to the first: where the walk goes behind the parent is
// known by then.
void BlockTree::build() {
  Blocks(a_).find();
  root_ = -1;
  for (i64 k = a_.n - 1; k >= 0; --k) {
    const i64 first = block_of(k);
    if (first != k) continue;
    const i64 above = parent(at(first));
    if (above < 0) {
      a_.jl[first] = root_;
      root_ = first;
    } else {
      a_.jl[first] = child(above) >= 0 ? child(above) : a_.jl[above];
      a_.position[above] = (first + 1) << kWidthBits | (a_.position[above] & kWidthMask);
    }
  }
}

}  // namespace sm
