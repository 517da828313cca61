#include "cli/help.hpp"

namespace sm::cli::help {

const char* const kMain =
    R"(qxsm - inspect, factor and solve with sparse symmetric matrices

Reads Matrix Market files and works on them through the qxesm module: a fill-reducing order, the factorization
A = U'DU with rank and log-determinant, and solutions of A x = b. Singular matrices are welcome: a pivot that is zero
to tolerance is dropped, and what is solved with is then a generalized inverse.

Example: solve A x = b for a stiffness matrix, with b = A * 1.

  $ qxsm solve data/bcsstk13.mtx
  matrix             data/bcsstk13.mtx (coordinate real symmetric)
  order              2003 x 2003
  rank               2003 of 2003
  relative residual  2.116e-16
  ...

'qxsm SUBCOMMAND --help' explains each subcommand, with an example.
)";

const char* const kInfo =
    R"(Show what a file holds, without factoring it

Order, stored entries, density, symmetry of pattern and values, range of the diagonal, rows without a diagonal entry,
blocks (connected components of the graph of the entries; a square matrix is block diagonal with one block for each),
and the memory that assembling and ordering a symmetric matrix will take. Any real matrix is served, rectangular ones
too. Entries at one position are added together.

Example: how much the factor of a power network would fill in.

  $ qxsm info --fill data/494_bus.mtx
  order             494 x 494
  stored entries    1080
  density           0.6827 % (1666 entries in the whole matrix)
  symmetry          symmetric, as the file says
  diagonal          0.1703577 to 20007.71
  without diagonal  none
  blocks            1, the largest of 494 rows
  nnz(U)            921 off the diagonal
  ...
)";

const char* const kFactor =
    R"(Order and factor a symmetric matrix, and say what that took

Factors A = U'DU in a minimum-degree order. Reported are the rank and the log-determinant over the accepted pivots,
whether A is positive definite, semidefinite or neither (exit code 1), the rows whose pivots were dropped, the size of
U (entries off the diagonal, fill ratio, subscripts stored in compressed form), operations and seconds by phase, and
the peak of memory.

General files are accepted when they are symmetric in value. Entries at one position are added together; zeros off the
diagonal are not kept.

Example:

  $ qxsm factor data/bcsstk13.mtx
  rank             2003 of 2003
  log-determinant  38330.04461650225
  definiteness     positive definite
  rows dropped     none
  upper triangle   42943 entries with the diagonal
  nnz(U)           274215 off the diagonal
  fill ratio       6.432 (U with its diagonal / upper triangle)
  subscripts       27599 stored
  flops            61128103 (sum of L(L+2) over the rows of U, L entries off the diagonal)
  numeric          0.014 s, 4.449 GFLOP/s
  ...
)";

const char* const kSolve =
    R"(Solve A x = b for one or many right-hand sides

Factors the symmetric matrix A as 'qxsm factor' does, solves, and measures ||b - A x|| / (||A|| ||x|| + ||b||) in the
infinity norm, from the entries of the file. When A is singular, each b is tested: one with a relative residual above
1e-10 is called inconsistent (A x = b has no solution), and the exit code is 1. A matrix that is not positive
semidefinite is refused, with exit code 1.

Example: two right-hand sides, one in each column of an array file.

  $ qxsm solve data/bcsstk01.mtx -b data/bcsstk01_b.mtx -o x.mtx
  right-hand sides     2, from data/bcsstk01_b.mtx
  rank                 48 of 48
  relative residual 1  1.338e-16
  relative residual 2  1.424e-19
  solution             48 x 2, in x.mtx
  ...
)";

const char* const kInvdiag =
    R"(Compute the diagonal of the inverse of a symmetric matrix

Factors A as 'qxsm factor' does and computes the diagonal of its inverse from the factor, a partial back substitution
for each row, without the rest of the inverse. These are the variances of the estimates when A is a matrix of normal
equations. When A is singular, the inverse is the generalized inverse that dropped pivots leave, with 0 in the rows
that were dropped. A matrix that is not positive semidefinite is refused, with exit code 1.

Example: which joints of a structure give way most, and how far.

  $ qxsm invdiag data/bcsstk01.mtx -o d.mtx
  rank             48 of 48
  rows dropped     none
  smallest         4.68456e-10 in row 46
  largest          0.000106459 in row 1
  written          48 x 1, in d.mtx
  ...
)";

const char* const kGrid =
    R"(Write the matrix of a five-point grid, for trials of any size

Writes a symmetric matrix of order NX * NY: 4 + S on the diagonal and -1 for each pair of neighbours. With S = 0 it is
the Laplacian with fixed borders, and positive definite.

Example: a problem with a million unknowns.

  $ qxsm grid 1000 1000 -o grid.mtx
  order           1000000
  stored entries  2998000
  ...
  $ qxsm solve grid.mtx --memory 2G
)";

const char* const kExitCodes =
    R"(Exit codes:
  0  done
  1  a numerical "no": not positive semidefinite, or an inconsistent right-hand side
  2  wrong usage, or a file that cannot be read, understood or written
  3  out of memory (see --memory), or the module cannot be loaded)";

}  // namespace sm::cli::help
