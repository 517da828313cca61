#include "cli/help.hpp"

namespace sm::cli::help {

const char* const kMain =
    R"(qxsm - fit mixed models, and inspect, factor and solve with sparse symmetric matrices

Fits linear mixed models, animal models and Gaussian fields to a table of data (lmm, reml, blup, pedigree). Reads Matrix
Market files and works on them through the qxesm module: a fill-reducing order, the factorization A = U'DU with rank and
log-determinant, solutions of A x = b, and what else is made of a matrix and its inverse. Singular matrices are welcome:
a pivot that is zero to tolerance is dropped, and what is solved with is then a generalized inverse.

Example: reaction times of 18 subjects, each with an intercept and a slope of its own.

  $ qxsm lmm examples/sleepstudy.csv 'reaction ~ days + (days | subject)'
  REML criterion at convergence: 1743.6283
   subject   (Intercept)  612.0899    288.7827   24.74045
             days          35.0717     14.7821    5.92213  0.066
   Residual               654.9410     77.1855   25.59182
  (Intercept)  251.4051      6.8246  17.00   36.838   < 2e-16
  days          10.4673      1.5458  17.00    6.771  3.26e-06
  ...

  $ qxsm solve data/bcsstk13.mtx     # a stiffness matrix, with b = A * 1
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

Factors A = U'DU in a fill-reducing order. Reported are the rank and the log-determinant over the accepted pivots,
whether A is positive definite, semidefinite or neither (exit code 1), the rows whose pivots were dropped, the size of
U (entries off the diagonal, fill ratio, subscripts stored in compressed form), operations and seconds by phase, and
the peak of memory.

General files are accepted when they are symmetric in value. Entries at one position are added together; zeros off the
diagonal are not kept.

The order decides how much U fills in. --ordering md, minimum degree, is found fast and good for most matrices: mixed
models, pedigrees, 2-D grids with five points. --ordering metis, nested dissection, takes about ten times as long to
find and saves a third of the operations on wide stencils in the plane (13 points), more than half of them on 3-D
grids: it is worth it where 'numeric' takes most of the time. --ordering amd is of md's kind, and often a little better
on grids; --ordering natural is for a matrix whose file has it in a good order already, such as a narrow band.

Examples:

  $ qxsm factor data/bcsstk13.mtx
  ordered by       md, the module's minimum degree
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
  $ qxsm factor data/bcsstk13.mtx --ordering natural
  ordered by       natural, as in the file
  rank             2003 of 2003
  ...
)";

const char* const kSolve =
    R"(Solve A x = b for one or many right-hand sides

Factors the symmetric matrix A as 'qxsm factor' does, solves, and measures ||b - A x|| / (||A|| ||x|| + ||b||) in the
infinity norm, from the entries of the file. When A is singular, each b is tested: one with a relative residual above
1e-10 is called inconsistent (A x = b has no solution), and the exit code is 1. A matrix that is not positive
semidefinite is refused, with exit code 1.

With --method cg nothing is factored: conjugate gradients, preconditioned by the diagonal, take one right-hand side
after the other. On a terminal the residual is shown as it comes down; --json has its history. Where they do not
converge the exit code is 1, and x is what they had reached.

Example: two right-hand sides, one in each column of an array file.

  $ qxsm solve data/bcsstk01.mtx -b data/bcsstk01_b.mtx -o x.mtx
  right-hand sides     2, from data/bcsstk01_b.mtx
  rank                 48 of 48
  relative residual 1  1.338e-16
  relative residual 2  1.424e-19
  solution             48 x 2, in x.mtx
  ...
  $ qxsm solve data/gr_30_30.mtx --method cg --tolerance 1e-8 --max-iterations 200
  tolerance          1e-08
  max iterations     200
  iterations         41 (the most for one right-hand side)
  relative residual  1.460e-09 after 41 iterations
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

const char* const kQuad =
    R"(Compute the form X A X' or X A^- X'

A is symmetric, and X any real matrix with as many columns. With --inverse A is factored as 'qxsm factor' does: with
the normal equations of a model in A and functions of its parameters in the rows of X, the form holds the variances and
covariances of the estimates, up to the error variance. When A is singular, the inverse is the generalized inverse that
dropped pivots leave, and the form is the same for every generalized inverse as far as the rows of X are estimable (see
'qxsm estimable'). A matrix that is not positive semidefinite is then refused, with exit code 1.

Example: variances of three group means, of two, three and one observation.

  $ qxsm quad data/oneway.mtx data/oneway_means.mtx --inverse -o f.mtx
  rows of X        data/oneway_means.mtx (array real general), 3 x 4
  rank             3 of 4
  form             3 x 3, 6 values in its lower triangle
  diagonal 1       0.5
  diagonal 3       1
  written          3 x 3 (array real symmetric), in f.mtx
  ...
)";

const char* const kTrace =
    R"(Compute the trace of A, A B, A^- or A^- B

Without --inverse, A and B are any real matrices whose product is square, general or symmetric. With --inverse, A is
symmetric and factored as 'qxsm factor' does: the trace is then that of its inverse, or of the inverse times B, with a
solution for each row of B. When A is singular, the inverse is the generalized inverse that dropped pivots leave. A
matrix that is not positive semidefinite is refused, with exit code 1.

Example: the inverse of A times A itself has the rank of A as its trace.

  $ qxsm trace data/bcsstk01.mtx data/bcsstk01.mtx --inverse
  second matrix    data/bcsstk01.mtx (coordinate real symmetric), 48 x 48
  rank             48 of 48
  rows dropped     none
  tr(A^- B)        47.99999999999997
  ...
)";

const char* const kHermite =
    R"(Compute the Hermite form A^- A of a symmetric matrix

Factors A as 'qxsm factor' does and computes H = A^- A, column by column. H is the identity when A is regular. Else it
has a row of zeros for each dropped pivot, and its other rows tell how each parameter of a model is confounded with
those that were dropped: a row l is estimable when l H = l. Elements of magnitude 1.11e-12 or less are left out. A
matrix that is not positive semidefinite is refused, with exit code 1.

Example: a mean and three groups, where the mean is the sum of what the groups say.

  $ qxsm hermite data/oneway.mtx -o h.mtx
  rank             3 of 4
  tr(H)            3
  Hermite form     6 entries
  written          4 x 4, in h.mtx
  ...
)";

const char* const kEstimable =
    R"(Tell which rows of L are estimable with the normal equations A

A row l is estimable when it is a combination of rows of A: l b is then the same for every solution b of the normal
equations, whatever generalized inverse they were solved with. Three things are asked for each row:

  pivots        no pivot was dropped (yes), l is nothing but dropped places (no), or neither (open)
  Hermite form  l H = l, with H = A^- A
  check         A A^- l = l

A row that passes the last two is estimable. When one does not, it is named, and the exit code is 1. So it is for a
matrix that is not positive semidefinite.

Example: with a mean beside three groups, a group's mean and a difference of groups are estimable; a group's effect
alone and the mean alone are not.

  $ qxsm estimable data/oneway.mtx data/oneway_l.mtx     # exit code 1
  rows of L        data/oneway_l.mtx (coordinate real general), 4 x 4
  rank             3 of 4
  row 1            estimable (pivots open, Hermite form yes, check yes)
  not estimable    2 of 4: 3, 4
  ...
)";

const char* const kConvert =
    R"(Write a matrix in another form: sparse, dense or packed

Reads any file that the other subcommands read and writes it as coordinates, as an array of the whole matrix, or as an
array of its lower triangle. Entries at one position are added together, and sparse files have no zeros. A matrix that
is symmetric only in value, and not by the word of its file, can be packed too.

Example: a stiffness matrix as a packed triangle, and back.

  $ qxsm convert data/bcsstk01.mtx p.mtx.gz --to packed
  to              packed (array real symmetric)
  values          1176
  ...
  $ qxsm convert p.mtx.gz s.mtx --to sparse
  to              sparse (coordinate real symmetric)
  values          224
  ...
)";

const char* const kPedigree =
    R"(Find inbreeding and the inverse relationship matrix of a pedigree

Reads who descends from whom: a table with the columns id, sire and dam (by these names, else its first three), rows in
any order. Empty fields, NA, 0 and . are unknown parents; a parent without a row of its own is added as a founder. Of A,
the numerator relationship matrix, the inverse with inbreeding follows from the pedigree alone by Henderson's rules; it
is sparse, and a million animals take seconds. Animals that descend from themselves are refused and named.

Example: six animals, two of them inbred.

  $ qxsm pedigree data/six_animals.csv --ainv ainv.mtx --inbreeding f.csv
  animals          6
  founders         2
  inbred           2
  mean F           0.0416667
  largest F        0.125
  log-determinant  -2.431662135269186 (of A)
  A-inverse        16 entries in its lower triangle
  ...
)";

const char* const kLmm =
    R"(Fit a linear mixed model to a table of data

Fits by restricted maximum likelihood (or --ml): fixed effects, variances and covariances of random effects, and the
random effects themselves. The formula is written as for lme4: (1 | g) is an intercept for each level of g, (x | g) an
intercept and a slope with their covariance, (x || g) the same without it, (1 | a/b) means (1 | a) + (1 | a:b). A
variance that is estimated as zero is said in words, and so is every column of X that depends on those before it; what
is not estimable gets no number. On a terminal a line for each iteration shows criterion, largest scaled score and step.
Ctrl-C stops, writes what there is, and ends with exit code 1; --start goes on from there.

Example: does sleep deprivation slow reactions, and how much do subjects differ?

  $ qxsm lmm examples/sleepstudy.csv 'reaction ~ days + (days | subject)' --test 'day 9: 1*(Intercept) + 9*days'
  Linear mixed model fit by REML
  REML criterion at convergence: 1743.6283
  days          10.4673      1.5458  17.00    6.771  3.26e-06
  day 9   345.611      14.629  17.00   23.625  1.94e-14  estimable
  ...
  $ qxsm lmm examples/penicillin.csv 'diameter ~ 1 + (1 | plate) + (1 | sample)' --out fit --plot plots
  REML criterion at convergence: 330.8606
   plate     (Intercept)  0.716908    0.226365   0.846704
  ...
  $ qxsm lmm examples/sleepstudy.csv 'reaction ~ days + (days | subject)' --dry-run
  observations    180
  fixed effects   2 columns, rank 2
  equations       38 unknowns
  ...
)";

const char* const kReml =
    R"(Fit a model with a pedigree or another known precision

As 'qxsm lmm', for terms whose levels are related: (1 | animal; pedigree) has the variance times the relationship matrix
of --pedigree, (1 | g; name) the variance times the (Moore-Penrose) inverse of the matrix of --kinv name=K.mtx. That may
be singular, as that of an intrinsic autoregression is. Each variance over their total is printed with its standard
error, or what --ratio asks for.

Example: how much of the variance is between batches; and the heritability of a trait, from a pedigree.

  $ qxsm reml examples/dyestuff.csv 'yield ~ 1 + (1 | batch)' --ratio 'icc = batch / (batch + residual)'
  REML criterion at convergence: 319.6543
   batch     (Intercept)   1764.05     1432.75    42.0006
   Residual                2451.25      707.61    49.5101
  icc    0.4185      0.2162
  ...

  qxsm reml birds.csv 'weight ~ sex + (1 | bird; pedigree) + (1 | nest)' --pedigree birds_pedigree.csv \
    --ratio 'h2 = bird / total'
)";

const char* const kBlup =
    R"(Predict random effects with given variances

As 'qxsm reml', with the variances told and not estimated: solves the mixed-model equations for fixed and random
effects, their standard errors, and the prediction error variances and reliabilities (--pev prints them).

Example: breeding values of eight calves, five of them weighed, with a ratio of variances of 2.

  $ qxsm blup examples/calves.csv 'gain ~ 0 + sex + (1 | calf; pedigree)' --pedigree examples/calves_pedigree.csv \
      --var calf=20 --var residual=40 --pev
  Linear mixed model with given variances
  REML criterion at these variances: 19.3092
   1      0.0984446    4.0760    4.3409     0.057812
   8      0.1826147    3.4820    4.1103     0.155272
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
  1  a numerical "no": not positive semidefinite, an inconsistent right-hand side, not converged, a row that is not
     estimable, or a result that overflows
  2  wrong usage, a file that cannot be read, understood or written, or a model that does not suit its data
  3  out of memory (see --memory), or the module cannot be loaded)";

}  // namespace sm::cli::help
