# REML of an animal model with R's Matrix, whose Cholesky factors are CHOLMOD's: Rscript animal.R DATA PEDIGREE ANSWER
# The model: yield = herd and year + animal + residual. The criterion is profiled over the residual variance and
# minimised over the variance ratio alone, by R's optimize(); the factor is analysed once and then updated.
arguments <- commandArgs(trailingOnly = TRUE)
suppressMessages(library(Matrix))
seconds <- function() proc.time()[["elapsed"]]
began <- seconds()
data <- read.csv(arguments[1], stringsAsFactors = TRUE)
pedigree <- read.csv(arguments[2])
read <- seconds()

# A = T D T', T = (I - P)^-1 = I + P + P^2 + ..., where P has 1/2 for each known parent. The diagonal of A and D, of
# which each gives the other for the next generation, settle after as many rounds as there are generations.
q <- nrow(pedigree)
sire <- match(pedigree$sire, pedigree$id)
dam <- match(pedigree$dam, pedigree$id)
parents <- sparseMatrix(i = c(which(!is.na(sire)), which(!is.na(dam))), j = c(sire[!is.na(sire)], dam[!is.na(dam)]),
                        x = 0.5, dims = c(q, q))
descent <- Diagonal(q)
step <- parents
while (length(step@x) > 0) {
  descent <- descent + step
  step <- step %*% parents
}
descent@x <- descent@x^2
known <- function(parent, diagonal) ifelse(is.na(parent), 0, diagonal[parent])
diagonal <- rep(1, q)
repeat {
  mendelian <- 1 - 0.25 * (known(sire, diagonal) + known(dam, diagonal))
  settled <- as.vector(descent %*% mendelian)
  if (isTRUE(all(settled == diagonal))) break
  diagonal <- settled
}
rm(descent, step)
inverse <- crossprod(Diagonal(x = 1 / sqrt(mendelian)) %*% (Diagonal(q) - parents))

n <- nrow(data)
p <- nlevels(data$herdyear)
y <- data$yield
design <- cbind(sparseMatrix(i = seq_len(n), j = as.integer(data$herdyear), x = 1, dims = c(n, p)),
                sparseMatrix(i = seq_len(n), j = match(data$animal, pedigree$id), x = 1, dims = c(n, q)))
information <- forceSymmetric(crossprod(design))
penalty <- forceSymmetric(bdiag(Matrix(0, p, p, sparse = TRUE), inverse))
right <- as.vector(crossprod(design, y))
set_up <- seconds()

factor <- Cholesky(information + penalty, perm = TRUE, LDL = FALSE)
evaluations <- 0
at <- function(log_ratio) {
  evaluations <<- evaluations + 1
  factor <<- update(factor, information + exp(log_ratio) * penalty)
  solution <- as.vector(solve(factor, right))
  residual <- y - as.vector(design %*% solution)
  variance <- sum(y * residual) / (n - p)
  log_det <- 2 * as.numeric(determinant(factor)$modulus)
  criterion <- (n - p) * (log(2 * pi * variance) + 1) + log_det - q * log_ratio + sum(log(mendelian))
  list(criterion = criterion, variances = c(variance / exp(log_ratio), variance))
}
best <- at(optimize(function(r) at(r)$criterion, log(c(0.05, 50)), tol = 1e-5)$minimum)
fitted <- seconds()
numbers <- function(x) paste0("[", paste(sprintf("%.17g", x), collapse = ", "), "]")
writeLines(paste0(
  '{"criterion": ', sprintf("%.17g", best$criterion), ', "variances": ', numbers(best$variances),
  ', "evaluations": ', evaluations, ', "messages": [], "version": "Matrix ', as.character(packageVersion("Matrix")), '"',
  ', "read": ', read - began, ', "set_up": ', set_up - read, ', "fit": ', fitted - set_up, "}"), arguments[3])
