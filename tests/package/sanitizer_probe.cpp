// Makes one mistake on request, so that a test can see the sanitizers of this build catch it.
#include <climits>
#include <cstdio>
#include <cstring>
#include <memory>

namespace {

int use_after_free(int argc) {
  int* block = std::make_unique<int[]>(static_cast<std::size_t>(argc)).release();
  volatile int* kept = block;
  delete[] block;
  return kept[0];
}

int overflow(int argc) {
  volatile int big = INT_MAX;
  return big + argc;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc == 2 && std::strcmp(argv[1], "use-after-free") == 0) return use_after_free(argc);
  if (argc == 2 && std::strcmp(argv[1], "overflow") == 0) return overflow(argc);
  std::fputs("usage: sanitizer_probe use-after-free | overflow\n", stderr);
  return 2;
}
